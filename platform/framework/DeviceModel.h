// The simulated device's description: what the model file in the shared data
// directory says the device holds.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "foundation/Exception.h"
#include "foundation/Guid.h"
#include "foundation/Status.h"
#include "foundation/StringBase.h"

#include "PropertyValue.h"
#include "SimControl.h"

namespace qel::sim {

/// A model that could not be loaded; ErrorCode() is the status the framework
/// hands its caller, what() says which part of the model was at fault.
class ModelError : public fnd::exception::Exception {
public:
    ModelError(int32_t line, int32_t status, const fnd::NString& detail)
        : Exception("DeviceModel", line), status_(status), message_(detail) {}
    const char* what() const noexcept override { return message_.CStr(); }
    int32_t ErrorCode() const noexcept override { return status_; }

private:
    int32_t status_;
    fnd::NString message_;
};

/// One installed system expert, its texts already decoded from UTF-8.
struct ExpertRecord {
    fnd::WString programmaticName;
    fnd::WString displayName;
    fnd::WString version;
    fnd::Guid productId;
};

/// One property of an item as the model defines it.
struct PropertyRecord {
    api::PropertyTag tag = 0;
    PropertyValue value;
    bool readOnly = false;
    bool requiresRestart = false;
};

/// One item of the device: which expert serves it, its names and properties.
struct ItemRecord {
    std::wstring expert;
    std::wstring name;
    std::wstring uri;
    std::wstring alias;
    /// Bags of this item offer only IkrSysPropertyBag, so times are read as
    /// local calendar fields.
    bool legacyBag = false;
    std::vector<PropertyRecord> properties;

    /// The property with `tag`, or null.
    const PropertyRecord* Find(api::PropertyTag tag) const noexcept;
};

/// A framework call that the model makes fail. The optional members narrow it
/// down: the call's locator (for bag getters, the bag's item URI), the
/// expert's programmatic name, the property tag.
struct FaultRecord {
    std::wstring operation;
    std::optional<std::wstring> locator;
    std::optional<std::wstring> expert;
    std::optional<api::PropertyTag> tag;
    int32_t status = 0;
};

/// The firmware the device starts with and how fast a change advances.
struct FirmwareSettings {
    std::wstring version = L"1.0.0";
    uint32_t millisecondsPerPercent = 20;
};

/// The tag of the property every item bag carries: the item's URI, a string.
inline constexpr api::PropertyTag kItemUriTag = 0x01000000;

/// The device as the model file describes it. Immutable once loaded; the
/// framework's objects share one instance.
class DeviceModel {
public:
    /// Where the model lives: "sim/device.json" under the shared data directory.
    static fnd::NString DefaultPath();

    /// Reads and parses the file at `path`. Throws ModelError with
    /// kStatusModelMissing when it does not exist, kStatusModelDenied when it
    /// may not be read, and as Parse does for its content.
    static DeviceModel Load(const fnd::NString& path);

    /// Parses a model document. The top level is an object whose "experts"
    /// array holds objects with the strings "programmaticName", "displayName",
    /// "version" and "productId" (a braced GUID); "items", "faults" and
    /// "firmware" are optional (docs/DEVICE_MODEL.md); other keys are ignored,
    /// so that a model may describe more than this version reads. Anything
    /// else, including text that is not strict UTF-8, an item of an unknown
    /// expert or a repeated URI, throws ModelError with kStatusModelInvalid.
    static DeviceModel Parse(const char* bytes, uint32_t count);

    /// The experts in the order the model lists them.
    const std::vector<ExpertRecord>& Experts() const noexcept { return experts_; }
    /// The items in the order the model lists them.
    const std::vector<ItemRecord>& Items() const noexcept { return items_; }
    const FirmwareSettings& Firmware() const noexcept { return firmware_; }

    /// The status the model makes `operation` answer for these arguments, or
    /// 0 when no fault applies. A null argument matches only faults that do
    /// not name that member.
    int32_t Fault(const wchar_t* operation, const wchar_t* locator = nullptr, const std::wstring* expert = nullptr,
                  const api::PropertyTag* tag = nullptr) const noexcept;

private:
    std::vector<ExpertRecord> experts_;
    std::vector<ItemRecord> items_;
    std::vector<FaultRecord> faults_;
    FirmwareSettings firmware_;
};

}  // namespace qel::sim
