#pragma once

#include <cstdint>

#include "zt/fnd/osdep/CriticalSection.h"

namespace zt {
namespace fnd {
namespace osdep {

// A 32-bit signed number on which each operation is one indivisible step, under a section of its
// own. Arithmetic wraps. Throws std::bad_alloc from the constructor only. Threads: any.
class AtomicInt {
 public:
  explicit AtomicInt(int value) : m_value(value) {}
  AtomicInt(const AtomicInt&) = delete;
  AtomicInt& operator=(const AtomicInt&) = delete;

  int getCount() const;
  int increment();  // the new value
  int decrement();  // the new value

  // Stores `replacement` if the value is `expected`. Returns the old value either way.
  int compareExchange(int expected, int replacement);
  void replace(int value) { replaceAndReturn(value); }
  int replaceAndReturn(int value);  // the old value

  bool operator==(int value) const { return getCount() == value; }
  bool operator!=(int value) const { return getCount() != value; }
  bool operator>(int value) const { return getCount() > value; }
  bool operator>=(int value) const { return getCount() >= value; }

 private:
  int add(std::uint32_t n);

  std::int32_t m_value GUARDED_BY(m_section);
  CriticalSection m_section;
};

}  // namespace osdep
}  // namespace fnd
}  // namespace zt
