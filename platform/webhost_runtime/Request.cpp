// The request object behind a runtime request handle.
#include "Request.h"

namespace qel::webhost {

namespace {
constexpr std::string_view kMethodVariable = "REQUEST_METHOD";
}  // namespace

Request::Request(std::string_view method) { SetMethod(method); }

void Request::SetMethod(std::string_view method) { SetVariable(kMethodVariable, method); }

std::string Request::Method() const {
    const std::string* method = FindVariable(kMethodVariable);
    return method ? *method : std::string();
}

void Request::SetVariable(std::string_view name, std::string_view value) {
    auto found = variables_.find(name);
    if (found != variables_.end()) {
        found->second.assign(value);
    } else {
        variables_.emplace(std::string(name), std::string(value));
    }
}

void Request::RemoveVariable(std::string_view name) {
    auto found = variables_.find(name);
    if (found != variables_.end()) variables_.erase(found);
}

const std::string* Request::FindVariable(std::string_view name) const {
    auto found = variables_.find(name);
    return found != variables_.end() ? &found->second : nullptr;
}

void Request::AddFormField(std::string_view key, std::string_view value) {
    formFields_.push_back({std::string(key), std::string(value)});
}

void Request::AddUploadedFile(std::string_view localPath, std::string_view clientName) {
    uploadedFiles_.push_back({std::string(localPath), std::string(clientName)});
}

void Request::SetResponseMimeType(std::string_view mimeType) { mimeType_.assign(mimeType); }

void Request::AppendOutput(const void* bytes, size_t count) {
    if (count) output_.append(static_cast<const char*>(bytes), count);
}

}  // namespace qel::webhost
