// trace and hook: where the log goes, and which fault is armed.
#include <errno.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <map>
#include <sstream>
#include <system_error>

#include "source/Common/Posix/vltlinuxos.h"
#include "source/Common/vltHookPoints.h"
#include "source/vlIniMgr.h"
#include "tools/vltctl/Reading.h"
#include "vlloader/source/InstallLayout.h"
#include "vlloader/source/vlloader.h"
#include "zt/fnd/String.h"

namespace admin {
namespace {

namespace fs = std::filesystem;

using vltctl::ExitCode;
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

int Trace(const Arguments&, Output& output) {
  std::string directory = Narrow(vlLogDirectory()), options = Narrow(vlDiagnosticsIni());
  Document document(ReadGuarded(options).bytes);
  std::vector<Row> rows = {{"directory", directory, ""},
                           {"options", options, fs::exists(options) ? "" : "missing"},
                           Option(document, "Severity", "1"),
                           Option(document, "Target", "1"),
                           Option(document, "LowDiskThreshold", "0")};
  std::string newest = NewestLog(directory);
  if (!newest.empty()) rows.push_back({"newest log", directory + newest, ""});
  Print(rows, output);
  if (newest.empty() || output.json()) return vltctl::kGood;
  for (const std::string& line : LastLines(directory + newest)) output.line("| " + line);
  return vltctl::kGood;
}

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
