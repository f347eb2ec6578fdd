#include "tools/vltctl-client/DropRights.h"

#include <fcntl.h>
#include <grp.h>
#include <linux/capability.h>
#include <pwd.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace vltctl {
namespace {

constexpr gid_t kNoGroup = 65534;
constexpr int kFirstBeyondStandard = 3;

struct Capabilities {
  __user_cap_header_struct head = {_LINUX_CAPABILITY_VERSION_3, 0};
  __user_cap_data_struct sets[_LINUX_CAPABILITY_U32S_3] = {};
};

// They go with the superuser's id by themselves, unless the process was started with "keep" bits.
bool DropCapabilities() {
  Capabilities none;
  return syscall(SYS_capset, &none.head, none.sets) == 0;
}

bool HasCapabilities() {
  Capabilities now;
  if (syscall(SYS_capget, &now.head, now.sets) != 0) return true;
  for (const auto& set : now.sets) {
    if (set.effective || set.permitted || set.inheritable) return true;
  }
  return false;
}

bool Is(uid_t user, gid_t group) {
  uid_t u[3];
  gid_t g[3];
  if (getresuid(&u[0], &u[1], &u[2]) != 0 || getresgid(&g[0], &g[1], &g[2]) != 0) return false;
  for (int i = 0; i < 3; ++i) {
    if (u[i] != user || g[i] != group) return false;
  }
  return getgroups(0, nullptr) == 0;
}

}  // namespace

const char* DropRights(uid_t user) {
  const passwd* entry = getpwuid(user);
  // The group of the file says nothing: a set-group-id directory gives it to whoever makes a file there.
  gid_t group = entry && entry->pw_gid != 0 ? entry->pw_gid : kNoGroup;
  if (setgroups(0, nullptr) != 0) return "the groups cannot be dropped";
  if (setresgid(group, group, group) != 0) return "the group cannot be taken on";
  if (setresuid(user, user, user) != 0) return "the user cannot be taken on";
  if (!DropCapabilities()) return "the capabilities cannot be dropped";
  if (prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) != 0) return "the way back cannot be barred";
  bool back = setuid(0) == 0 || setgid(0) == 0;
  if (back || !Is(user, group) || HasCapabilities()) return "rights of the superuser are left";
  return nullptr;
}

const char* DetachFromParent(int* keep) {
  int null = open("/dev/null", O_RDWR);
  if (null < 0) return "/dev/null cannot be opened";
  // Above all that is replaced below, so that neither dup2 closes the other's source.
  int moved = fcntl(*keep, F_DUPFD, kFirstBeyondStandard + 1);
  if (moved < 0) return "the pipe cannot be moved";
  for (int fd = 0; fd < kFirstBeyondStandard; ++fd) {
    if (dup2(null, fd) < 0) return "the standard streams cannot be replaced";
  }
  if (dup2(moved, kFirstBeyondStandard) < 0) return "the pipe cannot be moved";
  *keep = kFirstBeyondStandard;
  if (syscall(SYS_close_range, kFirstBeyondStandard + 1, ~0U, 0) != 0) {
    return "the open files cannot be closed";
  }
  return nullptr;
}

}  // namespace vltctl
