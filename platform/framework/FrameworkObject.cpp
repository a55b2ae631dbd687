// The framework operations of the simulated device.
#include "FrameworkObject.h"

#include <cwchar>

#include "Enumerators.h"

namespace qel::sim {

namespace {

constexpr wchar_t kThisDevice[] = L"//localhost";

/// A locator names this device when it is "//localhost" or continues with
/// "/" and a path below it; "//localhostess" is another host.
int32_t CheckLocator(const wchar_t* locator) noexcept {
    if (!locator) return fnd::kStatusPointer;
    constexpr size_t length = sizeof kThisDevice / sizeof kThisDevice[0] - 1;
    if (std::wcsncmp(locator, kThisDevice, length) != 0) return fnd::kStatusBadLocator;
    wchar_t next = locator[length];
    return next == L'\0' || next == L'/' ? fnd::kStatusOk : fnd::kStatusBadLocator;
}

template <typename T>
void Clear(T* out) noexcept {
    if (out) *out = T{};
}

}  // namespace

int32_t FrameworkObject::EnumSystemExperts(const wchar_t* locator, api::IkrSysEnumExperts** out) {
    return Guarded([&] {
        if (!out) return fnd::kStatusPointer;
        *out = nullptr;
        int32_t status = CheckLocator(locator);
        if (fnd::Failed(status)) return status;
        *out = new EnumExperts(model_);
        return fnd::kStatusOk;
    });
}

int32_t FrameworkObject::SearchForItemsAndProperties(const wchar_t*, uint32_t, api::IkrSysPropertyBag*,
                                                     api::IkrSysEnumPropertyBags** out) {
    Clear(out);
    return fnd::kStatusNotImplemented;
}

int32_t FrameworkObject::SearchForItemNames(const wchar_t*, api::IkrSysEnumUris** out) {
    Clear(out);
    return fnd::kStatusNotImplemented;
}

int32_t FrameworkObject::GetPropertiesOfItem(const wchar_t*, api::IkrSysPropertyBag** out) {
    Clear(out);
    return fnd::kStatusNotImplemented;
}

int32_t FrameworkObject::SetNotificationHandler(const wchar_t*, api::IkrSysNotificationHandler*, uint32_t) {
    return fnd::kStatusNotImplemented;
}

int32_t FrameworkObject::PopulateOrRefreshProperties(api::IkrSysPropertyBag*, uint32_t, const api::PropertyTag*,
                                                     uint32_t) {
    return fnd::kStatusNotImplemented;
}

int32_t FrameworkObject::CreatePropertyBag(api::IkrSysPropertyBag** out) {
    Clear(out);
    return fnd::kStatusNotImplemented;
}

int32_t FrameworkObject::RenameAlias(const wchar_t*, const wchar_t*, uint32_t, uint32_t* conflict, api::SysString* uri1,
                                     api::SysString* uri2) {
    Clear(conflict);
    Clear(uri1);
    Clear(uri2);
    return fnd::kStatusNotImplemented;
}

int32_t FrameworkObject::PersistChanges(api::IkrSysPropertyBag*, uint32_t, uint32_t* requiresRestart,
                                        api::SysString* detailedResult) {
    Clear(requiresRestart);
    Clear(detailedResult);
    return fnd::kStatusNotImplemented;
}

}  // namespace qel::sim
