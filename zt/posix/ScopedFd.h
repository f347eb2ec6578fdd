#pragma once

#include <utility>

namespace zt::posix {

// Owner of a descriptor; -1 is none. The one place, with the classes that are built on it, where
// close() is called. Moves leave the source without one. Threads: one at a time.
class ScopedFd {
 public:
  explicit ScopedFd(int fd = -1) noexcept : m_fd(fd) {}
  ~ScopedFd() { reset(); }
  ScopedFd(ScopedFd&& other) noexcept : m_fd(other.release()) {}
  ScopedFd& operator=(ScopedFd&& other) noexcept {
    reset(other.release());
    return *this;
  }

  int get() const noexcept { return m_fd; }
  bool valid() const noexcept { return m_fd >= 0; }
  explicit operator bool() const noexcept { return valid(); }
  // The descriptor, which is the caller's from here on.
  int release() noexcept { return std::exchange(m_fd, -1); }

  // Closes the descriptor, once, whatever close() reports, and takes the other. Keeps errno.
  void reset(int fd = -1) noexcept;

 private:
  int m_fd;
};

}  // namespace zt::posix
