// The framework object that qelsysInstantiateFramework hands out: the entry
// to everything the simulated device offers.
#pragma once

#include <memory>

#include "ComObject.h"
#include "DeviceModel.h"

namespace qel::sim {

/// Serves the framework operations from one loaded model. Operations this
/// version does not simulate answer kStatusNotImplemented with their
/// interface outputs nulled.
class FrameworkObject final : public ComObject<api::IkrSysFramework> {
public:
    explicit FrameworkObject(std::shared_ptr<const DeviceModel> model) noexcept : model_(std::move(model)) {}

    int32_t SearchForItemsAndProperties(const wchar_t* locator, uint32_t filterMode, api::IkrSysPropertyBag* filter,
                                        api::IkrSysEnumPropertyBags** out) override;
    int32_t SearchForItemNames(const wchar_t* locator, api::IkrSysEnumUris** out) override;
    int32_t GetPropertiesOfItem(const wchar_t* locator, api::IkrSysPropertyBag** out) override;
    /// The experts of the model for a locator naming this device ("//localhost",
    /// alone or followed by "/" and a path); another host gives
    /// kStatusBadLocator, a null locator kStatusPointer.
    int32_t EnumSystemExperts(const wchar_t* locator, api::IkrSysEnumExperts** out) override;
    int32_t SetNotificationHandler(const wchar_t* locator, api::IkrSysNotificationHandler* handler,
                                   uint32_t flags) override;
    int32_t PopulateOrRefreshProperties(api::IkrSysPropertyBag* bag, uint32_t count, const api::PropertyTag* tags,
                                        uint32_t allowAsync) override;
    int32_t CreatePropertyBag(api::IkrSysPropertyBag** out) override;
    int32_t RenameAlias(const wchar_t* locator, const wchar_t* name, uint32_t mode, uint32_t* conflict,
                        api::SysString* uri1, api::SysString* uri2) override;
    int32_t PersistChanges(api::IkrSysPropertyBag* bag, uint32_t validateOnly, uint32_t* requiresRestart,
                           api::SysString* detailedResult) override;

private:
    std::shared_ptr<const DeviceModel> model_;
};

}  // namespace qel::sim
