#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

// Who has locked a file with flock, as the kernel shows it in /proc/locks.
namespace vltctl {

struct Process {
  pid_t pid;
  std::string command;  // empty if it cannot be read
};

// The processes that took the locks on the file; empty if it is not locked, and where there is no /proc.
// Opens and locks nothing. A file system that hides its files' devices from /proc/locks is seen through
// by the descriptors of the process, as far as they may be read.
std::vector<Process> LockHolders(const std::string& file);

// "vltctl (pid 12)", or "process 12" where the name cannot be read.
std::string NameOf(const Process& process);

// "held by vltctl (pid 12)", or "held by another process" where that cannot be said.
std::string HeldBy(const std::vector<Process>& holders);

}  // namespace vltctl
