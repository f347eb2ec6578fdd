#pragma once

#include <cerrno>

namespace zt::posix {

// Makes a system call again for as long as it reports -1 with EINTR; returns its last result, with
// errno as that call left it. Never for close(): the descriptor is gone even when it reports EINTR.
template <class Call>
auto RetryEintr(Call call) -> decltype(call()) {
  for (;;) {
    auto result = call();
    if (result != -1 || errno != EINTR) return result;
  }
}

}  // namespace zt::posix
