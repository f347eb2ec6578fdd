// settings, settings set and url: what is in force, where it comes from, and what is ignored.
#include <errno.h>
#include <string.h>

#include <algorithm>
#include <cctype>
#include <optional>

#include "source/Common/vltcmn.h"
#include "source/Utilities/vltSettingsKeys.h"
#include "source/Utilities/vltjar.h"
#include "tools/common/IniLines.h"
#include "tools/vltctl/GuardedFiles.h"
#include "tools/vltctl/Reading.h"
#include "tools/vltctl/Root.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/String.h"

namespace admin {
namespace {

using vltctl::Failure;
using vltctl::IniLine;
using vltctl::Json;
using zt::fnd::String;

std::string Narrow(const wchar_t* text) { return zt::fnd::AnsiString(text).c_str(); }

// ---- The settings that there are

enum class Reads {
  Text,
  U32,
  Flag,
  Long,
  Count
};  // as source/Utilities/vltSettings.cpp reads them
enum class Side { Both, Client, Server };

struct Setting {
  std::string key;  // without the index
  bool isIndexed;
  Reads reads;
  Side side;
  std::optional<std::string> atDefaultIndex, otherwise;  // what holds without a line
};

Setting Indexed(const settings::IndexedText& row) {
  return {row.key, true, Reads::Text, Side::Both, Narrow(row.atDefaultIndex), std::nullopt};
}

Setting Plain(const settings::PlainNumber& row, Reads reads, Side side) {
  std::string fallback = std::to_string(row.fallback);
  return {row.key, false, reads, side, fallback, fallback};
}

const std::vector<Setting>& AllSettings() {
  using namespace settings;
  static const std::vector<Setting> all = {
      Indexed(kBootstrapEndpoint),
      Indexed(kRemoteProtocol),
      Indexed(kRemoteEndpoint),
      Indexed(kRemoteEventPort),
      Indexed(kLocalProtocol),
      Indexed(kLocalEndpoint),
      {kEventNameAppend, true, Reads::Text, Side::Both, "", ""},
      {kRemoteServerEnabled, true, Reads::Flag, Side::Server, "0", "0"},
      Plain(kJournalingOptions, Reads::Flag, Side::Server),
      Plain(kMaxBackupFrequency, Reads::Long, Side::Server),
      Plain(kValidateDBStructure, Reads::Flag, Side::Server),
      Plain(kNumCheckpoints, Reads::Count, Side::Server),
      Plain(kCreateCheckpoints, Reads::Flag, Side::Server),
      Plain(kObjectCacheLimit, Reads::U32, Side::Client),
      Plain(kObjectCacheFlushPercentage, Reads::U32, Side::Client),
      Plain(kBufferCacheLimit, Reads::U32, Side::Client),
      Plain(kBufferCacheMinimumLimit, Reads::U32, Side::Client),
      Plain(kBufferCacheFlushPercentage, Reads::U32, Side::Client),
      Plain(kGarbageCollectorInterval, Reads::U32, Side::Client)};
  return all;
}

bool AreDigits(const std::string& text) {
  return !text.empty() &&
         std::all_of(text.begin(), text.end(), [](unsigned char c) { return isdigit(c); });
}

// The setting that a name of a line stands for, with any index; null if there is none.
const Setting* FindSetting(const std::string& name) {
  for (const Setting& setting : AllSettings()) {
    bool isLonger = name.size() > setting.key.size();
    std::string rest = isLonger ? name.substr(setting.key.size()) : "";
    if (!vltctl::SameName(name.substr(0, setting.key.size()), setting.key)) continue;
    if (setting.isIndexed ? AreDigits(rest) : !isLonger) return &setting;
  }
  return nullptr;
}

// The number as the library takes it.
Json InForce(Reads reads, const std::string& value) {
  String wide(value.c_str());
  switch (reads) {
    case Reads::Text:
      return value;
    case Reads::U32:
      return vltU32FromString2(wide.c_str());
    case Reads::Flag:
      return vltI32FromString2(wide.c_str()) != 0 ? 1 : 0;
    case Reads::Long:
      return atol(value.c_str());
    case Reads::Count:
      return std::max(atol(value.c_str()), 0L);
  }
  return nullptr;
}

std::string TextOf(const Json& value) {
  return value.is_string() ? value.get<std::string>() : value.is_null() ? "" : value.dump();
}

// ---- The file

std::string SettingsFile(const Arguments& arguments) {
  if (!arguments.has("--name")) return DataFile(Narrow(vlt::layout::kSettings));
  std::string name = arguments.text("--name");
  if (name.empty() || name.find('/') != std::string::npos) {
    throw Failure(vltctl::kUsage, {"bad-name", "--name", "\"" + name + "\" is no name of a file",
                                   "", "give the name without directory and without \".ini\""});
  }
  return DataFile(name + ".ini");
}

struct File {
  std::string path;
  GuardedIniState state;
  std::vector<IniLine> lines;  // none where the library takes none from it
};

File Read(const std::string& path) {
  File out{path, Inspect(path), {}};
  if (out.state.opening == GuardedIniState::Opening::Fails) {
    throw Failure(vltctl::kDataUnusable,
                  {WordsOf(out.state.kind).code, path, WordsOf(out.state.kind).found,
                   WhyOf(out.state), WordsOf(out.state.kind).next});
  }
  if (out.state.opening == GuardedIniState::Opening::Takes) {
    out.lines = vltctl::LinesOf(ReadGuarded(path).bytes);
  }
  return out;
}

std::string At(const File& file, const IniLine& line) {
  return file.path + ":" + std::to_string(line.number);
}

// ---- What is ignored

std::vector<std::string> KeysWithIndex(unsigned index) {
  std::vector<std::string> keys;
  for (const Setting& s : AllSettings()) {
    keys.push_back(s.key + (s.isIndexed ? std::to_string(index) : ""));
  }
  return keys;
}

// How much of a value counts as a number.
size_t NumberLength(const std::string& value) {
  char* end = nullptr;
  strtol(value.c_str(), &end, 10);
  return static_cast<size_t>(end - value.c_str());
}

class Findings {
 public:
  Findings(const File& file, unsigned index, Output& output)
      : m_file(file), m_index(index), m_output(output) {}

  void report();
  bool any() const { return m_any; }

 private:
  void say(const IniLine& line, const char* code, const std::string& what, const std::string& why,
           const std::string& next) {
    m_any = true;
    m_output.problem({code, At(m_file, line), what, why, next});
  }
  void reportItem(const IniLine& line);

  const File& m_file;
  const unsigned m_index;
  Output& m_output;
  bool m_any = false;
};

void Findings::reportItem(const IniLine& line) {
  const Setting* setting = FindSetting(line.name);
  if (!setting) {
    std::string guess = vltctl::DidYouMean(line.name, KeysWithIndex(m_index));
    say(line, "unknown-key", line.name + " is ignored", "there is no such setting",
        guess.empty() ? "\"vltctl settings\" shows all" : guess);
    return;
  }
  const IniLine* counts = vltctl::FindItem(m_file.lines, line.section, line.name);
  if (counts != &line) {
    say(line, "repeated-key", line.name + " is ignored",
        "line " + std::to_string(counts->number) + " sets it again", "remove one of them");
    return;
  }
  size_t number = NumberLength(line.value);
  if (setting->reads == Reads::Text || number == line.value.size()) return;
  Json value = InForce(setting->reads, line.value);
  std::string why = number == 0 ? "it does not begin with a number"
                                : "\"" + line.value.substr(number) + "\" is no part of a number";
  say(line, "bad-number", "\"" + line.value + "\" counts as " + TextOf(value), why,
      "write the number alone");
}

void Findings::report() {
  if (m_file.state.opening == GuardedIniState::Opening::SetsAsideAndBegins ||
      m_file.state.opening == GuardedIniState::Opening::SetsAsideAndFails) {
    m_any = true;
    m_output.problem({WordsOf(m_file.state.kind).code, m_file.path,
                      "nothing of it is in force: " + std::string(WordsOf(m_file.state.kind).found),
                      "", WordsOf(m_file.state.kind).next});
  }
  for (const IniLine& line : m_file.lines) {
    if (line.kind == IniLine::Kind::Bad) {
      say(line, "bad-line", "\"" + line.text + "\" is ignored",
          "it is neither a section nor a name with a value", "write NAME = VALUE");
    } else if (line.kind == IniLine::Kind::Item &&
               !vltctl::SameName(line.section, settings::kSection)) {
      say(line, "other-section", line.name + " is ignored",
          line.section.empty() ? "it is above the first section"
                               : "it is in section [" + line.section + "]",
          std::string("move it into [") + settings::kSection + "]");
    } else if (line.kind == IniLine::Kind::Item) {
      reportItem(line);
    }
  }
}

bool IsOfSide(const Setting& setting, const Arguments& arguments) {
  bool client = arguments.has("--client"), server = arguments.has("--server");
  if (client == server || setting.side == Side::Both) return true;
  return setting.side == (client ? Side::Client : Side::Server);
}

struct Effective {
  Json value;  // null for one that is not set
  std::string origin;
  const IniLine* line = nullptr;
};

Effective ValueOf(const File& file, const Setting& setting, const std::string& key,
                  unsigned index) {
  if (const IniLine* line = vltctl::FindItem(file.lines, settings::kSection, key)) {
    return {InForce(setting.reads, line->value), At(file, *line), line};
  }
  auto fallback = index == settings::kDefaultIndex ? setting.atDefaultIndex : setting.otherwise;
  if (!fallback) return {nullptr, "not set", nullptr};
  return {InForce(setting.reads, *fallback), "built-in default", nullptr};
}

}  // namespace

int Settings(const Arguments& arguments, Output& output) {
  unsigned index = arguments.number("--index", settings::kDefaultIndex);
  File file = Read(SettingsFile(arguments));
  vltctl::Table table;
  for (const Setting& setting : AllSettings()) {
    if (!IsOfSide(setting, arguments)) continue;
    std::string key = setting.key + (setting.isIndexed ? std::to_string(index) : "");
    Effective effective = ValueOf(file, setting, key, index);
    table.add({key, TextOf(effective.value), effective.origin});
    output.item({{"name", key},
                 {"value", effective.value},
                 {"origin", effective.origin},
                 {"file", effective.line ? Json(file.path) : Json()},
                 {"line", effective.line ? Json(effective.line->number) : Json()},
                 {"written", effective.line ? Json(effective.line->value) : Json()}});
  }
  output.print(table);
  Findings findings(file, index, output);
  findings.report();
  return findings.any() ? vltctl::kNotFound : vltctl::kGood;
}

// ---- settings set

namespace {

void ExpectValid(const Setting& setting, const std::string& key, const std::string& value) {
  bool isNumber = setting.reads == Reads::Text || NumberLength(value) == value.size();
  bool breaksLines = value.find_first_of("\r\n") != std::string::npos;
  if (!value.empty() && isNumber && !breaksLines) return;
  throw Failure(vltctl::kUsage,
                {"bad-value", key, "\"" + value + "\" is no value of it", "",
                 setting.reads == Reads::Text ? "give one line of text" : "give a number"});
}

bool HasComments(const std::vector<IniLine>& lines) {
  return std::any_of(lines.begin(), lines.end(),
                     [](const IniLine& line) { return line.kind == IniLine::Kind::Comment; });
}

}  // namespace

int SettingsSet(const Arguments& arguments, Output& output) {
  const std::string key = arguments.text("KEY"), value = arguments.text("VALUE");
  const Setting* setting = FindSetting(key);
  if (!setting) {
    std::string guess = vltctl::DidYouMean(key, KeysWithIndex(settings::kDefaultIndex));
    throw Failure(vltctl::kUsage, {"unknown-key", "", "no such setting: " + key, "",
                                   guess.empty() ? "\"vltctl settings\" shows all" : guess});
  }
  ExpectValid(*setting, key, value);
  const std::string path = SettingsFile(arguments);
  File before = Read(path);
  if (before.state.opening == GuardedIniState::Opening::SetsAsideAndBegins ||
      before.state.opening == GuardedIniState::Opening::SetsAsideAndFails) {
    const StateWords& words = WordsOf(before.state.kind);
    throw Failure(vltctl::kDataUnusable, {words.code, path, words.found, "", words.next});
  }
  ExpectFree(path);
  String wide(path.c_str());
  std::unique_ptr<CvlIniMgr> ini;
  errno = 0;
  if (OpenForWriting(path, [&] { return VltjarOpen(wide.c_str(), &ini); }) < 0 || !ini) {
    throw CannotWrite(path, errno);
  }
  bool isSaved = ini->SetItem(settings::kSection, key.c_str(), value.c_str(), false) >= 0 &&
                 VltjarSaveChanges(wide.c_str(), ini.get()) >= 0;
  if (!isSaved) throw CannotWrite(path, errno);
  ini.reset();
  if (HasComments(before.lines)) {
    output.note(path + ": its comments and empty lines are gone, as with each save of the library");
  }
  output.item({{"file", path}, {"name", key}, {"value", value}});
  output.line(path + ": " + key + " = " + value);
  return vltctl::kGood;
}

// ---- url

namespace {

std::string EndpointOf(const File& file, Effective* effective) {
  const Setting* setting = FindSetting(std::string(settings::kLocalEndpoint.key) +
                                       std::to_string(settings::kDefaultIndex));
  std::string key = setting->key + std::to_string(settings::kDefaultIndex);
  *effective = ValueOf(file, *setting, key, settings::kDefaultIndex);
  return "127.0.0.1:" + TextOf(effective->value);
}

// The library's look-up (source/Utilities/vltStorageUrl.cpp) reads the working directory's file, and
// makes it if it is missing, which is not done here.
std::string LibrarysUrl() {
  File local = Read(Narrow(vlt::layout::kSettings));
  Effective ignored;
  return EndpointOf(local, &ignored);
}

}  // namespace

int Url(const Arguments&, Output& output) {
  File file = Read(DataFile(Narrow(vlt::layout::kSettings)));
  Effective server;
  std::string url = EndpointOf(file, &server), byLibrary = HasChosenRoot() ? "" : LibrarysUrl();
  output.line(url);
  output.item({{"url", url},
               {"origin", server.origin},
               {"line", server.line ? Json(server.line->number) : Json()},
               {"library", byLibrary.empty() ? Json() : Json(byLibrary)}});
  if (!byLibrary.empty() && url != byLibrary) {
    output.note("vltGetLocalConfigurationURL answers " + byLibrary +
                " in this directory: it reads kor.ini of the working directory, not " + file.path);
  }
  return vltctl::kGood;
}

}  // namespace admin
