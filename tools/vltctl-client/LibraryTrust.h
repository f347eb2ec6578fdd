#pragma once

#include <sys/types.h>

#include <set>
#include <string>

// Whose code runs when a process loads a library: everybody who can decide what its path leads to.
namespace vltctl {

// Users other than root who can change the file, put another one in its place, or do so to a directory
// or link on the way.
struct Controllers {
  std::set<uid_t> users;
  // A path that more than the users above can change - every user, a group, those of an access control
  // list - or that cannot be examined. Empty if there is none.
  std::string shared;
  std::string reason;  // what is the matter with it
};

// Walks the absolute path from the top, through links. A path that ends early is judged as far as it
// goes: whoever controls that part can complete it. Never waits; opens nothing.
Controllers ControllersOf(const std::string& path);

// The same for all files that the loader tries for a component's file (Candidates.h).
Controllers ControllersOfLibrary(const std::string& file);

}  // namespace vltctl
