// The plug-in as the web server sees it: routes, statuses, exact documents,
// form shapes and the lifecycle, through the five exported entry points.
#include <gtest/gtest.h>
#include <openssl/evp.h>

#include <filesystem>
#include <string>
#include <thread>
#include <vector>

#include "PluginHost.h"

namespace qel::testing {
namespace {

using webhost::Request;

constexpr std::string_view kTwoExperts = R"({"experts": [
  {"programmaticName": "axis", "displayName": "Axis <Expert> & 'Co'", "version": "1.0",
   "productId": "{00112233-4455-6677-8899-aabbccddeeff}"},
  {"programmaticName": "net", "displayName": "R\u00e9seau \"2\"", "version": "2.1",
   "productId": "{0F1E2D3C-4B5A-6978-8796-A5B4C3D2E1F0}"}]})";

constexpr std::string_view kTwoExpertsBody =
    "<SystemExperts>"
    "<ExpertInfo productID='{00112233-4455-6677-8899-AABBCCDDEEFF}' productDisplayName='Axis &lt;Expert&gt; "
    "&amp; &apos;Co&apos;' productVersion='1.0' programmaticName='axis' />"
    "<ExpertInfo productID='{0F1E2D3C-4B5A-6978-8796-A5B4C3D2E1F0}' productDisplayName='R\xC3\xA9seau "
    "&quot;2&quot;' productVersion='2.1' programmaticName='net' />"
    "</SystemExperts>";

// UTF-8 (as written in these tests) to UTF-16LE, for the expected documents.
std::string Utf8ToUtf16(std::string_view utf8) {
    std::string out;
    for (size_t i = 0; i < utf8.size();) {
        unsigned char c = utf8[i];
        uint32_t cp = c;
        size_t n = 1;
        if (c >= 0xE0) cp = c & 0x0F, n = 3;
        else if (c >= 0xC0) cp = c & 0x1F, n = 2;
        for (size_t k = 1; k < n; ++k) cp = (cp << 6) | (utf8[i + k] & 0x3F);
        i += n;
        out.push_back(static_cast<char>(cp & 0xFF));
        out.push_back(static_cast<char>(cp >> 8));
    }
    return out;
}

std::string Utf8Document(std::string_view root, std::string_view hr, std::string_view body = "") {
    std::string text = "<?xml version='1.0' encoding='utf-8'?><";
    text.append(root).append(" hr='").append(hr).append("' version='00010001'>").append(body);
    text.append("</").append(root).append(">");
    return text;
}

std::string Base64(const std::vector<uint8_t>& bytes) {
    std::string out(4 * ((bytes.size() + 2) / 3) + 1, '\0');
    int n = EVP_EncodeBlock(reinterpret_cast<unsigned char*>(out.data()), bytes.data(), static_cast<int>(bytes.size()));
    out.resize(static_cast<size_t>(n));
    return out;
}

webhost::EncryptKey TestKey(uint8_t seed) {
    webhost::EncryptKey key{};
    for (size_t i = 0; i < key.size(); ++i) key[i] = static_cast<uint8_t>(seed + i * 7);
    return key;
}

const Mapping kServer(L"Server");

TEST(PluginRouting, UnknownMappingFailsWithoutReadingTheForm) {
    PluginHost host;
    Request request("POST");
    host.Post(request, "Function=EnumSystemExperts&");
    host.Run(Mapping(L"Servers"), request);
    EXPECT_EQ(request.Output(), Utf16Document("80004005"));
    EXPECT_EQ(request.ResponseMimeType(), "text/xml; charset=utf-16le");
    EXPECT_EQ(request.Calls().readAllFormData + request.Calls().readAllFormDataWithMime, 0u);
}

TEST(PluginRouting, ApiWithWrongMethodFailsBeforeTheFrameworkExists) {
    PluginHost host(RuntimeVariant::kAll, kTwoExperts);
    Request request;
    host.Post(request, "Function=EnumSystemExperts&").SetMethod("GET");
    host.Run(kServer, request);
    EXPECT_EQ(request.Output(), Utf16Document("80004005"));
    EXPECT_EQ(LiveFrameworkObjects(), 0);
}

TEST(PluginRouting, MappingAndMethodIgnoreCase) {
    PluginHost host(RuntimeVariant::kAll, kTwoExperts);
    for (const wchar_t* name : {L"server", L"SERVER", L"ServerAuthenticated", L"serverfirmware"}) {
        Request request;
        host.Post(request, "Function=enumsystemexperts&").SetMethod("post");
        host.Run(Mapping(name), request);
        EXPECT_EQ(request.Output(), Utf8ToUtf16("<?xml version='1.0' encoding='utf-16le'?><QelSysAPI_Results "
                                                "hr='0' version='00010001'>" +
                                                std::string(kTwoExpertsBody) + "</QelSysAPI_Results>"));
    }
}

TEST(PluginRouting, CatalogueWithWrongMethodIsAnsweredLikeAnApiFailure) {
    PluginHost host;
    Request request("POST");
    host.Run(Mapping(L"ItemDefs"), request);
    EXPECT_EQ(request.Output(), Utf16Document("80004005"));
}

TEST(PluginRouting, CatalogueAnswersUtf8WithItsOwnRoot) {
    PluginHost host;
    Request bindings("get");
    host.Run(Mapping(L"ItemBindings"), bindings);
    EXPECT_EQ(bindings.Output(), Utf8Document("allbindings", "1"));
    EXPECT_EQ(bindings.ResponseMimeType(), "text/xml; charset=utf-8");

    host.WriteFile("uixml/sysconfig/a.def.xml", "<?xml version='1.0'?>\n<item kind=\"x\"/>\n");
    host.WriteFile("uixml/sysconfig/a.const.xml", "<constants/>");
    Request definitions("GET");
    definitions.SetVariable("items", ",a,,missing,");
    host.Run(Mapping(L"ItemDefs"), definitions);
    EXPECT_EQ(definitions.Output(),
              Utf8Document("definitions", "0", "<item id=\"a\" kind=\"x\"/>\n\n<constants/>\n"));
}

TEST(PluginDocument, EnumSystemExpertsInUtf16) {
    PluginHost host(RuntimeVariant::kAll, kTwoExperts);
    Request request;
    host.Run(kServer, host.Post(request, "Function=EnumSystemExperts&"));
    EXPECT_EQ(request.Output(),
              Utf8ToUtf16("<?xml version='1.0' encoding='utf-16le'?><QelSysAPI_Results hr='0' version='00010001'>" +
                          std::string(kTwoExpertsBody) + "</QelSysAPI_Results>"));
    EXPECT_EQ(request.Calls().setResponseMimeType, 1u);
    EXPECT_EQ(request.Calls().writeOutput, 1u);
}

TEST(PluginDocument, ResponseEncodingSelectsUtf8InAnyCase) {
    PluginHost host(RuntimeVariant::kAll, kTwoExperts);
    struct Case {
        const char* encoding;
        bool utf8;
    } cases[] = {{"UTF-8", true}, {"utf-8", true}, {"uTf-8", true}, {"UTF8", false}, {"", false}, {nullptr, false}};
    for (const Case& c : cases) {
        std::string form = "Function=EnumSystemExperts&";
        if (c.encoding) form += std::string("response_encoding=") + c.encoding + "&";
        Request request;
        host.Run(kServer, host.Post(request, form));
        std::string utf8 = Utf8Document("QelSysAPI_Results", "0", kTwoExpertsBody);
        if (c.utf8) {
            EXPECT_EQ(request.Output(), utf8) << form;
            EXPECT_EQ(request.ResponseMimeType(), "text/xml; charset=utf-8");
        } else {
            EXPECT_EQ(request.Output(), Utf8ToUtf16("<?xml version='1.0' encoding='utf-16le'?>" +
                                                    utf8.substr(utf8.find("<QelSysAPI"))))
                << form;
        }
    }
}

TEST(PluginDocument, NoExpertsGiveASelfClosedList) {
    PluginHost host;
    Request request;
    host.Run(kServer, host.Post(request, "Function=EnumSystemExperts&response_encoding=UTF-8&"));
    EXPECT_EQ(request.Output(), Utf8Document("QelSysAPI_Results", "0", "<SystemExperts />"));
}

TEST(PluginForm, ContentTypeDecidesTheFormEncoding) {
    PluginHost host;
    struct Case {
        const char* contentType;
        const char* hr;
    } cases[] = {
        {"application/x-www-form-urlencoded; charset=UTF-8", "0"},
        {"application/x-www-form-urlencoded; charset=utf-8", "80004005"},  // "charset" but not "UTF-8"
        {"application/x-www-form-urlencoded", "0"},
        {"multipart/form-data; boundary=x; charset=ISO-8859-1", "80004005"},
    };
    for (const Case& c : cases) {
        Request request;
        host.Run(kServer, host.Post(request, "Function=EnumSystemExperts&", c.contentType));
        std::string expected = std::string(c.hr) == "0" ? Utf16Document("0", "<SystemExperts />") : Utf16Document(c.hr);
        EXPECT_EQ(request.Output(), expected) << c.contentType;
    }
}

TEST(PluginForm, FailuresOfDecodingNeverReadAsSuccess) {
    PluginHost host;
    struct Case {
        const char* form;
        const char* contentType;
        const char* hr;
    } cases[] = {
        {"Function=EnumSystemExperts&bad=%FF&", "application/x-www-form-urlencoded; charset=UTF-8", "80004005"},
        {"Function=EnumSystemExperts&", "application/x-www-form-urlencoded", "0"},
        {"function=Nothing&", "application/x-www-form-urlencoded", "80004005"},
        {"Plugins=x&", "application/x-www-form-urlencoded", "80004005"},  // no Function
        {"Function=EnumSystemExperts", "application/x-www-form-urlencoded", "80004005"},  // pair never ended
        {"Items=b&Function=EnumSystemExperts&", "application/x-www-form-urlencoded", "80040372"},
        {"Plugins=&Items=b&Function=EnumSystemExperts&", "application/x-www-form-urlencoded", "80040372"},
    };
    for (const Case& c : cases) {
        Request request;
        host.Run(kServer, host.Post(request, c.form, c.contentType));
        std::string expected = std::string(c.hr) == "0" ? Utf16Document("0", "<SystemExperts />") : Utf16Document(c.hr);
        EXPECT_EQ(request.Output(), expected) << c.form;
    }
}

TEST(PluginForm, PlainFieldsOnBothRuntimePaths) {
    // Only a runtime with ReadAllFormDataWithMime gets the richer path; every
    // other variant (and no runtime library at all) falls back to the list.
    for (RuntimeVariant variant : {RuntimeVariant::kAll, RuntimeVariant::kNone, RuntimeVariant::kMissing,
                                   RuntimeVariant::kEncryptKeyOnly, RuntimeVariant::kNoMime}) {
        PluginHost host(variant);
        Request request("POST");
        request.SetVariable("CONTENT_TYPE", "application/x-www-form-urlencoded");
        request.AddFormField("Function", "EnumSystemExperts");
        request.AddFormField("response_encoding", "UTF-8");
        host.Run(kServer, request);
        EXPECT_EQ(request.Output(), Utf8Document("QelSysAPI_Results", "0", "<SystemExperts />"));
        bool mime = variant == RuntimeVariant::kAll;
        EXPECT_EQ(request.Calls().readAllFormDataWithMime, mime ? 1u : 0u);
        EXPECT_EQ(request.Calls().readAllFormData, mime ? 0u : 1u);
        EXPECT_EQ(request.Calls().mimeListsFreed, request.Calls().mimeListsHandedOut);
    }
}

TEST(PluginForm, FieldNamePrefixSelectsTheShape) {
    PluginHost host;
    struct Case {
        const char* field;
        const char* hr;
    } cases[] = {{"form_data2", "0"}, {"xform_data", "80004005"}, {"Form_Data", "80004005"}};
    for (const Case& c : cases) {
        Request request("POST");
        request.SetVariable("CONTENT_TYPE", "application/x-www-form-urlencoded");
        request.AddFormField(c.field, "Function=EnumSystemExperts&");
        host.Run(kServer, request);
        std::string expected = std::string(c.hr) == "0" ? Utf16Document("0", "<SystemExperts />") : Utf16Document(c.hr);
        EXPECT_EQ(request.Output(), expected) << c.field;
    }
}

TEST(PluginEncryption, RoundTripThroughTheRuntime) {
    for (RuntimeVariant variant : {RuntimeVariant::kAll, RuntimeVariant::kNoMime}) {
        PluginHost host(variant, kTwoExperts);
        Request request("POST");
        request.SetVariable("CONTENT_TYPE", "application/x-www-form-urlencoded");
        request.SetEncryptKey(TestKey(1));
        auto key = TestKey(1);
        request.AddFormField("encrypted_data",
                             Base64(webhost::EncryptForRequest(key, "Function=EnumSystemExperts&response_encoding=UTF-8&")));
        host.Run(kServer, request);
        EXPECT_EQ(request.Output(), Utf8Document("QelSysAPI_Results", "0", kTwoExpertsBody));
    }
}

TEST(PluginEncryption, RefusalsHaveTheirStatuses) {
    auto key = TestKey(1);
    std::string sealed = Base64(webhost::EncryptForRequest(key, "Function=EnumSystemExperts&"));
    struct Case {
        RuntimeVariant variant;
        std::string field;
        bool withKey;
        uint8_t keySeed;
        const char* hr;
    } cases[] = {
        {RuntimeVariant::kNone, sealed, true, 1, "80040378"},
        {RuntimeVariant::kEncryptKeyOnly, sealed, true, 1, "80040378"},
        {RuntimeVariant::kMissing, sealed, true, 1, "80040378"},
        {RuntimeVariant::kAll, sealed, false, 1, "80004005"},      // the client has no key
        {RuntimeVariant::kAll, sealed, true, 9, "80004005"},       // the wrong key
        {RuntimeVariant::kAll, sealed + "A", true, 1, "8007000E"},  // not a Base64 length
        {RuntimeVariant::kAll, "", true, 1, "8007000E"},
    };
    for (const Case& c : cases) {
        PluginHost host(c.variant);
        Request request("POST");
        request.SetVariable("CONTENT_TYPE", "application/x-www-form-urlencoded");
        if (c.withKey) request.SetEncryptKey(TestKey(c.keySeed));
        request.AddFormField("encrypted_data", c.field);
        host.Run(kServer, request);
        EXPECT_EQ(request.Output(), Utf16Document(c.hr)) << c.hr;
    }
}

TEST(PluginLifecycle, FinalizeReleasesTheFrameworkOnce) {
    PluginHost host(RuntimeVariant::kAll, kTwoExperts);
    Request first;
    host.Run(kServer, host.Post(first, "Function=EnumSystemExperts&"));
    EXPECT_GT(LiveFrameworkObjects(), 0);
    host.Finalize();
    EXPECT_EQ(LiveFrameworkObjects(), 0);
    host.Finalize();
    EXPECT_EQ(LiveFrameworkObjects(), 0);
    host.Pause();
    host.Resume();
    Request again;
    host.Run(kServer, host.Post(again, "Function=EnumSystemExperts&"));
    EXPECT_EQ(again.Output(), first.Output());
}

TEST(PluginLifecycle, FrameworkFailureIsTheRequestStatus) {
    PluginHost host;
    std::filesystem::remove(host.ShareDir() + "/sim/device.json");
    Request request;
    host.Run(kServer, host.Post(request, "Function=EnumSystemExperts&"));
    EXPECT_EQ(request.Output(), Utf16Document("80070002"));
    host.WriteFile("sim/device.json", "{not json");
    Request invalid;
    host.Run(kServer, host.Post(invalid, "Function=EnumSystemExperts&"));
    EXPECT_EQ(invalid.Output(), Utf16Document("8007000D"));
}

TEST(PluginLifecycle, ConcurrentRequestsEachGetTheirDocument) {
    PluginHost host(RuntimeVariant::kAll, kTwoExperts);
    Request reference;
    host.Run(kServer, host.Post(reference, "Function=EnumSystemExperts&"));
    std::vector<std::thread> threads;
    std::vector<int> mismatches(4, 0);
    for (int t = 0; t < 4; ++t) {
        threads.emplace_back([&, t] {
            for (int i = 0; i < 50; ++i) {
                Request request;
                host.Run(kServer, host.Post(request, "Function=EnumSystemExperts&"));
                if (request.Output() != reference.Output()) ++mismatches[t];
            }
        });
    }
    for (auto& thread : threads) thread.join();
    EXPECT_EQ(mismatches, std::vector<int>(4, 0));
}

}  // namespace
}  // namespace qel::testing
