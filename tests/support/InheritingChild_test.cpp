#include "tests/support/InheritingChild.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include "tests/support/Child.h"

namespace vlt::test {
namespace {

TEST(InheritingChild, ProgramLivesUntilItsEnd) {
  Child child([] {
    InheritingProgram program;
    program.fork();
    if (!program.await()) return 1;
    return program.end() ? 0 : 2;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(InheritingChild, ProgramNeedsNoStandardStreams) {
  Child child([] {
    for (int fd : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) close(fd);
    InheritingProgram program;
    program.fork();
    if (!program.await()) return 1;
    return program.end() ? 0 : 2;
  });
  EXPECT_EQ(child.wait(), 0);
}

}  // namespace
}  // namespace vlt::test
