#pragma once

#include <optional>
#include <string>
#include <vector>

#include "tools/vltctl/Component.h"

// The component check, each component in a child process: a library that crashes, hangs or ends its
// process while it is loaded takes nothing else down.
namespace vltctl {

struct Finding {
  Component component;
  bool sound = false;
  std::vector<std::string> messages;  // the library's, as they stand
  std::vector<std::string> notes;     // the loader's own words, and what became of the child
};

std::vector<Finding> CheckComponents(const Client& client, const std::optional<std::string>& guid);

}  // namespace vltctl
