#include "zt/fnd/CharacterAttributes.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>

#include "tests/support/Child.h"
#include "tests/support/ScopedLocale.h"
#include "zt/fnd/Exception.h"

using namespace zt::fnd;

TEST(CharacterAttributes, DefaultFoldsAsciiOnly) {
  const vlt::test::ScopedLocale locale(LC_ALL, "C.UTF-8");
  const CharacterAttributes<wchar_t> wide;
  EXPECT_EQ(wide.toUpper(L'a'), L'A');
  EXPECT_EQ(wide.toUpper(L'A'), L'A');
  EXPECT_EQ(wide.toUpper(L'\xE9'), L'\xE9');
  EXPECT_EQ(static_cast<wchar_t>(0x7FFFFFFF), wide.toUpper(static_cast<wchar_t>(0x7FFFFFFF)));
  const CharacterAttributes<char> narrow;
  EXPECT_EQ(narrow.toUpper('z'), 'Z');
  EXPECT_EQ(narrow.toUpper('\xE9'), '\xE9');
}

TEST(CharacterAttributes, NamedLocale) {
  const CharacterAttributes<wchar_t> wide("C.UTF-8");
  EXPECT_EQ(wide.toUpper(L'\xE9'), L'\xC9');
  const CharacterAttributes<wchar_t> copy(wide);
  EXPECT_EQ(copy.toUpper(L'\xE9'), L'\xC9');
}

TEST(CharacterAttributes, UnknownNameRaisesWithTheReason) {
  constexpr const char* kNone = "no_SUCH.locale";
  if (locale_t taken = newlocale(LC_ALL_MASK, kNone, nullptr)) {
    freelocale(taken);
    GTEST_SKIP() << "NOT TESTED: this C library takes any name for a locale's";
  }
  try {
    const CharacterAttributes<char> none(kNone);
    FAIL();
  } catch (const exception::InvalidArgument2& e) {
    EXPECT_EQ(strncmp(e.what(), "Invalid argument(s): ", 21), 0);
    EXPECT_GT(strlen(e.what()), 21u);
  }
}

TEST(CharacterAttributes, NullIsNoNameAndEmptyIsTheEnvironments) {
  EXPECT_THROW(CharacterAttributes<char>(static_cast<const char*>(nullptr)),
               exception::InvalidArgument2);
  EXPECT_THROW(CharacterAttributes<wchar_t>(static_cast<const char*>(nullptr)),
               exception::InvalidArgument2);
  vlt::test::Child child([] {
    setenv("LC_ALL", "C.UTF-8", 1);
    return CharacterAttributes<wchar_t>("").toUpper(L'\xE9') == L'\xC9' ? 0 : 1;
  });
  EXPECT_EQ(child.wait(), 0);
}
