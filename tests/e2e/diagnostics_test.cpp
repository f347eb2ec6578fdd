// vltctl trace and vltctl hook: what they print and write, byte for byte, and that the library obeys.
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <regex>
#include <set>
#include <sstream>

#include "source/Utilities/vltutils.h"
#include "tests/e2e/Vltctl.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;
using nlohmann::json;

// The points, as hook files in the field have them.
const std::set<std::string> kPoints = {"TestHookNT\"./source/Utilities/vltutils\"1215",
                                       "TestHookNT\"./source/Utilities/vltutils\"2653",
                                       "TestHookNT\"./source/Utilities/vltutils\"2663",
                                       "TestHookNT\"./source/Utilities/vltCheck\"369",
                                       "TestHookNT\"./source/Common/vltcmn\"96",
                                       "TestHookNT\"./source/Common/vltcmn\"111",
                                       "TestHookNT\"./source/Common/vltcmn\"126",
                                       "TestHookNT\"./source/Common/vltcmn\"141",
                                       "TestHookNT\"./source/Common/vltcmn\"158",
                                       "TestHookNT\"./source/Common/vltcmn\"174",
                                       "TestHookNT\"./source/Common/vltcmn\"1132",
                                       "TestHookNT\"./source/Common/vltcmn\"1257",
                                       "TestHookNT\"./source/Common/vltcmn\"1330",
                                       "TestHook\"./source/Common/vltcmn\"1317",
                                       "TestHook\"./source/Common/vltcmn\"1358",
                                       "TestHook\"./source/Common/vltBindingClasses\"102",
                                       "TestHookNT\"./source/Common/vltDuplicateString2\"19",
                                       "TestHookNT\"./source/Common/vltDuplicateString2\"42",
                                       "TestHookNT\"./source/Common/vltTypeToString2\"77",
                                       "vltjarInvalidChecksumSet",
                                       "vltjarValidChecksumSet"};

struct Flag {
  const char *word, *lines;
};
constexpr Flag kFlags[] = {{"hang", "Hang = true\n"},
                           {"hang=250", "Hang = true\nHangTime = 250\n"},
                           {"crash", "Crash = true\n"},
                           {"fail", "SimulateMemoryAllocationFailure = true\n"},
                           {"throw", "SimulateMemoryAllocationFailureAndThrow = true\n"},
                           {"exhaust", "MemoryAllocationFailure = true\n"}};

class Diagnostics : public testing::Test {
 protected:
  std::string hookFile() const { return m_installation.root() + "/VLTHooks.ini"; }
  Installation m_installation;
};

// ---- The points

TEST_F(Diagnostics, HookListNamesEachPointOnce) {
  std::istringstream lines(Vltctl({"hook", "list"}).out);
  std::multiset<std::string> names;
  for (std::string line; std::getline(lines, line);) {
    line.erase(0, line.find_first_not_of("0123456789 "));
    names.insert(line.substr(0, line.find("  ")));
  }
  EXPECT_EQ(names, std::multiset<std::string>(kPoints.begin(), kPoints.end()));
  std::set<std::string> keys;
  for (const json& item : VltctlJson({"hook", "list"}).items) {
    keys.insert(item["name"]);
    EXPECT_NE(item["where"], "") << item["name"];
  }
  EXPECT_EQ(keys, kPoints);
}

std::string TextOf(const fs::path& file) {
  std::ifstream in(file);
  return std::string(std::istreambuf_iterator<char>(in), {});
}

// Sources of the library, without its tests.
std::string AllSources() {
  std::string text;
  for (const char* directory : {"source", "vlloader", "zt", "ztcom", "ztini"}) {
    for (const auto& entry :
         fs::recursive_directory_iterator(std::string(VLT_TEST_SOURCE) + "/" + directory)) {
      std::string name = entry.path().filename();
      if (entry.is_regular_file() && !name.ends_with("_test.cpp") && name != "vltHookPoints.h") {
        text += TextOf(entry.path());
      }
    }
  }
  return text;
}

TEST_F(Diagnostics, ThePointsInTheSourcesAreThoseOfTheList) {
  std::string table = std::string(VLT_TEST_SOURCE) + "/source/Common/vltHookPoints.h";
  if (!Exists(table)) GTEST_SKIP() << "NOT TESTED: the sources are not here";
  std::map<std::string, std::string> constants;
  std::string header = TextOf(table);
  std::regex definition("char\\* (k\\w+) =\\s*\"((?:[^\"\\\\]|\\\\.)*)\"");
  for (std::sregex_iterator i(header.begin(), header.end(), definition), end; i != end; ++i) {
    constants[(*i)[1]] = std::regex_replace((*i)[2].str(), std::regex("\\\\(.)"), "$1");
  }
  std::string sources = AllSources();
  std::map<std::string, int> used;
  std::regex use("hook::(k(?!ForeverInMSecs)\\w+)");  // which is a length of time
  for (std::sregex_iterator i(sources.begin(), sources.end(), use), end; i != end; ++i) {
    ASSERT_TRUE(constants.contains((*i)[1])) << (*i)[1];
    ++used[constants[(*i)[1]]];
  }
  std::set<std::string> points;
  for (const auto& [point, count] : used) {
    points.insert(point);
    EXPECT_EQ(count, 1) << point;
  }
  EXPECT_EQ(points, kPoints);
  // Each call passes one of the names above, or what it was given of them.
  std::regex call("(?:vltTestHook|Strikes)\\(([^)]*)\\)");
  for (std::sregex_iterator i(sources.begin(), sources.end(), call), end; i != end; ++i) {
    std::string argument = (*i)[1];
    EXPECT_TRUE(argument.starts_with("vlt::hook::k") || argument == "hookPoint" ||
                argument == "const char* hookPoint" || argument == "const char* name")
        << argument;
  }
}

// ---- Arming

TEST_F(Diagnostics, ArmingWritesTheFileOfThePointAndItsFault) {
  for (const std::string& point : kPoints) {
    EXPECT_EQ(Vltctl({"hook", "arm", point, "fail"}).exitCode, 0);
    EXPECT_EQ(ReadBytes(hookFile()),
              "[Hook]\nName = " + point + "\nSimulateMemoryAllocationFailure = true\n\n");
  }
  for (const Flag& flag : kFlags) {
    EXPECT_EQ(Vltctl({"hook", "arm", "vltjarValidChecksumSet", flag.word}).exitCode, 0);
    EXPECT_EQ(ReadBytes(hookFile()),
              std::string("[Hook]\nName = vltjarValidChecksumSet\n") + flag.lines + "\n");
  }
  EXPECT_EQ(Vltctl({"hook", "arm", "vltjarValidChecksumSet", "crash", "throw"}).exitCode, 0);
  EXPECT_EQ(ReadBytes(hookFile()),
            "[Hook]\nName = vltjarValidChecksumSet\nCrash = true\n"
            "SimulateMemoryAllocationFailureAndThrow = true\n\n");
}

TEST_F(Diagnostics, TheNumbersOfTheListArmAsTheNamesDo) {
  for (const json& point : VltctlJson({"hook", "list"}).items) {
    JsonResult armed = VltctlJson({"hook", "arm", point["number"].dump(), "fail"});
    EXPECT_EQ(armed.exitCode, kGood);
    EXPECT_EQ(armed.items.at(0)["armed"], point["name"]);
    std::string text = ReadBytes(hookFile());
    EXPECT_EQ(text.find("[Hook]\nName = " + point["name"].get<std::string>() + "\n"), 0u) << text;
  }
  for (const char* number : {"0", "22", "01", "-1", "1x"}) {
    EXPECT_EQ(Vltctl({"hook", "arm", number, "fail"}).exitCode, kNotFound) << number;
  }
}

TEST_F(Diagnostics, WhatIsRefusedLeavesTheArmedPoint) {
  ASSERT_EQ(Vltctl({"hook", "arm", "vltjarValidChecksumSet", "crash"}).exitCode, 0);
  std::string before = ReadBytes(hookFile());
  for (std::vector<std::string> arguments :
       {std::vector<std::string>{"VLTJARVALIDCHECKSUMSET", "fail"},
        {"vltjarInvalidChecksumSet", "Fail"},
        {"vltjarInvalidChecksumSet", "fail", "nonsense"},
        {"vltjarInvalidChecksumSet", "fail=1"},
        {"vltjarInvalidChecksumSet", "hang="},
        {"vltjarInvalidChecksumSet", "hang=-1"},
        {"vltjarInvalidChecksumSet", "hang=2147483648"},
        {"vltjarInvalidChecksumSet"},
        {}}) {
    arguments.insert(arguments.begin(), {"hook", "arm"});
    ProgramResult result = Vltctl(arguments);
    EXPECT_NE(result.exitCode, 0);
    EXPECT_NE(result.err + result.out, "");
    EXPECT_EQ(ReadBytes(hookFile()), before);
  }
}

TEST_F(Diagnostics, ClearingLeavesNothingArmedAndMakesNoFile) {
  EXPECT_EQ(Vltctl({"hook", "clear"}).exitCode, 0);
  EXPECT_FALSE(Exists(hookFile()));
  WriteBytes(hookFile(), "[Hook]\nName = x\n[Other]\na = b\n");
  EXPECT_EQ(Vltctl({"hook", "clear"}).exitCode, 0);
  EXPECT_EQ(ReadBytes(hookFile()), "[Other]\na = b\n");
}

TEST_F(Diagnostics, AProcessObeysWhatWasArmedOnceItRefreshes) {
  ExpectInChild([] {
    const char* point = "TestHookNT\"./source/Common/vltTypeToString2\"77";
    auto text = [] {
      wchar_t* given = vltGuidToString(GUID{});
      bool there = given && *given;
      vltFree(given);
      return there;
    };
    EXPECT_EQ(Vltctl({"hook", "arm", point, "fail"}).exitCode, 0);
    EXPECT_TRUE(text());
    vltRefreshHook();
    EXPECT_FALSE(text());
    EXPECT_EQ(vltTestHook(point), 1u);
    EXPECT_EQ(vltTestHook("testHookNT\"./source/Common/vltTypeToString2\"77"), 0u);
    EXPECT_EQ(Vltctl({"hook", "arm", "vltjarValidChecksumSet", "fail"}).exitCode, 0);
    vltRefreshHook();
    EXPECT_TRUE(text());
    EXPECT_EQ(Vltctl({"hook", "clear"}).exitCode, 0);
    vltRefreshHook();
    EXPECT_EQ(vltTestHook("vltjarValidChecksumSet"), 1u);  // until the process ends
  });
}

// ---- The log

TEST_F(Diagnostics, TraceShowsTheNewestLogsLastLines) {
  const char* root = getenv("VLT_PRIVATE_ROOT");
  bool ours = geteuid() != 0 || (root && std::string(root) == "made");
  if (!ours) GTEST_SKIP() << "NOT TESTED: the log directory would be the machine's";
  std::string logs =
      geteuid() == 0 ? "/Library/Logs/KOR/" : std::string(getenv("HOME")) + "/Library/Logs/KOR/";
  fs::create_directories(logs);
  std::string lines, last;
  for (int i = 0; i < 25; ++i) lines += "  line " + std::to_string(i) + "\n";
  for (int i = 15; i < 25; ++i) last += "|   line " + std::to_string(i) + "\n";
  WriteBytes(logs + "20260102_000000-vlTracer-00000001.log", lines);
  WriteBytes(logs + "20260101_235959-vlTracer-FFFFFFFF.log", "  older\n");
  WriteBytes(logs + "zzz.log", "  not one of ours\n");
  auto before = fs::last_write_time(logs);
  ProgramResult result = Vltctl({"trace"});
  EXPECT_EQ(result.exitCode, 0);
  EXPECT_EQ(result.err, "");
  EXPECT_TRUE(result.out.ends_with("\n" + last)) << result.out;
  auto rows = VltctlJson({"trace"}).items;
  EXPECT_EQ(ItemWith(rows, "name", "newest log")["value"],
            logs + "20260102_000000-vlTracer-00000001.log");
  EXPECT_EQ(ItemWith(rows, "name", "Target")["origin"], "built-in default");
  EXPECT_EQ(fs::last_write_time(logs), before);  // looking begins no log
  EXPECT_EQ(ReadBytes(logs + "20260102_000000-vlTracer-00000001.log"), lines);
  fs::remove_all(logs);
}

}  // namespace
}  // namespace vlt::test
