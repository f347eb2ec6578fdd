#pragma once

#include <sys/types.h>

namespace vltctl {

// Turns the superuser's process for good into one of the user: groups, user and group ids, capabilities;
// programs with foreign rights give none back. Checks each of them afterwards. Returns null, or what
// could not be done; the process must then not run anything of the user's.
const char* DropRights(uid_t user);

// Cuts the process off from what its parent has open: the standard streams become /dev/null, all other
// descriptors but *keep, which is moved, are closed. Null, or what could not be done; *keep is open then,
// too. The terminal is left by setsid(), which is the caller's.
const char* DetachFromParent(int* keep);

}  // namespace vltctl
