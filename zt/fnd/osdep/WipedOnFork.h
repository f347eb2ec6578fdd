#pragma once

#include <cstddef>

namespace zt::fnd::osdep {

inline constexpr size_t kWipedOnForkBytes = 64;

// Memory that is all zero in each child of this process, however the child is made, unless it
// shares its parent's memory (vfork). kWipedOnForkBytes bytes, zero at first, aligned for any type,
// never freed. Null where the system has no such memory: Linux before 4.14, emulators of user
// programs, other systems.
void* AllocateWipedOnFork() noexcept;

}  // namespace zt::fnd::osdep
