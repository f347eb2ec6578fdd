#pragma once

#include <sys/types.h>

#include <string>
#include <string_view>

// The files of logs (docs/log-format.md): whose they are, and which is the newest.
namespace admin {

// The process whose log has this name: "20260101_000000-vlTracer-0000530C.log". 0 for any other name.
pid_t ProcessOfLog(const std::string& name);

bool HasEnded(pid_t pid);

// Name of the newest log in the directory, of the process or, for 0, of any; empty if there is none.
std::string NewestLog(const std::string& directory, pid_t process);

// The last bytes of a text, from the beginning of a line on, that have at most so many lines.
std::string_view LastLines(std::string_view text, size_t count);

}  // namespace admin
