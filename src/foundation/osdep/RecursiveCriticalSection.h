// An in-process recursive lock with priority inheritance.
#pragma once

#include <cstdint>
#include <memory>

namespace qel::fnd::osdep {

/// The owner may lock it again; each Lock needs its Unlock. Unlock by a
/// thread that does not own it does nothing and returns 0.
class RecursiveCriticalSection {
public:
    RecursiveCriticalSection();
    ~RecursiveCriticalSection();
    RecursiveCriticalSection(const RecursiveCriticalSection&) = delete;
    RecursiveCriticalSection& operator=(const RecursiveCriticalSection&) = delete;

    void Lock();
    /// False when another thread holds it.
    bool TryLock();
    int32_t Unlock();
    bool IsOwnedByCaller() const;

private:
    struct Record;  // keeps <pthread.h> out of this header
    std::unique_ptr<Record> record_;
};

}  // namespace qel::fnd::osdep
