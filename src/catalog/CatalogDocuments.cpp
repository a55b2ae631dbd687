// Copying definition, constant and binding files into one document.
#include "catalog/CatalogDocuments.h"

#include <strings.h>

#include <cerrno>
#include <cstring>
#include <memory>

#include "catalog/SharedDirectory.h"
#include "foundation/Exception.h"
#include "foundation/osdep/BinaryFile.h"
#include "foundation/osdep/FindFiles.h"
#include "foundation/osdep/IConv.h"
#include "foundation/osdep/path.h"

namespace qel::catalog {

namespace {

// Client-supplied names become file names in the catalogue directory; a
// name that could step out of it (a slash, "." or "..", or a NUL that would
// cut the name short at the system call) names no item.
bool IsSafeItemName(const WString& name) {
    return name.Find(L'/') == WString::npos && name.Find(L'\0') == WString::npos && !(name == L".") &&
           !(name == L"..");
}

bool IsSafeLanguage(const WString& language) {
    return language.Find(L'/') == WString::npos && language.Find(L'\0') == WString::npos;
}

// Computed on demand when no API request has created the framework yet; not
// kept, so that the framework's creation stays the one place that sets it.
WString CatalogueDirectory() {
    WString directory = SysconfigDirectory();
    return directory.IsEmpty() ? ComputeSysconfigDirectory() : directory;
}

WString ItemFile(const WString& directory, const WString& item, const WString& suffix) {
    return fnd::osdep::JoinPath(directory, item + suffix);
}

// A request that fails half-way answers a failure status; the half-written
// document must not go out under it.
class OutputRollback {
public:
    explicit OutputRollback(NString& out) : out_(out), length_(out.Length()) {}
    ~OutputRollback() {
        if (armed_) out_.Resize(length_);
    }
    OutputRollback(const OutputRollback&) = delete;
    OutputRollback& operator=(const OutputRollback&) = delete;
    void Commit() noexcept { armed_ = false; }

private:
    NString& out_;
    NString::size_type length_;
    bool armed_ = true;
};

}  // namespace

namespace {

constexpr uint32_t kReadChunk = 16 * 1024;

// A file's bytes, reused for every file of a request. Not a string: growing
// one fills the new space, a cost per byte that a read overwrites anyway.
class ReadBuffer {
public:
    char* Data() noexcept { return data_.get(); }
    size_t Size() const noexcept { return size_; }
    void Clear() noexcept { size_ = 0; }
    void Truncate(size_t size) noexcept { size_ = size < size_ ? size : size_; }
    // Room for `count` more bytes after the end.
    char* Spare(size_t count) {
        if (capacity_ - size_ < count) {
            size_t capacity = capacity_ * 2 > size_ + count ? capacity_ * 2 : size_ + count;
            std::unique_ptr<char[]> grown(new char[capacity]);
            if (size_) std::memcpy(grown.get(), data_.get(), size_);
            data_ = std::move(grown);
            capacity_ = capacity;
        }
        return data_.get() + size_;
    }
    void Grow(size_t count) noexcept { size_ += count; }

private:
    std::unique_ptr<char[]> data_;
    size_t capacity_ = 0;
    size_t size_ = 0;
};

// Reads the whole file into `buffer`. False when the first read fails (a
// directory opens, then cannot be read). A later read error keeps only the
// complete lines read so far, like a line reader that stops at the error;
// `complete` then says that no unfinished last line follows.
bool ReadWhole(fnd::osdep::BinaryFile& file, ReadBuffer& buffer, bool& complete) {
    buffer.Clear();
    complete = false;
    for (;;) {
        char* spare = buffer.Spare(kReadChunk);
        int64_t got;
        do {
            got = file.Read(spare, kReadChunk);
        } while (got < 0 && errno == EINTR);
        if (got == 0) return true;
        if (got < 0) {
            const char* data = buffer.Data();
            size_t end = buffer.Size();
            while (end > 0 && data[end - 1] != '\n') --end;
            if (end == 0) return false;
            buffer.Truncate(end);
            complete = true;
            return true;
        }
        buffer.Grow(static_cast<size_t>(got));
    }
}

bool IsDeclaration(const char* line, size_t length) {
    return length >= 5 && line[0] == '<' && line[1] == '?' && ::strncasecmp(line, "<?xml", 5) == 0;
}

// The copy of one file, with the line semantics of a text reader: every line
// keeps its line feed and the last piece gets one, so a file that ends with
// a line feed yields one more, and an empty file a single one. The file is
// read whole and copied in runs between the lines that change, instead of a
// line at a time, because a catalogue request copies megabytes this way.
bool InsertFile(NString& out, ReadBuffer& scratch, const WString& path, bool mustExist, const char* startTag,
                const WString* name) {
    if (mustExist && !fnd::osdep::IsFile(path)) return false;
    fnd::osdep::BinaryFile file(path, fnd::osdep::BinaryFile::kRead, true);
    if (!file.IsOpen()) return false;
    bool complete = false;
    if (!ReadWhole(file, scratch, complete)) return false;
    file.Close();

    const size_t tagLength = startTag ? std::strlen(startTag) : 0;
    bool stampPending = startTag && name;
    const char* data = scratch.Data();
    const size_t size = scratch.Size();
    size_t run = 0;  // start of the bytes not yet copied
    for (size_t pos = 0;;) {
        const void* found = pos < size ? std::memchr(data + pos, '\n', size - pos) : nullptr;
        if (!found && complete) break;  // nothing follows the last whole line
        const size_t end = found ? static_cast<size_t>(static_cast<const char*>(found) - data) + 1 : size;
        const bool dropped = IsDeclaration(data + pos, end - pos);
        if (dropped) {
            out.Append(data + run, static_cast<NString::size_type>(pos - run));
            run = end;
        } else if (stampPending) {
            if (end - pos >= tagLength && ::strncasecmp(data + pos, startTag, tagLength) == 0) {
                out.Append(data + run, static_cast<NString::size_type>(pos + tagLength - run));
                out.Append(" id=\"").Append(fnd::osdep::Narrow(*name)).PushBack('"');
                run = pos + tagLength;
            }
            stampPending = false;
        }
        if (!found) {
            // The last piece, even an empty one, gets a line feed of its own.
            out.Append(data + run, static_cast<NString::size_type>(size - run));
            if (!dropped) out.PushBack('\n');
            return true;
        }
        pos = end;
    }
    out.Append(data + run, static_cast<NString::size_type>(size - run));
    return true;
}

}  // namespace

bool InsertDocument(NString& out, const WString& path, bool mustExist, const char* startTag, const WString* name) {
    ReadBuffer scratch;
    return InsertFile(out, scratch, path, mustExist, startTag, name);
}

int32_t WriteItemDefinitions(const std::vector<WString>& items, const WString& language, NString& out) {
    OutputRollback rollback(out);
    const WString directory = CatalogueDirectory();
    const WString tag = IsSafeLanguage(language) ? language : WString();
    const WString prefix = tag.Length() >= 2 ? tag.Substr(0, 2) : WString();
    const bool chinese = fnd::EqualsNoCase(prefix, WString(L"zh"));
    const bool simplified = fnd::EqualsNoCase(tag, WString(L"zh-CN")) || fnd::EqualsNoCase(tag, WString(L"zh-SG"));

    // The suffixes are the same for every item; only the name in front changes.
    std::vector<WString> constantSuffixes;
    if (chinese) {
        constantSuffixes.push_back(WString(L".const.") + tag + L".xml");
        if (simplified) constantSuffixes.push_back(WString(L".const.zh-Hans.xml"));
    }
    if (!prefix.IsEmpty()) constantSuffixes.push_back(WString(L".const.") + prefix + L".xml");
    constantSuffixes.push_back(WString(L".const.xml"));

    ReadBuffer scratch;  // one read buffer for all the files of the request
    bool copiedAny = false;
    for (const WString& item : items) {
        if (!IsSafeItemName(item)) continue;
        if (!InsertFile(out, scratch, ItemFile(directory, item, WString(L".def.xml")), false, "<item", &item))
            continue;
        copiedAny = true;
        for (const WString& suffix : constantSuffixes)
            if (InsertFile(out, scratch, ItemFile(directory, item, suffix), true, nullptr, nullptr)) break;
    }
    rollback.Commit();
    return copiedAny ? 0 : 1;
}

int32_t WriteAllBindings(NString& out) {
    OutputRollback rollback(out);
    const WString suffix(L".binding.xml");
    ReadBuffer scratch;
    bool copiedAny = false;
    for (const WString& path : fnd::osdep::FindFiles(fnd::osdep::JoinPath(CatalogueDirectory(), WString(L"*") + suffix))) {
        WString file = fnd::osdep::FileName(path);
        WString name = file.Substr(0, file.Length() - suffix.Length());
        if (InsertFile(out, scratch, path, false, "<binding", &name)) copiedAny = true;
    }
    rollback.Commit();
    return copiedAny ? 0 : 1;
}

}  // namespace qel::catalog
