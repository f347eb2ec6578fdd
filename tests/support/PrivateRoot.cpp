#include "tests/support/PrivateRoot.h"

#include <grp.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
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

}  // namespace

bool EnterPrivateRoot(const std::string& place) {
  std::string root = place + kBelow;
  std::string here = fs::current_path();
  if (unshare(CLONE_NEWNS) != 0) return false;
  // First of all: nothing that is mounted from here on may show outside.
  if (mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) Fail("mount");
  fs::create_directory(root);
  BindAll(root);
  if (chroot(root.c_str()) != 0 || chdir(here.c_str()) != 0) Fail("chroot");
  return true;
}

void RemovePrivateRoot(const std::string& place) {
  std::string root = place + kBelow;
  std::error_code ignored;
  fs::remove_all(root + "/" + kOwn, ignored);
  // One by one, and only what is empty: if a mount were still here, it would be the machine itself.
  for (fs::directory_iterator entry(root, ignored), end; !ignored && entry != end;
       entry.increment(ignored)) {
    if (entry->is_symlink(ignored)) {
      unlink(entry->path().c_str());
    } else {
      rmdir(entry->path().c_str());
    }
  }
  rmdir(root.c_str());
}

bool BecomeOrdinaryUser(const std::string& place) {
  std::error_code failed;
  for (const auto& entry : fs::recursive_directory_iterator(place, failed)) {
    if (lchown(entry.path().c_str(), kNobody, kNobody) != 0) return false;
  }
  return !failed && chown(place.c_str(), kNobody, kNobody) == 0 && setgroups(0, nullptr) == 0 &&
         setresgid(kNobody, kNobody, kNobody) == 0 && setresuid(kNobody, kNobody, kNobody) == 0;
}

}  // namespace vlt::test
