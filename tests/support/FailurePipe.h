#pragma once

namespace vlt::test {

// Brings the failed expectations of a child process to its parent, with file, line and text. Skips
// too, so that a test whose child skips is skipped.
//
// Made before the fork. A full pipe never blocks the child: what does not fit is printed by the child
// instead. One process writes at a time, or several: a record is one write, cut at PIPE_BUF bytes.
class FailurePipe {
 public:
  // Throws std::system_error if there is no pipe.
  FailurePipe();
  ~FailurePipe();
  FailurePipe(const FailurePipe&) = delete;
  FailurePipe& operator=(const FailurePipe&) = delete;

  // In the child, once: from here on its failures go into the pipe, and are not printed.
  void send() const;

  // In the parent: makes what has arrived so far failures of the running test. Does not wait.
  void receive() const;

 private:
  int m_read, m_write;
};

}  // namespace vlt::test
