// Reads property bags and tag lists that clients spread over numbered
// request arguments, and sets typed values on framework bags.
#pragma once

#include <cstdint>

#include "api/ArgumentMap.h"
#include "api/Framework.h"

namespace qel::api {

/// The argument's value; null when it is absent and not required. An absent
/// required argument throws kStatusFail as a `long`.
const WString* GetRequestVariable(const ArgumentMap& args, const wchar_t* name, bool required);

/// Fills `tags[0..count)` from the hexadecimal arguments "Tag_0", "Tag_1",
/// ... (each required).
void ReadTagList(const ArgumentMap& args, uint32_t count, PropertyTag* tags);

/// Sets the properties of bag 0 ("NbrTags_0", "Tag_0_i", "Type_0_i",
/// "Value_0_i") on `bag`. Filter mode 0 sets all; 1 skips the listed tags;
/// any other mode sets only the listed ones. A skipped property's type and
/// value are not read. The first failure status is thrown as a `long`, so
/// the properties after it stay unset; a number out of range throws
/// exception::UnableToConvert.
void DecodePropertyBag(const ArgumentMap& args, IkrSysPropertyBag* bag, uint32_t filterMode, uint32_t tagCount,
                       const PropertyTag* tags);

/// Parses `text` by `type` and calls the matching setter; returns its status,
/// or kStatusFail for an unknown type or a time text of the wrong shape.
/// `version` (hexadecimal) picks the time form: up to 10000 six decimal
/// local-time fields, above it the four hexadecimal words of an AbsTime.
/// Time values need a bag that provides IkrSysPropertyBagEx; the status of
/// that query is returned when it does not.
int32_t SetPropertyFromText(const WString& text, const WString& version, IkrSysPropertyBag* bag, PropertyTag tag,
                            PropertyTypeCode type);

}  // namespace qel::api
