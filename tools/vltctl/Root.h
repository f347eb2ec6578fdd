#pragma once

#include <string>

#include "tools/common/Arguments.h"

// The installation that a command is about: the one in force, or that of --root, which may be the image
// of another machine's.
namespace admin {

// Takes --root for the installation of this process, if it was given. Comes before every other function
// of this program. Throws a Failure: there is no such directory, unless it is awaited, or a link in it
// leads out of it.
enum class MissingRoot { Failure, Awaited };
void ChooseRoot(const vltctl::Arguments& arguments, MissingRoot missing = MissingRoot::Failure);

// Throws a Failure if --root was given and a link in it leads out of it by now: where it leads another
// machine has another file.
void ExpectNoWayOut();

// Whether --root was given. Then nothing of this machine counts but the files, and nothing is made that
// only a program in force makes.
bool HasChosenRoot();

// Absolute; empty where the preference "Dir" is.
std::string InstallDirectory();

}  // namespace admin
