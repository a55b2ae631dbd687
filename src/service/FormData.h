// Turning an API request's form data into its argument map.
#pragma once

#include <cstdint>
#include <vector>

#include "api/ArgumentMap.h"
#include "foundation/StringBase.h"

namespace qel::webhost {
class KeyValuePairList;
}

namespace qel::service {

/// What reading the form borrowed from the runtime; released when the
/// request ends, in the runtime's expected order.
class FormResources {
public:
    FormResources() = default;
    ~FormResources() { Release(); }
    FormResources(const FormResources&) = delete;
    FormResources& operator=(const FormResources&) = delete;

    /// Gives everything back; the first call does the work. The runtime's
    /// list-freeing entry point is called once per request when it exists,
    /// with null when no list was read.
    void Release() noexcept;

    webhost::KeyValuePairList* list = nullptr;
    std::vector<uint8_t> decoded;
    uint8_t* key = nullptr;
    char* decryptedText = nullptr;
    void* mimeList = nullptr;

private:
    bool released_ = false;
};

/// Decodes URL-encoded pairs ("a=1&b=2&") into `args`. A pair is stored only
/// when an "&" ends it. Keys and values are UTF-8 when `utf8`, else in the
/// process code set; invalid UTF-8 throws exception::InvalidSequence.
/// Keys and values of any length are accepted.
void UrlDecode(const char* text, bool utf8, api::ArgumentMap& args);

/// Decodes Base64 (also with "-" and "_" for 62 and 63). A text that is
/// empty, not a multiple of four long, or has "=" before its last character
/// cannot be sized and gives false. Decoding stops at the first bad group;
/// the bytes not decoded stay zero.
bool Base64Decode(const fnd::NString& text, std::vector<uint8_t>& out);

/// Builds the argument map of an API request from the runtime's form data:
/// "form_data" (URL-encoded, with the first uploaded file), "encrypted_data"
/// (Base64 of the runtime-encrypted form), or plain fields. Failures are
/// statuses thrown as a `long`.
void BuildArgumentMap(void* request, bool utf8, api::ArgumentMap& args, FormResources& resources);

}  // namespace qel::service
