#pragma once

#include <optional>
#include <string>
#include <vector>

#include "tools/vltctl-client/Component.h"

// The component check, each component in a child process: a library that crashes, hangs or ends its
// process while it is loaded takes nothing else down. A component that is registered without a readable
// identifier is never sound: the library has no name for it.
namespace vltctl {

struct Finding {
  Component component;
  bool sound = false;
  std::vector<std::string> messages;  // the library's, as they are
  // The loader's own words, what the check raised, and what became of the child.
  std::vector<std::string> notes;
};

std::vector<Finding> CheckComponents(const Client& client, const std::optional<std::string>& guid);

}  // namespace vltctl
