#include "ztini/NameFold.h"

#include <gtest/gtest.h>

#include <clocale>
#include <string>

#include "ztini/NameCompare.h"

namespace {

using ztini::NameFold;

TEST(NameFold, TablesAreThoseOfTheCLibrary) {
  NameFold fold;
  for (int c = 0; c < 256; ++c) {
    const char byte = static_cast<char>(c);
    EXPECT_EQ(fold.upper(byte), ztini::LocaleFold::upper(byte)) << c;
    EXPECT_EQ(fold.isSpace(byte), ztini::LocaleFold::isSpace(byte)) << c;
  }
  EXPECT_EQ(fold.upper('a'), 'A');
  EXPECT_TRUE(fold.isSpace('\v'));
  EXPECT_FALSE(fold.isSpace('\0'));
}

TEST(NameFold, RefreshInAnUnchangedLocaleKeepsTheGeneration) {
  NameFold fold;
  const uint32_t before = fold.generation();
  fold.refresh();
  fold.refresh();
  EXPECT_EQ(fold.generation(), before);
}

TEST(NameFold, AnEqualLocaleUnderAnotherNameKeepsTheGeneration) {
  NameFold fold;
  const uint32_t before = fold.generation();
  const char* other = setlocale(LC_CTYPE, "C.UTF-8");
  if (!other) GTEST_SKIP() << "no C.UTF-8 locale here";
  fold.refresh();
  EXPECT_EQ(fold.generation(), before);  // both fold ASCII only, byte by byte
  setlocale(LC_CTYPE, "C");
  fold.refresh();
  EXPECT_EQ(fold.generation(), before);
}

TEST(NameFold, AThreadLocaleIsNoticed) {
  NameFold fold;
  locale_t own = newlocale(LC_CTYPE_MASK, "C", nullptr);
  ASSERT_NE(own, locale_t(0));
  const locale_t before = uselocale(own);
  fold.refresh();
  EXPECT_EQ(fold.upper('z'), 'Z');
  uselocale(before);
  freelocale(own);
  fold.refresh();
  EXPECT_EQ(fold.generation(), 0u);
}

}  // namespace
