// Conversions through the system's iconv between wide text and a named code
// set ("" is the process locale's code set, "US-ASCII", "UTF-16LE", ...).
#pragma once

#include <cstdint>

#include "foundation/StringBase.h"

namespace qel::fnd::osdep {

/// Bytes in `fromCodeSet` to wide text. Each input unit that iconv rejects
/// (a byte; a 16-bit unit for "UTF-16LE") becomes one "?". An unknown code
/// set throws exception::InvalidLocale (module "osdep/IConv").
WString IConv(const char* bytes, uint32_t count, const char* fromCodeSet);
inline WString IConv(const NString& bytes, const char* fromCodeSet) {
    return IConv(bytes.Data(), bytes.Length(), fromCodeSet);
}

/// Wide text to bytes in `toCodeSet`. Each character that iconv rejects
/// becomes "?" (the unit "?" in "UTF-16LE"). An unknown code set throws
/// exception::InvalidLocale.
NString IConv(const wchar_t* text, uint32_t count, const char* toCodeSet);
inline NString IConv(const WString& text, const char* toCodeSet) {
    return IConv(text.Data(), text.Length(), toCodeSet);
}

/// Bytes of the UTF-16LE encoding of `text` (what IConv to "UTF-16LE" would
/// produce); a size beyond 32 bits throws exception::OutOfRange.
uint32_t Utf16LeSize(const wchar_t* text, uint32_t count);

/// Appends the UTF-16LE encoding of `text` to `out`, the same bytes as
/// IConv(text, count, "UTF-16LE"), without a temporary copy: the encoding is
/// measured first and `out` grows at most once, to exactly the length it
/// needs. A result longer than a string can hold throws before `out` changes.
void AppendUtf16Le(NString& out, const wchar_t* text, uint32_t count);
inline void AppendUtf16Le(NString& out, const WString& text) { AppendUtf16Le(out, text.Data(), text.Length()); }

/// The default conversions, through the process code set: used for paths,
/// environment values and every text handed to or taken from the system.
inline NString Narrow(const WString& text) { return IConv(text, ""); }
inline WString Widen(const NString& text) { return IConv(text, ""); }

}  // namespace qel::fnd::osdep
