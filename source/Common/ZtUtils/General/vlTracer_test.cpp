#include "source/Common/ZtUtils/General/vlTracer.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <signal.h>
#include <sys/mount.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <functional>
#include <map>
#include <regex>
#include <set>
#include <sstream>
#include <thread>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/TempDir.h"
#include "tests/support/TracedChild.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/ThreadID.h"

namespace {

using namespace vlt::test;

const std::string kDiskShort =
    "** Available disk space is below the desired threshold. Aborting tracing. **\n";
constexpr auto kMask = static_cast<vlTracer::SeverityLevel>(2);

struct Traced {
  int exitCode;
  std::string out, err, logName, log;
};

// Runs the body in a process whose log is fresh, with a directory for it.
Traced Trace(const std::function<void(const std::wstring& directory)>& body) {
  TempDir dir;
  std::string logs = dir.makeDir("logs");
  Traced result;
  result.exitCode = Child([&] {
                      int out = open((dir / "out").c_str(), O_CREAT | O_WRONLY, 0600);
                      int err = open((dir / "err").c_str(), O_CREAT | O_WRONLY, 0600);
                      dup2(out, 1);
                      dup2(err, 2);
                      body(std::wstring(logs.begin(), logs.end()));
                      return 0;
                    }).wait();
  result.out = ReadBytes(dir / "out");
  result.err = ReadBytes(dir / "err");
  for (const auto& entry : std::filesystem::directory_iterator(logs)) {
    EXPECT_EQ(result.logName, "") << "more than one log";
    result.logName = entry.path().filename();
    result.log = ReadBytes(entry.path());
  }
  return result;
}

void Start(int target, const wchar_t* directory, long threshold = 0) {
  vlTracer::Initialize(kMask, static_cast<vlTracer::TraceTarget>(target), directory, threshold);
}

TEST(vlTracer, WritesNothingBeforeTheStartAndAfterTheEnd) {
  Traced t = Trace([](const std::wstring& directory) {
    vlt_vlTracer::TraceOutput(' ', "early", false);
    Start(7, directory.c_str());
    vlTracer::Cleanup();
    vlt_vlTracer::TraceOutput(' ', "late", false);
    vlTracer::Cleanup();
  });
  EXPECT_EQ(t.exitCode, 0);
  EXPECT_EQ(t.out + t.err + t.log, "");
  EXPECT_EQ(t.logName, "");
}

TEST(vlTracer, LineGoesToEveryTarget) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(7, directory.c_str());
    vlt_vlTracer::TraceOutput('*', "text", false);
  });
  EXPECT_EQ(t.log, "* text\n");
  EXPECT_EQ(t.err, "* text\n");
  EXPECT_EQ(t.out, "* text\n");
}

TEST(vlTracer, FileNameHoldsTheStartAndTheProcess) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(1, (directory + L"/").c_str());
    vlt_vlTracer::TraceOutput(' ', "x", false);
    char pid[32];
    snprintf(pid, sizeof pid, "%08lX", static_cast<unsigned long>(getpid()));
    vlt_vlTracer::TraceOutput(' ', pid, false);
  });
  std::smatch match;
  ASSERT_TRUE(
      std::regex_match(t.logName, match, std::regex("\\d{8}_\\d{6}-vlTracer-([0-9A-F]{8})\\.log")));
  EXPECT_EQ(t.log, "  x\n  " + match[1].str() + "\n");
}

TEST(vlTracer, DetailLineTellsThreadAndTime) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(1, directory.c_str());
    vlt_vlTracer::TraceOutput(' ', "x", true);
  });
  EXPECT_TRUE(std::regex_match(
      t.log, std::regex("  x\n  Thread = 0x[0-9A-F]+, Time = \\d{8} \\d{6}\\.\\d{3}\n")))
      << t.log;
}

TEST(vlTracer, DetailLineIsThatOfTheCallingThreadAndOfNow) {
  auto now = [] {
    char text[32];
    time_t seconds = time(nullptr);
    tm local;
    strftime(text, sizeof text, "%Y%m%d %H%M%S", localtime_r(&seconds, &local));
    return std::string(text);
  };
  std::string before = now();
  Traced t = Trace([](const std::wstring& directory) {
    Start(1, directory.c_str());
    std::string id;
    std::thread([&] {
      id = zt::fnd::AnsiString(zt::fnd::osdep::ThreadID::getCallingID().getDisplayStringHex())
               .c_str();
      vlt_vlTracer::TraceOutput(' ', id.c_str(), true);
    }).join();
  });
  std::smatch match;
  ASSERT_TRUE(std::regex_match(
      t.log, match, std::regex("  (\\w+)\n  Thread = 0x(\\w+), Time = (.{15})\\.\\d{3}\n")))
      << t.log;
  EXPECT_EQ(match[1], match[2]);
  EXPECT_LE(before, match[3].str());
  EXPECT_GE(now(), match[3].str());
}

TEST(vlTracer, LongTextIsCutTo2047BytesWithItsMarker) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(1, directory.c_str());
    vlt_vlTracer::TraceOutput('m', std::string(3000, 'x').c_str(), false);
    vlt_vlTracer::TraceOutput('m', std::string(2045, 'y').c_str(), false);
    vlt_vlTracer::TraceOutput('m', nullptr, false);
  });
  EXPECT_EQ(t.log, "m " + std::string(2045, 'x') + "\nm " + std::string(2045, 'y') + "\nm \n");
}

TEST(vlTracer, NoTargetWritesNothing) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(0, directory.c_str());
    if (vlt_vlTracer::GetTraceMask() != 2) _exit(1);
    vlt_vlTracer::TraceOutput(' ', "x", true);
  });
  EXPECT_EQ(t.exitCode, 0);
  EXPECT_EQ(t.out + t.err + t.logName, "");
}

TEST(vlTracer, WithoutADirectoryOnlyTheOtherTargetsWrite) {
  Traced t = Trace([](const std::wstring&) {
    Start(1 | 4, nullptr);
    vlt_vlTracer::TraceOutput(' ', "x", false);
    vlt_vlTracer::TraceOutput(' ', "y", false);
  });
  EXPECT_EQ(t.err, "  x\n  y\n");
  EXPECT_EQ(t.logName, "");
}

TEST(vlTracer, ASecondStartChangesTheTargetAndNotTheFile) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(4, directory.c_str());
    vlt_vlTracer::TraceOutput(' ', "one", false);
    Start(2, L"/nowhere");
    vlt_vlTracer::TraceOutput(' ', "two", false);
    Start(1, directory.c_str());  // No file was named at the start.
    vlt_vlTracer::TraceOutput(' ', "three", false);
    if (vlt_vlTracer::GetTraceMask() != 2) _exit(1);
  });
  EXPECT_EQ(t.exitCode, 0);
  EXPECT_EQ(t.err, "  one\n");
  EXPECT_EQ(t.out, "  two\n");
  EXPECT_EQ(t.logName, "");
}

TEST(vlTracer, ANewDirectoryOfASecondStartIsIgnored) {
  TempDir other;
  Traced t = Trace([&](const std::wstring& directory) {
    Start(1, directory.c_str());
    vlt_vlTracer::TraceOutput(' ', "one", false);
    Start(1, std::wstring(other.path().begin(), other.path().end()).c_str());
    vlt_vlTracer::TraceOutput(' ', "two", false);
  });
  EXPECT_EQ(t.log, "  one\n  two\n");
  EXPECT_TRUE(std::filesystem::is_empty(other.path()));
}

TEST(vlTracer, AStartAfterTheEndGoesOnInTheSameFile) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(1, directory.c_str());
    vlt_vlTracer::TraceOutput(' ', "one", false);
    vlTracer::Cleanup();
    Start(1, L"/nowhere");
    vlt_vlTracer::TraceOutput(' ', "two", false);
  });
  EXPECT_EQ(t.log, "  one\n  two\n");
}

TEST(vlTracer, ABackslashEndsADirectoryToo) {
  TempDir dir;
  std::string name = dir / "logs\\";
  EXPECT_EQ(Child([&] {
              Start(1, std::wstring(name.begin(), name.end()).c_str());
              vlt_vlTracer::TraceOutput(' ', "x", false);
              return 0;
            }).wait(),
            0);
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(dir.path())) {
    names.push_back(entry.path().filename());
  }
  ASSERT_EQ(names.size(), 1u);
  EXPECT_TRUE(names[0].starts_with("logs\\2")) << names[0];
}

TEST(vlTracer, AFailedLockDoesNotStopTheOutput) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(1 | 4, directory.c_str());
    vlt_vlTracer::TraceOutput(' ', "one", false);
    if (!FailSystemCall(SYS_flock, EIO)) _exit(1);
    vlt_vlTracer::TraceOutput(' ', "two", true);
  });
  EXPECT_EQ(t.exitCode, 0);
  EXPECT_TRUE(std::regex_match(t.log, std::regex("  one\n  two\n  Thread = .*\n"))) << t.log;
  EXPECT_EQ(t.err, t.log);
}

// Names of the calls that write and lock, for a call with detail after the first one.
std::vector<std::string> CallsOfALine(int target, long threshold) {
  TempDir dir;
  std::string logs = dir.makeDir("logs");
  std::vector<std::string> names;
  bool counts = false;
  TracedChild::Run(
      [&] {
        dup2(open((dir / "err").c_str(), O_CREAT | O_WRONLY, 0600), 2);
        Start(target, std::wstring(logs.begin(), logs.end()).c_str(), threshold);
        vlt_vlTracer::TraceOutput(' ', "opens", false);
        getppid();
        vlt_vlTracer::TraceOutput(' ', "x", true);
        getppid();
        return 0;
      },
      [&](const SystemCall& call) {
        if (call.number == SYS_getppid) counts = !counts;
        if (!counts) return 0;
        // A stream's write is one call or the other, by the C library.
        if (call.number == SYS_write || call.number == SYS_writev) names.push_back("write");
        if (call.number == SYS_flock) names.push_back("flock");
        return 0;
      },
      [](const SystemCall&) {});
  return names;
}

// What one write cannot keep together needs the lock between processes.
TEST(vlTracer, TheFileAloneGetsACallInOneWriteWithoutALock) {
  if (std::string missing = TracedChild::Missing(); !missing.empty()) {
    GTEST_SKIP() << "NOT TESTED: " << missing;
  }
  using Names = std::vector<std::string>;
  EXPECT_EQ(CallsOfALine(1, 0), (Names{"write"}));
  const Names locked{"flock", "write", "write", "flock"};
  EXPECT_EQ(CallsOfALine(4, 0), locked);
  EXPECT_EQ(CallsOfALine(1, 1), locked);
}

TEST(vlTracer, LinesAreInTheFileWhenTheCallReturns) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(1, directory.c_str());
    vlt_vlTracer::TraceOutput(' ', "x", false);
    raise(SIGKILL);
  });
  EXPECT_EQ(t.exitCode, 128 + SIGKILL);
  EXPECT_EQ(t.log, "  x\n");
}

TEST(vlTracer, ADirectoryThatAppearsLaterGetsTheLog) {
  TempDir dir;
  std::string logs = dir / "later";
  EXPECT_EQ(Child([&] {
              Start(1, std::wstring(logs.begin(), logs.end()).c_str());
              vlt_vlTracer::TraceOutput(' ', "lost", false);
              std::filesystem::create_directory(logs);
              vlt_vlTracer::TraceOutput(' ', "kept", false);
              return 0;
            }).wait(),
            0);
  for (const auto& entry : std::filesystem::directory_iterator(logs)) {
    EXPECT_EQ(ReadBytes(entry.path()), "  kept\n");
  }
}

TEST(vlTracer, ADiskThatIsShortAtTheFirstLineLeavesNoFileAndNoMessage) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(1 | 4, directory.c_str(), INT32_MAX);
    Start(1 | 4, directory.c_str(), static_cast<long>(~0ul >> 1));
    vlt_vlTracer::TraceOutput(' ', "x", false);
    Start(1 | 4, directory.c_str(), 0);
    vlt_vlTracer::TraceOutput(' ', "y", false);  // for good
  });
  if (sizeof(long) == 4) GTEST_SKIP() << "a 32-bit limit may be below what the disk has";
  EXPECT_EQ(t.logName, "");
  EXPECT_EQ(t.err, "  x\n  y\n");
}

TEST(vlTracer, ADiskThatBecomesShortEndsTheFileWithAMessage) {
  if (sizeof(long) == 4) GTEST_SKIP() << "a 32-bit limit may be below what the disk has";
  Traced t = Trace([](const std::wstring& directory) {
    Start(1 | 4, directory.c_str(), 1);
    vlt_vlTracer::TraceOutput(' ', "one", false);
    Start(1 | 4, directory.c_str(), static_cast<long>(~0ul >> 1));
    vlt_vlTracer::TraceOutput(' ', "two", false);
    vlt_vlTracer::TraceOutput(' ', "three", false);
    Start(1 | 4, directory.c_str(), 0);
    vlt_vlTracer::TraceOutput(' ', "four", false);
  });
  EXPECT_EQ(t.log, "  one\n" + kDiskShort);
  EXPECT_EQ(t.err, "  one\n" + kDiskShort + "  three\n  four\n");
}

TEST(vlTracer, AFullSmallFileSystemStopsTheLog) {
  TempDir dir;
  std::string logs = dir.makeDir("small"), err = dir / "err";
  Child child([&] {
    if (unshare(CLONE_NEWNS) != 0 || mount("tmpfs", logs.c_str(), "tmpfs", 0, "size=64k") != 0) {
      return 50;
    }
    dup2(open(err.c_str(), O_CREAT | O_WRONLY, 0600), 2);
    Start(1 | 4, std::wstring(logs.begin(), logs.end()).c_str(), 16384);
    for (int i = 0; i < 100; ++i) {
      vlt_vlTracer::TraceOutput(' ', std::string(1000, 'x').c_str(), false);
    }
    auto read = [&] {
      std::string log;
      for (const auto& entry : std::filesystem::directory_iterator(logs)) {
        log = ReadBytes(entry.path());
      }
      return log;
    };
    std::string full = read();
    if (full.size() >= 65536 || !full.ends_with("x\n" + kDiskShort)) return 1;
    for (const auto& entry : std::filesystem::directory_iterator(logs)) {
      std::filesystem::resize_file(entry.path(), 0);
    }
    vlt_vlTracer::TraceOutput(' ', "there is room again", false);  // and no log, for good
    return read().empty() ? 0 : 2;
  });
  int result = child.wait();
  if (result == 50) GTEST_SKIP() << "NOT TESTED: mounting is not permitted";
  EXPECT_EQ(result, 0);
  std::string lines = ReadBytes(err);
  EXPECT_EQ(std::count(lines.begin(), lines.end(), '\n'), 101);  // the other target went on
  EXPECT_TRUE(lines.ends_with("  there is room again\n"));
}

// Without a limit nothing is looked at: lines that find no space are lost, silently.
TEST(vlTracer, AFullFileSystemWithoutALimitIsSilent) {
  TempDir dir;
  std::string logs = dir.makeDir("small");
  int result = Child([&] {
                 if (unshare(CLONE_NEWNS) != 0 ||
                     mount("tmpfs", logs.c_str(), "tmpfs", 0, "size=16k") != 0) {
                   return 50;
                 }
                 Start(1, std::wstring(logs.begin(), logs.end()).c_str());
                 for (int i = 0; i < 100; ++i) {
                   vlt_vlTracer::TraceOutput(' ', std::string(1000, 'x').c_str(), true);
                 }
                 vlTracer::Cleanup();
                 return 0;
               }).wait();
  if (result == 50) GTEST_SKIP() << "NOT TESTED: mounting is not permitted";
  EXPECT_EQ(result, 0);
}

TEST(vlTracer, ThresholdOfTheOptionsNeverTurnsNegative) {
  EXPECT_EQ(vlTracer::Threshold(0), 0);
  EXPECT_EQ(vlTracer::Threshold(2147483647u), 2147483647);
  for (uint32_t bytes : {2147483648u, 4294967295u}) {
    EXPECT_EQ(vlTracer::Threshold(bytes), sizeof(long) == 4 ? LONG_MAX : static_cast<long>(bytes));
  }
}

TEST(vlTracer, FreeSpaceOfAMissingPathIsMinusOne) {
  EXPECT_EQ(CalcFreeSpace("/no/such/path"), -1);
  EXPECT_GT(CalcFreeSpace("/"), 0);
}

TEST(vlTracer, TwoThreadsNeverInterleaveTheirLines) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(1, directory.c_str());
    std::vector<std::thread> threads;
    for (char marker : {'a', 'b', 'c', 'd'}) {
      threads.emplace_back([marker] {
        for (int i = 0; i < 100; ++i) vlt_vlTracer::TraceOutput(marker, "x", true);
      });
    }
    for (auto& thread : threads) thread.join();
  });
  std::istringstream lines(t.log);
  std::string first, second;
  std::map<char, std::set<std::string>> threads;
  int pairs = 0;
  while (std::getline(lines, first) && std::getline(lines, second)) {
    EXPECT_EQ(first.substr(1), " x");
    EXPECT_EQ(second.rfind("  Thread = 0x", 0), 0u);
    threads[first[0]].insert(second.substr(0, second.find(',')));
    ++pairs;
  }
  EXPECT_EQ(pairs, 400);
  EXPECT_EQ(threads.size(), 4u);
  for (const auto& [marker, ids] : threads) EXPECT_EQ(ids.size(), 1u) << marker;
}

TEST(vlTracer, ObjectsTellTheirCall) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(1, directory.c_str());
    vlTracer0 none('>', "NoArguments");
    reinterpret_cast<vlt_vlTracer*>(&none)->TraceArgsHelper();
    int number = 7;
    auto print = [](std::ostream& out, const vlTracerX::Argument& argument) {
      out << "[" << *static_cast<const int*>(argument.value) << "]";
    };
    vlTracerX::Argument arguments[] = {{&number, print}, {&number, print}};
    vlTracerX some('<', "Some", 2, arguments);
    reinterpret_cast<vlt_vlTracer*>(&some)->TraceArgsHelper();
    std::string name(2000, 'n');
    vlTracer0 longName('>', name.c_str());
    reinterpret_cast<vlt_vlTracer*>(&longName)->TraceArgsHelper();
  });
  EXPECT_TRUE(
      std::regex_match(t.log, std::regex("> Func: NoArguments\n  Thread = .*\n"
                                         "< Func: Some Args: \\[7\\]\\[7\\]\n  Thread = .*\n"
                                         "> Func: n{1017}\n  Thread = .*\n")))
      << t.log;
}

TEST(vlTracer, ObjectTextIsCutToTheBuffer) {
  std::string name(2000, 'n');
  vlTracer0 object('>', name.c_str());
  char buffer[16];
  EXPECT_EQ(object.GetStringContentsA(buffer, sizeof buffer), buffer);
  EXPECT_STREQ(buffer, "Func: nnnnnnnnn");
  EXPECT_EQ(object.GetStringContentsA(buffer, 0), buffer);
}

std::wstring g_callbackDirectory;

TEST(vlTracer, APendingCallbackStartsTheLogWhenTheMaskIsAsked) {
  Traced t = Trace([](const std::wstring& directory) {
    g_callbackDirectory = directory;
    vlTracer::Initialize([] { Start(1, g_callbackDirectory.c_str()); });
    vlt_vlTracer::TraceOutput(' ', "not yet", false);
    if (vlt_vlTracer::GetTraceMask() != 2) _exit(1);
    vlt_vlTracer::TraceOutput(' ', "now", false);
  });
  EXPECT_EQ(t.exitCode, 0);
  EXPECT_EQ(t.log, "  now\n");
}

}  // namespace
