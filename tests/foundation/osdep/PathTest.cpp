// Path text rules, file-system queries and directory creation as callers see
// them.
#include "foundation/osdep/path.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <optional>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

#include "foundation/Exception.h"
#include "foundation/FoundationTestSupport.h"

namespace qel::fnd::osdep {
namespace {

using testing::S;
using testing::TempDir;
using testing::ThrownBy;
using testing::W;




TEST(PathText, JoinFileNameParentAndTrailingSlash) {
    struct { const char *directory, *name, *joined; } joins[] = {
        {"/a/", "b", "/a/b"}, {"/a", "b", "/a/b"}, {"/a", "/b", "/b"}, {"", "b", "b"},
        {"a", "b/c", "a/b/c"}, {"/", "b", "/b"}, {"/a", "", "/a/"}, {"", "", ""},
    };
    for (const auto& c : joins) {
        EXPECT_EQ(S(JoinPath(W(c.directory), W(c.name))), c.joined) << c.directory << " + " << c.name;
        EXPECT_STREQ(JoinPath(NString(c.directory), NString(c.name)).CStr(), c.joined);
    }
    struct { const char *path, *name, *parent, *slashed; } paths[] = {
        {"/x/y.binding.xml", "y.binding.xml", "/x", "/x/y.binding.xml/"},
        {"name", "name", "", "name/"}, {"/a/b", "b", "/a", "/a/b/"}, {"//a//b", "b", "//a", "//a//b/"},
        {"/a", "a", "/", "/a/"}, {"/a/b/", "", "/a/b", "/a/b/"}, {"/a/b//", "", "/a/b", "/a/b//"},
        {"a/b/c", "c", "a/b", "a/b/c/"}, {"//a", "a", "//", "//a/"}, {"/", "", "/", "/"},
        {"///", "", "///", "///"},
    };
    for (const auto& c : paths) {
        EXPECT_EQ(S(FileName(W(c.path))), c.name) << c.path;
        EXPECT_EQ(S(ParentDirectory(W(c.path))), c.parent) << c.path;
        EXPECT_EQ(S(EnsureTrailingSlash(W(c.path))), c.slashed) << c.path;
    }
    EXPECT_EQ(S(ParentDirectory(WString())), "");
    auto e = ThrownBy<exception::InvalidArgument>([] { EnsureTrailingSlash(WString()); });
    ASSERT_TRUE(e);
    EXPECT_STREQ(e->File(), "osdep/path");
    EXPECT_EQ(e->Line(), 508);
}

TEST(PathQueries, DirectoriesAndRegularFilesFollowingLinks) {
    TempDir dir;
    std::ofstream(dir / "file") << "x";
    ASSERT_EQ(::mkdir((dir / "sub").c_str(), 0700), 0);
    ASSERT_EQ(::symlink((dir / "sub").c_str(), (dir / "dirlink").c_str()), 0);
    ASSERT_EQ(::symlink((dir / "file").c_str(), (dir / "filelink").c_str()), 0);
    ASSERT_EQ(::symlink((dir / "gone").c_str(), (dir / "dangling").c_str()), 0);
    struct { std::string path; bool isDirectory, isFile; } cases[] = {
        {dir / "sub", true, false},      {dir / "sub/", true, false},       {dir / "dirlink", true, false},
        {dir / "file", false, true},     {dir / "filelink", false, true},   {"/dev/null", false, false},
        {dir / "missing", false, false}, {dir / "dangling", false, false},
        {dir / "file/below", false, false},  // ENOTDIR: does not exist either
    };
    for (const auto& c : cases) {
        EXPECT_EQ(IsDirectory(W(c.path)), c.isDirectory) << c.path;
        EXPECT_EQ(IsFile(W(c.path)), c.isFile) << c.path;
    }
    // Relative paths: never a directory, and a caller error for IsFile.
    for (const char* path : {".", "file", ""}) {
        EXPECT_FALSE(IsDirectory(W(path))) << path;
        auto e = ThrownBy<exception::InvalidArgument>([&] { IsFile(W(path)); });
        ASSERT_TRUE(e) << path;
        EXPECT_EQ(e->Line(), 998);
    }
}

TEST(PathQueries, IsFileReportsOtherFailuresAsPosixErrors) {
    TempDir dir;
    ASSERT_EQ(::symlink((dir / "b").c_str(), (dir / "a").c_str()), 0);
    ASSERT_EQ(::symlink((dir / "a").c_str(), (dir / "b").c_str()), 0);
    struct { std::string path; int error; } cases[] = {{dir / "a", ELOOP}, {dir / std::string(300, 'n'), ENAMETOOLONG}};
    for (const auto& c : cases) {
        auto e = ThrownBy<PosixError>([&] { IsFile(W(c.path)); });
        ASSERT_TRUE(e) << c.error;
        EXPECT_EQ(e->OSErrorCode(), c.error);
        EXPECT_STREQ(e->File(), "osdep/path");
        EXPECT_EQ(e->Line(), 1044);
    }
}

TEST(CreateDirectories, CreatesMissingLevelsPrivateAndPassesOverExistingOnes) {
    TempDir dir;
    ASSERT_EQ(::mkdir((dir / "x").c_str(), 0755), 0);
    ASSERT_EQ(::chmod((dir / "x").c_str(), 0755), 0);
    CreateDirectories(W(dir / "x//y/z///"));
    CreateDirectories(W(dir / "x/y"));  // all there already
    mode_t mask = ::umask(0);
    ::umask(mask);
    struct { const char* level; mode_t bits; } levels[] = {{"x", 0755}, {"x/y", 0700 & ~mask}, {"x/y/z", 0700 & ~mask}};
    for (const auto& c : levels) {
        struct stat info {};
        ASSERT_EQ(::stat((dir / c.level).c_str(), &info), 0) << c.level;
        EXPECT_TRUE(S_ISDIR(info.st_mode)) << c.level;
        EXPECT_EQ(info.st_mode & 07777, c.bits) << c.level;
    }
}

TEST(CreateDirectories, RefusalsNameTheirCause) {
    TempDir dir;
    std::ofstream(dir / "file") << "x";
    struct { const char* path; int32_t line; } invalid[] = {{"x/y", 643}, {"", 643}, {"/", 670}, {"///", 670}};
    for (const auto& c : invalid) {
        auto e = ThrownBy<exception::InvalidArgument>([&] { CreateDirectories(W(c.path)); });
        ASSERT_TRUE(e) << c.path;
        EXPECT_EQ(e->Line(), c.line) << c.path;
    }
    for (const char* path : {"file/y", "file", "file/"}) {
        auto e = ThrownBy<exception::ObjectAlreadyExists>([&] { CreateDirectories(W(dir / path)); });
        ASSERT_TRUE(e) << path;
        EXPECT_STREQ(e->File(), "osdep/path");
        EXPECT_EQ(e->Line(), 523);
    }
    // Any other refusal of the system; a too long name is one even for root.
    const std::string tooLong = dir / (std::string(300, 'n') + "/y");
    auto e = ThrownBy<exception::AccessDenied>([&] { CreateDirectories(W(tooLong)); });
    ASSERT_TRUE(e);
    EXPECT_EQ(std::string(e->what()), "Access denied: " + tooLong);
    EXPECT_EQ(e->Line(), 525);
}

}  // namespace
}  // namespace qel::fnd::osdep
