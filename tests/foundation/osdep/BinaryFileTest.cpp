// Binary files and whole-count reads and writes: open modes, results on closed
// objects, and reads that fail without consuming anything.
#include "foundation/osdep/BinaryFile.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <utility>
#include <vector>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/time.h>
#include <unistd.h>

#include "foundation/Exception.h"
#include "foundation/FoundationTestSupport.h"

namespace qel::fnd::osdep {
namespace {

using testing::TempDir;
using testing::W;



std::string Content(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), {}};
}

TEST(BinaryFile, ModeFlagsChooseAccessTruncationAndCreation) {
    using F = BinaryFile;
    struct { uint32_t mode; int64_t read, write; const char* after; } cases[] = {
        {0, 1, -1, "old"},                   {F::kRead, 1, -1, "old"},
        {F::kWrite, -1, 1, "Nld"},           {F::kReadWrite, 1, 1, "oNd"},
        {F::kRead | F::kWrite, 1, 1, "oNd"}, {F::kReadWrite | F::kCreate, 1, 1, "oNd"},
        {F::kReadWrite | F::kTruncate | F::kCreate, 0, 1, "N"},
    };
    for (const auto& c : cases) {
        TempDir dir;
        std::ofstream(dir / "f") << "old";
        BinaryFile file(W(dir / "f"), c.mode);
        char byte;
        EXPECT_EQ(file.Read(&byte, 1), c.read) << c.mode;
        EXPECT_EQ(file.Write("N", 1), c.write) << c.mode;
        file.Close();
        EXPECT_EQ(Content(dir / "f"), c.after) << c.mode;
    }
    TempDir dir;
    BinaryFile created(W(dir / "new"), F::kReadWrite | F::kCreate);
    struct stat info {};
    ASSERT_EQ(::fstat(created.Descriptor(), &info), 0);
    EXPECT_EQ(info.st_mode & 0777, 0600u);  // private to the owner
    EXPECT_TRUE(::fcntl(created.Descriptor(), F_GETFD) & FD_CLOEXEC);
}

TEST(BinaryFile, FailedOpenThrowsOrLeavesTheObjectClosed) {
    TempDir dir;
    try {
        BinaryFile file(W(dir / "missing"), BinaryFile::kRead);
        ADD_FAILURE() << "no exception";
    } catch (const PosixError& e) {
        EXPECT_EQ(e.OSErrorCode(), ENOENT);
        EXPECT_STREQ(e.File(), "osdep/BinaryFile");
        EXPECT_EQ(e.Line(), 258);
    }
    BinaryFile file(W(dir / "missing"), BinaryFile::kRead, true);
    EXPECT_EQ(file.Descriptor(), -1);
    char buffer[4];
    errno = 0;
    EXPECT_EQ(file.Read(buffer, 4), -1);
    EXPECT_EQ(file.Write(buffer, 4), -1);
    EXPECT_EQ(file.Seek(0, BinaryFile::kFromStart), -1);
    EXPECT_EQ(file.ReadAll(buffer, 4), -1);
    EXPECT_EQ(file.WriteAll(buffer, 4), -1);
    EXPECT_EQ(errno, 0) << "a closed object made a system call";
    file.Close();

    EXPECT_EQ(file.Open(W(dir / "missing"), BinaryFile::kRead), -1);
    ASSERT_EQ(file.Open(W(dir / "new"), BinaryFile::kWrite | BinaryFile::kCreate), 0);
    int32_t fd = file.Descriptor();
    EXPECT_EQ(file.Open(W(dir / "new"), BinaryFile::kRead), -1);
    EXPECT_EQ(errno, EINVAL);
    EXPECT_EQ(file.Descriptor(), fd);
}

TEST(BinaryFile, SeekAndFailedReadAllKeepTheFullPosition) {
    TempDir dir;
    std::ofstream(dir / "f") << "0123456789";
    BinaryFile file(W(dir / "f"), BinaryFile::kReadWrite);
    char buffer[10] = {};
    ASSERT_EQ(file.Seek(-4, BinaryFile::kFromEnd), 6);
    EXPECT_EQ(file.ReadAll(buffer, 10), -1);  // only 4 left: nothing consumed
    EXPECT_EQ(file.Seek(0, BinaryFile::kFromCurrent), 6);
    EXPECT_EQ(file.ReadAll(buffer, 4), 4);
    EXPECT_EQ(std::string(buffer, 4), "6789");
    EXPECT_EQ(file.ReadAll(buffer, 0), 0);
    EXPECT_EQ(file.WriteAll("", 0), 0);
    // Offsets past 4 GiB survive on the 32-bit target too.
    const int64_t far = (int64_t{1} << 32) + 5;
    ASSERT_EQ(file.Seek(far, BinaryFile::kFromStart), far);
    EXPECT_EQ(file.WriteAll("z", 1), 1);
    EXPECT_EQ(file.Seek(-1, BinaryFile::kFromCurrent), far);
}

TEST(BinaryFile, OwnershipMovesAndEndsWithTheObject) {
    TempDir dir;
    std::ofstream(dir / "a") << "A";
    int32_t first, second;
    {
        BinaryFile a(W(dir / "a"), BinaryFile::kRead);
        BinaryFile b(W(dir / "a"), BinaryFile::kRead);
        first = a.Descriptor();
        second = b.Descriptor();
        BinaryFile moved(std::move(a));
        EXPECT_FALSE(a.IsOpen());
        b = std::move(moved);
        EXPECT_EQ(::fcntl(second, F_GETFD), -1) << "the target's own file stayed open";
        EXPECT_EQ(b.Descriptor(), first);
    }
    EXPECT_EQ(::fcntl(first, F_GETFD), -1);
}

// The other end of a pipe is served from the handler of an interval timer,
// not from another thread or process: each tick interrupts the blocked call
// under test (EINTR, or a short count once some bytes moved) and then moves
// a little data, so every retry path is taken. The handler never blocks.
struct Ticks {
    static inline int fd = -1;
    static inline char* data = nullptr;
    static inline size_t length = 0;
    static inline std::atomic<size_t> moved{0};
    static inline std::atomic<unsigned> count{0};

    static void FeedOneByte(int) {
        int saved = errno;
        if (size_t at = moved; at < length && ::write(fd, data + at, 1) == 1) moved = at + 1;
        errno = saved;
    }
    // Every other tick only, so that the writer also blocks with nothing
    // transferred (EINTR) and not only after a short count.
    static void DrainSome(int) {
        int saved = errno;
        size_t at = moved;
        ssize_t n = count++ % 2 && at < length ? ::read(fd, data + at, std::min<size_t>(length - at, 4096)) : 0;
        if (n > 0) moved = at + static_cast<size_t>(n);
        errno = saved;
    }
};

// SIGALRM every `microseconds` into `handler`, without SA_RESTART.
struct TickingTimer {
    struct sigaction old {};
    TickingTimer(void (*handler)(int), long microseconds) {
        struct sigaction action {};
        action.sa_handler = handler;
        ::sigaction(SIGALRM, &action, &old);
        itimerval timer{{0, microseconds}, {0, microseconds}};
        ::setitimer(ITIMER_REAL, &timer, nullptr);
    }
    ~TickingTimer() {
        itimerval stop{};
        ::setitimer(ITIMER_REAL, &stop, nullptr);
        ::sigaction(SIGALRM, &old, nullptr);
    }
};

TEST(ReadAll, GathersShortAndInterruptedReads) {
    int ends[2];
    ASSERT_EQ(::pipe(ends), 0);
    char text[] = "0123456789", buffer[10] = {};
    Ticks::fd = ends[1], Ticks::data = text, Ticks::length = 10, Ticks::moved = 0;
    int64_t result;
    {
        TickingTimer timer(Ticks::FeedOneByte, 1000);
        result = ReadAll(ends[0], buffer, 10);
    }
    EXPECT_EQ(result, 10);
    EXPECT_EQ(std::string(buffer, 10), "0123456789");
    ::close(ends[1]);
    EXPECT_EQ(ReadAll(ends[0], buffer, 1), -1);  // end of input
    ::close(ends[0]);
    EXPECT_EQ(ReadAll(-1, buffer, 4), -1);
    EXPECT_EQ(errno, EBADF);
}

TEST(WriteAll, CompletesWritesCutShortOrInterrupted) {
    int ends[2];
    ASSERT_EQ(::pipe(ends), 0);
    ASSERT_EQ(::fcntl(ends[0], F_SETFL, O_NONBLOCK), 0);
    std::vector<char> data(256 * 1024), received(data.size());
    for (size_t i = 0; i < data.size(); ++i) data[i] = static_cast<char>(i * 7 + i / 251);
    Ticks::fd = ends[0], Ticks::data = received.data(), Ticks::length = received.size(), Ticks::moved = 0;
    int64_t result;
    {
        TickingTimer timer(Ticks::DrainSome, 500);
        result = WriteAll(ends[1], data.data(), static_cast<uint32_t>(data.size()));
    }
    EXPECT_EQ(result, static_cast<int64_t>(data.size()));
    size_t at = Ticks::moved;
    for (ssize_t n; at < received.size() && (n = ::read(ends[0], &received[at], received.size() - at)) > 0;)
        at += static_cast<size_t>(n);
    EXPECT_TRUE(received == data);
    ::close(ends[0]);
    ::close(ends[1]);
    EXPECT_EQ(WriteAll(-1, "x", 1), -1);
    EXPECT_EQ(errno, EBADF);
}

}  // namespace
}  // namespace qel::fnd::osdep
