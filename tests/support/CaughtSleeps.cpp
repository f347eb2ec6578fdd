#include "tests/support/CaughtSleeps.h"

#include <signal.h>
#include <sys/syscall.h>
#include <ucontext.h>

#include <algorithm>
#include <array>
#include <cstddef>

#include "tests/support/FailSystemCall.h"

namespace vlt::test {
namespace {

#if defined(__x86_64__)
auto& FirstArgument(mcontext_t& context) { return context.gregs[REG_RDI]; }
auto& ThirdArgument(mcontext_t& context) { return context.gregs[REG_RDX]; }
auto& Result(mcontext_t& context) { return context.gregs[REG_RAX]; }
#elif defined(__i386__)
auto& FirstArgument(mcontext_t& context) { return context.gregs[REG_EBX]; }
auto& ThirdArgument(mcontext_t& context) { return context.gregs[REG_EDX]; }
auto& Result(mcontext_t& context) { return context.gregs[REG_EAX]; }
#elif defined(__aarch64__)
auto& FirstArgument(mcontext_t& context) { return context.regs[0]; }
auto& ThirdArgument(mcontext_t& context) { return context.regs[2]; }
auto& Result(mcontext_t& context) { return context.regs[0]; }
#elif defined(__arm__)
auto& FirstArgument(mcontext_t& context) { return context.arm_r0; }
auto& ThirdArgument(mcontext_t& context) { return context.arm_r2; }
auto& Result(mcontext_t& context) { return context.arm_r0; }
#elif defined(__s390x__)
auto& FirstArgument(mcontext_t& context) { return context.gregs[2]; }
auto& ThirdArgument(mcontext_t& context) { return context.gregs[4]; }
auto& Result(mcontext_t& context) { return context.gregs[2]; }
#endif

// The time of both calls, which serve sleeps below 68 years in 32-bit processes, too.
struct KernelTime {
  long seconds, nanoseconds;
};

std::array<long long, 1000> s_sleeps;
std::size_t s_count;

void OnSleep(int, siginfo_t* call, void* context) {
  mcontext_t& registers = static_cast<ucontext_t*>(context)->uc_mcontext;
  auto* time = reinterpret_cast<const KernelTime*>(
      call->si_syscall == SYS_nanosleep ? FirstArgument(registers) : ThirdArgument(registers));
  long long ms = time->seconds * 1000LL + time->nanoseconds / 1000000;
  if (s_count < s_sleeps.size()) s_sleeps[s_count++] = ms;
  Result(registers) = 0;
}

}  // namespace

bool CatchSleeps() {
  struct sigaction action = {};
  action.sa_sigaction = OnSleep;
  action.sa_flags = SA_SIGINFO;
  sigaction(SIGSYS, &action, nullptr);
  return TrapSystemCall(SYS_clock_nanosleep) && TrapSystemCall(SYS_nanosleep);
}

std::vector<long long> CaughtSleeps() {
  return std::vector<long long>(s_sleeps.begin(),
                                s_sleeps.begin() + static_cast<std::ptrdiff_t>(s_count));
}

}  // namespace vlt::test
