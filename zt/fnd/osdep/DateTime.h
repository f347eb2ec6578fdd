#pragma once

#include <sys/time.h>

#include <cstdint>
#include <ctime>

#include "zt/fnd/AbsTime.h"
#include "zt/fnd/StringFwd.h"

namespace zt::fnd::osdep {

AbsTime CurrentSystemTime();
AbsTime TimevalToAbsTime(const timeval& time);

// Calendar fields of a time in whole seconds, truncated or rounded as AbsTime::toTime_T does.
// Throw OutOfRange for a year that the C library cannot hold.
tm AbsTimeToLocalDateTime(const AbsTime& time, bool round);
tm AbsTimeToUTCDateTime(const AbsTime& time, bool round);

enum TimeStringType : int32_t { kTimeUTC = 0, kTimeLocal = 1, kTimeLocal2 = 2 };

// Text of a time, by two strftime formats with a blank between them.
//
// AbsTime::min is the empty text. A null format is the system's own, an empty one leaves its part
// and the blank out. With `fractionDigits` the time format gets the separator and that many
// decimals after each "%S" and "%#S", rounded half up with carry into the seconds; without, whole
// seconds are rounded. The separator is "." for 1, "," for 2, otherwise the decimal point of the
// host's locale. `timeSuffix` follows the time format after a blank. `timeFirst` turns the parts
// round. A result of more than 511 bytes is empty. Throws InvalidArgument for more than 3 digits,
// before anything else; OutOfRange as above.
String AbsTimeToString(AbsTime time, const wchar_t* dateFormat, const wchar_t* timeFormat,
                       unsigned int fractionDigits, TimeStringType type, bool timeFirst = false,
                       const wchar_t* timeSuffix = nullptr, int separator = 0);

// "%x" and "%X". They set the host's LC_TIME from the environment, for the whole process.
String GetSystemDateFormat();
String GetSystemTimeFormat();

}  // namespace zt::fnd::osdep
