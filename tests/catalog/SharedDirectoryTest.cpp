// Where the shared data directory is found, and the catalogue directory below it.
#include <gtest/gtest.h>
#include <stdlib.h>

#include <filesystem>
#include <fstream>
#include <string>

#include "catalog/SharedDirectory.h"
#include "foundation/osdep/IConv.h"

namespace qel::catalog {
namespace {

namespace fs = std::filesystem;

std::string Text(const WString& wide) {
    fnd::NString bytes = fnd::osdep::Narrow(wide);
    return std::string(bytes.Data(), bytes.Length());
}

// A scratch folder for a "share.dir" file, with QELSHAREDDIR restored after.
class SharedDirectoryTest : public ::testing::Test {
protected:
    void SetUp() override {
        if (const char* value = getenv("QELSHAREDDIR")) saved_ = value, hadValue_ = true;
        unsetenv("QELSHAREDDIR");
        char pattern[] = "/tmp/qel-sharedir-XXXXXX";
        ASSERT_NE(mkdtemp(pattern), nullptr);
        dir_ = pattern;
        file_ = dir_ + "/share.dir";
    }
    void TearDown() override {
        if (hadValue_) setenv("QELSHAREDDIR", saved_.c_str(), 1);
        else unsetenv("QELSHAREDDIR");
        std::error_code ignored;
        fs::remove_all(dir_, ignored);
    }
    void WriteShareDir(const std::string& content) const {
        std::ofstream(file_, std::ios::binary | std::ios::trunc) << content;
    }
    std::string Shared() const { return Text(GetSharedDirectory(file_.c_str())); }

    std::string dir_;
    std::string file_;
    std::string saved_;
    bool hadValue_ = false;
};

TEST_F(SharedDirectoryTest, AbsoluteVariableWinsOverTheFile) {
    WriteShareDir("/data/share\n");
    setenv("QELSHAREDDIR", "/opt/share", 1);
    EXPECT_EQ(Shared(), "/opt/share");
    setenv("QELSHAREDDIR", "/opt/share/", 1);
    EXPECT_EQ(Shared(), "/opt/share/");  // used as found
}

TEST_F(SharedDirectoryTest, RelativeOrEmptyVariableGivesTheDefaultNotTheFile) {
    WriteShareDir("/data/share\n");
    for (const char* value : {"share", "", "./x"}) {
        setenv("QELSHAREDDIR", value, 1);
        EXPECT_EQ(Shared(), "/usr/local/morvane/share") << value;
    }
}

TEST_F(SharedDirectoryTest, FileContentCases) {
    const std::string long300 = "/" + std::string(299, 'a');
    struct Case {
        std::string content;
        std::string expected;
    } cases[] = {
        {"/data/share\r\n", "/data/share"},
        {"/data/share", "/data/share"},
        {"/data/share\nsecond line\n", "/data/share"},
        {"/a\rb\nc", "/a"},
        {"/a\nb\rc", "/a"},
        {"/with space/x\n", "/with space/x"},
        {long300, long300.substr(0, 255)},
        {"", "/usr/local/morvane/share"},
        {"\n/data/share\n", "/usr/local/morvane/share"},
        {"data/share\n", "/usr/local/morvane/share"},
        {" /data/share\n", "/usr/local/morvane/share"},
    };
    for (const Case& c : cases) {
        WriteShareDir(c.content);
        EXPECT_EQ(Shared(), c.expected) << c.content;
    }
}

TEST_F(SharedDirectoryTest, MissingOrUnopenableFileGivesTheDefault) {
    EXPECT_EQ(Shared(), "/usr/local/morvane/share");
    fs::create_directory(file_);  // opens, but reading it fails
    EXPECT_EQ(Shared(), "/usr/local/morvane/share");
}

TEST_F(SharedDirectoryTest, CatalogueDirectoryIsBelowTheSharedDirectory) {
    setenv("QELSHAREDDIR", "/opt/share", 1);
    EXPECT_EQ(Text(ComputeSysconfigDirectory()), "/opt/share/uixml/sysconfig");
    setenv("QELSHAREDDIR", "/opt/share/", 1);
    EXPECT_EQ(Text(ComputeSysconfigDirectory()), "/opt/share/uixml/sysconfig");
}

TEST(SysconfigDirectory, KeepsWhatWasSetUntilReplaced) {
    SetSysconfigDirectory(WString(L"/x/uixml/sysconfig"));
    EXPECT_EQ(Text(SysconfigDirectory()), "/x/uixml/sysconfig");
    SetSysconfigDirectory(WString());
    EXPECT_TRUE(SysconfigDirectory().IsEmpty());
}

}  // namespace
}  // namespace qel::catalog
