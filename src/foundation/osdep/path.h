// Path text helpers and the few file-system queries and changes built on them.
#pragma once

#include "foundation/StringBase.h"

namespace qel::fnd::osdep {

// --- path text, no file-system access ---------------------------------------
// "/" is the only separator; nothing here normalises "." or "..".

/// `name` itself when it is absolute or `directory` is empty; otherwise the
/// two joined by exactly one "/" added where `directory` does not end in one.
WString JoinPath(const WString& directory, const WString& name);
NString JoinPath(const NString& directory, const NString& name);

/// The text after the last "/", or the whole path when it has none.
WString FileName(const WString& path);

/// The path without its last component and the slashes in front of it. The
/// path's leading slashes always stay ("/a" gives "/", "a" gives ""); a path
/// ending in "/" loses only its trailing slashes; an empty path or one made
/// only of slashes comes back unchanged.
WString ParentDirectory(const WString& path);

/// The path with one "/" appended unless it already ends in one. An empty path
/// throws exception::InvalidArgument.
WString EnsureTrailingSlash(const WString& path);

// --- file-system queries ------------------------------------------------------

/// True when `path` is absolute and names a directory (symbolic links
/// followed). Every failure, including a relative path, answers false.
bool IsDirectory(const WString& path);

/// True for a regular file (symbolic links followed), false for anything else
/// that exists and for a path that does not exist. A relative path throws
/// exception::InvalidArgument; any other failure to query the path throws
/// PosixError with its errno.
bool IsFile(const WString& path);

// --- file-system changes -----------------------------------------------------

/// Creates every missing directory of the absolute `path`, from the root down,
/// each with permission bits 0700 (before the umask). Directories that exist
/// already are passed over. Throws exception::InvalidArgument for a relative
/// path or one that is empty without its trailing slashes ("/"),
/// exception::ObjectAlreadyExists when a component exists but is not a
/// directory, and exception::AccessDenied naming `path` for any other refusal.
void CreateDirectories(const WString& path);

}  // namespace qel::fnd::osdep
