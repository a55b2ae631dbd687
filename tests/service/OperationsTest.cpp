// The item and device operations end to end: requests through the built
// plug-in against the simulated device, answered as one UTF-8 document.
#include <gtest/gtest.h>

#include <string>

#include "PluginHost.h"

namespace qel::testing {
namespace {

using webhost::Request;

constexpr std::string_view kDevice = R"({"experts": [
  {"programmaticName": "controller", "displayName": "Controller", "version": "1.0",
   "productId": "{00112233-4455-6677-8899-AABBCCDDEEFF}"}],
  "items": [
    {"expert": "controller", "name": "Eth0", "uri": "//localhost/Net/Eth0", "alias": "", "legacyBag": false,
     "properties": [
       {"tag": "0x01006000", "type": 6, "value": "a<b>&'c'", "readOnly": false, "requiresRestart": false},
       {"tag": "0x01006001", "type": 3, "value": 4294967295, "readOnly": false, "requiresRestart": true},
       {"tag": "0x01006002", "type": 1, "value": -5, "readOnly": true, "requiresRestart": false}]},
    {"expert": "controller", "name": "Eth1", "uri": "//localhost/Net/Eth1", "alias": "", "legacyBag": false,
     "properties": []}]})";

const Mapping kServer(L"Server");
const Mapping kAuthenticated(L"ServerAuthenticated");

std::string Document(std::string_view hr, std::string_view body = "") {
    std::string text = "<?xml version='1.0' encoding='utf-8'?><QelSysAPI_Results hr='";
    text.append(hr).append("' version='00010001'>").append(body).append("</QelSysAPI_Results>");
    return text;
}

std::string Ask(const PluginHost& host, const Mapping& mapping, const std::string& form) {
    Request request;
    host.Run(mapping, host.Post(request, form + "&response_encoding=UTF-8&"));
    return request.Output();
}

constexpr std::string_view kEth0Properties =
    "<Property tag='1000000' type='6'>//localhost/Net/Eth0</Property>"
    "<Property tag='1006000' type='6'>a&lt;b&gt;&amp;&apos;c&apos;</Property>"
    "<Property tag='1006001' type='3'>4294967295</Property>"
    "<Property tag='1006002' type='1'>-5</Property>";

TEST(PluginOperations, GetPropertiesOfItem) {
    PluginHost host(RuntimeVariant::kAll, kDevice);
    EXPECT_EQ(Ask(host, kServer, "Function=GetPropertiesOfItem&Plugins=Net&Items=Eth0"),
              Document("0", "<PropertyBag>" + std::string(kEth0Properties) + "</PropertyBag>"));
}

TEST(PluginOperations, SearchForItemNamesAndNothingFound) {
    PluginHost host(RuntimeVariant::kAll, kDevice);
    EXPECT_EQ(Ask(host, kServer, "Function=SearchForItemNames&Plugins=controller"),
              Document("0", "<URIs><URI>//localhost/Net/Eth0</URI><URI>//localhost/Net/Eth1</URI></URIs>"));
    EXPECT_EQ(Ask(host, kServer, "Function=SearchForItemNames&Plugins=Nothing"), Document("1"));
}

TEST(PluginOperations, SearchForItemsAndPropertiesWithAFilterBag) {
    PluginHost host(RuntimeVariant::kAll, kDevice);
    EXPECT_EQ(Ask(host, kServer,
                  "Function=SearchForItemsAndProperties&Plugins=controller&NbrBags=1&NbrTags_0=1&Tag_0_0=1006002"
                  "&Type_0_0=1&Value_0_0=-5"),
              Document("0", "<PropertyBags><PropertyBag>" + std::string(kEth0Properties) +
                                "</PropertyBag></PropertyBags>"));
}

TEST(PluginOperations, PersistedChangesAreReadBack) {
    PluginHost host(RuntimeVariant::kAll, kDevice);
    const std::string persist =
        "Function=PersistPropertyChanges&Plugins=Net&Items=Eth0&NbrTags=1&Tag_0=1006001"
        "&NbrTags_0=1&Tag_0_0=1006001&Type_0_0=3&Value_0_0=7";
    EXPECT_EQ(Ask(host, kServer, persist), Document("8004037D"));
    const std::string answer = Ask(host, kAuthenticated, persist);
    EXPECT_EQ(answer.rfind("<?xml version='1.0' encoding='utf-8'?><QelSysAPI_Results hr='0' version='00010001'>"
                           "<PersistChanges requiresRestart='1' /><DetailedResult>",
                           0),
              0u)
        << answer;
    const std::string after = Ask(host, kServer, "Function=PopulateOrRefreshProperties&Plugins=Net&Items=Eth0"
                                                 "&AllowAsyncNotification=0&NbrTags=1&Tag_0=1006001");
    EXPECT_EQ(after, Document("0", "<PropertyBag><Property tag='1006001' type='3'>7</Property></PropertyBag>"));
}

TEST(PluginOperations, SelfTestReportsTheDeviceTextEvenWhenItFails) {
    PluginHost host(RuntimeVariant::kAll, kDevice);
    EXPECT_EQ(Ask(host, kServer, "Function=DiagnosticSelfTest&DiagnosticMode=63"), Document("8004037D"));
    EXPECT_EQ(Ask(host, kAuthenticated, "Function=DiagnosticSelfTest&DiagnosticMode=63"),
              Document("80070057", "<DetailedResult>Self-test not run: unknown mode 99.</DetailedResult>"));
}

}  // namespace
}  // namespace qel::testing
