#pragma once

#include <sys/resource.h>
#include <unistd.h>

#include <cstdio>

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

}  // namespace vlt::test
