#pragma once

#include <sys/types.h>

#include <utility>

#include "zt/fnd/StringFwd.h"

namespace zt {
namespace fnd {
namespace osdep {

// Owner of a descriptor that a forked child does not keep (O_CLOFORK, which Linux lacks).
//
// A lock of flock() belongs to the open file, which a child of fork() shares: as long as the child
// lives, the lock of a parent that was killed would last. The descriptor is closed in the child
// before fork() returns there, which leaves the parent's lock alone, and the child's copy of the
// object then owns nothing, whatever has got the number since. A process that was made without
// fork()'s handlers keeps the descriptor. Threads: one at a time; any may fork.
class CloseOnForkFd {
 public:
  CloseOnForkFd() noexcept = default;  // none
  CloseOnForkFd(CloseOnForkFd&& other) noexcept;
  CloseOnForkFd& operator=(CloseOnForkFd&& other) noexcept;
  ~CloseOnForkFd() { reset(); }

  // CreateSharedUnixFile. No fork gets hold of the descriptor while it is being opened. Throws what
  // that throws, and std::bad_alloc.
  static CloseOnForkFd OpenShared(const AnsiString& path);

  int get() const noexcept { return m_fd; }
  bool valid() const noexcept { return m_fd >= 0; }

  // Whether a child keeps its copy from here on, and owns it.
  void keepOnFork(bool keep) noexcept;

  // Closes what this process owns, once. Keeps errno.
  void reset() noexcept;

 private:
  CloseOnForkFd(int fd, pid_t pid) noexcept : m_fd(fd), m_pid(pid) {}

  int m_fd = -1;
  pid_t m_pid = 0;
  bool m_kept = false;
};

}  // namespace osdep
}  // namespace fnd
}  // namespace zt
