// Unbuffered binary file access on a system descriptor, and whole-count reads
// and writes on raw descriptors.
#pragma once

#include <cstdint>

#include "foundation/StringBase.h"

namespace qel::fnd::osdep {

/// Reads exactly `count` bytes from `fd`, repeating short and interrupted
/// reads, and returns `count`. When the end of the file or an error comes
/// first, the position is moved back by what was read, so that nothing is
/// consumed, and -1 is returned (errno from the failed read; unchanged at the
/// end of the file). A count of 0 returns 0.
int64_t ReadAll(int32_t fd, void* buffer, uint32_t count);

/// Writes exactly `count` bytes to `fd`, repeating short and interrupted
/// writes, and returns `count`; -1 on an error, with the bytes already written
/// left in place. A count of 0 returns 0.
int64_t WriteAll(int32_t fd, const void* buffer, uint32_t count);

/// A file opened with the system's `open`; closed on destruction. Used by one
/// thread at a time.
class BinaryFile {
public:
    /// Mode flags, combined with "|". Without kWrite or kReadWrite the file is
    /// opened for reading only; kRead | kWrite means kReadWrite.
    enum Mode : uint32_t {
        kRead = 1,
        kWrite = 2,
        kReadWrite = 4,
        kTruncate = 8,
        kCreate = 16,  // a new file gets permission bits 0600
    };
    /// Origins for Seek, with the values of the system's SEEK_SET, SEEK_CUR
    /// and SEEK_END.
    enum Whence : int32_t { kFromStart = 0, kFromCurrent = 1, kFromEnd = 2 };

    BinaryFile() noexcept = default;
    /// Opens `path`. A failure throws PosixError with its errno unless
    /// `mayFail` is set; the object then stays closed.
    BinaryFile(const WString& path, uint32_t mode, bool mayFail = false);
    ~BinaryFile();

    BinaryFile(const BinaryFile&) = delete;
    BinaryFile& operator=(const BinaryFile&) = delete;
    BinaryFile(BinaryFile&& other) noexcept;
    BinaryFile& operator=(BinaryFile&& other) noexcept;

    /// Opens `path` on a closed object: 0 on success, -1 with errno set on
    /// failure (EINVAL when the object is open already).
    int32_t Open(const WString& path, uint32_t mode);

    // The system's read, write and lseek; -1 with no system call when closed.
    int64_t Read(void* buffer, uint32_t count);
    int64_t Write(const void* buffer, uint32_t count);
    int64_t Seek(int64_t offset, int32_t whence);

    /// The free ReadAll and WriteAll on this file; -1 when closed.
    int64_t ReadAll(void* buffer, uint32_t count);
    int64_t WriteAll(const void* buffer, uint32_t count);

    /// Closes the file; nothing happens on a closed object.
    void Close() noexcept;
    bool IsOpen() const noexcept { return fd_ >= 0; }
    /// The system descriptor, -1 when closed; still owned by this object.
    int32_t Descriptor() const noexcept { return fd_; }

private:
    int32_t fd_ = -1;
};

}  // namespace qel::fnd::osdep
