// The contract with the web server: its runtime library
// (libwebhost_runtime.so.12), the objects it hands over, and the plug-in's
// five exported entry points. The plug-in, the runtime stand-in and the dev
// host are all built against this one header.
#pragma once

#include <cstdint>

#include "foundation/StringBase.h"

#ifndef QEL_EXPORT
#define QEL_EXPORT __attribute__((visibility("default")))
#endif

namespace qel::webhost {

using fnd::WString;

/// The host's object for the web-service mapping that received a request.
/// The plug-in only calls MappingName, the fourth virtual operation (the
/// destructor takes the first two).
class QEL_EXPORT RequestMapping {
public:
    virtual ~RequestMapping();
    virtual const WString& MappingPath() const = 0;
    virtual const WString& MappingName() const = 0;
};

/// One form field, read in place by the plug-in.
struct KeyValuePair {
    WString key;
    WString value;
    KeyValuePair* next = nullptr;
};

/// Form fields in the order the client sent them. Created and deleted by the
/// caller, filled by ReadAllFormData_C_REST_QEL_QLWS_.
class QEL_EXPORT KeyValuePairList {
public:
    KeyValuePairList();
    ~KeyValuePairList();
    KeyValuePairList(const KeyValuePairList&) = delete;
    KeyValuePairList& operator=(const KeyValuePairList&) = delete;

    KeyValuePair* GetFirst() const;
    KeyValuePair* GetNext(KeyValuePair* pair) const;
    /// Appends a copy of the pair at the end (used by the runtime).
    void Add(const WString& key, const WString& value);

private:
    KeyValuePair* first_ = nullptr;
    KeyValuePair* last_ = nullptr;
};

/// An uploaded file: where the web server stored it, and the client's name.
struct UploadedFile {
    WString localFileName;
    WString clientFileName;
    UploadedFile* next = nullptr;
};

/// Handed out by ReadUploadedFilesList_C_REST_QEL_QLWS_; the receiver deletes
/// it, whatever the call returned.
class QEL_EXPORT UploadedFilesList {
public:
    UploadedFilesList();
    ~UploadedFilesList();
    UploadedFilesList(const UploadedFilesList&) = delete;
    UploadedFilesList& operator=(const UploadedFilesList&) = delete;

    UploadedFile* GetFirst() const;
    void Add(const WString& localFileName, const WString& clientFileName);

private:
    UploadedFile* first_ = nullptr;
    UploadedFile* last_ = nullptr;
};

}  // namespace qel::webhost

extern "C" {

// --- required entry points of the runtime: 0 is success -------------------

/// The caller offers `*size` bytes. 0: `buffer` holds the terminated value.
/// Non-zero with `*size` > 0: `*size` is the length needed (with the NUL).
/// Non-zero with `*size` == 0: `buffer` still holds a terminated text.
QEL_EXPORT int32_t ReadRequestVariable_C_REST_QEL_QLWS_(void* request, const char* name, char* buffer,
                                                             uint32_t* size);
QEL_EXPORT int32_t SetHTTPResponseMimeType_C_REST_QEL_QLWS_(void* request, const char* mimeType);
QEL_EXPORT int32_t WriteOutput_C_REST_QEL_QLWS_(void* request, const void* bytes, uint32_t count);
QEL_EXPORT int32_t ReadAllFormData_C_REST_QEL_QLWS_(void* request, qel::webhost::KeyValuePairList* list);
/// `*list` must be null on entry; a non-null list left there is the caller's.
QEL_EXPORT int32_t ReadUploadedFilesList_C_REST_QEL_QLWS_(void* request,
                                                               qel::webhost::UploadedFilesList** list);

// --- optional entry points, looked up by name: a runtime may lack any -------

/// The key is allocated with malloc; the caller frees it.
QEL_EXPORT int32_t GetEncryptKey_C_REST_QEL_QLWS_(void* request, uint8_t** key, uint32_t* keyLength);
/// `cipher` is a 16-byte initialisation vector followed by AES-256-CBC
/// ciphertext with PKCS#7 padding. `*text` is NUL-terminated, allocated with
/// malloc; the caller frees it.
QEL_EXPORT int32_t Decrypt_C_REST_QEL_QLWS_(void* request, const uint8_t* key, uint32_t keyLength, const uint8_t* cipher,
                                 uint32_t cipherLength, char** text, uint32_t* textLength);
QEL_EXPORT int32_t ReadAllFormDataWithMime_C_REST_QEL_QLWS_(void* request, void** list);
QEL_EXPORT int32_t KeyValueWithMimeGetFirst_C_REST_QEL_QLWS_(void* list, void** item);
QEL_EXPORT int32_t KeyValueWithMimeGetNext_C_REST_QEL_QLWS_(void* list, void* item, void** next);
/// The texts stay owned by the list.
QEL_EXPORT int32_t KeyValueWithMimeGetKey_C_REST_QEL_QLWS_(void* item, const char** key);
QEL_EXPORT int32_t KeyValueWithMimeGetValue_C_REST_QEL_QLWS_(void* item, const char** value);
QEL_EXPORT int32_t FreeKeyValuePairWithMimeList_C_REST_QEL_QLWS_(void* list);

// --- the plug-in's five exported entry points -------------------------------
QEL_EXPORT void qelsysapiInit();
QEL_EXPORT void qelsysapiRun(qel::webhost::RequestMapping* mapping, void* request);
QEL_EXPORT void qelsysapiFinalize();
QEL_EXPORT void qelsysapiPause();
QEL_EXPORT void qelsysapiResume();
}

namespace qel::webhost {
// Function types of the optional entry points, for lookup by name.
using GetEncryptKeyFn = decltype(&GetEncryptKey_C_REST_QEL_QLWS_);
using DecryptFn = decltype(&Decrypt_C_REST_QEL_QLWS_);
using ReadAllFormDataWithMimeFn = decltype(&ReadAllFormDataWithMime_C_REST_QEL_QLWS_);
using KeyValueWithMimeGetFirstFn = decltype(&KeyValueWithMimeGetFirst_C_REST_QEL_QLWS_);
using KeyValueWithMimeGetNextFn = decltype(&KeyValueWithMimeGetNext_C_REST_QEL_QLWS_);
using KeyValueWithMimeGetKeyFn = decltype(&KeyValueWithMimeGetKey_C_REST_QEL_QLWS_);
using KeyValueWithMimeGetValueFn = decltype(&KeyValueWithMimeGetValue_C_REST_QEL_QLWS_);
using FreeKeyValuePairWithMimeListFn = decltype(&FreeKeyValuePairWithMimeList_C_REST_QEL_QLWS_);
}  // namespace qel::webhost
