// Integers to and from text: digits, signs, bases, and every refusal with its
// module and line.
#include "foundation/IntegerText.h"

#include <gtest/gtest.h>

#include <limits>
#include <random>
#include <string>

#include "foundation/Exception.h"

namespace qel::fnd {
namespace {

using exception::UnableToConvert;

std::wstring Std(const WString& s) { return std::wstring(s.CStr(), s.Length()); }

template <typename F>
void ExpectUnable(F&& call, const char* module, int32_t line) {
    try {
        call();
        ADD_FAILURE() << "no exception";
    } catch (const UnableToConvert& e) {
        EXPECT_STREQ(e.File(), module);
        EXPECT_EQ(e.Line(), line);
        EXPECT_STREQ(e.what(), "Unable to convert.");
    }
}

TEST(IntegerToString, DigitsSignsAndBases) {
    EXPECT_EQ(Std(IntegerToString<int32_t>(255, 2)), L"11111111");
    EXPECT_EQ(Std(IntegerToString<int32_t>(-255, 10)), L"-255");
    EXPECT_EQ(Std(IntegerToString<int32_t>(-255)), L"-255");
    EXPECT_EQ(Std(IntegerToString<int32_t>(0, 10)), L"0");
    EXPECT_EQ(Std(IntegerToString<uint64_t>(0, 36)), L"0");
    EXPECT_EQ(Std(IntegerToString<int32_t>(255, 16)), L"FF");
    EXPECT_EQ(Std(IntegerToString<int32_t>(35, 36)), L"Z");
    EXPECT_EQ(Std(IntegerToString<int32_t>(36, 36)), L"10");
    EXPECT_EQ(Std(IntegerToString<uint16_t>(65535, 36)), L"1EKF");
    EXPECT_EQ(Std(IntegerToString<int32_t>(8, 8)), L"10");
    EXPECT_EQ(Std(IntegerToString<int32_t>(123456789, 10)), L"123456789");
}

TEST(IntegerToString, NegativeOutsideBaseTenShowsTheBitPattern) {
    EXPECT_EQ(Std(IntegerToString<int32_t>(-1, 16)), L"FFFFFFFF");
    EXPECT_EQ(Std(IntegerToString<int16_t>(-1, 16)), L"FFFF");
    EXPECT_EQ(Std(IntegerToString<int64_t>(-1, 16)), L"FFFFFFFFFFFFFFFF");
    EXPECT_EQ(Std(IntegerToString<int16_t>(-2, 2)), L"1111111111111110");
    EXPECT_EQ(Std(IntegerToString<int32_t>(-255, 8)), L"37777777401");
}

TEST(IntegerToString, ExtremesOfEveryWidth) {
    EXPECT_EQ(Std(IntegerToString<int16_t>(INT16_MIN)), L"-32768");
    EXPECT_EQ(Std(IntegerToString<int16_t>(INT16_MAX)), L"32767");
    EXPECT_EQ(Std(IntegerToString<uint16_t>(UINT16_MAX)), L"65535");
    EXPECT_EQ(Std(IntegerToString<int32_t>(INT32_MIN)), L"-2147483648");
    EXPECT_EQ(Std(IntegerToString<uint32_t>(UINT32_MAX)), L"4294967295");
    EXPECT_EQ(Std(IntegerToString<int64_t>(INT64_MIN)), L"-9223372036854775808");
    EXPECT_EQ(Std(IntegerToString<int64_t>(INT64_MAX)), L"9223372036854775807");
    EXPECT_EQ(Std(IntegerToString<uint64_t>(UINT64_MAX)), L"18446744073709551615");
    // Base 2 fills the whole room: one digit per bit.
    EXPECT_EQ(Std(IntegerToString<uint64_t>(UINT64_MAX, 2)), std::wstring(64, L'1'));
    EXPECT_EQ(Std(IntegerToString<int64_t>(INT64_MIN, 2)), L"1" + std::wstring(63, L'0'));
    EXPECT_EQ(Std(IntegerToString<uint16_t>(UINT16_MAX, 2)), std::wstring(16, L'1'));
}

TEST(IntegerToString, BadBaseThrowsUnableToConvert) {
    ExpectUnable([] { IntegerToString<int32_t>(5, 0); }, "osdep/IntegerToString", 53);
    ExpectUnable([] { IntegerToString<uint64_t>(0, 0); }, "osdep/IntegerToString", 53);
    for (uint32_t base : {1u, 37u, 100u, 0xFFFFFFFFu}) {
        SCOPED_TRACE(base);
        ExpectUnable([base] { IntegerToString<int32_t>(5, base); }, "osdep/IntegerToString", 33);
        ExpectUnable([base] { IntegerToString<int16_t>(0, base); }, "osdep/IntegerToString", 33);
        ExpectUnable([base] { IntegerToString<int64_t>(-7, base); }, "osdep/IntegerToString", 33);
    }
}

struct ParseCase {
    const wchar_t* text;
    uint32_t base;
    int32_t value;
};

TEST(StringToInteger, ParsesPrefixesSignsAndDigits) {
    const ParseCase kCases[] = {
        {L"0x1F", 16, 31},      {L"0X1f", 16, 31},  {L"1f", 16, 31},    {L"1F", 16, 31},
        {L"0x", 16, 0},         {L"0xg", 16, 0},    {L"x1F", 16, 0},    {L"12abc", 10, 12},
        {L"  -5", 10, -5},      {L" \t\r\n42", 10, 42}, {L"", 10, 0},   {L" \t\r\n", 10, 0},
        {L"+7", 10, 7},         {L"-+7", 10, -7},   {L"+-7", 10, 0},    {L"\v5", 10, 0},
        {L"42 and more", 10, 42}, {L"4 2", 10, 4},  {L"102", 2, 2},     {L"777", 8, 511},
        {L"zz", 36, 1295},      {L"ZZ", 36, 1295},  {L"0010", 10, 10},  {L"-2147483648", 10, INT32_MIN},
        {L"2147483647", 10, INT32_MAX},
        // Outside base 10 the sign is ignored and the digits are the bit
        // pattern.
        {L"-1", 16, 1},         {L"-0", 16, 0},     {L"-0x1F", 16, 31}, {L"FFFFFFFF", 16, -1},
        {L"80000000", 16, INT32_MIN}, {L"-101", 2, 5},
        // Digits are ASCII only.
        {L"\xFF11", 10, 0},     {L"1\xFF11", 10, 1},
    };
    for (const ParseCase& c : kCases) {
        EXPECT_EQ(StringToInteger<int32_t>(WString(c.text), c.base), c.value) << c.text << " base " << c.base;
    }
}

TEST(StringToInteger, OutOfRangeAndSignMismatchThrow) {
    const char* const kModule = "osdep/StringToInteger";
    ExpectUnable([] { StringToInteger<int32_t>(WString(L"-0")); }, kModule, 156);
    ExpectUnable([] { StringToInteger<int32_t>(WString(L"-")); }, kModule, 156);
    ExpectUnable([] { StringToInteger<int32_t>(WString(L"2147483648")); }, kModule, 156);
    ExpectUnable([] { StringToInteger<int32_t>(WString(L"-2147483649")); }, kModule, 156);
    ExpectUnable([] { StringToInteger<int32_t>(WString(L"4294967295")); }, kModule, 156);
    ExpectUnable([] { StringToInteger<int32_t>(WString(L"-4294967295")); }, kModule, 156);
    ExpectUnable([] { StringToInteger<uint32_t>(WString(L"4294967296")); }, kModule, 81);
    ExpectUnable([] { StringToInteger<int32_t>(WString(L"4294967296")); }, kModule, 81);
    ExpectUnable([] { StringToInteger<uint32_t>(WString(L"100000000"), 16); }, kModule, 81);
    ExpectUnable([] { StringToInteger<int16_t>(WString(L"32768")); }, kModule, 156);
    ExpectUnable([] { StringToInteger<int16_t>(WString(L"-32769")); }, kModule, 156);
    ExpectUnable([] { StringToInteger<int16_t>(WString(L"65536")); }, kModule, 81);
    ExpectUnable([] { StringToInteger<uint16_t>(WString(L"65536")); }, kModule, 81);
    ExpectUnable([] { StringToInteger<uint16_t>(WString(L"10000"), 16); }, kModule, 81);
    ExpectUnable([] { StringToInteger<int64_t>(WString(L"9223372036854775808")); }, kModule, 156);
    ExpectUnable([] { StringToInteger<int64_t>(WString(L"18446744073709551616")); }, kModule, 81);
    ExpectUnable([] { StringToInteger<uint64_t>(WString(L"18446744073709551616")); }, kModule, 81);
    ExpectUnable([] { StringToInteger<uint64_t>(WString(L"10000000000000000"), 16); }, kModule, 81);
    // A huge number of digits stops at the first that overflows.
    ExpectUnable([] { StringToInteger<uint64_t>(WString(100000, L'9')); }, kModule, 81);
    ExpectUnable([] { StringToInteger<int16_t>(WString(100000, L'1'), 2); }, kModule, 81);
}

TEST(StringToInteger, EdgesOfEveryWidthAreAccepted) {
    EXPECT_EQ(StringToInteger<int16_t>(WString(L"32767")), INT16_MAX);
    EXPECT_EQ(StringToInteger<int16_t>(WString(L"-32768")), INT16_MIN);
    EXPECT_EQ(StringToInteger<uint16_t>(WString(L"65535")), UINT16_MAX);
    EXPECT_EQ(StringToInteger<uint32_t>(WString(L"4294967295")), UINT32_MAX);
    EXPECT_EQ(StringToInteger<int64_t>(WString(L"-9223372036854775808")), INT64_MIN);
    EXPECT_EQ(StringToInteger<int64_t>(WString(L"9223372036854775807")), INT64_MAX);
    EXPECT_EQ(StringToInteger<uint64_t>(WString(L"18446744073709551615")), UINT64_MAX);
    EXPECT_EQ(StringToInteger<uint64_t>(WString(L"FFFFFFFFFFFFFFFF"), 16), UINT64_MAX);
    EXPECT_EQ(StringToInteger<int16_t>(WString(L"ffff"), 16), -1);
    // Leading zeros never overflow.
    EXPECT_EQ(StringToInteger<int16_t>(WString(100000, L'0') + L"7"), 7);
}

TEST(StringToInteger, UnsignedResultNegatesInUnsignedArithmetic) {
    EXPECT_EQ(StringToInteger<uint32_t>(WString(L"-1")), UINT32_MAX);
    EXPECT_EQ(StringToInteger<uint16_t>(WString(L"-1")), UINT16_MAX);
    EXPECT_EQ(StringToInteger<uint64_t>(WString(L"-2")), UINT64_MAX - 1);
    EXPECT_EQ(StringToInteger<uint32_t>(WString(L"-0")), 0u);
    EXPECT_EQ(StringToInteger<uint32_t>(WString(L"-4294967295")), 1u);
}

TEST(StringToInteger, BadBaseThrowsBeforeLookingAtTheText) {
    for (uint32_t base : {0u, 1u, 37u, 0xFFFFFFFFu}) {
        SCOPED_TRACE(base);
        ExpectUnable([base] { StringToInteger<int32_t>(WString(L"12"), base); }, "osdep/StringToInteger", 25);
        ExpectUnable([base] { StringToInteger<uint64_t>(WString(), base); }, "osdep/StringToInteger", 25);
    }
}

template <typename T>
void ExpectRoundTrips(std::mt19937_64& rng) {
    for (int i = 0; i < 300; ++i) {
        T value = static_cast<T>(rng() >> (rng() % 64));
        if (i % 3 == 0) value = static_cast<T>(0 - value);
        uint32_t base = 2 + static_cast<uint32_t>(rng() % 35);
        WString text = IntegerToString<T>(value, base);
        ASSERT_EQ(StringToInteger<T>(text, base), value) << Std(text) << " base " << base;
    }
}

TEST(IntegerText, EveryTypeRoundTripsInEveryBase) {
    std::mt19937_64 rng(36);
    ExpectRoundTrips<int16_t>(rng);
    ExpectRoundTrips<uint16_t>(rng);
    ExpectRoundTrips<int32_t>(rng);
    ExpectRoundTrips<uint32_t>(rng);
    ExpectRoundTrips<int64_t>(rng);
    ExpectRoundTrips<uint64_t>(rng);
}

}  // namespace
}  // namespace qel::fnd
