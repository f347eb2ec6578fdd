#pragma once

namespace storm {

// Kills processes while they hold a named mutex and have a forked child and one that runs another
// program. The next process has to get the mutex although both children live. Prints the longest
// wait. True if it got in each time.
bool RunMutexDeath(unsigned kills);

}  // namespace storm
