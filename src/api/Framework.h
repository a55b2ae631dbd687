// The contract with the system-configuration framework (libqelsysapi.so.5):
// component interfaces, their identifiers, and the text type they exchange.
// The plug-in and the framework are both built against this one header.
#pragma once

#include <cstdint>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <cwchar>

#include "foundation/Guid.h"

namespace qel::api {

using fnd::Guid;

/// A property tag and a property type code (1 to 7).
using PropertyTag = uint32_t;
using PropertyTypeCode = uint32_t;

enum : PropertyTypeCode {
    kTypeInteger1 = 1,
    kTypeInteger2 = 2,
    kTypeUnsigned = 3,
    kTypeDouble = 4,
    kTypeGuid = 5,
    kTypeString = 6,
    kTypeTime = 7,
};

/// 128-bit absolute time: a fraction of a second in units of 2^-64 s, then
/// signed seconds since 1904-01-01 00:00 UTC. In memory four 32-bit words:
/// fraction low, fraction high, seconds low, seconds high.
struct AbsTime {
    uint64_t fraction = 0;
    int64_t seconds = 0;
};

/// A calendar date-time as the framework returns it: local time.
struct DateTimeFields {
    int32_t year = 0, month = 0, day = 0, hour = 0, minute = 0, second = 0;
};

// ---------------------------------------------------------------------------
// SysString: a 32-bit character count, the characters, a 0; the pointer
// addresses the first character and the block starts 4 bytes before it.
// Whoever receives one frees it with SysStringFree, on every path.
using SysString = wchar_t*;

inline SysString SysStringAllocLen(const wchar_t* text, uint32_t count) {
    static_assert(sizeof(wchar_t) == 4, "the framework exchanges 32-bit characters");
    // The count word and the NUL come on top; on a 32-bit size_t a huge count
    // must not wrap into a small block.
    if (static_cast<uint64_t>(count) + 2 > SIZE_MAX / 4) return nullptr;
    auto* block = static_cast<uint32_t*>(std::malloc((static_cast<size_t>(count) + 2) * 4));
    if (!block) return nullptr;
    block[0] = count;
    auto* chars = reinterpret_cast<wchar_t*>(block + 1);
    if (count) std::memcpy(chars, text, static_cast<size_t>(count) * 4);
    chars[count] = 0;
    return chars;
}
inline SysString SysStringAlloc(const wchar_t* text) {
    return SysStringAllocLen(text ? text : L"", text ? static_cast<uint32_t>(std::wcslen(text)) : 0);
}
inline uint32_t SysStringLen(const wchar_t* s) { return s ? reinterpret_cast<const uint32_t*>(s)[-1] : 0; }
inline void SysStringFree(SysString s) {
    if (s) std::free(reinterpret_cast<uint32_t*>(s) - 1);
}

/// Owns one SysString and frees it on every path.
class SysStringHolder {
public:
    SysStringHolder() = default;
    ~SysStringHolder() { SysStringFree(s_); }
    SysStringHolder(const SysStringHolder&) = delete;
    SysStringHolder& operator=(const SysStringHolder&) = delete;
    /// For an out parameter; frees what was held first.
    SysString* Out() {
        SysStringFree(s_);
        s_ = nullptr;
        return &s_;
    }
    const wchar_t* Get() const { return s_; }
    uint32_t Length() const { return SysStringLen(s_); }

private:
    SysString s_ = nullptr;
};

// ---------------------------------------------------------------------------
// Interface identifiers.
inline constexpr Guid kIID_IUnknown{0x00000000, 0x0000, 0x0000, {0xC0, 0, 0, 0, 0, 0, 0, 0x46}};
inline constexpr Guid kIID_IkrSysFramework{0x5d0a6c1e, 0x3b27, 0x4f0c, {0x9a, 0x61, 0x0e, 0x42, 0x7c, 0x13, 0xb8, 0x50}};
inline constexpr Guid kIID_IkrSysDiagnostics{0x121ca7da, 0x7a6b, 0x48a5, {0xb7, 0xdc, 0xd4, 0xac, 0xbc, 0x6a, 0xca, 0xc6}};
inline constexpr Guid kIID_IkrSysFirmware{0x1bb445c3, 0xf6a7, 0x4198, {0x89, 0x23, 0x11, 0x12, 0xf9, 0xdd, 0x07, 0x89}};
inline constexpr Guid kIID_IkrSysPropertyBag{0x8f31d2a4, 0x61c0, 0x4e2b, {0xa7, 0x95, 0x2c, 0x0b, 0x5e, 0x94, 0x17, 0xd3}};
inline constexpr Guid kIID_IkrSysPropertyBagEx{0xe275e061, 0x297b, 0x4463, {0xa5, 0xf1, 0x5d, 0x2d, 0x9d, 0x8f, 0x38, 0x98}};
inline constexpr Guid kIID_IkrSysExpertInfo{0x2b7e90c8, 0xd41f, 0x4a36, {0x8e, 0x0d, 0x63, 0xf1, 0x29, 0xa4, 0x5c, 0x0b}};
inline constexpr Guid kIID_IkrSysEnumExperts{0x93c4f5b2, 0x0e6d, 0x4c81, {0xb3, 0x2a, 0x7d, 0x58, 0xe1, 0x06, 0xfa, 0x24}};
inline constexpr Guid kIID_IkrSysEnumPropertyBags{0x4a6d0b7f, 0x8c35, 0x47e9, {0x91, 0xd4, 0x05, 0xbb, 0x3e, 0x72, 0xc8, 0x16}};
inline constexpr Guid kIID_IkrSysEnumUris{0xc1f8a3d6, 0x5b90, 0x4d27, {0x86, 0x4e, 0xa9, 0x30, 0x7b, 0x1d, 0x62, 0xe5}};
inline constexpr Guid kIID_IkrSysEnumTags{0x6e2b49c0, 0xa7d3, 0x4158, {0xbc, 0x07, 0x38, 0xf6, 0x91, 0x2e, 0xd4, 0x7a}};
inline constexpr Guid kIID_IkrSysNotificationHandler{0x3c565452, 0xf242, 0x4f35, {0xa4, 0xad, 0x22, 0xac, 0x69, 0xbd, 0x82, 0x1b}};
inline constexpr Guid kIID_IkrSysBinaryImage{0x28c277a2, 0x23a7, 0x4756, {0x91, 0x2c, 0x39, 0xf9, 0xf5, 0xa5, 0xd5, 0x6f}};

// ---------------------------------------------------------------------------
// Every interface starts with these three; results are 32-bit statuses.
// Callers release every interface they receive, failures included.
class IUnknown {
public:
    virtual int32_t QueryInterface(const Guid& iid, void** out) = 0;
    virtual uint32_t AddRef() = 0;
    virtual uint32_t Release() = 0;

protected:
    ~IUnknown() = default;
};

class IkrSysEnumTags : public IUnknown {
public:
    /// 0 for each element delivered, non-zero at the end.
    virtual int32_t Next(uint32_t count, PropertyTag* tags, uint32_t* fetched) = 0;

protected:
    ~IkrSysEnumTags() = default;
};

class IkrSysPropertyBag : public IUnknown {
public:
    virtual int32_t EnumPropertyTags(IkrSysEnumTags** out) = 0;
    virtual int32_t GetPropertyType(PropertyTag tag, PropertyTypeCode* type) = 0;
    virtual int32_t SetInteger1(PropertyTag tag, int32_t value) = 0;
    virtual int32_t SetInteger2(PropertyTag tag, int32_t value) = 0;
    virtual int32_t SetUnsigned(PropertyTag tag, uint32_t value) = 0;
    virtual int32_t SetDouble(PropertyTag tag, double value) = 0;
    virtual int32_t SetGuid(PropertyTag tag, Guid value) = 0;
    virtual int32_t SetString(PropertyTag tag, const wchar_t* value) = 0;
    virtual int32_t GetInteger1(PropertyTag tag, int32_t* value) = 0;
    virtual int32_t GetInteger2(PropertyTag tag, int32_t* value) = 0;
    virtual int32_t GetUnsigned(PropertyTag tag, uint32_t* value) = 0;
    virtual int32_t GetDouble(PropertyTag tag, double* value) = 0;
    virtual int32_t GetGuid(PropertyTag tag, Guid* value) = 0;
    virtual int32_t GetString(PropertyTag tag, SysString* value) = 0;
    virtual int32_t GetDateTime(PropertyTag tag, DateTimeFields* value) = 0;

protected:
    ~IkrSysPropertyBag() = default;
};

class IkrSysPropertyBagEx : public IkrSysPropertyBag {
public:
    virtual int32_t ResetChangeTracking() = 0;
    virtual int32_t GetTimestamp(PropertyTag tag, AbsTime* value) = 0;
    virtual int32_t SetTimestamp(PropertyTag tag, const AbsTime* value) = 0;

protected:
    ~IkrSysPropertyBagEx() = default;
};

class IkrSysEnumPropertyBags : public IUnknown {
public:
    virtual int32_t Next(uint32_t count, IkrSysPropertyBag** bags, uint32_t* fetched) = 0;

protected:
    ~IkrSysEnumPropertyBags() = default;
};

class IkrSysEnumUris : public IUnknown {
public:
    virtual int32_t Next(uint32_t count, SysString* uris, uint32_t* fetched) = 0;

protected:
    ~IkrSysEnumUris() = default;
};

class IkrSysExpertInfo : public IUnknown {
public:
    virtual int32_t GetProductID(Guid* id) = 0;
    virtual int32_t GetProductDisplayName(SysString* name) = 0;
    virtual int32_t GetProductVersion(SysString* version) = 0;
    virtual int32_t GetProgrammaticName(SysString* name) = 0;

protected:
    ~IkrSysExpertInfo() = default;
};

class IkrSysEnumExperts : public IUnknown {
public:
    virtual int32_t Next(uint32_t count, IkrSysExpertInfo** experts, uint32_t* fetched) = 0;

protected:
    ~IkrSysEnumExperts() = default;
};

/// Implemented by the service; the framework calls it on its own threads.
class IkrSysNotificationHandler : public IUnknown {
public:
    virtual int32_t OnNotify(uint32_t unused, uint32_t reason, IkrSysEnumUris* items) = 0;

protected:
    ~IkrSysNotificationHandler() = default;
};

/// Implemented by the service: an uploaded firmware image held in memory.
class IkrSysBinaryImage : public IUnknown {
public:
    virtual int32_t GetSize(uint32_t* size) = 0;
    virtual int32_t GetData(const uint8_t** data) = 0;

protected:
    ~IkrSysBinaryImage() = default;
};

class IkrSysDiagnostics : public IUnknown {
public:
    virtual int32_t Reset(const wchar_t* locator, uint32_t mode) = 0;
    virtual int32_t SelfTest(const wchar_t* locator, uint32_t mode, SysString* detailedResult) = 0;
    virtual int32_t SelfCalibrate(const wchar_t* locator, SysString* detailedResult) = 0;

protected:
    ~IkrSysDiagnostics() = default;
};

class IkrSysFirmware : public IUnknown {
public:
    virtual int32_t BeginFirmwareChange(const wchar_t* locator, uint32_t stopTasks, uint32_t imageLength,
                                        SysString* detailedResult) = 0;
    virtual int32_t UpdateFirmwareImage(const wchar_t* locator, const wchar_t* token, uint32_t overwrite,
                                        const wchar_t* clientFileName, IkrSysBinaryImage* image) = 0;
    virtual int32_t UpdateFirmwareVersion(const wchar_t* locator, const wchar_t* token, uint32_t overwrite,
                                          const wchar_t* version) = 0;
    virtual int32_t EraseFirmware(const wchar_t* locator, const wchar_t* token) = 0;
    virtual int32_t CheckFirmwareStatus(const wchar_t* locator, uint32_t* state, uint32_t* percentComplete,
                                        uint32_t* requiresRestart, SysString* version) = 0;

protected:
    ~IkrSysFirmware() = default;
};

class IkrSysFramework : public IUnknown {
public:
    virtual int32_t SearchForItemsAndProperties(const wchar_t* locator, uint32_t filterMode,
                                                IkrSysPropertyBag* filter, IkrSysEnumPropertyBags** out) = 0;
    virtual int32_t SearchForItemNames(const wchar_t* locator, IkrSysEnumUris** out) = 0;
    virtual int32_t GetPropertiesOfItem(const wchar_t* locator, IkrSysPropertyBag** out) = 0;
    virtual int32_t EnumSystemExperts(const wchar_t* locator, IkrSysEnumExperts** out) = 0;
    virtual int32_t SetNotificationHandler(const wchar_t* locator, IkrSysNotificationHandler* handler,
                                           uint32_t flags) = 0;
    virtual int32_t PopulateOrRefreshProperties(IkrSysPropertyBag* bag, uint32_t count, const PropertyTag* tags,
                                                uint32_t allowAsync) = 0;
    virtual int32_t CreatePropertyBag(IkrSysPropertyBag** out) = 0;
    virtual int32_t RenameAlias(const wchar_t* locator, const wchar_t* name, uint32_t mode, uint32_t* conflict,
                                SysString* uri1, SysString* uri2) = 0;
    virtual int32_t PersistChanges(IkrSysPropertyBag* bag, uint32_t validateOnly, uint32_t* requiresRestart,
                                   SysString* detailedResult) = 0;

protected:
    ~IkrSysFramework() = default;
};

}  // namespace qel::api

extern "C" {
/// The framework's one exported entry point: creates the framework object
/// with one reference for the caller. The shared data directory is found as
/// the plug-in finds it ("QELSHAREDDIR", ...).
__attribute__((visibility("default"))) int32_t qelsysInstantiateFramework(qel::api::IkrSysFramework** out);
}
