#include "zt/posix/Environment.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>

#include "tests/support/Child.h"

namespace zt::posix {
namespace {

using vlt::test::Child;

TEST(Environment, AProgramWithItsCallersRightsHasTheVariables) {
  Child child([] {
    setenv("VLT_TEST_PLACE", "/place", 1);
    const char* value = TrustedEnvironment("VLT_TEST_PLACE");
    if (!value || value != std::string("/place")) return 1;
    return TrustedEnvironment("VLT_TEST_NOTHING") ? 2 : 0;
  });
  EXPECT_EQ(child.wait(), 0);
}

}  // namespace
}  // namespace zt::posix
