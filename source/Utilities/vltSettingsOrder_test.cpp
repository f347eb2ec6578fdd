// Which settings file is read, in which order its items are, and what the result is.
#include <gtest/gtest.h>

#include "tests/support/SettingsProbe.h"

namespace {

using namespace vlt::test;
using namespace vlt::test::settings;

class vltSettingsOrder : public SettingsPlace {};

// ---- Which file

TEST_F(vltSettingsOrder, TheNameCountsOnlyWithItsFlag) {
  write("ClientObjectCacheLimit=1\nBootstrapEndpoint3=plain\nNumCheckpoints=1\n");
  write("ClientObjectCacheLimit=2\nBootstrapEndpoint3=named\nNumCheckpoints=2\n", "other");
  ExpectInChild([&] {
    struct Row {
      unsigned flag;
      const wchar_t* name;
      unsigned file;
    };
    for (const Row& row : {Row{0, L"other", 1}, Row{1, L"other", 2}, Row{5, L"other", 2},
                           Row{1, nullptr, 1}, Row{0, nullptr, 1}}) {
      EXPECT_EQ(AskCache(1, S_OK, row.flag, row.name)[0], row.file);
      long checkpoints = 0;
      vltGetServerSettings(3, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr,
                           nullptr, nullptr, nullptr, row.flag, row.name, nullptr, nullptr,
                           &checkpoints, nullptr);
      EXPECT_EQ(checkpoints, static_cast<long>(row.file));
      Texts<1> t;
      vltGetClientSettings(3, 1, row.flag, row.name, t.at(0), nullptr, nullptr, nullptr, nullptr);
      EXPECT_EQ(t.found(0), row.file == 2 ? "named" : "plain");
    }
    // A name is put into the file's name as it is; a file of that name is begun.
    EXPECT_EQ(AskCache(1, S_OK, 1, L"a.b")[0], kCacheRows[0].fallback);
  });
  EXPECT_EQ(ReadBytes(data() + "/a.b.ini"), "");
  EXPECT_EQ(ModeOf(data() + "/a.b.ini"), 0777);
}

// ---- The order: where two outputs are the same place, the later one stays.

TEST_F(vltSettingsOrder, TextsAreReadInTheirOrder) {
  std::string items;
  for (const TextRow& row : kServerRows) items += std::string(row.key) + "3=" + row.key + "\n";
  write(items);
  // The earlier text of each pair is lost here, so this child counts no leaks.
  EXPECT_EQ(Child([] {
              for (size_t first = 0; first < kServerTexts; ++first) {
                for (size_t second = first + 1; second < kServerTexts; ++second) {
                  wchar_t* same = nullptr;
                  auto at = [&](size_t n) { return n == first || n == second ? &same : nullptr; };
                  vltGetServerSettings(3, nullptr, at(1), at(2), at(3), at(4), at(5), at(6),
                                       nullptr, at(0), nullptr, 0, nullptr, nullptr, nullptr,
                                       nullptr, nullptr);
                  if (Narrow(same) != kServerRows[second].key) return 1;
                  if (second >= kClientTexts) continue;
                  same = nullptr;
                  vltGetClientSettings(3, 1, 0, nullptr, at(1), at(2), at(3), at(4), at(0));
                  if (Narrow(same) != kRemoteRows[second].key) return 2;
                  if (second >= kEventPort) continue;
                  same = nullptr;
                  vltGetClientSettings(3, 0, 0, nullptr, at(1), at(2), at(3), nullptr, at(0));
                  if (Narrow(same) != kLocalRows[second].key) return 3;
                }
              }
              return 0;
            }).wait(),
            0);
}

TEST_F(vltSettingsOrder, NumbersAreReadInTheirOrder) {
  std::string items = "RemoteServerEnabled3=1\n";
  for (size_t n = 0; n < kNumbers; ++n) {
    items += std::string(kCacheRows[n].key) + "=" + std::to_string(n) + "\n";
  }
  write(items +
        "JournalingOptions=0\nMaxBackupFrequency=5\nValidateDBStructure=1\n"
        "NumCheckpoints=6\nCreateCheckpoints=0\n");
  WriteBytes(data() + "/vltjar.ini", "[CookieSection]\nLastServerCookie=42\n");
  ExpectInChild([&] {
    for (size_t first = 0; first < kNumbers; ++first) {
      for (size_t second = first + 1; second < kNumbers; ++second) {
        unsigned same = 99;
        auto at = [&](size_t n) { return n == first || n == second ? &same : nullptr; };
        vltGetClientCacheSettings(at(0), at(1), at(2), at(3), at(4), at(5), 0, nullptr);
        EXPECT_EQ(same, second);
      }
    }
    // Enabled 1, journaling 0, validate 1, create 0, and the cookie, 42, after them all.
    unsigned same = 99;
    auto ask = [&](bool enabled, bool journaling, bool validate, bool create, bool cookie) {
      EXPECT_EQ(
          vltGetServerSettings(3, enabled ? &same : nullptr, nullptr, nullptr, nullptr, nullptr,
                               nullptr, nullptr, cookie ? reinterpret_cast<int*>(&same) : nullptr,
                               nullptr, nullptr, 0, nullptr, journaling ? &same : nullptr,
                               validate ? &same : nullptr, nullptr, create ? &same : nullptr),
          S_OK);
      return same;
    };
    EXPECT_EQ(ask(true, true, false, false, false), 0u);
    EXPECT_EQ(ask(false, true, true, false, false), 1u);
    EXPECT_EQ(ask(true, false, true, true, false), 0u);
    EXPECT_EQ(ask(true, true, true, true, true), 42u);
    long number = 99;
    vltGetServerSettings(3, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr,
                         nullptr, &number, 0, nullptr, nullptr, nullptr, &number, nullptr);
    EXPECT_EQ(number, 6);
  });
}

// A jar that cannot be opened ends the call between the numbers and the texts.
TEST_F(vltSettingsOrder, TheCookieComesBetweenTheNumbersAndTheTexts) {
  write("");
  std::filesystem::create_directory(data() + "/vltjar.ini");
  ExpectInChild([&] {
    Texts<kServerTexts> t;
    int cookie = 77;
    long backup = 77, checkpoints = 77;
    unsigned enabled = 77, journaling = 77, validate = 77, create = 77;
    auto ask = [&] {
      return vltGetServerSettings(3, &enabled, t.at(1), t.at(2), t.at(3), t.at(4), t.at(5), t.at(6),
                                  &cookie, t.at(0), &backup, 0, nullptr, &journaling, &validate,
                                  &checkpoints, &create);
    };
    EXPECT_THROW(ask(), int);
    EXPECT_EQ(t.found(kServerAppend), "");
    EXPECT_EQ(create, 1u);
    EXPECT_EQ(checkpoints, 100);
    EXPECT_EQ(cookie, 77);
    for (size_t n = kServerBootstrap; n < kServerTexts; ++n) {
      EXPECT_EQ(t.found(n), std::nullopt);
    }
    // Nothing stayed locked: another process gets in.
    EXPECT_EQ(Child([] { return AskCache(1, S_OK)[0] == 150000 ? 0 : 1; }).wait(), 0);
  });
}

// ---- The result

TEST_F(vltSettingsOrder, AShortSidecarStaysTheResultButForTheJarsAnswer) {
  struct Row {
    unsigned index, remote, offline;
    HRESULT result;
  };
  const Row rows[] = {{3, 1, 0, E_FAIL}, {3, 0, 0, E_FAIL}, {kOther, 0, 0, E_FAIL},
                      {3, 1, 1, E_FAIL}, {3, 0, 1, S_OK},   {kOther, 0, 1, S_OK}};
  for (const Row& row : rows) {
    write("BootstrapEndpoint3=lost\nNumCheckpoints=5\n");
    WriteBytes(data() + "/kor.vl5", std::string(15, 'x'));
    ExpectInChild([&] {
      Texts<kClientTexts> t;
      EXPECT_EQ(
          vltGetClientSettings(row.index, row.remote, row.offline, nullptr, t.at(kBootstrap),
                               t.at(kProtocol), t.at(kEndpoint), t.at(kEventPort), t.at(kAppend)),
          row.result);
      EXPECT_EQ(t.found(kBootstrap), row.index == 3 ? Text("62602") : std::nullopt);
      // Only the first opening reports it.
      Texts<kClientTexts> again;
      EXPECT_EQ(AskClient(3, 1, again), S_OK);
    });
  }
  for (bool server : {true, false}) {
    write("NumCheckpoints=5\n");
    WriteBytes(data() + "/kor.vl5", std::string(15, 'x'));
    ExpectInChild([&] {
      if (server) {
        EXPECT_EQ(AskNumbers(3, 63, E_FAIL), Expected(63, 0, nullptr));
      } else {
        EXPECT_EQ(AskCache(63, E_FAIL), ExpectedCache(63, 0, nullptr));
      }
    });
  }
}

// Without an output for it the jar is not asked, and what was missing before stays the result.
TEST_F(vltSettingsOrder, TheJarsAnswerCountsOnlyIfAnEndpointIsWanted) {
  write("");
  ExpectInChild([&] {
    Texts<kClientTexts> t;
    EXPECT_EQ(vltGetClientSettings(kOther, 0, 1, nullptr, t.at(kBootstrap), nullptr, nullptr,
                                   nullptr, nullptr),
              E_FAIL);
  });
  EXPECT_FALSE(Exists(data() + "/vltjar.ini"));
}

TEST_F(vltSettingsOrder, AFileThatCannotBeOpenedTouchesNoOutput) {
  std::filesystem::create_directory(data() + "/kor.ini");
  ExpectInChild([&] {
    Texts<kClientTexts> client;
    EXPECT_THROW(AskClient(3, 1, client), int);
    Texts<kServerTexts> server;
    EXPECT_THROW(AskServer(3, server), int);
    unsigned limit = 77;
    EXPECT_THROW(
        vltGetClientCacheSettings(&limit, nullptr, nullptr, nullptr, nullptr, nullptr, 0, nullptr),
        int);
    EXPECT_EQ(limit, 77u);
    EXPECT_EQ(client.found(kAppend), std::nullopt);
    EXPECT_EQ(server.found(kServerAppend), std::nullopt);
  });
}

TEST_F(vltSettingsOrder, WithoutADataDirectoryOnlyTheDefaultsAreThere) {
  std::filesystem::remove_all(data());
  ExpectInChild([&] {
    for (unsigned index : {3u, kOther}) {
      Texts<kServerTexts> server;
      EXPECT_EQ(AskServer(index, server), index == 3 ? S_OK : E_FAIL);
      Texts<kClientTexts> client;
      EXPECT_EQ(AskClient(index, 1, client), index == 3 ? S_OK : E_FAIL);
      for (size_t n = 0; n < kServerTexts; ++n) {
        EXPECT_EQ(server.found(n), ExpectedText(kServerRows[n], index, false));
        if (n >= kClientTexts) continue;
        EXPECT_EQ(client.found(n), ExpectedText(kRemoteRows[n], index, false));
      }
    }
  });
  EXPECT_FALSE(Exists(data()));
}

}  // namespace
