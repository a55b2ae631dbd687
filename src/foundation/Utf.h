// The service's own UTF-8 codec: a strict decoder and an encoder that keeps
// every 31-bit value.
#pragma once

#include <cstdint>

#include "StringBase.h"

namespace qel::fnd {

/// Decodes UTF-8 strictly: overlong forms, stray continuation bytes, 0xF8 to
/// 0xFF and sequences cut short throw exception::InvalidSequence (module
/// "Utf8ToWide"). Encoded surrogates and four-byte values up to 0x1FFFFF are
/// accepted as they are. Never reads outside [bytes, bytes + count).
WString Utf8ToWide(const char* bytes, uint32_t count);
inline WString Utf8ToWide(const NString& bytes) { return Utf8ToWide(bytes.Data(), bytes.Length()); }

/// Encodes every value up to 0x7FFFFFFF in one to six bytes (surrogates
/// included); a value that is negative as a signed 32-bit number becomes "?".
NString WideToUtf8(const wchar_t* text, uint32_t count);
inline NString WideToUtf8(const WString& text) { return WideToUtf8(text.Data(), text.Length()); }

}  // namespace qel::fnd
