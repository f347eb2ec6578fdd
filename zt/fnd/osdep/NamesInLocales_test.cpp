// Mutexes and events of one name in processes of several locales.
#include <gtest/gtest.h>

#include <future>
#include <string>

#include "tests/support/Child.h"
#include "tests/support/CompiledLocales.h"
#include "tests/support/EventPlace.h"
#include "tests/support/InChild.h"
#include "tests/support/MutexPlace.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/Mutex.h"
#include "zt/fnd/osdep/NamedEvent.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::Child;
using vlt::test::CompiledLocales;
using vlt::test::EventPlace;
using vlt::test::ExpectInChild;
using vlt::test::MutexPlace;
using vlt::test::Signal;

class NamesInLocales : public testing::Test {
 protected:
  NamesInLocales() {
    m_locales.make("tr_TR", "UTF-8");
    m_locales.make("de_DE", "ISO-8859-1");
  }

  CompiledLocales m_locales;
};

TEST_F(NamesInLocales, MutexBeyondAsciiExcludesProcessesOfOtherLocales) {
  MutexPlace place;
  for (const char* first : {"C", "C.UTF-8", "de_DE.ISO-8859-1"}) {
    Signal held, end;
    Child holder([&] {
      if (!m_locales.use(first)) return 1;
      Mutex mutex(L"m\xE9");
      mutex.lock();
      held.notify();
      return end.await() ? 0 : 2;
    });
    ASSERT_TRUE(held.await());
    for (const char* second : {"C", "C.UTF-8", "de_DE.ISO-8859-1"}) {
      Child other([&] {
        if (!m_locales.use(second)) return 1;
        return Mutex(L"m\xE9").tryLock() ? 2 : 0;
      });
      EXPECT_EQ(other.wait(), 0) << first << " beside " << second;
    }
    end.notify();
    EXPECT_EQ(holder.wait(), 0);
  }
}

TEST_F(NamesInLocales, TwoNamesBeyondAsciiAreTwoMutexesInTheCLocale) {
  MutexPlace place;
  ExpectInChild([&] {
    ASSERT_TRUE(m_locales.use("C"));
    Mutex first(L"m\xE9"), second(L"m\xE8");
    first.lock();
    EXPECT_TRUE(second.tryLock());
  });
}

TEST_F(NamesInLocales, CaseIsFoldedAlikeWhereTheLocaleFoldsIOtherwise) {
  MutexPlace place;
  ExpectInChild([&] {
    ASSERT_TRUE(m_locales.use("tr_TR.UTF-8"));
    Mutex lower(L"title"), upper(L"TITLE");
    lower.lock();
    // One section for both: another thread cannot enter it.
    EXPECT_FALSE(std::async(std::launch::async, [&] { return upper.tryLock(); }).get());
    lower.unlock();
  });
}

TEST_F(NamesInLocales, EventBeyondAsciiIsSeenByProcessesOfOtherLocales) {
  EventPlace place;
  Signal ready, set, end;
  Child other([&] {
    if (!m_locales.use("de_DE.ISO-8859-1")) return 1;
    NamedEvent event(L"m\xE9", true, false);
    ready.notify();
    if (!set.await()) return 2;
    return event.check() ? 0 : 3;
  });
  ASSERT_TRUE(ready.await());
  Child sets([&] {
    if (!m_locales.use("C")) return 1;
    NamedEvent(L"m\xE9", true, false).set();
    return 0;
  });
  EXPECT_EQ(sets.wait(), 0);
  EXPECT_TRUE(vlt::test::Exists(place.file("m\xC3\xA9")));
  set.notify();
  EXPECT_EQ(other.wait(), 0);
}

}  // namespace
}  // namespace zt::fnd::osdep
