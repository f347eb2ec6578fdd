#pragma once

#include <ostream>

#include "tests/support/Child.h"

// Forks of a process whose other threads are busy.
namespace vlt::test {

struct ForkStorm {
  int children = 0;
  int hung = 0;    // that slept and did nothing for five seconds, or ran for a minute; killed
  int failed = 0;  // that ended otherwise than with 0
};

// While two threads run `busy` again and again, forks as many children as there is time for (2,000
// with VLT_FULL), and has each run `once`, which is true for a good result. Ends early after three
// hung ones.
ForkStorm RunForkStorm(const std::function<void()>& busy, const std::function<bool()>& once,
                       int budgetMs = 1500);

std::ostream& operator<<(std::ostream& out, const ForkStorm& storm);

}  // namespace vlt::test
