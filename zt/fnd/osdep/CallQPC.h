#pragma once

#include <cstdint>

namespace zt::fnd::osdep {

// The high-resolution clock, read in ticks of a chosen length. Threads: any.
class CallQPC {
 public:
  CallQPC();

  // Ticks of `unit` nanoseconds: 1000000 gives milliseconds. Above 1000000000 always 0; 0 is not
  // allowed, and gives 0.
  uint64_t hires(unsigned int unit) const;

  // The same for a given reading of the clock; exact, without overflow on the way.
  uint64_t convert(uint64_t ticks, unsigned int unit) const;

 private:
  uint64_t m_rate;
};

}  // namespace zt::fnd::osdep
