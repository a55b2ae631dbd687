// Reading the simulated device's model file and checking its shape.
#include "DeviceModel.h"

#include <cerrno>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

#include <nlohmann/json.hpp>

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

}  // namespace

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
    return model;
}

}  // namespace qel::sim
