// locks: the named locks and events of the machine, who holds them, and how old they are.
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "tools/common/LockHolder.h"
#include "tools/vltctl/Logs.h"
#include "tools/vltctl/Reading.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/SharedUnixObject.h"
#include "zt/posix/Files.h"

namespace admin {
namespace {

namespace fs = std::filesystem;
using zt::posix::ScopedFd;

struct Lock {
  std::string name, file;
  const char* kind;  // "lock", "log" or "event"
  time_t ageSeconds;
  std::vector<vltctl::Process> holders;
};

std::vector<Lock> LocksIn(const std::string& directory, const char* kind,
                          const vltctl::LockTable& table) {
  std::vector<Lock> locks;
  std::error_code missing;
  for (fs::directory_iterator entry(directory, missing), end; !missing && entry != end;
       entry.increment(missing)) {
    std::string name = entry->path().filename(), file = directory + "/" + name;
    struct stat info;
    if (lstat(file.c_str(), &info) != 0 || !S_ISREG(info.st_mode)) continue;
    locks.push_back({name, file, ProcessOfLog(name) ? "log" : kind, time(nullptr) - info.st_mtime,
                     table.holders(file)});
  }
  std::sort(locks.begin(), locks.end(),
            [](const Lock& a, const Lock& b) { return a.name < b.name; });
  return locks;
}

std::string Age(time_t seconds) {
  if (seconds < 60) return std::to_string(seconds) + " s";
  if (seconds < 3600) return std::to_string(seconds / 60) + " min";
  if (seconds < 86400) return std::to_string(seconds / 3600) + " h";
  return std::to_string(seconds / 86400) + " d";
}

// Of a process that has ended, and locked by none. The library makes a lock file that is gone again.
bool IsLeftOver(const Lock& lock) {
  pid_t pid = ProcessOfLog(lock.name);
  return pid != 0 && lock.holders.empty() && HasEnded(pid);
}

// Removes the file while its lock is held here, so that no process has it at that moment.
bool Remove(const std::string& file) {
  ScopedFd fd = zt::posix::OpenExisting(file.c_str(), O_RDWR, zt::posix::Kind::File,
                                        zt::posix::LastLink::Refused);
  return fd && zt::posix::Flock(fd.get(), LOCK_EX | LOCK_NB) == 0 &&
         zt::posix::Unlink(file.c_str()) == 0;
}

void Show(const Lock& lock, vltctl::Table* table, Output& output) {
  vltctl::Json holders = vltctl::Json::array();
  for (const vltctl::Process& process : lock.holders) {
    holders.push_back({{"pid", process.pid}, {"command", process.command}});
  }
  output.item({{"name", lock.name},
               {"kind", lock.kind},
               {"file", lock.file},
               {"ageSeconds", lock.ageSeconds},
               {"holders", holders}});
  table->add({lock.kind, lock.name, Age(lock.ageSeconds),
              lock.holders.empty() ? "free" : vltctl::HeldBy(lock.holders)});
}

std::string Count(size_t count, const char* one, const char* many) {
  return std::to_string(count) + " " + (count == 1 ? one : many);
}

}  // namespace

int Locks(const Arguments& arguments, Output& output) {
  const std::string base = zt::fnd::AnsiString(zt::fnd::osdep::GetSharedUnixBase()).c_str();
  vltctl::LockTable held;
  std::vector<Lock> locks = LocksIn(base + "/mutex", "lock", held);
  std::vector<Lock> events = LocksIn(base + "/namedEvent", "event", held);
  locks.insert(locks.end(), events.begin(), events.end());
  bool sweeps = arguments.has("--sweep");
  size_t leftOver = 0, removed = 0;
  vltctl::Table table;
  for (const Lock& lock : locks) {
    if (!IsLeftOver(lock)) {
      Show(lock, &table, output);
      continue;
    }
    ++leftOver;
    if (sweeps && Remove(lock.file)) ++removed;
  }
  output.print(table);
  if (sweeps) {
    output.note("removed " + Count(removed, "lock of a log", "locks of logs") + " in " + base +
                "/mutex");
    return removed == leftOver ? vltctl::kGood : vltctl::kNotFound;
  }
  if (leftOver > 0) {
    output.note(Count(leftOver, "lock of a log whose process has ended is",
                      "locks of logs whose processes have ended are") +
                " not shown; \"vltctl locks --sweep\" removes them");
  }
  return vltctl::kGood;
}

}  // namespace admin
