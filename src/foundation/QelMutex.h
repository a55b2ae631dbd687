// A small non-recursive lock that knows its owner, and the process-wide one
// that serialises the reference counts of the service's component objects.
#pragma once

#include <memory>

namespace qel::fnd {

/// Locking it twice from one thread is a programming error, not a deadlock
/// to wait out: the second Lock finds the flag set and aborts the process.
class CQelMutex {
public:
    CQelMutex();
    virtual ~CQelMutex();
    CQelMutex(const CQelMutex&) = delete;
    CQelMutex& operator=(const CQelMutex&) = delete;

    void Lock();
    void Unlock();
    bool IsLockedByCaller() const;

private:
    struct Record;  // keeps <pthread.h> out of this header
    std::unique_ptr<Record> record_;
};

/// Holds a CQelMutex for one scope.
class CQelMutexLock {
public:
    explicit CQelMutexLock(CQelMutex& mutex) : mutex_(mutex) { mutex_.Lock(); }
    ~CQelMutexLock() { mutex_.Unlock(); }
    CQelMutexLock(const CQelMutexLock&) = delete;
    CQelMutexLock& operator=(const CQelMutexLock&) = delete;

private:
    CQelMutex& mutex_;
};

/// The one lock under which every component object of the service changes
/// its reference count. Constructed at load, before any object can exist.
CQelMutex& ComObjectCountMutex();

}  // namespace qel::fnd
