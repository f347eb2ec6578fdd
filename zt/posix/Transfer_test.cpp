#include "zt/posix/Transfer.h"

#include <gtest/gtest.h>

#include <vector>

namespace zt::posix {
namespace {

// One step of a transfer: what the call returns, with which errno.
struct Step {
  ssize_t result;
  int error;
};

struct Row {
  const char* what;
  std::vector<Step> steps;
  size_t moved;
  int error;  // of an early end
};

TEST(Transfer, MovesUntilAllIsMovedOrACallMovesNothing) {
  const Row rows[] = {
      {"in one call", {{10, 0}}, 10, EDOM},
      {"in parts", {{3, 0}, {6, 0}, {1, 0}}, 10, EDOM},
      {"interrupted", {{3, 0}, {-1, EINTR}, {7, 0}}, 10, EINTR},
      {"the end of the file", {{3, 0}, {0, EDOM}}, 3, 0},
      {"a failure", {{3, 0}, {-1, EIO}}, 3, EIO},
  };
  for (const Row& row : rows) {
    size_t step = 0, expected = 0;
    errno = EDOM;
    size_t moved = MoveAll(10, [&](size_t done, size_t rest) {
      EXPECT_EQ(done, expected) << row.what;
      EXPECT_EQ(rest, 10 - expected) << row.what;
      Step now = row.steps.at(step++);
      if (now.error) errno = now.error;
      if (now.result > 0) expected += static_cast<size_t>(now.result);
      return now.result;
    });
    EXPECT_EQ(errno, row.error) << row.what;
    EXPECT_EQ(moved, row.moved) << row.what;
    EXPECT_EQ(step, row.steps.size()) << row.what;
  }
}

TEST(Transfer, OfNothingMakesNoCall) {
  EXPECT_EQ(MoveAll(0, [](size_t, size_t) -> ssize_t { throw 1; }), 0u);
}

}  // namespace
}  // namespace zt::posix
