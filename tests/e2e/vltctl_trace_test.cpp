// trace -f: the lines of a process's log while they are written.
#include <gtest/gtest.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>

#include "tests/e2e/RunningVltctl.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

// A process that lives until it is told to end, for a log to belong to.
class Writer {
 public:
  pid_t pid() const { return m_pid; }
  void end() {
    m_end.notify();
    EXPECT_EQ(m_child.wait(), 0);
  }

 private:
  Signal m_end;
  Child m_child{[this] { return m_end.await() ? 0 : 1; }};
  const pid_t m_pid = m_child.pid();
};

class VltctlTrace : public testing::Test {
 protected:
  ~VltctlTrace() override { fs::remove_all(m_logs); }

  std::string log(pid_t pid, const std::string& start = "20260101_000000") const {
    char name[64];
    snprintf(name, sizeof name, "%s-vlTracer-%08X.log", start.c_str(), static_cast<unsigned>(pid));
    return m_logs + name;
  }
  void append(const std::string& file, const std::string& text) const {
    fs::create_directories(m_logs);
    std::ofstream(file, std::ios::app) << text;
  }

  const std::string m_logs =
      geteuid() == 0 ? "/Library/Logs/KOR/" : std::string(getenv("HOME")) + "/Library/Logs/KOR/";
  Writer m_writer;
};

TEST_F(VltctlTrace, LinesArePrintedAsTheyCome) {
  const std::string file = log(m_writer.pid());
  append(file, "  one\n  tw");
  RunningVltctl trace({"trace", "-f"});
  ASSERT_TRUE(trace.prints("  one\n"));
  append(file, "o\n  three\n");
  ASSERT_TRUE(trace.prints("  one\n  two\n  three\n"));
  EXPECT_EQ(trace.stop(), kGood);
  EXPECT_EQ(trace.err(), "vltctl: following " + file + "\n");
}

TEST_F(VltctlTrace, OfALongLogTheLastTenLinesCount) {
  const std::string file = log(m_writer.pid());
  std::string last;
  for (int n = 0; n < 300000; ++n) last += "  " + std::to_string(n) + "\n";
  append(file, last);
  RunningVltctl trace({"trace", "--follow"});
  ASSERT_TRUE(trace.prints("  299999\n"));
  EXPECT_EQ(trace.out().substr(0, 9), "  299990\n");
  EXPECT_EQ(trace.stop(SIGTERM), kGood);
}

TEST_F(VltctlTrace, ItEndsWithTheProcessAndWhatThatWroteLast) {
  const std::string file = log(m_writer.pid());
  append(file, "  one\n");
  RunningVltctl trace({"trace", "-f", std::to_string(m_writer.pid())});
  ASSERT_TRUE(trace.prints("  one\n"));
  append(file, "  last, without its end");
  m_writer.end();
  EXPECT_EQ(trace.wait(), kGood);
  EXPECT_EQ(trace.out(), "  one\n  last, without its end\n");
  EXPECT_EQ(trace.err(), "vltctl: following " + file + "\nvltctl: process " +
                             std::to_string(m_writer.pid()) + " has ended\n");
}

TEST_F(VltctlTrace, ALogThatIsCutIsReadFromItsBeginning) {
  const std::string file = log(m_writer.pid());
  append(file, "  a long first line\n");
  RunningVltctl trace({"trace", "-f"});
  ASSERT_TRUE(trace.prints("  a long first line\n"));
  fs::resize_file(file, 0);
  ASSERT_TRUE(Eventually([&] { return trace.err().find("was cut") != std::string::npos; }));
  append(file, "  new\n");
  ASSERT_TRUE(trace.prints("  a long first line\n  new\n"));
  EXPECT_EQ(trace.stop(), kGood);
}

TEST_F(VltctlTrace, ALogThatIsRotatedIsReadToItsEndAndThenTheNewOne) {
  const std::string file = log(m_writer.pid());
  append(file, "  one\n");
  RunningVltctl trace({"trace", "-f"});
  ASSERT_TRUE(trace.prints("  one\n"));
  fs::rename(file, m_logs + "old");
  ASSERT_TRUE(
      Eventually([&] { return trace.err().find("removed or renamed") != std::string::npos; }));
  append(m_logs + "old", "  two\n");
  ASSERT_TRUE(trace.prints("  one\n  two\n"));
  append(file, "  three\n");
  ASSERT_TRUE(trace.prints("  one\n  two\n  three\n"));
  EXPECT_EQ(trace.stop(), kGood);
}

TEST_F(VltctlTrace, ALogThatIsRemovedIsReadOn) {
  const std::string file = log(m_writer.pid());
  append(file, "  one\n");
  std::ofstream open(file, std::ios::app);
  RunningVltctl trace({"trace", "-f"});
  ASSERT_TRUE(trace.prints("  one\n"));
  fs::remove(file);
  open << "  two\n" << std::flush;
  ASSERT_TRUE(trace.prints("  one\n  two\n"));
  EXPECT_EQ(trace.stop(), kGood);
}

TEST_F(VltctlTrace, TheLogOfAProcessIsAwaited) {
  Writer other;
  append(log(other.pid(), "20270101_000000"), "  newer\n");
  RunningVltctl trace({"trace", "-f", std::to_string(m_writer.pid())});
  ASSERT_TRUE(
      Eventually([&] { return trace.err().find("there is no log yet") != std::string::npos; }));
  append(log(m_writer.pid()), "  mine\n");
  ASSERT_TRUE(trace.prints("  mine\n"));
  EXPECT_EQ(trace.out(), "  mine\n");
  EXPECT_EQ(trace.stop(), kGood);
}

TEST_F(VltctlTrace, OfAProcessThatHasEndedWithoutALogThereIsNone) {
  m_writer.end();
  JsonResult result = VltctlJson({"trace", "-f", std::to_string(m_writer.pid())});
  EXPECT_EQ(result.exitCode, kNotFound);
  EXPECT_EQ(result.problems.at(0)["code"], "no-log");
}

// The places are shown all the same.
TEST_F(VltctlTrace, WithoutFollowingALogThatIsMissingIsReported) {
  const std::string pid = std::to_string(m_writer.pid());
  ProgramResult runs = Vltctl({"trace", pid});
  EXPECT_EQ(runs.exitCode, kNotFound);
  EXPECT_NE(runs.out.find(m_logs), std::string::npos) << runs.out;
  EXPECT_EQ(runs.err,
            "vltctl: " + m_logs + ": there is no log of process " + pid +
                ": it has traced nothing yet, or runs as another user, whose logs are elsewhere; "
                "\"vltctl trace -f " +
                pid + "\" waits for its first line\n");
  m_writer.end();
  JsonResult ended = VltctlJson({"trace", pid});
  EXPECT_EQ(ended.exitCode, kNotFound);
  EXPECT_EQ(ItemWith(ended.items, "name", "directory")["value"], m_logs);
  EXPECT_EQ(ended.problems.at(0)["code"], "no-log");
  EXPECT_EQ(ended.problems.at(0)["why"], "no process with this id runs");
}

// Of no process in particular there may be none.
TEST_F(VltctlTrace, WithoutAPidThePlacesAreAllThereIs) {
  ProgramResult result = Vltctl({"trace"});
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_NE(result.out.find(m_logs), std::string::npos) << result.out;
  EXPECT_EQ(result.err, "");
}

TEST_F(VltctlTrace, AsJsonEachLineIsAnItem) {
  append(log(m_writer.pid()), "  one\n  two\n");
  RunningVltctl trace({"trace", "-f", "--json"});
  ASSERT_TRUE(trace.prints("  two"));
  EXPECT_EQ(trace.stop(), kGood);
  nlohmann::json items = Document(trace.out())["items"];
  ASSERT_EQ(items.size(), 2u);
  EXPECT_EQ(items[1]["value"], "  two");
  EXPECT_EQ(items[1]["origin"], log(m_writer.pid()));
}

TEST_F(VltctlTrace, WithoutFollowingThePidChoosesTheLog) {
  append(log(1, "20270101_000000"), "  newer\n");
  append(log(m_writer.pid()), "  mine\n");
  std::string out = Vltctl({"trace", std::to_string(m_writer.pid())}).out;
  EXPECT_NE(out.find("|   mine\n"), std::string::npos) << out;
  EXPECT_EQ(Vltctl({"trace", "0"}).exitCode, kUsage);
  EXPECT_EQ(Vltctl({"trace", "x"}).exitCode, kUsage);
}

}  // namespace
}  // namespace vlt::test
