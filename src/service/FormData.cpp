// Form data: the URL decoder, the Base64 decoder and the three form shapes.
#include "service/FormData.h"

#include <cstdlib>
#include <cstring>
#include <memory>
#include <utility>

#include "foundation/IntegerText.h"
#include "foundation/Status.h"
#include "foundation/Utf.h"
#include "foundation/osdep/IConv.h"
#include "service/ModuleState.h"
#include "service/WebhostRuntime.h"

namespace qel::service {

using fnd::NString;
using fnd::WString;

namespace {

[[noreturn]] void Fail(int32_t status) { throw static_cast<long>(status); }

WString MakeWide(const NString& bytes, bool utf8) {
    // A decoded NUL ends the piece, as it would in a C buffer.
    NString::size_type end = bytes.Find('\0');
    const char* data = bytes.CStr();
    uint32_t count = end == NString::npos ? bytes.Length() : end;
    return utf8 ? fnd::Utf8ToWide(data, count) : fnd::osdep::IConv(data, count, "");
}

enum class Shape { kNone, kFormData, kEncrypted };

Shape ShapeOfKey(const WString& key) {
    if (key.Find(WString(L"form_data")) == 0) return Shape::kFormData;
    if (key.Find(WString(L"encrypted_data")) == 0) return Shape::kEncrypted;
    return Shape::kNone;
}

int Base64Value(unsigned char c) {
    if (c >= 'A' && c <= 'Z') return c - 'A';
    if (c >= 'a' && c <= 'z') return c - 'a' + 26;
    if (c >= '0' && c <= '9') return c - '0' + 52;
    if (c == '+' || c == '-') return 62;
    if (c == '/' || c == '_') return 63;
    return -1;
}

void RecordFirstUpload(void* request, api::ArgumentMap& args) {
    webhost::UploadedFilesList* list = nullptr;
    int32_t rc = ReadUploadedFilesList_C_REST_QEL_QLWS_(request, &list);
    std::unique_ptr<webhost::UploadedFilesList> owned(list);  // ours whatever the result
    if (rc != 0 || !owned) return;
    if (const webhost::UploadedFile* file = owned->GetFirst()) {
        args[WString(L"FormAttachedClientFilename")] = file->clientFileName;
        args[WString(L"FormAttachedLocalFilename")] = file->localFileName;
    }
}

}  // namespace

void FormResources::Release() noexcept {
    if (released_) return;
    released_ = true;
    delete std::exchange(list, nullptr);
    decoded.clear();
    decoded.shrink_to_fit();
    std::free(std::exchange(key, nullptr));
    std::free(std::exchange(decryptedText, nullptr));
    if (auto freeList = EntryPoints().freeKeyValuePairWithMimeList) freeList(std::exchange(mimeList, nullptr));
}

void UrlDecode(const char* text, bool utf8, api::ArgumentMap& args) {
    NString key;
    NString value;
    bool inValue = false;
    for (const char* p = text; *p;) {
        NString& current = inValue ? value : key;
        char c = *p;
        if (c == '%') {
            // Two hexadecimal digits; an escape cut short by the end of the
            // text is read from what is there, never beyond it.
            uint32_t available = p[1] == '\0' ? 0 : (p[2] == '\0' ? 1 : 2);
            wchar_t digits[3] = {};
            for (uint32_t i = 0; i < available; ++i) digits[i] = static_cast<unsigned char>(p[1 + i]);
            uint32_t byte = fnd::StringToInteger<uint32_t>(WString(digits, available), 16);
            current.PushBack(static_cast<char>(byte & 0xFF));
            p += 1 + available;
            continue;
        }
        if (c == '+') {
            current.PushBack(' ');
        } else if (c == '=' && !inValue) {
            inValue = true;
        } else if (c == '&' && inValue) {
            args[MakeWide(key, utf8)] = MakeWide(value, utf8);
            key.Clear();
            value.Clear();
            inValue = false;
        } else {
            current.PushBack(c);
        }
        ++p;
    }
}

bool Base64Decode(const NString& text, std::vector<uint8_t>& out) {
    uint32_t n = text.Length();
    if (n == 0 || n % 4 != 0) return false;
    uint64_t length = static_cast<uint64_t>(n) / 4 * 3;
    if (text[n - 1] == '=') length -= text[n - 2] == '=' ? 2 : 1;
    else if (text[n - 2] == '=') return false;
    out.assign(static_cast<size_t>(length), 0);

    size_t written = 0;
    for (uint32_t i = 0; i + 4 <= n; i += 4) {
        unsigned char c0 = text[i], c1 = text[i + 1], c2 = text[i + 2], c3 = text[i + 3];
        int a = Base64Value(c0), b = Base64Value(c1), c = Base64Value(c2), d = Base64Value(c3);
        if (a < 0 || b < 0) break;
        if (c2 == '=' && c3 != '=') break;
        if ((c < 0 && c2 != '=') || (d < 0 && c3 != '=')) break;
        auto put = [&](int byte) {
            if (written < out.size()) out[written++] = static_cast<uint8_t>(byte & 0xFF);
        };
        put((a << 2) | (b >> 4));
        if (c2 != '=') put((b << 4) | (c >> 2));
        if (c3 != '=') put((c << 6) | d);
    }
    return true;
}

void BuildArgumentMap(void* request, bool utf8, api::ArgumentMap& args, FormResources& resources) {
    const OptionalEntryPoints& rt = EntryPoints();
    const bool itemFunctions = rt.keyValueWithMimeGetFirst && rt.keyValueWithMimeGetNext &&
                               rt.keyValueWithMimeGetKey && rt.keyValueWithMimeGetValue;
    const bool runtimePath = rt.readAllFormDataWithMime != nullptr;

    Shape shape = Shape::kNone;
    NString formText;
    if (runtimePath) {
        if (rt.readAllFormDataWithMime(request, &resources.mimeList) != 0) Fail(fnd::kStatusFail);
        if (itemFunctions) {
            void* item = nullptr;
            for (int32_t rc = rt.keyValueWithMimeGetFirst(resources.mimeList, &item); rc == 0 && item;
                 rc = rt.keyValueWithMimeGetNext(resources.mimeList, item, &item)) {
                const char* key = nullptr;
                rt.keyValueWithMimeGetKey(item, &key);
                shape = ShapeOfKey(fnd::osdep::Widen(NString(key)));
                if (shape != Shape::kNone) {
                    const char* value = nullptr;
                    rt.keyValueWithMimeGetValue(item, &value);
                    formText = NString(value);
                    break;
                }
            }
        }
    } else {
        resources.list = new webhost::KeyValuePairList();
        if (ReadAllFormData_C_REST_QEL_QLWS_(request, resources.list) != 0) Fail(fnd::kStatusFail);
        for (webhost::KeyValuePair* pair = resources.list->GetFirst(); pair; pair = pair->next) {
            shape = ShapeOfKey(pair->key);
            if (shape != Shape::kNone) {
                formText = fnd::osdep::Narrow(pair->value);
                break;
            }
        }
    }

    switch (shape) {
        case Shape::kEncrypted: {
            if (!rt.getEncryptKey || !rt.decrypt) Fail(fnd::kStatusDecryptFailed);
            if (!Base64Decode(formText, resources.decoded)) Fail(fnd::kStatusOutOfMemory);
            uint32_t keyLength = 0;
            if (rt.getEncryptKey(request, &resources.key, &keyLength) != 0) Fail(fnd::kStatusFail);
            uint32_t textLength = 0;
            if (rt.decrypt(request, resources.key, keyLength, resources.decoded.data(),
                           static_cast<uint32_t>(resources.decoded.size()), &resources.decryptedText,
                           &textLength) != 0)
                Fail(fnd::kStatusFail);
            UrlDecode(resources.decryptedText ? resources.decryptedText : "", utf8, args);
            break;
        }
        case Shape::kFormData:
            UrlDecode(formText.CStr(), utf8, args);
            RecordFirstUpload(request, args);
            break;
        case Shape::kNone:
            if (runtimePath) {
                if (!itemFunctions) Fail(fnd::kStatusFail);
                void* item = nullptr;
                for (int32_t rc = rt.keyValueWithMimeGetFirst(resources.mimeList, &item); rc == 0 && item;
                     rc = rt.keyValueWithMimeGetNext(resources.mimeList, item, &item)) {
                    const char* key = nullptr;
                    const char* value = nullptr;
                    rt.keyValueWithMimeGetKey(item, &key);
                    rt.keyValueWithMimeGetValue(item, &value);
                    NString valueBytes(value);
                    args[fnd::osdep::Widen(NString(key))] =
                        utf8 ? fnd::Utf8ToWide(valueBytes) : fnd::osdep::Widen(valueBytes);
                }
            } else {
                for (webhost::KeyValuePair* pair = resources.list->GetFirst(); pair; pair = pair->next)
                    args[pair->key] = pair->value;
            }
            break;
    }
}

}  // namespace qel::service
