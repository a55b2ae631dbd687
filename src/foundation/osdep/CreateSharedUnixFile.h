// Lock and state files that every local user of the controller may share.
#pragma once

#include <cstdint>

#include "foundation/StringBase.h"

namespace qel::fnd::osdep {

/// Opens `path` (bytes, as handed to the system) for reading and writing,
/// creating it if missing, makes it readable and writable by everyone and
/// returns the descriptor, which the caller closes. A symbolic link at `path`
/// is refused, never followed: the shared directories are world-writable, and
/// a link planted there must not lead the service to open or re-permission
/// another file. A file of another user keeps its bits. An open refused for
/// permission is tried again after 1 ms, three attempts in all. Throws
/// PosixError when the file cannot be opened (ELOOP for a symbolic link) or
/// its bits cannot be set.
int32_t CreateSharedUnixFile(const NString& path);

}  // namespace qel::fnd::osdep
