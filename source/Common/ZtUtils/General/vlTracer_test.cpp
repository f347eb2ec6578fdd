#include "source/Common/ZtUtils/General/vlTracer.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/mount.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <regex>
#include <thread>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/String.h"

namespace {

using namespace vlt::test;

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

TEST(Tracer, WritesNothingBeforeTheStartAndAfterTheEnd) {
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

TEST(Tracer, LineGoesToEveryTarget) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(7, directory.c_str());
    vlt_vlTracer::TraceOutput('*', "text", false);
  });
  EXPECT_EQ(t.log, "* text\n");
  EXPECT_EQ(t.err, "* text\n");
  EXPECT_EQ(t.out, "* text\n");
}

TEST(Tracer, FileNameHoldsTheStartAndTheProcess) {
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

TEST(Tracer, DetailLineTellsThreadAndTime) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(1, directory.c_str());
    vlt_vlTracer::TraceOutput(' ', "x", true);
  });
  EXPECT_TRUE(std::regex_match(
      t.log, std::regex("  x\n  Thread = 0x[0-9A-F]+, Time = \\d{8} \\d{6}\\.\\d{3}\n")))
      << t.log;
}

TEST(Tracer, LongTextIsCutTo2047BytesWithItsMarker) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(1, directory.c_str());
    vlt_vlTracer::TraceOutput('m', std::string(3000, 'x').c_str(), false);
    vlt_vlTracer::TraceOutput('m', std::string(2045, 'y').c_str(), false);
    vlt_vlTracer::TraceOutput('m', nullptr, false);
  });
  EXPECT_EQ(t.log, "m " + std::string(2045, 'x') + "\nm " + std::string(2045, 'y') + "\nm \n");
}

TEST(Tracer, NoTargetWritesNothing) {
  Traced t = Trace([](const std::wstring& directory) {
    Start(0, directory.c_str());
    vlt_vlTracer::TraceOutput(' ', "x", true);
  });
  EXPECT_EQ(t.out + t.err + t.logName, "");
}

TEST(Tracer, WithoutADirectoryOnlyTheOtherTargetsWrite) {
  Traced t = Trace([](const std::wstring&) {
    Start(1 | 4, nullptr);
    vlt_vlTracer::TraceOutput(' ', "x", false);
    vlt_vlTracer::TraceOutput(' ', "y", false);
  });
  EXPECT_EQ(t.err, "  x\n  y\n");
  EXPECT_EQ(t.logName, "");
}

TEST(Tracer, ASecondStartChangesTheTargetAndNotTheFile) {
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

TEST(Tracer, ADirectoryThatAppearsLaterGetsTheLog) {
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

TEST(Tracer, ADiskThatIsShortAtTheFirstLineLeavesNoFileAndNoMessage) {
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

TEST(Tracer, ADiskThatBecomesShortEndsTheFileWithAMessage) {
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
  const std::string message =
      "** Available disk space is below the desired threshold. Aborting tracing. **\n";
  EXPECT_EQ(t.log, "  one\n" + message);
  EXPECT_EQ(t.err, "  one\n" + message + "  three\n  four\n");
}

TEST(Tracer, AFullSmallFileSystemStopsTheLog) {
  if (geteuid() != 0) GTEST_SKIP() << "needs root, to mount a small file system";
  TempDir dir;
  std::string logs = dir.makeDir("small");
  Child child([&] {
    if (mount("tmpfs", logs.c_str(), "tmpfs", 0, "size=64k") != 0) return 50;
    Start(1, std::wstring(logs.begin(), logs.end()).c_str(), 16384);
    for (int i = 0; i < 100; ++i) {
      vlt_vlTracer::TraceOutput(' ', std::string(1000, 'x').c_str(), false);
    }
    std::string log;
    for (const auto& entry : std::filesystem::directory_iterator(logs)) {
      log = ReadBytes(entry.path());
    }
    umount(logs.c_str());
    return log.size() < 65536 && log.ends_with("Aborting tracing. **\n") ? 0 : 1;
  });
  int result = child.wait();
  if (result == 50) GTEST_SKIP() << "mounting is not permitted";
  EXPECT_EQ(result, 0);
}

TEST(Tracer, FreeSpaceOfAMissingPathIsMinusOne) {
  EXPECT_EQ(CalcFreeSpace("/no/such/path"), -1);
  EXPECT_GT(CalcFreeSpace("/"), 0);
}

TEST(Tracer, TwoThreadsNeverInterleaveTheirLines) {
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
  int pairs = 0;
  while (std::getline(lines, first) && std::getline(lines, second)) {
    EXPECT_EQ(first.substr(1), " x");
    EXPECT_EQ(second.rfind("  Thread = 0x", 0), 0u);
    ++pairs;
  }
  EXPECT_EQ(pairs, 400);
}

TEST(Tracer, ObjectsTellTheirCall) {
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
    vlTracer0 longName('>', std::string(2000, 'n').c_str());
  });
  EXPECT_TRUE(
      std::regex_match(t.log, std::regex("> Func: NoArguments\n  Thread = .*\n"
                                         "< Func: Some Args: \\[7\\]\\[7\\]\n  Thread = .*\n")))
      << t.log;
}

TEST(Tracer, ObjectTextIsCutToTheBuffer) {
  std::string name(2000, 'n');
  vlTracer0 object('>', name.c_str());
  char buffer[16];
  EXPECT_EQ(object.GetStringContentsA(buffer, sizeof buffer), buffer);
  EXPECT_STREQ(buffer, "Func: nnnnnnnnn");
  EXPECT_EQ(object.GetStringContentsA(buffer, 0), buffer);
}

std::wstring g_callbackDirectory;

TEST(Tracer, APendingCallbackStartsTheLogWhenTheMaskIsAsked) {
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
