// Keeping the simulated device's state: the overlay on the model and the
// state file, which is only ever replaced whole.
#include "DeviceState.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <sstream>

#include "ModelJson.h"

namespace qel::sim {

namespace {

using json::Json;

constexpr int kStateFormat = 1;

// Two frameworks in one process may save at once; each save writes its own
// temporary file, and this keeps the renames from interleaving with the writes.
std::mutex saveLock;

std::string DirectoryOf(const std::string& path) {
    size_t slash = path.rfind('/');
    return slash == std::string::npos ? std::string(".") : path.substr(0, slash);
}

bool WriteAll(int fd, const char* data, size_t size) {
    while (size > 0) {
        ssize_t written = ::write(fd, data, size);
        if (written < 0 && errno == EINTR) continue;
        if (written <= 0) return false;
        data += written;
        size -= static_cast<size_t>(written);
    }
    return true;
}

}  // namespace

std::string DeviceState::PathBeside(const std::string& modelPath) {
    return DirectoryOf(modelPath) + "/device.state.json";
}

std::vector<ItemState> DeviceState::Factory() const {
    std::vector<ItemState> items;
    items.reserve(model_->Items().size());
    for (const auto& item : model_->Items()) {
        ItemState state;
        state.alias = item.alias;
        for (const auto& property : item.properties) state.values.push_back(property.value);
        items.push_back(std::move(state));
    }
    return items;
}

DeviceState::DeviceState(std::shared_ptr<const DeviceModel> model, std::string statePath)
    : model_(std::move(model)), path_(std::move(statePath)), items_(Factory()) {
    std::ifstream in(path_, std::ios::binary);
    if (!in) return;
    std::stringstream content;
    content << in.rdbuf();
    Json document = Json::parse(content.str(), nullptr, /*allow_exceptions=*/false);
    // Only a file this code wrote and renamed into place is taken; anything
    // else there leaves the device in factory state rather than half-restored.
    if (!document.is_object() || document.value("format", 0) != kStateFormat) return;
    auto items = document.find("items");
    if (items == document.end() || !items->is_array()) return;
    const auto& modelItems = model_->Items();
    for (const auto& entry : *items) {
        if (!entry.is_object() || !entry.contains("uri") || !entry["uri"].is_string()) continue;
        std::wstring uri;
        if (!json::ToWide(entry["uri"].get<std::string>(), &uri)) continue;
        for (size_t i = 0; i < modelItems.size(); ++i) {
            if (modelItems[i].uri != uri) continue;
            auto alias = entry.find("alias");
            if (alias != entry.end() && alias->is_string()) json::ToWide(alias->get<std::string>(), &items_[i].alias);
            auto properties = entry.find("properties");
            if (properties == entry.end() || !properties->is_array()) break;
            for (const auto& saved : *properties) {
                if (!saved.is_object() || !saved.contains("tag") || !saved.contains("value")) continue;
                api::PropertyTag tag;
                if (!json::ReadTag(saved["tag"], &tag)) continue;
                const auto& defined = modelItems[i].properties;
                for (size_t p = 0; p < defined.size(); ++p) {
                    if (defined[p].tag != tag) continue;
                    PropertyValue value;
                    std::string problem;
                    if (json::ReadValue(saved["value"], defined[p].value.type, &value, &problem))
                        items_[i].values[p] = std::move(value);
                }
            }
            break;
        }
    }
}

std::vector<ItemState> DeviceState::Snapshot() const {
    std::lock_guard<std::mutex> guard(lock_);
    return items_;
}

int32_t DeviceState::Update(const std::function<bool(std::vector<ItemState>&)>& change) {
    std::lock_guard<std::mutex> guard(lock_);
    std::vector<ItemState> copy = items_;
    if (!change(copy)) return fnd::kStatusFalse;
    int32_t status = Save(copy);
    if (fnd::Failed(status)) return status;
    items_ = std::move(copy);
    return fnd::kStatusOk;
}

int32_t DeviceState::FactoryReset() {
    std::lock_guard<std::mutex> guard(lock_);
    {
        std::lock_guard<std::mutex> saving(saveLock);
        if (::unlink(path_.c_str()) != 0 && errno != ENOENT) return fnd::kStatusFail;
    }
    items_ = Factory();
    return fnd::kStatusOk;
}

int32_t DeviceState::Save(const std::vector<ItemState>& items) const {
    // Only what differs from the model is kept, so that a model edited later
    // still provides the defaults for everything never changed.
    Json saved = Json::array();
    const auto& modelItems = model_->Items();
    for (size_t i = 0; i < modelItems.size(); ++i) {
        Json properties = Json::array();
        for (size_t p = 0; p < modelItems[i].properties.size(); ++p) {
            if (items[i].values[p] == modelItems[i].properties[p].value) continue;
            properties.push_back({{"tag", json::ToUtf8(TagText(modelItems[i].properties[p].tag))},
                                  {"value", json::WriteValue(items[i].values[p])}});
        }
        if (properties.empty() && items[i].alias == modelItems[i].alias) continue;
        saved.push_back({{"uri", json::ToUtf8(modelItems[i].uri)},
                         {"alias", json::ToUtf8(items[i].alias)},
                         {"properties", std::move(properties)}});
    }
    std::string text = Json{{"format", kStateFormat}, {"items", std::move(saved)}}.dump(2);
    text.push_back('\n');

    int32_t fault = model_->Fault(L"SaveState");
    std::lock_guard<std::mutex> saving(saveLock);
    std::string directory = DirectoryOf(path_);
    std::string temporary = directory + "/.device.state.json.XXXXXX";
    int fd = ::mkstemp(temporary.data());
    if (fd < 0) return fnd::kStatusFail;
    if (fnd::Failed(fault)) {
        // The model asks for a crash in the middle of the write: half the
        // file stays behind under its temporary name, the state file is untouched.
        WriteAll(fd, text.data(), text.size() / 2);
        ::close(fd);
        return fault;
    }
    bool written = WriteAll(fd, text.data(), text.size()) && ::fsync(fd) == 0;
    written = ::close(fd) == 0 && written;
    if (!written || ::rename(temporary.c_str(), path_.c_str()) != 0) {
        ::unlink(temporary.c_str());
        return fnd::kStatusFail;
    }
    // The rename itself reaches the disk only with the directory.
    int dir = ::open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (dir >= 0) {
        ::fsync(dir);
        ::close(dir);
    }
    return fnd::kStatusOk;
}

}  // namespace qel::sim
