// The arithmetic of times is that of the 128-bit fixed-point value: 64 bits of seconds, 64 of their
// fraction. Every conversion has the same three steps: move the epoch, multiply by the units of a
// second, round. A step that leaves the range is seen by the sign, as the value wraps at 128 bits.
#include "zt/fnd/AbsTime.h"

#include <algorithm>
#include <cmath>
#include <iterator>
#include <limits>

using nZTSS100::tTimeUnit;

namespace {

using Value = tSSTimeValue::tValue;

constexpr uint64_t kHalf = uint64_t(1) << 63;
constexpr double kTwo64 = 18446744073709551616.0;

void SetStatus(int32_t* status, int32_t error) {
  if (status && *status == tSSTimeValue::kNoError) *status = error;
}

// Both kinds have whole factors, so that no conversion divides by a rounded one.
struct UnitFactor {
  tTimeUnit unit;
  int64_t factor;
  bool perSecond;  // so many to the second; otherwise so many seconds
};

constexpr UnitFactor kUnitFactors[] = {
    {nZTSS100::kTimeUnitAtto, 1000000000000000000, true},
    {nZTSS100::kTimeUnitFemto, 1000000000000000, true},
    {nZTSS100::kTimeUnitPico, 1000000000000, true},
    {nZTSS100::kTimeUnitNano, 1000000000, true},
    {nZTSS100::kTimeUnitTicks, 10000000, true},
    {nZTSS100::kTimeUnitMicro, 1000000, true},
    {nZTSS100::kTimeUnitMilli, 1000, true},
    {nZTSS100::kTimeUnitMinute, 60, false},
    {nZTSS100::kTimeUnitHour, 3600, false},
    {nZTSS100::kTimeUnitDay, 86400, false},
};

// Whether the magnitude, truncated, goes up by one.
bool RoundsAway(tSSTimeValue::tRoundMethod method, const Value& magnitude, bool negative) {
  const uint64_t fraction = magnitude.fractionBits();
  // The sign is known to the caller only: the magnitude is what is rounded.
  switch (method) {
    case tSSTimeValue::kRoundNearest:
      return fraction > kHalf || (fraction == kHalf && magnitude.IsOdd());
    case tSSTimeValue::kRoundUp:
      return fraction != 0 && !negative;
    case tSSTimeValue::kRoundDown:
      return fraction != 0 && negative;
    default:
      return false;
  }
}

}  // namespace

void tSSTimeValue::_CorrectUnits(tUnitConversion conversion, tTimeUnit unit, tValue& value,
                                 int32_t* status) {
  // Not in the table: dividing by 1 would cost a long division.
  if (unit == nZTSS100::kTimeUnitSecond) return;
  const UnitFactor* const end = std::end(kUnitFactors);
  const UnitFactor* const row = std::find_if(std::begin(kUnitFactors), end,
                                             [=](const UnitFactor& f) { return f.unit == unit; });
  if (row == end) return SetStatus(status, kInvalidUnit);
  const tValue factor(static_cast<long long>(row->factor));
  if (row->perSecond == (conversion == kToSeconds)) {
    value /= factor;
    return;
  }
  const bool wasNegative = value.IsNegative();
  value *= factor;
  if (value.IsNegative() != wasNegative) SetStatus(status, kDoesNotFit);
}

// Works on the magnitude: the bits before the point of a negative number are its floor, not its
// integer part.
void tSSTimeValue::_RoundAndCheckFit(tRoundMethod method, const tValue& maximum,
                                     const tValue& minimum, tValue& value, int32_t* status) {
  const bool negative = value.IsNegative();
  if (negative) value.Negate();
  const bool away = RoundsAway(method, value, negative);
  value &= tValue(0xFFFFFFFF, 0xFFFFFFFF, 0, 0);
  if (away) value += tValue(1);
  // Rounding the largest magnitude up carries into the sign bit.
  const bool passed = !negative && value.IsNegative();
  if (negative) value.Negate();
  if (passed || value > maximum || value < minimum) SetStatus(status, kDoesNotFit);
}

namespace zt::fnd {
namespace {

constexpr Value kMost(0x7FFFFFFF, 0xFFFFFFFF, 0, 0);
constexpr Value kLeast(0x80000000, 0, 0, 0);

// Seconds from 1904 in which 64 bits of ticks surely end, on either side, and well before 65 would.
constexpr Value kTicksEnd(1000000000000LL);
constexpr int64_t kTicksPerSecond = 10000000;
constexpr int64_t kSurelyFit = 900000000000;

int64_t Limit(bool negative) {
  return negative ? std::numeric_limits<int64_t>::min() : std::numeric_limits<int64_t>::max();
}

// Seconds since 1904 to a count of units since an epoch that lies `offset` seconds before 1904.
// A step that leaves the range ends at the limit on the side where it left.
int64_t CountSince(Value value, int64_t offset, tTimeUnit unit, bool round) {
  const bool wasNegative = value.IsNegative();
  value += Value(static_cast<long long>(offset));
  // Two numbers of one sign whose sum has the other: it has wrapped. Numbers of different signs
  // cannot.
  if (wasNegative == (offset < 0) && value.IsNegative() != wasNegative) return Limit(wasNegative);
  const bool negative = value.IsNegative();
  int32_t status = tSSTimeValue::kNoError;
  tSSTimeValue::_CorrectUnits(tSSTimeValue::kFromSeconds, unit, value, &status);
  const auto method = round ? tSSTimeValue::kRoundNearest : tSSTimeValue::kRoundTowardZero;
  tSSTimeValue::_RoundAndCheckFit(method, kMost, kLeast, value, &status);
  return status == tSSTimeValue::kNoError ? value.integerPart() : Limit(negative);
}

// A fraction that lies so close to 1.0 that a double shows it as 1.0 or the value next to it.
bool ShowsAsOne(double fraction) {
  const double band = std::numeric_limits<double>::epsilon() * std::max(std::fabs(fraction), 1.0);
  return fraction >= 1.0 || 1.0 - fraction <= band;
}

double FractionOf(const Value& value) { return static_cast<double>(value.fractionBits()) / kTwo64; }

}  // namespace

int64_t AbsTime::getSeconds() const noexcept {
  const bool negative = m_value.IsNegative();
  const Value magnitude = negative ? -m_value : m_value;
  Value whole = m_value;
  tSSTimeValue::_RoundAndCheckFit(tSSTimeValue::kRoundTowardZero, kMost, kLeast, whole, nullptr);
  const int64_t seconds = whole.integerPart();
  // getFraction gives 0 for such a value; without the carry both together would lose a second.
  if (!ShowsAsOne(FractionOf(magnitude)) || seconds == Limit(negative)) return seconds;
  return negative ? seconds - 1 : seconds + 1;
}

double AbsTime::getFraction() const noexcept {
  const double fraction = FractionOf(m_value);
  return ShowsAsOne(fraction) ? 0.0 : fraction;
}

int64_t AbsTime::toTime_T(bool round) const noexcept {
  return CountSince(m_value, -kUnixEpoch, nZTSS100::kTimeUnitSecond, round);
}

int64_t AbsTime::toLKTIME(bool round) const noexcept {
  // The change of its sign reveals a product that is too large, but only up to twice the range.
  const bool negative = m_value.IsNegative();
  if (negative ? m_value < -kTicksEnd : m_value > kTicksEnd) return Limit(negative);
  // Times of files: whole seconds, of which the ticks fit.
  const int64_t seconds = m_value.integerPart();
  if (m_value.fractionBits() == 0 && seconds >= -kSurelyFit && seconds <= kSurelyFit) {
    return (seconds + kLktimeEpoch) * kTicksPerSecond;
  }
  return CountSince(m_value, kLktimeEpoch, nZTSS100::kTimeUnitTicks, round);
}

}  // namespace zt::fnd
