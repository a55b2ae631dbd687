// The utility library's lock objects: a synchronisation base and the
// critical section that guards the plug-in's process-wide state.
#pragma once

#include <cstdint>

#include "foundation/osdep/RecursiveCriticalSection.h"

namespace Kitbase {

class CqelSyncObject {
public:
    CqelSyncObject() = default;
    virtual ~CqelSyncObject() = default;
    CqelSyncObject(const CqelSyncObject&) = delete;
    CqelSyncObject& operator=(const CqelSyncObject&) = delete;

    /// Stored for callers that tag their locks; nothing reads it.
    virtual void SetAttribute(uint32_t attribute) { attribute_ = attribute; }
    virtual bool Lock(int32_t timeoutMs) = 0;
    virtual int32_t Unlock() = 0;

private:
    uint32_t attribute_ = 0;
};

/// A recursive in-process critical section. Lock waits without limit
/// whatever the time-out (callers pass -1) and returns true.
class CqelCS : public CqelSyncObject {
public:
    bool Lock(int32_t timeoutMs = -1) override;
    int32_t Unlock() override;

private:
    qel::fnd::osdep::RecursiveCriticalSection section_;
};

/// Holds a CqelCS for one scope.
class CqelCSLock {
public:
    explicit CqelCSLock(CqelCS& cs) : cs_(cs) { cs_.Lock(-1); }
    ~CqelCSLock() { cs_.Unlock(); }
    CqelCSLock(const CqelCSLock&) = delete;
    CqelCSLock& operator=(const CqelCSLock&) = delete;

private:
    CqelCS& cs_;
};

}  // namespace Kitbase
