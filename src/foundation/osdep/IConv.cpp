// Code-set conversions through the system's iconv, with one "?" for each
// unit iconv refuses.
#include "foundation/osdep/IConv.h"

#include <cerrno>
#include <iconv.h>
#include <strings.h>

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

}  // namespace

WString IConv(const char* bytes, uint32_t count, const char* fromCodeSet) {
    Descriptor cd(kWide, fromCodeSet);
    if (count == 0) return WString();
    // At most one wide character comes from each input byte.
    WString result(count, L'\0');
    const wchar_t question = L'?';
    size_t written = cd.Run(bytes, count, IsUtf16Le(fromCodeSet) ? 2 : 1, reinterpret_cast<char*>(result.Data()),
                            CheckedMultiply(count, sizeof(wchar_t)), reinterpret_cast<const char*>(&question),
                            sizeof question);
    result.Resize(static_cast<WString::size_type>(written / sizeof(wchar_t)));
    return result;
}

NString IConv(const wchar_t* text, uint32_t count, const char* toCodeSet) {
    Descriptor cd(toCodeSet, kWide);
    if (count == 0) return NString();
    bool utf16 = IsUtf16Le(toCodeSet);
    // Four bytes cover any character in UTF-8 or UTF-16 (a surrogate pair).
    NString result(CheckedMultiply(count, 4), '\0');
    static const char kQuestion16[2] = {'?', '\0'};
    size_t written = cd.Run(reinterpret_cast<const char*>(text), static_cast<size_t>(count) * sizeof(wchar_t),
                            sizeof(wchar_t), result.Data(), result.Length(), utf16 ? kQuestion16 : "?",
                            utf16 ? 2 : 1);
    result.Resize(static_cast<NString::size_type>(written));
    return result;
}

}  // namespace qel::fnd::osdep
