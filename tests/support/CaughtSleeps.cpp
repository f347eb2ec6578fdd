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
constexpr int kThirdArgument = REG_RDX, kResult = REG_RAX;
#else
constexpr int kThirdArgument = REG_EDX, kResult = REG_EAX;
#endif

// The time of SYS_clock_nanosleep, which serves sleeps below 68 years in 32-bit processes, too.
struct KernelTime {
  long seconds, nanoseconds;
};

std::array<long long, 1000> s_sleeps;
std::size_t s_count;

void OnSleep(int, siginfo_t*, void* context) {
  auto& registers = static_cast<ucontext_t*>(context)->uc_mcontext.gregs;
  auto* time = reinterpret_cast<const KernelTime*>(registers[kThirdArgument]);
  long long ms = time->seconds * 1000LL + time->nanoseconds / 1000000;
  if (s_count < s_sleeps.size()) s_sleeps[s_count++] = ms;
  registers[kResult] = 0;
}

}  // namespace

bool CatchSleeps() {
  struct sigaction action = {};
  action.sa_sigaction = OnSleep;
  action.sa_flags = SA_SIGINFO;
  sigaction(SIGSYS, &action, nullptr);
  return TrapSystemCall(SYS_clock_nanosleep);
}

std::vector<long long> CaughtSleeps() {
  return std::vector<long long>(s_sleeps.begin(),
                                s_sleeps.begin() + static_cast<std::ptrdiff_t>(s_count));
}

}  // namespace vlt::test
