// vltctl where something around it is missing: space on the disk, the reader of its output, /proc, a locale.
#include <gtest/gtest.h>
#include <locale.h>
#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <filesystem>

#include "tests/e2e/Start.h"
#include "tests/e2e/Vltctl.h"
#include "tests/support/BuildModule.h"
#include "tests/support/Sanitizer.h"

namespace vlt::test {
namespace {

// An installation in which each command has something to print.
class VltctlSurroundings : public testing::Test {
 protected:
  VltctlSurroundings() {
    m_installation.addObjectExpert("Tank", "Tank", GText(1),
                                   "{" + GText(1) + "}:1:{" + GText(9) + "}");
    std::filesystem::create_directory(m_data);
    WriteBytes(m_data + "/vltjar.ini",
               "[ServerSection]\nServerIdentity={00000001-0002-0003-0405-060708090A0B}\n");
    EXPECT_EQ(Vltctl({"list", "--live"}).exitCode, kGood);
  }

  std::vector<std::vector<std::string>> commands() const {
    return {{"list"},
            {"list", "--live"},
            {"scan", "--dry-run"},
            {"show", GText(1)},
            {"classes", GText(9)},
            {"settings"},
            {"jar"},
            {"identity"},
            {"trace"},
            {"hook", "list"},
            {"--version"},
            {"--help"},
            {"list", "--help"},
            {"completion", "bash"},
            {"verify", m_installation.database()}};
  }

  Installation m_installation;
  const std::string m_data = m_installation.root() + "/Data";
};

std::string Joined(const std::vector<std::string>& words) {
  std::string out;
  for (const std::string& word : words) out += word + " ";
  return out;
}

// What the command prints to a terminal; both streams come there.
std::string OnTerminal(const std::string& command, const Environment& environment) {
  return RunProgram({"script", "-qec", kVltctl + " " + command, "/dev/null"}, environment).out;
}

TEST_F(VltctlSurroundings, ColoursAreForTerminals) {
  if (RunProgram({"sh", "-c", "command -v script"}).exitCode != 0) {
    GTEST_SKIP() << "NOT TESTED: script is not installed";
  }
  const std::string escape = "\x1B[", verify = "verify " + m_installation.database();
  const Environment terminal = {{"TERM", "xterm"}, {"NO_COLOR", ""}, {"CLICOLOR_FORCE", ""}};
  auto with = [&](const char* name, const char* value) {
    Environment environment = terminal;
    environment.push_back({name, value});
    return environment;
  };
  EXPECT_NE(OnTerminal(verify, terminal).find(": \x1B[32mthe digest matches\x1B[0m; the next"),
            std::string::npos)
      << OnTerminal(verify, terminal);
  EXPECT_EQ(OnTerminal(verify, with("NO_COLOR", "1")).find(escape), std::string::npos);
  EXPECT_EQ(OnTerminal(verify, with("TERM", "dumb")).find(escape), std::string::npos);
  EXPECT_EQ(OnTerminal(verify + " --json", terminal).find(escape), std::string::npos);
  for (const std::vector<std::string>& command : commands()) {
    EXPECT_EQ(Vltctl(command).out.find(escape), std::string::npos) << command[0];
  }
  EXPECT_EQ(Vltctl({"doctor"}).out.find(escape), std::string::npos);
  std::string forced = Vltctl({"doctor"}, {{"CLICOLOR_FORCE", "1"}}).out;
  EXPECT_EQ(forced.find("\x1B[32mok\x1B[0m"), 0u) << forced;
}

// A library that takes its time to load, and one after it.
TEST_F(VltctlSurroundings, ALongCheckShowsHowFarItIsOnATerminal) {
  if (RunProgram({"sh", "-c", "command -v script"}).exitCode != 0) {
    GTEST_SKIP() << "NOT TESTED: script is not installed";
  }
  m_installation.addObjectExpert("Last", "Last", GText(2));
  const std::string library = m_installation.root() + "/Experts/Tank.vle/libTank.so";
  BuildModule(library,
              "#include <unistd.h>\n"
              "__attribute__((constructor)) void start() { usleep(700000); }\n"
              "extern \"C\" int vltCreateObjectExpert() { return 0; }\n");
  std::string shown = OnTerminal("check", {{"TERM", "xterm"}});
  EXPECT_NE(shown.find("\rchecking "), std::string::npos) << shown;
  EXPECT_EQ(Vltctl({"check"}).err, "");
}

// Each reads files that take their time to open.
TEST_F(VltctlSurroundings, WhatTakesLongShowsOnATerminalHowLongOrHowFar) {
  if (RunProgram({"sh", "-c", "command -v script"}).exitCode != 0 ||
      RunProgram({"strace", "-e", "trace=none", "true"}).exitCode != 0) {
    GTEST_SKIP() << "NOT TESTED: script is not installed, or strace is missing or not permitted";
  }
  m_installation.addObjectExpert("Last", "Last", GText(2));
  ASSERT_EQ(Vltctl({"list", "--live"}).exitCode, kGood);
  const std::string experts = m_installation.root() + "/Experts",
                    files = experts + "/Last.vle/Resources/Info.vlr -P " + experts +
                            "/Tank.vle/Resources/Info.vlr",
                    database = m_installation.database(), cleared = "\r\x1B[K";
  auto slowly = [](const std::string& path, const std::string& command) {
    return "strace -f -o /dev/null -P " + path +
           " -e trace=openat,openat2 -e inject=openat,openat2:delay_enter=600000 " + kVltctl + " " +
           command;
  };
  const Environment terminal = {{"TERM", "xterm"}, {"ASAN_OPTIONS", "detect_leaks=0"}};
  auto shown = [&](const std::string& command) {
    return RunProgram({"script", "-qec", command, "/dev/null"}, terminal).out;
  };
  for (const auto& [path, command, line, result] :
       {std::array<std::string, 4>{database, "list", "reading the installation: 1 s", "TYPE"},
        {database, "scan --dry-run", "reading the installation: 1 s", "2 unchanged"},
        {database, "doctor", "examining the installation: 1 s", "ok"},
        {files, "verify --content", "comparing 1 of 2", "2 registration files"},
        {files, "lint " + experts, "reading 1 of 2", experts}}) {
    const std::string text = shown(slowly(path, command));
    size_t at = text.find("\r" + line), end = text.find(cleared), output = text.rfind(result);
    EXPECT_NE(at, std::string::npos) << command << "\n" << text;
    EXPECT_LT(at, end) << command << "\n" << text;
    EXPECT_LT(end, output) << command << "\n" << text;
    EXPECT_NE(output, std::string::npos) << command << "\n" << text;
  }
  for (const std::string& slow : {slowly(database, "list"), slowly(files, "lint " + experts)}) {
    EXPECT_EQ(RunProgram({"sh", "-c", slow}, terminal).err, "");
  }
}

ProgramResult InShell(const std::string& script, const std::vector<std::string>& arguments) {
  std::vector<std::string> all = {"sh", "-c", script, "sh", kVltctl};
  all.insert(all.end(), arguments.begin(), arguments.end());
  return RunProgram(all);
}

TEST_F(VltctlSurroundings, AFullDiskIsAFailureOfEachCommand) {
  for (std::vector<std::string> command : commands()) {
    for (bool json : {false, true}) {
      if (json) command.push_back("--json");
      ProgramResult result = InShell("exec \"$@\" >/dev/full", command);
      EXPECT_EQ(result.exitCode, kCannotWrite) << Joined(command);
      EXPECT_EQ(
          result.err,
          "vltctl: standard output: cannot be written: No space left on device; the output is "
          "incomplete\n")
          << Joined(command);
    }
  }
}

// The reader has gone, as "head" does.
int EndWithoutReader(const std::vector<std::string>& command, bool signalIsIgnored,
                     const std::string& errors) {
  Child child([&]() -> int {
    int ends[2];
    if (pipe(ends) != 0) return 97;
    close(ends[0]);
    dup2(ends[1], 1);
    FILE* err = freopen(errors.c_str(), "w", stderr);
    if (!err) return 97;
    signal(SIGPIPE, signalIsIgnored ? SIG_IGN : SIG_DFL);
    std::vector<char*> argv = {const_cast<char*>(kVltctl.c_str())};
    for (const std::string& word : command) argv.push_back(const_cast<char*>(word.c_str()));
    argv.push_back(nullptr);
    execv(argv[0], argv.data());
    return 97;
  });
  return child.wait();
}

TEST_F(VltctlSurroundings, AReaderThatHasGoneEndsEachCommandQuietly) {
  TempDir dir;
  for (const std::vector<std::string>& command : commands()) {
    EXPECT_EQ(EndWithoutReader(command, false, dir / "err"), 128 + SIGPIPE) << Joined(command);
    EXPECT_EQ(ReadBytes(dir / "err"), "") << Joined(command);
    EXPECT_EQ(EndWithoutReader(command, true, dir / "err"), kCannotWrite) << Joined(command);
    EXPECT_EQ(ReadBytes(dir / "err"), "") << Joined(command);
  }
}

// In a mount name space of its own, with nothing in /proc. Its mount is made private before, so that the
// machine keeps its own.
std::vector<std::string> WithoutProc(const std::string& script) {
  return {"unshare",
          "--mount",
          "--propagation",
          "unchanged",
          "sh",
          "-c",
          "mount --make-rprivate /proc && mount -t tmpfs none /proc && " + script,
          "sh"};
}

// Why a program cannot be run without /proc here; empty where it can.
std::string WhyProcStays() {
  if (!kCanLimitMemory) return "a sanitizer's program reads /proc itself";
  if (RunProgram(WithoutProc("test ! -e /proc/self")).exitCode != 0)
    return "mount is not permitted";
  return "";
}

TEST_F(VltctlSurroundings, NoCommandNeedsProc) {
  if (std::string why = WhyProcStays(); !why.empty()) GTEST_SKIP() << "NOT TESTED: " << why;
  auto all = commands();
  all.push_back({"check"});
  all.push_back({"events"});
  for (const std::vector<std::string>& command : all) {
    ProgramResult with = Vltctl(command);
    std::vector<std::string> words = WithoutProc("exec \"$@\"");
    words.push_back(kVltctl);
    words.insert(words.end(), command.begin(), command.end());
    ProgramResult hidden = RunProgram(words);
    EXPECT_EQ(hidden.exitCode, with.exitCode) << Joined(command) << hidden.err;
    EXPECT_EQ(hidden.err, with.err) << Joined(command);
    size_t compared =
        std::min(with.out.find("; scanned"), with.out.size());  // what follows is a time
    EXPECT_EQ(hidden.out.substr(0, compared), with.out.substr(0, compared)) << Joined(command);
  }
}

TEST_F(VltctlSurroundings, WithoutProcARelativeNameFindsTheClientToo) {
  if (std::string why = WhyProcStays(); !why.empty()) GTEST_SKIP() << "NOT TESTED: " << why;
  std::vector<std::string> words = WithoutProc("cd \"$(dirname \"$1\")\" && exec ./vltctl list");
  words.push_back(kVltctl);
  ProgramResult result = RunProgram(words);
  EXPECT_EQ(result.exitCode, kGood) << result.err;
}

// ---- What does not need the library

TEST_F(VltctlSurroundings, HelpAndVersionTouchNothing) {
  if (RunProgram({"strace", "-e", "trace=none", "true"}).exitCode != 0) {
    GTEST_SKIP() << "strace is missing or not permitted";
  }
  TempDir dir;
  for (const std::vector<std::string>& command :
       {std::vector<std::string>{"--help"}, {"--version"}, {"check", "--help"}, {"lsit"}, {}}) {
    std::vector<std::string> traced = {"strace", "-f", "-o", dir / "trace", kVltctl};
    traced.insert(traced.end(), command.begin(), command.end());
    RunProgram(traced, {{"ASAN_OPTIONS", "detect_leaks=0"}});
    std::string trace = ReadBytes(dir / "trace");
    std::vector<std::string> changes = Changes(trace);
    EXPECT_TRUE(changes.empty()) << Joined(command) << changes[0];
    EXPECT_EQ(trace.find("libvltutils"), std::string::npos) << Joined(command);
    EXPECT_EQ(trace.find("com.zentrex.kor.ini"), std::string::npos) << Joined(command);
  }
}

// ---- The locale

class VltctlSurroundingsLocale : public testing::Test {
 protected:
  VltctlSurroundingsLocale() {
    m_installation.addObjectExpert(
        "Gr\xC3\xB6\xC3\x9F"
        "e",
        "Path", GText(1));
    m_installation.addObjectExpert("Plain", "N\xC3\xA4me", GText(2));
    m_installation.addObjectExpert("Ascii", "Ascii", GText(3));
    EXPECT_EQ(Vltctl({"list", "--live"}, {{"LC_ALL", "C.UTF-8"}}).exitCode, kGood);
  }
  ProgramResult listed() const {
    return RunProgram({"env", "-u", "LANG", "-u", "LC_ALL", "-u", "LC_CTYPE", kVltctl, "list"});
  }
  Installation m_installation;
};

TEST_F(VltctlSurroundingsLocale, WithoutOneAllIsListedAndWhatTheLibraryMissesIsSaid) {
  ProgramResult result = listed();
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_NE(result.out.find("/Experts/Gr\xC3\xB6\xC3\x9F"
                            "e.vle\n"),
            std::string::npos)
      << result.out;
  EXPECT_NE(result.out.find("N\xC3\xA4me"), std::string::npos) << result.out;
  EXPECT_EQ(
      result.err,
      "vltctl: the environment has no UTF-8 locale: a program that is started with it does not "
      "find Path, N\xC3\xA4me; set LANG=C.UTF-8 for it\n");
}

// What the notes say is so.
TEST_F(VltctlSurroundingsLocale, TheLibraryMissesThemInTheCLocale) {
  ExpectInChild([] {
    setlocale(LC_ALL, "C");
    IvltRegistrar* registrar = nullptr;
    ASSERT_EQ(GetRegistrar(&registrar), "ok");
    _vltComponent2 record;
    memset(&record, 0, sizeof record);
    EXPECT_LT(registrar->GetComponent(G(1), &record), 0);
    EXPECT_LT(registrar->GetComponent(G(2), &record), 0);
    EXPECT_EQ(registrar->GetComponent(G(3), &record), S_OK);
    vltutilsFreeComponent2(record);
    registrar->Release();
  });
}

TEST_F(VltctlSurroundingsLocale, WithOneThereIsNothingToSay) {
  ProgramResult result = Vltctl({"list"}, {{"LC_ALL", "C.UTF-8"}});
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_EQ(result.err, "");
}

}  // namespace
}  // namespace vlt::test
