#pragma once

#include <vector>

namespace vlt::test {

// From here on the sleeps of this process return at once, and are written down. It cannot be undone:
// for children only. False if the kernel does not allow it.
bool CatchSleeps();

// The sleeps so far, in milliseconds, as the kernel was asked for them; at most the first thousand.
std::vector<long long> CaughtSleeps();

}  // namespace vlt::test
