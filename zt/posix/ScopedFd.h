#pragma once

#include <utility>

namespace zt::posix {

// Owner of a descriptor; -1 is none.
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
  int release() noexcept { return std::exchange(m_fd, -1); }

  // Closes the descriptor, once, whatever close() reports, and takes the other. Keeps errno.
  void reset(int fd = -1) noexcept;

 private:
  int m_fd;
};

}  // namespace zt::posix
