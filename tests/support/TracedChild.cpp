#include "tests/support/TracedChild.h"

#include <elf.h>
#include <signal.h>
#include <stdio.h>
#include <sys/prctl.h>
#include <sys/ptrace.h>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <sys/user.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstddef>
#include <exception>
#include <map>
#include <system_error>

namespace vlt::test {
namespace {

using Arguments = std::array<uint64_t, 6>;

#if defined(__x86_64__)
auto& NumberOf(user_regs_struct& r) { return r.orig_rax; }
auto& ResultOf(user_regs_struct& r) { return r.rax; }
Arguments ArgumentsOf(const user_regs_struct& r) {
  return {r.rdi, r.rsi, r.rdx, r.r10, r.r8, r.r9};
}
#elif defined(__i386__)
auto& NumberOf(user_regs_struct& r) { return r.orig_eax; }
auto& ResultOf(user_regs_struct& r) { return r.eax; }
Arguments ArgumentsOf(const user_regs_struct& r) {
  const auto word = [](long value) -> uint64_t { return static_cast<uint32_t>(value); };
  return {word(r.ebx), word(r.ecx), word(r.edx), word(r.esi), word(r.edi), word(r.ebp)};
}
#elif defined(__aarch64__)
auto& NumberOf(user_regs_struct& r) { return r.regs[8]; }
auto& ResultOf(user_regs_struct& r) { return r.regs[0]; }
Arguments ArgumentsOf(const user_regs_struct& r) {
  return {r.regs[0], r.regs[1], r.regs[2], r.regs[3], r.regs[4], r.regs[5]};
}
#else
// Not written for this processor: Missing() says so, and no process is traced.
#define VLT_UNKNOWN_REGISTERS 1
struct user_regs_struct {
  long number, result;
};
auto& NumberOf(user_regs_struct& r) { return r.number; }
auto& ResultOf(user_regs_struct& r) { return r.result; }
Arguments ArgumentsOf(const user_regs_struct&) { return {}; }
#endif

// The process, stopped at the entry of a call, then makes none: no call has the number -1. False if
// the process is gone.
#if defined(VLT_UNKNOWN_REGISTERS)
bool SkipCall(pid_t, user_regs_struct) { return false; }
#elif defined(__aarch64__)
bool SkipCall(pid_t process, user_regs_struct) {
  int number = -1;
  iovec data = {&number, sizeof number};
  return ptrace(PTRACE_SETREGSET, process, NT_ARM_SYSTEM_CALL, &data) == 0;
}
#else
bool SkipCall(pid_t process, user_regs_struct r) {
  NumberOf(r) = -1;
  return ptrace(PTRACE_SETREGS, process, nullptr, &r) == 0;
}
#endif

// What paths a call has: the numbers of its arguments, -1 for none.
struct Row {
  const char* name;
  int path, secondPath, descriptor;
};

const std::map<long, Row>& Rows() {
  static const std::map<long, Row> rows = {
#define VLT_ROW(name, path, second, descriptor)     \
  {                                                 \
    SYS_##name, { #name, path, second, descriptor } \
  }
      VLT_ROW(openat, 1, -1, -1),     VLT_ROW(read, -1, -1, 0),       VLT_ROW(pread64, -1, -1, 0),
      VLT_ROW(write, -1, -1, 0),      VLT_ROW(pwrite64, -1, -1, 0),   VLT_ROW(writev, -1, -1, 0),
      VLT_ROW(readv, -1, -1, 0),      VLT_ROW(close, -1, -1, 0),      VLT_ROW(fsync, -1, -1, 0),
      VLT_ROW(fdatasync, -1, -1, 0),  VLT_ROW(ftruncate, -1, -1, 0),  VLT_ROW(lseek, -1, -1, 0),
      VLT_ROW(fstat, -1, -1, 0),      VLT_ROW(statx, 1, -1, -1),      VLT_ROW(fcntl, -1, -1, 0),
      VLT_ROW(flock, -1, -1, 0),      VLT_ROW(fchmod, -1, -1, 0),     VLT_ROW(fchmodat, 1, -1, -1),
      VLT_ROW(fchownat, 1, -1, -1),   VLT_ROW(faccessat, 1, -1, -1),  VLT_ROW(renameat, 1, 3, -1),
      VLT_ROW(renameat2, 1, 3, -1),   VLT_ROW(linkat, 1, 3, -1),      VLT_ROW(unlinkat, 1, -1, -1),
      VLT_ROW(mkdirat, 1, -1, -1),    VLT_ROW(readlinkat, 1, -1, -1), VLT_ROW(symlinkat, 0, 2, -1),
      VLT_ROW(getdents64, -1, -1, 0), VLT_ROW(utimensat, 1, -1, -1),  VLT_ROW(fstatfs, -1, -1, 0),
      VLT_ROW(dup, -1, -1, 0),        VLT_ROW(dup3, -1, -1, 0),
#ifdef SYS_newfstatat
      VLT_ROW(newfstatat, 1, -1, -1),
#endif
#ifdef SYS_fstatat64
      VLT_ROW(fstatat64, 1, -1, -1),
#endif
#ifdef SYS_open
      VLT_ROW(open, 0, -1, -1),       VLT_ROW(stat, 0, -1, -1),       VLT_ROW(lstat, 0, -1, -1),
      VLT_ROW(access, 0, -1, -1),     VLT_ROW(rename, 0, 1, -1),      VLT_ROW(link, 0, 1, -1),
      VLT_ROW(unlink, 0, -1, -1),     VLT_ROW(mkdir, 0, -1, -1),      VLT_ROW(rmdir, 0, -1, -1),
      VLT_ROW(readlink, 0, -1, -1),   VLT_ROW(symlink, 0, 1, -1),     VLT_ROW(chmod, 0, -1, -1),
#endif
#undef VLT_ROW
  };
  return rows;
}

[[noreturn]] void Fail(const char* what) {
  throw std::system_error(errno, std::generic_category(), what);
}

[[noreturn]] void RunTraced(const std::function<int()>& body, pid_t tracer, int deadlineSeconds) {
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  if (getppid() != tracer || ptrace(PTRACE_TRACEME, 0, nullptr, nullptr) != 0) _exit(98);
  alarm(static_cast<unsigned>(deadlineSeconds));
  raise(SIGSTOP);
  int code = 99;
  try {
    code = body();
  } catch (...) {
    fprintf(stderr, "traced child: an exception left the function\n");
  }
  fflush(nullptr);
  _exit(code);
}

// The one process and the state of its present call.
class Tracer {
 public:
  Tracer(pid_t process, const TracedChild::Before& before, const TracedChild::After& after)
      : m_process(process), m_before(before), m_after(after) {}

  int run() {
    int status = next();
    if (!WIFSTOPPED(status)) return ExitCode(status);
    ptrace(PTRACE_SETOPTIONS, m_process, nullptr, PTRACE_O_TRACESYSGOOD | PTRACE_O_EXITKILL);
    int signal = 0;
    for (;;) {
      if (ptrace(PTRACE_SYSCALL, m_process, nullptr, signal) != 0 && errno != ESRCH) Fail("ptrace");
      status = next();
      if (!WIFSTOPPED(status)) return ExitCode(status);
      signal = 0;
      if (WSTOPSIG(status) == (SIGTRAP | 0x80)) {
        m_inside ? leave() : enter();
      } else {
        signal = WSTOPSIG(status);
      }
    }
  }

 private:
  static int ExitCode(int status) {
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
  }

  int next() const {
    int status = 0;
    while (waitpid(m_process, &status, __WALL) != m_process) {
      if (errno != EINTR) Fail("waitpid");
    }
    return status;
  }

  user_regs_struct registers() const {
    user_regs_struct registers;
    iovec data = {&registers, sizeof registers};
    if (ptrace(PTRACE_GETREGSET, m_process, NT_PRSTATUS, &data) != 0) Fail("PTRACE_GETREGSET");
    return registers;
  }

  void enter() {
    user_regs_struct r = registers();
    m_call = SystemCall{};
    m_call.process = m_process;
    m_call.number = static_cast<long>(NumberOf(r));
    const Arguments arguments = ArgumentsOf(r);
    std::copy(arguments.begin(), arguments.end(), m_call.args);
    m_inside = true;
    m_error = m_before ? m_before(m_call) : 0;
    if (m_error != 0 && m_call.number != SYS_close) {
      if (!SkipCall(m_process, r)) Fail("PTRACE_SETREGS");
    }
  }

  void leave() {
    m_inside = false;
    user_regs_struct r = registers();
    if (m_error != 0) {
      ResultOf(r) = m_error == TracedChild::kPretend ? 0 : -m_error;
      iovec data = {&r, sizeof r};
      if (ptrace(PTRACE_SETREGSET, m_process, NT_PRSTATUS, &data) != 0) Fail("PTRACE_SETREGSET");
      return;
    }
    m_call.result = static_cast<long>(ResultOf(r));
    if (m_after) m_after(m_call);
  }

  const pid_t m_process;
  const TracedChild::Before& m_before;
  const TracedChild::After& m_after;
  SystemCall m_call = {};
  bool m_inside = false;
  int m_error = 0;
};

}  // namespace

std::string SystemCall::text(uint64_t address) const {
  std::string found;
  char buffer[256];
  while (found.size() < PATH_MAX) {
    // Up to the end of a page only: what follows may not be there.
    size_t length = std::min<size_t>(sizeof buffer, 4096 - address % 4096);
    iovec local = {buffer, length}, remote = {reinterpret_cast<void*>(address), length};
    ssize_t got = process_vm_readv(process, &local, 1, &remote, 1, 0);
    if (got <= 0) return "";
    auto end = std::find(buffer, buffer + got, '\0');
    found.append(buffer, end);
    if (end != buffer + got) return found;
    address += static_cast<uint64_t>(got);
  }
  return found;
}

std::string SystemCall::name() const {
  auto row = Rows().find(number);
  return row == Rows().end() ? std::to_string(number) : row->second.name;
}

std::string SystemCall::what() const {
  auto row = Rows().find(number);
  if (row == Rows().end()) return "";
  const Row& r = row->second;
  auto descriptor = [&](uint64_t number) {
    char target[PATH_MAX];
    std::string link =
        "/proc/" + std::to_string(process) + "/fd/" + std::to_string(static_cast<int>(number));
    ssize_t length = readlink(link.c_str(), target, sizeof target);
    return length < 0 ? "" : std::string(target, static_cast<size_t>(length));
  };
  if (r.descriptor >= 0) return descriptor(args[r.descriptor]);
  std::string paths = text(args[r.path]);
  // With AT_EMPTY_PATH.
  if (paths.empty() && r.path == 1) return descriptor(args[0]);
  return r.secondPath < 0 ? paths : paths + " " + text(args[r.secondPath]);
}

std::string TracedChild::Missing() {
#ifdef VLT_UNKNOWN_REGISTERS
  return "system calls are traced on x86 and arm64 only";
#endif
  try {
    int calls = 0;
    int code = Run([] { return getppid() > 0 ? 0 : 1; },
                   [&](const SystemCall& call) {
                     calls += call.number == SYS_getppid;
                     return 0;
                   },
                   {});
    return code == 0 && calls > 0 ? "" : "processes cannot be traced here";
  } catch (const std::system_error& error) {
    return std::string("processes cannot be traced here: ") + error.what();
  }
}

int TracedChild::Run(const std::function<int()>& body, const Before& before, const After& after,
                     int deadlineSeconds) {
  pid_t tracer = getpid();
  fflush(nullptr);
  pid_t process = fork();
  if (process < 0) Fail("fork");
  if (process == 0) RunTraced(body, tracer, deadlineSeconds);
  try {
    return Tracer(process, before, after).run();
  } catch (...) {
    // The process is still there and unreaped, whatever went wrong: it must not stay.
    ::kill(process, SIGKILL);
    waitpid(process, nullptr, __WALL);
    throw;
  }
}

}  // namespace vlt::test
