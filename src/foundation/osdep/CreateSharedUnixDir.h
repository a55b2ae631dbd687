// Directories that every local user of the controller may share (for the
// files behind named events and mutexes).
#pragma once

#include "foundation/StringBase.h"

namespace qel::fnd::osdep {

/// Makes sure the absolute `path` is a directory with permission bits 0777,
/// creating the missing directories as CreateDirectories does. When the caller
/// does not own the directory its bits are left as they are: another user made
/// it shared already. Throws what CreateDirectories throws, and PosixError when
/// the path is still no directory afterwards or its bits cannot be set.
void CreateSharedUnixDir(const WString& path);

}  // namespace qel::fnd::osdep
