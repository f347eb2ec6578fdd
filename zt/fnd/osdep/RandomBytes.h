#pragma once

#include <cstddef>

namespace zt::fnd::osdep {

// Platform seam: fills up to 256 bytes at random, good enough for identifiers that no other machine
// makes too. False with errno if the system has none to give. Threads: any.
bool RandomBytes(void* bytes, size_t sizeBytes);

}  // namespace zt::fnd::osdep
