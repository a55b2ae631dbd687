// The JSON forms of property values, shared by the model reader and the state
// file; included by the framework's sources only.
#pragma once

#include <cstdint>
#include <string>

#include <nlohmann/json.hpp>

#include "PropertyValue.h"

namespace qel::sim::json {

using Json = nlohmann::json;

/// Reads `value` as a property of type `type`; the text of a failure says what
/// is wrong, for the caller to place. Returns false on failure.
bool ReadValue(const Json& value, api::PropertyTypeCode type, PropertyValue* out, std::string* problem);

/// The form ReadValue reads back to an equal value (times as seconds and fraction).
Json WriteValue(const PropertyValue& value);

/// A tag text "0x01006000" (hexadecimal, prefix optional); false when it is not one.
bool ReadTag(const Json& value, api::PropertyTag* tag);

/// UTF-8 text to wide; false when it is not strict UTF-8.
bool ToWide(const std::string& utf8, std::wstring* out);
std::string ToUtf8(const std::wstring& text);

}  // namespace qel::sim::json
