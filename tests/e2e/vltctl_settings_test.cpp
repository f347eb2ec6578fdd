// vltctl settings and url beside what the library itself answers.
#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>

#include "source/Utilities/vltutils.h"
#include "tests/e2e/Start.h"
#include "tests/e2e/Vltctl.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;
using nlohmann::json;

class VltctlSettings : public testing::Test {
 protected:
  VltctlSettings() { fs::create_directories(m_installation.root() + "/Data"); }
  std::string file() const { return m_installation.root() + "/Data/kor.ini"; }
  static json value(const std::string& name) {
    return ItemWith(VltctlJson({"settings"}).items, "name", name)["value"];
  }
  Installation m_installation;
};

// What the library's calls answer in a process of their own, by the names of the settings.
void ExpectLibraryAgrees() {
  json items = VltctlJson({"settings"}).items;
  auto number = [&](const char* name) -> long { return ItemWith(items, "name", name)["value"]; };
  ExpectInChild([&] {
    unsigned limit = 0, percent = 0, journaling = 0, validate = 0, create = 0, remote = 0;
    long backup = 0, checkpoints = 0;
    vltGetClientCacheSettings(&limit, &percent, nullptr, nullptr, nullptr, nullptr, 0, nullptr);
    vltGetServerSettings(3, &remote, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr,
                         nullptr, &backup, 0, nullptr, &journaling, &validate, &checkpoints,
                         &create);
    EXPECT_EQ(number("ClientObjectCacheLimit"), limit);
    EXPECT_EQ(number("ClientObjectCacheFlushPercentage"), percent);
    EXPECT_EQ(number("MaxBackupFrequency"), backup);
    EXPECT_EQ(number("NumCheckpoints"), checkpoints);
    EXPECT_EQ(number("JournalingOptions"), journaling);
    EXPECT_EQ(number("ValidateDBStructure"), validate);
    EXPECT_EQ(number("CreateCheckpoints"), create);
    EXPECT_EQ(number("RemoteServerEnabled3"), remote);
  });
}

TEST_F(VltctlSettings, ValuesAreThoseThatTheLibraryAnswers) {
  const char* const texts[] = {
      "",
      "[STORAGE]\nClientObjectCacheLimit = 12 potatoes\nNumCheckpoints = -7\nJournalingOptions=9\n",
      "[STORAGE]\nMaxBackupFrequency=1\nmaxbackupfrequency=2\nCreateCheckpoints=no\n",
      "[storage]\nRemoteServerEnabled3 = 5\nValidateDBStructure = "
      "\"0\"\n[other]\nNumCheckpoints=3\n"
      "[STORAGE]\nNumCheckpoints=4\n",
      "\xEF\xBB\xBF[STORAGE]\r\nClientObjectCacheLimit=-1\r\nNumCheckpoints=\r\n"};
  for (const char* text : texts) {
    SCOPED_TRACE(text);
    WriteBytes(file(), text);
    ExpectLibraryAgrees();
  }
}

TEST_F(VltctlSettings, EachValueHasItsLine) {
  WriteBytes(file(), "; note\n[STORAGE]\nNumCheckpoints = 007\n");
  json item = ItemWith(VltctlJson({"settings"}).items, "name", "NumCheckpoints");
  EXPECT_EQ(item, (json{{"name", "NumCheckpoints"},
                        {"value", 7},
                        {"origin", file() + ":3"},
                        {"file", file()},
                        {"line", 3},
                        {"written", "007"}}));
}

TEST_F(VltctlSettings, SetSavesWithADigestAndTheLibraryReadsIt) {
  WriteBytes(file(), "[STORAGE]\nEventNameAppend3 = x\n");
  ProgramResult result = Vltctl({"settings", "set", "NumCheckpoints", "42"});
  EXPECT_EQ(result.exitCode, kGood) << result.err;
  EXPECT_EQ(result.out, file() + ": NumCheckpoints = 42\n");
  EXPECT_EQ(ReadBytes(file()), "[STORAGE]\nEventNameAppend3 = x\nNumCheckpoints = 42\n");
  EXPECT_EQ(VltctlJson({"verify", file()}).items.at(0)["state"], "sound");
  EXPECT_EQ(value("NumCheckpoints"), 42);
  ExpectLibraryAgrees();
}

TEST_F(VltctlSettings, SetMakesTheFile) {
  fs::remove_all(m_installation.root() + "/Data");
  EXPECT_EQ(Vltctl({"settings", "set", "LocalServerEndpoint3", "7777"}).exitCode, kGood);
  EXPECT_EQ(value("LocalServerEndpoint3"), "7777");
  EXPECT_EQ(Vltctl({"settings", "set", "--name", "other", "LocalServerEndpoint4", "1"}).exitCode,
            kGood);
  EXPECT_TRUE(Exists(m_installation.root() + "/Data/other.ini"));
}

TEST_F(VltctlSettings, SetSaysThatCommentsGo) {
  WriteBytes(file(), "; note\n[STORAGE]\nNumCheckpoints = 1\n");
  EXPECT_EQ(Vltctl({"settings", "set", "NumCheckpoints", "2"}).err,
            "vltctl: " + file() +
                ": its comments and empty lines are gone, as with each save of the library\n");
}

// ---- url

TEST_F(VltctlSettings, UrlIsWhereAServerOfTheInstallationListens) {
  TempDir here;
  WriteBytes(file(), "[STORAGE]\nLocalServerEndpoint3 = 7777\n");
  ProgramResult result =
      RunProgram({"sh", "-c", "cd \"$1\" && exec \"$2\" url", "sh", here.path(), kVltctl});
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_EQ(result.out, "127.0.0.1:7777\n");
  EXPECT_EQ(
      result.err,
      "vltctl: vltGetLocalConfigurationURL answers 127.0.0.1:61900 in this directory: it reads "
      "kor.ini of the working directory, not " +
          file() + "\n");
  EXPECT_TRUE(fs::is_empty(here.path()));
}

TEST_F(VltctlSettings, UrlSaysWhatTheLibraryAnswers) {
  TempDir here;
  ASSERT_EQ(chdir(here.path().c_str()), 0);
  for (const char* text : {"[STORAGE]\nLocalServerEndpoint3 = 5\n", ""}) {
    WriteBytes(here / "kor.ini", text);
    std::string library = VltctlJson({"url"}).items.at(0)["library"];
    ExpectInChild([&] {
      wchar_t* url = nullptr;
      ASSERT_EQ(vltGetLocalConfigurationURL(&url), S_OK);
      EXPECT_EQ(std::wstring(library.begin(), library.end()), url);
      vltFree(url);
    });
  }
}

}  // namespace
}  // namespace vlt::test
