// Every item of the settings file, absent, present and malformed, at the index that has defaults
// and at another one, with every choice of outputs.
#include <gtest/gtest.h>

#include "tests/support/SettingsProbe.h"

namespace {

using namespace vlt::test;
using namespace vlt::test::settings;

class vltSettingsTable : public SettingsPlace {
 protected:
  // Every choice of items that are there, and of outputs that are wanted.
  template <size_t N>
  void allChoices(const TextRow (&rows)[N], unsigned index,
                  const std::function<HRESULT(Texts<N>&)>& ask) const {
    for (unsigned present = 0; present < 1u << N; ++present) {
      std::string items;
      for (size_t n = 0; n < N; ++n) {
        if (rows[n].key && present >> n & 1) {
          items += rows[n].key + std::to_string(index) + "=value of " + rows[n].key + "\n";
        }
      }
      write(items);
      for (unsigned wanted = 0; wanted < 1u << N; ++wanted) {
        Texts<N> t(wanted);
        HRESULT result = ask(t);
        HRESULT expected = S_OK;
        for (size_t n = 0; n < N; ++n) {
          Text text = ExpectedText(rows[n], index, present >> n & 1);
          bool asked = rows[n].key && wanted >> n & 1;
          if (asked && !text) expected = E_FAIL;
          ASSERT_EQ(t.found(n), asked ? text : std::nullopt) << items << wanted << " " << n;
        }
        ASSERT_EQ(result, expected) << items << wanted;
      }
    }
  }
};

TEST_F(vltSettingsTable, EveryChoiceOfItemsAndOutputsOfAClient) {
  for (unsigned index : {3u, kOther, 0u, UINT_MAX}) {
    SCOPED_TRACE(index);
    ExpectInChild([&] {
      allChoices<kClientTexts>(kRemoteRows, index,
                               [&](Texts<kClientTexts>& t) { return AskClient(index, 1, t); });
      allChoices<kClientTexts>(kLocalRows, index,
                               [&](Texts<kClientTexts>& t) { return AskClient(index, 0, t); });
    });
  }
}

// Thousands of openings, which a sanitizer makes slow.
constexpr int kManyOpeningsMs = 110000;

TEST_F(vltSettingsTable, EveryChoiceOfItemsAndOutputsOfAServer) {
  for (unsigned index : {3u, kOther}) {
    SCOPED_TRACE(index);
    ExpectInChild(
        [&] {
          allChoices<kServerTexts>(kServerRows, index,
                                   [&](Texts<kServerTexts>& t) { return AskServer(index, t); });
        },
        kManyOpeningsMs);
  }
}

TEST_F(vltSettingsTable, TextsAreWhatTheFileSays) {
  struct Row {
    std::string line;
    Text text;  // none: as if the item were absent
  };
  const std::string most(255, 'x'), more(5000, 'y');
  const Row rows[] = {
      {"BootstrapEndpoint2=plain", "plain"},
      {"BootstrapEndpoint2 = a b", "a b"},
      {"BootstrapEndpoint2=\"quoted \"", "quoted "},
      {"BootstrapEndpoint2='single'", "single"},
      {"BootstrapEndpoint2=\"\"", ""},
      {"BootstrapEndpoint2=", std::nullopt},
      {"BootstrapEndpoint2", std::nullopt},
      {";BootstrapEndpoint2=x", std::nullopt},
      {"BootstrapEndpoint=x", std::nullopt},
      {"BootstrapEndpoint02=x", std::nullopt},
      {"BootstrapEndpoint22=x", std::nullopt},
      {"[OTHER]\nBootstrapEndpoint2=x", std::nullopt},
      {"BootstrapEndpoint2=%d%s%n", "%d%s%n"},
      {"BootstrapEndpoint2=" + most, most},
      {"BootstrapEndpoint2=" + more, more},
  };
  ExpectInChild([&] {
    for (const Row& row : rows) {
      write(row.line + "\n");
      Texts<kServerTexts> server(1u << kServerBootstrap);
      EXPECT_EQ(AskServer(kOther, server), row.text ? S_OK : E_FAIL) << row.line;
      EXPECT_EQ(server.found(kServerBootstrap), row.text) << row.line;
      Texts<kClientTexts> client(1u << kBootstrap);
      EXPECT_EQ(AskClient(kOther, 1, client), row.text ? S_OK : E_FAIL) << row.line;
      EXPECT_EQ(client.found(kBootstrap), row.text) << row.line;
    }
  });
}

// ---- Numbers

TEST_F(vltSettingsTable, EveryNumberOfAServerInEveryForm) {
  for (unsigned index : {3u, kOther}) {
    ExpectInChild([&] {
      for (size_t n = 0; n < kNumbers; ++n) {
        for (const NumberText& row : kNumberTexts) {
          write(ServerKey(n, index) + "=" + row.text + "\n");
          for (unsigned wanted : {63u, 1u << n, 63u & ~(1u << n)}) {
            EXPECT_EQ(AskNumbers(index, wanted, S_OK), Expected(wanted, n, &row))
                << ServerKey(n, index) << " " << row.text << " " << wanted;
          }
        }
      }
    });
  }
}

TEST_F(vltSettingsTable, EveryChoiceOfAServersNumbersHasItsDefaults) {
  for (bool withDirectory : {true, false}) {
    if (!withDirectory) std::filesystem::remove_all(data());
    ExpectInChild([&] {
      for (unsigned index : {3u, kOther}) {
        for (unsigned wanted = 0; wanted < 64; ++wanted) {
          EXPECT_EQ(AskNumbers(index, wanted, S_OK), Expected(wanted, 0, nullptr)) << wanted;
        }
      }
    });
  }
  EXPECT_FALSE(Exists(data()));  // Nobody wanted the cookie.
}

TEST_F(vltSettingsTable, EveryCacheNumberInEveryForm) {
  ExpectInChild([&] {
    for (size_t n = 0; n < kNumbers; ++n) {
      for (const NumberText& row : kNumberTexts) {
        write(std::string(kCacheRows[n].key) + "=" + row.text + "\n");
        for (unsigned wanted : {63u, 1u << n, 63u & ~(1u << n)}) {
          EXPECT_EQ(AskCache(wanted, S_OK), ExpectedCache(wanted, n, &row))
              << kCacheRows[n].key << " " << row.text << " " << wanted;
        }
      }
    }
  });
}

TEST_F(vltSettingsTable, EveryChoiceOfCacheNumbersHasItsDefaults) {
  for (bool withDirectory : {true, false}) {
    if (!withDirectory) std::filesystem::remove_all(data());
    ExpectInChild([&] {
      for (unsigned wanted = 0; wanted < 64; ++wanted) {
        EXPECT_EQ(AskCache(wanted, S_OK), ExpectedCache(wanted, 0, nullptr)) << wanted;
      }
    });
  }
}

}  // namespace
