// Comparing, converting and describing property values.
#include "PropertyValue.h"

#include <cstdio>
#include <ctime>
#include <cwchar>

namespace qel::sim {

bool PropertyValue::operator==(const PropertyValue& other) const noexcept {
    if (type != other.type) return false;
    switch (type) {
        case api::kTypeInteger1:
        case api::kTypeInteger2:
        case api::kTypeUnsigned:
            return integer == other.integer;
        case api::kTypeDouble:
            return number == other.number;
        case api::kTypeGuid:
            return guid == other.guid;
        case api::kTypeString:
            return text == other.text;
        case api::kTypeTime:
            return time.seconds == other.time.seconds && time.fraction == other.time.fraction;
        default:
            return false;
    }
}

bool LocalFieldsToAbsTime(const api::DateTimeFields& fields, api::AbsTime* time) noexcept {
    std::tm broken{};
    broken.tm_year = fields.year - 1900;
    broken.tm_mon = fields.month - 1;
    broken.tm_mday = fields.day;
    broken.tm_hour = fields.hour;
    broken.tm_min = fields.minute;
    broken.tm_sec = fields.second;
    broken.tm_isdst = -1;
    std::time_t seconds = std::mktime(&broken);
    // -1 is also one second before 1970, which no model of ours needs.
    if (seconds == static_cast<std::time_t>(-1)) return false;
    time->seconds = static_cast<int64_t>(seconds) + kSecondsFrom1904To1970;
    time->fraction = 0;
    return true;
}

bool AbsTimeToLocalFields(const api::AbsTime& time, api::DateTimeFields* fields) noexcept {
    int64_t unixSeconds = time.seconds - kSecondsFrom1904To1970;
    std::time_t seconds = static_cast<std::time_t>(unixSeconds);
    // A 32-bit time_t cannot hold every time the device may be given.
    if (static_cast<int64_t>(seconds) != unixSeconds) return false;
    std::tm broken{};
    if (!localtime_r(&seconds, &broken)) return false;
    fields->year = broken.tm_year + 1900;
    fields->month = broken.tm_mon + 1;
    fields->day = broken.tm_mday;
    fields->hour = broken.tm_hour;
    fields->minute = broken.tm_min;
    fields->second = broken.tm_sec;
    return true;
}

std::wstring DescribeValue(const PropertyValue& value) {
    wchar_t buffer[96];
    switch (value.type) {
        case api::kTypeInteger1:
        case api::kTypeInteger2:
        case api::kTypeUnsigned:
            std::swprintf(buffer, 96, L"%lld", static_cast<long long>(value.integer));
            return buffer;
        case api::kTypeDouble:
            std::swprintf(buffer, 96, L"%g", value.number);
            return buffer;
        case api::kTypeGuid: {
            fnd::WString text = value.guid.ToString();
            return std::wstring(text.Data(), text.Length());
        }
        case api::kTypeString:
            return L"\"" + value.text + L"\"";
        case api::kTypeTime: {
            api::DateTimeFields fields;
            if (!AbsTimeToLocalFields(value.time, &fields)) return L"(time out of range)";
            std::swprintf(buffer, 96, L"%04d-%02d-%02d %02d:%02d:%02d", static_cast<int>(fields.year),
                          static_cast<int>(fields.month), static_cast<int>(fields.day), static_cast<int>(fields.hour),
                          static_cast<int>(fields.minute), static_cast<int>(fields.second));
            return buffer;
        }
        default:
            return L"?";
    }
}

std::wstring TagText(api::PropertyTag tag) {
    wchar_t buffer[16];
    std::swprintf(buffer, 16, L"0x%08X", static_cast<unsigned>(tag));
    return buffer;
}

}  // namespace qel::sim
