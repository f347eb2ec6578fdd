// The commands of vltctl that look at the system's files, and change nothing.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/file.h>
#include <unistd.h>

#include <filesystem>
#include <map>
#include <sstream>

#include "tests/e2e/Vltctl.h"
#include "tests/support/Installation.h"

namespace {

using namespace vlt::test;
using nlohmann::json;

// The rows of a command, by their names.
std::map<std::string, json> Rows(const std::vector<std::string>& arguments) {
  std::map<std::string, json> rows;
  for (const json& item : VltctlJson(arguments).items) rows[item["name"]] = item;
  return rows;
}

class VltctlAdmin : public testing::Test {
 protected:
  VltctlAdmin() : data(installation.root() + "/Data") { std::filesystem::create_directory(data); }
  std::string jar() const { return data + "/vltjar.ini"; }

  Installation installation;
  std::string data;
};

TEST_F(VltctlAdmin, SettingsByIndexNameAndSide) {
  WriteBytes(data + "/other.ini", "[STORAGE]\nLocalServerEndpoint4=9\n");
  auto client = Rows({"settings", "--index", "4", "--name", "other", "--client"});
  EXPECT_EQ(client["LocalServerEndpoint4"]["value"], "9");
  EXPECT_EQ(client["BootstrapEndpoint4"]["origin"], "not set");
  EXPECT_FALSE(client.contains("NumCheckpoints"));
  EXPECT_FALSE(Rows({"settings", "--server"}).contains("ClientObjectCacheLimit"));
}

TEST_F(VltctlAdmin, JarTellsItsSections) {
  EXPECT_EQ(Vltctl({"jar"}).exitCode, 1);
  WriteBytes(jar(), "[CookieSection]\nLastServerCookie=5\n[S]\nServerProcessID=77\n");
  json items = VltctlJson({"jar"}).items;
  EXPECT_EQ(items.at(0),
            (json{{"section", "CookieSection"}, {"name", "LastServerCookie"}, {"value", "5"}}));
  EXPECT_EQ(items.at(1), (json{{"section", "S"}, {"name", "ServerProcessID"}, {"value", "77"}}));
  EXPECT_NE(Vltctl({"jar"}).out.find("ServerProcessID"), std::string::npos);
}

TEST_F(VltctlAdmin, HookIsArmedAndCleared) {
  std::string file = installation.root() + "/VLTHooks.ini";
  std::string point = "TestHookNT\"./source/Common/vltDuplicateString2\"19";
  EXPECT_NE(Vltctl({"hook", "list"}).out.find(point), std::string::npos);
  EXPECT_EQ(VltctlJson({"hook", "list"}).items.size(), 21u);
  EXPECT_EQ(Vltctl({"hook", "arm", point, "hang=25", "fail"}).exitCode, 0);
  EXPECT_EQ(ReadBytes(file), "[Hook]\nName = " + point +
                                 "\nHang = true\nHangTime = 25\n"
                                 "SimulateMemoryAllocationFailure = true\n\n");
  EXPECT_EQ(Vltctl({"hook", "clear"}).exitCode, 0);
  EXPECT_EQ(ReadBytes(file), "");
  EXPECT_EQ(Vltctl({"hook", "arm", "no such point", "fail"}).exitCode, 1);
  EXPECT_EQ(Vltctl({"hook", "arm", point, "nonsense"}).exitCode, 2);
  EXPECT_EQ(Vltctl({"hook", "arm", point}).exitCode, 2);
}

TEST_F(VltctlAdmin, TraceTellsWhereTheLogGoes) {
  auto trace = Rows({"trace"});
  std::string expected =
      geteuid() == 0 ? "/Library/Logs/KOR/" : std::string(getenv("HOME")) + "/Library/Logs/KOR/";
  EXPECT_EQ(trace["directory"]["value"], expected);
  EXPECT_EQ(trace["Severity"]["value"], "1");
  std::filesystem::create_directories(expected);
  WriteBytes(expected + "20260101_000000-vlTracer-00000001.log", "  old\n");
  WriteBytes(expected + "20260102_000000-vlTracer-00000001.log", "  one\n  two\n");
  EXPECT_NE(Vltctl({"trace"}).out.find("|   one\n|   two\n"), std::string::npos);
  std::filesystem::remove_all(expected);
}

TEST_F(VltctlAdmin, UrlAndIdentity) {
  EXPECT_EQ(Vltctl({"identity"}).exitCode, 3);  // without the library that makes GUIDs
  WriteBytes(jar(), "[ServerSection]\nServerIdentity={00000001-0002-0003-0405-060708090A0B}\n");
  EXPECT_EQ(Vltctl({"identity"}).out, "{00000001-0002-0003-0405-060708090A0B}\n");
}

TEST_F(VltctlAdmin, LookingChangesNothingAndWaitsForNobody) {
  if (RunProgram({"strace", "-e", "trace=none", "true"}).exitCode != 0) {
    GTEST_SKIP() << "strace is missing or not permitted";
  }
  WriteBytes(data + "/kor.ini", "[STORAGE]\n");
  WriteBytes(jar(), "[CookieSection]\nLastServerCookie=5\n");
  TempDir dir;
  // Another process has the jar's lock, as a server in the middle of a save would.
  Signal held, release;
  Child holder([&] {
    std::string name;
    for (char c : jar()) {
      if (c != '/' && c != '.') name += static_cast<char>(toupper(c));
    }
    std::string locks = std::string(getenv("ZTFNDTMPSHAREDFILEDIR")) + "/mutex";
    std::filesystem::create_directories(locks);
    int fd = open((locks + "/" + name).c_str(), O_CREAT | O_RDWR, 0666);
    flock(fd, LOCK_EX);
    held.notify();
    release.await();
    return 0;
  });
  ASSERT_TRUE(held.await());
  for (std::vector<std::string> command :
       {std::vector<std::string>{"settings"}, {"jar"}, {"verify", jar()}, {"trace"}, {"events"}}) {
    auto plain = Vltctl(command);  // within its deadline
    EXPECT_EQ(plain.exitCode, 0) << plain.err;
    std::vector<std::string> traced = {"strace", "-f", "-o", dir / "trace", kVltctl};
    traced.insert(traced.end(), command.begin(), command.end());
    // The leak checker of the sanitizer's build cannot work on a traced process.
    EXPECT_EQ(RunProgram(traced, {{"ASAN_OPTIONS", "detect_leaks=0"}}).exitCode, 0);
    std::vector<std::string> changes = Changes(ReadBytes(dir / "trace"));
    EXPECT_TRUE(changes.empty()) << command[0] << ": " << changes[0];
  }
  release.notify();
  EXPECT_EQ(holder.wait(), 0);
}

}  // namespace
