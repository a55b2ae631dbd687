// The arguments of one API request: wide keys matched without regard to case.
#pragma once

#include <map>

#include "foundation/StringBase.h"

namespace qel::api {

using fnd::WString;

struct NoCaseLess {
    bool operator()(const WString& a, const WString& b) const noexcept { return fnd::CompareNoCase(a, b) < 0; }
};

/// Ordered by key without regard to case, one value per key. Assigning
/// through operator[] keeps the key's first spelling and the last value.
using ArgumentMap = std::map<WString, WString, NoCaseLess>;

/// The value of `key`, or null when the key is absent.
inline const WString* FindArgument(const ArgumentMap& args, const wchar_t* key) {
    auto it = args.find(WString(key));
    return it == args.end() ? nullptr : &it->second;
}

}  // namespace qel::api
