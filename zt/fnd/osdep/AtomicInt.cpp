#include "zt/fnd/osdep/AtomicInt.h"

#include <utility>

namespace zt {
namespace fnd {
namespace osdep {

int AtomicInt::getCount() const {
  CriticalSectionGuard guard(m_section);
  return m_value;
}

int AtomicInt::add(std::uint32_t n) {
  CriticalSectionGuard guard(m_section);
  m_value = static_cast<std::int32_t>(static_cast<std::uint32_t>(m_value) + n);
  return m_value;
}

int AtomicInt::increment() { return add(1); }
int AtomicInt::decrement() { return add(0xFFFFFFFFu); }

int AtomicInt::compareExchange(int expected, int replacement) {
  CriticalSectionGuard guard(m_section);
  return m_value == expected ? std::exchange(m_value, replacement) : m_value;
}

int AtomicInt::replaceAndReturn(int value) {
  CriticalSectionGuard guard(m_section);
  return std::exchange(m_value, value);
}

}  // namespace osdep
}  // namespace fnd
}  // namespace zt
