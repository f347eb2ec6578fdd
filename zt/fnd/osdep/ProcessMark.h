#pragma once

#include <atomic>
#include <cstdint>

namespace zt::fnd::osdep {

// Distinguishes the process that an object belongs to from the children that it forks.
//
// The process id does not: the first processes of two name spaces both have 1, and one may be the
// other's child. The mark is a number that the kernel takes out of each child's memory
// (MADV_WIPEONFORK), however the child was made, so asking costs no system call. On a kernel
// without that, each fork() is counted in the child before it returns there, and the process id
// distinguishes the children that were made without the handlers of fork().
//
// A child of vfork() shares its parent's memory and its marks, and may do nothing but exec or
// _exit. Threads: any may ask while one changes the mark. What was written before a change is seen
// by whoever finds the mark current for it.
class ProcessMark {
 public:
  ProcessMark() noexcept = default;  // of no process
  ProcessMark(const ProcessMark& other) noexcept { *this = other; }
  ProcessMark& operator=(const ProcessMark& other) noexcept;

  // Of the calling process.
  static ProcessMark Current() noexcept;
  bool isCurrent() const noexcept;

 private:
  std::atomic<uint64_t> m_number{0};
};

}  // namespace zt::fnd::osdep
