#pragma once

#include <atomic>
#include <cstdint>

namespace zt::fnd::osdep {

// A 32-bit signed number on which each operation is one indivisible step. Arithmetic wraps. No
// locks: a child that is forked during a step of another thread can go on. Threads: any.
class AtomicInt {
 public:
  explicit AtomicInt(int value) noexcept : m_value(value) {}
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
  std::atomic<int32_t> m_value;
  [[maybe_unused]] void* m_reserved =
      nullptr;  // of the size that objects with a number in them have always had
};

}  // namespace zt::fnd::osdep
