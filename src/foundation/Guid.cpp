// GUIDs to and from their braced registry text form.
#include "foundation/Guid.h"

#include "foundation/Exception.h"

namespace qel::fnd {

namespace {

constexpr const char* kModule = "Guid";
constexpr uint32_t kTextLength = 38;
constexpr wchar_t kHex[] = L"0123456789ABCDEF";

// Where the hex digits of each field start in the text; byte fields of Data4
// follow each other without separators except after the second.
constexpr uint32_t kData1At = 1, kData2At = 10, kData3At = 15, kData4At[8] = {20, 22, 25, 27, 29, 31, 33, 35};

void PutHex(wchar_t* out, uint64_t value, uint32_t digits) noexcept {
    for (uint32_t i = digits; i-- > 0; value >>= 4) out[i] = kHex[value & 0xFu];
}

bool IsSeparatorAt(uint32_t pos) noexcept { return pos == 9 || pos == 14 || pos == 19 || pos == 24; }

uint32_t HexValue(wchar_t c) noexcept {
    const uint32_t u = static_cast<uint32_t>(c);
    if (u - '0' < 10u) return u - '0';
    if (u - 'A' < 6u) return u - 'A' + 10;
    if (u - 'a' < 6u) return u - 'a' + 10;
    return 16;
}

uint32_t ReadHex(const wchar_t* text, uint32_t at, uint32_t digits) noexcept {
    uint32_t value = 0;
    for (uint32_t i = 0; i < digits; ++i) value = (value << 4) | HexValue(text[at + i]);
    return value;
}

}  // namespace

WString Guid::ToString() const {
    WString text(kTextLength, L'-');
    wchar_t* out = text.Data();
    out[0] = L'{';
    PutHex(out + kData1At, Data1, 8);
    PutHex(out + kData2At, Data2, 4);
    PutHex(out + kData3At, Data3, 4);
    for (uint32_t i = 0; i < 8; ++i) PutHex(out + kData4At[i], Data4[i], 2);
    out[kTextLength - 1] = L'}';
    return text;
}

Guid Guid::FromString(const WString& text) {
    if (text.Length() != kTextLength) throw exception::BadGuidString(kModule, 224);
    const wchar_t* in = text.Data();
    // Every position is checked before any is read as a number.
    for (uint32_t pos = 0; pos < kTextLength; ++pos) {
        bool ok;
        if (pos == 0) ok = in[pos] == L'{';
        else if (pos == kTextLength - 1) ok = in[pos] == L'}';
        else if (IsSeparatorAt(pos)) ok = in[pos] == L'-';
        else ok = HexValue(in[pos]) < 16;
        if (!ok) throw exception::BadGuidString(kModule, 247);
    }
    Guid guid;
    guid.Data1 = ReadHex(in, kData1At, 8);
    guid.Data2 = static_cast<uint16_t>(ReadHex(in, kData2At, 4));
    guid.Data3 = static_cast<uint16_t>(ReadHex(in, kData3At, 4));
    for (uint32_t i = 0; i < 8; ++i) guid.Data4[i] = static_cast<uint8_t>(ReadHex(in, kData4At[i], 2));
    return guid;
}

}  // namespace qel::fnd
