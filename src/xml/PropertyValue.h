// The one text form of each property type, as written into "Property"
// elements, and local calendar time to absolute time.
#pragma once

#include "api/Framework.h"
#include "foundation/StringBase.h"

struct tm;

namespace qel::xml {

/// Reads the value of `tag` from `bag` with the getter of `type` and returns
/// its text form. A failed query is thrown as a `long` holding its status; a
/// type outside 1 to 7 throws kStatusFail. Time values come from the extended
/// bag when there is one, else from the local calendar date-time; a date
/// before 1904 or one the system cannot convert gives "0 0 0 0".
fnd::WString FormatPropertyValue(api::IkrSysPropertyBag* bag, api::PropertyTag tag, api::PropertyTypeCode type);

/// The absolute time of a broken-down local time (the process's time zone;
/// out-of-range fields are normalised). A time not after 1970-01-01 00:00:00
/// UTC, or one the system rejects, throws exception::OutOfRange.
api::AbsTime LocalDateTimeToAbsTime(const struct tm& localTime);

/// The four 32-bit words of an AbsTime in memory order, upper-case
/// hexadecimal, single blanks between them.
fnd::WString AbsTimeToText(const api::AbsTime& time);

}  // namespace qel::xml
