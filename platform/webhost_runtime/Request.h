// One HTTP request as the web server runtime stand-in serves it to the
// plug-in: what the host received, what the plug-in answered, and which
// runtime entry points it called.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "Crypto.h"

namespace qel::webhost {

/// The object a request handle points to. A host fills in the input side,
/// hands the address to qelsysapiRun as the request handle and reads the
/// output side afterwards. A request is served on one thread at a time and is
/// not synchronised. Texts are bytes as they came off the wire; the runtime
/// decides how to widen them for the plug-in.
///
/// Lists the runtime hands out for a request point back to it, so the request
/// must outlive them.
class Request {
public:
    /// One form field, in the order the client sent it.
    struct FormField {
        std::string key;
        std::string value;
    };

    /// One uploaded file: where the host stored it (a path in the process code
    /// set) and the name the client gave it (UTF-8 from a well-behaved client).
    struct UploadedFile {
        std::string localPath;
        std::string clientName;
    };

    /// How often each entry point was called for this request; hosts check
    /// that the response was set and written exactly once, and that form data
    /// was or was not read. The lists of the "WithMime" family are counted as
    /// handed out and as freed, so a host can see that none was leaked.
    struct CallCounts {
        uint32_t readRequestVariable = 0;
        uint32_t setResponseMimeType = 0;
        uint32_t writeOutput = 0;
        uint32_t readAllFormData = 0;
        uint32_t readAllFormDataWithMime = 0;
        uint32_t readUploadedFilesList = 0;
        uint32_t getEncryptKey = 0;
        uint32_t decrypt = 0;
        uint32_t mimeListsHandedOut = 0;
        uint32_t mimeListsFreed = 0;
    };

    /// Entry points that refuse this request, as a runtime does when the
    /// connection broke or the body could not be parsed.
    struct Failures {
        /// Every variable then reads as unknown.
        bool readRequestVariable = false;
        bool readAllFormData = false;
        bool readAllFormDataWithMime = false;
        bool readUploadedFilesList = false;
        /// With readUploadedFilesList: the failing call still leaves a filled
        /// list, which the caller must delete without using it.
        bool leaveUploadedFilesListOnFailure = false;
    };

    /// A request with "REQUEST_METHOD" set to `method`.
    explicit Request(std::string_view method = "GET");

    // --- input --------------------------------------------------------------

    /// Sets the variable "REQUEST_METHOD".
    void SetMethod(std::string_view method);
    /// "REQUEST_METHOD", or empty when it was removed.
    std::string Method() const;

    /// Variables hold the server's ("REQUEST_METHOD", "CONTENT_TYPE") and the
    /// query's arguments alike. Names match exactly, case included.
    void SetVariable(std::string_view name, std::string_view value);
    void RemoveVariable(std::string_view name);
    /// Null when the request has no such variable.
    const std::string* FindVariable(std::string_view name) const;

    void AddFormField(std::string_view key, std::string_view value);
    const std::vector<FormField>& FormFields() const noexcept { return formFields_; }

    void AddUploadedFile(std::string_view localPath, std::string_view clientName);
    const std::vector<UploadedFile>& UploadedFiles() const noexcept { return uploadedFiles_; }

    /// The key of this client's session, if it has one.
    void SetEncryptKey(const EncryptKey& key) { key_ = key; }
    void ClearEncryptKey() noexcept { key_.reset(); }
    const std::optional<EncryptKey>& Key() const noexcept { return key_; }

    // --- output -------------------------------------------------------------

    /// Replaces the mime type; the count of calls is kept in Calls().
    void SetResponseMimeType(std::string_view mimeType);
    const std::string& ResponseMimeType() const noexcept { return mimeType_; }
    /// Appends bytes of the body.
    void AppendOutput(const void* bytes, size_t count);
    const std::string& Output() const noexcept { return output_; }

    // --- bookkeeping --------------------------------------------------------

    CallCounts& Calls() noexcept { return calls_; }
    const CallCounts& Calls() const noexcept { return calls_; }
    Failures& Fail() noexcept { return failures_; }
    const Failures& Fail() const noexcept { return failures_; }

private:
    std::map<std::string, std::string, std::less<>> variables_;
    std::vector<FormField> formFields_;
    std::vector<UploadedFile> uploadedFiles_;
    std::optional<EncryptKey> key_;
    std::string mimeType_;
    std::string output_;
    CallCounts calls_;
    Failures failures_;
};

}  // namespace qel::webhost
