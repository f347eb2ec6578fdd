#include "zt/fnd/osdep/AtomicInt.h"

namespace zt::fnd::osdep {

int AtomicInt::getCount() const { return m_value.load(); }

namespace {

// Unsigned, as the signed sum could overflow.
int Sum(int32_t value, uint32_t n) {
  return static_cast<int32_t>(static_cast<uint32_t>(value) + n);
}

}  // namespace

int AtomicInt::increment() { return Sum(m_value.fetch_add(1), 1); }
int AtomicInt::decrement() { return Sum(m_value.fetch_sub(1), 0xFFFFFFFFu); }

int AtomicInt::compareExchange(int expected, int replacement) {
  m_value.compare_exchange_strong(expected, replacement);
  return expected;
}

int AtomicInt::replaceAndReturn(int value) { return m_value.exchange(value); }

}  // namespace zt::fnd::osdep
