// Multiplication and division work on magnitudes and put the sign back at the end: truncation
// toward zero needs no special case then. Wrapping is the contract, so no intermediate result is
// checked.
#include "zt/fnd/FixedPoint128.h"

#include <cmath>

namespace nZTSS100 {
namespace {

using Fixed = tFixedPoint128<64, true>;

constexpr Fixed kLargest(0x7FFFFFFF, 0xFFFFFFFF, 0xFFFFFFFF, 0xFFFFFFFF);
constexpr Fixed kLeast(0x80000000, 0, 0, 0);
constexpr double kTwo63 = 9223372036854775808.0;
constexpr double kTwo64 = 18446744073709551616.0;
constexpr long double kLongTwo64 = 18446744073709551616.0L;

// A number of words of 32 bits, least significant first.
struct Words {
  uint32_t w[4];

  explicit Words(const Fixed& value) { value.Get(w[3], w[2], w[1], w[0]); }
};

// A finite value whose integer part fits.
Fixed FromMagnitude(double value) {
  const double integer = std::floor(value);
  const auto high = static_cast<uint64_t>(integer);
  // Exact: the difference has no more bits than the value, and scaling only moves the exponent.
  const auto low = static_cast<uint64_t>((value - integer) * kTwo64);
  return Fixed(static_cast<uint32_t>(high >> 32), static_cast<uint32_t>(high),
               static_cast<uint32_t>(low >> 32), static_cast<uint32_t>(low));
}

}  // namespace

Fixed::tFixedPoint128(double value) noexcept : tFixedPoint128() {
  if (std::isnan(value)) return;
  if (value >= kTwo63) {
    *this = kLargest;
  } else if (value <= -kTwo63) {
    *this = kLeast;
  } else {
    *this = FromMagnitude(std::fabs(value));
    if (value < 0) Negate();
  }
}

Fixed::tFixedPoint128(double integer, double fraction) noexcept : tFixedPoint128(integer) {
  const tFixedPoint128 more(fraction);
  const bool wasNegative = IsNegative();
  *this += more;
  if (wasNegative == more.IsNegative() && wasNegative != IsNegative()) {
    *this = wasNegative ? kLeast : kLargest;
  }
}

Fixed::operator long double() const noexcept {
  const tFixedPoint128 m = magnitude();
  // Sixty-four bits of mantissa hold the integer part whole where long double has them; on other
  // hosts this rounds once more.
  const long double value =
      static_cast<long double>(m.m_high) + static_cast<long double>(m.m_low) / kLongTwo64;
  return IsNegative() ? -value : value;
}

Fixed::operator double() const noexcept {
  return static_cast<double>(static_cast<long double>(*this));
}

void Fixed::LeftShift(int bits, bool fill) noexcept {
  const uint64_t in = fill ? ~uint64_t(0) : 0;
  // Shift counts of 64 and more are undefined in C++. The test ends a count of billions at once.
  for (; bits >= 64; bits -= 64) {
    if (m_high == in && m_low == in) return;
    m_high = m_low;
    m_low = in;
  }
  if (bits <= 0) return;
  m_high = m_high << bits | m_low >> (64 - bits);
  m_low = m_low << bits | in >> (64 - bits);
}

void Fixed::RightShift(int bits, bool fill) noexcept {
  const uint64_t in = fill ? ~uint64_t(0) : 0;
  for (; bits >= 64; bits -= 64) {
    if (m_high == in && m_low == in) return;
    m_low = m_high;
    m_high = in;
  }
  if (bits <= 0) return;
  m_low = m_low >> bits | m_high << (64 - bits);
  m_high = m_high >> bits | in << (64 - bits);
}

// Long multiplication of the magnitudes; of the 256 bits the middle 128 are the product.
Fixed& Fixed::operator*=(const tFixedPoint128& other) noexcept {
  const bool negative = IsNegative() != other.IsNegative();
  const Words a(magnitude()), b(other.magnitude());
  uint32_t product[8] = {};
  for (int i = 0; i < 4; ++i) {
    uint64_t carry = 0;
    for (int j = 0; j < 4; ++j) {
      // At most (2^32 - 1)^2 + 2 (2^32 - 1), which is exactly 2^64 - 1: the sum cannot wrap.
      carry += static_cast<uint64_t>(a.w[i]) * b.w[j] + product[i + j];
      product[i + j] = static_cast<uint32_t>(carry);
      carry >>= 32;
    }
    product[i + 4] = static_cast<uint32_t>(carry);
  }
  *this = tFixedPoint128(product[5], product[4], product[3], product[2]);
  if (negative) Negate();
  return *this;
}

Fixed& Fixed::operator/=(const tFixedPoint128& other) noexcept {
  const bool negative = IsNegative() != other.IsNegative();
  // The contract for zero; the division by words would trap.
  if (!other) return *this = IsNegative() ? kLeast : kLargest;
  *this = magnitude();
  DivideInternal(other.magnitude());
  if (negative) Negate();
  return *this;
}

// By a whole number of 32 bits, as all units up to the nanosecond are: word by word.
void Fixed::DivideByWord(uint32_t divisor) noexcept {
  Words words(*this);
  uint64_t rest = 0;
  for (int i = 3; i >= 0; --i) {
    rest = rest << 32 | words.w[i];
    words.w[i] = static_cast<uint32_t>(rest / divisor);
    rest %= divisor;
  }
  *this = tFixedPoint128(words.w[3], words.w[2], words.w[1], words.w[0]);
}

// Binary long division of (this * 2^64) by the divisor's 128 bits; only the quotient's low 128 bits
// are kept.
void Fixed::DivideInternal(const tFixedPoint128& divisor) noexcept {
  if (divisor.m_low == 0 && divisor.m_high <= 0xFFFFFFFFu) {
    return DivideByWord(static_cast<uint32_t>(divisor.m_high));
  }
  tFixedPoint128 quotient, rest;
  const auto lessUnsigned = [](const tFixedPoint128& a, const tFixedPoint128& b) {
    return a.m_high != b.m_high ? a.m_high < b.m_high : a.m_low < b.m_low;
  };
  // 128 bits of the dividend and 64 of its scaling, one quotient bit a round. What is shifted out
  // of the quotient at the top is what the result cannot hold.
  for (int i = 0; i < 192; ++i) {
    // The rest has 129 bits for a moment; the one that is about to be lost says that the divisor
    // fits.
    const bool carry = rest.IsNegative();
    rest.LeftShift(1, IsNegative());
    LeftShift(1, false);
    const bool fits = carry || !lessUnsigned(rest, divisor);
    if (fits) rest -= divisor;
    quotient.LeftShift(1, fits);
  }
  *this = quotient;
}

}  // namespace nZTSS100
