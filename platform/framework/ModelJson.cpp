// Reading and writing property values as JSON.
#include "ModelJson.h"

#include <cstdio>
#include <cstdlib>
#include <limits>

#include "foundation/Exception.h"
#include "foundation/Utf.h"

namespace qel::sim::json {

bool ToWide(const std::string& utf8, std::wstring* out) {
    try {
        fnd::WString wide = fnd::Utf8ToWide(utf8.data(), static_cast<uint32_t>(utf8.size()));
        out->assign(wide.Data(), wide.Length());
        return true;
    } catch (const fnd::exception::Exception&) {
        return false;
    }
}

std::string ToUtf8(const std::wstring& text) {
    fnd::NString utf8 = fnd::WideToUtf8(text.data(), static_cast<uint32_t>(text.size()));
    return std::string(utf8.Data(), utf8.Length());
}

bool ReadTag(const Json& value, api::PropertyTag* tag) {
    if (!value.is_string()) return false;
    const std::string& text = value.get_ref<const std::string&>();
    size_t start = text.size() > 2 && text[0] == '0' && (text[1] == 'x' || text[1] == 'X') ? 2 : 0;
    if (start == text.size() || text.size() - start > 8) return false;
    uint32_t result = 0;
    for (size_t i = start; i < text.size(); ++i) {
        char c = text[i];
        uint32_t digit;
        if (c >= '0' && c <= '9') digit = static_cast<uint32_t>(c - '0');
        else if (c >= 'a' && c <= 'f') digit = static_cast<uint32_t>(c - 'a' + 10);
        else if (c >= 'A' && c <= 'F') digit = static_cast<uint32_t>(c - 'A' + 10);
        else return false;
        result = result << 4 | digit;
    }
    *tag = result;
    return true;
}

namespace {

bool ReadTime(const Json& value, api::AbsTime* time, std::string* problem) {
    if (value.is_object()) {
        auto seconds = value.find("seconds");
        auto fraction = value.find("fraction");
        if (seconds == value.end() || !seconds->is_number_integer()) {
            *problem = "\"seconds\" is not an integer";
            return false;
        }
        if (seconds->is_number_unsigned() && seconds->get<uint64_t>() > uint64_t(std::numeric_limits<int64_t>::max())) {
            *problem = "\"seconds\" is too large";
            return false;
        }
        time->seconds = seconds->get<int64_t>();
        time->fraction = 0;
        if (fraction != value.end()) {
            if (!fraction->is_number_unsigned()) {
                *problem = "\"fraction\" is not an unsigned integer";
                return false;
            }
            time->fraction = fraction->get<uint64_t>();
        }
        return true;
    }
    if (value.is_string()) {
        const std::string& text = value.get_ref<const std::string&>();
        api::DateTimeFields f;
        int used = 0;
        if (text.size() == 19 &&
            std::sscanf(text.c_str(), "%4d-%2d-%2d %2d:%2d:%2d%n", &f.year, &f.month, &f.day, &f.hour, &f.minute,
                        &f.second, &used) == 6 &&
            used == 19 && f.month >= 1 && f.month <= 12 && f.day >= 1 && f.day <= 31 && f.hour < 24 &&
            f.minute < 60 && f.second < 61 && LocalFieldsToAbsTime(f, time))
            return true;
        *problem = "is not a local date-time \"YYYY-MM-DD hh:mm:ss\"";
        return false;
    }
    *problem = "is neither {\"seconds\", \"fraction\"} nor a date-time text";
    return false;
}

}  // namespace

bool ReadValue(const Json& value, api::PropertyTypeCode type, PropertyValue* out, std::string* problem) {
    out->type = type;
    switch (type) {
        case api::kTypeInteger1:
        case api::kTypeInteger2:
            if (!value.is_number_integer() ||
                (value.is_number_unsigned() && value.get<uint64_t>() > uint64_t(std::numeric_limits<int32_t>::max())) ||
                value.get<int64_t>() < std::numeric_limits<int32_t>::min() ||
                value.get<int64_t>() > std::numeric_limits<int32_t>::max()) {
                *problem = "is not a signed 32-bit integer";
                return false;
            }
            out->integer = value.get<int64_t>();
            return true;
        case api::kTypeUnsigned:
            if (!value.is_number_unsigned() || value.get<uint64_t>() > std::numeric_limits<uint32_t>::max()) {
                *problem = "is not an unsigned 32-bit integer";
                return false;
            }
            out->integer = static_cast<int64_t>(value.get<uint64_t>());
            return true;
        case api::kTypeDouble:
            if (!value.is_number()) {
                *problem = "is not a number";
                return false;
            }
            out->number = value.get<double>();
            return true;
        case api::kTypeGuid: {
            std::wstring text;
            if (!value.is_string() || !ToWide(value.get_ref<const std::string&>(), &text)) {
                *problem = "is not a GUID text";
                return false;
            }
            try {
                out->guid = fnd::Guid::FromString(fnd::WString(text.c_str()));
            } catch (const fnd::exception::Exception&) {
                *problem = "is not a braced GUID";
                return false;
            }
            return true;
        }
        case api::kTypeString:
            if (!value.is_string() || !ToWide(value.get_ref<const std::string&>(), &out->text)) {
                *problem = "is not a UTF-8 string";
                return false;
            }
            return true;
        case api::kTypeTime:
            return ReadTime(value, &out->time, problem);
        default:
            *problem = "has a type outside 1 to 7";
            return false;
    }
}

Json WriteValue(const PropertyValue& value) {
    switch (value.type) {
        case api::kTypeInteger1:
        case api::kTypeInteger2:
        case api::kTypeUnsigned:
            return Json(value.integer);
        case api::kTypeDouble:
            return Json(value.number);
        case api::kTypeGuid: {
            fnd::WString text = value.guid.ToString();
            return Json(ToUtf8(std::wstring(text.Data(), text.Length())));
        }
        case api::kTypeString:
            return Json(ToUtf8(value.text));
        case api::kTypeTime:
            return Json{{"seconds", value.time.seconds}, {"fraction", value.time.fraction}};
        default:
            return Json();
    }
}

}  // namespace qel::sim::json
