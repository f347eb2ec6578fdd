#pragma once

#include <cstdint>

#include "zt/fnd/StringFwd.h"
#include "zt/fnd/osdep/ProcessMark.h"
#include "zt/fnd/osdep/SharedUnixObject.h"

namespace zt::fnd::osdep {

// Owner of a descriptor that a forked child does not keep (O_CLOFORK, which Linux lacks).
//
// A lock of flock() belongs to the open file, which a child of fork() shares: as long as the child
// lives, the lock of a parent that was killed would last. The descriptor is closed in the child
// before fork() returns there, which leaves the parent's lock alone, and the child's copy of the
// object then owns nothing, whatever has got the number since. A process that was made without
// fork()'s handlers keeps the descriptor.
//
// The number of the descriptor is the host's to close, as daemons do with all they find. It is the
// object's only as long as it leads to the file that was opened, and no other object has got it:
// after that it is not used, closed or locked for this object, in this process or in a child.
// Threads: one at a time; any may fork.
class CloseOnForkFd {
 public:
  CloseOnForkFd() noexcept = default;  // none
  CloseOnForkFd(CloseOnForkFd&& other) noexcept;
  CloseOnForkFd& operator=(CloseOnForkFd&& other) noexcept;
  ~CloseOnForkFd() { reset(); }

  // CreateSharedUnixFile. No fork gets hold of the descriptor while it is being opened. Throws what
  // that throws, and std::bad_alloc.
  static CloseOnForkFd OpenShared(const AnsiString& path, InTheWay way = InTheWay::Refused);

  // Has fork() know of the descriptors before the first is opened; for those whose own handlers
  // must run before these.
  static void RegisterForkHandlers();

  // The descriptor; -1 for none, for one that the host has closed, and in a child that has no copy.
  // Asks the system each time. Keeps errno.
  int get() const noexcept;
  // Whether one was opened.
  bool valid() const noexcept { return m_fd >= 0; }
  const FileIdentity& identity() const noexcept { return m_file; }

  // Whether a child keeps its copy from here on, and owns it.
  void keepOnFork(bool keep) noexcept;

  // Closes what this process owns, once; no child of that moment keeps a copy. Keeps errno.
  void reset() noexcept;

 private:
  int m_fd = -1;
  uint64_t m_serial = 0;  // of the opening
  FileIdentity m_file;
  ProcessMark m_process;
  bool m_kept = false;
};

}  // namespace zt::fnd::osdep
