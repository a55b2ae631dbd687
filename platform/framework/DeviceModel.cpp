// Reading the simulated device's model file and checking its shape.
#include "DeviceModel.h"

#include <cerrno>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

#include <nlohmann/json.hpp>

#include "ModelJson.h"
#include "SharedDirectory.h"
#include "foundation/Utf.h"
#include "foundation/osdep/path.h"

namespace qel::sim {

namespace {

using Json = nlohmann::json;

[[noreturn]] void Invalid(int32_t line, const fnd::NString& detail) {
    throw ModelError(line, kStatusModelInvalid, detail);
}

/// Closes a descriptor on every path out of Load.
class Descriptor {
public:
    explicit Descriptor(int fd) noexcept : fd_(fd) {}
    ~Descriptor() {
        if (fd_ >= 0) ::close(fd_);
    }
    Descriptor(const Descriptor&) = delete;
    Descriptor& operator=(const Descriptor&) = delete;
    int Get() const noexcept { return fd_; }

private:
    int fd_;
};

int32_t StatusForOpenError(int error) {
    switch (error) {
        case ENOENT:
        case ENOTDIR:
            return kStatusModelMissing;
        case EACCES:
        case EPERM:
            return kStatusModelDenied;
        default:
            return fnd::kStatusFail;
    }
}

/// The member `key` of an expert as decoded text; `where` names the expert in
/// the message of a failure.
fnd::WString TextMember(const Json& expert, const char* key, const fnd::NString& where) {
    auto found = expert.find(key);
    if (found == expert.end() || !found->is_string()) Invalid(__LINE__, where + ": \"" + key + "\" is not a string");
    const auto& utf8 = found->get_ref<const std::string&>();
    try {
        return fnd::Utf8ToWide(utf8.data(), static_cast<uint32_t>(utf8.size()));
    } catch (const fnd::exception::InvalidSequence&) {
        Invalid(__LINE__, where + ": \"" + key + "\" is not UTF-8");
    }
}

ExpertRecord ReadExpert(const Json& expert, size_t index) {
    fnd::NString where("experts[");
    where.Append(std::to_string(index).c_str()).Append("]");
    if (!expert.is_object()) Invalid(__LINE__, where + " is not an object");

    ExpertRecord record;
    record.programmaticName = TextMember(expert, "programmaticName", where);
    record.displayName = TextMember(expert, "displayName", where);
    record.version = TextMember(expert, "version", where);
    fnd::WString id = TextMember(expert, "productId", where);
    try {
        record.productId = fnd::Guid::FromString(id);
    } catch (const fnd::exception::BadGuidString&) {
        Invalid(__LINE__, where + ": \"productId\" is not a braced GUID");
    }
    return record;
}

fnd::NString Where(const char* list, size_t index) {
    fnd::NString where(list);
    where.Append("[").Append(std::to_string(index).c_str()).Append("]");
    return where;
}

std::wstring WideMember(const Json& object, const char* key, const fnd::NString& where, bool required = true) {
    auto found = object.find(key);
    if (found == object.end() && !required) return std::wstring();
    if (found == object.end() || !found->is_string()) Invalid(__LINE__, where + ": \"" + key + "\" is not a string");
    std::wstring text;
    if (!json::ToWide(found->get_ref<const std::string&>(), &text))
        Invalid(__LINE__, where + ": \"" + key + "\" is not UTF-8");
    return text;
}

bool FlagMember(const Json& object, const char* key, const fnd::NString& where) {
    auto found = object.find(key);
    if (found == object.end()) return false;
    if (!found->is_boolean()) Invalid(__LINE__, where + ": \"" + key + "\" is not true or false");
    return found->get<bool>();
}

PropertyRecord ReadProperty(const Json& property, const fnd::NString& where) {
    if (!property.is_object()) Invalid(__LINE__, where + " is not an object");
    PropertyRecord record;
    auto tag = property.find("tag");
    if (tag == property.end() || !json::ReadTag(*tag, &record.tag))
        Invalid(__LINE__, where + ": \"tag\" is not a hexadecimal text");
    if (record.tag == kItemUriTag) Invalid(__LINE__, where + ": the URI property is the device's own");
    auto type = property.find("type");
    if (type == property.end() || !type->is_number_unsigned() || type->get<uint64_t>() < 1 || type->get<uint64_t>() > 7)
        Invalid(__LINE__, where + ": \"type\" is not a code from 1 to 7");
    auto value = property.find("value");
    std::string problem;
    if (value == property.end() ||
        !json::ReadValue(*value, static_cast<api::PropertyTypeCode>(type->get<uint64_t>()), &record.value, &problem))
        Invalid(__LINE__, where + ": \"value\" " + problem.c_str());
    record.readOnly = FlagMember(property, "readOnly", where);
    record.requiresRestart = FlagMember(property, "requiresRestart", where);
    return record;
}

ItemRecord ReadItem(const Json& item, size_t index, const std::vector<ExpertRecord>& experts) {
    fnd::NString where = Where("items", index);
    if (!item.is_object()) Invalid(__LINE__, where + " is not an object");
    ItemRecord record;
    record.expert = WideMember(item, "expert", where);
    record.name = WideMember(item, "name", where);
    record.uri = WideMember(item, "uri", where);
    record.alias = WideMember(item, "alias", where, false);
    record.legacyBag = FlagMember(item, "legacyBag", where);
    bool known = false;
    for (const auto& expert : experts)
        known = known || std::wstring(expert.programmaticName.Data(), expert.programmaticName.Length()) == record.expert;
    if (!known) Invalid(__LINE__, where + ": \"expert\" names no expert of the model");
    if (record.name.empty() || record.name.find_first_of(L"/,") != std::wstring::npos)
        Invalid(__LINE__, where + ": \"name\" is empty or holds \"/\" or \",\"");
    if (record.uri.rfind(L"//localhost/", 0) != 0) Invalid(__LINE__, where + ": \"uri\" is not below //localhost/");
    auto properties = item.find("properties");
    if (properties != item.end()) {
        if (!properties->is_array()) Invalid(__LINE__, where + ": \"properties\" is not an array");
        for (size_t i = 0; i < properties->size(); ++i) {
            PropertyRecord property = ReadProperty((*properties)[i], where + "." + Where("properties", i));
            if (record.Find(property.tag)) Invalid(__LINE__, where + ": a tag is listed twice");
            record.properties.push_back(std::move(property));
        }
    }
    return record;
}

FaultRecord ReadFault(const Json& fault, size_t index) {
    fnd::NString where = Where("faults", index);
    if (!fault.is_object()) Invalid(__LINE__, where + " is not an object");
    FaultRecord record;
    record.operation = WideMember(fault, "operation", where);
    if (fault.contains("locator")) record.locator = WideMember(fault, "locator", where);
    if (fault.contains("expert")) record.expert = WideMember(fault, "expert", where);
    if (fault.contains("tag")) {
        api::PropertyTag tag;
        if (!json::ReadTag(fault["tag"], &tag)) Invalid(__LINE__, where + ": \"tag\" is not a hexadecimal text");
        record.tag = tag;
    }
    api::PropertyTag status;
    auto found = fault.find("status");
    if (found == fault.end() || !json::ReadTag(*found, &status))
        Invalid(__LINE__, where + ": \"status\" is not a hexadecimal text");
    record.status = fnd::Status(status);
    // A fault that answers success would hide the very path it is meant to show.
    if (!fnd::Failed(record.status) && record.status != fnd::kStatusFalse)
        Invalid(__LINE__, where + ": \"status\" is neither a failure nor 1");
    return record;
}

FirmwareSettings ReadFirmware(const Json& firmware) {
    FirmwareSettings settings;
    if (!firmware.is_object()) Invalid(__LINE__, "\"firmware\" is not an object");
    if (firmware.contains("version")) settings.version = WideMember(firmware, "version", "firmware");
    auto pace = firmware.find("millisecondsPerPercent");
    if (pace != firmware.end()) {
        if (!pace->is_number_unsigned() || pace->get<uint64_t>() > 60000)
            Invalid(__LINE__, "\"firmware\": \"millisecondsPerPercent\" is not 0 to 60000");
        settings.millisecondsPerPercent = static_cast<uint32_t>(pace->get<uint64_t>());
    }
    return settings;
}

}  // namespace

const PropertyRecord* ItemRecord::Find(api::PropertyTag tag) const noexcept {
    for (const auto& property : properties)
        if (property.tag == tag) return &property;
    return nullptr;
}

int32_t DeviceModel::Fault(const wchar_t* operation, const wchar_t* locator, const std::wstring* expert,
                           const api::PropertyTag* tag) const noexcept {
    for (const auto& fault : faults_) {
        if (fault.operation != operation) continue;
        if (fault.locator && (!locator || *fault.locator != locator)) continue;
        if (fault.expert && (!expert || *fault.expert != *expert)) continue;
        if (fault.tag && (!tag || *fault.tag != *tag)) continue;
        return fault.status;
    }
    return fnd::kStatusOk;
}

fnd::NString DeviceModel::DefaultPath() {
    return fnd::osdep::JoinPath(SharedDataDirectory(), fnd::NString("sim/device.json"));
}

DeviceModel DeviceModel::Load(const fnd::NString& path) {
    int fd;
    do {
        fd = ::open(path.CStr(), O_RDONLY | O_CLOEXEC);
    } while (fd < 0 && errno == EINTR);
    if (fd < 0) {
        int error = errno;
        throw ModelError(__LINE__, StatusForOpenError(error), path + ": cannot be opened");
    }
    Descriptor file(fd);

    // A directory opens fine but is no model; reading it would only fail.
    struct stat info;
    if (::fstat(file.Get(), &info) != 0 || !S_ISREG(info.st_mode)) Invalid(__LINE__, path + " is not a regular file");

    std::string content;
    char chunk[4096];
    for (;;) {
        ssize_t got = ::read(file.Get(), chunk, sizeof chunk);
        if (got < 0 && errno == EINTR) continue;
        if (got < 0) throw ModelError(__LINE__, fnd::kStatusFail, path + ": read failed");
        if (got == 0) break;
        content.append(chunk, static_cast<size_t>(got));
        if (content.size() > fnd::NString::kMaxLength) Invalid(__LINE__, path + " is too large");
    }
    return Parse(content.data(), static_cast<uint32_t>(content.size()));
}

DeviceModel DeviceModel::Parse(const char* bytes, uint32_t count) {
    // Without exceptions the parser answers "discarded" for any syntax error,
    // including strings that are not UTF-8.
    Json document = Json::parse(bytes, bytes + count, nullptr, /*allow_exceptions=*/false);
    if (document.is_discarded()) Invalid(__LINE__, "the model is not JSON");
    if (!document.is_object()) Invalid(__LINE__, "the model is not a JSON object");

    auto experts = document.find("experts");
    if (experts == document.end() || !experts->is_array()) Invalid(__LINE__, "\"experts\" is not an array");

    DeviceModel model;
    model.experts_.reserve(experts->size());
    for (size_t i = 0; i < experts->size(); ++i) model.experts_.push_back(ReadExpert((*experts)[i], i));

    auto items = document.find("items");
    if (items != document.end()) {
        if (!items->is_array()) Invalid(__LINE__, "\"items\" is not an array");
        for (size_t i = 0; i < items->size(); ++i) {
            ItemRecord item = ReadItem((*items)[i], i, model.experts_);
            for (const auto& earlier : model.items_)
                if (earlier.uri == item.uri) Invalid(__LINE__, Where("items", i) + ": \"uri\" is repeated");
            model.items_.push_back(std::move(item));
        }
    }
    auto faults = document.find("faults");
    if (faults != document.end()) {
        if (!faults->is_array()) Invalid(__LINE__, "\"faults\" is not an array");
        for (size_t i = 0; i < faults->size(); ++i) model.faults_.push_back(ReadFault((*faults)[i], i));
    }
    auto firmware = document.find("firmware");
    if (firmware != document.end()) model.firmware_ = ReadFirmware(*firmware);
    return model;
}

}  // namespace qel::sim
