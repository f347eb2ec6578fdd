#pragma once

namespace zt::fnd::osdep {

// Blocks the calling thread for at least this time; a signal does not cut it short.
void Sleep(unsigned int ms);

}  // namespace zt::fnd::osdep
