// The UTF-8 codec as callers see it: exact bytes and values, strict rejection
// of malformed input, and agreement with the system's iconv on random text.
#include "foundation/Utf.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <iconv.h>
#include <iterator>
#include <memory>
#include <optional>
#include <random>
#include <string>
#include <vector>

#include "foundation/Exception.h"
#include "foundation/FoundationTestSupport.h"

namespace qel::fnd {
namespace {

using testing::RawWide;

using exception::InvalidSequence;

std::vector<uint32_t> Values(const WString& s) {
    std::vector<uint32_t> v;
    for (wchar_t c : s) v.push_back(static_cast<uint32_t>(c));
    return v;
}

std::vector<uint32_t> Bytes(const NString& s) {
    std::vector<uint32_t> v;
    for (char c : s) v.push_back(static_cast<unsigned char>(c));
    return v;
}

std::vector<uint32_t> Bytes(const std::string& s) { return Bytes(NString(s.data(), static_cast<uint32_t>(s.size()))); }

WString Wide(const std::vector<uint32_t>& values) {
    WString s;
    for (uint32_t v : values) s.PushBack(static_cast<wchar_t>(v));
    return s;
}

// Decodes from a block of exactly `bytes.size()` bytes, so that the address
// sanitizer sees any read past the input.
WString DecodeExact(const std::string& bytes) {
    std::unique_ptr<char[]> block(new char[bytes.size()]);
    std::copy(bytes.begin(), bytes.end(), block.get());
    return Utf8ToWide(block.get(), static_cast<uint32_t>(bytes.size()));
}

void ExpectInvalid(const std::string& bytes) {
    SCOPED_TRACE(::testing::PrintToString(Bytes(bytes)));
    try {
        DecodeExact(bytes);
        ADD_FAILURE() << "decoded malformed input";
    } catch (const InvalidSequence& e) {
        EXPECT_STREQ(e.File(), "Utf8ToWide");
        EXPECT_STREQ(e.what(), "Invalid UTF8 encoding sequence");
    }
}

struct Coded {
    const char* bytes;
    uint32_t value;
};

// Every length boundary of both directions, plus the values that only this
// codec (not strict Unicode) accepts.
const Coded kBoundaries[] = {
    {"\x00", 0x0},
    {"\x7F", 0x7F},
    {"\xC2\x80", 0x80},
    {"\xC3\xA9", 0xE9},
    {"\xDF\xBF", 0x7FF},
    {"\xE0\xA0\x80", 0x800},
    {"\xE2\x82\xAC", 0x20AC},
    {"\xED\x9F\xBF", 0xD7FF},
    {"\xED\xA0\x80", 0xD800},
    {"\xED\xBF\xBF", 0xDFFF},
    {"\xEF\xBF\xBF", 0xFFFF},
    {"\xF0\x90\x80\x80", 0x10000},
    {"\xF0\x9F\x98\x80", 0x1F600},
    {"\xF4\x8F\xBF\xBF", 0x10FFFF},
    {"\xF4\x90\x80\x80", 0x110000},
    {"\xF7\xBF\xBF\xBF", 0x1FFFFF},
};

std::string BytesOf(const Coded& c) { return c.value == 0 ? std::string(1, '\0') : std::string(c.bytes); }

TEST(Utf8ToWide, DecodesEveryLengthBoundary) {
    for (const Coded& c : kBoundaries) {
        WString decoded = DecodeExact(BytesOf(c));
        EXPECT_EQ(Values(decoded), std::vector<uint32_t>{c.value}) << std::hex << c.value;
    }
}

TEST(Utf8ToWide, EmptyInputGivesEmptyString) {
    WString decoded = Utf8ToWide(nullptr, 0);
    EXPECT_TRUE(decoded.IsEmpty());
    EXPECT_EQ(decoded.CStr()[0], L'\0');
}

TEST(Utf8ToWide, ResultIsAllocatedExactlyAndTerminated) {
    WString decoded = Utf8ToWide(NString("<a>caf\xC3\xA9 \xE2\x82\xAC \xF0\x9F\x98\x80 and more ascii text</a>"));
    EXPECT_EQ(decoded.Length(), 35u);
    EXPECT_EQ(decoded.Capacity(), decoded.Length());
    EXPECT_EQ(decoded.CStr()[decoded.Length()], L'\0');
    EXPECT_EQ(decoded, L"<a>caf\u00e9 \u20ac \U0001F600 and more ascii text</a>");
}

TEST(Utf8ToWide, RejectsMalformedSequences) {
    const char* const kMalformed[] = {
        "\x80", "\xBF",                                  // stray continuation bytes
        "\xC0\x80", "\xC1\xBF",                          // overlong two-byte forms
        "\xE0\x80\x80", "\xE0\x9F\xBF",                  // overlong three-byte forms
        "\xF0\x80\x80\x80", "\xF0\x8F\xBF\xBF",          // overlong four-byte forms
        "\xC3\x41", "\xC3\xC3\xA9", "\xE2\x28\xA1",      // a continuation byte missing
        "\xE2\x82\x41", "\xF0\x9F\x41\x80", "\xF0\x9F\x98\xC0",
        "\xF8\x88\x80\x80\x80", "\xFB\xBF\xBF\xBF\xBF",  // five- and six-byte forms
        "\xFC\x84\x80\x80\x80\x80", "\xFD\xBF\xBF\xBF\xBF\xBF",
        "\xFE", "\xFF",                                  // never lead bytes
        "\xE2\x82", "\xC3", "\xF0\x9F\x98", "\xF7",      // cut short
    };
    for (const char* bytes : kMalformed) {
        ExpectInvalid(bytes);
        // Behind ASCII runs of every length that the fast path handles in
        // blocks, and before more text.
        for (size_t run = 1; run <= 17; ++run) {
            ExpectInvalid(std::string(run, 'x') + bytes);
            ExpectInvalid(std::string(run, 'x') + bytes + std::string(run, 'y'));
        }
    }
}

TEST(Utf8ToWide, TextCutInsideASequenceIsRejectedAtEveryCut) {
    const std::string text = "ab\xC3\xA9" "c\xE2\x82\xAC\xF0\x9F\x98\x80\xED\xA0\x80" "defghijk\xF7\xBF\xBF\xBF" "z";
    const std::vector<uint32_t> values = {'a', 'b', 0xE9, 'c', 0x20AC, 0x1F600, 0xD800, 'd', 'e',
                                          'f', 'g', 'h', 'i', 'j', 'k', 0x1FFFFF, 'z'};
    // Byte offsets where a character starts; every other cut splits one.
    std::vector<size_t> starts;
    for (size_t i = 0; i < text.size(); ++i)
        if ((static_cast<unsigned char>(text[i]) & 0xC0) != 0x80) starts.push_back(i);
    ASSERT_EQ(starts.size(), values.size());
    starts.push_back(text.size());
    for (size_t cut = 0; cut <= text.size(); ++cut) {
        SCOPED_TRACE(cut);
        size_t whole = 0;
        while (whole < starts.size() && starts[whole] < cut) ++whole;
        if (starts[whole] == cut) {
            EXPECT_EQ(Values(DecodeExact(text.substr(0, cut))),
                      std::vector<uint32_t>(values.begin(), values.begin() + static_cast<ptrdiff_t>(whole)));
        } else {
            ExpectInvalid(text.substr(0, cut));
        }
    }
}

TEST(WideToUtf8, EncodesEveryLengthBoundary) {
    for (const Coded& c : kBoundaries) {
        WString text = Wide({c.value});
        EXPECT_EQ(Bytes(WideToUtf8(text)), Bytes(BytesOf(c))) << std::hex << c.value;
    }
}

TEST(WideToUtf8, KeepsValuesBeyondUnicodeAndMarksNegativeOnes) {
    const Coded kWide[] = {
        {"\xF8\x88\x80\x80\x80", 0x200000},       {"\xFB\xBF\xBF\xBF\xBF", 0x3FFFFFF},
        {"\xFC\x84\x80\x80\x80\x80", 0x4000000},  {"\xFD\xBF\xBF\xBF\xBF\xBF", 0x7FFFFFFF},
        {"?", 0x80000000},                        {"?", 0xFFFFFFFF},
        {"?", 0xDEADBEEF},
    };
    for (const Coded& c : kWide) {
        EXPECT_EQ(Bytes(WideToUtf8(Wide({c.value}))), Bytes(std::string(c.bytes))) << std::hex << c.value;
    }
}

TEST(WideToUtf8, ResultIsAllocatedExactlyAndTerminated) {
    WString text(L"x\u20acy\U0001F600z");
    text.PushBack(static_cast<wchar_t>(0x80000000u));
    NString bytes = WideToUtf8(text);
    EXPECT_EQ(Bytes(bytes), Bytes(std::string("x\xE2\x82\xACy\xF0\x9F\x98\x80z?")));
    EXPECT_EQ(bytes.Capacity(), bytes.Length());
    EXPECT_EQ(bytes.CStr()[bytes.Length()], '\0');
    EXPECT_TRUE(WideToUtf8(WString()).IsEmpty());
    EXPECT_TRUE(WideToUtf8(nullptr, 0).IsEmpty());
}

TEST(UtfCodec, NonAsciiAtEveryPositionOfAsciiRuns) {
    // Both directions copy ASCII in blocks; a longer form may sit anywhere in
    // or across one.
    for (size_t length = 1; length <= 40; ++length) {
        for (size_t at = 0; at < length; ++at) {
            std::vector<uint32_t> values;
            std::string bytes;
            for (size_t i = 0; i < length; ++i) {
                values.push_back(i == at ? 0x1F600 : 'a' + i % 26);
                bytes += i == at ? std::string("\xF0\x9F\x98\x80") : std::string(1, static_cast<char>('a' + i % 26));
            }
            ASSERT_EQ(Bytes(WideToUtf8(Wide(values))), Bytes(bytes)) << length << " " << at;
            ASSERT_EQ(Values(DecodeExact(bytes)), values) << length << " " << at;
        }
    }
}

TEST(WideToUtf8, RoundTripsEveryValueTheDecoderAccepts) {
    std::mt19937 rng(7);
    std::uniform_int_distribution<uint32_t> value(0, 0x1FFFFF);
    for (int round = 0; round < 200; ++round) {
        std::vector<uint32_t> values(rng() % 64);
        for (uint32_t& v : values) v = value(rng) >> (rng() % 21);
        EXPECT_EQ(Values(Utf8ToWide(WideToUtf8(Wide(values)))), values);
    }
}

// --- differential tests against the system's iconv ---------------------------

// One iconv call over the whole input: the output, or nothing when iconv
// refuses any of it.
std::optional<std::string> IconvWhole(const char* to, const char* from, const std::string& in) {
    iconv_t cd = iconv_open(to, from);
    if (cd == reinterpret_cast<iconv_t>(-1)) return std::nullopt;
    std::string out(in.size() * 8 + 16, '\0');
    char* inPtr = const_cast<char*>(in.data());
    size_t inLeft = in.size();
    char* outPtr = out.data();
    size_t outLeft = out.size();
    size_t r = iconv(cd, &inPtr, &inLeft, &outPtr, &outLeft);
    iconv_close(cd);
    if (r == static_cast<size_t>(-1) || inLeft != 0) return std::nullopt;
    out.resize(out.size() - outLeft);
    return out;
}


std::vector<uint32_t> FromRawWide(const std::string& raw) {
    std::vector<uint32_t> values;
    for (size_t i = 0; i + sizeof(wchar_t) <= raw.size(); i += sizeof(wchar_t)) {
        wchar_t c;
        std::memcpy(&c, raw.data() + i, sizeof c);
        values.push_back(static_cast<uint32_t>(c));
    }
    return values;
}

// Characters from every range the codecs treat differently, weighted towards
// the edges, including those of the vector code's lane tricks.
uint32_t RandomValue(std::mt19937& rng) {
    switch (rng() % 10) {
        case 0: case 1: case 2: return rng() % 0x80;
        case 3: return 0x80 + rng() % 0x780;
        case 4: return 0x800 + rng() % 0xF800;
        case 5: return 0xD800 + rng() % 0x800;
        case 6: return 0x10000 + rng() % 0x100000;
        case 7: return 0x110000 + rng() % (0x80000000u - 0x110000);
        case 8: return 0x80000000u | rng();
        default: {
            static const uint32_t kEdges[] = {0, 0x7F, 0x80, 0x7FF, 0x800, 0x7FFF, 0x8000, 0xD7FF, 0xD800, 0xDBFF,
                                              0xDC00, 0xDFFF, 0xE000, 0xFFFD, 0xFFFE, 0xFFFF, 0x10000, 0x10FFFF,
                                              0x110000, 0x1FFFFF, 0x200000, 0x3FFFFFF, 0x4000000, 0x7FFFFFFF,
                                              0x80000000, 0x80000041, 0xFFFF0000, 0xFFFF8000, 0xFFFFFF80, 0xFFFFFFFF};
            return kEdges[rng() % std::size(kEdges)];
        }
    }
}

// Random text: in odd rounds mostly ASCII, so that the block copies run and
// the other characters fall at every offset within and across blocks.
std::vector<uint32_t> RandomText(std::mt19937& rng, int round, bool (*keep)(uint32_t)) {
    std::vector<uint32_t> values(rng() % (round % 2 ? 120 : 60));
    for (uint32_t& v : values) {
        do v = round % 2 && rng() % 10 != 0 ? 0x20 + rng() % 0x5F : RandomValue(rng);
        while (!keep(v));
    }
    return values;
}

bool Any(uint32_t) { return true; }
bool IsScalarValue(uint32_t v) { return v <= 0x10FFFF && (v < 0xD800 || v >= 0xE000); }

// The encoder's documented form, built bit by bit: as many bytes as the
// value has significant bits calls for.
std::string DocumentedUtf8(uint32_t v) {
    if (v >= 0x80000000u) return "?";
    if (v < 0x80) return std::string(1, static_cast<char>(v));
    int bits = 0;
    while (bits < 32 && (v >> bits) != 0) ++bits;
    const int length = bits <= 11 ? 2 : bits <= 16 ? 3 : bits <= 21 ? 4 : bits <= 26 ? 5 : 6;
    std::string out(static_cast<size_t>(length), '\0');
    for (int i = length - 1; i > 0; --i, v >>= 6) out[static_cast<size_t>(i)] = static_cast<char>(0x80 | (v & 0x3F));
    out[0] = static_cast<char>(((0xFF00 >> length) & 0xFF) | v);
    return out;
}

TEST(WideToUtf8, AgreesWithIconvOnEveryCharacterItAccepts) {
    std::mt19937 rng(20240611);
    for (int i = 0; i < 4000; ++i) {
        uint32_t v = RandomValue(rng);
        NString ours = WideToUtf8(Wide({v}));
        std::optional<std::string> theirs = IconvWhole("UTF-8", "WCHAR_T", RawWide({v}));
        if (theirs) {
            EXPECT_EQ(Bytes(ours), Bytes(*theirs)) << std::hex << v;
        } else {
            // Where iconv refuses a value, ours keeps it in the longer forms
            // or marks it.
            EXPECT_EQ(Bytes(ours), Bytes(DocumentedUtf8(v))) << std::hex << v;
            EXPECT_TRUE((v >= 0xD800 && v < 0xE000) || v > 0x10FFFF) << std::hex << v;
        }
    }
}

// Per character: iconv's bytes where it takes the value, else ours.
std::string ExpectedUtf8(uint32_t v) {
    std::optional<std::string> theirs = IconvWhole("UTF-8", "WCHAR_T", RawWide({v}));
    return theirs ? *theirs : DocumentedUtf8(v);
}

TEST(WideToUtf8, EncodesWholeStringsCharacterByCharacter) {
    std::mt19937 rng(77);
    for (int round = 0; round < 2000; ++round) {
        std::vector<uint32_t> values = RandomText(rng, round, Any);
        std::string expected;
        for (uint32_t v : values) expected += v < 0x80 ? std::string(1, static_cast<char>(v)) : ExpectedUtf8(v);
        ASSERT_EQ(Bytes(WideToUtf8(Wide(values))), Bytes(expected)) << ::testing::PrintToString(values);
    }
}

TEST(WideToUtf8, AgreesWithIconvOnWholeStringsOfScalarValues) {
    std::mt19937 rng(99);
    for (int round = 0; round < 2000; ++round) {
        std::vector<uint32_t> values = RandomText(rng, round, IsScalarValue);
        NString ours = WideToUtf8(Wide(values));
        std::optional<std::string> theirs = IconvWhole("UTF-8", "WCHAR_T", RawWide(values));
        ASSERT_TRUE(theirs.has_value());
        ASSERT_EQ(Bytes(ours), Bytes(*theirs));
    }
}

TEST(Utf8ToWide, AgreesWithIconvOnValidText) {
    std::mt19937 rng(31337);
    for (int round = 0; round < 2000; ++round) {
        std::vector<uint32_t> values = RandomText(rng, round, IsScalarValue);
        std::optional<std::string> bytes = IconvWhole("UTF-8", "WCHAR_T", RawWide(values));
        ASSERT_TRUE(bytes.has_value());
        std::optional<std::string> theirs = IconvWhole("WCHAR_T", "UTF-8", *bytes);
        ASSERT_TRUE(theirs.has_value());
        ASSERT_EQ(Values(DecodeExact(*bytes)), FromRawWide(*theirs));
    }
}

// Valid text with random damage, so that both accepted and refused inputs
// come up often.
std::string DamagedUtf8(std::mt19937& rng, int round) {
    std::string bytes;
    for (uint32_t v : RandomText(rng, round, Any)) bytes += DocumentedUtf8(v);
    for (size_t hits = rng() % 3; hits > 0 && !bytes.empty(); --hits) {
        size_t at = rng() % bytes.size();
        switch (rng() % 4) {
            case 0: bytes[at] = static_cast<char>(rng()); break;
            case 1: bytes.erase(at, 1); break;
            case 2: bytes.insert(at, 1, static_cast<char>(0x80 | (rng() & 0x7F))); break;
            default: bytes.resize(at); break;
        }
    }
    return bytes;
}

TEST(Utf8ToWide, AgreesWithIconvOnDamagedInput) {
    std::mt19937 rng(4242);
    int accepted = 0, refused = 0;
    for (int round = 0; round < 4000; ++round) {
        std::string bytes = DamagedUtf8(rng, round);
        std::optional<std::vector<uint32_t>> ours;
        try {
            ours = Values(DecodeExact(bytes));
        } catch (const InvalidSequence&) {
        }
        std::optional<std::string> raw = IconvWhole("WCHAR_T", "UTF-8", bytes);
        std::optional<std::vector<uint32_t>> theirs;
        if (raw) theirs = FromRawWide(*raw);
        SCOPED_TRACE(::testing::PrintToString(Bytes(bytes)));
        (ours ? accepted : refused)++;

        // Ours keeps encoded surrogates (and values past Unicode, which some
        // iconv versions refuse); iconv accepts the five- and six-byte forms,
        // which ours refuses.
        bool oursBeyondIconv = false;
        if (ours)
            for (uint32_t v : *ours) oursBeyondIconv |= (v >= 0xD800 && v < 0xE000) || v > 0x10FFFF;
        bool theirsBeyondOurs = false;
        if (theirs)
            for (uint32_t v : *theirs) theirsBeyondOurs |= v > 0x1FFFFF;

        if (ours && !oursBeyondIconv) {
            ASSERT_TRUE(theirs.has_value());
            ASSERT_EQ(*ours, *theirs);
        }
        if (theirs && !theirsBeyondOurs) {
            ASSERT_TRUE(ours.has_value());
            ASSERT_EQ(*ours, *theirs);
        }
    }
    // Both outcomes must have been exercised for the comparison to mean much.
    EXPECT_GT(accepted, 500);
    EXPECT_GT(refused, 500);
}

}  // namespace
}  // namespace qel::fnd
