#pragma once

#include <chrono>
#include <map>
#include <string>

#include "zt/posix/ScopedFd.h"

// Waiting for changes in directories, until SIGINT or SIGTERM asks to end.
namespace admin {

class ChangeWatch {
 public:
  // From here on the two signals end a wait instead of the process. Throws a Failure where the system
  // has no more of what this needs.
  ChangeWatch();

  // Watches the entries of a directory, or the entry of that name alone. False if there is no directory.
  // Once added it stays so, until it is removed or renamed. Throws as the constructor does.
  bool add(const std::string& directory, const std::string& only = "");

  // The same, with the way to it: a directory that is missing now may come.
  bool addWithWay(const std::string& directory);

  enum class Woken { Changed, Signalled, Late };
  Woken wait(std::chrono::milliseconds longest);

  // Waits, after a change, until nothing has changed for a moment; for a bounded time. A save is then
  // one change.
  Woken settle();

 private:
  bool takeEvents();

  zt::posix::ScopedFd m_inotify, m_signals;
  std::map<int, std::string> m_only;  // by watch descriptor; empty for all entries
};

}  // namespace admin
