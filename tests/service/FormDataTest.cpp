// Form decoding: the URL and Base64 decoders, fed every prefix of their
// input, and the argument map built from each form shape.
#include "service/FormData.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "foundation/Exception.h"
#include "service/ModuleState.h"
#include "webhost_runtime/Request.h"

namespace qel::service {
namespace {

using api::ArgumentMap;
using fnd::NString;
using fnd::WString;

std::wstring Std(const WString& s) { return std::wstring(s.CStr(), s.Length()); }

std::vector<std::pair<std::wstring, std::wstring>> Pairs(const ArgumentMap& map) {
    std::vector<std::pair<std::wstring, std::wstring>> out;
    for (const auto& [k, v] : map) out.emplace_back(Std(k), Std(v));
    return out;
}

ArgumentMap Decode(const std::string& text, bool utf8 = true) {
    ArgumentMap map;
    UrlDecode(text.c_str(), utf8, map);
    return map;
}

using PairList = std::vector<std::pair<std::wstring, std::wstring>>;

TEST(UrlDecoder, PairsEndOnlyAtAmpersand) {
    struct Case {
        const char* text;
        PairList pairs;
    } cases[] = {
        {"Function=EnumSystemExperts&", {{L"Function", L"EnumSystemExperts"}}},
        {"Function=EnumSystemExperts", {}},
        {"a&b=1&", {{L"a&b", L"1"}}},
        {"a=b=c&", {{L"a", L"b=c"}}},
        {"a=%41+%42&", {{L"a", L"A B"}}},
        {"function=A&Function=B&", {{L"function", L"B"}}},
        {"noequals&", {}},
        {"=v&", {{L"", L"v"}}},
        {"k=&", {{L"k", L""}}},
        {"a=%zz&", {{L"a", L""}}},          // two non-digits decode to NUL, which ends the value
        {"a=x%00y&b=2&", {{L"a", L"x"}, {L"b", L"2"}}},
        {"a=%4&", {}},                       // the "&" is taken into the escape, so the pair never ends
        {"a=%4&&", {{L"a", L"\x04"}}},
        {"a=1&%", {{L"a", L"1"}}},
        {"a=%C3%A9&", {{L"a", L"\u00e9"}}},
    };
    for (const auto& c : cases) EXPECT_EQ(Pairs(Decode(c.text)), c.pairs) << c.text;
}

TEST(UrlDecoder, EscapeAtTheEndNeverReadsPastTheText) {
    // Exactly sized heap copies: the address sanitizer sees any read past them.
    struct Case {
        const char* text;
        PairList pairs;
    } cases[] = {
        {"a=1&b=%", {{L"a", L"1"}}}, {"a=1&b=%4", {{L"a", L"1"}}}, {"%", {}}, {"%4", {}}, {"a=%4", {}},
    };
    for (const auto& c : cases) {
        size_t n = std::strlen(c.text) + 1;
        std::unique_ptr<char[]> copy(new char[n]);
        std::memcpy(copy.get(), c.text, n);
        ArgumentMap map;
        UrlDecode(copy.get(), true, map);
        EXPECT_EQ(Pairs(map), c.pairs) << c.text;
    }
}

TEST(UrlDecoder, EveryPrefixDecodesTheCompletePairsOnly) {
    const std::string text = "Function=Search&Plugins=a%2Cb&Items=x+y&Tag_0=%41&";
    const PairList all = {{L"Function", L"Search"}, {L"Items", L"x y"}, {L"Plugins", L"a,b"}, {L"Tag_0", L"A"}};
    for (size_t cut = 0; cut <= text.size(); ++cut) {
        std::unique_ptr<char[]> prefix(new char[cut + 1]);
        std::memcpy(prefix.get(), text.data(), cut);
        prefix[cut] = '\0';
        ArgumentMap map;
        UrlDecode(prefix.get(), true, map);
        // Every stored pair is one of the full text's, whole.
        size_t ampersands = 0;
        for (size_t i = 0; i < cut; ++i) ampersands += text[i] == '&';
        EXPECT_EQ(map.size(), ampersands) << cut;
        for (const auto& pair : Pairs(map)) EXPECT_NE(std::find(all.begin(), all.end(), pair), all.end()) << cut;
    }
}

TEST(UrlDecoder, LongKeysAndValuesAreKeptWhole) {
    std::string key(2000, 'k');
    std::string value(70000, 'v');
    ArgumentMap map = Decode(key + "=" + value + "&");
    ASSERT_EQ(map.size(), 1u);
    EXPECT_EQ(map.begin()->first.Length(), 2000u);
    EXPECT_EQ(map.begin()->second.Length(), 70000u);
}

TEST(UrlDecoder, InvalidUtf8ThrowsAndProcessCodeSetDoesNot) {
    EXPECT_THROW(Decode("a=%FF&", true), fnd::exception::InvalidSequence);
    ArgumentMap map = Decode("a=%FF&", false);  // the C locale turns the byte into "?"
    ASSERT_EQ(map.size(), 1u);
    EXPECT_EQ(Std(map.begin()->second), L"?");
}

std::vector<uint8_t> B64(const std::string& text, bool* ok = nullptr) {
    std::vector<uint8_t> out;
    bool decoded = Base64Decode(NString(text.c_str(), static_cast<uint32_t>(text.size())), out);
    if (ok) *ok = decoded;
    return out;
}

std::vector<uint8_t> Bytes(const char* text) { return std::vector<uint8_t>(text, text + std::strlen(text)); }

TEST(Base64Decoder, LengthsAndAlphabets) {
    struct Case {
        const char* text;
        bool ok;
        std::vector<uint8_t> bytes;
    } cases[] = {
        {"TWFu", true, Bytes("Man")},
        {"TWE=", true, Bytes("Ma")},
        {"TQ==", true, Bytes("M")},
        {"+/+/", true, {0xFB, 0xFF, 0xBF}},
        {"-_-_", true, {0xFB, 0xFF, 0xBF}},
        {"", false, {}},
        {"TWF", false, {}},
        {"TW=u", false, {}},
        {"TW!u", true, {0, 0, 0}},  // c2 invalid: decoding stops before the group, the rest stays zero
        {"TWFuTW!u", true, {'M', 'a', 'n', 0, 0, 0}},
        {"!WFuTWFu", true, {0, 0, 0, 0, 0, 0}},
        {"TWFu=WFu", true, {'M', 'a', 'n', 0, 0, 0}},
    };
    for (const auto& c : cases) {
        bool ok = false;
        std::vector<uint8_t> out = B64(c.text, &ok);
        EXPECT_EQ(ok, c.ok) << c.text;
        if (c.ok) {
            EXPECT_EQ(out, c.bytes) << c.text;
        }
    }
}

TEST(Base64Decoder, EveryPrefixIsSizedOrRefused) {
    const std::string text = "SGVsbG8sIHdvcmxkIQ==";
    for (size_t cut = 0; cut <= text.size(); ++cut) {
        bool ok = false;
        std::vector<uint8_t> out = B64(text.substr(0, cut), &ok);
        EXPECT_EQ(ok, cut > 0 && cut % 4 == 0) << cut;
        if (ok && cut < text.size()) {
            EXPECT_EQ(std::string(out.begin(), out.end()), std::string("Hello, world!").substr(0, cut / 4 * 3));
        }
    }
}

// Builds the argument map with the runtime's own entry points bound as the
// plug-in binds them at start-up.
class ArgumentMapBuilder : public ::testing::Test {
protected:
    void SetUp() override { saved_ = EntryPoints(); }
    void TearDown() override { EntryPoints() = saved_; }
    void BindAll() {
        OptionalEntryPoints& p = EntryPoints();
        p.getEncryptKey = &GetEncryptKey_C_REST_QEL_QLWS_;
        p.decrypt = &Decrypt_C_REST_QEL_QLWS_;
        p.readAllFormDataWithMime = &ReadAllFormDataWithMime_C_REST_QEL_QLWS_;
        p.keyValueWithMimeGetFirst = &KeyValueWithMimeGetFirst_C_REST_QEL_QLWS_;
        p.keyValueWithMimeGetNext = &KeyValueWithMimeGetNext_C_REST_QEL_QLWS_;
        p.keyValueWithMimeGetKey = &KeyValueWithMimeGetKey_C_REST_QEL_QLWS_;
        p.keyValueWithMimeGetValue = &KeyValueWithMimeGetValue_C_REST_QEL_QLWS_;
        p.freeKeyValuePairWithMimeList = &FreeKeyValuePairWithMimeList_C_REST_QEL_QLWS_;
    }
    PairList Build(webhost::Request& request, bool utf8 = true) {
        ArgumentMap map;
        FormResources resources;
        BuildArgumentMap(&request, utf8, map, resources);
        return Pairs(map);
    }
    OptionalEntryPoints saved_;
};

TEST_F(ArgumentMapBuilder, FirstUploadedFileIsRecordedWithFormData) {
    for (bool runtimePath : {true, false}) {
        EntryPoints() = {};
        if (runtimePath) BindAll();
        webhost::Request request("POST");
        request.AddFormField("form_data", "Function=UpdateFirmwareImage&FormAttachedLocalFilename=forged&");
        request.AddUploadedFile("/tmp/upload-1", "image.cfg");
        request.AddUploadedFile("/tmp/upload-2", "second.cfg");
        EXPECT_EQ(Build(request), (PairList{{L"FormAttachedClientFilename", L"image.cfg"},
                                            {L"FormAttachedLocalFilename", L"/tmp/upload-1"},
                                            {L"Function", L"UpdateFirmwareImage"}}));
        EXPECT_EQ(request.Calls().readUploadedFilesList, 1u);
    }
}

TEST_F(ArgumentMapBuilder, UploadsAreIgnoredForPlainFieldsAndFailedListings) {
    BindAll();
    webhost::Request plain("POST");
    plain.AddFormField("Function", "X");
    plain.AddUploadedFile("/tmp/upload-1", "image.cfg");
    EXPECT_EQ(Build(plain), (PairList{{L"Function", L"X"}}));

    webhost::Request failing("POST");
    failing.AddFormField("form_data", "Function=X&");
    failing.AddUploadedFile("/tmp/upload-1", "image.cfg");
    failing.Fail().readUploadedFilesList = true;
    failing.Fail().leaveUploadedFilesListOnFailure = true;  // still ours to delete
    EXPECT_EQ(Build(failing), (PairList{{L"Function", L"X"}}));
}

TEST_F(ArgumentMapBuilder, RuntimeFailuresAreGenericFailures) {
    for (bool runtimePath : {true, false}) {
        EntryPoints() = {};
        if (runtimePath) BindAll();
        webhost::Request request("POST");
        request.AddFormField("Function", "X");
        request.Fail().readAllFormData = request.Fail().readAllFormDataWithMime = true;
        try {
            Build(request);
            ADD_FAILURE() << "no status thrown";
        } catch (long status) {
            EXPECT_EQ(static_cast<int32_t>(status), static_cast<int32_t>(0x80004005u));
        }
    }
}

TEST_F(ArgumentMapBuilder, FirstMatchingFieldDecidesTheShape) {
    BindAll();
    webhost::Request request("POST");
    request.AddFormField("other", "1");
    request.AddFormField("form_data", "Function=A&");
    request.AddFormField("encrypted_data", "!!!!");
    EXPECT_EQ(Build(request), (PairList{{L"Function", L"A"}}));
}

TEST_F(ArgumentMapBuilder, PlainFieldValuesFollowTheFormEncoding) {
    BindAll();
    webhost::Request request("POST");
    request.AddFormField("Name", "caf\xC3\xA9");
    EXPECT_EQ(Build(request, true), (PairList{{L"Name", L"caf\u00e9"}}));
    webhost::Request bad("POST");
    bad.AddFormField("Name", "caf\xE9");
    EXPECT_THROW(Build(bad, true), fnd::exception::InvalidSequence);
}

}  // namespace
}  // namespace qel::service
