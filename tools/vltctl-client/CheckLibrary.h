#pragma once

#include <sys/types.h>

#include <string>

#include "tools/common/Verdict.h"
#include "tools/vltctl-client/Component.h"

// What is to be seen of one component's library in the process that loads it.
namespace vltctl {

// Loads the component's library as a client of it would, looks for its entry point, and unloads it.
// Whatever the library does to its process, it does to this one. A relative path is never loaded: it
// would begin in the present directory.
Verdict CheckLibrary(const Component& component);

// Whether a check has to load anything at all: not the dictionary that the library itself is.
bool HasLibrary(const Component& component);

// Adds what vltCheckComponent says of the component to the notes; this process must have the
// registrar's lock or be able to wait for it.
void AddLibrarysWords(const Component& component, Verdict* verdict);

// Before root loads a library that another user can put there, it becomes that user: a process that
// shares nothing with the terminal and the files of the command but *fd. Empty, or why the library must
// not be loaded.
std::string PrepareToLoad(const Component& component, int* fd);

// Whether PrepareToLoad makes the process another user's, for good.
bool NeedsOtherUser(const Component& component);

}  // namespace vltctl
