#pragma once

#include <sys/types.h>

#include <cstdint>
#include <functional>
#include <string>

namespace vlt::test {

// A system call of a traced process, as its tracer sees it.
struct SystemCall {
  long number;
  uint64_t args[6];
  long result;  // after the call only; -errno for a failure
  pid_t process;

  // The NUL-terminated text at that address of the process; empty if it cannot be read.
  std::string text(uint64_t address) const;
  // Its name, "openat"; its number for one that the table does not have.
  std::string name() const;
  // The path arguments, or the path of the descriptor in the first argument.
  std::string what() const;
};

// A forked copy of the test process that runs one function, and is stopped before and after each of its
// system calls. Much faster than a program under strace, and the calls may be judged one by one.
//
// The function's result is the exit code, without destructors of statics; an exception ends it with 99.
// It must not start threads or processes. The process dies with its tracer, and past the deadline.
class TracedChild {
 public:
  // Before a call: 0 lets it happen. An error number makes it fail, without having happened, but for
  // close(), which the kernel always does: that is done, and reports the error. kPretend: the call does
  // nothing, and reports success.
  static constexpr int kPretend = -1;
  using Before = std::function<int(const SystemCall&)>;
  // After a call that happened.
  using After = std::function<void(const SystemCall&)>;

  // Why the machine cannot do this; empty if it can.
  static std::string Missing();

  // Runs the function to its end. Returns the exit code, or 128 + signal; SIGALRM past the deadline.
  // Throws std::system_error where tracing fails.
  static int Run(const std::function<int()>& body, const Before& before, const After& after,
                 int deadlineSeconds = 30);
};

}  // namespace vlt::test
