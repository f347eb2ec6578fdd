// Children of processes with several threads, at what the C library has locks of its own for.
#include <gtest/gtest.h>

#include <functional>
#include <iostream>
#include <string>

#include "tests/support/CompiledLocales.h"
#include "tests/support/ForkStorm.h"
#include "tests/support/InChild.h"
#include "tests/support/Modules.h"
#include "tests/support/MutexPlace.h"
#include "tests/support/Sanitizer.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/DateTime.h"
#include "zt/fnd/osdep/LoadModule.h"
#include "zt/fnd/osdep/Mutex.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::CompiledLocales;
using vlt::test::ExpectInChild;
using vlt::test::ForkStorm;
using vlt::test::MutexPlace;

class ForkThreads : public testing::Test {
 protected:
  void SetUp() override {
    if (!vlt::test::kCanForkWhileThreadsAllocate) {
      GTEST_SKIP() << "the sanitizer's allocator is not fork-safe";
    }
  }

  void storm(
      const std::function<bool()>& call, const std::function<void()>& prepare = [] {}) {
    ExpectInChild(
        [&] {
          prepare();
          ForkStorm result = vlt::test::RunForkStorm([&] { call(); }, call);
          std::cout << result << std::endl;
          EXPECT_GT(result.children, 3);
          EXPECT_EQ(0, result.hung);
          EXPECT_EQ(0, result.failed);
        },
        600000);
  }
};

TEST_F(ForkThreads, TextBeyondAsciiConvertsInChildren) {
  const CompiledLocales locales;
  locales.make("de_DE", "ISO-8859-1");
  for (const char* locale : {"C", "C.UTF-8", "de_DE.ISO-8859-1"}) {
    storm([] { return AnsiString(String(L"m\xE9")).length() != 0; },
          [&] { ASSERT_TRUE(locales.use(locale)); });
  }
}

TEST_F(ForkThreads, MutexWithANameBeyondAsciiIsMadeInChildren) {
  const CompiledLocales locales;
  locales.make("de_DE", "ISO-8859-1");
  const MutexPlace place;
  for (const char* locale : {"C.UTF-8", "de_DE.ISO-8859-1"}) {
    storm(
        [] {
          Mutex mutex(L"m\xE9");
          mutex.lock();
          mutex.unlock();
          return true;
        },
        [&] { ASSERT_TRUE(locales.use(locale)); });
  }
}

TEST_F(ForkThreads, TimesAreToldInChildren) {
  storm([] {
    return !AbsTimeToString(CurrentSystemTime(), L"%Y", L"%H", 3, kTimeLocal).empty() &&
           !AbsTimeToString(CurrentSystemTime(), L"%Y", L"%H", 3, kTimeUTC).empty();
  });
}

TEST_F(ForkThreads, ModulesAreLoadedInChildren) {
  const vlt::test::TempDir dir;
  const std::string file = dir / "module.so";
  vlt::test::MakeModule(file);
  storm([&] {
    void* module = LoadModule(String(file.c_str()));
    bool found = module && FindFunction(module, AnsiString("cos")) != nullptr;
    UnloadModule(module);
    return found;
  });
}

}  // namespace
}  // namespace zt::fnd::osdep
