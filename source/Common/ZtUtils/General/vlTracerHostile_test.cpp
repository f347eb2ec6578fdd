// The log where others are in its way: what they put under its name, a reader that does not read.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <ctime>
#include <filesystem>
#include <iterator>
#include <vector>

#include "source/Common/ZtUtils/General/vlTracer.h"
#include "tests/support/Child.h"
#include "tests/support/TempDir.h"
#include "tests/support/ThreadState.h"

namespace {

using namespace vlt::test;

void Start(int target, const wchar_t* directory) {
  vlTracer::Initialize(static_cast<vlTracer::SeverityLevel>(2),
                       static_cast<vlTracer::TraceTarget>(target), directory, 0);
}

// The names that a log started within the next seconds may get.
std::vector<std::string> ComingNames(const std::string& directory) {
  std::vector<std::string> names;
  for (time_t at = time(nullptr); names.size() < 5; ++at) {
    tm local;
    localtime_r(&at, &local);
    char name[64], suffix[32];
    strftime(name, sizeof name, "%Y%m%d_%H%M%S", &local);
    snprintf(suffix, sizeof suffix, "-vlTracer-%08lX.log", static_cast<unsigned long>(getpid()));
    names.push_back(directory + "/" + name + suffix);
  }
  return names;
}

TEST(vlTracerHostile, WhatOthersPutUnderTheLogsNameIsLeftAlone) {
  for (bool pipe : {true, false}) {
    TempDir dir;
    std::string logs = dir.makeDir("logs"), errors = dir / "err", target = dir / "target";
    WriteBytes(target, "mine\n");
    EXPECT_EQ(Child([&] {
                for (const std::string& name : ComingNames(logs)) {
                  int made =
                      pipe ? mkfifo(name.c_str(), 0666) : symlink(target.c_str(), name.c_str());
                  if (made != 0) return 1;
                }
                dup2(open(errors.c_str(), O_CREAT | O_WRONLY, 0600), 2);
                Start(vlTracer::kTargetFile | vlTracer::kTargetError,
                      std::wstring(logs.begin(), logs.end()).c_str());
                vlt_vlTracer::TraceOutput(' ', "x", false);
                return 0;
              }).wait(),
              0);
    EXPECT_EQ(ReadBytes(target), "mine\n");
    EXPECT_EQ(ReadBytes(errors), "  x\n");
    std::filesystem::directory_iterator entries(logs), end;
    EXPECT_EQ(std::distance(entries, end), 5);
  }
}

// What the pipe holds just now.
std::string Emptied(int end) {
  std::string text;
  char buffer[4096];
  fcntl(end, F_SETFL, O_NONBLOCK);
  for (ssize_t n; (n = read(end, buffer, sizeof buffer)) > 0;) {
    text.append(buffer, static_cast<size_t>(n));
  }
  return text;
}

// Standard error is a pipe that no one empties: its writer waits there with the lock.
TEST(vlTracerHostile, TheEndDoesNotWaitForAWriteThatDoesNotEnd) {
  EXPECT_EQ(Child([] {
              int ends[2];
              if (pipe(ends) != 0) return 1;
              dup2(ends[1], 2);
              fcntl(ends[1], F_SETFL, O_NONBLOCK);
              while (write(ends[1], "x", 1) == 1) {
              }
              fcntl(ends[1], F_SETFL, 0);
              Start(vlTracer::kTargetError, nullptr);
              WatchedThread writer([] { vlt_vlTracer::TraceOutput(' ', "stuck", false); });
              if (!writer.blocksInWrite()) return 2;
              WatchedThread waiter([] { vlt_vlTracer::TraceOutput(' ', "late", false); });
              if (!waiter.blocksInLock()) return 3;
              vlTracer::Cleanup();
              if (writer.done()) return 4;
              // Emptied, all of them come to an end; the line that waited is not written any more.
              std::string text;
              bool ended = Eventually([&] {
                bool done = writer.done() && waiter.done();
                text += Emptied(ends[0]);
                return done;
              });
              if (!ended) return 5;
              return text.ends_with("x  stuck\n") ? 0 : 6;
            }).wait(),
            0);
}

}  // namespace
