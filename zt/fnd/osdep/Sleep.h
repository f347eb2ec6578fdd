#pragma once

namespace zt {
namespace fnd {
namespace osdep {

// Blocks the calling thread for at least this time; a signal does not cut it short.
void Sleep(unsigned int ms);

}  // namespace osdep
}  // namespace fnd
}  // namespace zt
