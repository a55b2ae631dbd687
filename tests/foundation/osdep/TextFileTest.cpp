// Text files: what each mode index opens, and the exact lines ReadLine hands
// out up to and after the end of the file.
#include "foundation/osdep/TextFile.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <utility>
#include <vector>
#include <stdlib.h>

#include "foundation/Exception.h"

namespace qel::fnd::osdep {
namespace {

// A fresh directory for one test, removed with everything below it.
struct TempDir {
    std::string path = [] { char p[] = "/tmp/qel-text-XXXXXX"; return std::string(::mkdtemp(p) ? p : "/nonexistent"); }();
    ~TempDir() { std::error_code ignored; std::filesystem::remove_all(path, ignored); }
    NString operator/(const std::string& name) const { return NString((path + "/" + name).c_str()); }
};

void Write(const NString& path, const std::string& text) { std::ofstream(path.CStr(), std::ios::binary) << text; }
std::string Content(const NString& path) {
    std::ifstream in(path.CStr(), std::ios::binary);
    return {std::istreambuf_iterator<char>(in), {}};
}
std::string Line(TextFile& file) {
    NString line = file.ReadLine();
    return std::string(line.Data(), line.Length());
}

TEST(TextFile, ReadLineAppendsALineFeedToTheLastPieceThenGivesEmpty) {
    struct { std::string content; std::vector<std::string> lines; } cases[] = {
        {"a\n", {"a\n", "\n", "", ""}},
        {"a", {"a\n", "", ""}},
        {"", {"\n", "", ""}},
        {"one\ntwo\n\nthree", {"one\n", "two\n", "\n", "three\n", "", ""}},
        {std::string("x\0y\r\n", 5), {std::string("x\0y\r\n", 5), "\n", ""}},
        {std::string(70000, 'q') + "\nz", {std::string(70000, 'q') + "\n", "z\n", ""}},
    };
    for (const auto& c : cases) {
        TempDir dir;
        Write(dir / "t", c.content);
        TextFile file(dir / "t", TextFile::kRead);
        std::vector<std::string> lines;
        for (size_t i = 0; i < c.lines.size(); ++i) lines.push_back(Line(file));
        EXPECT_EQ(lines, c.lines) << c.content.substr(0, 20);
    }
}

TEST(TextFile, ModeIndexesOpenAsTheirStandardModes) {
    struct { int32_t mode; bool createsMissing; const char *contentAfterOpen, *firstLine; } cases[] = {
        {TextFile::kRead, false, "old\n", "old\n"},  {TextFile::kReadUpdate, false, "old\n", "old\n"},
        {TextFile::kWrite, true, "", ""},           {TextFile::kWriteUpdate, true, "", "\n"},
        {TextFile::kAppend, true, "old\n", ""},     {TextFile::kAppendUpdate, true, "old\n", "old\n"},
    };
    for (const auto& c : cases) {
        TempDir dir;
        Write(dir / "old", "old\n");
        TextFile file(dir / "old", c.mode);
        EXPECT_EQ(Content(dir / "old"), c.contentAfterOpen) << c.mode;
        EXPECT_EQ(Line(file), c.firstLine) << c.mode;  // empty: the mode cannot read
        TextFile fresh(dir / "new", c.mode, true);
        EXPECT_EQ(fresh.IsOpen(), c.createsMissing) << c.mode;
        EXPECT_EQ(std::filesystem::exists((dir / "new").CStr()), c.createsMissing) << c.mode;
    }
}

TEST(TextFile, FailedOpenThrowsOrLeavesTheObjectClosed) {
    TempDir dir;
    Write(dir / "t", "line\n");
    struct { NString path; int32_t mode; int error; } cases[] = {
        {dir / "missing", TextFile::kRead, ENOENT}, {dir / "t", -1, EINVAL}, {dir / "t", 6, EINVAL}};
    for (const auto& c : cases) {
        try {
            TextFile file(c.path, c.mode);
            ADD_FAILURE() << "no exception for mode " << c.mode;
        } catch (const PosixError& e) {
            EXPECT_EQ(e.OSErrorCode(), c.error);
            EXPECT_STREQ(e.File(), "osdep/TextFile");
            EXPECT_EQ(e.Line(), 85);
        }
        TextFile quiet;
        EXPECT_FALSE(quiet.Open(c.path, c.mode, true));
        EXPECT_FALSE(quiet.IsOpen());
        EXPECT_EQ(Line(quiet), "");
    }
    TextFile file(dir / "t", TextFile::kRead);
    EXPECT_THROW(file.Open(dir / "t", TextFile::kRead), PosixError);  // already open
    TextFile moved(std::move(file));
    EXPECT_EQ(Line(file), "");
    EXPECT_EQ(Line(moved), "line\n");
    moved.Close();
    EXPECT_EQ(Line(moved), "");
}

}  // namespace
}  // namespace qel::fnd::osdep
