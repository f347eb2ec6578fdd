#include "zt/fnd/osdep/WipedOnFork.h"

namespace zt::fnd::osdep {

void* AllocateWipedOnFork() noexcept { return nullptr; }

}  // namespace zt::fnd::osdep
