#include "tests/support/PrivateRoot.h"

#include <grp.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <system_error>

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

constexpr const char* kBelow = "/private-root";
constexpr const char* kOwn = "Library";  // never the machine's
constexpr uid_t kNobody = 65534;

[[noreturn]] void Fail(const char* what) {
  throw std::system_error(errno, std::generic_category(), what);
}

// Nothing that is mounted below `root` from here on may show outside. In a changed root directory
// "/" is often no mount point, and `root` is made one.
bool HideMounts(const std::string& root) {
  if (mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0) return true;
  return mount(root.c_str(), root.c_str(), nullptr, MS_BIND, nullptr) == 0 &&
         mount(nullptr, root.c_str(), nullptr, MS_PRIVATE, nullptr) == 0;
}

void BindAll(const std::string& root) {
  for (const auto& entry : fs::directory_iterator("/")) {
    std::string name = entry.path().filename();
    if (name == kOwn) continue;
    std::string target = root + "/" + name;
    if (entry.is_symlink()) {
      fs::copy_symlink(entry.path(), target);
    } else if (entry.is_directory()) {
      fs::create_directory(target);
      if (mount(entry.path().c_str(), target.c_str(), nullptr, MS_BIND | MS_REC, nullptr) != 0) {
        Fail("mount");
      }
    }
  }
}

// The superuser of a user name space without other users is an ordinary one in a name space within.
bool RenameUser() {
  if (unshare(CLONE_NEWUSER) != 0) return false;
  const std::string map = std::to_string(kNobody) + " 0 1";
  std::ofstream("/proc/self/setgroups") << "deny";
  std::ofstream("/proc/self/gid_map") << map;
  std::ofstream("/proc/self/uid_map") << map;
  return getuid() == kNobody && getgid() == kNobody;
}

}  // namespace

bool EnterPrivateRoot(const std::string& place) {
  std::string root = place + kBelow;
  std::string here = fs::current_path();
  if (unshare(CLONE_NEWNS) != 0) return false;
  fs::create_directory(root);
  if (!HideMounts(root)) {
    LeavePrivateRoot(place);
    rmdir(root.c_str());
    return false;
  }
  BindAll(root);
  // What was bound may be of a group that shows outside. Where `root` is no mount point, all is
  // private.
  mount(nullptr, root.c_str(), nullptr, MS_REC | MS_PRIVATE, nullptr);
  if (chroot(root.c_str()) != 0 || chdir(here.c_str()) != 0) Fail("chroot");
  return true;
}

void LeavePrivateRoot(const std::string& place) {
  umount2((place + kBelow).c_str(), MNT_DETACH | UMOUNT_NOFOLLOW);
}

bool HasOtherUsers(const std::string& place) {
  return chown(place.c_str(), kNobody, kNobody) == 0 && chown(place.c_str(), 0, 0) == 0;
}

bool BecomeOrdinaryUser(const std::string& place) {
  if (!HasOtherUsers(place)) return RenameUser();
  std::error_code failed;
  for (const auto& entry : fs::recursive_directory_iterator(place, failed)) {
    if (lchown(entry.path().c_str(), kNobody, kNobody) != 0) return false;
  }
  return !failed && chown(place.c_str(), kNobody, kNobody) == 0 && setgroups(0, nullptr) == 0 &&
         setresgid(kNobody, kNobody, kNobody) == 0 && setresuid(kNobody, kNobody, kNobody) == 0;
}

bool AllMayEnter(const std::string& path) {
  for (fs::path place = path; place != place.root_path(); place = place.parent_path()) {
    if ((fs::status(place).permissions() & fs::perms::others_exec) == fs::perms::none) return false;
  }
  return true;
}

}  // namespace vlt::test
