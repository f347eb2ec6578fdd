// The log of processes with several threads that fork, and the numbers of its descriptor.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iostream>

#include "source/Common/ZtUtils/General/vlTracer.h"
#include "tests/support/ForkStorm.h"
#include "tests/support/InChild.h"
#include "tests/support/ReusedDescriptor.h"
#include "tests/support/Sanitizer.h"
#include "tests/support/TempDir.h"
#include "tests/support/ThreadState.h"

namespace {

using namespace vlt::test;

void Start(const std::string& directory, int target = vlTracer::kTargetFile) {
  vlTracer::Initialize(static_cast<vlTracer::SeverityLevel>(2),
                       static_cast<vlTracer::TraceTarget>(target),
                       std::wstring(directory.begin(), directory.end()).c_str(), 0);
}

void Say(const char* text) { vlt_vlTracer::TraceOutput(' ', text, false); }

// Path of the one log in the directory.
std::string LogIn(const std::string& directory) {
  std::string path;
  for (const auto& entry : std::filesystem::directory_iterator(directory)) {
    EXPECT_EQ(path, "") << "more than one log";
    path = entry.path();
  }
  return path;
}

TEST(vlTracerFork, ChildrenOfTracingThreadsTrace) {
  if (!kCanForkWhileThreadsAllocate) GTEST_SKIP() << "the sanitizer's allocator is not fork-safe";
  TempDir dir;
  ExpectInChild(
      [&] {
        Start(dir.makeDir("logs"));
        auto say = [] { vlt_vlTracer::TraceOutput('>', "busy", true); };
        ForkStorm result = RunForkStorm(say, [&] {
          say();
          return true;
        });
        std::cout << result << std::endl;
        EXPECT_GT(result.children, 3);
        EXPECT_EQ(0, result.hung);
        EXPECT_EQ(0, result.failed);
        say();  // the parent's log has not come to a halt
      },
      600000);
  // Pairs of lines, all of them whole.
  std::ifstream log(LogIn(dir / "logs"));
  std::string first, second;
  while (std::getline(log, first)) {
    ASSERT_EQ(first, "> busy");
    ASSERT_TRUE(std::getline(log, second));
    ASSERT_TRUE(second.starts_with("  Thread = 0x")) << second;
  }
}

// The thread is inside a write, with the log's mutex.
TEST_IN_CHILD(vlTracerFork, ChildOfAForkDuringAWriteKeepsNoLock) {
  TempDir dir;
  int ends[2];
  ASSERT_EQ(0, pipe(ends));
  dup2(ends[1], 2);
  fcntl(ends[1], F_SETFL, O_NONBLOCK);
  while (write(ends[1], "x", 1) == 1) {
  }
  fcntl(ends[1], F_SETFL, 0);
  Start(dir.makeDir("logs"), vlTracer::kTargetError);
  WatchedThread writer([] { Say("stuck"); });
  ASSERT_TRUE(writer.blocksInWrite());
  // Not Child, which flushes the stream that the thread is inside.
  pid_t idle = fork();
  if (idle == 0) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    for (;;) pause();
  }
  fcntl(ends[0], F_SETFL, O_NONBLOCK);
  std::string text(4096, '\0');
  EXPECT_TRUE(Eventually([&] {
    while (read(ends[0], text.data(), text.size()) > 0) {
    }
    return writer.done();
  }));
  // The child lives, and the lock is free again.
  WatchedThread next([] { Say("next"); });
  EXPECT_TRUE(Eventually([&] { return next.done(); }));
  kill(idle, SIGKILL);
  waitpid(idle, nullptr, 0);
}

TEST_IN_CHILD(vlTracerForkDescriptor, FileReusingItsNumberIsLeftAloneAndTheLogGoesOn) {
  TempDir dir;
  Start(dir.makeDir("logs"));
  Say("one");
  std::string log = LogIn(dir / "logs");
  ReusedDescriptor hosts(dir / "hosts", DescriptorOf(log));
  Say("two");
  EXPECT_TRUE(hosts.unchanged());
  EXPECT_EQ("  one\n  two\n", ReadBytes(log));
  vlTracer::Cleanup();
  EXPECT_TRUE(hosts.isOpen());
  EXPECT_TRUE(hosts.unchanged());
}

TEST_IN_CHILD(vlTracerForkDescriptor, FileReusingItsNumberOutlivesTheEnd) {
  TempDir dir;
  Start(dir.makeDir("logs"));
  Say("one");
  ReusedDescriptor hosts(dir / "hosts", DescriptorOf(LogIn(dir / "logs")));
  vlTracer::Cleanup();
  EXPECT_TRUE(hosts.isOpen());
  EXPECT_TRUE(hosts.unchanged());
}

TEST_IN_CHILD(vlTracerForkDescriptor, ClosedOneIsOpenedAgain) {
  TempDir dir;
  Start(dir.makeDir("logs"));
  Say("one");
  std::string log = LogIn(dir / "logs");
  close(DescriptorOf(log));
  Say("two");
  EXPECT_EQ("  one\n  two\n", ReadBytes(log));
}

// What such a host prints later goes to what it opens as its output, or nowhere.
TEST(vlTracerForkDescriptor, IsNoneOfTheStandardStreams) {
  TempDir dir;
  EXPECT_EQ(Child([&] {
              for (int fd = 0; fd <= 2; ++fd) close(fd);
              Start(dir.makeDir("logs"));
              Say("one");
              std::string log = LogIn(dir / "logs");
              int number = DescriptorOf(log);
              if (number <= 2) return 1;
              if ((fcntl(number, F_GETFD) & FD_CLOEXEC) == 0) return 2;
              return ReadBytes(log) == "  one\n" ? 0 : 3;
            }).wait(),
            0);
}

}  // namespace
