#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "source/Utilities/vltutils.h"
#include "tests/support/Child.h"
#include "tests/support/Installation.h"

namespace {

using namespace vlt::test;

std::optional<std::string> Take(wchar_t*& text) {
  if (!text) return std::nullopt;
  std::string narrow;
  for (wchar_t* c = text; *c; ++c) narrow += static_cast<char>(*c);
  vltFree(text);
  text = nullptr;
  return narrow;
}

std::string Show(const std::optional<std::string>& text) { return text ? *text : "(untouched)"; }

struct Client {
  HRESULT result;
  std::optional<std::string> bootstrap, protocol, endpoint, eventPort, append;
};

Client ClientSettings(unsigned index, unsigned remote, unsigned offline, const wchar_t* name) {
  wchar_t* t[5] = {};
  Client c;
  c.result = vltGetClientSettings(index, remote, offline, name, &t[0], &t[1], &t[2], &t[3], &t[4]);
  c.bootstrap = Take(t[0]);
  c.protocol = Take(t[1]);
  c.endpoint = Take(t[2]);
  c.eventPort = Take(t[3]);
  c.append = Take(t[4]);
  return c;
}

std::string Text(const Client& c) {
  return std::to_string(static_cast<uint32_t>(c.result)) + "|" + Show(c.bootstrap) + "|" +
         Show(c.protocol) + "|" + Show(c.endpoint) + "|" + Show(c.eventPort) + "|" + Show(c.append);
}

struct Server {
  HRESULT result;
  unsigned remoteEnabled = 9;
  std::optional<std::string> texts[7];
  int cookie = 9;
  long maxBackup = -9;
  unsigned journaling = 9, validate = 9;
  long checkpoints = -9;
  unsigned create = 9;
};

Server ServerSettings(unsigned index, unsigned useName = 0, const wchar_t* name = nullptr) {
  Server s;
  wchar_t* t[7] = {};
  s.result = vltGetServerSettings(index, &s.remoteEnabled, &t[0], &t[1], &t[2], &t[3], &t[4], &t[5],
                                  &s.cookie, &t[6], &s.maxBackup, useName, name, &s.journaling,
                                  &s.validate, &s.checkpoints, &s.create);
  for (int i = 0; i < 7; ++i) s.texts[i] = Take(t[i]);
  return s;
}

std::string Text(const Server& s) {
  std::string out =
      std::to_string(static_cast<uint32_t>(s.result)) + "|" + std::to_string(s.remoteEnabled);
  for (const auto& text : s.texts) out += "|" + Show(text);
  return out + "|" + std::to_string(s.cookie) + "|" + std::to_string(s.maxBackup) + "|" +
         std::to_string(s.journaling) + "|" + std::to_string(s.validate) + "|" +
         std::to_string(s.checkpoints) + "|" + std::to_string(s.create);
}

constexpr const char* kFail = "2147500037";  // E_FAIL

// The install directory is looked up once a process: each question is a child of its own, which
// compares what it gets.
class vltSettingsFile : public testing::Test {
 protected:
  void write(const std::string& items, const std::string& name = "kor") {
    std::filesystem::create_directories(data());
    WriteBytes(data() + "/" + name + ".ini", "[STORAGE]\n" + items);
  }
  std::string data() const { return installation.root() + "/Data"; }
  template <class Ask>
  std::string ask(Ask question) {
    TempDir dir;
    Child([&] {
      WriteBytes(dir / "answer", Text(question()));
      return 0;
    }).wait();
    return ReadBytes(dir / "answer");
  }

  Installation installation;
};

TEST_F(vltSettingsFile, IndexThreeHasDefaultsForAClient) {
  for (bool withFile : {false, true}) {
    if (withFile) write("");
    EXPECT_EQ(ask([] { return ClientSettings(3, 1, 0, nullptr); }),
              "0|62602|ncacn_ip_tcp|51700|57616|");
    EXPECT_EQ(ask([] { return ClientSettings(3, 0, 0, nullptr); }),
              "0|62602|ncalrpc|61900|(untouched)|");
  }
}

TEST_F(vltSettingsFile, OtherIndexesFailAndKeepTheOutputs) {
  for (bool withFile : {false, true}) {
    if (withFile) write("");
    EXPECT_EQ(ask([] { return ClientSettings(2, 1, 0, nullptr); }),
              std::string(kFail) + "|(untouched)|(untouched)|(untouched)|(untouched)|");
  }
  write("RemoteServerEndpoint2=77\nEventNameAppend2=-x\n");
  EXPECT_EQ(ask([] { return ClientSettings(2, 1, 0, nullptr); }),
            std::string(kFail) + "|(untouched)|(untouched)|77|(untouched)|-x");
}

TEST_F(vltSettingsFile, ValuesOfTheFileWin) {
  write(
      "BootstrapEndpoint7=b\nRemoteServerProtocol7=rp\nRemoteServerEndpoint7=re\n"
      "RemoteEventPort7=ep\nLocalServerProtocol7=lp\nLocalServerEndpoint7=le\n"
      "EventNameAppend7=app\nRemoteServerEnabled7=7\n");
  EXPECT_EQ(ask([] { return ClientSettings(7, 1, 0, nullptr); }), "0|b|rp|re|ep|app");
  EXPECT_EQ(ask([] { return ClientSettings(7, 0, 0, nullptr); }), "0|b|lp|le|(untouched)|app");
  EXPECT_EQ(ask([] { return ServerSettings(7); }), "0|1|b|rp|re|ep|lp|le|app|0|86400|1|1|100|1");
}

TEST_F(vltSettingsFile, ServerDefaultsAtIndexThree) {
  write("");
  EXPECT_EQ(ask([] { return ServerSettings(3); }),
            "0|0|62602|ncacn_ip_tcp|51700|57616|ncalrpc|61900||0|86400|1|1|100|1");
}

TEST_F(vltSettingsFile, AtOtherIndexesTheUnnumberedOnesAreStillSet) {
  write("");
  std::string untouched =
      "|(untouched)|(untouched)|(untouched)|(untouched)|(untouched)|(untouched)";
  EXPECT_EQ(ask([] { return ServerSettings(2); }),
            std::string(kFail) + "|0" + untouched + "||0|86400|1|1|100|1");
}

TEST_F(vltSettingsFile, NumbersReadAsTheirConversionsMakeThem) {
  struct Row {
    const char *items, *tail;
  };
  const Row rows[] = {{"NumCheckpoints=-5\nCreateCheckpoints=2\n", "|86400|1|1|0|1"},
                      {"NumCheckpoints=7x\nCreateCheckpoints=0\n", "|86400|1|1|7|0"},
                      {"JournalingOptions=0\nValidateDBStructure=0\n", "|86400|0|0|100|1"},
                      {"JournalingOptions=abc\nValidateDBStructure=-3\n", "|86400|0|1|100|1"},
                      {"MaxBackupFrequency=-12\n", "|-12|1|1|100|1"}};
  for (const Row& row : rows) {
    write(row.items);
    std::string answer = ask([] { return ServerSettings(3); });
    EXPECT_TRUE(answer.ends_with(row.tail)) << row.items << answer;
  }
}

TEST_F(vltSettingsFile, RemoteEnabledIsATruthValue) {
  const std::pair<const char*, const char*> rows[] = {
      {"7", "0|1|"}, {"abc", "0|0|"}, {"0", "0|0|"}, {"1", "0|1|"}};
  for (const auto& [value, head] : rows) {
    write(std::string("RemoteServerEnabled3=") + value + "\n");
    EXPECT_EQ(ask([] { return ServerSettings(3); }).substr(0, 4), head) << value;
  }
}

TEST_F(vltSettingsFile, NullOutputsAreNotRead) {
  write("LocalServerEndpoint3=1\n");
  EXPECT_EQ(Child([] {
              HRESULT client = vltGetClientSettings(2, 1, 0, nullptr, nullptr, nullptr, nullptr,
                                                    nullptr, nullptr);
              HRESULT server = vltGetServerSettings(2, nullptr, nullptr, nullptr, nullptr, nullptr,
                                                    nullptr, nullptr, nullptr, nullptr, nullptr, 0,
                                                    nullptr, nullptr, nullptr, nullptr, nullptr);
              HRESULT cache = vltGetClientCacheSettings(nullptr, nullptr, nullptr, nullptr, nullptr,
                                                        nullptr, 0, nullptr);
              return client | server | cache;
            }).wait(),
            0);
  EXPECT_FALSE(Exists(data() + "/vltjar.ini"));  // No cookie was wanted.
}

TEST_F(vltSettingsFile, NamesChooseTheFileOnlyWhereTheyAreAskedFor) {
  write("LocalServerEndpoint3=plain\n");
  write("LocalServerEndpoint3=named\nRemoteServerEnabled3=1\n", "other");
  EXPECT_EQ(ask([] { return ClientSettings(3, 0, 0, L"other"); }),
            "0|62602|ncalrpc|plain|(untouched)|");
  EXPECT_EQ(ask([] { return ServerSettings(3, 1, L"other"); }).substr(0, 4), "0|1|");
  EXPECT_EQ(ask([] { return ServerSettings(3, 0, L"other"); }).substr(0, 4), "0|0|");
  EXPECT_EQ(ask([] { return ServerSettings(3, 1, nullptr); }).substr(0, 4), "0|0|");
}

TEST_F(vltSettingsFile, AnOfflineClientGetsItsEndpointFromTheJar) {
  write("", "mine");
  EXPECT_EQ(ask([] { return ClientSettings(3, 0, 1, L"mine"); }),
            "0|62602|ncalrpc|61901|(untouched)|");
  // The jar's answer replaces an earlier failure.
  EXPECT_EQ(ask([] { return ClientSettings(2, 0, 1, L"mine"); }),
            "0|(untouched)|(untouched)|61902|(untouched)|");
  write("");
  EXPECT_EQ(ask([] { return ClientSettings(3, 0, 1, nullptr); }),
            "0|62602|ncalrpc|61903|(untouched)|");
}

TEST_F(vltSettingsFile, RemoteGoesBeforeOffline) {
  write("", "mine");
  EXPECT_EQ(ask([] { return ClientSettings(3, 1, 1, L"mine"); }),
            "0|62602|ncacn_ip_tcp|51700|57616|");
  EXPECT_FALSE(Exists(data() + "/vltjar.ini"));
}

TEST_F(vltSettingsFile, OfflineWithoutADataDirectoryFails) {
  EXPECT_EQ(ask([] { return ClientSettings(3, 0, 1, L"mine"); }),
            std::string(kFail) + "|62602|ncalrpc|(untouched)|(untouched)|");
}

TEST_F(vltSettingsFile, TheCookieComesFromTheJarWhateverItsResult) {
  write("");
  WriteBytes(data() + "/vltjar.ini", "[CookieSection]\nLastServerCookie=42\n");
  EXPECT_NE(ask([] { return ServerSettings(3); }).find("||42|86400|"), std::string::npos);
}

TEST_F(vltSettingsFile, WithoutADataDirectoryTheCookieMakesIt) {
  EXPECT_EQ(ask([] { return ServerSettings(3); }),
            "0|0|62602|ncacn_ip_tcp|51700|57616|ncalrpc|61900||0|86400|1|1|100|1");
  EXPECT_TRUE(Exists(data() + "/vltjar.ini"));
}

TEST_F(vltSettingsFile, AnUnusableSidecarShowsInTheResult) {
  write("LocalServerEndpoint3=9\n");
  WriteBytes(data() + "/kor.vl5", "short");
  EXPECT_EQ(ask([] { return ClientSettings(3, 0, 0, nullptr); }),
            std::string(kFail) + "|62602|ncalrpc|61900|(untouched)|");
}

TEST_F(vltSettingsFile, CacheLimitsHaveDefaults) {
  const char* keys[] = {"ClientObjectCacheLimit",           "ClientObjectCacheFlushPercentage",
                        "ClientBufferCacheLimit",           "ClientBufferCacheMinimumLimit",
                        "ClientBufferCacheFlushPercentage", "GarbageCollectorInterval"};
  const unsigned defaults[] = {150000, 20, 33554432, 2097152, 20, 20000};
  for (int changed = -1; changed < 6; ++changed) {
    for (const auto& row :
         {std::pair<const char*, unsigned>{"77", 77}, {"x", 0}, {"-1", 0xFFFFFFFFu}}) {
      const char* text = row.first;
      unsigned number = row.second;
      write(changed < 0 ? "" : std::string(keys[changed]) + "=" + text + "\n");
      EXPECT_EQ(Child([&] {
                  unsigned v[6] = {};
                  HRESULT result = vltGetClientCacheSettings(&v[0], &v[1], &v[2], &v[3], &v[4],
                                                             &v[5], 0, nullptr);
                  for (int i = 0; i < 6; ++i) {
                    if (v[i] != (i == changed ? number : defaults[i])) return 10 + i;
                  }
                  return static_cast<int>(result);
                }).wait(),
                0)
          << changed << text;
    }
  }
}

// ---- The local URL and the kinds of storage

TEST(vltSettingsLocalUrl, NullIsAFailureAndNotAPointerError) {
  EXPECT_EQ(vltGetLocalConfigurationURL(nullptr), E_FAIL);
}

std::string Url(HRESULT expected) {
  wchar_t* url = nullptr;
  if (vltGetLocalConfigurationURL(&url) != expected) return "wrong result";
  return Show(Take(url));
}

TEST(vltSettingsLocalUrl, ComesFromTheWorkingDirectoryOnce) {
  TempDir dir;
  WriteBytes(dir / "kor.ini", "[STORAGE]\nLocalServerEndpoint3=555\n");
  EXPECT_EQ(Child([&] {
              if (chdir(dir.path().c_str()) != 0) return 1;
              if (Url(S_OK) != "127.0.0.1:555") return 2;
              WriteBytes(dir / "kor.ini", "[STORAGE]\nLocalServerEndpoint3=556\n");
              return Url(S_OK) == "127.0.0.1:555" ? 0 : 3;
            }).wait(),
            0);
}

TEST(vltSettingsLocalUrl, WithoutAFileHasTheDefaultPortAndLeavesAnEmptyFile) {
  TempDir dir;
  EXPECT_EQ(Child([&] {
              if (chdir(dir.path().c_str()) != 0) return 1;
              return Url(S_OK) == "127.0.0.1:61900" ? 0 : 2;
            }).wait(),
            0);
  EXPECT_EQ(ReadBytes(dir / "kor.ini"), "");
  EXPECT_FALSE(Exists(dir / "kor.vl5"));
}

TEST(vltSettingsLocalUrl, AnUnwritableDirectoryCostsThePortForGood) {
  EXPECT_EQ(Child([] {
              if (chdir("/proc/self") != 0) return 1;
              if (Url(E_FAIL) != "127.0.0.1:") return 2;
              return Url(S_OK) == "127.0.0.1:" ? 0 : 3;
            }).wait(),
            0);
}

TEST(vltSettingsStorageKind, DefaultStorages) {
  EXPECT_EQ(vltIsDefaultStorage(nullptr), 1);
  EXPECT_EQ(vltIsDefaultStorage(L"config.vlt"), 1);
  EXPECT_EQ(vltIsDefaultStorage(L"/a/b/CONFIG3.VLT"), 1);
  EXPECT_EQ(vltIsDefaultStorage(L"/a/config3.vlt/x"), 0);
  EXPECT_EQ(vltIsDefaultStorage(L"/a/config3.vlt/"), 0);
  EXPECT_EQ(vltIsDefaultStorage(L""), 0);
}

TEST(vltSettingsStorageKind, OfflineAddresses) {
  struct Row {
    const wchar_t* url;
    unsigned offline;
    const char* storage;
  };
  const Row rows[] = {
      {L"127.0.0.1:1", 0, "(untouched)"},         {L"x;VLTOFFLINESTORAGE=name", 1, "name"},
      {L"VLTOFFLINESTORAGE=na:me", 1, "na"},      {L"VLTOFFLINESTORAGE=", 1, ""},
      {L"vltofflinestorage=x", 0, "(untouched)"}, {nullptr, 0, "(untouched)"}};
  for (const Row& row : rows) {
    unsigned offline = 9;
    wchar_t* storage = nullptr;
    EXPECT_EQ(vltIsOfflineStorage(row.url, &offline, &storage), S_OK);
    EXPECT_EQ(offline, row.offline);
    EXPECT_EQ(Show(Take(storage)), row.storage);
    EXPECT_EQ(vltIsOfflineStorage(row.url, &offline, nullptr), S_OK);
    EXPECT_EQ(offline, row.offline);
  }
}

TEST(vltSettingsStorageKind, NamedRegistrarsAreTheDefaultOne) {
  Installation installation;
  EXPECT_EQ(vltGetNamedRegistrar(nullptr, nullptr), E_POINTER);
  IvltRegistrar* out = nullptr;
  EXPECT_EQ(vltGetNamedRegistrar2(L"/a/other.vlt", &out), E_FAIL);
  EXPECT_EQ(Child([] {
              IvltRegistrar *a = nullptr, *b = nullptr, *c = nullptr;
              if (vltGetNamedRegistrar(L"/x/config.vlt", &a) != S_OK) return 1;
              if (vltGetNamedRegistrar2(nullptr, &b) != S_OK) return 2;
              if (vltGetRegistrar(&c) != S_OK) return 3;
              bool same = a == b && b == c;
              a->Release();
              b->Release();
              c->Release();
              return same ? 0 : 4;
            }).wait(),
            0);
}

}  // namespace
