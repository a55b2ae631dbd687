// Tests of the web server runtime stand-in through its entry points, as the
// plug-in calls them.
#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "Crypto.h"
#include "Request.h"
#include "foundation/osdep/IConv.h"
#include "service/WebhostRuntime.h"

namespace qel::webhost {
namespace {

using fnd::NString;

// --- request variables ------------------------------------------------------

struct VariableRead {
    int32_t status;
    uint32_t size;
    std::string text;
};

// One call as the plug-in makes it; a null buffer when nothing is offered.
VariableRead ReadVariable(Request& request, const char* name, uint32_t offered) {
    std::vector<char> buffer(offered + 1, 'x');
    uint32_t size = offered;
    int32_t status = ReadRequestVariable_C_REST_QEL_QLWS_(&request, name, offered ? buffer.data() : nullptr, &size);
    return {status, size, offered ? std::string(buffer.data(), strnlen(buffer.data(), offered)) : std::string()};
}

TEST(WebhostRuntimeVariables, SizeProtocolAndRetry) {
    struct Case {
        uint32_t valueLength;
        uint32_t offered;
        bool fits;
    };
    const Case cases[] = {{0, 32, true}, {31, 32, true}, {32, 32, false}, {100, 32, false}, {5, 0, false}};
    for (const Case& c : cases) {
        SCOPED_TRACE(testing::Message() << "length " << c.valueLength << ", offered " << c.offered);
        std::string value(c.valueLength, 'v');
        Request request("POST");
        request.SetVariable("loc", value);

        VariableRead first = ReadVariable(request, "loc", c.offered);
        EXPECT_EQ(first.size, c.valueLength + 1);
        if (c.fits) {
            EXPECT_EQ(first.status, 0);
            EXPECT_EQ(first.text, value);
            continue;
        }
        EXPECT_NE(first.status, 0);
        EXPECT_EQ(first.text, "");
        VariableRead retry = ReadVariable(request, "loc", first.size);
        EXPECT_EQ(retry.status, 0);
        EXPECT_EQ(retry.text, value);
        EXPECT_EQ(request.Calls().readRequestVariable, 2u);
    }
}

TEST(WebhostRuntimeVariables, UnknownOrRefusedVariableLeavesEmptyTextAndSizeZero) {
    Request request("POST");
    request.SetVariable("CONTENT_TYPE", "text/plain");
    VariableRead unknown = ReadVariable(request, "items", 32);
    EXPECT_NE(unknown.status, 0);
    EXPECT_EQ(unknown.size, 0u);
    EXPECT_EQ(unknown.text, "");

    request.Fail().readRequestVariable = true;
    VariableRead refused = ReadVariable(request, "CONTENT_TYPE", 32);
    EXPECT_NE(refused.status, 0);
    EXPECT_EQ(refused.size, 0u);
    EXPECT_EQ(refused.text, "");
}

// --- output -----------------------------------------------------------------

TEST(WebhostRuntimeOutput, BytesAreKeptWhole) {
    Request request("POST");
    EXPECT_EQ(SetHTTPResponseMimeType_C_REST_QEL_QLWS_(&request, "text/xml"), 0);
    // UTF-16LE bodies are full of NUL bytes.
    const char body[] = {'<', '\0', 'a', '\0'};
    EXPECT_EQ(WriteOutput_C_REST_QEL_QLWS_(&request, body, sizeof body), 0);
    EXPECT_EQ(WriteOutput_C_REST_QEL_QLWS_(&request, body, 2), 0);
    EXPECT_EQ(request.ResponseMimeType(), "text/xml");
    EXPECT_EQ(request.Output(), std::string("<\0a\0<\0", 6));
    EXPECT_EQ(request.Calls().setResponseMimeType, 1u);
    EXPECT_EQ(request.Calls().writeOutput, 2u);
}

// --- form data as a list of wide pairs --------------------------------------

std::vector<std::pair<WString, WString>> Pairs(const KeyValuePairList& list) {
    std::vector<std::pair<WString, WString>> pairs;
    for (KeyValuePair* p = list.GetFirst(); p; p = list.GetNext(p)) pairs.emplace_back(p->key, p->value);
    return pairs;
}

TEST(WebhostRuntimeForm, FieldsInOrderDecodedFromUtf8) {
    Request request("POST");
    request.AddFormField("Function", "SetAlias");
    request.AddFormField("Alias", "Pr\xC3\xBC" "fstand \xE2\x82\xAC");
    request.AddFormField("Function", "second");
    KeyValuePairList list;
    ASSERT_EQ(ReadAllFormData_C_REST_QEL_QLWS_(&request, &list), 0);
    std::vector<std::pair<WString, WString>> expected = {
        {L"Function", L"SetAlias"}, {L"Alias", L"Pr\u00FC" L"fstand \u20AC"}, {L"Function", L"second"}};
    EXPECT_EQ(Pairs(list), expected);
    EXPECT_EQ(request.Calls().readAllFormData, 1u);
}

TEST(WebhostRuntimeForm, InvalidUtf8IsWidenedWithTheProcessCodeSet) {
    Request request("POST");
    request.AddFormField("na\xEFve", "caf\xE9");
    KeyValuePairList list;
    ASSERT_EQ(ReadAllFormData_C_REST_QEL_QLWS_(&request, &list), 0);
    ASSERT_NE(list.GetFirst(), nullptr);
    EXPECT_EQ(list.GetFirst()->key, fnd::osdep::Widen(NString("na\xEFve")));
    EXPECT_EQ(list.GetFirst()->value, fnd::osdep::Widen(NString("caf\xE9")));
}

TEST(WebhostRuntimeForm, RefusedReadLeavesListEmpty) {
    Request request("POST");
    request.AddFormField("form_data", "a=1&");
    request.Fail().readAllFormData = true;
    KeyValuePairList list;
    EXPECT_NE(ReadAllFormData_C_REST_QEL_QLWS_(&request, &list), 0);
    EXPECT_EQ(list.GetFirst(), nullptr);
    EXPECT_EQ(request.Calls().readAllFormData, 1u);
}

// --- form data through the "WithMime" handles -------------------------------

std::vector<std::pair<std::string, std::string>> WalkMimeList(void* list) {
    std::vector<std::pair<std::string, std::string>> items;
    void* item = nullptr;
    for (int32_t status = KeyValueWithMimeGetFirst_C_REST_QEL_QLWS_(list, &item); status == 0 && item;
         status = KeyValueWithMimeGetNext_C_REST_QEL_QLWS_(list, item, &item)) {
        const char* key = nullptr;
        const char* value = nullptr;
        KeyValueWithMimeGetKey_C_REST_QEL_QLWS_(item, &key);
        KeyValueWithMimeGetValue_C_REST_QEL_QLWS_(item, &value);
        items.emplace_back(key, value);
    }
    return items;
}

TEST(WebhostRuntimeFormWithMime, ItemsAreTheRawFieldsInOrder) {
    Request request("POST");
    request.AddFormField("encrypted_data", "QUJD");
    request.AddFormField("caf\xE9", "na\xC3\xAFve");
    void* list = nullptr;
    ASSERT_EQ(ReadAllFormDataWithMime_C_REST_QEL_QLWS_(&request, &list), 0);
    ASSERT_NE(list, nullptr);

    std::vector<std::pair<std::string, std::string>> expected = {{"encrypted_data", "QUJD"},
                                                                 {"caf\xE9", "na\xC3\xAFve"}};
    EXPECT_EQ(WalkMimeList(list), expected);

    // The texts belong to the list and stay put while it lives.
    void* first = nullptr;
    ASSERT_EQ(KeyValueWithMimeGetFirst_C_REST_QEL_QLWS_(list, &first), 0);
    const char* key = nullptr;
    KeyValueWithMimeGetKey_C_REST_QEL_QLWS_(first, &key);
    void* last = nullptr;
    ASSERT_EQ(KeyValueWithMimeGetNext_C_REST_QEL_QLWS_(list, first, &last), 0);
    void* beyond = &last;
    EXPECT_NE(KeyValueWithMimeGetNext_C_REST_QEL_QLWS_(list, last, &beyond), 0);
    EXPECT_EQ(beyond, nullptr);
    EXPECT_STREQ(key, "encrypted_data");

    EXPECT_EQ(request.Calls().mimeListsHandedOut, 1u);
    EXPECT_EQ(FreeKeyValuePairWithMimeList_C_REST_QEL_QLWS_(list), 0);
    EXPECT_EQ(request.Calls().mimeListsFreed, 1u);
}

TEST(WebhostRuntimeFormWithMime, EmptyFormAndNullHandles) {
    Request request("POST");
    void* list = nullptr;
    ASSERT_EQ(ReadAllFormDataWithMime_C_REST_QEL_QLWS_(&request, &list), 0);
    void* item = &list;
    EXPECT_NE(KeyValueWithMimeGetFirst_C_REST_QEL_QLWS_(list, &item), 0);
    EXPECT_EQ(item, nullptr);
    EXPECT_EQ(FreeKeyValuePairWithMimeList_C_REST_QEL_QLWS_(list), 0);
    EXPECT_EQ(FreeKeyValuePairWithMimeList_C_REST_QEL_QLWS_(nullptr), 0);

    // Callers use the texts without checking the result.
    const char* key = nullptr;
    EXPECT_NE(KeyValueWithMimeGetKey_C_REST_QEL_QLWS_(nullptr, &key), 0);
    EXPECT_STREQ(key, "");
}

TEST(WebhostRuntimeFormWithMime, RefusedReadHandsOutNoList) {
    Request request("POST");
    request.AddFormField("form_data", "a=1&");
    request.Fail().readAllFormDataWithMime = true;
    void* list = &request;
    EXPECT_NE(ReadAllFormDataWithMime_C_REST_QEL_QLWS_(&request, &list), 0);
    EXPECT_EQ(list, nullptr);
    EXPECT_EQ(request.Calls().mimeListsHandedOut, 0u);
}

// --- uploaded files ---------------------------------------------------------

TEST(WebhostRuntimeUploads, FilesInOrderInAListTheCallerDeletes) {
    Request request("POST");
    request.AddUploadedFile("/tmp/upload/1.bin", "image \xC3\xA9t\xC3\xA9.cfg");
    request.AddUploadedFile("/tmp/upload/2.bin", "second.cfg");
    UploadedFilesList* list = nullptr;
    ASSERT_EQ(ReadUploadedFilesList_C_REST_QEL_QLWS_(&request, &list), 0);
    std::unique_ptr<UploadedFilesList> owned(list);
    ASSERT_NE(list, nullptr);
    UploadedFile* first = list->GetFirst();
    ASSERT_NE(first, nullptr);
    EXPECT_EQ(first->localFileName, WString(L"/tmp/upload/1.bin"));
    EXPECT_EQ(first->clientFileName, WString(L"image \u00E9t\u00E9.cfg"));
    ASSERT_NE(first->next, nullptr);
    EXPECT_EQ(first->next->clientFileName, WString(L"second.cfg"));
    EXPECT_EQ(first->next->next, nullptr);
}

TEST(WebhostRuntimeUploads, ListAlreadyThereIsRefusedAndKept) {
    Request request("POST");
    request.AddUploadedFile("/tmp/upload/1.bin", "a.cfg");
    UploadedFilesList mine;
    UploadedFilesList* list = &mine;
    EXPECT_NE(ReadUploadedFilesList_C_REST_QEL_QLWS_(&request, &list), 0);
    EXPECT_EQ(list, &mine);
}

TEST(WebhostRuntimeUploads, FailureWithAndWithoutAList) {
    for (bool leave : {false, true}) {
        SCOPED_TRACE(leave ? "list left" : "no list");
        Request request("POST");
        request.AddUploadedFile("/tmp/upload/1.bin", "a.cfg");
        request.Fail().readUploadedFilesList = true;
        request.Fail().leaveUploadedFilesListOnFailure = leave;
        UploadedFilesList* list = nullptr;
        EXPECT_NE(ReadUploadedFilesList_C_REST_QEL_QLWS_(&request, &list), 0);
        std::unique_ptr<UploadedFilesList> owned(list);
        EXPECT_EQ(list != nullptr, leave);
        EXPECT_EQ(request.Calls().readUploadedFilesList, 1u);
    }
}

// --- key and decryption -----------------------------------------------------

EncryptKey TestKey() {
    EncryptKey key;
    for (size_t i = 0; i < key.size(); ++i) key[i] = static_cast<uint8_t>(i * 7 + 1);
    return key;
}

struct Decrypted {
    int32_t status;
    std::string text;  // up to the NUL
    uint32_t length;
    bool terminated;   // a NUL right after `length` bytes
};

Decrypted DecryptThrough(Request& request, const std::vector<uint8_t>& key, const std::vector<uint8_t>& cipher) {
    char* text = reinterpret_cast<char*>(&request);  // must be reset on failure
    uint32_t length = 99;
    int32_t status = Decrypt_C_REST_QEL_QLWS_(&request, key.data(), static_cast<uint32_t>(key.size()),
                                              cipher.data(), static_cast<uint32_t>(cipher.size()), &text, &length);
    Decrypted result{status, {}, length, false};
    if (status == 0) {
        result.text = text;
        result.terminated = text[length] == '\0';
        std::free(text);
    } else {
        EXPECT_EQ(text, nullptr);
    }
    return result;
}

std::vector<uint8_t> Bytes(const EncryptKey& key) { return {key.begin(), key.end()}; }

TEST(WebhostRuntimeCrypto, KeyIsAMallocedCopy) {
    Request request("POST");
    request.SetEncryptKey(TestKey());
    uint8_t* key = nullptr;
    uint32_t length = 0;
    ASSERT_EQ(GetEncryptKey_C_REST_QEL_QLWS_(&request, &key, &length), 0);
    ASSERT_EQ(length, kEncryptKeyLength);
    EXPECT_EQ(std::vector<uint8_t>(key, key + length), Bytes(TestKey()));
    key[0] ^= 0xFF;
    EXPECT_EQ(*request.Key(), TestKey());
    std::free(key);
}

TEST(WebhostRuntimeCrypto, NoKeyIsRefused) {
    Request request("POST");
    uint8_t* key = reinterpret_cast<uint8_t*>(&request);
    uint32_t length = 7;
    EXPECT_NE(GetEncryptKey_C_REST_QEL_QLWS_(&request, &key, &length), 0);
    EXPECT_EQ(key, nullptr);
    EXPECT_EQ(length, 0u);
}

TEST(WebhostRuntimeCrypto, RoundTripAcrossBlockBoundaries) {
    Request request("POST");
    for (size_t n : {0, 1, 15, 16, 17, 32, 1000}) {
        SCOPED_TRACE(n);
        std::string plain(n, '\0');
        for (size_t i = 0; i < n; ++i) plain[i] = static_cast<char>('a' + i % 26);
        std::vector<uint8_t> cipher = EncryptForRequest(Bytes(TestKey()), plain);
        EXPECT_EQ(cipher.size(), (n / kCipherBlockLength + 2) * kCipherBlockLength);
        Decrypted d = DecryptThrough(request, Bytes(TestKey()), cipher);
        EXPECT_EQ(d.status, 0);
        EXPECT_EQ(d.text, plain);
        EXPECT_EQ(d.length, n);
        EXPECT_TRUE(d.terminated);
    }
    EXPECT_EQ(request.Calls().decrypt, 7u);
}

TEST(WebhostRuntimeCrypto, EveryEncryptionHasItsOwnIv) {
    std::vector<uint8_t> a = EncryptForRequest(Bytes(TestKey()), "Function=Reset&");
    std::vector<uint8_t> b = EncryptForRequest(Bytes(TestKey()), "Function=Reset&");
    EXPECT_NE(std::vector<uint8_t>(a.begin(), a.begin() + kCipherBlockLength),
              std::vector<uint8_t>(b.begin(), b.begin() + kCipherBlockLength));
}

TEST(WebhostRuntimeCrypto, UndecryptableTextsAreRefused) {
    const std::vector<uint8_t> key = Bytes(TestKey());
    const std::array<uint8_t, kCipherBlockLength> iv = {1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16};
    // Sixteen bytes of text: IV, one text block, one block of padding 0x10.
    const std::vector<uint8_t> good = EncryptForRequest(key, iv, "Function=Reset&&");
    ASSERT_EQ(good.size(), 3 * kCipherBlockLength);

    auto with = [&](auto change) {
        std::vector<uint8_t> bytes = good;
        change(bytes);
        return bytes;
    };
    std::vector<uint8_t> otherKey = key;
    otherKey[31] ^= 0x01;
    std::vector<uint8_t> zeroKey(kEncryptKeyLength, 0);
    std::vector<uint8_t> longKey = key;
    longKey.push_back(0);

    struct Case {
        const char* what;
        std::vector<uint8_t> key;
        std::vector<uint8_t> cipher;
    };
    const Case cases[] = {
        {"short key", std::vector<uint8_t>(key.begin(), key.begin() + 31), good},
        {"long key", longKey, good},
        {"no key", {}, good},
        // With a fixed IV the wrong keys give fixed garbage, whose padding fails.
        {"key off by one bit", otherKey, good},
        {"zero key", zeroKey, good},
        // The block before the last one flips the last padding byte to 0x11.
        {"padding byte too large", key, with([](auto& b) { b[2 * kCipherBlockLength - 1] ^= 0x01; })},
        {"padding byte zero", key, with([](auto& b) { b[2 * kCipherBlockLength - 1] ^= 0x10; })},
        {"last block cut", key, std::vector<uint8_t>(good.begin(), good.end() - kCipherBlockLength)},
        {"one byte missing", key, std::vector<uint8_t>(good.begin(), good.end() - 1)},
        {"one byte extra", key, with([](auto& b) { b.push_back(0); })},
        {"IV only", key, std::vector<uint8_t>(good.begin(), good.begin() + kCipherBlockLength)},
        {"shorter than IV and a block", key, std::vector<uint8_t>(good.begin(), good.begin() + 31)},
        {"empty", key, {}},
    };
    Request request("POST");
    for (const Case& c : cases) {
        SCOPED_TRACE(c.what);
        Decrypted d = DecryptThrough(request, c.key, c.cipher);
        EXPECT_NE(d.status, 0);
        EXPECT_EQ(d.length, 0u);
    }
    // The unchanged text does decrypt, so the refusals above are the changes'.
    EXPECT_EQ(DecryptThrough(request, key, good).text, "Function=Reset&&");
}

}  // namespace
}  // namespace qel::webhost
