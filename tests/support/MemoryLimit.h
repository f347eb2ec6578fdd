#pragma once

#include <sys/resource.h>
#include <unistd.h>

#include <cstddef>
#include <cstdio>
#include <cstdlib>

#include "tests/support/Sanitizer.h"

namespace vlt::test {

// Lets this process map only so many bytes more than it has now. For a child: there is no way back.
inline void LimitMemoryTo(unsigned long moreBytes) {
  unsigned long pages = 0;
  if (FILE* f = std::fopen("/proc/self/statm", "re")) {
    if (std::fscanf(f, "%lu", &pages) != 1) pages = 0;
    std::fclose(f);
  }
  rlimit limit;
  getrlimit(RLIMIT_AS, &limit);
  limit.rlim_cur = static_cast<rlim_t>(pages) * static_cast<rlim_t>(sysconf(_SC_PAGESIZE)) +
                   static_cast<rlim_t>(moreBytes);
  setrlimit(RLIMIT_AS, &limit);
}

// Takes what the heap can still give in blocks of this size, so that one more, or a larger one, fails.
// Under a limit only: what earlier tests of the process have freed would otherwise be used first, and
// the limit not be felt. For a child: the blocks are not given back.
inline void UseUpBlocksOf(std::size_t bytes) {
  // Volatile, as an allocation that is not used may be left out.
  for (void* volatile block = std::malloc(bytes); block != nullptr;) block = std::malloc(bytes);
}

}  // namespace vlt::test
