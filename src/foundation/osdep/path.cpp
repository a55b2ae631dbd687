// Path text helpers and the file-system queries and changes built on them.
#include "foundation/osdep/path.h"

#include <cerrno>
#include <sys/stat.h>
#include <sys/types.h>

#include "foundation/Exception.h"
#include "foundation/osdep/IConv.h"

namespace qel::fnd::osdep {

namespace {

constexpr const char* kModule = "osdep/path";

template <typename CharT>
StringBase<CharT> Join(const StringBase<CharT>& directory, const StringBase<CharT>& name) {
    const CharT slash = static_cast<CharT>('/');
    if (directory.IsEmpty() || (!name.IsEmpty() && name[0] == slash)) return name;
    StringBase<CharT> result;
    result.Reserve(directory.Length() + 1 + name.Length());
    result.Append(directory);
    if (!directory.EndsWith(slash)) result.PushBack(slash);
    result.Append(name);
    return result;
}

bool IsAbsolute(const WString& path) { return !path.IsEmpty() && path[0] == L'/'; }

int StatRetrying(const NString& path, struct stat* info) {
    int r;
    do {
        r = ::stat(path.CStr(), info);
    } while (r != 0 && errno == EINTR);
    return r;
}

}  // namespace

WString JoinPath(const WString& directory, const WString& name) { return Join(directory, name); }

NString JoinPath(const NString& directory, const NString& name) { return Join(directory, name); }

WString FileName(const WString& path) {
    WString::size_type slash = path.FindLast(L'/');
    return slash == WString::npos ? path : path.Substr(slash + 1);
}

WString ParentDirectory(const WString& path) {
    if (path.FindFirstNotOf(WString(L"/")) == WString::npos) return path;  // empty or only slashes
    WString::size_type end = path.Length();
    if (path.EndsWith(L'/')) {
        while (end > 0 && path[end - 1] == L'/') --end;
        return path.Substr(0, end);
    }
    WString::size_type slash = path.FindLast(L'/');
    if (slash == WString::npos) return WString();
    end = slash;
    while (end > 0 && path[end - 1] == L'/') --end;
    // Nothing but slashes before the last component: those are the root.
    if (end == 0) return path.Substr(0, slash + 1);
    return path.Substr(0, end);
}

WString EnsureTrailingSlash(const WString& path) {
    if (path.IsEmpty()) throw exception::InvalidArgument(kModule, 508);
    if (path.EndsWith(L'/')) return path;
    WString result(path);
    result.PushBack(L'/');
    return result;
}

bool IsDirectory(const WString& path) {
    if (!IsAbsolute(path)) return false;
    NString bytes = Narrow(path);
    struct stat info;
    if (StatRetrying(bytes, &info) != 0) return false;
    return S_ISDIR(info.st_mode);
}

bool IsFile(const WString& path) {
    if (!IsAbsolute(path)) throw exception::InvalidArgument(kModule, 998);
    NString bytes = Narrow(path);
    struct stat info;
    if (StatRetrying(bytes, &info) != 0) {
        // A file below something that is not a directory does not exist either.
        if (errno == ENOENT || errno == ENOTDIR) return false;
        throw PosixError(kModule, 1044);
    }
    return S_ISREG(info.st_mode);
}

void CreateDirectories(const WString& path) {
    if (!IsAbsolute(path)) throw exception::InvalidArgument(kModule, 643);
    WString::size_type length = path.Length();
    while (length > 0 && path[length - 1] == L'/') --length;
    if (length == 0) throw exception::InvalidArgument(kModule, 670);

    // Each prefix that ends just before a "/" (or at the end) names one
    // component; runs of slashes only repeat the same directory.
    for (WString::size_type end = 1; end <= length; ++end) {
        if (end < length && path[end] != L'/') continue;
        if (path[end - 1] == L'/') continue;
        NString component = Narrow(path.Substr(0, end));
        int r;
        do {
            r = ::mkdir(component.CStr(), 0700);
        } while (r != 0 && errno == EINTR);
        if (r == 0) continue;
        if (errno != EEXIST) throw exception::AccessDenied(kModule, 525, path);
        struct stat info;
        if (StatRetrying(component, &info) != 0) throw exception::AccessDenied(kModule, 532, path);
        if (!S_ISDIR(info.st_mode)) throw exception::ObjectAlreadyExists(kModule, 523);
    }
}

}  // namespace qel::fnd::osdep
