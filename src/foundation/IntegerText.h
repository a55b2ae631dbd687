// Integers to and from text in bases 2 to 36.
#pragma once

#include <cstdint>

#include "StringBase.h"

namespace qel::fnd {

/// Digits 0-9 then A-Z, no prefix, no leading zeros. A negative value gets a
/// "-" in base 10 only; other bases show the unsigned bit pattern (-1 in base
/// 16 of an int32_t is FFFFFFFF). A base outside 2..36 throws
/// exception::UnableToConvert (module "osdep/IntegerToString").
/// Instantiated for int16_t, uint16_t, int32_t, uint32_t, int64_t, uint64_t.
template <typename T>
WString IntegerToString(T value, uint32_t base = 10);

/// Parses leading blanks, an optional "-" then "+", an optional "0x" in base
/// 16, then digits up to the first non-digit (the rest is ignored). Overflow,
/// a base outside 2..36, or in base 10 a sign that does not match the value
/// ("-0", out of the signed range) throw exception::UnableToConvert (module
/// "osdep/StringToInteger"). An empty or blank text gives 0.
/// Instantiated for the same types as IntegerToString.
template <typename T>
T StringToInteger(const WString& text, uint32_t base = 10);

}  // namespace qel::fnd
