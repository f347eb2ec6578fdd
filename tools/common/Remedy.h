#pragma once

#include <string>

namespace vltctl {

// What to do, with "--root DIR" added to each quoted command of this program that is to be run there, such
// as "vltctl verify". The directory is quoted for a shell. Commands that take no --root stay as they are,
// and all do if `root` is empty.
std::string RemedyAt(const std::string& root, const std::string& text);

}  // namespace vltctl
