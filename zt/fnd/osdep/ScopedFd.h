#pragma once

#include <utility>

namespace zt {
namespace fnd {
namespace osdep {

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
  int release() noexcept { return std::exchange(m_fd, -1); }

  // Closes the descriptor, once, whatever close() says, and takes the other. Keeps errno.
  void reset(int fd = -1) noexcept;

 private:
  int m_fd;
};

// flock() without EINTR: 0, or -1 with errno.
int Flock(int fd, int operation) noexcept;

}  // namespace osdep
}  // namespace fnd
}  // namespace zt
