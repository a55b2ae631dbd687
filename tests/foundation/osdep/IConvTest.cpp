// Code-set conversions as callers see them: the process locale, US-ASCII,
// unknown code sets, and UTF-16LE checked byte for byte against iconv.
#include "foundation/osdep/IConv.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <clocale>
#include <cstring>
#include <iconv.h>
#include <langinfo.h>
#include <memory>
#include <iterator>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

#include "foundation/Exception.h"
#include "foundation/FoundationTestSupport.h"

namespace qel::fnd::osdep {
namespace {

using testing::RawWide;

std::vector<uint32_t> Values(const WString& s) {
    std::vector<uint32_t> v;
    for (wchar_t c : s) v.push_back(static_cast<uint32_t>(c));
    return v;
}

std::vector<uint32_t> Bytes(const char* data, size_t size) {
    std::vector<uint32_t> v;
    for (size_t i = 0; i < size; ++i) v.push_back(static_cast<unsigned char>(data[i]));
    return v;
}
std::vector<uint32_t> Bytes(const NString& s) { return Bytes(s.Data(), s.Length()); }
std::vector<uint32_t> Bytes(const std::string& s) { return Bytes(s.data(), s.size()); }

WString Wide(const std::vector<uint32_t>& values) {
    WString s;
    for (uint32_t v : values) s.PushBack(static_cast<wchar_t>(v));
    return s;
}

// Converts from a block of exactly `bytes.size()` bytes, so that the address
// sanitizer sees any read past the input.
WString FromExact(const std::string& bytes, const char* codeSet) {
    std::unique_ptr<char[]> block(new char[bytes.size()]);
    std::memcpy(block.get(), bytes.data(), bytes.size());
    return IConv(block.get(), static_cast<uint32_t>(bytes.size()), codeSet);
}

// Switches LC_CTYPE for one test and puts the previous one back.
class CtypeLocale {
public:
    explicit CtypeLocale(const char* name) : previous_(std::setlocale(LC_CTYPE, nullptr)) {
        ok_ = std::setlocale(LC_CTYPE, name) != nullptr;
    }
    ~CtypeLocale() { std::setlocale(LC_CTYPE, previous_.c_str()); }
    bool Ok() const { return ok_; }

private:
    std::string previous_;
    bool ok_ = false;
};

TEST(IConv, EmptyCodeSetUsesTheProcessLocale) {
    {
        CtypeLocale c("C");
        ASSERT_TRUE(c.Ok());
        EXPECT_EQ(Bytes(IConv(WString(L"caf\u00e9"), "")), Bytes(std::string("caf?")));
        EXPECT_EQ(IConv(NString("caf\xC3\xA9"), ""), L"caf??");
        EXPECT_EQ(Narrow(WString(L"plain")), "plain");
        EXPECT_EQ(Widen(NString("plain")), L"plain");
    }
    CtypeLocale utf8("C.UTF-8");
    if (!utf8.Ok()) GTEST_SKIP() << "no C.UTF-8 locale on this system";
    ASSERT_STREQ(nl_langinfo(CODESET), "UTF-8");
    EXPECT_EQ(Bytes(IConv(WString(L"caf\u00e9 \U0001F600"), "")), Bytes(std::string("caf\xC3\xA9 \xF0\x9F\x98\x80")));
    EXPECT_EQ(IConv(NString("caf\xC3\xA9 \xF0\x9F\x98\x80"), ""), L"caf\u00e9 \U0001F600");
}

TEST(IConv, UsAsciiMarksEachRefusedUnit) {
    WString text(L"a\u00e9b\U0001F600c");
    text.PushBack(static_cast<wchar_t>(0xFFFFFFFFu));
    text.PushBack(L'd');
    EXPECT_EQ(Bytes(IConv(text, "US-ASCII")), Bytes(std::string("a?b?c?d")));
    // One "?" per byte: the two bytes of é give two.
    EXPECT_EQ(FromExact("a\xC3\xA9" "b\x80", "US-ASCII"), L"a??b?");
    EXPECT_EQ(FromExact("plain ascii", "us-ascii"), L"plain ascii");
    EXPECT_TRUE(IConv(WString(), "US-ASCII").IsEmpty());
    EXPECT_TRUE(IConv(NString(), "US-ASCII").IsEmpty());
}

TEST(IConv, UnknownCodeSetThrowsInvalidLocale) {
    for (const char* name : {"NO-SUCH-CODESET", "UTF-99", "X-UNKNOWN-42"}) {
        SCOPED_TRACE(name);
        for (bool empty : {false, true}) {
            WString wide(empty ? L"" : L"text");
            NString bytes(empty ? "" : "text");
            try {
                IConv(wide, name);
                ADD_FAILURE() << "converted to an unknown code set";
            } catch (const exception::InvalidLocale& e) {
                EXPECT_STREQ(e.File(), "osdep/IConv");
                EXPECT_EQ(e.Line(), 71);
            }
            EXPECT_THROW(IConv(bytes, name), exception::InvalidLocale);
        }
    }
}

TEST(IConv, SizeThatWouldOverflowThrowsBeforeReading) {
    // Only the first byte or character exists: the size check must come
    // before any reading or allocating.
    const char byte = 'a';
    const wchar_t wide = L'a';
    for (uint32_t count : {0x40000000u, 0xFFFFFFFFu}) {
        try {
            IConv(&byte, count, "US-ASCII");
            ADD_FAILURE() << "converted " << count << " bytes";
        } catch (const exception::OutOfRange& e) {
            EXPECT_STREQ(e.File(), "SafeInteger");
        }
        EXPECT_THROW(IConv(&wide, count, "US-ASCII"), exception::OutOfRange);
    }
}

struct Utf16Case {
    std::vector<uint32_t> wide;
    std::string bytes;
};

TEST(IConvUtf16Le, EncodesEachCharacterOrOneQuestionUnit) {
    const Utf16Case kCases[] = {
        {{}, ""},
        {{'A'}, std::string("A\0", 2)},
        {{0}, std::string("\0\0", 2)},
        {{0x20AC}, "\xAC\x20"},
        {{0xD7FF}, "\xFF\xD7"},
        {{0xE000}, std::string("\x00\xE0", 2)},
        {{0xFEFF}, "\xFF\xFE"},
        {{0xFFFF}, "\xFF\xFF"},
        {{0x10000}, std::string("\x00\xD8\x00\xDC", 4)},
        {{0x1F600}, std::string("\x3D\xD8\x00\xDE", 4)},
        {{0x10FFFF}, "\xFF\xDB\xFF\xDF"},
        // Refused: each becomes the unit "?".
        {{0xD800}, std::string("?\0", 2)},
        {{0xDBFF, 0xDC00}, std::string("?\0?\0", 4)},
        {{0xDFFF}, std::string("?\0", 2)},
        {{0x110000}, std::string("?\0", 2)},
        {{0x7FFFFFFF}, std::string("?\0", 2)},
        {{0x80000000}, std::string("?\0", 2)},
        {{0xFFFFFFFF}, std::string("?\0", 2)},
        {{'a', 0xD800, 'b'}, std::string("a\0?\0b\0", 6)},
    };
    for (const Utf16Case& c : kCases) {
        NString bytes = IConv(Wide(c.wide), "UTF-16LE");
        EXPECT_EQ(Bytes(bytes), Bytes(c.bytes)) << ::testing::PrintToString(c.wide);
        EXPECT_EQ(bytes.Capacity(), bytes.Length());
    }
    EXPECT_EQ(Bytes(IConv(WString(L"Ab"), "utf-16le")), Bytes(std::string("A\0b\0", 4)));
}

TEST(IConvUtf16Le, DecodesPairsAndMarksEachRefusedUnit) {
    const Utf16Case kCases[] = {
        {{}, ""},
        {{'A'}, std::string("A\0", 2)},
        {{0}, std::string("\0\0", 2)},
        {{0x20AC}, "\xAC\x20"},
        {{0xFEFF, 'A'}, std::string("\xFF\xFE" "A\0", 4)},  // a byte-order mark is an ordinary character
        {{0x1F600}, std::string("\x3D\xD8\x00\xDE", 4)},
        {{0x10FFFF}, "\xFF\xDB\xFF\xDF"},
        // Unpaired surrogates: one "?" per unit, and the next unit stands on
        // its own.
        {{'?'}, "\x3D\xD8"},
        {{'?', 'A'}, std::string("\x3D\xD8" "A\0", 4)},
        {{'?', 0x1F600}, std::string("\x3D\xD8\x3D\xD8\x00\xDE", 6)},
        {{'?'}, std::string("\x00\xDE", 2)},
        {{'?', '?'}, std::string("\x00\xDE\x3D\xD8", 4)},
        {{'A', '?', 'B'}, std::string("A\0\x00\xDC" "B\0", 6)},
        // An odd trailing byte is a refused unit too.
        {{'?'}, "A"},
        {{'A', '?'}, std::string("A\0B", 3)},
        {{'?', '?'}, std::string("\x3D\xD8\x00", 3)},
    };
    for (const Utf16Case& c : kCases) {
        WString wide = FromExact(c.bytes, "UTF-16LE");
        EXPECT_EQ(Values(wide), c.wide) << ::testing::PrintToString(Bytes(c.bytes));
        EXPECT_EQ(wide.Capacity(), wide.Length());
    }
    EXPECT_EQ(FromExact(std::string("A\0b\0", 4), "Utf-16LE"), L"Ab");
}

TEST(IConvUtf16Le, AstralAtEveryPositionOfPlainRuns) {
    // The encoder copies plain runs in blocks; a pair may fall anywhere.
    for (size_t length = 1; length <= 40; ++length) {
        for (size_t at = 0; at < length; ++at) {
            std::vector<uint32_t> values;
            for (size_t i = 0; i < length; ++i) values.push_back(i == at ? 0x1F600 : 0x41 + i % 26);
            NString bytes = IConv(Wide(values), "UTF-16LE");
            ASSERT_EQ(bytes.Length(), 2 * length + 2);
            EXPECT_EQ(Bytes(bytes.Data() + 2 * at, 4), Bytes(std::string("\x3D\xD8\x00\xDE", 4)));
            ASSERT_EQ(Values(IConv(bytes, "UTF-16LE")), values) << length << " " << at;
        }
    }
}

// --- differential tests against the system's iconv ---------------------------

// The conversion rule driven through iconv itself: one call after another,
// writing `replacement` and skipping one input unit wherever it stops.
std::string IconvWithReplacement(const char* to, const char* from, const std::string& in, size_t unit,
                                 const std::string& replacement) {
    iconv_t cd = iconv_open(to, from);
    if (cd == reinterpret_cast<iconv_t>(-1)) throw std::runtime_error("iconv_open");
    std::string out(in.size() * 4 + 16, '\0');
    char* inPtr = const_cast<char*>(in.data());
    size_t inLeft = in.size();
    char* outPtr = out.data();
    size_t outLeft = out.size();
    while (inLeft > 0) {
        if (iconv(cd, &inPtr, &inLeft, &outPtr, &outLeft) != static_cast<size_t>(-1)) break;
        if (errno != EILSEQ && errno != EINVAL) throw std::runtime_error("iconv ran out of room");
        std::memcpy(outPtr, replacement.data(), replacement.size());
        outPtr += replacement.size();
        outLeft -= replacement.size();
        size_t skip = std::min(unit, inLeft);
        inPtr += skip;
        inLeft -= skip;
    }
    iconv_close(cd);
    out.resize(out.size() - outLeft);
    return out;
}


uint32_t RandomWide(std::mt19937& rng) {
    switch (rng() % 8) {
        case 0: case 1: return rng() % 0x80;
        case 2: return rng() % 0x10000;
        case 3: return 0xD800 + rng() % 0x800;
        case 4: return 0x10000 + rng() % 0x100000;
        case 5: return 0x110000 + rng() % (0x80000000u - 0x110000);
        case 6: return 0x80000000u | rng();
        default: {
            // Including the edges of the vector code's lane tricks.
            static const uint32_t kEdges[] = {0,          0x7FFF,     0x8000,     0xD7FF,     0xD800,     0xDBFF,
                                              0xDC00,     0xDFFF,     0xE000,     0xFEFF,     0xFFFE,     0xFFFF,
                                              0x10000,    0x10FFFF,   0x110000,   0x7FFFFFFF, 0x80000000, 0x80007FFE,
                                              0x80007FFF, 0xFFFF7FFF, 0xFFFF8000, 0xFFFF8001, 0xFFFFFFFF};
            return kEdges[rng() % std::size(kEdges)];
        }
    }
}

uint16_t RandomUnit(std::mt19937& rng) {
    switch (rng() % 6) {
        case 0: return static_cast<uint16_t>(rng() % 0x80);
        case 1: return static_cast<uint16_t>(rng());
        case 2: case 3: return static_cast<uint16_t>(0xD800 + rng() % 0x400);  // high halves
        case 4: return static_cast<uint16_t>(0xDC00 + rng() % 0x400);          // low halves
        default: {
            static const uint16_t kEdges[] = {0, 0xD7FF, 0xD800, 0xDBFF, 0xDC00, 0xDFFF, 0xE000, 0xFEFF, 0xFFFE, 0xFFFF};
            return kEdges[rng() % std::size(kEdges)];
        }
    }
}

TEST(IConvUtf16Le, WideToUtf16LeMatchesIconvByteForByte) {
    std::mt19937 rng(1601);
    for (int round = 0; round < 3000; ++round) {
        // Odd rounds are mostly plain text, so that the block copies run and
        // the other characters fall at every offset within and across blocks.
        std::vector<uint32_t> values(rng() % (round % 2 ? 120 : 48));
        for (uint32_t& v : values) v = round % 2 && rng() % 10 != 0 ? 0x20 + rng() % 0x5F : RandomWide(rng);
        std::string expected =
            IconvWithReplacement("UTF-16LE", "WCHAR_T", RawWide(values), sizeof(wchar_t), std::string("?\0", 2));
        ASSERT_EQ(Bytes(IConv(Wide(values), "UTF-16LE")), Bytes(expected)) << ::testing::PrintToString(values);
    }
}

TEST(IConvUtf16Le, AppendUtf16LeMatchesIconvAfterThePrefix) {
    std::mt19937 rng(1603);
    for (int round = 0; round < 3000; ++round) {
        std::vector<uint32_t> values(rng() % (round % 2 ? 120 : 48));
        for (uint32_t& v : values) v = round % 2 && rng() % 10 != 0 ? 0x20 + rng() % 0x5F : RandomWide(rng);
        // Prefixes of odd lengths too, so the encoding starts at any offset.
        std::string prefix(rng() % 40, '\0');
        for (char& c : prefix) c = static_cast<char>(rng());
        std::string expected = prefix + IconvWithReplacement("UTF-16LE", "WCHAR_T", RawWide(values), sizeof(wchar_t),
                                                             std::string("?\0", 2));
        NString out(prefix.data(), static_cast<uint32_t>(prefix.size()));
        if (round % 3 == 0) out.Reserve(static_cast<uint32_t>(expected.size()) + 7);  // room already there
        const WString wide = Wide(values);
        ASSERT_EQ(Utf16LeSize(wide.Data(), wide.Length()), expected.size() - prefix.size());
        if (round % 2) AppendUtf16Le(out, wide);
        else AppendUtf16Le(out, wide.Data(), wide.Length());
        ASSERT_EQ(Bytes(out), Bytes(expected)) << ::testing::PrintToString(values);
        ASSERT_EQ(out.CStr()[out.Length()], '\0');
        // Growth is exact; a block with room enough is kept.
        ASSERT_EQ(out.Capacity(), round % 3 == 0 ? expected.size() + 7 : expected.size());
    }
}

TEST(IConvUtf16Le, AppendUtf16LeOfNothingLeavesTheStringAlone) {
    NString out("abc");
    const char* block = out.Data();
    AppendUtf16Le(out, WString());
    AppendUtf16Le(out, L"x", 0);
    EXPECT_EQ(out, "abc");
    EXPECT_EQ(out.Data(), block);
}

TEST(IConvUtf16Le, Utf16LeToWideMatchesIconv) {
    std::mt19937 rng(1602);
    for (int round = 0; round < 3000; ++round) {
        std::string bytes;
        for (size_t n = rng() % (round % 2 ? 120 : 48); n > 0; --n) {
            uint16_t u = round % 2 && rng() % 10 != 0 ? static_cast<uint16_t>(rng() % 0xD800) : RandomUnit(rng);
            bytes += static_cast<char>(u & 0xFF);
            bytes += static_cast<char>(u >> 8);
        }
        if (round % 4 == 0) bytes += static_cast<char>(rng());  // an odd end now and then
        const wchar_t question = L'?';
        std::string raw = IconvWithReplacement("WCHAR_T", "UTF-16LE", bytes, 2,
                                               std::string(reinterpret_cast<const char*>(&question), sizeof question));
        std::vector<uint32_t> expected;
        for (size_t i = 0; i + sizeof(wchar_t) <= raw.size(); i += sizeof(wchar_t)) {
            wchar_t c;
            std::memcpy(&c, raw.data() + i, sizeof c);
            expected.push_back(static_cast<uint32_t>(c));
        }
        ASSERT_EQ(Values(FromExact(bytes, "UTF-16LE")), expected) << ::testing::PrintToString(Bytes(bytes));
    }
}

}  // namespace
}  // namespace qel::fnd::osdep
