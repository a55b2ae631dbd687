// A test host: loads the built plug-in with dlopen over a temporary shared
// data directory and drives its entry points as the web server does.
#pragma once

#include <string>
#include <string_view>

#include "service/WebhostRuntime.h"
#include "webhost_runtime/Request.h"

namespace qel::testing {

/// The mapping object the host hands to qelsysapiRun.
class Mapping : public webhost::RequestMapping {
public:
    explicit Mapping(const wchar_t* name) : path_(L"/qelsysapi/"), name_(name) { path_.Append(name_); }
    const fnd::WString& MappingPath() const override { return path_; }
    const fnd::WString& MappingName() const override { return name_; }

private:
    fnd::WString path_;
    fnd::WString name_;
};

/// Which runtime library the shared data directory offers the plug-in under
/// "QelWebServer/libwebhost_runtime.so".
enum class RuntimeVariant { kMissing, kAll, kNone, kEncryptKeyOnly, kNoMime };

/// A fresh shared data directory (QELSHAREDDIR points at it) with a device
/// model and a runtime variant, and the plug-in loaded and initialised.
class PluginHost {
public:
    explicit PluginHost(RuntimeVariant variant = RuntimeVariant::kAll,
                        std::string_view deviceModel = R"({"experts": []})");
    ~PluginHost();
    PluginHost(const PluginHost&) = delete;
    PluginHost& operator=(const PluginHost&) = delete;

    const std::string& ShareDir() const { return shareDir_; }
    /// Writes a file under the shared data directory (parents created).
    void WriteFile(const std::string& relativePath, std::string_view content) const;

    void Init() const { init_(); }
    void Run(const webhost::RequestMapping& mapping, webhost::Request& request) const {
        run_(const_cast<webhost::RequestMapping*>(&mapping), &request);
    }
    void Finalize() const { finalize_(); }
    void Pause() const { pause_(); }
    void Resume() const { resume_(); }

    /// An API request as a client sends one: POST with one "form_data" field.
    webhost::Request& Post(webhost::Request& request, std::string_view formData,
                           std::string_view contentType = "application/x-www-form-urlencoded") const;

private:
    std::string shareDir_;
    void* handle_ = nullptr;
    void (*init_)() = nullptr;
    void (*run_)(webhost::RequestMapping*, void*) = nullptr;
    void (*finalize_)() = nullptr;
    void (*pause_)() = nullptr;
    void (*resume_)() = nullptr;
};

/// The bytes of an ASCII text in UTF-16LE, as the plug-in answers by default.
std::string Utf16(std::string_view ascii);

/// The whole default-encoded result document around `body`.
std::string Utf16Document(std::string_view hr, std::string_view body = "");

/// Number of framework objects alive in the simulated device.
int32_t LiveFrameworkObjects();

}  // namespace qel::testing
