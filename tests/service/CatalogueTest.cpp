// The catalogue routes through the loaded plug-in: failures of the file
// system answer 0x80004005 with no half document, names that could leave
// the catalogue directory name nothing, and the shipped sample catalogue.
#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include "PluginHost.h"

namespace qel::testing {
namespace {

namespace fs = std::filesystem;
using webhost::Request;

std::string Utf8Document(std::string_view root, std::string_view hr, std::string_view body = "") {
    std::string text = "<?xml version='1.0' encoding='utf-8'?><";
    text.append(root).append(" hr='").append(hr).append("' version='00010001'>").append(body);
    text.append("</").append(root).append(">");
    return text;
}

std::string Definitions(const PluginHost& host, std::string_view items, std::string_view language) {
    Request request("GET");
    request.SetVariable("items", items);
    request.SetVariable("loc", language);
    host.Run(Mapping(L"ItemDefs"), request);
    EXPECT_EQ(request.Calls().writeOutput, 1u);
    return request.Output();
}

TEST(PluginCatalogue, FileSystemFailureAnswersFailWithoutAHalfDocument) {
    PluginHost host;
    host.WriteFile("uixml/sysconfig/a.def.xml", "<item/>\n");
    host.WriteFile("uixml/sysconfig/b.def.xml", "<item/>\n");
    const std::string dir = host.ShareDir() + "/uixml/sysconfig";
    // A link to itself: querying it fails with something other than "missing".
    ASSERT_EQ(symlink("b.const.xml", (dir + "/b.const.xml").c_str()), 0);
    EXPECT_EQ(Definitions(host, "a,b", ""), Utf8Document("definitions", "80004005"));
    EXPECT_EQ(Definitions(host, "a", ""), Utf8Document("definitions", "0", "<item id=\"a\"/>\n\n"));

    // A Chinese tag is used in full, and a name too long for the system fails
    // the request the same way.
    EXPECT_EQ(Definitions(host, "a", "zh-" + std::string(300, 'x')), Utf8Document("definitions", "80004005"));
}

TEST(PluginCatalogue, NamesThatCouldLeaveTheDirectoryNameNothing) {
    PluginHost host;
    host.WriteFile("uixml/sysconfig/a.def.xml", "<item/>");
    host.WriteFile("uixml/sysconfig/a.const.xml", "<c default='1'/>");
    host.WriteFile("uixml/sysconfig/a.const.zh.xml", "<c zh='1'/>");
    host.WriteFile("leak.def.xml", "<item leak='1'/>");
    host.WriteFile("leak.xml", "<c leak='1'/>");
    fs::create_directories(host.ShareDir() + "/uixml/sysconfig/a.const.zh-x");
    const std::string absolute = host.ShareDir() + "/uixml/sysconfig/a";
    for (const std::string& items : {std::string("../../leak"), absolute, std::string("..,."), std::string("./a")})
        EXPECT_EQ(Definitions(host, items, "de"), Utf8Document("definitions", "1")) << items;
    EXPECT_EQ(Definitions(host, "a", "zh-x/../../../leak"),
              Utf8Document("definitions", "0", "<item id=\"a\"/>\n<c default='1'/>\n"));
}

// The sample catalogue installed with the simulated device.
class SampleCatalogue : public ::testing::Test {
protected:
    void SetUp() override {
        const fs::path source = fs::path(__FILE__).parent_path() / "../../platform/share/uixml/sysconfig";
        ASSERT_TRUE(fs::is_directory(source)) << source;
        fs::create_directories(host_.ShareDir() + "/uixml");
        fs::copy(source, host_.ShareDir() + "/uixml/sysconfig", fs::copy_options::recursive);
    }
    PluginHost host_;
};

TEST_F(SampleCatalogue, EveryItemHasItsDefinitionAndConstantsInEachLanguage) {
    struct Case {
        const char* language;
        const char* marker;  // what the constants of that language say for the clock
    } cases[] = {
        {"", "lang=\"en\""}, {"en-GB", "lang=\"en\""}, {"de-DE", "Datum und Uhrzeit"},
        {"zh-CN", "\xE6\x97\xA5\xE6\x9C\x9F\xE5\x92\x8C\xE6\x97\xB6\xE9\x97\xB4"}, {"zh-SG", "lang=\"zh-Hans\""},
    };
    for (const Case& c : cases) {
        std::string answer = Definitions(host_, "System,Ethernet0,Clock", c.language);
        EXPECT_EQ(answer.rfind("<?xml version='1.0' encoding='utf-8'?><definitions hr='0' version='00010001'>", 0), 0u)
            << c.language;
        EXPECT_TRUE(answer.ends_with("</constants>\n\n</definitions>")) << c.language;
        size_t system = answer.find("<item id=\"System\" ");
        size_t ethernet = answer.find("<item id=\"Ethernet0\" ");
        size_t clock = answer.find("<item id=\"Clock\" ");
        ASSERT_NE(system, std::string::npos);
        ASSERT_NE(ethernet, std::string::npos);
        ASSERT_NE(clock, std::string::npos);
        EXPECT_LT(system, ethernet);
        EXPECT_LT(ethernet, clock);
        EXPECT_NE(answer.find(c.marker, clock), std::string::npos) << c.language;
        EXPECT_EQ(answer.find("<?xml", 1), std::string::npos) << "declarations are dropped";
        EXPECT_NE(answer.find("tag=\"0x0103A000\""), std::string::npos);
    }
}

TEST_F(SampleCatalogue, BindingsOfAllItemsInSortedOrder) {
    Request request("GET");
    host_.Run(Mapping(L"ItemBindings"), request);
    const std::string& answer = request.Output();
    EXPECT_EQ(answer.rfind("<?xml version='1.0' encoding='utf-8'?><allbindings hr='0' version='00010001'>", 0), 0u);
    size_t clock = answer.find("<binding id=\"Clock\" ");
    size_t ethernet = answer.find("<binding id=\"Ethernet0\" ");
    size_t system = answer.find("<binding id=\"System\" ");
    ASSERT_NE(clock, std::string::npos);
    EXPECT_LT(clock, ethernet);
    EXPECT_LT(ethernet, system);
    EXPECT_NE(system, std::string::npos);
}

}  // namespace
}  // namespace qel::testing
