// vltctl over files that another user has made to harm whoever looks: text that a terminal obeys, files
// that never end, pipes and devices.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "tests/e2e/CheckTree.h"
#include "tests/support/Sanitizer.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

constexpr off_t kHuge = off_t{64} << 30;

// In a locale that can show every character, and with little memory, so that a file that is read to its
// end is noticed. A sanitizer reserves more than that for itself.
ProgramResult Look(const std::vector<std::string>& arguments) {
  std::string command = std::string(kCanLimitMemory ? "ulimit -v 3000000; " : "") + "exec \"$@\"";
  std::vector<std::string> all = {"sh", "-c", command, "sh", std::string(VLT_TEST_BIN) + "/vltctl"};
  all.insert(all.end(), arguments.begin(), arguments.end());
  return RunProgram(all, {{"LC_ALL", "C.UTF-8"}});
}

void ExpectNothingToObey(const std::string& text) {
  for (char c : text) {
    EXPECT_FALSE((static_cast<unsigned char>(c) < 0x20 && c != '\n') || c == 0x7F) << text;
  }
  EXPECT_EQ(text.find("\xC2\x9B"), std::string::npos) << text;
}

void MakeHuge(const std::string& file, const std::string& end = "") {
  WriteBytes(file, "");
  ASSERT_EQ(truncate(file.c_str(), kHuge), 0);
  if (end.empty()) return;
  FILE* out = fopen(file.c_str(), "a");
  ASSERT_NE(out, nullptr);
  fputs(end.c_str(), out);
  fclose(out);
}

class VltctlHostile : public testing::Test {
 protected:
  VltctlHostile() { fs::create_directories(m_data); }
  std::string log(const std::string& name) const { return m_logs + name; }
  void makeLogs() { fs::create_directories(m_logs); }
  ~VltctlHostile() override { fs::remove_all(m_logs); }

  Experts m_installation;
  const std::string m_data = m_installation.root() + "/Data";
  const std::string m_logs =
      geteuid() == 0 ? "/Library/Logs/KOR/" : std::string(getenv("HOME")) + "/Library/Logs/KOR/";
};

// ---- Text

constexpr const char* kEvil = "evil\x1B[31m\x7F\x07\xC2\x9B";
constexpr const char* kShown = "evil\\x1B[31m\\x7F\\x07\\u{9B}";

TEST_F(VltctlHostile, NamesOfComponentsAreShownEscaped) {
  std::string name = kEvil, file = m_installation.file(kEvil);
  m_installation.addBundle("Experts", "x.vle",
                           "[KORComponents]\n" + name + " = \"" + name + "\"\n[" + name +
                               "]\nIdentifier = \"" + GText(1) + "\"\nFileName = \"" + file +
                               "\"\nBINDING_CLASSES = \"{" + GText(1) + "}:1:{" + GText(9) +
                               "}\"\n");
  for (const std::vector<std::string>& command : {std::vector<std::string>{"scan", "--dry-run"},
                                                  {"list", "--live"},
                                                  {"list", "--long"},
                                                  {"show", GText(1)},
                                                  {"show", "evil"},
                                                  {"classes", GText(9)},
                                                  {"why", GText(1)},
                                                  {"check"}}) {
    ProgramResult result = Look(command);
    ExpectNothingToObey(result.out + result.err);
    EXPECT_NE(result.out.find(kShown), std::string::npos) << command[0] << result.out << result.err;
  }
}

TEST_F(VltctlHostile, WhatTheLoaderSaysIsShownEscaped) {
  std::string file = m_installation.add(1, "loader");
  TempDir dir;
  std::string needed = std::string("-Wl,-soname,") + kEvil;
  Build(dir / "libx.so", "int gone() { return 0; }\n", {needed});
  Build(file, std::string("int gone(); int use() { return gone(); }\n") + kGoodEntry,
        {"-L" + dir.path(), "-lx"});
  ProgramResult result = Look({"check", GText(1)});
  ExpectNothingToObey(result.out);
  EXPECT_NE(result.out.find(std::string(kShown) + ": cannot open"), std::string::npos)
      << result.out;
}

TEST_F(VltctlHostile, LinesOfTheLogAreShownEscaped) {
  makeLogs();
  WriteBytes(log("20260101_000000-vlTracer-00000001.log"), std::string("  ") + kEvil + "\n  b\n");
  ProgramResult result = Look({"trace"});
  ExpectNothingToObey(result.out);
  EXPECT_NE(result.out.find(std::string("|   ") + kShown + "\n|   b\n"), std::string::npos);
}

TEST_F(VltctlHostile, ArgumentsAndFileNamesAreShownEscaped) {
  ProgramResult verify = Look({"verify", m_data + "/" + kEvil});
  ExpectNothingToObey(verify.out + verify.err);
  EXPECT_NE(verify.out.find(kShown), std::string::npos);
  for (const std::vector<std::string>& command : {std::vector<std::string>{"list", "--type", kEvil},
                                                  {"settings", kEvil},
                                                  {"hook", "arm", kEvil, "fail"}}) {
    ProgramResult result = Look(command);
    ExpectNothingToObey(result.out + result.err);
    EXPECT_NE(result.err.find(kShown), std::string::npos) << command[0] << result.err;
  }
}

TEST_F(VltctlHostile, ValuesOfFilesAreShownEscaped) {
  std::string evil = kEvil;
  WriteBytes(m_data + "/vltjar.ini", "[" + evil + "]\n" + evil + " = " + evil + "\n");
  ProgramResult jar = Look({"jar"});
  EXPECT_EQ(jar.exitCode, kGood) << jar.err;
  ExpectNothingToObey(jar.out);
  EXPECT_NE(jar.out.find(std::string(kShown) + "  " + kShown), std::string::npos) << jar.out;
  WriteBytes(m_data + "/kor.ini", "[STORAGE]\nLocalServerEndpoint3=" + evil + "\n");
  ProgramResult settings = Look({"settings"});
  ExpectNothingToObey(settings.out);
  EXPECT_NE(settings.out.find(kShown), std::string::npos);
}

// ---- Files

TEST_F(VltctlHostile, TheLogIsTheNewestRegularFile) {
  makeLogs();
  WriteBytes(log("20260101_000000-vlTracer-00000001.log"), "  the log\n");
  ASSERT_EQ(mkfifo(log("20990101_000000-vlTracer-00000001.log").c_str(), 0666), 0);
  fs::create_symlink("/dev/zero", log("20990102_000000-vlTracer-00000001.log"));
  fs::create_directory(log("20990103_000000-vlTracer-00000001.log"));
  fs::create_symlink("/etc/passwd", log("20990104_000000-vlTracer-00000001.log"));
  ProgramResult result = Look({"trace"});
  EXPECT_EQ(result.exitCode, kGood) << result.err;
  EXPECT_NE(result.out.find("|   the log\n"), std::string::npos) << result.out;
}

TEST_F(VltctlHostile, OfALogThatHasGrownTheEndIsRead) {
  makeLogs();
  MakeHuge(log("20260101_000000-vlTracer-00000001.log"), "\n  one\n  two\n");
  ProgramResult result = Look({"trace"});
  EXPECT_EQ(result.exitCode, kGood) << result.err;
  EXPECT_NE(result.out.find("|   one\n|   two\n"), std::string::npos);
}

TEST_F(VltctlHostile, TheLastTenLinesOfALongLogAreWhole) {
  makeLogs();
  std::string text, last;
  for (int n = 0; n < 2000; ++n) text += std::to_string(n) + std::string(2000, 'x') + "\n";
  for (int n = 1990; n < 2000; ++n)
    last += "| " + std::to_string(n) + std::string(2000, 'x') + "\n";
  WriteBytes(log("20260101_000000-vlTracer-00000001.log"), text);
  ProgramResult result = Look({"trace"});
  EXPECT_EQ(result.out.substr(result.out.find("\n| ") + 1), last);
}

TEST_F(VltctlHostile, AHugeFileIsNotRead) {
  struct Case {
    std::vector<std::string> command;
    std::string file;
  };
  const Case cases[] = {{{"jar"}, m_data + "/vltjar.ini"},
                        {{"settings"}, m_data + "/kor.ini"},
                        {{"verify", m_data + "/x.ini"}, m_data + "/x.ini"},
                        {{"hook", "clear"}, m_installation.root() + "/VLTHooks.ini"}};
  for (const Case& c : cases) {
    MakeHuge(c.file);
    ProgramResult result = Look(c.command);
    EXPECT_EQ(result.exitCode, kDataUnusable) << c.command[0] << result.out << result.err;
    if (c.command[0] != "verify") {
      EXPECT_NE(result.err.find("cannot be read: it is larger than 256 MiB"), std::string::npos)
          << result.err;
    }
    fs::remove(c.file);
  }
}

TEST_F(VltctlHostile, OfAHugeSidecarTheDigestIsRead) {
  WriteBytes(m_data + "/x.ini", "[a]\nb = 1\n");
  MakeHuge(m_data + "/x.vl5");
  ProgramResult result = Look({"verify", m_data + "/x.ini"});
  EXPECT_EQ(result.exitCode, kGood) << result.err;
  EXPECT_NE(result.out.find("the digest differs"), std::string::npos) << result.out;
}

TEST_F(VltctlHostile, PipesAndDevicesAreNotOpened) {
  const std::string pipe = m_data + "/pipe", device = m_data + "/device";
  ASSERT_EQ(mkfifo(pipe.c_str(), 0666), 0);
  fs::create_symlink("/dev/zero", device);
  for (const std::string& trap : {pipe, device}) {
    for (const std::string& file :
         {m_data + "/vltjar.ini", m_data + "/kor.ini", m_installation.root() + "/VLTHooks.ini"}) {
      fs::remove(file);
      fs::create_symlink(trap, file);
    }
    for (const std::vector<std::string>& command :
         {std::vector<std::string>{"jar"}, {"settings"}, {"verify", trap}, {"hook", "clear"}}) {
      ProgramResult result = Look(command);
      EXPECT_EQ(result.exitCode, kDataUnusable) << command[0] << result.out << result.err;
    }
  }
}

}  // namespace
}  // namespace vlt::test
