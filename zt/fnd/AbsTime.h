#pragma once

#include <compare>
#include <cstdint>

#include "zt/fnd/FixedPoint128.h"

namespace nZTSS100 {

// Units of time, by their codes in stored data.
enum tTimeUnit : uint32_t {
  kTimeUnitAtto = 0x36CAD7B7,   // 10^18 a second
  kTimeUnitFemto = 0x36CAD7BA,  // 10^15
  kTimeUnitPico = 0x36CAD7BD,   // 10^12
  kTimeUnitNano = 0x36CAD7C0,   // 10^9
  kTimeUnitTicks = 0x36CAD7C2,  // 10^7, of 100 nanoseconds
  kTimeUnitMicro = 0x36CAD7C3,  // 10^6
  kTimeUnitMilli = 0x36CAD7C6,  // 10^3
  kTimeUnitSecond = 0x36CAD7C9,
  kTimeUnitMinute = 0x36CAD7CB,
  kTimeUnitHour = 0x36CAD7CD,
  kTimeUnitDay = 0x36CAD7CF,
};

}  // namespace nZTSS100

// Conversions of a number of seconds. Each reports through a status, which is set only if it holds
// no error yet and never stops the work; a null status is not written.
struct tSSTimeValue {
  using tValue = nZTSS100::tFixedPoint128<64, true>;

  // kToSeconds: a count of units becomes seconds. kFromSeconds: the reverse.
  enum tUnitConversion : int32_t { kToSeconds = 1, kFromSeconds = 2 };
  enum tRoundMethod : int32_t {
    kRoundNearest = 1,  // a tie goes to the even value
    kRoundTowardZero = 2,
    kRoundUp = 3,
    kRoundDown = 4,
  };

  // Values of a status. The caller sets it to kNoError before the first conversion.
  static constexpr int32_t kNoError = 0;
  static constexpr int32_t kInvalidUnit = -50003;
  static constexpr int32_t kDoesNotFit = -50175;

  // Multiplies or divides by the unit's factor. An unknown unit leaves the value: kInvalidUnit. A
  // multiplication that changes the sign: kDoesNotFit.
  static void _CorrectUnits(tUnitConversion conversion, nZTSS100::tTimeUnit unit, tValue& value,
                            int32_t* status);

  // Rounds to an integer. A result outside minimum to maximum stays as it is: kDoesNotFit.
  static void _RoundAndCheckFit(tRoundMethod method, const tValue& maximum, const tValue& minimum,
                                tValue& value, int32_t* status);
};

namespace zt::fnd {

// A point in time: fixed-point seconds since 1904-01-01 00:00:00 UTC.
//
// `min` doubles as "no time". Threads: a plain value of 16 bytes, copied like an integer.
class AbsTime {
 public:
  using Value = nZTSS100::tFixedPoint128<64, true>;

  static constexpr unsigned int size = 16;  // bytes
  static const AbsTime max;
  static const AbsTime min;

  // Seconds from 1904 to the Unix epoch, and from 1601, where LKTIME starts, to 1904.
  static constexpr int64_t kUnixEpoch = 2082844800;
  static constexpr int64_t kLktimeEpoch = 9561628800;

  constexpr AbsTime() noexcept = default;  // 1904
  constexpr explicit AbsTime(const Value& value) noexcept : m_value(value) {}
  // The sum of both, in seconds since 1904.
  AbsTime(double seconds, double fraction) noexcept : m_value(seconds, fraction) {}

  constexpr const Value& value() const noexcept { return m_value; }

  // Whole seconds, truncated toward zero. A fraction that a double shows as 1.0 carries over, away
  // from zero.
  int64_t getSeconds() const noexcept;

  // The bits after the point, 0 up to 1; 0 where a double shows 1.0. Before 1904 this is the
  // distance from the second below, not from getSeconds().
  double getFraction() const noexcept;

  // Unix seconds, and ticks of 100 nanoseconds since 1601-01-01. `round` goes to the nearest whole
  // number, a tie to the even one; without it the result is truncated toward zero, counted from the
  // target's own epoch. What does not fit ends at the limit of 64 bits.
  int64_t toTime_T(bool round) const noexcept;
  int64_t toLKTIME(bool round) const noexcept;

  // Closed ranges: the ends count.
  static bool doRangesIntersect(const AbsTime& aStart, const AbsTime& aEnd, const AbsTime& bStart,
                                const AbsTime& bEnd) noexcept {
    return aStart <= bEnd && aEnd >= bStart;
  }
  static bool isSubRange(const AbsTime& aStart, const AbsTime& aEnd, const AbsTime& bStart,
                         const AbsTime& bEnd) noexcept {
    return aStart >= bStart && aEnd <= bEnd;
  }

  // By the whole value, to 2^-64 seconds. `min` is before every other time.
  friend constexpr bool operator==(const AbsTime&, const AbsTime&) noexcept = default;
  friend constexpr auto operator<=>(const AbsTime&, const AbsTime&) noexcept = default;

 private:
  Value m_value;
};

inline constexpr AbsTime AbsTime::max{Value(0x7FFFFFFF, 0xFFFFFFFF, 0xFFFFFFFF, 0xFFFFFFFF)};
inline constexpr AbsTime AbsTime::min{Value(0x80000000, 0, 0, 0)};

static_assert(sizeof(AbsTime) == AbsTime::size);

}  // namespace zt::fnd
