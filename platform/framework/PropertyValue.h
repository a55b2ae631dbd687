// One typed property value as the simulated device holds it, with the
// comparisons, time conversions and texts the device's operations need.
#pragma once

#include <cstdint>
#include <string>

#include "api/Framework.h"

namespace qel::sim {

/// A property value of any of the seven type codes. Only the member that
/// belongs to `type` is meaningful; integers of codes 1 to 3 share `integer`.
struct PropertyValue {
    api::PropertyTypeCode type = api::kTypeString;
    int64_t integer = 0;
    double number = 0.0;
    fnd::Guid guid;
    std::wstring text;
    api::AbsTime time;

    /// Same type and same value; doubles compare exactly, as a client that
    /// read a value and sends it back expects to match it.
    bool operator==(const PropertyValue& other) const noexcept;
};

/// Seconds between 1904-01-01 and 1970-01-01, both UTC.
inline constexpr int64_t kSecondsFrom1904To1970 = 2082844800;

/// The absolute time of a local calendar date-time (daylight saving decided
/// by the system). False when the system cannot represent it.
bool LocalFieldsToAbsTime(const api::DateTimeFields& fields, api::AbsTime* time) noexcept;

/// The local calendar date-time of an absolute time, the fraction dropped.
/// False when the system cannot represent it.
bool AbsTimeToLocalFields(const api::AbsTime& time, api::DateTimeFields* fields) noexcept;

/// The value as a short readable text for detailed results: integers in
/// decimal, strings quoted, times as local "YYYY-MM-DD hh:mm:ss".
std::wstring DescribeValue(const PropertyValue& value);

/// "0x01006000" for a tag.
std::wstring TagText(api::PropertyTag tag);

}  // namespace qel::sim
