// From a time to text in three steps: fractions are put into the format as literal digits, the time
// is broken down into calendar fields, and strftime prints them. strftime knows no fractions, and a
// fraction that rounds up to a whole second has to move the time before it is broken down, which is
// why the format comes first.
#include "zt/fnd/osdep/DateTime.h"

#include <clocale>
#include <cwchar>

#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/ForkSafeMutex.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/LeakedInstance.h"

namespace zt::fnd::osdep {
namespace {

constexpr unsigned kMostDigits = 3;
constexpr size_t kTextSize = 512;
constexpr unsigned kPowersOfTen[kMostDigits + 1] = {1, 10, 100, 1000};

const AbsTime::Value kUnixEpoch(static_cast<long long>(AbsTime::kUnixEpoch));

// The C library keeps time zone and locale under locks of its own, which a child may find held for
// good.
struct SystemTimes {
  ForkSafeMutex lock{AtFork::Wait, 90};
};

String SeparatorText(int separator) {
  if (separator == 1) return L".";
  if (separator == 2) return L",";
  return String(localeconv()->decimal_point);
}

// The separator and the decimals of the time, which moves on by a second where they round up to 1.
String FractionText(AbsTime& time, unsigned digits, int separator) {
  const unsigned one = kPowersOfTen[digits];
  // Half up, by adding a half and cutting.
  double f = time.getFraction() * one + 0.5;
  if (f >= one) {
    time = AbsTime(time.value() + AbsTime::Value(1));
    f = 0;
  }
  unsigned rest = static_cast<unsigned>(f);
  String text(digits, L'0');
  for (unsigned i = digits; i-- > 0; rest /= 10) text[i] = static_cast<wchar_t>(L'0' + rest % 10);
  return SeparatorText(separator) + text;
}

// Puts the text after every "%S" and "%#S".
String WithFraction(const String& format, const String& fraction) {
  String result;
  String::size_type done = 0;
  for (String::size_type i = 0; i + 1 < format.length(); ++i) {
    if (format[i] != L'%') continue;
    const String::size_type letter = format[i + 1] == L'#' ? i + 2 : i + 1;
    if (letter >= format.length() || format[letter] != L'S') continue;
    result.append(format.begin() + done, letter + 1 - done);
    result += fraction;
    done = letter + 1;
  }
  return result.append(format.begin() + done, format.length() - done);
}

String Join(const String& first, const String& second) {
  return first.empty() || second.empty() ? first + second : first + L" " + second;
}

// "%#S" prints what "%S" does, since a number has no case; not every strftime knows the flag.
void DropFlagsOfSeconds(String& format) {
  for (String::size_type i = 0; i + 2 < format.length(); ++i) {
    if (format[i] != L'%') continue;
    ++i;  // what follows begins no conversion, as in "%%#S"
    if (format[i] == L'#' && format[i + 1] == L'S') format.erase(i, 1);
  }
}

String Format(const tm& fields, String format) {
  DropFlagsOfSeconds(format);
  // strftime gives 0 both for a result that does not fit and for an empty one; both are the empty
  // text.
  char text[kTextSize];
  const AnsiString narrow(format);
  Hold hold(LeakedInstance<SystemTimes>().lock);
  const size_t n = strftime(text, sizeof text, narrow.c_str(), &fields);
  return String(static_cast<const char*>(text), static_cast<String::size_type>(n));
}

template <class BreakDown>
tm ToFields(const AbsTime& time, bool round, BreakDown breakDown) {
  const time_t seconds = static_cast<time_t>(time.toTime_T(round));
  tm fields;
  Hold hold(LeakedInstance<SystemTimes>().lock);
  if (!breakDown(&seconds, &fields)) ZT_RAISE(exception::OutOfRange());
  return fields;
}

String SystemFormat(const wchar_t* format) {
  Hold hold(LeakedInstance<SystemTimes>().lock);
  // The host's setting is changed on purpose: "%x" is meant to be the user's own, and strftime has
  // no other way to get a locale.
  setlocale(LC_TIME, "");
  return String(format);
}

static_assert(sizeof(time_t) == sizeof(int64_t), "times pass 2038");

}  // namespace

AbsTime TimevalToAbsTime(const timeval& time) {
  // Unsigned, where a clock far outside all calendars wraps instead of trapping.
  const uint64_t micros =
      static_cast<uint64_t>(time.tv_sec) * 1000000 + static_cast<uint64_t>(time.tv_usec);
  AbsTime::Value value(static_cast<int64_t>(micros));
  const bool isWhole = time.tv_usec == 0 && static_cast<int64_t>(micros) / 1000000 == time.tv_sec;
  if (isWhole) {
    value = AbsTime::Value(static_cast<int64_t>(time.tv_sec));
  } else {
    tSSTimeValue::_CorrectUnits(tSSTimeValue::kToSeconds, nZTSS100::kTimeUnitMicro, value, nullptr);
  }
  value += kUnixEpoch;
  return AbsTime(value);
}

AbsTime CurrentSystemTime() {
  timeval now;
  gettimeofday(&now, nullptr);
  return TimevalToAbsTime(now);
}

tm AbsTimeToLocalDateTime(const AbsTime& time, bool round) {
  return ToFields(time, round, localtime_r);
}

tm AbsTimeToUTCDateTime(const AbsTime& time, bool round) { return ToFields(time, round, gmtime_r); }

String AbsTimeToString(AbsTime time, const wchar_t* dateFormat, const wchar_t* timeFormat,
                       unsigned int fractionDigits, TimeStringType type, bool timeFirst,
                       const wchar_t* timeSuffix, int separator) {
  if (fractionDigits > kMostDigits) ZT_RAISE(exception::InvalidArgument());
  if (time == AbsTime::min) return String();
  const String datePart = dateFormat ? String(dateFormat) : GetSystemDateFormat();
  String timePart = timeFormat ? String(timeFormat) : GetSystemTimeFormat();
  if (!timePart.empty()) {
    if (timeSuffix && *timeSuffix != L'\0') timePart = timePart + L" " + timeSuffix;
    if (fractionDigits != 0) {
      timePart = WithFraction(timePart, FractionText(time, fractionDigits, separator));
    }
  }
  const String format = timeFirst ? Join(timePart, datePart) : Join(datePart, timePart);
  // With digits the fraction is already in the format, and rounding the seconds as well would count
  // it twice.
  const bool round = fractionDigits == 0;
  return Format(
      type == kTimeUTC ? AbsTimeToUTCDateTime(time, round) : AbsTimeToLocalDateTime(time, round),
      format);
}

String GetSystemDateFormat() { return SystemFormat(L"%x"); }
String GetSystemTimeFormat() { return SystemFormat(L"%X"); }

}  // namespace zt::fnd::osdep
