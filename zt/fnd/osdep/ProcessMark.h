#pragma once

#include <sys/types.h>

#include <atomic>

namespace zt::fnd::osdep {

// Distinguishes the process that an object belongs to from the children that it forks.
//
// The process id alone does not: the first processes of two name spaces both have 1, and one may
// be the other's child. So each fork() is counted in the child, before it returns there; the id
// distinguishes children that were made without the handlers of fork().
// Threads: any may ask while one changes the mark. What was written before a change is seen by
// whoever finds the mark current for it.
class ProcessMark {
 public:
  ProcessMark() noexcept = default;  // of no process
  ProcessMark(const ProcessMark& other) noexcept { *this = other; }
  ProcessMark& operator=(const ProcessMark& other) noexcept;

  // Of the calling process.
  static ProcessMark Current() noexcept;
  bool isCurrent() const noexcept;

 private:
  std::atomic<pid_t> m_pid{0};
  std::atomic<unsigned> m_generation{0};
};

}  // namespace zt::fnd::osdep
