// Integers to and from text in bases 2 to 36.
#include "foundation/IntegerText.h"

#include <limits>
#include <type_traits>

#include "foundation/Exception.h"

namespace qel::fnd {

namespace {

constexpr const char* kToStringModule = "osdep/IntegerToString";
constexpr const char* kToIntegerModule = "osdep/StringToInteger";
constexpr wchar_t kDigits[] = L"0123456789ABCDEFGHIJKLMNOPQRSTUVWXYZ";

// 0-9 and letters of either case as 10 and up; anything else is above every
// base.
uint32_t DigitValue(wchar_t c) noexcept {
    const uint32_t u = static_cast<uint32_t>(c);
    if (u - '0' < 10u) return u - '0';
    if (u - 'A' < 26u) return u - 'A' + 10;
    if (u - 'a' < 26u) return u - 'a' + 10;
    return 36;
}

bool IsBlank(wchar_t c) noexcept { return c == L' ' || c == L'\t' || c == L'\r' || c == L'\n'; }

}  // namespace

template <typename T>
WString IntegerToString(T value, uint32_t base) {
    using U = std::make_unsigned_t<T>;
    if (base == 0) throw exception::UnableToConvert(kToStringModule, 53);
    const bool negative = std::is_signed_v<T> && value < 0 && base == 10;
    U magnitude = negative ? static_cast<U>(U(0) - static_cast<U>(value)) : static_cast<U>(value);

    // One character per bit is enough for base 2, the longest form.
    constexpr uint32_t kRoom = std::numeric_limits<U>::digits;
    wchar_t buffer[kRoom + 1];
    uint32_t pos = kRoom;
    do {
        if (base < 2 || base > 36) throw exception::UnableToConvert(kToStringModule, 33);
        if (pos == 0) throw exception::UnableToConvert(kToStringModule, 64);
        buffer[--pos] = kDigits[magnitude % base];
        magnitude = static_cast<U>(magnitude / base);
    } while (magnitude != 0);
    if (negative) {
        if (pos == 0) throw exception::UnableToConvert(kToStringModule, 64);
        buffer[--pos] = L'-';
    }
    return WString(buffer + pos, kRoom - pos);
}

template <typename T>
T StringToInteger(const WString& text, uint32_t base) {
    using U = std::make_unsigned_t<T>;
    if (base < 2 || base > 36) throw exception::UnableToConvert(kToIntegerModule, 25);
    const wchar_t* p = text.begin();
    const wchar_t* const end = text.end();
    while (p != end && IsBlank(*p)) ++p;
    if (p == end) return 0;

    bool negative = false;
    if (*p == L'-') {
        negative = true;
        ++p;
    }
    if (p != end && *p == L'+') ++p;
    if (base == 16 && end - p > 2 && p[0] == L'0' && (p[1] == L'x' || p[1] == L'X')) p += 2;

    constexpr uint64_t kMax = std::numeric_limits<U>::max();
    uint64_t value = 0;
    for (; p != end; ++p) {
        const uint32_t digit = DigitValue(*p);
        if (digit >= base) break;
        if (value > (kMax - digit) / base) throw exception::UnableToConvert(kToIntegerModule, 81);
        value = value * base + digit;
    }

    U bits = static_cast<U>(value);
    if (base != 10) return static_cast<T>(bits);
    if (negative) bits = static_cast<U>(U(0) - bits);
    const T result = static_cast<T>(bits);
    // Out of the signed range the sign comes out wrong; "-0" has none to give.
    if constexpr (std::is_signed_v<T>) {
        if ((result < 0) != negative) throw exception::UnableToConvert(kToIntegerModule, 156);
    }
    return result;
}

#define QEL_INTEGER_TEXT(T)                                   \
    template WString IntegerToString<T>(T value, uint32_t base); \
    template T StringToInteger<T>(const WString& text, uint32_t base)

QEL_INTEGER_TEXT(int16_t);
QEL_INTEGER_TEXT(uint16_t);
QEL_INTEGER_TEXT(int32_t);
QEL_INTEGER_TEXT(uint32_t);
QEL_INTEGER_TEXT(int64_t);
QEL_INTEGER_TEXT(uint64_t);

#undef QEL_INTEGER_TEXT

}  // namespace qel::fnd
