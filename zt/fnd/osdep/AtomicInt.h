#pragma once

#include <atomic>
#include <cstdint>

namespace zt::fnd::osdep {

// A 32-bit signed number on which each operation is one indivisible step, sequentially consistent:
// what a thread wrote before a step is seen by the thread that finds the step done. Arithmetic
// wraps in two's complement. Nothing throws. No locks: a child that is forked during a step of
// another thread can go on. Threads: any.
class AtomicInt {
 public:
  explicit AtomicInt(int value) noexcept : m_value(value) {}
  AtomicInt(const AtomicInt&) = delete;
  AtomicInt& operator=(const AtomicInt&) = delete;

  // The value at some moment of the call; it may have changed since.
  int getCount() const;
  int increment();  // the new value
  int decrement();  // the new value

  // Stores `replacement` if the value is `expected`. Returns the old value either way.
  int compareExchange(int expected, int replacement);
  void replace(int value) { replaceAndReturn(value); }
  int replaceAndReturn(int value);  // the old value

  // Comparisons of that same momentary value: for tests and reports, not to decide who acts next.
  // That is what the results of the steps are for.
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
