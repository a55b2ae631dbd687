// GUID text: the exact registry form written, and every malformed text
// refused with its line.
#include "foundation/Guid.h"

#include <gtest/gtest.h>

#include <random>
#include <string>

#include "foundation/Exception.h"

namespace qel::fnd {
namespace {

std::wstring Std(const WString& s) { return std::wstring(s.CStr(), s.Length()); }

const Guid kSample = {0x12345678, 0x9ABC, 0xDEF0, {0x01, 0x23, 0x45, 0x67, 0x89, 0xAB, 0xCD, 0xEF}};
const wchar_t kSampleText[] = L"{12345678-9ABC-DEF0-0123-456789ABCDEF}";

void ExpectBad(const WString& text, int32_t line) {
    try {
        Guid::FromString(text);
        ADD_FAILURE() << "accepted " << Std(text);
    } catch (const exception::BadGuidString& e) {
        EXPECT_STREQ(e.File(), "Guid");
        EXPECT_EQ(e.Line(), line) << Std(text);
        EXPECT_STREQ(e.what(), "Badly formatted Guid string.");
    }
}

TEST(Guid, WritesBracedUpperCaseRegistryForm) {
    EXPECT_EQ(Std(kSample.ToString()), kSampleText);
    EXPECT_EQ(Std(Guid().ToString()), L"{00000000-0000-0000-0000-000000000000}");
    Guid ones{0xFFFFFFFF, 0xFFFF, 0xFFFF, {0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF}};
    EXPECT_EQ(Std(ones.ToString()), L"{FFFFFFFF-FFFF-FFFF-FFFF-FFFFFFFFFFFF}");
    // Small fields keep their leading zeros.
    Guid small{0x1, 0x2, 0x3, {0x4, 0x5, 0x6, 0x7, 0x8, 0x9, 0xA, 0xB}};
    EXPECT_EQ(Std(small.ToString()), L"{00000001-0002-0003-0405-060708090A0B}");
}

TEST(Guid, ReadsEitherCase) {
    EXPECT_EQ(Guid::FromString(WString(kSampleText)), kSample);
    EXPECT_EQ(Guid::FromString(WString(L"{12345678-9abc-def0-0123-456789abcdef}")), kSample);
    EXPECT_EQ(Guid::FromString(WString(L"{12345678-9aBc-DeF0-0123-456789AbCdEf}")), kSample);
}

TEST(Guid, RoundTripsRandomValues) {
    std::mt19937 rng(38);
    for (int i = 0; i < 500; ++i) {
        Guid g{static_cast<uint32_t>(rng()), static_cast<uint16_t>(rng()), static_cast<uint16_t>(rng()), {}};
        for (uint8_t& b : g.Data4) b = static_cast<uint8_t>(rng());
        ASSERT_EQ(Guid::FromString(g.ToString()), g);
    }
}

TEST(Guid, EveryWrongLengthIsRefused) {
    const std::wstring good(kSampleText);
    for (size_t length = 0; length <= 80; ++length) {
        if (length == good.size()) continue;
        std::wstring text = length < good.size() ? good.substr(0, length) : good + std::wstring(length - good.size(), L'0');
        ExpectBad(WString(text.data(), static_cast<uint32_t>(text.size())), 224);
    }
    // A well-formed GUID inside a longer text is still the wrong length.
    ExpectBad(WString(L" {12345678-9ABC-DEF0-0123-456789ABCDEF}"), 224);
    ExpectBad(WString(L"12345678-9ABC-DEF0-0123-456789ABCDEF"), 224);
}

TEST(Guid, WrongCharacterAtEveryPositionIsRefused) {
    const std::wstring good(kSampleText);
    for (size_t pos = 0; pos < good.size(); ++pos) {
        const bool hex = pos != 0 && pos != 37 && pos != 9 && pos != 14 && pos != 19 && pos != 24;
        // Each stands where it does not belong: digits in the punctuation,
        // punctuation and near-digits among the digits.
        const wchar_t kBad[] = {L'G', L'g', L'-', L'{', L'}', L' ', L'\0', L'/', L':', L'@', L'`',
                                static_cast<wchar_t>(0xFF10), static_cast<wchar_t>(0x10030),
                                static_cast<wchar_t>(0xFFFFFFFFu), L'0', L'a', L'F'};
        for (wchar_t bad : kBad) {
            if (bad == good[pos]) continue;
            if (hex && ((bad >= L'0' && bad <= L'9') || (bad >= L'a' && bad <= L'f') || (bad >= L'A' && bad <= L'F')))
                continue;
            std::wstring text = good;
            text[pos] = bad;
            SCOPED_TRACE(pos);
            ExpectBad(WString(text.data(), static_cast<uint32_t>(text.size())), 247);
        }
    }
    ExpectBad(WString(L"}12345678-9ABC-DEF0-0123-456789ABCDEF{"), 247);
    ExpectBad(WString(L"{12345678-9ABC-DEF0-0123456789ABCDEF-}"), 247);
}

}  // namespace
}  // namespace qel::fnd
