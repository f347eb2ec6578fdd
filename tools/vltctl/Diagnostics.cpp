// trace and hook: where the log goes, and which fault is armed.
#include <stdio.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <iterator>
#include <map>
#include <sstream>
#include <stdexcept>
#include <system_error>

#include "source/Common/Posix/vltlinuxos.h"
#include "source/Common/vltHookPoints.h"
#include "source/vlIniMgr.h"
#include "tools/common/Terminal.h"
#include "tools/vltctl/Reading.h"
#include "vlloader/source/InstallLayout.h"
#include "vlloader/source/vlloader.h"
#include "zt/fnd/String.h"

namespace admin {
namespace {

namespace fs = std::filesystem;

using vltctl::ForTerminal;
using zt::posix::ScopedFd;

constexpr size_t kLastLines = 10;
constexpr size_t kTailSize = 256 * 1024;  // a line of the log has at most 2,047 bytes

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

// The log whose name sorts last: names begin with the time of the start. Other users can
// put pipes, devices and links there by such a name; only a regular file is a log.
std::string NewestLog(const std::string& directory) {
  std::string newest;
  std::error_code ignored;
  for (const auto& entry : fs::directory_iterator(directory, ignored)) {
    std::string name = entry.path().filename();
    std::error_code gone;
    if (name.find("-vlTracer-") == std::string::npos) continue;
    if (fs::is_regular_file(entry.symlink_status(gone))) newest = std::max(newest, name);
  }
  return newest;
}

// The last bytes of the file, as many as the last lines can have: what a log has grown to does not count.
std::string Tail(const std::string& file) {
  std::string error, bytes(kTailSize, '\0');
  ScopedFd fd = OpenRegular(file, &error);
  off_t size = fd.valid() ? lseek(fd.get(), 0, SEEK_END) : -1;
  if (size < 0) return "";
  off_t begin = std::max<off_t>(0, size - static_cast<off_t>(kTailSize));
  ssize_t got = pread(fd.get(), bytes.data(), bytes.size(), begin);
  bytes.resize(got > 0 ? static_cast<size_t>(got) : 0);
  if (begin == 0) return bytes;
  size_t whole = bytes.find('\n');  // The line that the tail begins in is not whole.
  return whole == std::string::npos ? bytes : bytes.substr(whole + 1);
}

std::vector<std::string> LastLines(const std::string& file) {
  std::vector<std::string> lines;
  std::istringstream in(Tail(file));
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
    return vltctl::kGood;
  }
  Print(rows, false);
  if (newest.empty()) return vltctl::kGood;
  for (const std::string& line : LastLines(directory + newest)) {
    printf("| %s\n", ForTerminal(line).c_str());
  }
  return vltctl::kGood;
}

int HookList(bool json) {
  std::vector<Row> rows;
  for (const auto& point : vlt::hook::kPoints) rows.push_back({point.name, point.where, ""});
  Print(rows, json);
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
  if (read.state == GuardedBytes::State::Unreadable) {
    throw std::runtime_error(file + ": " + read.error);
  }
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
    fprintf(stderr, "vltctl: no such point: %s\n", ForTerminal(name).c_str());
    return vltctl::kNotFound;
  }
  ExpectUsable(HookFile());
  CvlIniMgr ini = CvlIniMgr::OpenRaw(HookFile());
  ini.EraseSection("Hook");
  ini.SetItem("Hook", "Name", name.c_str(), false);
  for (const std::string& flag : flags) {
    if (SetFlag(ini, flag)) continue;
    fprintf(stderr, "vltctl: no such flag: %s (hang[=MS], crash, fail, throw, exhaust)\n",
            ForTerminal(flag).c_str());
    return vltctl::kUsage;
  }
  return ini.Write() < 0 ? vltctl::kDataUnusable : vltctl::kGood;
}

int HookClear() {
  if (!fs::exists(HookFile())) return vltctl::kGood;
  ExpectUsable(HookFile());
  CvlIniMgr ini = CvlIniMgr::OpenRaw(HookFile());
  ini.EraseSection("Hook");
  return ini.Write() < 0 ? vltctl::kDataUnusable : vltctl::kGood;
}

}  // namespace admin
