#include "tests/support/FailSystemCall.h"

#include <linux/filter.h>
#include <linux/seccomp.h>
#include <sys/prctl.h>

#include <cstddef>

namespace vlt::test {

namespace {

bool AnswerSystemCall(long systemCallNumber, unsigned answer) {
  sock_filter program[] = {
      BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)),
      BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, static_cast<unsigned>(systemCallNumber), 0, 1),
      BPF_STMT(BPF_RET | BPF_K, answer),
      BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
  };
  sock_fprog filter = {sizeof program / sizeof program[0], program};
  return prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0 &&
         prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &filter) == 0;
}

}  // namespace

bool FailSystemCall(long systemCallNumber, int error) {
  return AnswerSystemCall(systemCallNumber, SECCOMP_RET_ERRNO | static_cast<unsigned>(error));
}

bool TrapSystemCall(long systemCallNumber) {
  return AnswerSystemCall(systemCallNumber, SECCOMP_RET_TRAP);
}

}  // namespace vlt::test
