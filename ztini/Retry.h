#pragma once

#include <cerrno>

namespace ztini {

// Repeats a system call for as long as a signal interrupts it.
template <class Call>
auto RetryEintr(Call call) {
  auto result = call();
  while (result == -1 && errno == EINTR) result = call();
  return result;
}

}  // namespace ztini
