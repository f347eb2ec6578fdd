#pragma once

#include <string>

namespace vlt::test {

// Gives the calling process, and those it starts, a root directory of its own: everything of the
// machine is there at its place, but what is made in "/" itself - "/Library", say, where the library
// keeps the superuser's logs - is made below `place`. Only for the superuser; needs the right to
// mount, in a name space of its own. False, and nothing changed, without it; throws when it fails half
// way, and the process must then end: what it sees below `place` may be the machine itself.
bool EnterPrivateRoot(const std::string& place);

// Removes what EnterPrivateRoot made, once the process has ended. Never descends into what was
// mounted.
void RemovePrivateRoot(const std::string& place);

// Makes the superuser an ordinary user who owns `place`.
bool BecomeOrdinaryUser(const std::string& place);

}  // namespace vlt::test
