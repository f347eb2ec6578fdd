#pragma once

#include <string>
#include <vector>

namespace vltctl {

// The files that the library's loader tries for a component's file, in its order (zt/fnd/osdep/
// SharedLibrary.h and Bundle.h): inside a directory "X.framework" the first of libX.so, X.so and X that
// loads; for a name without a dot those of "X.framework" and "X.bundle", then libX.so beside it.
std::vector<std::string> LibraryCandidates(const std::string& file);

}  // namespace vltctl
