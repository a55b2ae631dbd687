// The test host: a temporary shared data directory and the plug-in loaded
// from its build path.
#include "PluginHost.h"

#include <dlfcn.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <stdexcept>

namespace qel::testing {

namespace fs = std::filesystem;

namespace {

const char* VariantPath(RuntimeVariant variant) {
    switch (variant) {
        case RuntimeVariant::kAll: return QEL_RUNTIME_VARIANT_ALL;
        case RuntimeVariant::kNone: return QEL_RUNTIME_VARIANT_NONE;
        case RuntimeVariant::kEncryptKeyOnly: return QEL_RUNTIME_VARIANT_ENCRYPT_KEY_ONLY;
        case RuntimeVariant::kNoMime: return QEL_RUNTIME_VARIANT_NO_MIME;
        case RuntimeVariant::kMissing: break;
    }
    return nullptr;
}

template <typename Fn>
Fn Symbol(void* handle, const char* name) {
    void* address = dlsym(handle, name);
    if (!address) throw std::runtime_error(std::string("plug-in lacks ") + name);
    return reinterpret_cast<Fn>(address);
}

}  // namespace

PluginHost::PluginHost(RuntimeVariant variant, std::string_view deviceModel) {
    char pattern[] = "/tmp/qelsysapi-host-XXXXXX";
    if (!mkdtemp(pattern)) throw std::runtime_error("mkdtemp failed");
    shareDir_ = pattern;
    setenv("QELSHAREDDIR", shareDir_.c_str(), 1);
    WriteFile("sim/device.json", deviceModel);
    fs::create_directories(shareDir_ + "/QelWebServer");
    if (const char* runtime = VariantPath(variant))
        fs::create_symlink(runtime, shareDir_ + "/QelWebServer/libwebhost_runtime.so");

    handle_ = dlopen(QEL_PLUGIN_PATH, RTLD_NOW | RTLD_LOCAL);
    if (!handle_) throw std::runtime_error(std::string("dlopen: ") + dlerror());
    init_ = Symbol<void (*)()>(handle_, "qelsysapiInit");
    run_ = Symbol<void (*)(webhost::RequestMapping*, void*)>(handle_, "qelsysapiRun");
    finalize_ = Symbol<void (*)()>(handle_, "qelsysapiFinalize");
    pause_ = Symbol<void (*)()>(handle_, "qelsysapiPause");
    resume_ = Symbol<void (*)()>(handle_, "qelsysapiResume");
    init_();
}

PluginHost::~PluginHost() {
    finalize_();
    dlclose(handle_);
    std::error_code ignored;
    fs::remove_all(shareDir_, ignored);
    unsetenv("QELSHAREDDIR");
}

void PluginHost::WriteFile(const std::string& relativePath, std::string_view content) const {
    fs::path path = fs::path(shareDir_) / relativePath;
    fs::create_directories(path.parent_path());
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    out.write(content.data(), static_cast<std::streamsize>(content.size()));
}

webhost::Request& PluginHost::Post(webhost::Request& request, std::string_view formData,
                                   std::string_view contentType) const {
    request.SetMethod("POST");
    request.SetVariable("CONTENT_TYPE", contentType);
    request.AddFormField("form_data", formData);
    return request;
}

std::string Utf16(std::string_view ascii) {
    std::string out;
    for (char c : ascii) {
        out.push_back(c);
        out.push_back('\0');
    }
    return out;
}

std::string Utf16Document(std::string_view hr, std::string_view body) {
    std::string text = "<?xml version='1.0' encoding='utf-16le'?><QelSysAPI_Results hr='";
    text.append(hr).append("' version='00010001'>").append(body).append("</QelSysAPI_Results>");
    return Utf16(text);
}

extern "C" int32_t qelsysSimLiveObjects();

int32_t LiveFrameworkObjects() { return qelsysSimLiveObjects(); }

}  // namespace qel::testing
