// vltctl doctor, paths, error and locks.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <functional>

#include "source/Common/vltTypes.h"
#include "tests/e2e/Start.h"
#include "tests/e2e/Vltctl.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;
using nlohmann::json;

class VltctlDoctor : public testing::Test {
 protected:
  VltctlDoctor() {
    ExpectStart([](IvltRegistrar&) {});
  }
  std::string root() const { return m_installation.root(); }
  static json sign(const std::string& code) {
    return ItemWith(VltctlJson({"doctor"}).items, "code", code);
  }
  Installation m_installation;
};

// ---- doctor

TEST_F(VltctlDoctor, AFreshInstallationHasNothingBad) {
  fs::create_directory(root() + "/Experts");
  ProgramResult result = Vltctl({"doctor"}, {{"LC_ALL", "C.UTF-8"}});
  EXPECT_EQ(result.exitCode, kGood) << result.out;
  EXPECT_EQ(result.out.find("BAD"), std::string::npos) << result.out;
  EXPECT_EQ(result.out.find("warn"), std::string::npos) << result.out;
  EXPECT_NE(result.out.find("\nok  the digest matches"), std::string::npos) << result.out;
}

struct Illness {
  std::string code, level;
  std::function<void(const std::string& root)> make;
};

TEST_F(VltctlDoctor, EachIllnessHasItsSign) {
  const Illness illnesses[] = {
      {"no-install-directory", "BAD", [](auto&) { Installation::setDir(""); }},
      {"directory-missing", "warn", [](auto& root) { fs::remove_all(root + "/Experts"); }},
      {"directory-unusable", "BAD",
       [](auto& root) {
         fs::remove_all(root + "/Data");
         WriteBytes(root + "/Data", "");
       }},
      {"sidecar-short", "BAD", [](auto& root) { WriteBytes(root + "/vlt.vl5", "x"); }},
      {"digest-differs", "warn",
       [](auto& root) { WriteBytes(root + "/vlt.vl5", std::string(16, 'x')); }},
      {"hook-armed", "warn",
       [](auto& root) { WriteBytes(root + "/VLTHooks.ini", "[Hook]\nName = x\n"); }},
      {"shared-closed", "BAD", [](auto&) {
         chmod((std::string(getenv("ZTFNDTMPSHAREDFILEDIR")) + "/mutex").c_str(), 0700);
       }}};
  for (const Illness& illness : illnesses) {
    Installation fresh;
    ExpectStart([](IvltRegistrar&) {});
    illness.make(fresh.root());
    json found = sign(illness.code);
    ASSERT_TRUE(found.is_object()) << illness.code;
    EXPECT_EQ(found["level"], illness.level) << illness.code;
    EXPECT_TRUE(found["next"].is_string()) << illness.code;
    EXPECT_EQ(Vltctl({"doctor"}).exitCode, illness.level == "BAD" ? kNotFound : kGood);
    chmod((std::string(getenv("ZTFNDTMPSHAREDFILEDIR")) + "/mutex").c_str(), 0777);
  }
}

TEST_F(VltctlDoctor, WithoutALocaleItWarns) {
  ProgramResult result =
      RunProgram({"env", "-u", "LANG", "-u", "LC_ALL", "-u", "LC_CTYPE", kVltctl, "doctor"});
  EXPECT_NE(result.out.find("set LANG=C.UTF-8 for services and cron jobs\n"), std::string::npos)
      << result.out;
}

// ---- paths

TEST_F(VltctlDoctor, PathsHaveTheirOrigin) {
  json items = VltctlJson({"paths"}).items;
  const std::string preference = std::string(getenv("XDG_CONFIG_HOME")) + "/com.zentrex.kor.ini";
  EXPECT_EQ(ItemWith(items, "name", "preference")["path"], preference);
  EXPECT_EQ(ItemWith(items, "name", "install directory"), (json{{"name", "install directory"},
                                                                {"path", root()},
                                                                {"state", "directory"},
                                                                {"origin", preference}}));
  EXPECT_EQ(ItemWith(items, "name", "database")["state"], "file");
  EXPECT_EQ(ItemWith(items, "name", "settings")["state"], "missing");
  EXPECT_EQ(ItemWith(items, "name", "locks")["origin"], "ZTFNDTMPSHAREDFILEDIR");
  fs::remove(preference);
  items = VltctlJson({"paths"}).items;
  EXPECT_EQ(ItemWith(items, "name", "install directory")["path"],
            "/Library/Application Support/Zentrex/KOR");
  EXPECT_EQ(ItemWith(items, "name", "install directory")["origin"], "built-in default");
}

// ---- error

TEST_F(VltctlDoctor, ErrorTakesEachFormOfACodeAndNames) {
  const std::vector<std::pair<std::string, std::string>> rows = {
      {"0x80040326", "VLT_E_UUID_ENTRY"},
      {"80040326", "VLT_E_UUID_ENTRY"},
      {"-2147220698", "VLT_E_UUID_ENTRY"},
      {"2147746598", "VLT_E_UUID_ENTRY"},
      {"vlt_e_uuid_entry", "VLT_E_UUID_ENTRY"},
      {"0", "S_OK"},
      {"1", "S_FALSE"},
      {"0x8ABC700F", "InvalidArgument"},
      {"BadGuidString", "BadGuidString"}};
  for (const auto& [word, name] : rows) {
    JsonResult result = VltctlJson({"error", word});
    EXPECT_EQ(result.exitCode, kGood) << word;
    ASSERT_EQ(result.items.size(), 1u) << word;
    EXPECT_EQ(result.items[0]["name"], name) << word;
  }
  EXPECT_EQ(VltctlJson({"error", "E_FAIL"}).items.at(0)["code"], 0x80004005u);
  // A code that two classes share has two rows.
  EXPECT_EQ(VltctlJson({"error", "0x8ABC7007"}).items.size(), 2u);
  EXPECT_GT(VltctlJson({"error"}).items.size(), 30u);
}

// ---- locks

class VltctlDoctorLocks : public VltctlDoctor {
 protected:
  const std::string m_locks = std::string(getenv("ZTFNDTMPSHAREDFILEDIR")) + "/mutex";
  std::string log(unsigned pid) const {
    char name[64];
    snprintf(name, sizeof name, "/20260101_000000-vlTracer-%08X.log", pid);
    return m_locks + name;
  }
  // The id of a process that has ended.
  static pid_t ended() {
    Child child([] { return 0; });
    pid_t pid = child.pid();
    EXPECT_EQ(child.wait(), 0);
    return pid;
  }
};

TEST_F(VltctlDoctorLocks, AHeldLockNamesItsHolder) {
  Server server;
  ASSERT_TRUE(server.isReady());
  std::vector<json> holders;
  for (const json& lock : VltctlJson({"locks"}).items) {
    if (!lock["holders"].empty()) holders.push_back(lock["holders"][0]);
  }
  ASSERT_EQ(holders.size(), 1u);
  EXPECT_EQ(holders[0], (json{{"pid", server.pid()}, {"command", "e2e_tests"}}));
  EXPECT_NE(Vltctl({"locks"}).out.find("held by e2e_tests (pid "), std::string::npos);
  EXPECT_EQ(server.end(), 0);
}

TEST_F(VltctlDoctorLocks, SweepRemovesLocksOfLogsOfEndedProcessesOnly) {
  std::string dead = log(static_cast<unsigned>(ended())),
              alive = log(static_cast<unsigned>(getpid()));
  std::string busy = log(static_cast<unsigned>(ended())), other = m_locks + "/SOMEFILEINI";
  for (const std::string& file : {dead, alive, other}) WriteBytes(file, "");
  Vltctl({"locks"});
  EXPECT_TRUE(Exists(dead));  // nothing goes without being asked
  ProgramResult result = Vltctl({"locks", "--sweep"});
  EXPECT_EQ(result.exitCode, kGood) << result.err;
  EXPECT_FALSE(Exists(dead));
  EXPECT_TRUE(Exists(alive));
  EXPECT_TRUE(Exists(other));
  // One that a process has locked, whoever it belongs to, stays.
  WriteBytes(busy, "");
  int fd = open(busy.c_str(), O_RDWR | O_CLOEXEC);
  ASSERT_EQ(flock(fd, LOCK_EX), 0);
  Vltctl({"locks", "--sweep"});
  EXPECT_TRUE(Exists(busy));
  close(fd);
}

TEST_F(VltctlDoctorLocks, WhatIsNoFileIsNotTouched) {
  // Of two that were there at once, so that their ids differ.
  Child first([] { return 0; }), second([] { return 0; });
  std::string directory = log(static_cast<unsigned>(first.pid())),
              link = log(static_cast<unsigned>(second.pid()));
  EXPECT_EQ(first.wait() + second.wait(), 0);
  TempDir elsewhere;
  WriteBytes(elsewhere / "file", "");
  fs::create_directory(directory);
  fs::create_symlink(elsewhere / "file", link);
  Vltctl({"locks", "--sweep"});
  EXPECT_TRUE(Exists(directory));
  EXPECT_TRUE(Exists(link));
  EXPECT_TRUE(Exists(elsewhere / "file"));
}

}  // namespace
}  // namespace vlt::test
