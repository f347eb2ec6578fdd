#pragma once

#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>
#include <utility>

#include "tests/support/Child.h"

// Processes that inherit the descriptors of one that is killed, and live on.
namespace vlt::test {

// A plain child of whoever calls fork(): says so, lives until it is asked to end, and ends.
class InheritingChild {
 public:
  // In the process that is to have it. Returns there only.
  void fork() const {
    if (::fork() != 0) return;
    m_forked.notify();
    m_end.await();
    _exit(0);
  }
  bool await() const { return m_forked.await(); }
  void end() const { m_end.notify(); }

 private:
  Signal m_forked, m_end;
};

// The same, as another program, started by exec.
class InheritingProgram {
 public:
  InheritingProgram() {
    Open(m_feed);
    Open(m_output);
  }
  ~InheritingProgram() {
    for (int fd : {m_feed[0], m_feed[1], m_output[0], m_output[1]}) close(fd);
  }
  InheritingProgram(const InheritingProgram&) = delete;
  InheritingProgram& operator=(const InheritingProgram&) = delete;

  void fork() const {
    if (::fork() != 0) return;
    dup2(m_feed[0], 0);
    dup2(m_output[1], 1);
    execlp("cat", "cat", static_cast<char*>(nullptr));
    _exit(1);
  }
  // Once the program runs.
  bool await() const { return echoes(); }
  // Whether it has lived until now; it ends then.
  bool end() {
    bool lives = echoes();
    close(std::exchange(m_feed[1], -1));
    return lives;
  }

 private:
  // Above the standard streams, without which the test may have been started.
  static void Open(int (&ends)[2]) {
    int made[2];
    if (pipe2(made, O_CLOEXEC) != 0) {
      throw std::system_error(errno, std::generic_category(), "pipe2");
    }
    for (int i : {0, 1}) {
      ends[i] = fcntl(made[i], F_DUPFD_CLOEXEC, STDERR_FILENO + 1);
      close(made[i]);
    }
  }

  bool echoes() const {
    char byte;
    pollfd output = {m_output[0], POLLIN, 0};
    return write(m_feed[1], "x", 1) == 1 && poll(&output, 1, kDeadlineMs) == 1 &&
           read(m_output[0], &byte, 1) == 1;
  }

  int m_feed[2], m_output[2];
};

}  // namespace vlt::test
