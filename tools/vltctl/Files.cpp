// settings, jar, verify: what the guarded files say.
#include <stdio.h>
#include <string.h>

#include <algorithm>

#include "source/Cmd5vlt.h"
#include "source/Common/vltFileSecurity.h"
#include "source/IniSidecar.h"
#include "source/Utilities/vltSettingsKeys.h"
#include "source/vlIniMgr.h"
#include "tools/common/Terminal.h"
#include "tools/vltctl/Reading.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/String.h"

using vltctl::ForTerminal;

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

int Settings(unsigned index, bool client, bool server, const std::string& name, bool json) {
  using namespace settings;
  std::string file = DataFile((name.empty() ? "kor" : name) + ".ini");
  GuardedBytes read = ReadGuarded(file);
  if (read.state == GuardedBytes::State::Unreadable) {
    fprintf(stderr, "vltctl: %s: %s\n", ForTerminal(file).c_str(), read.error.c_str());
    return vltctl::kDataUnusable;
  }
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
  Print(out.rows, json);
  return vltctl::kGood;
}

int Jar(bool json) {
  std::string file = DataFile(zt::fnd::AnsiString(vlt::layout::kJar).c_str());
  GuardedBytes read = ReadGuarded(file);
  if (read.state != GuardedBytes::State::Read) {
    bool missing = read.state == GuardedBytes::State::Missing;
    fprintf(stderr, "vltctl: %s: %s\n", ForTerminal(file).c_str(),
            missing ? "no jar" : read.error.c_str());
    return missing ? vltctl::kNotFound : vltctl::kDataUnusable;
  }
  Document document(read.bytes);
  std::vector<Row> rows;
  for (const std::string& section : document.sections()) {
    for (const auto& [item, value] : document.items(section)) {
      rows.push_back({item, value, "[" + section + "]"});
    }
  }
  if (!json) {
    Print(rows, false);
  } else {
    nlohmann::json out = nlohmann::json::object();
    for (const Row& row : rows)
      out[row.origin.substr(1, row.origin.size() - 2)][row.name] = row.value;
    PrintJson(out);
  }
  return document.status() < 0 ? vltctl::kDataUnusable : vltctl::kGood;
}

namespace {

struct Verdict {
  const char* found;
  const char* nextOpen;
  ExitCode code;
};

std::string Md5(const std::string& bytes) {
  unsigned char digest[IniSidecar::kSizeBytes];
  Cmd5vlt md5;
  md5.addString(reinterpret_cast<const unsigned char*>(bytes.data()),
                static_cast<unsigned>(bytes.size()));
  md5.getDigest(digest);
  return std::string(reinterpret_cast<char*>(digest), sizeof digest);
}

constexpr const char* kTaken = "takes the file as it is";
constexpr const char* kSetAside = "sets the file aside as .bad and begins an empty one";

Verdict Judge(const GuardedBytes& read) {
  if (read.state == GuardedBytes::State::Missing) {
    return {"the file is missing", "makes an empty file", vltctl::kNotFound};
  }
  if (read.state == GuardedBytes::State::Unreadable) {
    return {"the file cannot be opened", "fails and leaves the file", vltctl::kDataUnusable};
  }
  if (read.sidecar && read.sidecar->size() < IniSidecar::kSizeBytes) {
    return {"the sidecar is short", kSetAside, vltctl::kDataUnusable};
  }
  if (Document(read.bytes).status() < 0) {
    return {"the file cannot be parsed", kSetAside, vltctl::kDataUnusable};
  }
  if (!read.sidecar) return {"there is no sidecar", kTaken, vltctl::kGood};
  std::string digest = read.sidecar->substr(0, IniSidecar::kSizeBytes);
  if (digest == Md5(read.bytes)) return {"the digest matches", kTaken, vltctl::kGood};
  if (std::equal(digest.begin(), digest.end(), IniSidecar::kInvalidMark.begin())) {
    return {"the sidecar is the mark of a first save under way", kTaken, vltctl::kGood};
  }
  return {"the digest differs", kTaken, vltctl::kGood};
}

}  // namespace

int Verify(const std::string& file, bool json) {
  Verdict verdict = Judge(ReadGuarded(file));
  if (json) {
    PrintJson({{"file", file}, {"found", verdict.found}, {"nextOpen", verdict.nextOpen}});
  } else {
    printf("%s: %s; the next open %s\n", ForTerminal(file).c_str(), verdict.found,
           verdict.nextOpen);
  }
  return verdict.code;
}

}  // namespace admin
