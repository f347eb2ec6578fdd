// One path has one lock, whatever the locales of the processes.
#include <gtest/gtest.h>
#include <sys/syscall.h>

#include <clocale>
#include <string>

#include "tests/support/Child.h"
#include "tests/support/CompiledLocales.h"
#include "tests/support/InChild.h"
#include "tests/support/TempDir.h"
#include "tests/support/TestIni.h"
#include "zt/fnd/String.h"

namespace {

using namespace vlt::test;

struct Pair {
  const char *first, *second, *file;
};

constexpr Pair kPairs[] = {
    {"tr_TR.UTF-8", "C", "title.ini"},
    {"az_AZ.UTF-8", "C", "title.ini"},
    {"C", "C.UTF-8", "m\xC3\xA9.ini"},
    {"de_DE.ISO-8859-1", "C.UTF-8", "m\xC3\xA9.ini"},
    {"de_DE.ISO-8859-1", "C.UTF-8", "m\xE9.ini"},
    {"tr_TR.UTF-8", "de_DE.ISO-8859-1", "i\xC4\xB1\xC4\xB0.ini"},
};

class IniFileLockLocale : public testing::Test {
 protected:
  IniFileLockLocale() {
    m_locales.make("tr_TR", "UTF-8");
    m_locales.make("az_AZ", "UTF-8");
    m_locales.make("de_DE", "ISO-8859-1");
  }

  CompiledLocales m_locales;
};

TEST_F(IniFileLockLocale, NameOfAFileIsTheSameInEveryLocale) {
  const std::pair<const char*, const char*> names[] = {
      {"/d/vltjar.ini", "DVLTJARINI"},
      {"/d/iI", "DII"},
      {"/d/m\xC3\xA9", "DM%C3%A9"},
      {"/d/\xFF\x80z", "D%FF%80Z"},
  };
  for (const char* locale : {"C", "C.UTF-8", "tr_TR.UTF-8", "az_AZ.UTF-8", "de_DE.ISO-8859-1"}) {
    SCOPED_TRACE(locale);
    ExpectInChild([&] {
      ASSERT_TRUE(m_locales.use(locale));
      for (const auto& [file, name] : names) {
        EXPECT_STREQ(name, zt::fnd::AnsiString(IniFileLock::NameForFile(file)).c_str());
      }
    });
  }
}

TEST_F(IniFileLockLocale, ProcessesOfTwoLocalesExcludeEachOther) {
  for (const Pair& pair : kPairs) {
    TempDir dir;
    std::string file = dir / pair.file;
    Signal held, free, entered;
    Child holder([&] {
      if (!m_locales.use(pair.first)) return 1;
      CvlIniMgr mine = CvlIniMgr::LockOnly(file);
      held.notify();
      return free.await() ? 0 : 2;
    });
    ASSERT_TRUE(held.await());
    Child waiter([&] {
      if (!m_locales.use(pair.second)) return 1;
      CvlIniMgr mine = CvlIniMgr::LockOnly(file);
      entered.notify();
      return 0;
    });
    EXPECT_TRUE(
        Eventually([&] { return BlockedIn(waiter.pid(), SYS_flock) || !waiter.running(); }));
    EXPECT_FALSE(entered.await(0)) << pair.first << " beside " << pair.second << ": " << pair.file;
    free.notify();
    EXPECT_EQ(0, holder.wait());
    EXPECT_EQ(0, waiter.wait());
  }
}

TEST_F(IniFileLockLocale, WritersOfTwoLocalesLoseNothing) {
  constexpr int kEach = 300;
  for (const Pair& pair : {kPairs[0], kPairs[2]}) {
    TempDir dir;
    std::string file = dir / pair.file;
    auto writes = [&](const char* locale, const std::string& prefix) {
      return [this, &file, locale, prefix] {
        if (!m_locales.use(locale)) return 1;
        for (int i = 0; i < kEach; ++i) {
          CvlIniMgr ini = CvlIniMgr::OpenForUpdate(file);
          if (ini.SetItem((prefix + std::to_string(i)).c_str(), "a", "1", true) != S_OK) return 2;
          if (ini.Write() != S_OK) return 3;
        }
        return 0;
      };
    };
    Child first(writes(pair.first, "first")), second(writes(pair.second, "second"));
    EXPECT_EQ(0, first.wait());
    EXPECT_EQ(0, second.wait());
    CvlIniMgr ini = CvlIniMgr::OpenForUpdate(file);
    EXPECT_EQ(2 * kEach, ini.GetNumberOfSections()) << pair.first << " beside " << pair.second;
  }
}

}  // namespace
