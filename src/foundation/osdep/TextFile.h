// Line-oriented reading of text files through a standard-library stream.
#pragma once

#include <cstdint>
#include <cstdio>

#include "foundation/StringBase.h"

namespace qel::fnd::osdep {

/// A file opened with the standard library's `fopen`; closed on destruction.
/// Used by one thread at a time.
class TextFile {
public:
    /// Mode indexes and the `fopen` modes they stand for.
    enum Mode : int32_t {
        kRead = 0,          // "r"
        kReadUpdate = 1,    // "r+"
        kWrite = 2,         // "w"
        kWriteUpdate = 3,   // "w+"
        kAppend = 4,        // "a"
        kAppendUpdate = 5,  // "a+"
    };

    TextFile() noexcept = default;
    /// Opens as Open does.
    TextFile(const NString& path, int32_t mode, bool mayFail = false);
    ~TextFile();

    TextFile(const TextFile&) = delete;
    TextFile& operator=(const TextFile&) = delete;
    TextFile(TextFile&& other) noexcept;
    TextFile& operator=(TextFile&& other) noexcept;

    /// Opens `path` (bytes, as handed to the system) with the mode of index
    /// `mode` on a closed object. A failure throws PosixError with its errno
    /// unless `mayFail` is set, when it returns false and the object stays
    /// closed. An open object or a mode index out of range fail with EINVAL.
    bool Open(const NString& path, int32_t mode, bool mayFail = false);

    /// The next line including its line feed. The last piece of the file gets
    /// a line feed appended, even an empty one, so that a file ending in a line
    /// feed yields one more line made of a line feed alone; after that, and on
    /// a read error or a closed object, the result is empty.
    NString ReadLine();

    /// Closes the stream; nothing happens on a closed object.
    void Close() noexcept;
    bool IsOpen() const noexcept { return stream_ != nullptr; }

private:
    std::FILE* stream_ = nullptr;
};

}  // namespace qel::fnd::osdep
