// The catalogue documents: files copied line by line with declarations
// dropped and the item name stamped, the constants' language fall-backs,
// names that could leave the catalogue directory, and the bindings listing.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <atomic>
#include <string>
#include <thread>
#include <vector>

#include "catalog/CatalogDocuments.h"
#include "catalog/SharedDirectory.h"
#include "foundation/Exception.h"
#include "foundation/osdep/IConv.h"

namespace qel::catalog {
namespace {

namespace fs = std::filesystem;

std::string Text(const NString& bytes) { return std::string(bytes.Data(), bytes.Length()); }
WString Wide(const std::string& text) {
    return fnd::osdep::Widen(NString(text.data(), static_cast<NString::size_type>(text.size())));
}

// A temporary shared data directory that QELSHAREDDIR names, with the kept
// catalogue directory cleared so that every request computes it on demand.
class Catalogue : public ::testing::Test {
protected:
    void SetUp() override {
        char pattern[] = "/tmp/qel-catalogue-XXXXXX";
        ASSERT_NE(mkdtemp(pattern), nullptr);
        share_ = pattern;
        dir_ = share_ + "/uixml/sysconfig";
        fs::create_directories(dir_);
        setenv("QELSHAREDDIR", share_.c_str(), 1);
        SetSysconfigDirectory(WString());
    }
    void TearDown() override {
        SetSysconfigDirectory(WString());
        unsetenv("QELSHAREDDIR");
        std::error_code ignored;
        fs::remove_all(share_, ignored);
    }

    std::string Path(const std::string& name) const { return dir_ + "/" + name; }
    void Write(const std::string& name, const std::string& content) const {
        std::ofstream(Path(name), std::ios::binary | std::ios::trunc) << content;
    }
    void Remove(const std::string& name) const { fs::remove(Path(name)); }

    // The bytes InsertDocument appends for a file holding `content`.
    std::string Inserted(const std::string& content, const char* tag = "<item", const char* name = "N") const {
        Write("doc.xml", content);
        NString out;
        WString wideName = name ? Wide(name) : WString();
        EXPECT_TRUE(InsertDocument(out, Wide(Path("doc.xml")), false, tag, name ? &wideName : nullptr));
        return Text(out);
    }

    struct Answer {
        int32_t status;
        std::string body;
    };
    Answer Definitions(const std::vector<WString>& items, const WString& language) const {
        NString out;
        int32_t status = WriteItemDefinitions(items, language, out);
        return {status, Text(out)};
    }
    Answer Definitions(const std::vector<std::string>& items, const std::string& language) const {
        std::vector<WString> wide;
        for (const std::string& item : items) wide.push_back(Wide(item));
        return Definitions(wide, Wide(language));
    }
    Answer Bindings() const {
        NString out;
        int32_t status = WriteAllBindings(out);
        return {status, Text(out)};
    }

    std::string share_;
    std::string dir_;
};

// --- InsertDocument -----------------------------------------------------------

TEST_F(Catalogue, InsertDocumentLineCases) {
    struct Case {
        const char* content;
        const char* expected;
    } cases[] = {
        // declarations dropped whatever their case, the stamp goes into the
        // first line that survives
        {"<?xml version='1.0'?>\n<item kind='x'>\n</item>", "<item id=\"N\" kind='x'>\n</item>\n"},
        {"<?XML version='1.0'?>\r\n<ITEM/>\n", "<ITEM id=\"N\"/>\n\n"},
        {"<?xml a?>\n<?Xml b?>\n<item/>", "<item id=\"N\"/>\n"},
        // only the first surviving line is examined
        {"<!-- about -->\n<item/>\n", "<!-- about -->\n<item/>\n\n"},
        {"\n<item/>", "\n<item/>\n"},
        {"<item a='1'/>\n<item b='2'/>", "<item id=\"N\" a='1'/>\n<item b='2'/>\n"},
        // a declaration further down goes too; a shorter look-alike stays
        {"<item>\n<?xml x?>\n</item>", "<item id=\"N\">\n</item>\n"},
        {"<?xm\n<item/>", "<?xm\n<item/>\n"},
        // line feeds at the end
        {"", "\n"},
        {"<item/>", "<item id=\"N\"/>\n"},
        {"<item/>\n", "<item id=\"N\"/>\n\n"},
        {"<item/>\n\n", "<item id=\"N\"/>\n\n\n"},
        {"<?xml x?>", ""},
        {"<?xml x?>\n", "\n"},
        // the tag is matched without regard to case and stamped right after itself
        {"<Item\tx='1'/>", "<Item id=\"N\"\tx='1'/>\n"},
        {"<item", "<item id=\"N\"\n"},
        {"<ite/>", "<ite/>\n"},
        {" <item/>", " <item/>\n"},
    };
    for (const Case& c : cases) EXPECT_EQ(Inserted(c.content), c.expected) << c.content;
}

TEST_F(Catalogue, InsertDocumentStampsOnlyWithBothTagAndName) {
    EXPECT_EQ(Inserted("<item/>", nullptr, "N"), "<item/>\n");
    EXPECT_EQ(Inserted("<item/>", "<item", nullptr), "<item/>\n");
    EXPECT_EQ(Inserted("<binding x='1'>\n</binding>\n", "<binding", "a.b"),
              "<binding id=\"a.b\" x='1'>\n</binding>\n\n");
}

TEST_F(Catalogue, InsertDocumentCopiesBytesAsTheyAre) {
    const std::string nul("<item>a\0b</item>", 16);
    EXPECT_EQ(Inserted(nul), std::string("<item id=\"N\">a\0b</item>\n", 24));
    const std::string utf8 = "<c name='Gr\xC3\xB6\xC3\x9F" "e \xE6\x97\xB6\xE9\x92\x9F'/>";
    EXPECT_EQ(Inserted(utf8), utf8 + "\n");
    const std::string longLine = "<item>" + std::string(200000, 'x') + "</item>\n";
    EXPECT_EQ(Inserted(longLine), "<item id=\"N\">" + std::string(200000, 'x') + "</item>\n\n");
}

TEST_F(Catalogue, InsertDocumentAppendsToWhatIsThere) {
    Write("doc.xml", "<c/>");
    NString out("before\n");
    EXPECT_TRUE(InsertDocument(out, Wide(Path("doc.xml")), true, nullptr, nullptr));
    EXPECT_EQ(Text(out), "before\n<c/>\n");
}

TEST_F(Catalogue, InsertDocumentRefusesWhatCannotBeRead) {
    fs::create_directory(Path("folder.xml"));
    Write("plain", "x");
    const std::string paths[] = {Path("missing.xml"), Path("folder.xml"), Path("plain") + "/below.xml"};
    for (const std::string& path : paths) {
        for (bool mustExist : {false, true}) {
            NString out("kept");
            WString name(L"N");
            EXPECT_FALSE(InsertDocument(out, Wide(path), mustExist, "<item", &name)) << path << mustExist;
            EXPECT_EQ(Text(out), "kept") << path;
        }
    }
}

TEST_F(Catalogue, InsertDocumentWithExistenceRequiredInsistsOnAnAbsolutePath) {
    NString out;
    EXPECT_THROW(InsertDocument(out, WString(L"relative.xml"), true, nullptr, nullptr),
                 fnd::exception::InvalidArgument);
    EXPECT_FALSE(InsertDocument(out, WString(L"relative-missing.xml"), false, nullptr, nullptr));
}

// --- WriteItemDefinitions -----------------------------------------------------

TEST_F(Catalogue, ConstantsFallBackInOrder) {
    struct Case {
        const char* language;
        std::vector<std::string> present;  // constants files "I.const.<x>.xml"; "" is the default
        const char* chosen;                // the one copied; nullptr for none
    } cases[] = {
        {"zh-SG", {"zh-SG", "zh-Hans", "zh", ""}, "zh-SG"},
        {"zh-SG", {"zh-Hans", "zh", ""}, "zh-Hans"},
        {"zh-SG", {"zh", ""}, "zh"},
        {"zh-SG", {""}, ""},
        {"zh-CN", {"zh-Hans", "zh", ""}, "zh-Hans"},
        {"ZH-cn", {"zh-Hans", ""}, "zh-Hans"},
        // the full tag is named as received, compared without regard to case
        {"zh-cn", {"zh-cn", "zh-CN", "zh-Hans"}, "zh-cn"},
        {"zh-cn", {"zh-CN", "zh-Hans"}, "zh-Hans"},
        {"zh-TW", {"zh-TW", "zh-Hans", "zh", ""}, "zh-TW"},
        {"zh-TW", {"zh-Hans", "zh", ""}, "zh"},
        {"zh-TW", {"zh-Hans", ""}, ""},
        {"zh-Hant", {"zh-Hant", "zh"}, "zh-Hant"},
        {"Zh-tw", {"zh", "Zh", ""}, "Zh"},
        {"zh", {"zh", ""}, "zh"},
        // other languages: the prefix, never the full tag
        {"de-AT", {"de-AT", "de", ""}, "de"},
        {"de-AT", {"de-AT", ""}, ""},
        {"de", {"de", ""}, "de"},
        {"DE", {"de", ""}, ""},
        {"fr", {"de", ""}, ""},
        {"d", {"d", ""}, ""},
        {"", {"de", ""}, ""},
        {"de", {"de-AT"}, nullptr},
        {"de", {}, nullptr},
    };
    Write("I.def.xml", "<item/>");
    for (const Case& c : cases) {
        std::vector<std::string> files;
        for (const std::string& suffix : c.present) {
            files.push_back(suffix.empty() ? "I.const.xml" : "I.const." + suffix + ".xml");
            Write(files.back(), "<constants from='" + suffix + "'/>");
        }
        std::string expected = "<item id=\"I\"/>\n";
        if (c.chosen) expected += "<constants from='" + std::string(c.chosen) + "'/>\n";
        Answer answer = Definitions(std::vector<std::string>{"I"}, c.language);
        EXPECT_EQ(answer.status, 0) << c.language;
        EXPECT_EQ(answer.body, expected) << c.language << " chosen " << (c.chosen ? c.chosen : "none");
        for (const std::string& file : files) Remove(file);
    }
}

TEST_F(Catalogue, DefinitionsInListOrderWithTheirConstants) {
    Write("System.def.xml", "<?xml version='1.0' encoding='utf-8'?>\n<item kind='system'>\n</item>\n");
    Write("System.const.de.xml", "<constants lang='de'/>\n");
    Write("Clock.def.xml", "<item kind='clock'/>");
    Write("Clock.const.xml", "<constants/>");
    Answer answer = Definitions(std::vector<std::string>{"Clock", "System", "Clock"}, "de-CH");
    EXPECT_EQ(answer.status, 0);
    EXPECT_EQ(answer.body,
              "<item id=\"Clock\" kind='clock'/>\n<constants/>\n"
              "<item id=\"System\" kind='system'>\n</item>\n\n<constants lang='de'/>\n\n"
              "<item id=\"Clock\" kind='clock'/>\n<constants/>\n");
}

TEST_F(Catalogue, MissingDefinitionContributesNothing) {
    Write("gone.const.xml", "<constants/>");
    Write("gone.const.de.xml", "<constants/>");
    fs::create_directory(Path("folder.def.xml"));
    Write("folder.const.xml", "<constants/>");
    EXPECT_EQ(Definitions(std::vector<std::string>{"gone", "folder"}, "de").status, 1);
    EXPECT_EQ(Definitions(std::vector<std::string>{"gone", "folder"}, "de").body, "");
    EXPECT_EQ(Definitions(std::vector<std::string>{}, "de").status, 1);

    Write("a.def.xml", "<item/>");
    Answer mixed = Definitions(std::vector<std::string>{"gone", "a", "folder"}, "de");
    EXPECT_EQ(mixed.status, 0);
    EXPECT_EQ(mixed.body, "<item id=\"a\"/>\n");
}

TEST_F(Catalogue, EmptyDefinitionCountsAsCopied) {
    Write("e.def.xml", "");
    Write("e.const.xml", "<constants/>\n");
    Answer answer = Definitions(std::vector<std::string>{"e"}, "");
    EXPECT_EQ(answer.status, 0);
    EXPECT_EQ(answer.body, "\n<constants/>\n\n");
}

TEST_F(Catalogue, DirectoryIsComputedOnDemandUntilTheFrameworkSetsIt) {
    Write("a.def.xml", "<item/>");
    EXPECT_EQ(Definitions(std::vector<std::string>{"a"}, "").status, 0);

    // Once set, the kept directory is used, whatever the variable says now.
    fs::create_directories(share_ + "/other");
    std::ofstream(share_ + "/other/b.def.xml") << "<item/>";
    SetSysconfigDirectory(Wide(share_ + "/other"));
    EXPECT_EQ(Definitions(std::vector<std::string>{"a"}, "").status, 1);
    EXPECT_EQ(Definitions(std::vector<std::string>{"b"}, "").body, "<item id=\"b\"/>\n");
}

TEST_F(Catalogue, RequestsReadTheDirectoryWhileTheFrameworkReplacesIt) {
    // Both directories hold the item, so every request must find it whichever
    // value it reads; a torn read of the kept string would not.
    Write("a.def.xml", "<item/>");
    fs::create_directories(share_ + "/other");
    std::ofstream(share_ + "/other/a.def.xml") << "<item/>";
    const WString first = Wide(dir_);
    const WString second = Wide(share_ + "/other");
    SetSysconfigDirectory(first);
    std::atomic<bool> stop{false};
    std::atomic<int> failures{0};
    std::vector<std::thread> readers;
    for (int t = 0; t < 2; ++t) {
        readers.emplace_back([&] {
            for (int i = 0; i < 200 && !stop; ++i) {
                NString out;
                if (WriteItemDefinitions({WString(L"a")}, WString(), out) != 0) ++failures;
            }
        });
    }
    for (int i = 0; i < 400; ++i) SetSysconfigDirectory(i % 2 ? first : second);
    stop = true;
    for (std::thread& reader : readers) reader.join();
    EXPECT_EQ(failures.load(), 0);
}

TEST_F(Catalogue, UnsafeItemNamesNameNoItem) {
    // Each of these names would reach a readable file if it were used as is.
    Write("I.def.xml", "<item/>");
    Write("I", "<item secret='1'/>");
    Write("..def.xml", "<item dot='1'/>");
    Write("...def.xml", "<item dotdot='1'/>");
    std::ofstream(share_ + "/outside.def.xml") << "<item outside='1'/>";
    const std::vector<WString> unsafe = {
        Wide("../sysconfig/I"), Wide("../../outside"), Wide(dir_ + "/I"), Wide("./I"), WString(L"."),
        WString(L".."), WString(L"I\0x", 3), WString(L"I/"),
    };
    for (const WString& item : unsafe) {
        Answer answer = Definitions(std::vector<WString>{item}, WString(L"de"));
        EXPECT_EQ(answer.status, 1) << Text(fnd::osdep::Narrow(item));
        EXPECT_EQ(answer.body, "") << Text(fnd::osdep::Narrow(item));
    }
    // Names that merely look odd stay items.
    Write("..x.def.xml", "<item/>");
    Write(" I .def.xml", "<item/>");
    EXPECT_EQ(Definitions(std::vector<std::string>{"..x", " I "}, "").body, "<item id=\"..x\"/>\n<item id=\" I \"/>\n");
}

TEST_F(Catalogue, UnsafeLanguageLeavesOnlyTheDefaultConstants) {
    // "I.const.zh-x" is a folder, so the full tag below would climb out of it
    // to the shared data directory if it were used as is.
    Write("I.def.xml", "<item/>");
    Write("I.const.xml", "<constants default='1'/>");
    Write("I.const.zh.xml", "<constants zh='1'/>");
    Write("I.const.de.xml", "<constants de='1'/>");
    fs::create_directory(Path("I.const.zh-x"));
    std::ofstream(share_ + "/leak.xml") << "<constants leak='1'/>";
    const std::vector<WString> unsafe = {
        Wide("zh-x/../../../leak"), Wide("zh/"), Wide("/de"), WString(L"de\0x", 4), WString(L"zh\0", 3),
    };
    for (const WString& language : unsafe) {
        Answer answer = Definitions(std::vector<WString>{WString(L"I")}, language);
        EXPECT_EQ(answer.status, 0);
        EXPECT_EQ(answer.body, "<item id=\"I\"/>\n<constants default='1'/>\n") << Text(fnd::osdep::Narrow(language));
    }
}

TEST_F(Catalogue, FailedStatusQueryLeavesTheOutputAsItWas) {
    // A link that points at itself cannot be queried; that is a failure of
    // the file system, not a missing file, and it leaves the request.
    Write("a.def.xml", "<item/>");
    Write("loop.def.xml", "<item/>");
    ASSERT_EQ(symlink("loop.const.xml", Path("loop.const.xml").c_str()), 0);
    NString out("before");
    EXPECT_THROW(WriteItemDefinitions({WString(L"a"), WString(L"loop")}, WString(), out), fnd::exception::Exception);
    EXPECT_EQ(Text(out), "before");
}

// --- WriteAllBindings ---------------------------------------------------------

TEST_F(Catalogue, BindingsSortedAndNamedAfterTheirFiles) {
    Write("clock.binding.xml", "<?xml version='1.0'?>\n<binding>\n</binding>\n");
    Write("a.b.binding.xml", "<binding/>");
    Write("eth0.binding.xml", "<!-- none -->");
    Write("eth0.def.xml", "<item/>");
    Write("eth0.binding.xml.bak", "<binding/>");
    Write(".hidden.binding.xml", "<binding/>");
    fs::create_directory(Path("folder.binding.xml"));
    Answer answer = Bindings();
    EXPECT_EQ(answer.status, 0);
    EXPECT_EQ(answer.body,
              "<binding id=\"a.b\"/>\n"
              "<binding id=\"clock\">\n</binding>\n\n"
              "<!-- none -->\n");
}

TEST_F(Catalogue, NoReadableBindingAnswersFalse) {
    EXPECT_EQ(Bindings().status, 1);
    fs::create_directory(Path("folder.binding.xml"));
    EXPECT_EQ(Bindings().status, 1);
    EXPECT_EQ(Bindings().body, "");
    fs::remove_all(dir_);
    EXPECT_EQ(Bindings().status, 1);

    std::ofstream(dir_) << "";  // the catalogue directory is now a plain file
    ASSERT_TRUE(fs::is_regular_file(dir_));
    EXPECT_EQ(Bindings().status, 1);
}

TEST_F(Catalogue, EmptyBindingCountsAsCopied) {
    Write("x.binding.xml", "");
    Answer answer = Bindings();
    EXPECT_EQ(answer.status, 0);
    EXPECT_EQ(answer.body, "\n");
}

}  // namespace
}  // namespace qel::catalog
