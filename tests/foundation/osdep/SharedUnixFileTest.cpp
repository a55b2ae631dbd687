// Shared directories and lock files: bits that let every local user in, and
// links planted by another user that must never be followed.
#include "foundation/osdep/CreateSharedUnixDir.h"
#include "foundation/osdep/CreateSharedUnixFile.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "foundation/Exception.h"
#include "foundation/FoundationTestSupport.h"

namespace qel::fnd::osdep {
namespace {

using testing::N;
using testing::TempDir;
using testing::W;



void MakeFile(const std::string& path, mode_t bits, const std::string& content) {
    std::ofstream(path) << content;
    ASSERT_EQ(::chmod(path.c_str(), bits), 0);
}
std::string Content(const std::string& path) {
    std::ifstream in(path);
    return {std::istreambuf_iterator<char>(in), {}};
}
mode_t Bits(const std::string& path) {
    struct stat info {};
    return ::lstat(path.c_str(), &info) == 0 ? info.st_mode & 07777 : 0;
}

// Runs `check` in a child process as "nobody" (the tests run as root) and
// returns its exit code, or null with the reason why it cannot run here.
template <typename F>
const char* AsAnotherUser(F&& check, int* code) {
    if (::geteuid() != 0) return "needs root to act as another user";
    pid_t pid = ::fork();
    if (pid == 0) {
        if (::setgid(65534) != 0 || ::setuid(65534) != 0) ::_exit(77);
        int result = 99;
        try { result = check(); } catch (...) {}
        ::_exit(result);
    }
    int status = 0;
    ::waitpid(pid, &status, 0);
    // Under some user-mode emulators the C library's fork leaves a child that
    // crashes before it runs anything.
    if (WIFSIGNALED(status)) return "forked children crash here";
    *code = WEXITSTATUS(status);
    return *code == 77 ? "cannot drop root privileges here" : nullptr;
}

TEST(CreateSharedUnixDir, CreatesOrOpensUpTheDirectoryForEveryone) {
    TempDir dir;
    mode_t old = ::umask(022);
    CreateSharedUnixDir(W(dir / "a/b"));
    ::umask(old);
    EXPECT_EQ(Bits(dir / "a"), 0700u);
    EXPECT_EQ(Bits(dir / "a/b"), 0777u);
    ASSERT_EQ(::chmod((dir / "a").c_str(), 0700), 0);
    CreateSharedUnixDir(W(dir / "a"));
    EXPECT_EQ(Bits(dir / "a"), 0777u);
    MakeFile(dir / "f", 0600, "x");
    EXPECT_THROW(CreateSharedUnixDir(W(dir / "f")), exception::ObjectAlreadyExists);
}

TEST(CreateSharedUnixDir, DirectoryOfAnotherUserKeepsItsBitsSilently) {
    TempDir dir;
    ASSERT_EQ(::mkdir((dir / "d").c_str(), 0755), 0);
    ASSERT_EQ(::chmod((dir / "d").c_str(), 0755), 0);
    int code = -1;
    const WString path = W(dir / "d");
    if (const char* why = AsAnotherUser([&] { CreateSharedUnixDir(path); return 0; }, &code)) GTEST_SKIP() << why;
    EXPECT_EQ(code, 0) << "the refusal to change the bits was reported";
    EXPECT_EQ(Bits(dir / "d"), 0755u);
}

TEST(CreateSharedUnixDir, PlantedLinkIsRefusedAndItsTargetLeftAlone) {
    TempDir dir;
    ASSERT_EQ(::mkdir((dir / "private").c_str(), 0700), 0);
    ASSERT_EQ(::symlink((dir / "private").c_str(), (dir / "shared").c_str()), 0);
    for (const char* name : {"shared", "shared/"}) {
        try {
            CreateSharedUnixDir(W(dir / name));
            ADD_FAILURE() << name << " was opened up";
        } catch (const PosixError& e) {
            // Linux reports a link opened as a directory without following
            // it as "not a directory".
            EXPECT_TRUE(e.OSErrorCode() == ENOTDIR || e.OSErrorCode() == ELOOP) << name;
            EXPECT_STREQ(e.File(), "osdep/CreateSharedUnixDir");
        }
    }
    EXPECT_EQ(Bits(dir / "private"), 0700u);
}

TEST(CreateSharedUnixFile, CreatesOrOpensTheFileForEveryoneWithoutTruncating) {
    TempDir dir;
    mode_t old = ::umask(077);
    int32_t fd = CreateSharedUnixFile(N(dir / "lock"));
    ::umask(old);
    ASSERT_GE(fd, 0);
    EXPECT_EQ(::write(fd, "state", 5), 5);
    EXPECT_TRUE(::fcntl(fd, F_GETFD) & FD_CLOEXEC);  // must not leak into programs the server starts
    ::close(fd);
    EXPECT_EQ(Bits(dir / "lock"), 0666u);
    ASSERT_EQ(::chmod((dir / "lock").c_str(), 0600), 0);
    ::close(CreateSharedUnixFile(N(dir / "lock")));
    EXPECT_EQ(Bits(dir / "lock"), 0666u);
    EXPECT_EQ(Content(dir / "lock"), "state");
}

TEST(CreateSharedUnixFile, PlantedLinkIsRefusedAndItsTargetLeftAlone) {
    TempDir dir;
    MakeFile(dir / "secret", 0600, "private");
    ASSERT_EQ(::symlink((dir / "secret").c_str(), (dir / "lock").c_str()), 0);
    ASSERT_EQ(::symlink((dir / "elsewhere").c_str(), (dir / "dangling").c_str()), 0);
    for (const char* name : {"lock", "dangling"}) {
        try {
            ::close(CreateSharedUnixFile(N(dir / name)));
            ADD_FAILURE() << name << " was opened";
        } catch (const PosixError& e) {
            EXPECT_EQ(e.OSErrorCode(), ELOOP) << name;
            EXPECT_STREQ(e.File(), "osdep/CreateSharedUnixFile");
            EXPECT_EQ(e.Line(), 58);
        }
    }
    EXPECT_EQ(Bits(dir / "secret"), 0600u);
    EXPECT_EQ(Content(dir / "secret"), "private");
    EXPECT_FALSE(std::filesystem::exists(dir / "elsewhere"));
}

TEST(CreateSharedUnixFile, FileOfAnotherUserIsUsedAsItsOwnerLeftIt) {
    TempDir dir;
    MakeFile(dir / "open", 0646, "theirs");
    MakeFile(dir / "closed", 0600, "theirs");
    int code = -1;
    const char* why = AsAnotherUser(
        [open = N(dir / "open"), closed = N(dir / "closed")] {
            int32_t fd = CreateSharedUnixFile(open);  // bits cannot be changed: accepted
            bool written = ::pwrite(fd, "ours", 4, 0) == 4;
            ::close(fd);
            if (!written) return 1;
            try {
                ::close(CreateSharedUnixFile(closed));  // refused on every attempt
            } catch (const PosixError& e) {
                return e.OSErrorCode() == EACCES && e.Line() == 58 ? 0 : 2;
            }
            return 3;
        },
        &code);
    if (why) GTEST_SKIP() << why;
    EXPECT_EQ(code, 0);
    EXPECT_EQ(Bits(dir / "open"), 0646u);
    EXPECT_EQ(Content(dir / "open"), "oursrs");
}

}  // namespace
}  // namespace qel::fnd::osdep
