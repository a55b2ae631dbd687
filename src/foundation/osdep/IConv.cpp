// Code-set conversions through the system's iconv, with one "?" for each
// unit iconv refuses.
#include "foundation/osdep/IConv.h"

#include <algorithm>
#include <bit>
#include <cerrno>
#include <iconv.h>
#include <strings.h>

#if defined(__SSE2__)
#include <emmintrin.h>
#endif

#include "foundation/Exception.h"
#include "foundation/SafeInteger.h"

namespace qel::fnd::osdep {

namespace {

constexpr const char* kModule = "osdep/IConv";
// glibc's name for the platform's wide characters (UCS-4 in host order).
constexpr const char* kWide = "WCHAR_T";

bool IsUtf16Le(const char* codeSet) { return strcasecmp(codeSet, "UTF-16LE") == 0; }

// Owns one descriptor for the length of one conversion, so that conversions
// on several threads never share state.
class Descriptor {
public:
    Descriptor(const char* to, const char* from) : cd_(iconv_open(to, from)) {
        if (cd_ == reinterpret_cast<iconv_t>(-1)) throw exception::InvalidLocale(kModule, 71);
    }
    ~Descriptor() { iconv_close(cd_); }
    Descriptor(const Descriptor&) = delete;
    Descriptor& operator=(const Descriptor&) = delete;

    // Converts while input and output room remain; each refused unit becomes
    // `replacement` in the output and is skipped. Returns the bytes written.
    size_t Run(const char* in, size_t inLeft, size_t unit, char* out, size_t outSize,
               const char* replacement, size_t replacementSize) {
        char* inPtr = const_cast<char*>(in);
        char* outPtr = out;
        size_t outLeft = outSize;
        while (inLeft > 0 && outLeft > 0) {
            size_t r = iconv(cd_, &inPtr, &inLeft, &outPtr, &outLeft);
            if (r != static_cast<size_t>(-1)) break;
            if (errno != EILSEQ && errno != EINVAL) break;  // E2BIG: no room left
            if (outLeft < replacementSize) break;
            for (size_t i = 0; i < replacementSize; ++i) *outPtr++ = replacement[i];
            outLeft -= replacementSize;
            size_t skip = unit < inLeft ? unit : inLeft;
            inPtr += skip;
            inLeft -= skip;
        }
        // Stateful code sets may owe a closing shift sequence.
        iconv(cd_, nullptr, nullptr, &outPtr, &outLeft);
        return static_cast<size_t>(outPtr - out);
    }

private:
    iconv_t cd_;
};

// UTF-16LE text comes and goes in bulk, so both directions skip iconv. They
// reproduce its results exactly, "?" units for refused input included: the
// wide side may hold any 32-bit value.
//
// Runs of characters below the surrogates map one to one. Both directions
// look at a block at a time, copy the run that leads it in one go and only
// then turn to a single character: vector code with SSE2 on x86-64, plain
// loops elsewhere (the controller's ARM baseline has no NEON). Both targets
// are little-endian, so a 16-bit unit in memory is already in UTF-16LE byte
// order.

constexpr uint32_t kQuestionMark = 0x3F;
constexpr size_t kBlock = 16;  // wide characters, or bytes of UTF-16LE

bool IsSurrogate(uint32_t u) noexcept { return u - 0xD800u < 0x800u; }
bool IsAstral(uint32_t u) noexcept { return u - 0x10000u < 0x100000u; }

#if defined(__SSE2__)

__m128i Load(const void* p) noexcept { return _mm_loadu_si128(static_cast<const __m128i*>(p)); }

// Writes the 16 characters at `p` as units and returns how many of them,
// from the first, lie in [0, 0xD800); the rest are rewritten by the caller.
// Moved down by 0x7FFF, that range packs into signed 16-bit lanes exactly as
// [-0x7FFF, 0x5800]; every other value saturates to -0x8000 or lands above.
size_t NarrowLowBmpPrefix(const wchar_t* p, unsigned char* out) noexcept {
    const __m128i bias32 = _mm_set1_epi32(0x7FFF);
    const __m128i low = _mm_packs_epi32(_mm_sub_epi32(Load(p), bias32), _mm_sub_epi32(Load(p + 4), bias32));
    const __m128i high = _mm_packs_epi32(_mm_sub_epi32(Load(p + 8), bias32), _mm_sub_epi32(Load(p + 12), bias32));
    const __m128i bias16 = _mm_set1_epi16(0x7FFF);
    auto* to = reinterpret_cast<__m128i*>(out);
    _mm_storeu_si128(to, _mm_add_epi16(low, bias16));
    _mm_storeu_si128(to + 1, _mm_add_epi16(high, bias16));
    const __m128i top = _mm_set1_epi16(0x5800);
    const __m128i floor = _mm_set1_epi16(static_cast<int16_t>(-0x8000));
    const __m128i badLow = _mm_or_si128(_mm_cmpgt_epi16(low, top), _mm_cmpeq_epi16(low, floor));
    const __m128i badHigh = _mm_or_si128(_mm_cmpgt_epi16(high, top), _mm_cmpeq_epi16(high, floor));
    const auto bad = static_cast<uint32_t>(_mm_movemask_epi8(_mm_packs_epi16(badLow, badHigh)));
    return static_cast<size_t>(std::countr_zero(bad | 0x10000u));
}

// Characters beyond the BMP in `blocks` blocks; the count must fit 32 bits.
uint32_t AstralCount(const wchar_t* p, size_t blocks) noexcept {
    // u - 0x10000 below 0x100000 as unsigned numbers, compared as signed ones
    // after moving the range to the bottom.
    const __m128i shift = _mm_set1_epi32(static_cast<int32_t>(0x80000000u - 0x10000u));
    const __m128i limit = _mm_set1_epi32(static_cast<int32_t>(0x80000000u + 0x100000u));
    __m128i count = _mm_setzero_si128();
    for (size_t i = 0; i < blocks * kBlock; i += 4)
        count = _mm_sub_epi32(count, _mm_cmplt_epi32(_mm_add_epi32(Load(p + i), shift), limit));
    count = _mm_add_epi32(count, _mm_shuffle_epi32(count, _MM_SHUFFLE(1, 0, 3, 2)));
    count = _mm_add_epi32(count, _mm_shuffle_epi32(count, _MM_SHUFFLE(2, 3, 0, 1)));
    return static_cast<uint32_t>(_mm_cvtsi128_si32(count));
}

// Units, among the eight at `in`, before the first surrogate.
size_t PlainUnitPrefix(const unsigned char* in) noexcept {
    const __m128i top = _mm_and_si128(Load(in), _mm_set1_epi16(static_cast<int16_t>(0xF800)));
    const auto surrogates =
        static_cast<uint32_t>(_mm_movemask_epi8(_mm_cmpeq_epi16(top, _mm_set1_epi16(static_cast<int16_t>(0xD800)))));
    return static_cast<size_t>(std::countr_zero(surrogates | 0x10000u)) / 2;
}

// Writes all eight units at `in` as wide characters and returns how many of
// them lead before the first surrogate; the rest are rewritten by the caller.
size_t WidenPlainUnitPrefix(const unsigned char* in, wchar_t* out) noexcept {
    const __m128i units = Load(in);
    auto* to = reinterpret_cast<__m128i*>(out);
    _mm_storeu_si128(to, _mm_unpacklo_epi16(units, _mm_setzero_si128()));
    _mm_storeu_si128(to + 1, _mm_unpackhi_epi16(units, _mm_setzero_si128()));
    return PlainUnitPrefix(in);
}

#else

size_t NarrowLowBmpPrefix(const wchar_t* p, unsigned char* out) noexcept {
    size_t n = 0;
    for (; n < kBlock && static_cast<uint32_t>(p[n]) < 0xD800u; ++n) {
        out[2 * n] = static_cast<unsigned char>(static_cast<uint32_t>(p[n]) & 0xFFu);
        out[2 * n + 1] = static_cast<unsigned char>(static_cast<uint32_t>(p[n]) >> 8);
    }
    return n;
}

uint32_t AstralCount(const wchar_t* p, size_t blocks) noexcept {
    uint32_t count = 0;
    for (size_t i = 0; i < blocks * kBlock; ++i) count += IsAstral(static_cast<uint32_t>(p[i]));
    return count;
}

size_t PlainUnitPrefix(const unsigned char* in) noexcept {
    size_t n = 0;
    while (n < kBlock / 2 && (in[2 * n + 1] & 0xF8u) != 0xD8u) ++n;
    return n;
}

size_t WidenPlainUnitPrefix(const unsigned char* in, wchar_t* out) noexcept {
    size_t n = PlainUnitPrefix(in);
    for (size_t i = 0; i < n; ++i) out[i] = static_cast<wchar_t>(in[2 * i] | (static_cast<uint32_t>(in[2 * i + 1]) << 8));
    return n;
}

#endif

[[noreturn]] void ThrowOverflow(int32_t line) { throw exception::BufferOverflow(kModule, line); }

// Writes one character as one or two units, or the unit "?" for what iconv
// refuses: surrogates and values beyond the Unicode range, negative ones too.
inline unsigned char* EncodeUtf16(uint32_t u, unsigned char* out, unsigned char* outEnd) {
    uint32_t units[2];
    size_t n = 1;
    if (IsAstral(u)) {
        u -= 0x10000u;
        units[0] = 0xD800u | (u >> 10);
        units[1] = 0xDC00u | (u & 0x3FFu);
        n = 2;
    } else {
        units[0] = u < 0x10000u && !IsSurrogate(u) ? u : kQuestionMark;
    }
    if (static_cast<size_t>(outEnd - out) < 2 * n) ThrowOverflow(__LINE__);
    for (size_t i = 0; i < n; ++i) {
        *out++ = static_cast<unsigned char>(units[i] & 0xFFu);
        *out++ = static_cast<unsigned char>(units[i] >> 8);
    }
    return out;
}

// Writes the encoding into [out, outEnd), which Utf16LeSize measured.
void EncodeUtf16Le(const wchar_t* text, uint32_t count, unsigned char* out, unsigned char* const outEnd) {
    const wchar_t* const end = text + count;
    for (const wchar_t* p = text; p != end;) {
        if (static_cast<size_t>(end - p) >= kBlock && static_cast<size_t>(outEnd - out) >= 2 * kBlock) {
            const size_t plain = NarrowLowBmpPrefix(p, out);
            p += plain;
            out += 2 * plain;
            if (plain == kBlock) continue;
        }
        out = EncodeUtf16(static_cast<uint32_t>(*p++), out, outEnd);
    }
    if (out != outEnd) ThrowOverflow(__LINE__);
}

NString WideToUtf16Le(const wchar_t* text, uint32_t count) {
    NString result(Utf16LeSize(text, count), '\0');
    auto* out = reinterpret_cast<unsigned char*>(result.Data());
    EncodeUtf16Le(text, count, out, out + result.Length());
    return result;
}

// Walks UTF-16LE input as iconv decodes it: `run(at)` may copy the eight
// units at `at` in one go and returns how many of them, leading, are not
// surrogates; `emit` takes each other character, or "?" for each refused
// unit. A high surrogate without its low half and a lone low surrogate are
// refused one unit at a time; the half of a unit left over at an odd end is
// refused too.
template <typename Run, typename Emit>
void DecodeUtf16Le(const unsigned char* in, uint32_t count, Run&& run, Emit&& emit) {
    uint32_t i = 0;
    while (count - i >= 2) {
        if (count - i >= kBlock) {
            const size_t plain = run(in + i);
            i += static_cast<uint32_t>(2 * plain);
            if (plain == kBlock / 2) continue;
        }
        const uint32_t u = in[i] | (static_cast<uint32_t>(in[i + 1]) << 8);
        i += 2;
        if (!IsSurrogate(u)) {
            emit(u);
        } else if (u < 0xDC00u && count - i >= 2) {
            const uint32_t low = in[i] | (static_cast<uint32_t>(in[i + 1]) << 8);
            if (low - 0xDC00u < 0x400u) {
                emit(0x10000u + ((u - 0xD800u) << 10) + (low - 0xDC00u));
                i += 2;
            } else {
                emit(kQuestionMark);
            }
        } else {
            emit(kQuestionMark);
        }
    }
    if (i < count) emit(kQuestionMark);
}

WString Utf16LeToWide(const char* bytes, uint32_t count) {
    const auto* in = reinterpret_cast<const unsigned char*>(bytes);
    uint32_t characters = 0;
    DecodeUtf16Le(
        in, count,
        [&characters](const unsigned char* at) {
            const size_t plain = PlainUnitPrefix(at);
            characters += static_cast<uint32_t>(plain);
            return plain;
        },
        [&characters](uint32_t) { ++characters; });
    WString result(characters, L'\0');
    wchar_t* out = result.Data();
    wchar_t* const outEnd = out + characters;
    DecodeUtf16Le(
        in, count,
        [&out, outEnd](const unsigned char* at) {
            // Without room for a whole block, one character at a time.
            if (static_cast<size_t>(outEnd - out) < kBlock / 2) return size_t{0};
            const size_t plain = WidenPlainUnitPrefix(at, out);
            out += plain;
            return plain;
        },
        [&out, outEnd](uint32_t u) {
            if (out == outEnd) ThrowOverflow(__LINE__);
            *out++ = static_cast<wchar_t>(u);
        });
    if (out != outEnd) ThrowOverflow(__LINE__);
    return result;
}

}  // namespace

// One unit per character and a second for each one beyond the BMP, counted
// per chunk, whose count cannot overflow; only the total is checked.
uint32_t Utf16LeSize(const wchar_t* text, uint32_t count) {
    const wchar_t* const end = text + count;
    constexpr size_t kChunkBlocks = 4096;
    uint32_t units = count;
    const wchar_t* p = text;
    while (static_cast<size_t>(end - p) >= kBlock) {
        const size_t blocks = std::min(kChunkBlocks, static_cast<size_t>(end - p) / kBlock);
        units = CheckedAdd(units, AstralCount(p, blocks));
        p += blocks * kBlock;
    }
    uint32_t tail = 0;
    for (; p != end; ++p) tail += IsAstral(static_cast<uint32_t>(*p));
    units = CheckedAdd(units, tail);
    return CheckedMultiply(units, 2);
}

WString IConv(const char* bytes, uint32_t count, const char* fromCodeSet) {
    if (IsUtf16Le(fromCodeSet)) return Utf16LeToWide(bytes, count);
    Descriptor cd(kWide, fromCodeSet);
    if (count == 0) return WString();
    // At most one wide character comes from each input byte. The size is
    // checked before anything is allocated.
    const uint32_t outBytes = CheckedMultiply(count, sizeof(wchar_t));
    WString result(count, L'\0');
    const wchar_t question = L'?';
    size_t written = cd.Run(bytes, count, 1, reinterpret_cast<char*>(result.Data()), outBytes,
                            reinterpret_cast<const char*>(&question), sizeof question);
    result.Resize(static_cast<WString::size_type>(written / sizeof(wchar_t)));
    return result;
}

void AppendUtf16Le(NString& out, const wchar_t* text, uint32_t count) {
    const uint32_t bytes = Utf16LeSize(text, count);
    const NString::size_type start = out.Length();
    if (static_cast<uint64_t>(start) + bytes > NString::kMaxLength) detail::ThrowStringTooLarge(__LINE__);
    if (bytes == 0) return;
    // Exact growth: the caller's document is the largest block of a request,
    // and doubling it would leave up to half of it unused.
    out.Reserve(start + bytes);
    // Written into the block's spare room, then taken into the length by
    // appending it onto itself (a move in place): Resize would first fill
    // the room a byte at a time, which costs more than the encoding.
    auto* at = reinterpret_cast<unsigned char*>(out.Data()) + start;
    EncodeUtf16Le(text, count, at, at + bytes);
    out.Append(out.Data() + start, bytes);
}

NString IConv(const wchar_t* text, uint32_t count, const char* toCodeSet) {
    if (IsUtf16Le(toCodeSet)) return WideToUtf16Le(text, count);
    Descriptor cd(toCodeSet, kWide);
    if (count == 0) return NString();
    // Four bytes per character hold every Unicode character in UTF-8; iconv's
    // five- and six-byte forms of larger values can run out of room, which
    // ends the text early.
    NString result(CheckedMultiply(count, 4), '\0');
    size_t written = cd.Run(reinterpret_cast<const char*>(text), static_cast<size_t>(count) * sizeof(wchar_t),
                            sizeof(wchar_t), result.Data(), result.Length(), "?", 1);
    result.Resize(static_cast<NString::size_type>(written));
    return result;
}

}  // namespace qel::fnd::osdep
