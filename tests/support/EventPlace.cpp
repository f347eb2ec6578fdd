#include "tests/support/EventPlace.h"

#include <gtest/gtest.h>
#include <sched.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/ipc.h>
#include <sys/mount.h>
#include <sys/sem.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <system_error>

#include "tests/support/TempDir.h"
#include "zt/fnd/ByteOrder.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

constexpr int kNotAllowed = 77;

bool EnterOwnIpc() {
  static const bool entered = unshare(CLONE_NEWIPC) == 0;
  return entered;
}

// Below the directory of the whole test program, which removes it.
const std::string& Base() {
  static const std::string base = [] {
    const char* root = getenv("TMPDIR");
    std::string path = std::string(root ? root : "/tmp") + "/events.XXXXXX";
    if (!mkdtemp(path.data())) abort();
    chmod(path.c_str(), 0777);
    return path;
  }();
  return base;
}

void RemoveSet(int id) {
  if (id >= 0) semctl(id, 0, IPC_RMID);
}

// A name space of mounts of which nothing shows outside.
bool EnterOwnMounts() {
  if (unshare(CLONE_NEWNS) != 0) return false;
  if (mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0) return true;
  // Below a changed root directory that cannot be said, but it may be so already.
  std::string mounts = ReadBytes("/proc/self/mountinfo");
  return mounts.find(" shared:") == std::string::npos;
}

}  // namespace

EventPlace::EventPlace() {
  EnterOwnIpc();
  setenv("ZTFNDTMPSHAREDFILEDIR", Base().c_str(), 1);
  clean();
}

EventPlace::~EventPlace() { clean(); }

void EventPlace::clean() const {
  for (const std::string& name : files()) {
    if (name.starts_with("sem_")) RemoveSet(SetOfFile(file(name)));
  }
  if (HasOwnIpc()) {
    seminfo info;
    int highest = semctl(0, 0, SEM_INFO, &info);
    semid_ds status;
    for (int index = 0; index <= highest; ++index) RemoveSet(semctl(index, 0, SEM_STAT, &status));
  }
  std::error_code ignored;
  fs::remove_all(Base() + "/namedEvent", ignored);
}

std::string EventPlace::file(const std::string& name) const {
  return Base() + "/namedEvent/" + name;
}

std::vector<std::string> EventPlace::files() const {
  std::vector<std::string> names;
  std::error_code ignored;
  for (fs::directory_iterator entry(Base() + "/namedEvent", ignored), end; !ignored && entry != end;
       entry.increment(ignored)) {
    names.push_back(entry->path().filename());
  }
  std::sort(names.begin(), names.end());
  return names;
}

EventPlace::Slot EventPlace::slotOf(const std::string& name) const {
  std::string bytes = ReadBytes(file(name));
  Slot slot = {};
  if (bytes.size() != 9) {
    ADD_FAILURE() << name << " has " << bytes.size() << " bytes";
    return slot;
  }
  const auto* at = reinterpret_cast<const unsigned char*>(bytes.data());
  slot.set = zt::fnd::little_endian::Get<uint32_t>(at + 1);
  slot.index = zt::fnd::little_endian::Get<uint32_t>(at + 5);
  return slot;
}

int EventPlace::SetOfFile(const std::string& stateFile) {
  key_t key = ftok(stateFile.c_str(), 1);
  return key == -1 ? -1 : SetOfKey(key);
}

int EventPlace::SetOfKey(key_t key) { return semget(key, 0, 0); }

int EventPlace::ValueOf(int set, unsigned slot) {
  return semctl(set, static_cast<int>(slot), GETVAL);
}

bool EventPlace::HasOwnIpc() { return EnterOwnIpc(); }

int EventPlace::CountSets() {
  if (!HasOwnIpc()) return -1;
  seminfo info = {};
  semctl(0, 0, SEM_INFO, &info);
  return info.semusz;
}

void Keeper::kill() {
  m_child.kill(SIGKILL);
  m_child.wait();
}

Allowed RunInOwnTmp(const std::string& options, const std::function<int()>& body, int* code) {
  Child child([&] {
    if (!EnterOwnMounts() || unshare(CLONE_NEWIPC) != 0 ||
        mount("tmpfs", "/tmp", "tmpfs", 0, options.c_str()) != 0 || chdir("/tmp") != 0) {
      return kNotAllowed;
    }
    setenv("ZTFNDTMPSHAREDFILEDIR", "/tmp/shared", 1);
    return body();
  });
  *code = child.wait();
  return *code == kNotAllowed ? Allowed::No : Allowed::Yes;
}

}  // namespace vlt::test
