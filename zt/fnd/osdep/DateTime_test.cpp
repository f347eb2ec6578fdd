#include "zt/fnd/osdep/DateTime.h"

#include <gtest/gtest.h>

#include <clocale>
#include <cmath>
#include <cstdlib>
#include <ctime>
#include <limits>
#include <string>

#include "tests/support/PlainPosix.h"
#include "tests/support/ScopedLocale.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"

using namespace zt::fnd;
using namespace zt::fnd::osdep;
using vlt::test::ScopedLocale;

namespace {

// 2026-11-14 13:34:25 UTC.
constexpr double kSeconds = 1794663265;

AbsTime At(double seconds, double fraction = 0) {
  return AbsTime(2082844800.0 + seconds, fraction);
}

std::wstring Std(const String& s) { return std::wstring(s.begin(), s.end()); }

std::wstring Text(AbsTime time, const wchar_t* date, const wchar_t* clock, unsigned digits,
                  int separator = 1) {
  return Std(AbsTimeToString(time, date, clock, digits, kTimeUTC, false, nullptr, separator));
}

// The zone of the process for the life of the object.
class ScopedZone {
 public:
  explicit ScopedZone(const char* zone) {
    setenv("TZ", zone, 1);
    tzset();
  }
  ~ScopedZone() {
    unsetenv("TZ");
    tzset();
  }
};

}  // namespace

TEST(DateTimeText, DateAndTimeStandWithABlank) {
  EXPECT_EQ(L"20261114 133425", Text(At(kSeconds), L"%Y%m%d", L"%H%M%S", 0));
  EXPECT_EQ(L"13:34:25 14.11.2026",
            Std(AbsTimeToString(At(kSeconds), L"%d.%m.%Y", L"%H:%M:%S", 0, kTimeUTC, true)));
}

TEST(DateTimeText, UsesOfTheSystem) {
  EXPECT_EQ(L"_11142026", Text(At(kSeconds), L"_%m%d%Y", L"", 0));
  EXPECT_EQ(L"20261114 133425.123", Text(At(kSeconds, 0.123), L"%Y%m%d", L"%H%M%S", 3));
}

TEST(DateTimeText, MissingPartsLeaveNoBlank) {
  EXPECT_EQ(L"13:34", Text(At(kSeconds), L"", L"%H:%M", 0));
  EXPECT_EQ(L"2026", Text(At(kSeconds), L"%Y", L"", 0));
  EXPECT_EQ(L"", Text(At(kSeconds), L"", L"", 0));
  EXPECT_EQ(L"13", Std(AbsTimeToString(At(kSeconds), L"", L"%H", 0, kTimeUTC, true)));
}

TEST(DateTimeText, NoTimeIsEmptyWhateverTheFormats) {
  EXPECT_EQ(L"", Text(AbsTime::min, L"%Y", L"%H", 3));
  EXPECT_EQ(L"", Text(AbsTime::min, L"%Q%", L"%", 0));
  EXPECT_EQ(L"", Text(AbsTime::min, nullptr, nullptr, 0));
}

TEST(DateTimeText, TooManyDigitsRaiseFirst) {
  EXPECT_THROW(Text(AbsTime::min, L"", L"", 4), exception::InvalidArgument);
  EXPECT_THROW(Text(At(0), L"%Y", L"", 0xFFFFFFFF), exception::InvalidArgument);
}

TEST(DateTimeText, FractionsAreRoundedHalfUpWithCarry) {
  const struct {
    double fraction;
    unsigned digits;
    const wchar_t* text;
  } table[] = {{0.9996, 3, L"26.000"}, {0.9995, 3, L"26.000"},   {0.9994, 3, L"25.999"},
               {0.0, 3, L"25.000"},    {0.0625, 3, L"25.063"},   {0.005, 2, L"25.01"},
               {0.04, 1, L"25.0"},     {0.05078125, 1, L"25.1"}, {0.95, 1, L"26.0"},
               {0.5, 1, L"25.5"},      {0.25, 2, L"25.25"}};
  for (const auto& row : table) {
    EXPECT_EQ(row.text, Text(At(kSeconds, row.fraction), L"", L"%S", row.digits)) << row.fraction;
  }
}

TEST(DateTimeText, WithoutDigitsWholeSecondsAreRoundedHalfToEven) {
  EXPECT_EQ(L"26", Text(At(kSeconds, 0.5), L"", L"%S", 0));
  EXPECT_EQ(L"26", Text(At(kSeconds + 1, 0.5), L"", L"%S", 0));
  EXPECT_EQ(L"25", Text(At(kSeconds, 0.25), L"", L"%S", 0));
}

TEST(DateTimeText, EmptyTimeFormatIgnoresTheDigits) {
  EXPECT_EQ(L"2026", Text(At(kSeconds, 0.5), L"%Y", L"", 3));
  EXPECT_EQ(L"25", Text(At(kSeconds, 0.75), L"%S", L"", 3)) << "truncated, as digits are asked for";
  EXPECT_EQ(L"26", Text(At(kSeconds, 0.75), L"%S", L"", 0));
}

TEST(DateTimeText, FractionStandsBehindEverySecond) {
  EXPECT_EQ(L"25.5|25.5|34", Text(At(kSeconds, 0.5), L"", L"%S|%#S|%M", 1));
  EXPECT_EQ(L"%S.5", Text(At(kSeconds, 0.5), L"", L"%%S", 1)) << "found in the text as it stands";
  EXPECT_EQ(L"25", Text(At(kSeconds, 0.5), L"%S", L"%M", 1).substr(0, 2)) << "not in the date";
}

TEST(DateTimeText, TheFlagOfSecondsChangesNothing) {
  EXPECT_EQ(L"25", Text(At(kSeconds), L"", L"%#S", 0));
  EXPECT_EQ(L"25 25", Text(At(kSeconds), L"%#S", L"%#S", 0)) << "in the date, too";
  EXPECT_EQ(L"%#S%25", Text(At(kSeconds), L"", L"%%#S%%%#S", 0)) << "text that only looks like it";
}

TEST(DateTimeText, SeparatorComesFromTheLastArgument) {
  EXPECT_EQ(L"25.5", Text(At(kSeconds, 0.5), L"", L"%S", 1, 1));
  EXPECT_EQ(L"25,5", Text(At(kSeconds, 0.5), L"", L"%S", 1, 2));
  const std::wstring point = Std(String(std::localeconv()->decimal_point));
  EXPECT_EQ(L"25" + point + L"5", Text(At(kSeconds, 0.5), L"", L"%S", 1, 0));
  EXPECT_EQ(L"25" + point + L"5", Text(At(kSeconds, 0.5), L"", L"%S", 1, 99));
}

TEST(DateTimeText, SuffixFollowsATimeFormat) {
  const auto text = [](const wchar_t* clock, const wchar_t* suffix) {
    return Std(AbsTimeToString(At(kSeconds), L"%Y", clock, 0, kTimeUTC, false, suffix));
  };
  EXPECT_EQ(text(L"%H", L"UTC"), L"2026 13 UTC");
  EXPECT_EQ(text(L"%H", L""), L"2026 13");
  EXPECT_EQ(text(L"", L"UTC"), L"2026");
}

TEST(DateTimeText, LocalTimeForTypesOneAndTwo) {
  const ScopedZone zone("XYZ-2");
  const auto text = [](TimeStringType type) {
    return Std(AbsTimeToString(At(kSeconds), L"", L"%H:%M", 0, type));
  };
  EXPECT_EQ(text(kTimeUTC), L"13:34");
  EXPECT_EQ(text(kTimeLocal), L"15:34");
  EXPECT_EQ(text(kTimeLocal2), L"15:34");
}

TEST(DateTimeText, NullFormatsAreTheSystemsOwn) {
  const ScopedLocale locale(LC_TIME, "C");
  EXPECT_EQ(Std(GetSystemDateFormat()), L"%x");
  EXPECT_EQ(Std(GetSystemTimeFormat()), L"%X");
  const std::wstring both = Text(At(kSeconds), nullptr, nullptr, 0);
  EXPECT_EQ(Text(At(kSeconds), L"%x", L"%X", 0), both);
  EXPECT_FALSE(both.empty());
}

TEST(DateTimeText, SystemFormatsTakeTheTimeLocaleFromTheEnvironment) {
  // musl takes "C.UTF-8" for "C" here, and any other name as it is.
  const std::string other = vlt::test::kGlibc ? "C.UTF-8" : "de_DE.UTF-8";
  const ScopedLocale locale(LC_TIME, "C");
  setenv("LC_ALL", other.c_str(), 1);
  GetSystemDateFormat();
  EXPECT_EQ(setlocale(LC_TIME, nullptr), other);
  EXPECT_STREQ(setlocale(LC_CTYPE, nullptr), "C") << "and nothing else";
  unsetenv("LC_ALL");
}

TEST(DateTimeText, ExplicitFormatsLeaveTheLocaleAlone) {
  const ScopedLocale locale(LC_TIME, "C");
  setenv("LC_ALL", "C.UTF-8", 1);
  Text(At(kSeconds), L"%Y", L"%H", 3);
  EXPECT_STREQ(setlocale(LC_TIME, nullptr), "C");
  unsetenv("LC_ALL");
}

TEST(DateTimeText, TextBeyondTheBufferIsEmpty) {
  const std::wstring format(511, L'x'), longer(512, L'x'), longest(100000, L'x');
  EXPECT_EQ(format, Text(At(0), format.c_str(), L"", 0));
  EXPECT_EQ(Text(At(0), longer.c_str(), L"", 0), L"");
  EXPECT_EQ(Text(At(0), longest.c_str(), longest.c_str(), 0), L"");
}

TEST(DateTimeText, YearsBeyondTheCalendarRaise) {
  EXPECT_THROW(Text(AbsTime::max, L"%Y", L"", 0), exception::OutOfRange);
  EXPECT_THROW(AbsTimeToUTCDateTime(AbsTime::max, false), exception::OutOfRange);
  EXPECT_THROW(AbsTimeToLocalDateTime(AbsTime(-9e18, 0), true), exception::OutOfRange);
}

TEST(DateTimeFields, RoundOrTruncate) {
  EXPECT_EQ(25, AbsTimeToUTCDateTime(At(kSeconds, 0.75), false).tm_sec);
  EXPECT_EQ(26, AbsTimeToUTCDateTime(At(kSeconds, 0.75), true).tm_sec);
  const std::tm fields = AbsTimeToUTCDateTime(At(0), false);
  EXPECT_EQ(70, fields.tm_year);
  EXPECT_EQ(4, fields.tm_wday);
  const tm old = AbsTimeToUTCDateTime(AbsTime(), false);
  EXPECT_EQ(old.tm_year, 4);
  EXPECT_EQ(old.tm_mday, 1);
}

TEST(DateTimeFields, PassTheYear2038) {
  EXPECT_EQ(138, AbsTimeToUTCDateTime(At(2147483648.0), false).tm_year);
  EXPECT_EQ(1100, AbsTimeToUTCDateTime(At(32503680000.0), false).tm_year);
}

TEST(DateTimeFields, LocalTimeFollowsTheZone) {
  const ScopedZone zone("XYZ5");
  EXPECT_EQ(AbsTimeToLocalDateTime(At(kSeconds), false).tm_hour, 8);
}

TEST(DateTimeClock, TimevalKeepsItsMicroseconds) {
  timeval time;
  time.tv_sec = 1794663265;
  time.tv_usec = 500000;
  const AbsTime t = TimevalToAbsTime(time);
  EXPECT_EQ(2082844800LL + 1794663265, t.getSeconds());
  EXPECT_EQ(t.getFraction(), 0.5);
  time.tv_usec = 1;
  EXPECT_NEAR(1e-6, TimevalToAbsTime(time).getFraction(), 1e-15);
  time.tv_sec = -1;
  time.tv_usec = 0;
  EXPECT_EQ(TimevalToAbsTime(time).getSeconds(), 2082844799);
}

// Also where the microseconds of so many seconds wrap.
TEST(DateTimeClock, WholeSecondsAreDividedAsOthersAre) {
  constexpr int64_t kWraps = std::numeric_limits<int64_t>::max() / 1000000;
  for (int64_t seconds :
       {INT64_C(0), INT64_C(1), INT64_C(-1), INT64_C(1794663265), kWraps, kWraps + 1, -kWraps,
        -kWraps - 2, 3 * kWraps, std::numeric_limits<int64_t>::max(),
        std::numeric_limits<int64_t>::min()}) {
    timeval time = {};
    time.tv_sec = static_cast<time_t>(seconds);
    AbsTime::Value divided(static_cast<int64_t>(static_cast<uint64_t>(seconds) * 1000000));
    divided /= AbsTime::Value(1000000);
    divided += AbsTime::kUnixEpoch;
    EXPECT_TRUE(TimevalToAbsTime(time) == AbsTime(divided)) << seconds;
  }
}

TEST(DateTimeClock, CurrentTimeIsNow) {
  const std::int64_t before = std::time(nullptr);
  const AbsTime now = CurrentSystemTime();
  const int64_t after = std::time(nullptr);
  EXPECT_LE(before, now.toTime_T(false));
  EXPECT_GE(after, now.toTime_T(false));
}
