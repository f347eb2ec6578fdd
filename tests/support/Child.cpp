#include "tests/support/Child.h"

#include <errno.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <exception>
#include <fstream>
#include <stdexcept>
#include <system_error>

#include "tests/support/Emulation.h"

// Of the coverage build only: writes the counters down, which _exit would lose.
extern "C" void __gcov_dump() __attribute__((weak));

namespace vlt::test {
namespace {

using Clock = std::chrono::steady_clock;

int LeftMs(Clock::time_point end) {
  auto left = std::chrono::duration_cast<std::chrono::milliseconds>(end - Clock::now()).count();
  return left > 0 ? static_cast<int>(left) : 0;
}

[[noreturn]] void Fail(const char* what) {
  throw std::system_error(errno, std::generic_category(), what);
}

int ExitCode(int status) {
  return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

void DieWithParent(pid_t parent) {
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  if (getppid() != parent) _exit(98);  // The parent went before the line above.
}

// Reaps the process if it ends in time.
bool ReapUntil(pid_t pid, Clock::time_point end, int* status) {
  for (;;) {
    pid_t got = waitpid(pid, status, WNOHANG);
    if (got == pid) return true;
    if (got < 0 && errno != EINTR) Fail("waitpid");
    if (Clock::now() >= end) return false;
    poll(nullptr, 0, 2);
  }
}

void KillAndReap(pid_t pid) {
  ::kill(pid, SIGKILL);
  int status;
  while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
  }
}

// Reads both pipes until their ends or the deadline.
void Drain(int out, int err, ProgramResult* result, Clock::time_point end) {
  pollfd fds[2] = {{out, POLLIN, 0}, {err, POLLIN, 0}};
  std::string* texts[2] = {&result->out, &result->err};
  char buffer[16384];
  while (fds[0].fd >= 0 || fds[1].fd >= 0) {
    int ready = poll(fds, 2, LeftMs(end));
    if (ready == 0) return;
    for (int i = 0; i < 2; ++i) {
      if (fds[i].fd < 0 || !fds[i].revents) continue;
      ssize_t got = read(fds[i].fd, buffer, sizeof buffer);
      if (got > 0) {
        texts[i]->append(buffer, static_cast<size_t>(got));
      } else {
        fds[i].fd = -1;
      }
    }
  }
}

}  // namespace

Child::Child(const std::function<int()>& body) : m_failures(std::make_unique<FailurePipe>()) {
  pid_t parent = getpid();
  fflush(nullptr);
  m_pid = fork();
  if (m_pid < 0) Fail("fork");
  if (m_pid > 0) return;
  DieWithParent(parent);
  m_failures->send();
  int code = 99;
  try {
    code = body();
  } catch (const std::exception& e) {
    fprintf(stderr, "child: %s\n", e.what());
  } catch (...) {
    fprintf(stderr, "child: exception of another kind\n");
  }
  fflush(nullptr);
  if (__gcov_dump) __gcov_dump();
  _exit(code);
}

Child::~Child() {
  if (m_pid <= 0) return;
  KillAndReap(m_pid);
  m_failures->receive();
}

void Child::kill(int signal) const {
  if (m_pid > 0) ::kill(m_pid, signal);
}

int Child::wait(int deadlineMs) {
  if (m_pid <= 0) return -1;
  int status = 0;
  bool ended = ReapUntil(m_pid, Clock::now() + std::chrono::milliseconds(deadlineMs), &status);
  if (!ended) {
    ADD_FAILURE() << "child " << m_pid << " still runs after " << deadlineMs << " ms";
    KillAndReap(m_pid);
  }
  m_failures->receive();
  m_pid = -1;
  return ended ? ExitCode(status) : -1;
}

bool Child::running() const {
  siginfo_t info = {};
  if (m_pid <= 0) return false;
  return waitid(P_PID, static_cast<id_t>(m_pid), &info, WEXITED | WNOHANG | WNOWAIT) == 0 &&
         info.si_pid == 0;
}

Signal::Signal() {
  if (pipe2(m_fds, O_CLOEXEC) != 0) Fail("pipe2");
}

Signal::~Signal() {
  close(m_fds[0]);
  close(m_fds[1]);
}

void Signal::notify() const {
  char word = 1;
  if (write(m_fds[1], &word, 1) != 1) Fail("write");
}

bool Signal::await(int deadlineMs) const {
  auto end = Clock::now() + std::chrono::milliseconds(deadlineMs);
  pollfd fd = {m_fds[0], POLLIN, 0};
  char word;
  while (poll(&fd, 1, LeftMs(end)) < 0) {
    if (errno != EINTR) Fail("poll");
  }
  return (fd.revents & POLLIN) && read(m_fds[0], &word, 1) == 1;
}

ProgramResult RunProgram(const std::vector<std::string>& argv, const Environment& extra,
                         int deadlineMs) {
  auto end = Clock::now() + std::chrono::milliseconds(deadlineMs);
  int out[2], err[2];
  if (pipe2(out, O_CLOEXEC) != 0 || pipe2(err, O_CLOEXEC) != 0) Fail("pipe2");
  std::vector<char*> args;
  for (const auto& arg : argv) args.push_back(const_cast<char*>(arg.c_str()));
  args.push_back(nullptr);
  pid_t parent = getpid();
  pid_t pid = fork();
  if (pid < 0) Fail("fork");
  if (pid == 0) {
    DieWithParent(parent);
    for (const auto& [name, value] : extra) setenv(name.c_str(), value.c_str(), 1);
    int null = open("/dev/null", O_RDONLY);
    dup2(null, 0);
    dup2(out[1], 1);
    dup2(err[1], 2);
    execvp(args[0], args.data());
    _exit(127);
  }
  close(out[1]);
  close(err[1]);
  ProgramResult result = {-1, "", ""};
  Drain(out[0], err[0], &result, end);
  close(out[0]);
  close(err[0]);
  int status = 0;
  if (ReapUntil(pid, end, &status)) {
    result.exitCode = ExitCode(status);
  } else {
    ADD_FAILURE() << argv[0] << " still runs after " << deadlineMs << " ms";
    KillAndReap(pid);
  }
  return result;
}

bool Eventually(const std::function<bool()>& condition, int deadlineMs) {
  auto end = Clock::now() + std::chrono::milliseconds(deadlineMs);
  while (!condition()) {
    if (Clock::now() >= end) return false;
    poll(nullptr, 0, 1);
  }
  return true;
}

bool BlockedIn(pid_t pid, long systemCallNumber) {
  std::ifstream in("/proc/" + std::to_string(pid) + "/syscall");
  long number = -1;
  return in >> number && number == NumberInProc(systemCallNumber);
}

}  // namespace vlt::test
