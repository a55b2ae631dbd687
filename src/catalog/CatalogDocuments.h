// The catalogue documents: item definitions with their localised constants,
// and the bindings of all items, copied from the catalogue directory.
#pragma once

#include <cstdint>
#include <vector>

#include "foundation/StringBase.h"

namespace qel::catalog {

using fnd::NString;
using fnd::WString;

/// Appends the file's lines to `out`, dropping XML declarations and stamping
/// ` id="name"` after `startTag` in the first surviving line when that line
/// starts with it. False when the file cannot be read (or, with
/// `mustExist`, is not a regular file); lines copied before a read error
/// stay in `out`.
bool InsertDocument(NString& out, const WString& path, bool mustExist, const char* startTag, const WString* name);

/// The definitions of `items` with constants for `language` (full tag for
/// Chinese, "zh-Hans" for zh-CN and zh-SG, the two-letter prefix, then the
/// default). 0 when at least one definition was copied, else 1.
int32_t WriteItemDefinitions(const std::vector<WString>& items, const WString& language, NString& out);

/// Every "*.binding.xml" of the catalogue directory in sorted order. 0 when
/// at least one was copied, else 1.
int32_t WriteAllBindings(NString& out);

}  // namespace qel::catalog
