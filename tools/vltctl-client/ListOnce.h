#pragma once

#include <vector>

#include "tools/vltctl-client/Component.h"

namespace vltctl {

// All components, asked for in a process of its own, which ends before this returns: the registrar that
// it has, and with it the lock of the database, is not kept. Throws Failure.
std::vector<Component> ListOnce();

}  // namespace vltctl
