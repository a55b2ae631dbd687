// Unbuffered binary file access on a system descriptor.
#include "foundation/osdep/BinaryFile.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "foundation/Exception.h"
#include "foundation/osdep/IConv.h"

namespace qel::fnd::osdep {

static_assert(BinaryFile::kFromStart == SEEK_SET && BinaryFile::kFromCurrent == SEEK_CUR &&
              BinaryFile::kFromEnd == SEEK_END);

namespace {

constexpr const char* kModule = "osdep/BinaryFile";

int OpenFlags(uint32_t mode) {
    int flags;
    if ((mode & BinaryFile::kReadWrite) || ((mode & BinaryFile::kRead) && (mode & BinaryFile::kWrite)))
        flags = O_RDWR;
    else if (mode & BinaryFile::kWrite)
        flags = O_WRONLY;
    else
        flags = O_RDONLY;
    if (mode & BinaryFile::kTruncate) flags |= O_TRUNC;
    if (mode & BinaryFile::kCreate) flags |= O_CREAT;
    // The web server starts other programs; they must not inherit our files.
    return flags | O_CLOEXEC;
}

}  // namespace

int64_t ReadAll(int32_t fd, void* buffer, uint32_t count) {
    char* at = static_cast<char*>(buffer);
    uint32_t done = 0;
    while (done < count) {
        ssize_t r = ::read(fd, at + done, count - done);
        if (r > 0) {
            done += static_cast<uint32_t>(r);
            continue;
        }
        if (r < 0 && errno == EINTR) continue;
        // Give back what was read so that a failed read-all consumes nothing;
        // the caller sees the errno of the read, not of the seek.
        int error = r < 0 ? errno : 0;
        if (done > 0) ::lseek(fd, -static_cast<off_t>(done), SEEK_CUR);
        if (r < 0) errno = error;
        return -1;
    }
    return count;
}

int64_t WriteAll(int32_t fd, const void* buffer, uint32_t count) {
    const char* at = static_cast<const char*>(buffer);
    uint32_t done = 0;
    while (done < count) {
        ssize_t r = ::write(fd, at + done, count - done);
        if (r >= 0) {
            done += static_cast<uint32_t>(r);
            continue;
        }
        if (errno == EINTR) continue;
        return -1;
    }
    return count;
}

BinaryFile::BinaryFile(const WString& path, uint32_t mode, bool mayFail) {
    if (Open(path, mode) != 0 && !mayFail) throw PosixError(kModule, 258);
}

BinaryFile::~BinaryFile() { Close(); }

BinaryFile::BinaryFile(BinaryFile&& other) noexcept : fd_(other.fd_) { other.fd_ = -1; }

BinaryFile& BinaryFile::operator=(BinaryFile&& other) noexcept {
    if (this != &other) {
        Close();
        fd_ = other.fd_;
        other.fd_ = -1;
    }
    return *this;
}

int32_t BinaryFile::Open(const WString& path, uint32_t mode) {
    if (IsOpen()) {
        errno = EINVAL;
        return -1;
    }
    NString bytes = Narrow(path);
    int fd;
    do {
        fd = ::open(bytes.CStr(), OpenFlags(mode), 0600);
    } while (fd < 0 && errno == EINTR);
    if (fd < 0) return -1;
    fd_ = fd;
    return 0;
}

int64_t BinaryFile::Read(void* buffer, uint32_t count) {
    if (!IsOpen()) return -1;
    return ::read(fd_, buffer, count);
}

int64_t BinaryFile::Write(const void* buffer, uint32_t count) {
    if (!IsOpen()) return -1;
    return ::write(fd_, buffer, count);
}

int64_t BinaryFile::Seek(int64_t offset, int32_t whence) {
    if (!IsOpen()) return -1;
    return ::lseek(fd_, static_cast<off_t>(offset), whence);
}

int64_t BinaryFile::ReadAll(void* buffer, uint32_t count) {
    if (!IsOpen()) return -1;
    return osdep::ReadAll(fd_, buffer, count);
}

int64_t BinaryFile::WriteAll(const void* buffer, uint32_t count) {
    if (!IsOpen()) return -1;
    return osdep::WriteAll(fd_, buffer, count);
}

void BinaryFile::Close() noexcept {
    if (!IsOpen()) return;
    // Not repeated on EINTR: Linux releases the descriptor even then, and a
    // second close could hit a descriptor another thread has just been given.
    ::close(fd_);
    fd_ = -1;
}

}  // namespace qel::fnd::osdep
