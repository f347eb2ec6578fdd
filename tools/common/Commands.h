#pragma once

#include <string_view>

// What vltctl and vltctl-client, which are one command to their user, have in common.
namespace vltctl {

enum ExitCode { kGood = 0, kNotFound = 1, kUsage = 2, kDataUnusable = 3 };

struct Command {
  const char *name, *summary;
};

// The commands that vltctl does itself, in the order of the help. It becomes vltctl-client for all
// others, and for the help, which lists both.
inline constexpr Command kFileCommands[] = {
    {"settings", "Each setting and where it comes from"},
    {"jar", "What server and clients have left each other"},
    {"verify", "A guarded file and its sidecar"},
    {"hook", "Fault injection: list, arm, clear"},
    {"trace", "Where the log of this user goes"},
    {"events", "Named events and who holds them"},
};

// Null if vltctl does not do the command of this name itself.
constexpr const char* SummaryOfFileCommand(std::string_view name) {
  for (const Command& command : kFileCommands) {
    if (name == command.name) return command.summary;
  }
  return nullptr;
}

}  // namespace vltctl
