#pragma once

#include <cerrno>

#include "zt/posix/Retry.h"

namespace zt {
namespace fnd {
namespace osdep {

using zt::posix::RetryEintr;

}  // namespace osdep
}  // namespace fnd
}  // namespace zt
