// hook: which fault is armed, for processes that refresh their hooks.
#include <errno.h>
#include <string.h>

#include <algorithm>
#include <filesystem>
#include <map>

#include "source/Common/vltHookPoints.h"
#include "source/vlIniMgr.h"
#include "tools/vltctl/Reading.h"
#include "vlloader/source/InstallLayout.h"

namespace admin {

namespace fs = std::filesystem;
using vltctl::ExitCode;

int HookList(const Arguments&, Output& output) {
  vltctl::Table table;
  for (const auto& point : vlt::hook::kPoints) {
    table.add({point.name, point.where});
    output.item({{"name", point.name}, {"where", point.where}});
  }
  output.print(table);
  return vltctl::kGood;
}

namespace {

const std::map<std::string, const char*> kFlags = {
    {"hang", "Hang"},
    {"crash", "Crash"},
    {"fail", "SimulateMemoryAllocationFailure"},
    {"throw", "SimulateMemoryAllocationFailureAndThrow"},
    {"exhaust", "MemoryAllocationFailure"}};

std::string HookFile() { return InstalledFile(vlt::layout::kHookFile); }

// The library would wait for a pipe, and read whatever size of file: both end the command.
void ExpectUsable(const std::string& file) {
  GuardedBytes read = ReadGuarded(file);
  if (read.state == GuardedBytes::State::Unreadable) throw Unusable(file, read.error);
}

// "hang=250" arms a hang of so many milliseconds.
bool SetFlag(CvlIniMgr& ini, const std::string& flag) {
  size_t equals = flag.find('=');
  auto found = kFlags.find(flag.substr(0, equals));
  if (found == kFlags.end()) return false;
  ini.SetItem("Hook", found->second, "true", false);
  if (equals != std::string::npos) {
    ini.SetItem("Hook", "HangTime", flag.substr(equals + 1).c_str(), false);
  }
  return true;
}

std::vector<std::string> PointNames() {
  std::vector<std::string> names;
  for (const auto& point : vlt::hook::kPoints) names.push_back(point.name);
  return names;
}

vltctl::Failure NoSuch(ExitCode code, const std::string& what, const std::string& word,
                       const std::vector<std::string>& candidates, const std::string& otherwise) {
  std::string guess = vltctl::DidYouMean(word, candidates);
  return {code,
          {"no-such-" + what, "", "no such " + what + ": " + word, "",
           guess.empty() ? otherwise : guess}};
}

int Save(CvlIniMgr& ini, const std::string& file) {
  errno = 0;
  if (ini.Write() >= 0) return vltctl::kGood;
  throw vltctl::Failure(vltctl::kCannotWrite,
                        {"cannot-write", file, "cannot be written", errno ? strerror(errno) : "",
                         "check the rights to its directory and the space on the disk"});
}

}  // namespace

int HookArm(const Arguments& arguments, Output& output) {
  const std::string name = arguments.text("POINT");
  std::vector<std::string> points = PointNames();
  if (std::find(points.begin(), points.end(), name) == points.end()) {
    throw NoSuch(vltctl::kNotFound, "point", name, points, "\"vltctl hook list\" shows all");
  }
  ExpectUsable(HookFile());
  CvlIniMgr ini = CvlIniMgr::OpenRaw(HookFile());
  ini.EraseSection("Hook");
  ini.SetItem("Hook", "Name", name.c_str(), false);
  for (const std::string& flag : arguments.list("FLAG")) {
    if (SetFlag(ini, flag)) continue;
    throw NoSuch(vltctl::kUsage, "flag", flag, {}, "give hang[=MS], crash, fail, throw or exhaust");
  }
  int code = Save(ini, HookFile());
  output.item({{"file", HookFile()}, {"armed", name}, {"flags", arguments.list("FLAG")}});
  return code;
}

int HookClear(const Arguments&, Output& output) {
  output.item({{"file", HookFile()}, {"armed", nullptr}, {"flags", vltctl::Json::array()}});
  if (!fs::exists(HookFile())) return vltctl::kGood;
  ExpectUsable(HookFile());
  CvlIniMgr ini = CvlIniMgr::OpenRaw(HookFile());
  ini.EraseSection("Hook");
  return Save(ini, HookFile());
}

}  // namespace admin
