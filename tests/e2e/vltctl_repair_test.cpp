// vltctl verify and repair: what they say of each state, and that a start of the library confirms it.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <functional>

#include "tests/e2e/Start.h"
#include "tests/e2e/Vltctl.h"
#include "tests/support/PrivateRoot.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;
using nlohmann::json;

std::string Utf16(const std::string& ascii) {
  std::string out = "\xFF\xFE";
  for (char c : ascii) out += std::string{c, '\0'};
  return out;
}

// An installation whose database has been written by a start.
class VltctlRepair : public testing::Test {
 protected:
  VltctlRepair() {
    m_installation.addDictionary("Core", "Core Dictionary", GText(1), 7, "co");
    m_installation.addObjectExpert("Tank", "Tank", GText(2));
    // The second start settles the blank lines, so that a third one writes the same.
    for (int start = 0; start < 2; ++start) ExpectStart([](IvltRegistrar&) {});
    m_text = ReadBytes(file());
  }
  std::string file() const { return m_installation.database(); }
  std::string sidecar() const { return m_installation.sidecar(); }

  json verified() const { return VltctlJson({"verify", file()}).items.at(0); }
  // The copy that a repair has left.
  std::string copy() const {
    for (const auto& entry : fs::directory_iterator(m_installation.root())) {
      if (entry.path().extension() == ".copy") return entry.path();
    }
    return "";
  }

  Installation m_installation;
  std::string m_text;
};

// ---- verify

struct Row {
  std::string state, opening, line, next;
  int code;
  std::function<void(const std::string& file, const std::string& sidecar)> make;
};

const Row kRows[] = {
    {"sound", "takes", "the digest matches; the next open takes the file as it is", "", kGood,
     [](auto&, auto&) {}},
    {"no-sidecar", "takes", "there is no sidecar; the next open takes the file as it is", "", kGood,
     [](auto&, auto& sidecar) { fs::remove(sidecar); }},
    {"first-save", "takes",
     "the sidecar is the mark of a first save under way; the next open takes the file as it is", "",
     kGood, [](auto&, auto& sidecar) { WriteBytes(sidecar, std::string(16, '0')); }},
    {"digest-differs", "takes", "the digest differs; the next open takes the file as it is", "",
     kGood, [](auto&, auto& sidecar) { WriteBytes(sidecar, std::string(16, 'x')); }},
    {"missing", "begins", "the file is missing; the next open makes an empty file", "", kNotFound,
     [](auto& file, auto&) { fs::remove(file); }},
    {"unparsable", "sets-aside",
     "the file cannot be parsed; the next open sets the file aside as .bad and begins an empty one",
     "\"vltctl repair\" converts it to UTF-8", kDataUnusable,
     [](auto& file, auto& sidecar) {
       WriteBytes(file, Utf16("[a]\n"));
       fs::remove(sidecar);
     }},
    {"unparsable-changed", "sets-aside-and-fails",
     "the file cannot be parsed, and the digest differs; the next open sets the file aside as .bad "
     "and fails; the one after it begins an empty one",
     "\"vltctl repair\" converts it to UTF-8", kDataUnusable,
     [](auto& file, auto&) { WriteBytes(file, Utf16("[a]\n")); }},
    {"unreadable", "fails",
     "the file cannot be read: it is a directory; the next open fails and leaves the file",
     "put a readable INI file in its place, or remove it", kDataUnusable,
     [](auto& file, auto&) {
       fs::remove(file);
       fs::create_directory(file);
     }},
    {"sidecar-short", "sets-aside-and-fails",
     "the sidecar is short; the next open sets the file aside as .bad and fails; the one after it "
     "begins an empty one",
     "\"vltctl repair\" keeps the file and gives it a sidecar", kDataUnusable,
     [](auto&, auto& sidecar) { WriteBytes(sidecar, "short"); }},
    {"sidecar-directory", "sets-aside-and-fails",
     "the sidecar is a directory; the next open sets the file aside as .bad and fails; the one "
     "after "
     "it begins an empty one",
     "\"vltctl repair\" keeps the file and gives it a sidecar", kDataUnusable,
     [](auto&, auto& sidecar) {
       fs::remove(sidecar);
       fs::create_directory(sidecar);
     }},
};

TEST_F(VltctlRepair, VerifyHasWordsForEachState) {
  const std::string digest = ReadBytes(sidecar());
  for (const Row& row : kRows) {
    fs::remove_all(file());
    fs::remove_all(sidecar());
    WriteBytes(file(), m_text);
    WriteBytes(sidecar(), digest);
    row.make(file(), sidecar());
    ProgramResult text = Vltctl({"verify", file()});
    EXPECT_EQ(text.out,
              file() + ": " + row.line + "\n" + (row.next.empty() ? "" : "  " + row.next + "\n"));
    EXPECT_EQ(text.exitCode, row.code) << row.state;
    json item = verified();
    EXPECT_EQ(item["state"], row.state);
    EXPECT_EQ(item["opening"], row.opening);
  }
}

TEST_F(VltctlRepair, AFileThatAUserMayNotReadIsUnreadableToThatUser) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: only root can become another user";
  if (!vlt::test::AllMayEnter(VLT_TEST_BIN)) {
    GTEST_SKIP() << "NOT TESTED: another user may not enter the build tree";
  }
  fs::permissions(file(), fs::perms::owner_read);
  ExpectInChild([&] {
    ASSERT_EQ(setuid(65534), 0);
    ProgramResult result = Vltctl({"verify", file()});
    EXPECT_EQ(result.exitCode, kDataUnusable);
    EXPECT_EQ(result.out.substr(0, result.out.find(';')),
              file() + ": the file cannot be read: Permission denied");
  });
}

TEST_F(VltctlRepair, WithoutFilesThoseOfTheInstallationAreVerified) {
  fs::create_directory(m_installation.root() + "/Data");
  WriteBytes(m_installation.root() + "/Data/kor.ini", "[STORAGE]\n");
  WriteBytes(m_installation.root() + "/Data/vldiag.ini", "[vlt]\n");  // which nothing guards
  WriteBytes(m_installation.root() + "/Data/other.ini", "[STORAGE]\n");
  std::vector<std::string> files;
  for (const json& item : VltctlJson({"verify", "--all"}).items) files.push_back(item["file"]);
  EXPECT_EQ(files, (std::vector<std::string>{file(), m_installation.root() + "/Data/kor.ini",
                                             m_installation.root() + "/Data/other.ini"}));
  EXPECT_EQ(Vltctl({"verify", "--all"}).out, Vltctl({"verify"}).out);
}

TEST_F(VltctlRepair, WhereNothingIsThatIsSaid) {
  TempDir empty;
  for (const char* command : {"verify", "repair"}) {
    ProgramResult result = Vltctl({command, "--root", empty.path()});
    EXPECT_EQ(result.exitCode, kGood) << result.err;
    EXPECT_EQ(result.out,
              "there is no database, jar or settings file yet; programs make them when they need "
              "them\n");
  }
}

// ---- repair

// The components of a start after the repair are those of the one before the damage.
void ExpectTheSameComponents() {
  ExpectStart([](IvltRegistrar& registrar) {
    for (uint32_t n : {1u, 2u}) {
      _vltComponent2 record;
      memset(&record, 0, sizeof record);
      EXPECT_EQ(registrar.GetComponent(G(n), &record), S_OK) << n;
      vltutilsFreeComponent2(record);
    }
  });
}

TEST_F(VltctlRepair, WhatWouldBeSetAsideIsTakenByTheNextStart) {
  for (const Row& row : kRows) {
    bool isDamaged = row.state == "first-save" || row.state == "digest-differs" ||
                     row.state.starts_with("sidecar-");
    if (!isDamaged) continue;
    row.make(file(), sidecar());
    ProgramResult repaired = Vltctl({"repair"});
    EXPECT_EQ(repaired.exitCode, kGood) << row.state << repaired.err;
    EXPECT_NE(repaired.out.find("has a new sidecar; what it was is " + copy()), std::string::npos)
        << repaired.out;
    EXPECT_EQ(ReadBytes(copy()), m_text) << row.state;
    EXPECT_EQ(verified()["state"], "sound") << row.state;
    EXPECT_EQ(ReadBytes(file()), m_text) << row.state;
    ExpectTheSameComponents();
    EXPECT_EQ(ReadBytes(file()), m_text) << row.state;  // nothing had to be merged again
    fs::remove(copy());
  }
}

TEST_F(VltctlRepair, ADatabaseInUtf16IsConverted) {
  WriteBytes(file(), Utf16(m_text));
  EXPECT_EQ(VltctlJson({"repair", file()}).items.at(0)["action"], "convert");
  EXPECT_EQ(ReadBytes(copy()), Utf16(m_text));
  EXPECT_EQ(ReadBytes(file()), m_text);
  EXPECT_EQ(verified()["state"], "sound");
  ExpectTheSameComponents();
  EXPECT_EQ(ReadBytes(file()), m_text);
}

TEST_F(VltctlRepair, WhatIsNoTextIsLeftAndSaid) {
  const std::string bytes =
      std::string("\xFF\xFE\x00\xD8", 4) + "x";  // half a character, and half a pair
  WriteBytes(file(), bytes);
  ProgramResult result = Vltctl({"repair", file()});
  EXPECT_EQ(result.exitCode, kDataUnusable);
  EXPECT_EQ(ReadBytes(file()), bytes);
  EXPECT_EQ(copy(), "");
}

TEST_F(VltctlRepair, ADryRunChangesNothing) {
  WriteBytes(sidecar(), "short");
  ProgramResult dry = Vltctl({"repair", "--dry-run"});
  EXPECT_EQ(dry.exitCode, kNotFound);
  EXPECT_EQ(dry.out, file() + ": the sidecar is short: would get a new sidecar\n");
  EXPECT_EQ(ReadBytes(sidecar()), "short");
  EXPECT_EQ(copy(), "");
}

TEST_F(VltctlRepair, WhatIsSoundIsLeftAlone) {
  struct stat before, after;
  ASSERT_EQ(stat(sidecar().c_str(), &before), 0);
  ProgramResult result = Vltctl({"repair"});
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_EQ(result.out, file() + ": the digest matches: nothing to do\n");
  ASSERT_EQ(stat(sidecar().c_str(), &after), 0);
  EXPECT_EQ(before.st_mtim.tv_nsec, after.st_mtim.tv_nsec);
  EXPECT_EQ(copy(), "");
}

TEST_F(VltctlRepair, BesideAServerItIsBusyAndChangesNothing) {
  WriteBytes(sidecar(), std::string(16, 'x'));
  Server server;
  ASSERT_TRUE(server.isReady());
  WriteBytes(sidecar(), std::string(16, 'x'));
  JsonResult result = VltctlJson({"repair"});
  EXPECT_EQ(result.exitCode, kBusy);
  EXPECT_EQ(result.err, "vltctl: " + file() + ": its lock is held by e2e_tests (pid " +
                            std::to_string(server.pid()) +
                            "); end that process, or try again later\n");
  EXPECT_EQ(result.problems.at(0)["code"], "busy");
  EXPECT_EQ(ReadBytes(sidecar()), std::string(16, 'x'));
  EXPECT_EQ(copy(), "");
  EXPECT_EQ(server.end(), 0);
}

}  // namespace
}  // namespace vlt::test
