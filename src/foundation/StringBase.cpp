// The out-of-line parts of StringBase: its failures and case-blind comparison.
#include "foundation/StringBase.h"

#include <strings.h>
#include <wctype.h>

#include "foundation/Exception.h"

namespace qel::fnd {

namespace detail {

void ThrowStringOffsetOutOfRange(int32_t line) {
    throw exception::OutOfRange2("StringBase", line, NString("String offset out of range"));
}

void ThrowStringTooLarge(int32_t line) {
    throw exception::BoundExceeded2("StringBase", line, NString("Resulting string too large"));
}

}  // namespace detail

int CompareNoCase(const WString& a, const WString& b) noexcept {
    WString::size_type n = a.Length() < b.Length() ? a.Length() : b.Length();
    for (WString::size_type i = 0; i < n; ++i) {
        wint_t x = towupper(static_cast<wint_t>(a[i]));
        wint_t y = towupper(static_cast<wint_t>(b[i]));
        if (x != y) return x < y ? -1 : 1;
    }
    if (a.Length() == b.Length()) return 0;
    return a.Length() < b.Length() ? -1 : 1;
}

int CompareNoCase(const NString& a, const NString& b) noexcept {
    NString::size_type n = a.Length() < b.Length() ? a.Length() : b.Length();
    for (NString::size_type i = 0; i < n; ++i) {
        int d = strncasecmp(&a[i], &b[i], 1);
        if (d != 0) return d < 0 ? -1 : 1;
    }
    if (a.Length() == b.Length()) return 0;
    return a.Length() < b.Length() ? -1 : 1;
}

}  // namespace qel::fnd
