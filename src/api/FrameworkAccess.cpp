// Creating and releasing the one framework object of the process.
#include "api/FrameworkAccess.h"

#include <atomic>

#include "catalog/SharedDirectory.h"

namespace qel::api {

namespace {

std::atomic<IkrSysFramework*>& Pointer() {
    static std::atomic<IkrSysFramework*> pointer{nullptr};
    return pointer;
}

}  // namespace

Kitbase::CqelCS& ServiceLock() {
    static Kitbase::CqelCS lock;
    return lock;
}

IkrSysFramework* FrameworkPointer() { return Pointer().load(std::memory_order_acquire); }

int32_t EnsureFramework() {
    if (FrameworkPointer()) return 0;
    Kitbase::CqelCSLock hold(ServiceLock());
    catalog::SetSysconfigDirectory(catalog::ComputeSysconfigDirectory());
    if (FrameworkPointer()) return 0;
    IkrSysFramework* created = nullptr;
    int32_t status = qelsysInstantiateFramework(&created);
    if (status < 0) {
        // A failing framework must not leave an object behind.
        if (created) created->Release();
        return status;
    }
    Pointer().store(created, std::memory_order_release);
    return status;
}

void ReleaseFramework() {
    Kitbase::CqelCSLock hold(ServiceLock());
    if (IkrSysFramework* framework = Pointer().exchange(nullptr, std::memory_order_acq_rel)) framework->Release();
}

}  // namespace qel::api
