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

/// The default conversions, through the process code set: used for paths,
/// environment values and every text handed to or taken from the system.
inline NString Narrow(const WString& text) { return IConv(text, ""); }
inline WString Widen(const NString& text) { return IConv(text, ""); }

}  // namespace qel::fnd::osdep
