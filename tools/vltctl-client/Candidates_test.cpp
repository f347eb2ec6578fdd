#include "tools/vltctl-client/Candidates.h"

#include <gtest/gtest.h>

namespace vltctl {
namespace {

using Paths = std::vector<std::string>;

TEST(Candidates, AreThoseOfTheLoader) {
  EXPECT_EQ(LibraryCandidates("/a/X.vle"),
            (Paths{"/a/X.vle/libX.so", "/a/X.vle/X.so", "/a/X.vle/X", "/a/X.vle"}));
  EXPECT_EQ(
      LibraryCandidates("/a.b/X"),
      (Paths{"/a.b/X.framework/libX.so", "/a.b/X.framework/X.so", "/a.b/X.framework/X",
             "/a.b/X.bundle/libX.so", "/a.b/X.bundle/X.so", "/a.b/X.bundle/X", "/a.b/libX.so"}));
  EXPECT_EQ(LibraryCandidates("X.so"), (Paths{"X.so/libX.so", "X.so/X.so", "X.so/X", "X.so"}));
  EXPECT_EQ(LibraryCandidates("/a/.vle"), (Paths{"/a/.vle"}));
}

}  // namespace
}  // namespace vltctl
