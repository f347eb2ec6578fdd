#include "zt/fnd/osdep/SharedObjectName.h"

#include <gtest/gtest.h>

#include <map>
#include <string>

#include "tests/support/InChild.h"
#include "tests/support/MutexPlace.h"
#include "tests/support/ScopedLocale.h"
#include "zt/fnd/String.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::MutexPlace;
using vlt::test::ScopedLocale;

TEST(SharedObjectName, FileNameIsUtf8InEveryLocale) {
  const struct {
    const wchar_t* name;
    const char* bytes;
  } rows[] = {{L"", ""},
              {L"Plain.name 1", "Plain.name 1"},
              {L"m\xE9", "m\xC3\xA9"},
              {L"\x20AC\x10348", "\xE2\x82\xAC\xF0\x90\x8D\x88"},
              {L"a\xD800z", "a?z"}};
  for (const char* locale : {"C", "C.UTF-8"}) {
    const ScopedLocale scoped(LC_CTYPE, locale);
    for (const auto& row : rows) {
      EXPECT_STREQ(row.bytes, SharedObjectFileName(row.name).c_str()) << locale;
    }
  }
}

TEST(SharedObjectName, PathIsThatOfTheFileInItsDirectory) {
  const MutexPlace place;
  EXPECT_EQ(place.dir / "mutex/name", SharedObjectPath(L"mutex", L"name").c_str());
  EXPECT_EQ(place.dir / "mutex/m\xC3\xA9", SharedObjectPath(L"mutex", L"m\xE9").c_str());
  EXPECT_STREQ(SharedObjectPath(L"mutex", L"/m\xE9").c_str(), "/m\xC3\xA9");
  EXPECT_STREQ(SharedObjectPath(L"mutex", L"/m").c_str(), "/m");
}

TEST(SharedObjectName, OrderFoldsTheLettersOfAsciiAlone) {
  const SharedObjectNameLess less;
  auto same = [&](const wchar_t* a, const wchar_t* b) { return !less(a, b) && !less(b, a); };
  EXPECT_TRUE(same(L"Title", L"tITLE"));
  EXPECT_TRUE(same(L"", L""));
  EXPECT_FALSE(same(L"m\xE9", L"m\xC9"));
  EXPECT_FALSE(same(L"[", L"{")) << "a letter's distance apart, and no letters";
  EXPECT_TRUE(less(L"a", L"B"));
  EXPECT_FALSE(less(L"B", L"a"));
  EXPECT_TRUE(less(L"", L"a"));
  EXPECT_FALSE(less(L"a", L""));
  EXPECT_TRUE(less(L"ab", L"abc"));
}

}  // namespace
}  // namespace zt::fnd::osdep
