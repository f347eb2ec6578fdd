#pragma once

#include <functional>
#include <vector>

#include "tools/vltctl-client/CheckLibrary.h"
#include "tools/vltctl-client/Component.h"

// The component check in child processes: a library that crashes, hangs or ends its process while it is
// loaded takes nothing else down.
//
// As many children run as there are processors. Each loads many libraries, one after the other, until
// one is found not sound; that one and all that the child still had to do are then checked in a process
// each, so that what a library has done to its process is not another one's fault.
namespace vltctl {

struct CheckOptions {
  bool asksLibrary = false;  // vltCheckComponent's words are notes
};

// Calls `done` for each component in the order given, as soon as it and all before it are known.
// Throws std::system_error where no child can be started.
void CheckComponents(const std::vector<Component>& components, const CheckOptions& options,
                     const std::function<void(const Component&, const Verdict&)>& done);

}  // namespace vltctl
