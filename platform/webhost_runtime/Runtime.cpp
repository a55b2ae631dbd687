// The web server runtime's entry points and list classes, serving the
// plug-in from a Request object.
//
// The same source builds the runtime proper and its variants; each optional
// entry point family is compiled only when its switch below is 1, so that a
// variant lacks the symbol itself and not just its behaviour.
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <new>
#include <optional>
#include <string>
#include <vector>

#include "Crypto.h"
#include "Request.h"
#include "foundation/Exception.h"
#include "foundation/Status.h"
#include "foundation/Utf.h"
#include "foundation/osdep/IConv.h"
#include "service/WebhostRuntime.h"

#ifndef QEL_RUNTIME_ENCRYPT_KEY
#define QEL_RUNTIME_ENCRYPT_KEY 1
#endif
#ifndef QEL_RUNTIME_DECRYPT
#define QEL_RUNTIME_DECRYPT 1
#endif
#ifndef QEL_RUNTIME_FORM_WITH_MIME
#define QEL_RUNTIME_FORM_WITH_MIME 1
#endif

namespace qel::webhost {

namespace {

using fnd::NString;
using fnd::Status;

constexpr int32_t kOk = fnd::kStatusOk;
constexpr int32_t kInvalidArg = fnd::kStatusInvalidArg;
constexpr int32_t kFailed = fnd::kStatusFail;
constexpr int32_t kOutOfMemory = fnd::kStatusOutOfMemory;
// The host's own conditions, in the same HRESULT convention as the plug-in's
// statuses (Win32 codes in facility 7).
constexpr int32_t kBufferTooSmall = Status(0x8007007Au);
constexpr int32_t kNotFound = Status(0x80070490u);
constexpr int32_t kNoMoreItems = Status(0x80070103u);
constexpr int32_t kUndecryptable = Status(0x8007000Du);

// No exception may reach the plug-in, which is C code as far as the runtime
// knows.
template <typename Body>
int32_t Guarded(Body&& body) noexcept {
    try {
        return body();
    } catch (const std::bad_alloc&) {
        return kOutOfMemory;
    } catch (...) {
        return kFailed;
    }
}

Request* AsRequest(void* handle) noexcept { return static_cast<Request*>(handle); }

// Form texts should be UTF-8, but old clients send their own code set; those
// bytes are taken as the process code set rather than refused.
WString DecodeFormText(const std::string& bytes) {
    if (bytes.size() > NString::kMaxLength) throw std::bad_alloc();
    auto count = static_cast<uint32_t>(bytes.size());
    try {
        return fnd::Utf8ToWide(bytes.data(), count);
    } catch (const fnd::exception::InvalidSequence&) {
        return fnd::osdep::Widen(NString(bytes.data(), count));
    }
}

// Local paths go back to the file system through the process code set.
WString DecodeLocalPath(const std::string& bytes) {
    if (bytes.size() > NString::kMaxLength) throw std::bad_alloc();
    return fnd::osdep::Widen(NString(bytes.data(), static_cast<uint32_t>(bytes.size())));
}

#if QEL_RUNTIME_FORM_WITH_MIME
// The list behind a "WithMime" handle: a snapshot of the fields, whose texts
// the plug-in reads in place until it frees the list.
struct MimeItem {
    std::string key;
    std::string value;
};

struct MimeFormList {
    Request* request;
    std::vector<MimeItem> items;
};

MimeFormList* AsMimeList(void* handle) noexcept { return static_cast<MimeFormList*>(handle); }
#endif

}  // namespace

// The host subclasses the mapping; its vtable lives with the runtime.
RequestMapping::~RequestMapping() = default;

KeyValuePairList::KeyValuePairList() = default;

KeyValuePairList::~KeyValuePairList() {
    // Iterative, so that a long form does not recurse once per field.
    for (KeyValuePair* pair = first_; pair;) {
        KeyValuePair* next = pair->next;
        delete pair;
        pair = next;
    }
}

KeyValuePair* KeyValuePairList::GetFirst() const { return first_; }

KeyValuePair* KeyValuePairList::GetNext(KeyValuePair* pair) const { return pair ? pair->next : nullptr; }

void KeyValuePairList::Add(const WString& key, const WString& value) {
    auto* pair = new KeyValuePair{key, value, nullptr};
    if (last_) {
        last_->next = pair;
    } else {
        first_ = pair;
    }
    last_ = pair;
}

UploadedFilesList::UploadedFilesList() = default;

UploadedFilesList::~UploadedFilesList() {
    for (UploadedFile* file = first_; file;) {
        UploadedFile* next = file->next;
        delete file;
        file = next;
    }
}

UploadedFile* UploadedFilesList::GetFirst() const { return first_; }

void UploadedFilesList::Add(const WString& localFileName, const WString& clientFileName) {
    auto* file = new UploadedFile{localFileName, clientFileName, nullptr};
    if (last_) {
        last_->next = file;
    } else {
        first_ = file;
    }
    last_ = file;
}

}  // namespace qel::webhost

using qel::webhost::AsRequest;
using qel::webhost::Guarded;
using qel::webhost::kBufferTooSmall;
using qel::webhost::kFailed;
using qel::webhost::kInvalidArg;
using qel::webhost::kNoMoreItems;
using qel::webhost::kNotFound;
using qel::webhost::kOk;
using qel::webhost::kOutOfMemory;
using qel::webhost::KeyValuePairList;
using qel::webhost::Request;
using qel::webhost::UploadedFilesList;

extern "C" {

int32_t ReadRequestVariable_C_REST_QEL_QLWS_(void* request, const char* name, char* buffer, uint32_t* size) {
    return Guarded([&]() -> int32_t {
        if (!size) return kInvalidArg;
        const uint32_t offered = *size;
        // Whatever fails below, the caller may still read the buffer's text.
        if (buffer && offered) buffer[0] = '\0';
        if (!request || !name || (!buffer && offered)) {
            *size = 0;
            return kInvalidArg;
        }
        Request& req = *AsRequest(request);
        ++req.Calls().readRequestVariable;

        const std::string* value = req.Fail().readRequestVariable ? nullptr : req.FindVariable(name);
        if (!value) {
            *size = 0;
            return kNotFound;
        }
        if (value->size() >= UINT32_MAX) return kFailed;
        const auto needed = static_cast<uint32_t>(value->size() + 1);
        *size = needed;
        if (needed > offered) return kBufferTooSmall;
        std::memcpy(buffer, value->data(), value->size());
        buffer[value->size()] = '\0';
        return kOk;
    });
}

int32_t SetHTTPResponseMimeType_C_REST_QEL_QLWS_(void* request, const char* mimeType) {
    return Guarded([&]() -> int32_t {
        if (!request || !mimeType) return kInvalidArg;
        Request& req = *AsRequest(request);
        ++req.Calls().setResponseMimeType;
        req.SetResponseMimeType(mimeType);
        return kOk;
    });
}

int32_t WriteOutput_C_REST_QEL_QLWS_(void* request, const void* bytes, uint32_t count) {
    return Guarded([&]() -> int32_t {
        if (!request || (!bytes && count)) return kInvalidArg;
        Request& req = *AsRequest(request);
        ++req.Calls().writeOutput;
        req.AppendOutput(bytes, count);
        return kOk;
    });
}

int32_t ReadAllFormData_C_REST_QEL_QLWS_(void* request, KeyValuePairList* list) {
    return Guarded([&]() -> int32_t {
        if (!request || !list) return kInvalidArg;
        Request& req = *AsRequest(request);
        ++req.Calls().readAllFormData;
        if (req.Fail().readAllFormData) return kFailed;
        for (const Request::FormField& field : req.FormFields()) {
            list->Add(qel::webhost::DecodeFormText(field.key), qel::webhost::DecodeFormText(field.value));
        }
        return kOk;
    });
}

int32_t ReadUploadedFilesList_C_REST_QEL_QLWS_(void* request, UploadedFilesList** list) {
    return Guarded([&]() -> int32_t {
        // A list already there is the caller's; overwriting it would leak it.
        if (!request || !list || *list) return kInvalidArg;
        Request& req = *AsRequest(request);
        ++req.Calls().readUploadedFilesList;
        const Request::Failures& fail = req.Fail();
        if (fail.readUploadedFilesList && !fail.leaveUploadedFilesListOnFailure) return kFailed;

        // Even without files the caller gets a list: it must delete one anyway.
        auto files = std::make_unique<UploadedFilesList>();
        for (const Request::UploadedFile& file : req.UploadedFiles()) {
            files->Add(qel::webhost::DecodeLocalPath(file.localPath), qel::webhost::DecodeFormText(file.clientName));
        }
        *list = files.release();
        return fail.readUploadedFilesList ? kFailed : kOk;
    });
}

#if QEL_RUNTIME_ENCRYPT_KEY
int32_t GetEncryptKey_C_REST_QEL_QLWS_(void* request, uint8_t** key, uint32_t* keyLength) {
    return Guarded([&]() -> int32_t {
        if (key) *key = nullptr;
        if (keyLength) *keyLength = 0;
        if (!request || !key || !keyLength) return kInvalidArg;
        Request& req = *AsRequest(request);
        ++req.Calls().getEncryptKey;
        if (!req.Key()) return kNotFound;
        auto* copy = static_cast<uint8_t*>(std::malloc(qel::webhost::kEncryptKeyLength));
        if (!copy) return kOutOfMemory;
        std::memcpy(copy, req.Key()->data(), qel::webhost::kEncryptKeyLength);
        *key = copy;
        *keyLength = qel::webhost::kEncryptKeyLength;
        return kOk;
    });
}
#endif

#if QEL_RUNTIME_DECRYPT
int32_t Decrypt_C_REST_QEL_QLWS_(void* request, const uint8_t* key, uint32_t keyLength, const uint8_t* cipher,
                                 uint32_t cipherLength, char** text, uint32_t* textLength) {
    return Guarded([&]() -> int32_t {
        if (text) *text = nullptr;
        if (textLength) *textLength = 0;
        if (!request || !text || !textLength || (!key && keyLength) || (!cipher && cipherLength))
            return kInvalidArg;
        Request& req = *AsRequest(request);
        ++req.Calls().decrypt;
        if (keyLength != qel::webhost::kEncryptKeyLength) return kInvalidArg;

        std::optional<std::string> plain =
            qel::webhost::DecryptFromRequest({key, keyLength}, {cipher, cipherLength});
        if (!plain) return qel::webhost::kUndecryptable;
        // Shorter than the cipher, so it fits 32 bits.
        auto* copy = static_cast<char*>(std::malloc(plain->size() + 1));
        if (!copy) return kOutOfMemory;
        std::memcpy(copy, plain->data(), plain->size());
        copy[plain->size()] = '\0';
        *text = copy;
        *textLength = static_cast<uint32_t>(plain->size());
        return kOk;
    });
}
#endif

#if QEL_RUNTIME_FORM_WITH_MIME
int32_t ReadAllFormDataWithMime_C_REST_QEL_QLWS_(void* request, void** list) {
    return Guarded([&]() -> int32_t {
        if (list) *list = nullptr;
        if (!request || !list) return kInvalidArg;
        Request& req = *AsRequest(request);
        ++req.Calls().readAllFormDataWithMime;
        if (req.Fail().readAllFormDataWithMime) return kFailed;

        auto fields = std::make_unique<qel::webhost::MimeFormList>();
        fields->request = &req;
        fields->items.reserve(req.FormFields().size());
        for (const Request::FormField& field : req.FormFields()) fields->items.push_back({field.key, field.value});
        ++req.Calls().mimeListsHandedOut;
        *list = fields.release();
        return kOk;
    });
}

// Iteration ends with both signals at once (a failure status and a null
// item), so a caller that checks only one of them still stops.
int32_t KeyValueWithMimeGetFirst_C_REST_QEL_QLWS_(void* list, void** item) {
    return Guarded([&]() -> int32_t {
        if (item) *item = nullptr;
        if (!list || !item) return kInvalidArg;
        auto& items = qel::webhost::AsMimeList(list)->items;
        if (items.empty()) return kNoMoreItems;
        *item = &items.front();
        return kOk;
    });
}

int32_t KeyValueWithMimeGetNext_C_REST_QEL_QLWS_(void* list, void* item, void** next) {
    return Guarded([&]() -> int32_t {
        if (next) *next = nullptr;
        if (!list || !item || !next) return kInvalidArg;
        auto& items = qel::webhost::AsMimeList(list)->items;
        // Compared as addresses: an item of another list is refused, not
        // turned into an index out of range.
        auto at = reinterpret_cast<uintptr_t>(item);
        auto first = reinterpret_cast<uintptr_t>(items.data());
        auto end = reinterpret_cast<uintptr_t>(items.data() + items.size());
        if (at < first || at >= end || (at - first) % sizeof(qel::webhost::MimeItem) != 0) return kInvalidArg;
        size_t index = (at - first) / sizeof(qel::webhost::MimeItem) + 1;
        if (index == items.size()) return kNoMoreItems;
        *next = &items[index];
        return kOk;
    });
}

// Callers use the text without looking at the result, so a failure still
// leaves a valid empty text.
int32_t KeyValueWithMimeGetKey_C_REST_QEL_QLWS_(void* item, const char** key) {
    return Guarded([&]() -> int32_t {
        if (!key) return kInvalidArg;
        *key = "";
        if (!item) return kInvalidArg;
        *key = static_cast<qel::webhost::MimeItem*>(item)->key.c_str();
        return kOk;
    });
}

int32_t KeyValueWithMimeGetValue_C_REST_QEL_QLWS_(void* item, const char** value) {
    return Guarded([&]() -> int32_t {
        if (!value) return kInvalidArg;
        *value = "";
        if (!item) return kInvalidArg;
        *value = static_cast<qel::webhost::MimeItem*>(item)->value.c_str();
        return kOk;
    });
}

int32_t FreeKeyValuePairWithMimeList_C_REST_QEL_QLWS_(void* list) {
    return Guarded([&]() -> int32_t {
        // Callers free at the end of every request, also when none was read.
        if (!list) return kOk;
        std::unique_ptr<qel::webhost::MimeFormList> fields(qel::webhost::AsMimeList(list));
        ++fields->request->Calls().mimeListsFreed;
        return kOk;
    });
}
#endif

}  // extern "C"
