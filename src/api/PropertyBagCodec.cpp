// The request side of property bags: numbered arguments to typed values.
#include "api/PropertyBagCodec.h"

#include <cwchar>
#include <ctime>

#include "api/ComPtr.h"
#include "foundation/Exception.h"
#include "foundation/IntegerText.h"
#include "foundation/Status.h"
#include "foundation/ThrowingStatus.h"
#include "xml/PropertyValue.h"

namespace qel::api {

namespace {

constexpr uint32_t kFirstHexTimeVersion = 0x10001;

// "Prefix" then the decimal indices joined by "_": the argument names that
// clients number from 0.
WString IndexedName(const wchar_t* prefix, uint32_t first, const uint32_t* second) {
    WString name(prefix);
    name.Append(fnd::IntegerToString<uint32_t>(first, 10));
    if (second) {
        name.PushBack(L'_');
        name.Append(fnd::IntegerToString<uint32_t>(*second, 10));
    }
    return name;
}

uint32_t HexArgument(const ArgumentMap& args, const WString& name) {
    return fnd::StringToInteger<uint32_t>(*GetRequestVariable(args, name.CStr(), true), 16);
}

bool IsListed(PropertyTag tag, uint32_t count, const PropertyTag* tags) {
    for (uint32_t i = 0; i < count; ++i)
        if (tags[i] == tag) return true;
    return false;
}

int32_t SetTime(const WString& text, const WString& version, IkrSysPropertyBag* bag, PropertyTag tag) {
    AbsTime time;
    if (fnd::StringToInteger<uint32_t>(version, 16) >= kFirstHexTimeVersion) {
        unsigned int words[4] = {};
        if (std::swscanf(text.CStr(), L"%X %X %X %X", &words[0], &words[1], &words[2], &words[3]) != 4)
            return fnd::kStatusFail;
        time.fraction = static_cast<uint64_t>(words[1]) << 32 | words[0];
        time.seconds = static_cast<int64_t>(static_cast<uint64_t>(words[3]) << 32 | words[2]);
    } else {
        long fields[6] = {};
        if (std::swscanf(text.CStr(), L"%ld %ld %ld %ld %ld %ld", &fields[0], &fields[1], &fields[2], &fields[3],
                         &fields[4], &fields[5]) != 6)
            return fnd::kStatusFail;
        if (fields[0] >= 1904) {
            struct tm local {};
            local.tm_year = static_cast<int>(fields[0] - 1900);
            local.tm_mon = static_cast<int>(fields[1] - 1);
            local.tm_mday = static_cast<int>(fields[2]);
            local.tm_hour = static_cast<int>(fields[3]);
            local.tm_min = static_cast<int>(fields[4]);
            local.tm_sec = static_cast<int>(fields[5]);
            local.tm_isdst = -1;
            try {
                time = xml::LocalDateTimeToAbsTime(local);
            } catch (const fnd::exception::Exception&) {
                time = AbsTime{};
            }
        }
    }
    ComPtr<IkrSysPropertyBagEx> extended;
    const int32_t found = bag->QueryInterface(kIID_IkrSysPropertyBagEx, extended.OutVoid());
    if (found < 0) return found;
    if (!extended) return fnd::kStatusNoInterface;
    return extended->SetTimestamp(tag, &time);
}

}  // namespace

const WString* GetRequestVariable(const ArgumentMap& args, const wchar_t* name, bool required) {
    const WString* value = FindArgument(args, name);
    if (!value && required) throw static_cast<long>(fnd::kStatusFail);
    return value;
}

void ReadTagList(const ArgumentMap& args, uint32_t count, PropertyTag* tags) {
    for (uint32_t i = 0; i < count; ++i) tags[i] = HexArgument(args, IndexedName(L"Tag_", i, nullptr));
}

void DecodePropertyBag(const ArgumentMap& args, IkrSysPropertyBag* bag, uint32_t filterMode, uint32_t tagCount,
                       const PropertyTag* tags) {
    const WString* given = GetRequestVariable(args, L"Version", false);
    const WString version = given ? *given : WString(L"00010000");
    const uint32_t count = HexArgument(args, IndexedName(L"NbrTags_", 0, nullptr));
    fnd::ThrowingStatus status;
    for (uint32_t i = 0; i < count; ++i) {
        const PropertyTag tag = HexArgument(args, IndexedName(L"Tag_", 0, &i));
        if (filterMode != 0 && IsListed(tag, tagCount, tags) == (filterMode == 1)) continue;
        const PropertyTypeCode type = HexArgument(args, IndexedName(L"Type_", 0, &i));
        const WString* value = GetRequestVariable(args, IndexedName(L"Value_", 0, &i).CStr(), true);
        status = SetPropertyFromText(*value, version, bag, tag, type);
    }
}

int32_t SetPropertyFromText(const WString& text, const WString& version, IkrSysPropertyBag* bag, PropertyTag tag,
                            PropertyTypeCode type) {
    switch (type) {
        case kTypeInteger1:
            return bag->SetInteger1(tag, fnd::StringToInteger<int32_t>(text, 10));
        case kTypeInteger2:
            return bag->SetInteger2(tag, fnd::StringToInteger<int32_t>(text, 10));
        case kTypeUnsigned:
            return bag->SetUnsigned(tag, fnd::StringToInteger<uint32_t>(text, 10));
        case kTypeDouble: {
            double value = 0.0;
            if (std::swscanf(text.CStr(), L"%lf", &value) != 1) value = 0.0;
            return bag->SetDouble(tag, value);
        }
        case kTypeGuid: {
            Guid value;
            try {
                value = Guid::FromString(text);
            } catch (const fnd::exception::BadGuidString&) {
                value = Guid{};
            }
            return bag->SetGuid(tag, value);
        }
        case kTypeString:
            return bag->SetString(tag, text.CStr());
        case kTypeTime:
            return SetTime(text, version, bag, tag);
        default:
            return fnd::kStatusFail;
    }
}

}  // namespace qel::api
