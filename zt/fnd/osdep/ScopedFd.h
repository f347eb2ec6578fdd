#pragma once

#include "zt/posix/ScopedFd.h"

namespace zt {
namespace fnd {
namespace osdep {

using zt::posix::ScopedFd;

// flock() without EINTR: 0, or -1 with errno.
int Flock(int fd, int operation) noexcept;

}  // namespace osdep
}  // namespace fnd
}  // namespace zt
