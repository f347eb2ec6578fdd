#pragma once

#include <string>

namespace vlt::test {

// Gives the calling process, and those it starts, a root directory of its own: everything of the
// machine is there at its place, but what is made in "/" itself - "/Library", say, where the library
// keeps the superuser's logs - is made below `place`. Only for the superuser; needs the right to
// mount, in a name space of its own. False, and `place` as it was, without it; throws when it fails
// half way, and the process must then end: what it sees below `place` may be the machine itself.
bool EnterPrivateRoot(const std::string& place);

// For the parent of a process that called EnterPrivateRoot, once that has ended: takes away the
// mount that shows outside where "/" is no mount point. Its contents, directories that are empty by
// then, go with `place`.
void LeavePrivateRoot(const std::string& place);

// True if the superuser can give `place`, which is its own, to another user: a user name space may
// have no other.
bool HasOtherUsers(const std::string& place);

// Makes the superuser an ordinary user who owns `place`.
bool BecomeOrdinaryUser(const std::string& place);

// True if every user may enter the directories on the path.
bool AllMayEnter(const std::string& path);

}  // namespace vlt::test
