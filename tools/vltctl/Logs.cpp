#include "tools/vltctl/Logs.h"

#include <errno.h>
#include <signal.h>
#include <stdint.h>
#include <stdlib.h>
#include <string.h>

#include <algorithm>
#include <filesystem>
#include <system_error>

namespace admin {

namespace fs = std::filesystem;

pid_t ProcessOfLog(const std::string& name) {
  constexpr const char* kMark = "-vlTracer-";
  size_t mark = name.find(kMark);
  if (mark == std::string::npos || !name.ends_with(".log")) return 0;
  std::string digits = name.substr(mark + strlen(kMark), 8);
  char* end = nullptr;
  unsigned long pid = strtoul(digits.c_str(), &end, 16);
  return *end == 0 && pid <= INT32_MAX ? static_cast<pid_t>(pid) : 0;
}

bool HasEnded(pid_t pid) { return kill(pid, 0) != 0 && errno == ESRCH; }

// Names begin with the time of the start, so that the last one is the newest. Other users can put pipes,
// devices and links there by such a name; only a regular file is a log.
std::string NewestLog(const std::string& directory, pid_t process) {
  std::string newest;
  std::error_code missing;
  for (fs::directory_iterator entry(directory, missing), end; !missing && entry != end;
       entry.increment(missing)) {
    std::string name = entry->path().filename();
    pid_t owner = ProcessOfLog(name);
    std::error_code gone;
    bool isMeant = owner != 0 && (process == 0 || owner == process);
    if (isMeant && fs::is_regular_file(entry->symlink_status(gone)))
      newest = std::max(newest, name);
  }
  return newest;
}

std::string_view LastLines(std::string_view text, size_t count) {
  size_t at = text.size();
  if (text.ends_with('\n')) --at;
  for (; count > 0 && at != std::string_view::npos; --count) {
    at = at == 0 ? std::string_view::npos : text.rfind('\n', at - 1);
  }
  return at == std::string_view::npos ? text : text.substr(at + 1);
}

}  // namespace admin
