#pragma once

// The three settings calls as tests ask them - with any choice of outputs - and what they must answer,
// by a model of their items that knows nothing of the library's.

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <climits>
#include <filesystem>
#include <functional>
#include <optional>
#include <ostream>
#include <string>

#include "source/Utilities/vltutils.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"

namespace vlt::test::settings {

inline constexpr unsigned kOther = 2;  // an index without defaults
inline constexpr size_t kNumbers = 6, kClientTexts = 5, kServerTexts = 7;

inline std::string Narrow(const wchar_t* text) {
  std::string narrow;
  for (; *text; ++text) narrow += static_cast<char>(*text);
  return narrow;
}

using Text = std::optional<std::string>;  // none: the output was not touched

// Text outputs of a call, of which some are wanted.
template <size_t N>
class Texts {
 public:
  explicit Texts(unsigned wanted = ~0u) : m_wanted(wanted) {}
  ~Texts() {
    for (wchar_t* text : m_texts) vltFree(text);
  }
  wchar_t** at(size_t n) { return m_wanted >> n & 1 ? &m_texts[n] : nullptr; }
  Text found(size_t n) const { return m_texts[n] ? Text(Narrow(m_texts[n])) : std::nullopt; }

 private:
  unsigned m_wanted;
  wchar_t* m_texts[N] = {};
};

// In the order in which they are read.
enum ClientText { kAppend, kBootstrap, kProtocol, kEndpoint, kEventPort };
enum ServerText {
  kServerAppend,
  kServerBootstrap,
  kRemoteProtocol,
  kRemoteEndpoint,
  kRemoteEventPort,
  kLocalProtocol,
  kLocalEndpoint
};

inline HRESULT AskClient(unsigned index, unsigned remote, Texts<kClientTexts>& t) {
  return vltGetClientSettings(index, remote, 0, nullptr, t.at(kBootstrap), t.at(kProtocol),
                              t.at(kEndpoint), t.at(kEventPort), t.at(kAppend));
}

inline HRESULT AskServer(unsigned index, Texts<kServerTexts>& t) {
  return vltGetServerSettings(index, nullptr, t.at(kServerBootstrap), t.at(kRemoteProtocol),
                              t.at(kRemoteEndpoint), t.at(kRemoteEventPort), t.at(kLocalProtocol),
                              t.at(kLocalEndpoint), nullptr, t.at(kServerAppend), nullptr, 0,
                              nullptr, nullptr, nullptr, nullptr, nullptr);
}

// The texts with an index: key and default at index 3.
struct TextRow {
  const char *key, *fallback;
};
inline constexpr TextRow kAppendRow = {"EventNameAppend", ""};
inline constexpr TextRow kBootstrapRow = {"BootstrapEndpoint", "62602"};
inline constexpr TextRow kServerRows[kServerTexts] = {kAppendRow,
                                                      kBootstrapRow,
                                                      {"RemoteServerProtocol", "ncacn_ip_tcp"},
                                                      {"RemoteServerEndpoint", "51700"},
                                                      {"RemoteEventPort", "57616"},
                                                      {"LocalServerProtocol", "ncalrpc"},
                                                      {"LocalServerEndpoint", "61900"}};
inline constexpr TextRow kRemoteRows[kClientTexts] = {
    kServerRows[0], kServerRows[1], kServerRows[2], kServerRows[3], kServerRows[4]};
// A local client gets no event port: no key can bring it.
inline constexpr TextRow kLocalRows[kClientTexts] = {
    kServerRows[0], kServerRows[1], kServerRows[5], kServerRows[6], {nullptr, nullptr}};

// What a text comes to, for each way in which numbers are read.
struct NumberText {
  const char* text;
  unsigned u32;   // also "RemoteServerEnabled", as a truth value
  long number;    // also the two counted options; negative checkpoints are none
  bool i32Truth;  // options that are stored as 0 or 1
};
inline constexpr unsigned kAll = UINT_MAX;
inline constexpr bool kWide = sizeof(long) == 8;
inline const NumberText kNumberTexts[] = {
    {"0", 0, 0, false},
    {"1", 1, 1, true},
    {"7", 7, 7, true},
    {"007", 7, 7, true},
    {"+7", 7, 7, true},
    {"-1", kAll, -1, true},
    {"-5", kAll - 4, -5, true},
    {"\" 12\"", 12, 12, true},
    {"12abc", 12, 12, true},
    {"1e3", 1, 1, true},
    {"0x10", 0, 0, false},
    {"abc", 0, 0, false},
    {"\"\"", 0, 0, false},
    {"True", 0, 0, false},
    {"2147483647", INT_MAX, INT_MAX, true},
    {"4294967295", kAll, kWide ? static_cast<long>(kAll) : LONG_MAX, true},
    {"4294967296", kWide ? 0 : kAll, static_cast<long>(kWide ? 4294967296 : LONG_MAX), !kWide},
    {"99999999999999999999", kAll, LONG_MAX, true},
};

struct ServerNumbers {
  unsigned remoteEnabled = 77, journaling = 77, validate = 77, create = 77;
  long maxBackup = 77, checkpoints = 77;
  bool operator==(const ServerNumbers&) const = default;
};
inline std::ostream& operator<<(std::ostream& out, const ServerNumbers& n) {
  return out << n.remoteEnabled << " " << n.journaling << " " << n.maxBackup << " " << n.validate
             << " " << n.checkpoints << " " << n.create;
}

// Bit n of `wanted` asks for the n-th in the order of ServerNumbers' items below.
inline ServerNumbers AskNumbers(unsigned index, unsigned wanted, HRESULT expected) {
  ServerNumbers n;
  EXPECT_EQ(vltGetServerSettings(
                index, wanted & 1 ? &n.remoteEnabled : nullptr, nullptr, nullptr, nullptr, nullptr,
                nullptr, nullptr, nullptr, nullptr, wanted & 4 ? &n.maxBackup : nullptr, 0, nullptr,
                wanted & 2 ? &n.journaling : nullptr, wanted & 8 ? &n.validate : nullptr,
                wanted & 16 ? &n.checkpoints : nullptr, wanted & 32 ? &n.create : nullptr),
            expected);
  return n;
}

// The items in the order in which they are read.
inline std::string ServerKey(size_t n, unsigned index) {
  const char* keys[kNumbers] = {"RemoteServerEnabled", "JournalingOptions", "MaxBackupFrequency",
                                "ValidateDBStructure", "NumCheckpoints",    "CreateCheckpoints"};
  return n == 0 ? keys[n] + std::to_string(index) : keys[n];
}

// With the n-th item as this text, or, for null, with none.
inline ServerNumbers Expected(unsigned wanted, size_t n, const NumberText* row) {
  ServerNumbers e;
  auto is = [&](size_t m) { return row && n == m; };
  if (wanted & 1) e.remoteEnabled = is(0) ? row->u32 != 0 : 0;
  if (wanted & 2) e.journaling = is(1) ? row->i32Truth : 1;
  if (wanted & 4) e.maxBackup = is(2) ? row->number : 86400;
  if (wanted & 8) e.validate = is(3) ? row->i32Truth : 1;
  if (wanted & 16) e.checkpoints = is(4) ? std::max(row->number, 0L) : 100;
  if (wanted & 32) e.create = is(5) ? row->number != 0 : 1;
  return e;
}

struct CacheRow {
  const char* key;
  unsigned fallback;
};
inline constexpr CacheRow kCacheRows[kNumbers] = {
    {"ClientObjectCacheLimit", 150000},       {"ClientObjectCacheFlushPercentage", 20},
    {"ClientBufferCacheLimit", 33554432},     {"ClientBufferCacheMinimumLimit", 2097152},
    {"ClientBufferCacheFlushPercentage", 20}, {"GarbageCollectorInterval", 20000}};

using CacheNumbers = std::array<unsigned, kNumbers>;

inline CacheNumbers AskCache(unsigned wanted, HRESULT expected, unsigned useName = 0,
                             const wchar_t* name = nullptr) {
  CacheNumbers v;
  v.fill(77);
  auto at = [&](size_t n) { return wanted >> n & 1 ? &v[n] : nullptr; };
  EXPECT_EQ(vltGetClientCacheSettings(at(0), at(1), at(2), at(3), at(4), at(5), useName, name),
            expected);
  return v;
}

inline CacheNumbers ExpectedCache(unsigned wanted, size_t n, const NumberText* row) {
  CacheNumbers e;
  for (size_t m = 0; m < kNumbers; ++m) {
    e[m] = !(wanted >> m & 1) ? 77 : row && m == n ? row->u32 : kCacheRows[m].fallback;
  }
  return e;
}

// Of an item that is there or not; none if the output stays untouched.
inline Text ExpectedText(const TextRow& row, unsigned index, bool present) {
  if (!row.key) return std::nullopt;
  if (present) return "value of " + std::string(row.key);
  if (index == 3 || std::string(row.key) == kAppendRow.key) return row.fallback;
  return std::nullopt;
}

// An installation with a data directory, where the test puts settings files.
class SettingsPlace : public testing::Test {
 protected:
  SettingsPlace() { std::filesystem::create_directory(data()); }

  std::string data() const { return installation.root() + "/Data"; }
  void write(const std::string& items, const std::string& name = "kor") const {
    WriteBytes(data() + "/" + name + ".ini", "[STORAGE]\n" + items);
  }

  Installation installation;
};

}  // namespace vlt::test::settings
