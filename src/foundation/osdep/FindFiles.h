// Lists the paths that match a wildcard pattern.
#pragma once

#include <vector>

#include "foundation/StringBase.h"

namespace qel::fnd::osdep {

/// The paths matching `pattern` (an absolute path whose components may hold
/// the system's glob wildcards), in the system's sorted order. Hidden files
/// match only a pattern that names their leading "."; a pattern without
/// wildcards gives the path itself if it exists. No match gives an empty
/// list; any other failure throws PosixError with its errno.
std::vector<WString> FindFiles(const WString& pattern);

}  // namespace qel::fnd::osdep
