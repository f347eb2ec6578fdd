#pragma once

#include <cstdint>

#include "zt/fnd/String.h"
#include "zt/fnd/Vector.h"

namespace zt::fnd::osdep {

// Lists the entries of one directory whose names fit a mask.
//
// The mask is a directory, a separator and a pattern; both "/" and "\" separate. Without a
// separator the directory is ".". A mask that ends in one lists nothing. In the pattern "*" stands
// for any run of characters and "?" for one; the rest compares without case. The result holds the
// directory, "/" and the name, in the order in which the system lists them. Threads: any.
class FindFiles {
 public:
  enum class FindFlags : uint32_t {
    None = 0,
    Hidden = 1,       // names that begin with "." too, but never "." and ".."
    Directories = 2,  // directories only, ending in "/"; a relative mask then finds nothing
    FollowLinks = 4,  // the text of a symbolic link in place of its path
    DotEntries = 8,   // directory + "/." and directory + "/.." at the end, whatever the pattern
  };
  friend constexpr FindFlags operator|(FindFlags a, FindFlags b) {
    return static_cast<FindFlags>(static_cast<uint32_t>(a) | static_cast<uint32_t>(b));
  }

  // Without flags a directory that cannot be listed gives an empty list; with them it throws
  // PosixError.
  Vector<String> getFilenames(const String& mask);
  Vector<String> getFilenames(const String& mask, FindFlags flags);
};

// The rule for patterns. Takes no more steps than the product of the two lengths.
bool WildcardFit(const wchar_t* pattern, const wchar_t* name);

}  // namespace zt::fnd::osdep
