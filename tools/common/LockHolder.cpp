#include "tools/common/LockHolder.h"

#include <stdio.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

#include <filesystem>
#include <fstream>
#include <system_error>

namespace vltctl {
namespace {

bool HasOpen(pid_t pid, const struct stat& file) {
  std::error_code hidden;
  std::filesystem::directory_iterator fd("/proc/" + std::to_string(pid) + "/fd", hidden), end;
  for (; !hidden && fd != end; fd.increment(hidden)) {
    struct stat info;
    if (stat(fd->path().c_str(), &info) != 0) continue;
    if (info.st_dev == file.st_dev && info.st_ino == file.st_ino) return true;
  }
  return false;
}

// The program's name; where another user's may not be seen, what the process calls itself.
std::string CommandOf(pid_t pid) {
  std::string place = "/proc/" + std::to_string(pid), command;
  std::error_code hidden;
  command = std::filesystem::read_symlink(place + "/exe", hidden).filename();
  if (!hidden) return command;
  std::ifstream in(place + "/comm");
  std::getline(in, command);
  return command;
}

}  // namespace

// "1: FLOCK  ADVISORY  WRITE 25983 fe:00:10970436 0 EOF". Those that wait have "->" before the kind.
LockTable::LockTable() {
  std::ifstream locks("/proc/locks");
  for (std::string line; std::getline(locks, line);) {
    Lock lock;
    bool isLock = sscanf(line.c_str(), "%*d: FLOCK %*s %*s %d %x:%x:%llu", &lock.pid, &lock.major,
                         &lock.minor, &lock.inode) == 4;
    if (isLock) m_locks.push_back(lock);
  }
}

std::vector<Process> LockTable::holders(const std::string& file) const {
  std::vector<Process> holders;
  struct stat info;
  if (stat(file.c_str(), &info) != 0) return holders;
  for (const Lock& lock : m_locks) {
    if (lock.inode != info.st_ino) continue;
    bool isDevice = lock.major == major(info.st_dev) && lock.minor == minor(info.st_dev);
    if (isDevice || HasOpen(lock.pid, info)) holders.push_back({lock.pid, CommandOf(lock.pid)});
  }
  return holders;
}

std::string NameOf(const Process& process) {
  std::string pid = std::to_string(process.pid);
  return process.command.empty() ? "process " + pid : process.command + " (pid " + pid + ")";
}

std::string HeldBy(const std::vector<Process>& holders) {
  std::string names;
  for (const Process& holder : holders) names += (names.empty() ? "" : ", ") + NameOf(holder);
  return "held by " + (names.empty() ? "another process" : names);
}

}  // namespace vltctl
