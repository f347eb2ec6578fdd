#pragma once

#include <compare>
#include <cstdint>

namespace nZTSS100 {

template <int IntegerBits, bool Signed>
class tFixedPoint128;

// Signed 128-bit number in two's complement: 64 bits before the binary point, 64 after it.
//
// Arithmetic wraps at 128 bits and never fails; who needs to know compares signs. Products and
// quotients are truncated toward zero. Division by zero gives the largest or least value by the
// dividend's sign. Floating-point values are truncated toward zero to 2^-64 and clamped to the
// range; not-a-number is 0. Threads: a plain value of 16 bytes.
template <>
class tFixedPoint128<64, true> {
 public:
  constexpr tFixedPoint128() noexcept : m_high(0), m_low(0) {}
  // Four words, from the most significant down.
  constexpr tFixedPoint128(uint32_t w3, uint32_t w2, uint32_t w1, uint32_t w0) noexcept
      : m_high(Join(w3, w2)), m_low(Join(w1, w0)) {}
  // Integer part.
  constexpr tFixedPoint128(int value) noexcept : tFixedPoint128(Whole(), value) {}
  constexpr tFixedPoint128(unsigned int value) noexcept : m_high(value), m_low(0) {}
  constexpr tFixedPoint128(long value) noexcept : tFixedPoint128(Whole(), value) {}
  constexpr tFixedPoint128(unsigned long value) noexcept : m_high(value), m_low(0) {}
  constexpr tFixedPoint128(long long value) noexcept : tFixedPoint128(Whole(), value) {}
  constexpr tFixedPoint128(unsigned long long value) noexcept : m_high(value), m_low(0) {}
  // Truncated toward zero to 2^-64 and clamped; not-a-number is 0.
  explicit tFixedPoint128(double value) noexcept;
  // The sum of both, each converted by itself, so that a large integer part does not cost the
  // fraction its low bits. Clamped where the sum leaves the range.
  tFixedPoint128(double integer, double fraction) noexcept;

  constexpr void Get(uint32_t& w3, uint32_t& w2, uint32_t& w1, uint32_t& w0) const noexcept {
    w3 = static_cast<uint32_t>(m_high >> 32);
    w2 = static_cast<uint32_t>(m_high);
    w1 = static_cast<uint32_t>(m_low >> 32);
    w0 = static_cast<uint32_t>(m_low);
  }
  // The integer part rounded down, and the 64 bits after the point.
  constexpr int64_t integerPart() const noexcept { return static_cast<int64_t>(m_high); }
  constexpr uint64_t fractionBits() const noexcept { return m_low; }
  explicit operator double() const noexcept;
  explicit operator long double() const noexcept;

  // The sign is the top bit; zero is positive.
  constexpr bool IsNegative() const noexcept { return (m_high >> 63) != 0; }
  constexpr bool IsOdd() const noexcept { return (m_high & 1) != 0; }  // of the integer part
  constexpr bool operator!() const noexcept { return m_high == 0 && m_low == 0; }

  constexpr void Zero() noexcept { m_high = m_low = 0; }
  constexpr void Invert() noexcept {
    m_high = ~m_high;
    m_low = ~m_low;
  }
  // Adds 2^-64.
  constexpr void IncrementLSB() noexcept {
    if (++m_low == 0) ++m_high;
  }
  constexpr void Negate() noexcept {
    Invert();
    IncrementLSB();
  }
  // Shift by 0 or more bits; `fill` is the bit that moves in. More than 127 fills the number.
  void LeftShift(int bits, bool fill) noexcept;
  void RightShift(int bits, bool fill) noexcept;

  tFixedPoint128& operator+=(const tFixedPoint128& other) noexcept {
    const uint64_t low = m_low + other.m_low;
    m_high += other.m_high + (low < m_low ? 1 : 0);
    m_low = low;
    return *this;
  }
  tFixedPoint128& operator-=(tFixedPoint128 other) noexcept {
    other.Negate();
    return *this += other;
  }
  // Truncated toward zero to 2^-64; what passes 128 bits is lost.
  tFixedPoint128& operator*=(const tFixedPoint128& other) noexcept;
  tFixedPoint128& operator/=(const tFixedPoint128& other) noexcept;
  tFixedPoint128& operator&=(const tFixedPoint128& other) noexcept {
    m_high &= other.m_high;
    m_low &= other.m_low;
    return *this;
  }
  tFixedPoint128 operator-() const noexcept {
    tFixedPoint128 result(*this);
    result.Negate();
    return result;
  }
  friend tFixedPoint128 operator+(tFixedPoint128 a, const tFixedPoint128& b) { return a += b; }
  friend tFixedPoint128 operator-(tFixedPoint128 a, const tFixedPoint128& b) { return a -= b; }
  friend tFixedPoint128 operator*(tFixedPoint128 a, const tFixedPoint128& b) { return a *= b; }
  friend tFixedPoint128 operator/(tFixedPoint128 a, const tFixedPoint128& b) { return a /= b; }
  friend tFixedPoint128 operator&(tFixedPoint128 a, const tFixedPoint128& b) { return a &= b; }

  friend constexpr bool operator==(const tFixedPoint128& a, const tFixedPoint128& b) noexcept {
    return a.m_high == b.m_high && a.m_low == b.m_low;
  }
  friend constexpr std::strong_ordering operator<=>(const tFixedPoint128& a,
                                                    const tFixedPoint128& b) noexcept {
    if (a.m_high != b.m_high) return a.integerPart() <=> b.integerPart();
    return a.m_low <=> b.m_low;
  }

 private:
  struct Whole {};
  constexpr tFixedPoint128(Whole, int64_t value) noexcept
      : m_high(static_cast<uint64_t>(value)), m_low(0) {}
  static constexpr uint64_t Join(uint32_t high, uint32_t low) noexcept {
    return static_cast<uint64_t>(high) << 32 | low;
  }
  tFixedPoint128 magnitude() const noexcept { return IsNegative() ? -*this : *this; }
  // Both operands as unsigned; the divisor is not zero.
  void DivideInternal(const tFixedPoint128& divisor) noexcept;
  void DivideByWord(uint32_t divisor) noexcept;

  uint64_t m_high, m_low;
};

}  // namespace nZTSS100
