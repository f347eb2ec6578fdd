// settings, jar: what the guarded files say.
#include "source/Utilities/vltSettingsKeys.h"
#include "tools/vltctl/Reading.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/String.h"

namespace admin {
namespace {

std::string Narrow(const wchar_t* text) { return zt::fnd::AnsiString(text).c_str(); }

// Puts rows together, each from the file or from its default.
class SettingRows {
 public:
  SettingRows(const std::string& file, const Document& document)
      : m_file(file), m_document(document) {}

  void add(const std::string& key, const std::optional<std::string>& fallback) {
    auto value = m_document.get(settings::kSection, key);
    if (value) {
      rows.push_back({key, *value, m_file + " [" + settings::kSection + "]"});
    } else {
      rows.push_back({key, fallback.value_or(""), fallback ? "built-in default" : "not set"});
    }
  }
  void add(const settings::IndexedText& row, unsigned index) {
    bool hasDefault = index == settings::kDefaultIndex;
    add(row.key + std::to_string(index),
        hasDefault ? std::optional<std::string>(Narrow(row.atDefaultIndex)) : std::nullopt);
  }
  void add(const settings::PlainNumber& row) { add(row.key, std::to_string(row.fallback)); }

  std::vector<Row> rows;

 private:
  std::string m_file;
  const Document& m_document;
};

}  // namespace

int Settings(const Arguments& arguments, Output& output) {
  using namespace settings;
  unsigned index = arguments.number("--index", kDefaultIndex);
  bool client = arguments.has("--client"), server = arguments.has("--server");
  std::string name = arguments.has("--name") ? arguments.text("--name") : "kor";
  std::string file = DataFile(name + ".ini");
  GuardedBytes read = ReadGuarded(file);
  if (read.state == GuardedBytes::State::Unreadable) throw Unusable(file, read.error);
  Document document(read.bytes);
  SettingRows out(file, document);
  bool both = client == server;
  for (const IndexedText& row : {kBootstrapEndpoint, kRemoteProtocol, kRemoteEndpoint,
                                 kRemoteEventPort, kLocalProtocol, kLocalEndpoint}) {
    out.add(row, index);
  }
  out.add(kEventNameAppend + std::to_string(index), "");
  if (both || server) {
    out.add(kRemoteServerEnabled + std::to_string(index), "0");
    for (const PlainNumber& row : {kJournalingOptions, kMaxBackupFrequency, kValidateDBStructure,
                                   kNumCheckpoints, kCreateCheckpoints}) {
      out.add(row);
    }
  }
  if (both || client) {
    for (const PlainNumber& row :
         {kObjectCacheLimit, kObjectCacheFlushPercentage, kBufferCacheLimit,
          kBufferCacheMinimumLimit, kBufferCacheFlushPercentage, kGarbageCollectorInterval}) {
      out.add(row);
    }
  }
  Print(out.rows, output);
  return vltctl::kGood;
}

int Jar(const Arguments&, Output& output) {
  std::string file = DataFile(zt::fnd::AnsiString(vlt::layout::kJar).c_str());
  GuardedBytes read = ReadGuarded(file);
  if (read.state == GuardedBytes::State::Unreadable) throw Unusable(file, read.error);
  if (read.state == GuardedBytes::State::Missing) {
    throw vltctl::Failure(vltctl::kNotFound, {"no-jar", file, "there is no jar", "",
                                              "a server makes it when it starts"});
  }
  Document document(read.bytes);
  vltctl::Table table;
  for (const std::string& section : document.sections()) {
    for (const auto& [item, value] : document.items(section)) {
      table.add({item, value, "[" + section + "]"});
      output.item({{"section", section}, {"name", item}, {"value", value}});
    }
  }
  output.print(table);
  return document.status() < 0 ? vltctl::kDataUnusable : vltctl::kGood;
}

}  // namespace admin
