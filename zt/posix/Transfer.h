#pragma once

#include <sys/types.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstddef>

#include "zt/posix/Retry.h"

namespace zt::posix {

// Moves up to `sizeBytes` bytes by transfer(done, rest), which moves some of the rest as read() and
// write() do, with a count or -1 and errno. Short transfers go on where they ended, interrupted
// ones are made again, and no single one is asked for more than SSIZE_MAX, as POSIX leaves that
// undefined.
//
// Ends early where one moves nothing; errno is then that call's, or 0 for one that reported no
// failure: the end of the file. Returns how many were moved.
template <class Transfer>
size_t MoveAll(size_t sizeBytes, Transfer transfer) {
  size_t done = 0;
  while (done < sizeBytes) {
    size_t rest = std::min<size_t>(sizeBytes - done, SSIZE_MAX);
    ssize_t moved = RetryEintr([&] { return static_cast<ssize_t>(transfer(done, rest)); });
    if (moved == 0) errno = 0;
    if (moved <= 0) break;
    done += static_cast<size_t>(moved);
  }
  return done;
}

}  // namespace zt::posix
