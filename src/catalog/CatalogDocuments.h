// The catalogue documents: item definitions with their localised constants,
// and the bindings of all items, copied from the catalogue directory.
#pragma once

#include <cstdint>
#include <vector>

#include "foundation/StringBase.h"

namespace qel::catalog {

using fnd::NString;
using fnd::WString;

/// Appends the file's lines to `out`, each with its line feed and the last
/// piece with one added (so a file ending in a line feed yields one more,
/// an empty file a single one), dropping lines that start with "<?xml"
/// (any case) and stamping ` id="name"` after `startTag` into the first
/// surviving line when that line starts with it. False when the file cannot
/// be read (or, with `mustExist`, is not a regular file), including a file
/// that opens but yields nothing at all (a directory); a later read error
/// keeps the whole lines read before it and counts as a copy. A relative
/// path or a failed status query with `mustExist` throws from the path layer.
bool InsertDocument(NString& out, const WString& path, bool mustExist, const char* startTag, const WString* name);

/// The definitions of `items` with constants for `language` (full tag for
/// Chinese, "zh-Hans" for zh-CN and zh-SG, the two-letter prefix, then the
/// default). 0 when at least one definition was copied, else 1. Item names
/// holding "/" or NUL, or being "." or "..", name no item; a language
/// holding "/" or NUL leaves only the default constants. A foundation
/// exception leaves `out` as it was before the call.
int32_t WriteItemDefinitions(const std::vector<WString>& items, const WString& language, NString& out);

/// Every "*.binding.xml" of the catalogue directory in sorted order. 0 when
/// at least one was copied, else 1. A foundation exception leaves `out` as
/// it was before the call.
int32_t WriteAllBindings(NString& out);

}  // namespace qel::catalog
