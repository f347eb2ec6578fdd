#include "source/Common/vltTestHook.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <malloc.h>
#include <string.h>
#include <sys/resource.h>
#include <unistd.h>

#include <chrono>
#include <functional>
#include <new>
#include <vector>

#include "source/Utilities/vltutils.h"
#include "tests/support/CaughtSleeps.h"
#include "tests/support/Child.h"
#include "tests/support/Installation.h"
#include "tests/support/MemoryLimit.h"

namespace {

using namespace vlt::test;

// The install directory is read once a process, so each start is a child of its own. Its exit code
// is the body's result; the hook file is written first.
int Armed(const std::string& hookFile, const std::function<int()>& body) {
  Installation installation;
  if (!hookFile.empty()) WriteBytes(installation.root() + "/VLTHooks.ini", hookFile);
  return Child([&] {
           vltRefreshHook();
           return body();
         })
      .wait();
}

std::string Hook(const std::string& name, const std::string& flags) {
  return "[Hook]\nName = " + name + "\n" + flags;
}

constexpr const char* kSimulate = "SimulateMemoryAllocationFailure = TRUE\n";
constexpr const char* kThrow = "SimulateMemoryAllocationFailureAndThrow = True\n";

TEST(vltTestHook, WithoutAFileNothingIsArmedAndNoFileAppears) {
  Installation installation;
  EXPECT_EQ(Child([&] {
              vltRefreshHook();
              return vltTestHook("") == 0 && vltTestHook("x") == 0 && vltTestHook(nullptr) == 0 ? 0
                                                                                                : 1;
            }).wait(),
            0);
  EXPECT_FALSE(Exists(installation.root() + "/VLTHooks.ini"));
}

TEST(vltTestHook, NameIsComparedExactly) {
  EXPECT_EQ(Armed(Hook("Point", kSimulate),
                  [] {
                    return vltTestHook("Point") == 1 && vltTestHook("point") == 0 &&
                                   vltTestHook("Points") == 0
                               ? 0
                               : 1;
                  }),
            0);
}

TEST(vltTestHook, WithoutANameNoFlagIsRead) {
  Installation installation;
  std::string file = installation.root() + "/VLTHooks.ini";
  WriteBytes(file, "[Hook]\nCrash = true\n");
  EXPECT_EQ(Child([&] {
              vltRefreshHook();
              WriteBytes(file, "[Hook]\nName = p\n");
              vltRefreshHook();
              return vltTestHook("p") == 1 ? 7 : 8;  // armed, and no flag was kept: no exit(0)
            }).wait(),
            7);
}

TEST(vltTestHook, FlagsStayWhileTheNameIsReplaced) {
  Installation installation;
  std::string file = installation.root() + "/VLTHooks.ini";
  WriteBytes(file, Hook("a", kThrow));
  EXPECT_EQ(Child([&] {
              vltRefreshHook();
              WriteBytes(file, Hook("b", "SimulateMemoryAllocationFailureAndThrow = false\n"));
              vltRefreshHook();
              if (vltTestHook("a") != 0) return 1;
              try {
                vltTestHook("b");
              } catch (const std::bad_alloc&) {
                return 0;
              }
              return 2;
            }).wait(),
            0);
}

TEST(vltTestHook, RefreshesWithOneNameKeepOneCopy) {
  EXPECT_EQ(Armed(Hook(std::string(10000, 'n'), ""),
                  [] {
                    for (int i = 0; i < 20; ++i) vltRefreshHook();
                    size_t before = mallinfo2().uordblks;
                    for (int i = 0; i < 100; ++i) vltRefreshHook();
                    return mallinfo2().uordblks < before + 100000 ? 0 : 1;
                  }),
            0);
}

TEST(vltTestHook, CrashEndsTheProcessNormally) {
  EXPECT_EQ(Armed(Hook("p", "Crash = true\n"),
                  [] {
                    vltTestHook("p");
                    return 5;
                  }),
            0);
}

TEST(vltTestHook, HangGoesBeforeCrashAndAnswersOne) {
  EXPECT_EQ(Armed(Hook("p", "Crash = true\nHang = true\nHangTime = 60\n"),
                  [] {
                    auto start = std::chrono::steady_clock::now();
                    unsigned answer = vltTestHook("p");
                    auto taken = std::chrono::steady_clock::now() - start;
                    return answer == 1 && taken >= std::chrono::milliseconds(60) ? 6 : 7;
                  }),
            6);
}

TEST(vltTestHook, HangWithoutATimeLastsForAsLongAsASleepCan) {
  EXPECT_EQ(Armed(Hook("p", "Hang = true\n"),
                  [] {
                    if (!CatchSleeps()) return 1;
                    if (vltTestHook("p") != 1) return 2;
                    return CaughtSleeps() == std::vector<long long>{0x7FFFFFFF} ? 0 : 3;
                  }),
            0);
}

TEST(vltTestHook, AHangTimeThatIsGoneByTheNextRefreshIsForgotten) {
  Installation installation;
  std::string file = installation.root() + "/VLTHooks.ini";
  WriteBytes(file, Hook("p", "Hang = true\nHangTime = 5\n"));
  EXPECT_EQ(Child([&] {
              vltRefreshHook();
              if (!CatchSleeps()) return 1;
              vltTestHook("p");
              WriteBytes(file, Hook("p", ""));  // without "Hang" the time is not looked at
              vltRefreshHook();
              vltTestHook("p");
              WriteBytes(file, Hook("p", "Hang = TRUE\n"));
              vltRefreshHook();
              vltTestHook("p");
              return CaughtSleeps() == std::vector<long long>{5, 5, 0x7FFFFFFF} ? 0 : 2;
            }).wait(),
            0);
}

// All five, and then each time without the one that came out.
TEST(vltTestHook, PrecedenceIsHangCrashSimulateThrowExhaust) {
  const std::string kExhaust = "MemoryAllocationFailure = true\n";
  const std::string kCrash = "Crash = true\n", kHang = "Hang = true\nHangTime = 1\n";
  auto body = [] {
    if (!CatchSleeps()) return 1;
    size_t before = mallinfo2().uordblks;
    unsigned answer = 9;
    try {
      answer = vltTestHook("p");
    } catch (const std::bad_alloc&) {
      return 40;
    }
    if (answer != 1) return 2;
    if (!CaughtSleeps().empty()) return 20;
    return mallinfo2().uordblks < before + (1u << 20) ? 30 : 50;
  };
  std::string flags = kExhaust + kThrow + kSimulate + kCrash + kHang;
  EXPECT_EQ(Armed(Hook("p", flags), body), 20);
  flags.resize(flags.size() - kHang.size());
  EXPECT_EQ(Armed(Hook("p", flags), body), 0);  // exit(0)
  flags.resize(flags.size() - kCrash.size());
  EXPECT_EQ(Armed(Hook("p", flags), body), 30);
  flags.resize(flags.size() - strlen(kSimulate));
  EXPECT_EQ(Armed(Hook("p", flags), body), 40);
}

TEST(vltTestHook, TextsOfFlagsOtherThanTrueSetNothing) {
  for (const char* text : {"1", "yes", "truely", "tru", "false", "\"\""}) {
    std::string flags;
    for (const char* flag :
         {"Crash", "Hang", "SimulateMemoryAllocationFailure",
          "SimulateMemoryAllocationFailureAndThrow", "MemoryAllocationFailure"}) {
      flags += std::string(flag) + " = " + text + "\n";
    }
    EXPECT_EQ(Armed(Hook("p", flags), [] { return vltTestHook("p") == 1 ? 6 : 7; }), 6) << text;
  }
}

TEST(vltTestHook, ABadHookFileArmsNothing) {
  EXPECT_EQ(Armed(std::string("\xFF\xFE[\0", 4), [] { return vltTestHook("p") == 0 ? 0 : 1; }), 0);
}

TEST(vltTestHook, ExhaustMemoryTakesWhatThereIs) {
  if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer holds the address space";
  EXPECT_EQ(Armed(Hook("p", "MemoryAllocationFailure = true\n"),
                  [] {
                    LimitMemoryTo(400u << 20);
                    if (vltTestHook("p") != 1) return 1;
                    if (malloc(64u << 20)) return 2;
                    if (vltTestHook("p") != 1) return 3;  // again, with smaller blocks
                    return malloc(4u << 20) ? 4 : 0;
                  }),
            0);
}

// Without allocating anything.
size_t MappedBytes() {
  char text[64] = {};
  int fd = open("/proc/self/statm", O_RDONLY | O_CLOEXEC);
  ssize_t got = read(fd, text, sizeof text - 1);
  close(fd);
  return got > 0 ? strtoul(text, nullptr, 10) * static_cast<size_t>(sysconf(_SC_PAGESIZE)) : 0;
}

// The first one has doubled its blocks to 128 MiB. From 4 KiB on, and without doubling, the second one
// would take next to nothing.
TEST(vltTestHook, ASecondExhaustionGoesOnWithBlocksOfTheSameSize) {
  if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer holds the address space";
  EXPECT_EQ(Armed(Hook("p", "MemoryAllocationFailure = true\n"),
                  [] {
                    LimitMemoryTo(400u << 20);
                    vltTestHook("p");
                    size_t before = MappedBytes();
                    rlimit limit = {RLIM_INFINITY, RLIM_INFINITY};
                    getrlimit(RLIMIT_AS, &limit);
                    limit.rlim_cur += 300u << 20;
                    setrlimit(RLIMIT_AS, &limit);
                    vltTestHook("p");
                    return MappedBytes() - before >= 256u << 20 ? 0 : 1;
                  }),
            0);
}

}  // namespace
