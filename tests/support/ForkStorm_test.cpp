#include "tests/support/ForkStorm.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <unistd.h>

#include <chrono>

namespace vlt::test {
namespace {

void Idle() { poll(nullptr, 0, 1); }

// The limit of one child ends the storm.
ForkStorm StormOfOne(const std::function<bool()>& once) { return RunForkStorm(Idle, once, 1); }

TEST(ForkStorm, AChildThatWaitsIndefinitelyIsHung) {
  ForkStorm storm = StormOfOne([] { return pause() == 0; });
  EXPECT_EQ(storm.children, 1);
  EXPECT_EQ(storm.hung, 1);
}

TEST(ForkStorm, ASlowChildThatGetsOnIsNotHung) {
  ForkStorm storm = StormOfOne([] {
    auto end = std::chrono::steady_clock::now() + std::chrono::seconds(11);  // two intervals
    while (std::chrono::steady_clock::now() < end) poll(nullptr, 0, 100);
    return true;
  });
  EXPECT_EQ(storm.children, 1);
  EXPECT_EQ(storm.hung, 0);
  EXPECT_EQ(storm.failed, 0);
}

TEST(ForkStorm, AResultOfFalseIsAFailure) {
  ForkStorm storm = StormOfOne([] { return false; });
  EXPECT_EQ(storm.failed, storm.children);
}

}  // namespace
}  // namespace vlt::test
