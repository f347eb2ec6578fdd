#include "zt/fnd/osdep/CallQPC.h"

#include "zt/fnd/osdep/MonotonicClock.h"

namespace zt::fnd::osdep {

CallQPC::CallQPC() : m_rate(MonotonicTicksPerSecond()) {}

uint64_t CallQPC::hires(unsigned int unit) const { return convert(MonotonicTicks(), unit); }

uint64_t CallQPC::convert(uint64_t ticks, unsigned int unit) const {
  if (unit == 0) return 0;
  // Units of that length in a second. Whole seconds and the rest are scaled apart, as the product
  // of all ticks and the factor needs more than 64 bits.
  uint64_t factor = 1000000000u / unit;
  return ticks / m_rate * factor + ticks % m_rate * factor / m_rate;
}

}  // namespace zt::fnd::osdep
