// What vltctl says in each bad situation: the whole text, and the exit code.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <functional>

#include "tests/e2e/Start.h"
#include "tests/e2e/Vltctl.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

void Replace(std::string* text, const std::string& word, const std::string& by) {
  for (size_t at; (at = text->find(word)) != std::string::npos;) text->replace(at, word.size(), by);
}

// ROOT is the install directory, CONFIG that of the preference.
std::string With(std::string text, const std::string& root) {
  Replace(&text, "ROOT", root);
  Replace(&text, "CONFIG", getenv("XDG_CONFIG_HOME"));
  return text;
}

struct Situation {
  const char* name;
  std::vector<std::string> command;
  int code;
  std::string text;
  std::function<void(const std::string& root)> make;
};

void Kor(const std::string& root, const std::string& text) {
  fs::create_directories(root + "/Data");
  WriteBytes(root + "/Data/kor.ini", text);
}

const Situation kSituations[] = {
    {"no install directory",
     {"list", "--live"},
     kDataUnusable,
     "vltctl: CONFIG/com.zentrex.kor.ini: the preference \"Dir\" is empty, so there is no "
     "installation; "
     "set it "
     "to the install directory, or remove it for the default\n",
     [](auto&) { Installation::setDir(""); }},
    {"install directory is a file",
     {"list", "--live"},
     kDataUnusable,
     "vltctl: ROOT: is no directory; move what is there out of the way\n",
     [](auto& root) {
       fs::remove_all(root);
       WriteBytes(root, "");
     }},
    {"Data is a file",
     {"list", "--live"},
     kDataUnusable,
     "vltctl: ROOT/Data: is no directory; move what is there out of the way\n",
     [](auto& root) { WriteBytes(root + "/Data", ""); }},
    {"database is a pipe",
     {"list"},
     kDataUnusable,
     "vltctl: ROOT/vlt.vlr: the file cannot be read: it is no regular file; put a readable INI "
     "file in its place, or remove it\n",
     [](auto& root) { ASSERT_EQ(mkfifo((root + "/vlt.vlr").c_str(), 0666), 0); }},
    {"database is a directory",
     {"list"},
     kDataUnusable,
     "vltctl: ROOT/vlt.vlr: the file cannot be read: it is a directory; put a readable INI file in "
     "its place, or remove it\n",
     [](auto& root) { fs::create_directory(root + "/vlt.vlr"); }},
    {"short sidecar",
     {"list"},
     kDataUnusable,
     "vltctl: ROOT/vlt.vlr: the sidecar is short; \"vltctl repair\" keeps the file and gives it a "
     "sidecar\n",
     [](auto& root) {
       WriteBytes(root + "/vlt.vlr", "[a]\nb=1\n");
       WriteBytes(root + "/vlt.vl5", "short");
     }},
    {"sidecar is a directory",
     {"check"},
     kDataUnusable,
     "vltctl: ROOT/vlt.vlr: the sidecar is a directory; \"vltctl repair\" keeps the file and gives "
     "it a "
     "sidecar\n",
     [](auto& root) {
       WriteBytes(root + "/vlt.vlr", "[a]\nb=1\n");
       fs::create_directory(root + "/vlt.vl5");
     }},
    {"unparsable, and the digest differs",
     {"show", GText(1)},
     kDataUnusable,
     "vltctl: ROOT/vlt.vlr: the file cannot be parsed, and the digest differs; \"vltctl repair\" "
     "converts it to UTF-8\n",
     [](auto& root) {
       WriteBytes(root + "/vlt.vlr", "\xFF\xFE[");
       WriteBytes(root + "/vlt.vl5", std::string(16, 'x'));
     }},
    {"no jar",
     {"jar"},
     kNotFound,
     "vltctl: ROOT/Data/vltjar.ini: there is no jar; a server makes it when it starts\n",
     [](auto&) {}},
    {"jar is a directory",
     {"jar"},
     kDataUnusable,
     "vltctl: ROOT/Data/vltjar.ini: cannot be read: it is a directory\n",
     [](auto& root) { fs::create_directories(root + "/Data/vltjar.ini"); }},
    {"no identity",
     {"identity"},
     kDataUnusable,
     "vltctl: ROOT/Data/vltjar.ini: there is no identity, and none can be made; install the "
     "library "
     "\"ZT-RPC\", which makes identifiers, or start the server once\n",
     [](auto&) {}},
    {"settings: misspelt",
     {"settings"},
     kNotFound,
     "vltctl: ROOT/Data/kor.ini:2: NumChekpoints is ignored: there is no such setting; did you "
     "mean "
     "\"NumCheckpoints\"?\n",
     [](auto& root) { Kor(root, "[STORAGE]\nNumChekpoints = 5\n"); }},
    {"settings: unknown",
     {"settings"},
     kNotFound,
     "vltctl: ROOT/Data/kor.ini:2: Potatoes is ignored: there is no such setting; \"vltctl "
     "settings\" "
     "shows all\n",
     [](auto& root) { Kor(root, "[STORAGE]\nPotatoes = 5\n"); }},
    {"settings: no number",
     {"settings"},
     kNotFound,
     "vltctl: ROOT/Data/kor.ini:2: \"12 potatoes\" counts as 12: \" potatoes\" is no part of a "
     "number; "
     "write the number alone\nvltctl: ROOT/Data/kor.ini:3: \"many\" counts as 0: it does not begin "
     "with "
     "a number; write the number alone\n",
     [](auto& root) {
       Kor(root, "[STORAGE]\nNumCheckpoints = 12 potatoes\nMaxBackupFrequency = many\n");
     }},
    {"settings: set twice",
     {"settings"},
     kNotFound,
     "vltctl: ROOT/Data/kor.ini:2: NumCheckpoints is ignored: line 3 sets it again; remove one of "
     "them\n",
     [](auto& root) { Kor(root, "[STORAGE]\nNumCheckpoints=1\nnumcheckpoints=2\n"); }},
    {"settings: no line",
     {"settings"},
     kNotFound,
     "vltctl: ROOT/Data/kor.ini:2: \"hello\" is ignored: it is neither a section nor a name with a "
     "value; write NAME = VALUE\n",
     [](auto& root) { Kor(root, "[STORAGE]\nhello\n"); }},
    {"settings: elsewhere",
     {"settings"},
     kNotFound,
     "vltctl: ROOT/Data/kor.ini:1: NumCheckpoints is ignored: it is above the first section; move "
     "it "
     "into [STORAGE]\nvltctl: ROOT/Data/kor.ini:3: NumCheckpoints is ignored: it is in section "
     "[other]; "
     "move it into [STORAGE]\n",
     [](auto& root) { Kor(root, "NumCheckpoints=1\n[other]\nNumCheckpoints=1\n"); }},
    {"settings: unparsable",
     {"settings"},
     kNotFound,
     "vltctl: ROOT/Data/kor.ini: nothing of it is in force: the file cannot be parsed; \"vltctl "
     "repair\" converts it to UTF-8\n",
     [](auto& root) { Kor(root, "\xFF\xFE["); }},
    {"settings: a directory",
     {"settings"},
     kDataUnusable,
     "vltctl: ROOT/Data/kor.ini: the file cannot be read: it is a directory; put a readable INI "
     "file in its place, or remove it\n",
     [](auto& root) { fs::create_directories(root + "/Data/kor.ini"); }},
    {"settings: a path for a name",
     {"settings", "--name", "../x"},
     kUsage,
     "vltctl: --name: \"../x\" is no name of a file; give the name without directory and without "
     "\".ini\"\n",
     [](auto&) {}},
    {"settings: no index",
     {"settings", "--index", "x"},
     kUsage,
     "vltctl: --index: \"x\" is no number; give digits, from 0 to 4294967295\n",
     [](auto&) {}},
    {"settings set: misspelt",
     {"settings", "set", "NumCheckpoint", "1"},
     kUsage,
     "vltctl: no such setting: NumCheckpoint; did you mean \"NumCheckpoints\"?\n",
     [](auto&) {}},
    {"settings set: no number",
     {"settings", "set", "NumCheckpoints", "1x"},
     kUsage,
     "vltctl: NumCheckpoints: \"1x\" is no value of it; give a number\n",
     [](auto&) {}},
    {"settings set: would be lost",
     {"settings", "set", "NumCheckpoints", "1"},
     kDataUnusable,
     "vltctl: ROOT/Data/kor.ini: the sidecar is short; \"vltctl repair\" keeps the file and gives "
     "it a "
     "sidecar\n",
     [](auto& root) {
       Kor(root, "[STORAGE]\nNumCheckpoints=7\n");
       WriteBytes(root + "/Data/kor.vl5", "short");
     }},
    {"hook: no such point",
     {"hook", "arm", "vltjarValidChecksumSte", "fail"},
     kNotFound,
     "vltctl: no such point: vltjarValidChecksumSte; did you mean \"vltjarValidChecksumSet\"?\n",
     [](auto&) {}},
    {"hook: no such flag",
     {"hook", "arm", "vltjarValidChecksumSet", "explode"},
     kUsage,
     "vltctl: no such flag: explode; give hang[=MS], crash, fail, throw or exhaust\n",
     [](auto&) {}},
    {"hook: no time",
     {"hook", "arm", "1", "hang=soon"},
     kUsage,
     "vltctl: \"soon\" is no time to hang for; give milliseconds, from 0 to 2147483647\n",
     [](auto&) {}},
    {"hook: a value too many",
     {"hook", "arm", "1", "crash=1"},
     kUsage,
     "vltctl: crash takes no value; write crash alone\n",
     [](auto&) {}},
    {"hook: no such number",
     {"hook", "arm", "22", "fail"},
     kNotFound,
     "vltctl: no such point: 22; \"vltctl hook list\" shows all\n",
     [](auto&) {}},
    {"verify: files and --all",
     {"verify", "--all", "x"},
     kUsage,
     "vltctl: --all goes without files; give --all, or the files\n",
     [](auto&) {}},
    {"error: mistyped",
     {"error", "E_FIAL"},
     kNotFound,
     "vltctl: the library has no code or name E_FIAL; did you mean \"E_FAIL\"?\n",
     [](auto&) {}},
    {"error: unknown",
     {"error", "0x80041234"},
     kNotFound,
     "vltctl: the library has no code or name 0x80041234; \"vltctl error\" shows all\n",
     [](auto&) {}},
    {"completion: no such shell",
     {"completion", "csh"},
     kUsage,
     "vltctl: no completion for csh; give bash, zsh, fish or man\n",
     [](auto&) {}},
    {"mistyped command",
     {"lsit"},
     kUsage,
     "vltctl: no such command: lsit; did you mean \"list\"?\n",
     [](auto&) {}},
    {"mistyped option",
     {"list", "--jsno"},
     kUsage,
     "vltctl: The following argument was not expected: --jsno; did you mean \"--json\"?\n",
     [](auto&) {}},
};

TEST(VltctlBadSituations, EachHasItsTextAndItsCode) {
  for (const Situation& row : kSituations) {
    Installation installation;
    row.make(installation.root());
    ProgramResult text = Vltctl(row.command);
    EXPECT_EQ(text.err, With(row.text, installation.root())) << row.name;
    EXPECT_EQ(text.exitCode, row.code) << row.name;
    Installation again;
    row.make(again.root());
    JsonResult json = VltctlJson(row.command);
    EXPECT_EQ(json.exitCode, row.code) << row.name;
    EXPECT_FALSE(json.problems.empty()) << row.name;
  }
}

TEST(VltctlBadSituations, BesideAnotherRegistrarNobodyWaits) {
  Installation installation;
  Server server;
  ASSERT_TRUE(server.isReady());
  ProgramResult result = Vltctl({"check"});
  EXPECT_EQ(result.exitCode, kBusy);
  EXPECT_EQ(result.err, "vltctl: " + installation.database() +
                            ": its lock is held by e2e_tests (pid " + std::to_string(server.pid()) +
                            "); end that process, or try again later\n");
  EXPECT_EQ(server.end(), 0);
}

TEST(VltctlBadSituations, AnotherUsersInstallationThatMayNotBeWritten) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: only root can become another user";
  Installation installation;
  RunProgram({"chmod", "-R", "a+rX", getenv("VLT_TEST_ROOT")});
  ExpectInChild([&] {
    ASSERT_EQ(setuid(65534), 0);
    ProgramResult result = Vltctl({"list", "--live"});
    EXPECT_EQ(result.exitCode, kDataUnusable);
    EXPECT_EQ(result.err, "vltctl: " + installation.root() +
                              ": the database cannot be made: Permission denied; run \"vltctl list "
                              "--live\" once as a user who may write there\n");
    for (const auto& [command, file] :
         {std::pair{std::vector<std::string>{"settings", "set", "NumCheckpoints", "5"},
                    installation.root() + "/Data/kor.ini"},
          {{"hook", "arm", "1", "fail"}, installation.root() + "/VLTHooks.ini"}}) {
      result = Vltctl(command);
      EXPECT_EQ(result.exitCode, kCannotWrite);
      EXPECT_EQ(result.err, "vltctl: " + file +
                                ": cannot be written: Permission denied; check the rights to its "
                                "directory and the space on the disk\n");
    }
  });
}

}  // namespace
}  // namespace vlt::test
