// Line-oriented reading of text files through a standard-library stream.
#include "foundation/osdep/TextFile.h"

#include <cerrno>
#include <cstdlib>
#include <stdio.h>

#include "foundation/Exception.h"

namespace qel::fnd::osdep {

namespace {

constexpr const char* kModule = "osdep/TextFile";
// "e": the web server starts other programs; they must not inherit our files.
constexpr const char* kModes[] = {"re", "r+e", "we", "w+e", "ae", "a+e"};
constexpr int32_t kModeCount = static_cast<int32_t>(sizeof kModes / sizeof kModes[0]);

}  // namespace

TextFile::TextFile(const NString& path, int32_t mode, bool mayFail) { Open(path, mode, mayFail); }

TextFile::~TextFile() { Close(); }

TextFile::TextFile(TextFile&& other) noexcept : stream_(other.stream_) { other.stream_ = nullptr; }

TextFile& TextFile::operator=(TextFile&& other) noexcept {
    if (this != &other) {
        Close();
        stream_ = other.stream_;
        other.stream_ = nullptr;
    }
    return *this;
}

bool TextFile::Open(const NString& path, int32_t mode, bool mayFail) {
    std::FILE* stream = nullptr;
    if (IsOpen() || mode < 0 || mode >= kModeCount) {
        errno = EINVAL;
    } else {
        do {
            stream = std::fopen(path.CStr(), kModes[mode]);
        } while (stream == nullptr && errno == EINTR);
    }
    if (stream == nullptr) {
        if (!mayFail) throw PosixError(kModule, 85);
        return false;
    }
    stream_ = stream;
    return true;
}

NString TextFile::ReadLine() {
    // The end flag is set only by a read that ran into the end, so a set flag
    // means the last piece has been handed out already.
    if (!IsOpen() || std::feof(stream_)) return NString();
    char* line = nullptr;
    size_t capacity = 0;
    ssize_t length = ::getline(&line, &capacity, stream_);
    NString result;
    if (length > 0) {
        result.Assign(line, static_cast<NString::size_type>(length));
    }
    std::free(line);
    if (std::ferror(stream_)) return NString();
    if (result.IsEmpty() || !result.EndsWith('\n')) result.PushBack('\n');
    return result;
}

void TextFile::Close() noexcept {
    if (!IsOpen()) return;
    // Not repeated on EINTR: fclose releases the stream whatever it reports.
    std::fclose(stream_);
    stream_ = nullptr;
}

}  // namespace qel::fnd::osdep
