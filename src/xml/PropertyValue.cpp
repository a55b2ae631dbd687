// Property values to text by type code.
#include "xml/PropertyValue.h"

#include <cstdio>
#include <ctime>

#include "api/ComPtr.h"
#include "foundation/Exception.h"
#include "foundation/IntegerText.h"
#include "foundation/Status.h"
#include "foundation/ThrowingStatus.h"
#include "foundation/osdep/IConv.h"

namespace qel::xml {

namespace {

// Seconds from 1904-01-01 to 1970-01-01, both UTC.
constexpr int64_t kSeconds1904To1970 = 2082844800;

void AppendHexWord(fnd::WString& out, uint32_t word) {
    wchar_t buffer[8];
    uint32_t pos = 8;
    do {
        buffer[--pos] = L"0123456789ABCDEF"[word & 0xF];
        word >>= 4;
    } while (word);
    out.Append(buffer + pos, 8 - pos);
}

// The fixed notation of "%lf" is ASCII in every locale this service runs
// under except for the decimal separator, which the process code set covers.
fnd::WString DoubleToText(double value) {
    char buffer[64];
    const int written = std::snprintf(buffer, sizeof buffer, "%lf", value);
    const uint32_t count = written < 0 ? 0 : written > 63 ? 63 : static_cast<uint32_t>(written);
    bool ascii = true;
    for (uint32_t i = 0; i < count; ++i) ascii = ascii && static_cast<unsigned char>(buffer[i]) < 0x80;
    if (!ascii) return fnd::osdep::IConv(buffer, count, "");
    fnd::WString text(count, L'\0');
    for (uint32_t i = 0; i < count; ++i) text[i] = static_cast<wchar_t>(buffer[i]);
    return text;
}

api::AbsTime TimeOfBag(api::IkrSysPropertyBag* bag, api::PropertyTag tag) {
    fnd::ThrowingStatus status;
    api::AbsTime time;
    api::ComPtr<api::IkrSysPropertyBagEx> extended;
    if (bag->QueryInterface(api::kIID_IkrSysPropertyBagEx, extended.OutVoid()) >= 0 && extended) {
        status = extended->GetTimestamp(tag, &time);
        return time;
    }
    api::DateTimeFields fields;
    status = bag->GetDateTime(tag, &fields);
    if (fields.year < 1904) return api::AbsTime{};
    struct tm local {};
    local.tm_sec = fields.second;
    local.tm_min = fields.minute;
    local.tm_hour = fields.hour;
    local.tm_mday = fields.day;
    local.tm_mon = fields.month - 1;
    local.tm_year = fields.year - 1900;
    local.tm_isdst = -1;
    try {
        return LocalDateTimeToAbsTime(local);
    } catch (const fnd::exception::Exception&) {
        return api::AbsTime{};
    }
}

}  // namespace

api::AbsTime LocalDateTimeToAbsTime(const struct tm& localTime) {
    struct tm copy = localTime;
    const time_t seconds = std::mktime(&copy);
    if (seconds < 1) throw fnd::exception::OutOfRange("osdep/LocalDateTimeToAbsTime", 44);
    api::AbsTime result;
    result.seconds = static_cast<int64_t>(seconds) + kSeconds1904To1970;
    return result;
}

fnd::WString AbsTimeToText(const api::AbsTime& time) {
    fnd::WString text;
    text.Reserve(35);
    AppendHexWord(text, static_cast<uint32_t>(time.fraction));
    text.PushBack(L' ');
    AppendHexWord(text, static_cast<uint32_t>(time.fraction >> 32));
    text.PushBack(L' ');
    AppendHexWord(text, static_cast<uint32_t>(static_cast<uint64_t>(time.seconds)));
    text.PushBack(L' ');
    AppendHexWord(text, static_cast<uint32_t>(static_cast<uint64_t>(time.seconds) >> 32));
    return text;
}

fnd::WString FormatPropertyValue(api::IkrSysPropertyBag* bag, api::PropertyTag tag, api::PropertyTypeCode type) {
    fnd::ThrowingStatus status;
    switch (type) {
        case api::kTypeInteger1:
        case api::kTypeInteger2: {
            int32_t value = 0;
            status = type == api::kTypeInteger1 ? bag->GetInteger1(tag, &value) : bag->GetInteger2(tag, &value);
            return fnd::IntegerToString<int32_t>(value, 10);
        }
        case api::kTypeUnsigned: {
            uint32_t value = 0;
            status = bag->GetUnsigned(tag, &value);
            return fnd::IntegerToString<uint32_t>(value, 10);
        }
        case api::kTypeDouble: {
            double value = 0.0;
            status = bag->GetDouble(tag, &value);
            return DoubleToText(value);
        }
        case api::kTypeGuid: {
            api::Guid value;
            status = bag->GetGuid(tag, &value);
            return value.ToString();
        }
        case api::kTypeString: {
            api::SysStringHolder value;
            status = bag->GetString(tag, value.Out());
            return fnd::WString(value.Get() ? value.Get() : L"", value.Length());
        }
        case api::kTypeTime:
            return AbsTimeToText(TimeOfBag(bag, tag));
        default:
            throw static_cast<long>(fnd::kStatusFail);
    }
}

}  // namespace qel::xml
