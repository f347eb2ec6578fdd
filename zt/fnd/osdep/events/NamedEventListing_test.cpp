// What an onlooker sees of the events: "vltctl events", which is beside this program.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <map>
#include <memory>
#include <nlohmann/json.hpp>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/EventPlace.h"
#include "tests/support/NamedEventFiles.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/osdep/NamedEvent.h"

namespace zt::fnd::osdep {
namespace {

using nlohmann::json;
using vlt::test::EventPlace;
using vlt::test::Keeper;
using vlt::test::OpenEvent;
using vlt::test::ReadBytes;
using vlt::test::RunProgram;
using vlt::test::WriteBytes;

std::string Vltctl() {
  return std::filesystem::read_symlink("/proc/self/exe").parent_path() / "vltctl";
}

class NamedEventListing : public testing::Test {
 protected:
  void SetUp() override {
    if (!vlt::test::Exists(Vltctl())) GTEST_SKIP() << "NOT TESTED: vltctl is not built";
  }

  // "value; holders" of each row.
  std::map<std::string, std::string> list() const {
    auto result = RunProgram({Vltctl(), "events", "--json"});
    EXPECT_EQ(result.exitCode, 0) << result.err;
    EXPECT_EQ(result.err, "");
    std::map<std::string, std::string> rows;
    const json listed = json::parse(result.out);
    for (const json& event : listed["items"]) {
      std::string holders;
      for (int pid : event["holders"]) holders += " " + std::to_string(pid);
      if (holders.empty()) holders = " no process";
      rows[event["name"]] = event["state"].get<std::string>() + "; held by" + holders;
    }
    return rows;
  }

  EventPlace m_place;
};

using Rows = std::map<std::string, std::string>;

std::string HeldBy(std::set<pid_t> pids) {
  std::string text = "; held by";
  for (pid_t pid : pids) text += " " + std::to_string(pid);
  return text;
}

TEST_F(NamedEventListing, NothingIsAnEmptyList) {
  EXPECT_EQ(Rows(), list());
  EXPECT_EQ(RunProgram({Vltctl(), "events"}).out, "");
}

TEST_F(NamedEventListing, NamesSlotsSetsAndHolders) {
  Keeper other([] { return OpenEvent("alpha"); });
  ASSERT_TRUE(other.good());
  auto alpha = OpenEvent("alpha"), again = OpenEvent("alpha"), beta = OpenEvent("beta", false);
  Rows expected = {{"alpha", "set 1, slot 0" + HeldBy({getpid(), other.pid()})},
                   {"beta", "set 1, slot 1" + HeldBy({getpid()})},
                   {"sem_1", "set of 128 slots, 126 free" + HeldBy({getpid(), other.pid()})}};
  EXPECT_EQ(expected, list());
  alpha.reset();
  again.reset();
  beta.reset();
  expected = {{"alpha", "set 1, slot 0" + HeldBy({other.pid()})},
              {"sem_1", "set of 128 slots, 127 free" + HeldBy({other.pid()})}};
  EXPECT_EQ(expected, list());
}

TEST_F(NamedEventListing, TextHasALineARow) {
  auto event = OpenEvent("name");
  std::string pid = std::to_string(getpid());
  EXPECT_EQ("name   set 1, slot 0               held by " + pid +
                "\nsem_1  set of 128 slots, 127 free  held by " + pid + "\n",
            RunProgram({Vltctl(), "events"}).out);
}

TEST_F(NamedEventListing, SecondSetIsASetToo) {
  std::vector<std::unique_ptr<NamedEvent>> events;
  for (int i = 0; i < 129; ++i) events.push_back(OpenEvent("e" + std::to_string(i)));
  Rows rows = list();
  EXPECT_EQ(rows.size(), 131u);
  EXPECT_EQ("set 2, slot 0" + HeldBy({getpid()}), rows["e128"]);
  EXPECT_EQ("set of 128 slots, 0 free" + HeldBy({getpid()}), rows["sem_1"]);
  EXPECT_EQ("set of 128 slots, 127 free" + HeldBy({getpid()}), rows["sem_2"]);
}

TEST_F(NamedEventListing, EventsOfTheDeadAreHeldByNobody) {
  Keeper killed([] { return OpenEvent("name"); });
  ASSERT_TRUE(killed.good());
  killed.kill();
  Rows expected = {{"name", "set 1, slot 0; held by no process"},
                   {"sem_1", "set of 128 slots, 127 free; held by no process"}};
  EXPECT_EQ(expected, list());
}

TEST_F(NamedEventListing, HeldFilesThatAreGoneAreNamedAsSuch) {
  auto event = OpenEvent("name"), odd = OpenEvent("odd (deleted)");
  std::filesystem::remove(m_place.file("name"));
  Keeper next([] { return OpenEvent("name"); });  // and another one of the name, and all else
  ASSERT_TRUE(next.good());
  Rows rows = list();
  EXPECT_EQ("its file is gone" + HeldBy({getpid(), next.pid()}), rows["name (deleted)"]);
  EXPECT_EQ("set 1, slot 2" + HeldBy({next.pid()}), rows["name"]);
  EXPECT_EQ("set 1, slot 1" + HeldBy({getpid(), next.pid()}), rows["odd (deleted)"]);
  EXPECT_EQ(rows.size(), 4u);
}

TEST_F(NamedEventListing, DamagedFilesAreToldAsWhatTheyAre) {
  auto event = OpenEvent("name");
  std::string good = ReadBytes(m_place.file("sem_1"));
  const std::pair<std::string, std::string> states[] = {
      {"X" + good.substr(1), "not a state file"},
      {good.substr(0, 17), "not a state file"},
      {"", "not a state file"},
      {good.substr(0, 5) + '\0' + good.substr(6), "set of 128 slots, 127 free, not ready"},
      {good.substr(0, 10) + std::string(8, '\xFF') + good.substr(18),
       "set of 128 slots, 4294967295 free"}};
  for (const auto& [bytes, told] : states) {
    WriteBytes(m_place.file("sem_1"), bytes);
    EXPECT_EQ(told + HeldBy({getpid()}), list()["sem_1"]);
    EXPECT_EQ(bytes, ReadBytes(m_place.file("sem_1")));
  }
  WriteBytes(m_place.file("sem_1"), good);
  WriteBytes(m_place.file("short"), "12345678");
  EXPECT_EQ(list()["short"], "no place yet; held by no process");
}

TEST_F(NamedEventListing, WhatIsNoFileOfAnEventIsNotWaitedFor) {
  auto event = OpenEvent("name");
  ASSERT_EQ(mkfifo(m_place.file("fifo").c_str(), 0666), 0);
  ASSERT_EQ(mkdir(m_place.file("directory").c_str(), 0777), 0);
  ASSERT_EQ(symlink("/dev/zero", m_place.file("device").c_str()), 0);
  ASSERT_EQ(symlink("/etc/passwd", m_place.file("link").c_str()), 0);
  WriteBytes(m_place.file("large"), "");
  ASSERT_EQ(truncate(m_place.file("large").c_str(), off_t{1} << 40), 0);
  WriteBytes(m_place.file("\x1B[2J\nend"), std::string(9, '\0'));
  Rows rows = list();
  EXPECT_EQ(rows["large"], "set 0, slot 0; held by no process");
  EXPECT_EQ(rows["\x1B[2J\nend"], "set 0, slot 0; held by no process");
  EXPECT_EQ(rows.size(), 4u);
  std::istringstream text(RunProgram({Vltctl(), "events"}).out);
  std::string first;
  std::getline(text, first);
  EXPECT_EQ(first.substr(0, first.find("  ")), "\\x1B[2J\\x0Aend");
}

// Calls of a trace that take a lock, change a file or a semaphore, or end another process's wait.
std::vector<std::string> Disturbances(const std::string& trace) {
  std::vector<std::string> found;
  std::istringstream lines(trace);
  for (std::string line; std::getline(lines, line);) {
    if (line.find(".gcda") != std::string::npos) continue;  // the coverage build's own counters
    for (const char* mark : {"flock(", "F_SETLK", "F_OFD_SETLK", "semop", "semtimedop", "semctl",
                             "semget", "ipc(", "O_CREAT", "O_WRONLY", "O_RDWR", "O_TRUNC",
                             "truncate", "unlink", "rename", "chmod", "chown", "utime", "mkdir"}) {
      if (line.find(mark) != std::string::npos) found.push_back(line);
    }
  }
  return found;
}

TEST_F(NamedEventListing, LookingDisturbsNobody) {
  auto event = OpenEvent("name", false, false), other = OpenEvent("other");
  std::string state = ReadBytes(m_place.file("sem_1")), lock = ReadBytes(m_place.file("name"));
  auto stateTime = std::filesystem::last_write_time(m_place.file("sem_1"));
  auto listing = RunProgram({Vltctl(), "events"});
  EXPECT_EQ(listing.exitCode, 0);
  EXPECT_EQ(state, ReadBytes(m_place.file("sem_1")));
  EXPECT_EQ(lock, ReadBytes(m_place.file("name")));
  EXPECT_EQ(stateTime, std::filesystem::last_write_time(m_place.file("sem_1")));
  EXPECT_FALSE(event->checkOnly());
  EXPECT_EQ((std::vector<std::string>{"name", "other", "sem_1"}), m_place.files());
  if (RunProgram({"strace", "-e", "trace=none", "true"}).exitCode != 0) {
    GTEST_SKIP() << "NOT TESTED: strace is missing or not permitted";
  }
  vlt::test::TempDir dir;
  // The leak checker of the sanitizer's build cannot work on a traced process.
  auto traced = RunProgram({"strace", "-f", "-o", dir / "trace", Vltctl(), "events"},
                           {{"ASAN_OPTIONS", "detect_leaks=0"}});
  EXPECT_EQ(traced.exitCode, 0);
  EXPECT_EQ(listing.out, traced.out);
  EXPECT_NE(std::string::npos, ReadBytes(dir / "trace").find("sem_1"));
  EXPECT_EQ(std::vector<std::string>(), Disturbances(ReadBytes(dir / "trace")));
}

}  // namespace
}  // namespace zt::fnd::osdep
