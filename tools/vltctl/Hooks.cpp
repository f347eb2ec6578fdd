// hook: which fault is armed, for processes that refresh their hooks.
#include <errno.h>
#include <string.h>

#include <algorithm>
#include <charconv>
#include <filesystem>
#include <utility>

#include "source/Common/vltHookPoints.h"
#include "source/vlIniMgr.h"
#include "tools/vltctl/GuardedFiles.h"
#include "tools/vltctl/Reading.h"
#include "vlloader/source/InstallLayout.h"

namespace admin {

namespace fs = std::filesystem;

namespace {

constexpr unsigned kLongestHangMs = 0x7FFFFFFF;  // what the library waits without a time

struct Flag {
  const char *word, *key;
};
constexpr Flag kFlags[] = {{"hang", "Hang"},
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

// An item of the hook file.
using Item = std::pair<std::string, std::string>;

vltctl::Failure BadFlag(const std::string& code, const std::string& what, const std::string& next) {
  return {vltctl::kUsage, {code, "", what, "", next}};
}

Item HangTime(const std::string& text) {
  unsigned milliseconds = 0;
  auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), milliseconds);
  bool isNumber = error == std::errc() && end == text.data() + text.size();
  if (isNumber && milliseconds <= kLongestHangMs) return {"HangTime", text};
  throw BadFlag("bad-hang-time", "\"" + text + "\" is no time to hang for",
                "give milliseconds, from 0 to 2147483647");
}

// "hang=250" arms a hang of so many milliseconds.
std::vector<Item> ItemsOf(const std::string& flag) {
  size_t equals = flag.find('=');
  const std::string word = flag.substr(0, equals);
  auto found = std::find_if(std::begin(kFlags), std::end(kFlags),
                            [&](const Flag& row) { return row.word == word; });
  if (found == std::end(kFlags)) {
    throw BadFlag("no-such-flag", "no such flag: " + flag,
                  "give hang[=MS], crash, fail, throw or exhaust");
  }
  std::vector<Item> items = {{found->key, "true"}};
  if (equals == std::string::npos) return items;
  if (word != "hang") {
    throw BadFlag("bad-flag", word + " takes no value", "write " + word + " alone");
  }
  items.push_back(HangTime(flag.substr(equals + 1)));
  return items;
}

std::vector<std::string> PointNames() {
  std::vector<std::string> names;
  for (const auto& point : vlt::hook::kPoints) names.push_back(point.name);
  return names;
}

// By its name, or by its number in the list, from 1.
std::string PointOf(const std::string& word) {
  const std::vector<std::string> names = PointNames();
  if (std::find(names.begin(), names.end(), word) != names.end()) return word;
  for (size_t n = 0; n < names.size(); ++n) {
    if (std::to_string(n + 1) == word) return names[n];
  }
  std::string guess = vltctl::DidYouMean(word, names);
  throw vltctl::Failure(vltctl::kNotFound,
                        {"no-such-point", "", "no such point: " + word, "",
                         guess.empty() ? "\"vltctl hook list\" shows all" : guess});
}

int Save(CvlIniMgr& ini, const std::string& file) {
  errno = 0;
  if (ini.Write() >= 0) return vltctl::kGood;
  throw CannotWrite(file, errno);
}

}  // namespace

int HookList(const Arguments&, Output& output) {
  vltctl::Table table;
  unsigned number = 0;
  for (const auto& point : vlt::hook::kPoints) {
    table.add({std::to_string(++number), point.name, point.where});
    output.item({{"number", number}, {"name", point.name}, {"where", point.where}});
  }
  output.print(table);
  return vltctl::kGood;
}

int HookArm(const Arguments& arguments, Output& output) {
  const std::string name = PointOf(arguments.text("POINT")), file = HookFile();
  const std::vector<std::string> flags = arguments.list("FLAG");
  std::vector<Item> items = {{"Name", name}};
  for (const std::string& flag : flags) {
    for (const Item& item : ItemsOf(flag)) items.push_back(item);
  }
  ExpectUsable(file);
  CvlIniMgr ini = OpenForWriting(file, [&] { return CvlIniMgr::OpenRaw(file); });
  ini.EraseSection("Hook");
  for (const auto& [key, value] : items) ini.SetItem("Hook", key.c_str(), value.c_str(), false);
  int code = Save(ini, file);
  output.item({{"file", file}, {"armed", name}, {"flags", flags}});
  output.line(file + ": armed " + name + "; it counts in a process that calls vltRefreshHook");
  return code;
}

int HookClear(const Arguments&, Output& output) {
  const std::string file = HookFile();
  output.item({{"file", file}, {"armed", nullptr}, {"flags", vltctl::Json::array()}});
  if (!fs::exists(file)) {
    output.line(file + ": nothing is armed");
    return vltctl::kGood;
  }
  ExpectUsable(file);
  CvlIniMgr ini = OpenForWriting(file, [&] { return CvlIniMgr::OpenRaw(file); });
  ini.EraseSection("Hook");
  int code = Save(ini, file);
  output.line(file + ": disarmed; flags that a process has read stay set until it ends");
  return code;
}

}  // namespace admin
