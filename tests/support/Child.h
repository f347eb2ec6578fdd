#pragma once

#include <sys/types.h>

#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "tests/support/FailurePipe.h"

namespace vlt::test {

inline constexpr int kDeadlineMs = 30000;

// A forked copy of the test process that runs one function.
//
// The child ends with the function's result as exit code, without running destructors of statics;
// an exception that leaves the function ends it with 99. A child that still runs when its object
// goes is killed by its id and reaped; it also dies with its parent. Its failed expectations become
// failures of the parent's test when it is waited for or killed.
class Child {
 public:
  explicit Child(const std::function<int()>& body);
  ~Child();
  Child(Child&& other) noexcept
      : m_failures(std::move(other.m_failures)), m_pid(std::exchange(other.m_pid, -1)) {}
  Child(const Child&) = delete;
  Child& operator=(const Child&) = delete;

  pid_t pid() const { return m_pid; }

  // Sends the signal to this child only.
  void kill(int signal) const;

  // Waits for the end. Returns the exit code, or 128 + signal. Past the deadline the test fails,
  // the child is killed, and the result is -1.
  int wait(int deadlineMs = kDeadlineMs);

  // True if the child has not ended yet.
  bool running() const;

 private:
  std::unique_ptr<FailurePipe> m_failures;
  pid_t m_pid;
};

// A word between processes: made before the fork, said on one side, awaited on the other.
class Signal {
 public:
  Signal();
  ~Signal();
  Signal(const Signal&) = delete;
  Signal& operator=(const Signal&) = delete;

  void notify() const;

  // Takes one notification; false if none came before the deadline.
  bool await(int deadlineMs = kDeadlineMs) const;

 private:
  int m_fds[2];
};

struct ProgramResult {
  int exitCode;  // 128 + signal when killed, -1 past the deadline
  std::string out, err;
};

using Environment = std::vector<std::pair<std::string, std::string>>;

// Runs argv[0] (searched in PATH) to its end, with the variables of `extra` set beside the present
// ones. Standard input is empty. Past the deadline the program is killed by its id and the test
// fails.
ProgramResult RunProgram(const std::vector<std::string>& argv, const Environment& extra = {},
                         int deadlineMs = kDeadlineMs);

// Waits until the condition holds, asking again and again; false past the deadline. For states of
// other processes that nothing announces (a child that blocks in a system call, say).
bool Eventually(const std::function<bool()>& condition, int deadlineMs = kDeadlineMs);

// True if the process sleeps in the system call of this number, as /proc reports it: its first thread,
// or the thread that has this id (tests/support/ThreadState.h).
bool BlockedIn(pid_t pid, long systemCallNumber);

}  // namespace vlt::test
