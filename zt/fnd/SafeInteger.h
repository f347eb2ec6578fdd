#pragma once

#include <limits>
#include <type_traits>

#include "zt/fnd/Exception.h"

namespace zt::fnd {

// Unsigned number whose arithmetic cannot wrap.
//
// Sizes of the foundation are 32-bit unsigned on every platform; each sum and product of sizes goes
// through here. Throws OutOfRange where a result does not fit T; the operands are then unchanged.
template <class T>
class SafeInteger {
  static_assert(std::is_unsigned_v<T>, "sizes are unsigned");

 public:
  static constexpr T k_HIGH_BIT = static_cast<T>(T(1) << (std::numeric_limits<T>::digits - 1));

  // Converts from and to T implicitly, so that sizes can be passed as they are.
  constexpr SafeInteger(T value = 0) noexcept : m_value(value) {}

  constexpr T get() const noexcept { return m_value; }
  constexpr operator T() const noexcept { return m_value; }

  static T Add(T a, T b) {
    T sum;
    if (__builtin_add_overflow(a, b, &sum)) ZT_RAISE(exception::OutOfRange());
    return sum;
  }

  static T Multiply(T a, T b) {
    T product;
    if (__builtin_mul_overflow(a, b, &product)) ZT_RAISE(exception::OutOfRange());
    return product;
  }

  SafeInteger& operator+=(SafeInteger other) {
    m_value = Add(m_value, other.m_value);
    return *this;
  }
  SafeInteger& operator*=(SafeInteger other) {
    m_value = Multiply(m_value, other.m_value);
    return *this;
  }
  friend SafeInteger operator+(SafeInteger a, SafeInteger b) { return a += b; }
  friend SafeInteger operator*(SafeInteger a, SafeInteger b) { return a *= b; }

  // Doubles the value. With the top bit set sets `overflow` and changes nothing else.
  SafeInteger& multiplyByTwoNoThrow(bool& overflow) noexcept {
    overflow = (m_value & k_HIGH_BIT) != 0;
    if (!overflow) m_value = static_cast<T>(m_value << 1);
    return *this;
  }

 private:
  T m_value;
};

}  // namespace zt::fnd
