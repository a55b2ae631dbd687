// The UTF-8 codec: measure the whole input, allocate exactly, then convert.
#include "foundation/Utf.h"

#include <algorithm>
#include <bit>

#if defined(__SSE2__)
#include <emmintrin.h>
#endif

#include "foundation/Exception.h"
#include "foundation/SafeInteger.h"

namespace qel::fnd {

namespace {

constexpr const char* kDecoderModule = "Utf8ToWide";
constexpr const char* kEncoderModule = "WideToUtf8";

// Most text the service handles is ASCII markup. Both directions look at 16
// units at a time, copy the ASCII ones that lead them in one go and only
// then turn to a single character. With SSE2 on x86-64 (every such processor
// has it) this is vector code; elsewhere it is plain loops (the controller's
// ARM baseline has no NEON).
constexpr size_t kBlock = 16;

// Bytes WideToUtf8 writes for one value. Compared as a signed number a
// negative value passes no threshold and counts one byte, its "?"; signed
// compares are also the ones vector units have.
inline uint32_t EncodedLength(uint32_t u) noexcept {
    const auto s = static_cast<int32_t>(u);
    return 1u + (s > 0x7F) + (s > 0x7FF) + (s > 0xFFFF) + (s > 0x1FFFFF) + (s > 0x3FFFFFF);
}

#if defined(__SSE2__)

__m128i Load(const void* p) noexcept { return _mm_loadu_si128(static_cast<const __m128i*>(p)); }

// Leading ASCII bytes among the 16 at `p`.
size_t AsciiPrefix(const unsigned char* p) noexcept {
    return static_cast<size_t>(std::countr_zero(static_cast<uint32_t>(_mm_movemask_epi8(Load(p))) | 0x10000u));
}

// Writes all 16 bytes at `p` as wide characters and returns how many of
// them, from the first, are ASCII; the rest are rewritten by the caller.
size_t WidenAsciiPrefix(const unsigned char* p, wchar_t* out) noexcept {
    const __m128i zero = _mm_setzero_si128();
    const __m128i bytes = Load(p);
    const __m128i low = _mm_unpacklo_epi8(bytes, zero);
    const __m128i high = _mm_unpackhi_epi8(bytes, zero);
    auto* to = reinterpret_cast<__m128i*>(out);
    _mm_storeu_si128(to, _mm_unpacklo_epi16(low, zero));
    _mm_storeu_si128(to + 1, _mm_unpackhi_epi16(low, zero));
    _mm_storeu_si128(to + 2, _mm_unpacklo_epi16(high, zero));
    _mm_storeu_si128(to + 3, _mm_unpackhi_epi16(high, zero));
    return static_cast<size_t>(std::countr_zero(static_cast<uint32_t>(_mm_movemask_epi8(bytes)) | 0x10000u));
}

// Writes the 16 characters at `p` as bytes and returns how many of them,
// from the first, are ASCII; the rest are rewritten by the caller. Saturating
// packs keep ASCII values as they are and never turn a value that is not
// zero into zero, so the same packs narrow the text and flag its non-ASCII
// characters.
size_t NarrowAsciiPrefix(const wchar_t* p, char* out) noexcept {
    const __m128i v0 = Load(p), v1 = Load(p + 4), v2 = Load(p + 8), v3 = Load(p + 12);
    _mm_storeu_si128(reinterpret_cast<__m128i*>(out),
                     _mm_packus_epi16(_mm_packs_epi32(v0, v1), _mm_packs_epi32(v2, v3)));
    const __m128i high = _mm_set1_epi32(~0x7F);
    const __m128i flags = _mm_packs_epi16(_mm_packs_epi32(_mm_and_si128(v0, high), _mm_and_si128(v1, high)),
                                          _mm_packs_epi32(_mm_and_si128(v2, high), _mm_and_si128(v3, high)));
    const auto ascii = static_cast<uint32_t>(_mm_movemask_epi8(_mm_cmpeq_epi8(flags, _mm_setzero_si128())));
    return static_cast<size_t>(std::countr_zero(~ascii));
}

// Bytes WideToUtf8 writes for the 16 characters at `p`, one lane per
// threshold: the slow form for blocks with values of 0x10000 and more.
__m128i ExtraBytesOfWideBlock(const wchar_t* p) noexcept {
    // Each compare gives -1 per lane that passes a threshold.
    __m128i extra = _mm_setzero_si128();
    for (size_t i = 0; i < kBlock; i += 4) {
        const __m128i v = Load(p + i);
        extra = _mm_sub_epi32(extra, _mm_cmpgt_epi32(v, _mm_set1_epi32(0x7F)));
        extra = _mm_sub_epi32(extra, _mm_cmpgt_epi32(v, _mm_set1_epi32(0x7FF)));
        extra = _mm_sub_epi32(extra, _mm_cmpgt_epi32(v, _mm_set1_epi32(0xFFFF)));
        extra = _mm_sub_epi32(extra, _mm_cmpgt_epi32(v, _mm_set1_epi32(0x1FFFFF)));
        extra = _mm_sub_epi32(extra, _mm_cmpgt_epi32(v, _mm_set1_epi32(0x3FFFFFF)));
    }
    return extra;
}

// Bytes WideToUtf8 writes for `blocks` blocks of characters; the sum must
// fit 32 bits and `blocks` must be at most 4096, so that 16-bit lanes
// cannot overflow.
uint32_t EncodedLengthOfBlocks(const wchar_t* p, size_t blocks) noexcept {
    // Text is almost all below 0x10000, where a value's length follows from
    // two thresholds that also hold after packing into 16-bit lanes (values
    // from 0x8000 saturate to 0x7FFF, still past both), eight characters to a
    // compare. Blocks with larger or negative values are rare and take the
    // 32-bit form.
    const __m128i upper = _mm_set1_epi32(static_cast<int32_t>(0xFFFF0000u));
    __m128i extra16 = _mm_setzero_si128();
    __m128i extra32 = _mm_setzero_si128();
    for (const wchar_t* const end = p + blocks * kBlock; p != end; p += kBlock) {
        const __m128i v0 = Load(p), v1 = Load(p + 4), v2 = Load(p + 8), v3 = Load(p + 12);
        const __m128i any = _mm_or_si128(_mm_or_si128(v0, v1), _mm_or_si128(v2, v3));
        if (_mm_movemask_epi8(_mm_cmpeq_epi32(_mm_and_si128(any, upper), _mm_setzero_si128())) != 0xFFFF) {
            extra32 = _mm_add_epi32(extra32, ExtraBytesOfWideBlock(p));
            continue;
        }
        const __m128i low = _mm_packs_epi32(v0, v1), high = _mm_packs_epi32(v2, v3);
        extra16 = _mm_sub_epi16(extra16, _mm_cmpgt_epi16(low, _mm_set1_epi16(0x7F)));
        extra16 = _mm_sub_epi16(extra16, _mm_cmpgt_epi16(low, _mm_set1_epi16(0x7FF)));
        extra16 = _mm_sub_epi16(extra16, _mm_cmpgt_epi16(high, _mm_set1_epi16(0x7F)));
        extra16 = _mm_sub_epi16(extra16, _mm_cmpgt_epi16(high, _mm_set1_epi16(0x7FF)));
    }
    extra32 = _mm_add_epi32(extra32, _mm_madd_epi16(extra16, _mm_set1_epi16(1)));
    extra32 = _mm_add_epi32(extra32, _mm_shuffle_epi32(extra32, _MM_SHUFFLE(1, 0, 3, 2)));
    extra32 = _mm_add_epi32(extra32, _mm_shuffle_epi32(extra32, _MM_SHUFFLE(2, 3, 0, 1)));
    return static_cast<uint32_t>(blocks * kBlock) + static_cast<uint32_t>(_mm_cvtsi128_si32(extra32));
}

#else

size_t AsciiPrefix(const unsigned char* p) noexcept {
    size_t n = 0;
    while (n < kBlock && p[n] < 0x80) ++n;
    return n;
}

size_t WidenAsciiPrefix(const unsigned char* p, wchar_t* out) noexcept {
    size_t n = AsciiPrefix(p);
    for (size_t i = 0; i < n; ++i) out[i] = static_cast<wchar_t>(p[i]);
    return n;
}

size_t NarrowAsciiPrefix(const wchar_t* p, char* out) noexcept {
    size_t n = 0;
    for (; n < kBlock && static_cast<uint32_t>(p[n]) < 0x80u; ++n) out[n] = static_cast<char>(p[n]);
    return n;
}

uint32_t EncodedLengthOfBlocks(const wchar_t* p, size_t blocks) noexcept {
    uint32_t length = 0;
    for (size_t i = 0; i < blocks * kBlock; ++i) length += EncodedLength(static_cast<uint32_t>(p[i]));
    return length;
}

#endif

// Length of the well-formed sequence at `p` (2 to 4 bytes) with its value in
// `value`, or 0 when the bytes there are not one. Reads only the `left` bytes
// that remain.
unsigned DecodeMultiByte(const unsigned char* p, size_t left, uint32_t& value) noexcept {
    const unsigned char lead = p[0];
    unsigned length;
    unsigned char secondMin = 0x80;  // raised where a smaller value would be an overlong form
    if (lead < 0xC2) {
        return 0;  // a stray continuation byte or an overlong two-byte form
    } else if (lead < 0xE0) {
        length = 2;
        value = lead & 0x1Fu;
    } else if (lead < 0xF0) {
        length = 3;
        value = lead & 0x0Fu;
        if (lead == 0xE0) secondMin = 0xA0;
    } else if (lead < 0xF8) {
        length = 4;
        value = lead & 0x07u;
        if (lead == 0xF0) secondMin = 0x90;
    } else {
        return 0;  // five- and six-byte forms and 0xFE/0xFF
    }
    if (left < length) return 0;
    if (p[1] < secondMin || p[1] > 0xBF) return 0;
    value = (value << 6) | (p[1] & 0x3Fu);
    for (unsigned i = 2; i < length; ++i) {
        if ((p[i] & 0xC0) != 0x80) return 0;
        value = (value << 6) | (p[i] & 0x3Fu);
    }
    return length;
}

uint32_t CountCharacters(const unsigned char* p, const unsigned char* end) {
    uint32_t characters = 0;
    while (p != end) {
        if (static_cast<size_t>(end - p) >= kBlock) {
            const size_t ascii = AsciiPrefix(p);
            p += ascii;
            characters += static_cast<uint32_t>(ascii);
            if (ascii == kBlock) continue;
        }
        if (*p < 0x80) {
            ++p;
        } else {
            uint32_t ignored;
            const unsigned length = DecodeMultiByte(p, static_cast<size_t>(end - p), ignored);
            if (length == 0) throw exception::InvalidSequence(kDecoderModule, __LINE__);
            p += length;
        }
        ++characters;
    }
    return characters;
}

uint32_t MeasureUtf8(const wchar_t* p, const wchar_t* end) {
    // A chunk's sum cannot overflow 32 bits; only the running total needs
    // the checked addition.
    constexpr size_t kChunkBlocks = 4096;
    uint32_t total = 0;
    while (static_cast<size_t>(end - p) >= kBlock) {
        const size_t blocks = std::min(kChunkBlocks, static_cast<size_t>(end - p) / kBlock);
        total = CheckedAdd(total, EncodedLengthOfBlocks(p, blocks));
        p += blocks * kBlock;
    }
    uint32_t tail = 0;
    for (; p != end; ++p) tail += EncodedLength(static_cast<uint32_t>(*p));
    return CheckedAdd(total, tail);
}

[[noreturn]] void ThrowEncoderOverflow(int32_t line) { throw exception::BufferOverflow(kEncoderModule, line); }

// Writes one value at `out`, which must leave room for it before `outEnd`.
inline char* EncodeOne(uint32_t u, char* out, char* outEnd) {
    if (u < 0x80u && out != outEnd) {
        *out = static_cast<char>(u);
        return out + 1;
    }
    const uint32_t length = EncodedLength(u);
    if (static_cast<size_t>(outEnd - out) < length) ThrowEncoderOverflow(__LINE__);
    if (u >= 0x80000000u) {
        *out = '?';
        return out + 1;
    }
    // The lead byte marks the length with as many high one bits; the
    // continuation bytes carry six bits each, most significant first.
    static constexpr unsigned char kLeadMark[7] = {0, 0, 0xC0, 0xE0, 0xF0, 0xF8, 0xFC};
    for (uint32_t i = length - 1; i > 0; --i) {
        out[i] = static_cast<char>(0x80u | (u & 0x3Fu));
        u >>= 6;
    }
    out[0] = static_cast<char>(kLeadMark[length] | u);
    return out + length;
}

// Values below 0x200000 (one to four bytes) without a branch on the length,
// which changes from character to character in mixed text: all four bytes
// are written, and those past the length are overwritten by what follows.
// Needs room for four bytes.
inline char* EncodeShort(uint32_t u, char* out) noexcept {
    static constexpr unsigned char kLeadMark[5] = {0, 0, 0xC0, 0xE0, 0xF0};
    const uint32_t length = EncodedLength(u);
    const uint32_t top = 6 * (length - 1);  // the lead byte's shift; each next byte's is 6 less
    out[0] = static_cast<char>(kLeadMark[length] | (u >> top));
    out[1] = static_cast<char>(0x80u | ((u >> ((top - 6) & 31)) & 0x3Fu));
    out[2] = static_cast<char>(0x80u | ((u >> ((top - 12) & 31)) & 0x3Fu));
    out[3] = static_cast<char>(0x80u | ((u >> ((top - 18) & 31)) & 0x3Fu));
    return out + length;
}

}  // namespace

WString Utf8ToWide(const char* bytes, uint32_t count) {
    if (count == 0) return WString();
    const auto* const begin = reinterpret_cast<const unsigned char*>(bytes);
    const unsigned char* const end = begin + count;
    const uint32_t characters = CountCharacters(begin, end);

    WString result(characters, L'\0');
    wchar_t* out = result.Data();
    wchar_t* const outEnd = out + characters;
    const unsigned char* p = begin;
    while (p != end) {
        if (static_cast<size_t>(end - p) >= kBlock && static_cast<size_t>(outEnd - out) >= kBlock) {
            const size_t ascii = WidenAsciiPrefix(p, out);
            p += ascii;
            out += ascii;
            if (ascii == kBlock) continue;
        }
        if (out == outEnd) throw exception::BufferOverflow(kDecoderModule, __LINE__);
        if (*p < 0x80) {
            *out++ = static_cast<wchar_t>(*p++);
            continue;
        }
        uint32_t value = 0;
        const unsigned length = DecodeMultiByte(p, static_cast<size_t>(end - p), value);
        if (length == 0) throw exception::InvalidSequence(kDecoderModule, __LINE__);
        *out++ = static_cast<wchar_t>(value);
        p += length;
    }
    if (out != outEnd) throw exception::BufferOverflow(kDecoderModule, __LINE__);
    return result;
}

NString WideToUtf8(const wchar_t* text, uint32_t count) {
    if (count == 0) return NString();
    const wchar_t* const end = text + count;
    const uint32_t size = MeasureUtf8(text, end);

    NString result(size, '\0');
    char* out = result.Data();
    char* const outEnd = out + size;
    const wchar_t* p = text;
    while (p != end) {
        if (static_cast<size_t>(end - p) >= kBlock && static_cast<size_t>(outEnd - out) >= kBlock) {
            const size_t ascii = NarrowAsciiPrefix(p, out);
            p += ascii;
            out += ascii;
            if (ascii == kBlock) continue;
        }
        const auto u = static_cast<uint32_t>(*p++);
        out = u < 0x200000u && outEnd - out >= 4 ? EncodeShort(u, out) : EncodeOne(u, out, outEnd);
    }
    if (out != outEnd) ThrowEncoderOverflow(__LINE__);
    return result;
}

}  // namespace qel::fnd
