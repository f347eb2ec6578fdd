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

// The locks of the machine at the moment of construction; none where there is no /proc.
class LockTable {
 public:
  LockTable();

  // The processes that took the locks on the file; empty if it is not locked. Opens and locks nothing. A
  // file system that hides its files' devices from /proc/locks is seen through by the descriptors of the
  // process, as far as they may be read.
  std::vector<Process> holders(const std::string& file) const;

 private:
  struct Lock {
    pid_t pid;
    unsigned major, minor;
    unsigned long long inode;
  };
  std::vector<Lock> m_locks;
};

// "vltctl (pid 12)", or "process 12" where the name cannot be read.
std::string NameOf(const Process& process);

// "held by vltctl (pid 12)", or "held by another process" where that cannot be said.
std::string HeldBy(const std::vector<Process>& holders);

}  // namespace vltctl
