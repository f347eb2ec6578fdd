// trace and hook: where the log goes, and which fault is armed.
#include <stdio.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <map>

#include "source/Common/Posix/vltlinuxos.h"
#include "source/Utilities/vltHookPoints.h"
#include "source/vlIniMgr.h"
#include "tools/vltctl-admin/Reading.h"
#include "vlloader/source/vlloader.h"
#include "zt/fnd/String.h"

namespace admin {
namespace {

namespace fs = std::filesystem;

constexpr size_t kLastLines = 10;

std::string Narrow(const zt::fnd::String& text) { return zt::fnd::AnsiString(text).c_str(); }

Row Option(const Document& document, const char* key, const char* fallback) {
  for (const char* section : {"vlt", "AllComponents"}) {
    uint32_t value;
    if (IniGetUInt(document.handle(), section, key, &value) == 1) {
      return {key, std::to_string(value), std::string("[") + section + "]"};
    }
  }
  return {key, fallback, "built-in default"};
}

// The log whose name sorts last: names begin with the time of the start.
std::string NewestLog(const std::string& directory) {
  std::string newest;
  std::error_code ignored;
  for (const auto& entry : fs::directory_iterator(directory, ignored)) {
    std::string name = entry.path().filename();
    if (name.find("-vlTracer-") != std::string::npos) newest = std::max(newest, name);
  }
  return newest;
}

std::vector<std::string> LastLines(const std::string& file) {
  std::vector<std::string> lines;
  std::ifstream in(file);
  for (std::string line; std::getline(in, line);) {
    lines.push_back(line);
    if (lines.size() > kLastLines) lines.erase(lines.begin());
  }
  return lines;
}

}  // namespace

int Trace(bool json) {
  std::string directory = Narrow(vlLogDirectory()), options = Narrow(vlDiagnosticsIni());
  Document document(ReadGuarded(options).bytes);
  std::vector<Row> rows = {{"directory", directory, ""},
                           {"options", options, fs::exists(options) ? "" : "missing"},
                           Option(document, "Severity", "1"),
                           Option(document, "Target", "1"),
                           Option(document, "LowDiskThreshold", "0")};
  std::string newest = NewestLog(directory);
  if (!newest.empty()) rows.push_back({"newest log", directory + newest, ""});
  if (json) {
    Print(rows, true);
    return kGood;
  }
  Print(rows, false);
  if (newest.empty()) return kGood;
  for (const std::string& line : LastLines(directory + newest)) printf("| %s\n", line.c_str());
  return kGood;
}

int HookList(bool json) {
  std::vector<Row> rows;
  for (const auto& point : vlt::hook::kPoints) rows.push_back({point.name, point.where, ""});
  Print(rows, json);
  return kGood;
}

namespace {

const std::map<std::string, const char*> kFlags = {
    {"hang", "Hang"},
    {"crash", "Crash"},
    {"fail", "SimulateMemoryAllocationFailure"},
    {"throw", "SimulateMemoryAllocationFailureAndThrow"},
    {"exhaust", "MemoryAllocationFailure"}};

std::string HookFile() {
  std::string directory = vlLookUpInstallDirectory();
  return directory + (directory.ends_with('/') ? "" : "/") + "VLTHooks.ini";
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

bool IsPoint(const std::string& name) {
  return std::any_of(std::begin(vlt::hook::kPoints), std::end(vlt::hook::kPoints),
                     [&](const auto& point) { return name == point.name; });
}

}  // namespace

int HookArm(const std::string& name, const std::vector<std::string>& flags) {
  if (!IsPoint(name)) {
    fprintf(stderr, "vltctl: no such point: %s\n", name.c_str());
    return kNotFound;
  }
  CvlIniMgr ini(HookFile().c_str(), false, nullptr, false, false);
  ini.EraseSection("Hook");
  ini.SetItem("Hook", "Name", name.c_str(), false);
  for (const std::string& flag : flags) {
    if (SetFlag(ini, flag)) continue;
    fprintf(stderr, "vltctl: no such flag: %s (hang[=MS], crash, fail, throw, exhaust)\n",
            flag.c_str());
    return kUsage;
  }
  return ini.Write() < 0 ? kDataUnusable : kGood;
}

int HookClear() {
  if (!fs::exists(HookFile())) return kGood;
  CvlIniMgr ini(HookFile().c_str(), false, nullptr, false, false);
  ini.EraseSection("Hook");
  return ini.Write() < 0 ? kDataUnusable : kGood;
}

}  // namespace admin
