// The framework object that qelsysInstantiateFramework hands out: the entry
// to everything the simulated device offers.
#pragma once

#include <memory>
#include <vector>

#include "ComObject.h"
#include "DeviceModel.h"
#include "DeviceState.h"
#include "Firmware.h"
#include "PropertyBag.h"

namespace qel::sim {

/// Serves the framework, firmware and diagnostics operations from one loaded
/// model and the device's state. Every operation first answers the fault the
/// model sets for it, if any. The firmware thread ends with the object.
class FrameworkObject final
    : public ComObject<api::IkrSysFramework, api::IkrSysFirmware, api::IkrSysDiagnostics> {
public:
    FrameworkObject(std::shared_ptr<const DeviceModel> model, std::shared_ptr<DeviceState> state)
        : model_(std::move(model)), state_(std::move(state)), firmware_(model_->Firmware()) {}

    int32_t SearchForItemsAndProperties(const wchar_t* locator, uint32_t filterMode, api::IkrSysPropertyBag* filter,
                                        api::IkrSysEnumPropertyBags** out) override;
    int32_t SearchForItemNames(const wchar_t* locator, api::IkrSysEnumUris** out) override;
    int32_t GetPropertiesOfItem(const wchar_t* locator, api::IkrSysPropertyBag** out) override;
    int32_t EnumSystemExperts(const wchar_t* locator, api::IkrSysEnumExperts** out) override;
    /// Not simulated yet: kStatusNotImplemented.
    int32_t SetNotificationHandler(const wchar_t* locator, api::IkrSysNotificationHandler* handler,
                                   uint32_t flags) override;
    int32_t PopulateOrRefreshProperties(api::IkrSysPropertyBag* bag, uint32_t count, const api::PropertyTag* tags,
                                        uint32_t allowAsync) override;
    int32_t CreatePropertyBag(api::IkrSysPropertyBag** out) override;
    int32_t RenameAlias(const wchar_t* locator, const wchar_t* name, uint32_t mode, uint32_t* conflict,
                        api::SysString* uri1, api::SysString* uri2) override;
    int32_t PersistChanges(api::IkrSysPropertyBag* bag, uint32_t validateOnly, uint32_t* requiresRestart,
                           api::SysString* detailedResult) override;

    int32_t BeginFirmwareChange(const wchar_t* locator, uint32_t stopTasks, uint32_t imageLength,
                                api::SysString* detailedResult) override;
    int32_t UpdateFirmwareImage(const wchar_t* locator, const wchar_t* token, uint32_t overwrite,
                                const wchar_t* clientFileName, api::IkrSysBinaryImage* image) override;
    int32_t UpdateFirmwareVersion(const wchar_t* locator, const wchar_t* token, uint32_t overwrite,
                                  const wchar_t* version) override;
    int32_t EraseFirmware(const wchar_t* locator, const wchar_t* token) override;
    int32_t CheckFirmwareStatus(const wchar_t* locator, uint32_t* state, uint32_t* percentComplete,
                                uint32_t* requiresRestart, api::SysString* version) override;

    int32_t Reset(const wchar_t* locator, uint32_t mode) override;
    int32_t SelfTest(const wchar_t* locator, uint32_t mode, api::SysString* detailedResult) override;
    int32_t SelfCalibrate(const wchar_t* locator, api::SysString* detailedResult) override;

private:
    std::vector<BagEntry> ItemEntries(size_t item, const ItemState& state) const;

    std::shared_ptr<const DeviceModel> model_;
    std::shared_ptr<DeviceState> state_;
    Firmware firmware_;
};

}  // namespace qel::sim
