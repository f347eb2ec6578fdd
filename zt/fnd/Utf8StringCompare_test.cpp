#include "zt/fnd/Utf8StringCompare.h"

#include <gtest/gtest.h>

#include <clocale>
#include <cstring>

#include "tests/support/ScopedLocale.h"
#include "zt/fnd/Exception.h"

using namespace zt::fnd;

namespace {

const unsigned char* U(const char* s) { return reinterpret_cast<const unsigned char*>(s); }
int Case(const char* a, const char* b) { return Utf8StringCaseInsensitiveCompare(U(a), U(b)); }
int Exact(const char* a, const char* b) { return Utf8StringExactCompare(U(a), U(b)); }

}  // namespace

TEST(Utf8StringCompare, FoldsAsciiOnly) {
  EXPECT_EQ(0, Case("abC", "ABc"));
  EXPECT_NE(0, Case("\xC3\xA9", "\xC3\x89"));
  const vlt::test::ScopedLocale locale(LC_ALL, "C.UTF-8");
  EXPECT_NE(Case("\xC3\xA9", "\xC3\x89"), 0) << "whatever the host's locale";
  EXPECT_LT(Case("abc", "ABD"), 0);
  EXPECT_GT(Case("\xE2\x82\xAC", "z"), 0);
}

TEST(Utf8StringCompare, ExactSeesCase) {
  EXPECT_EQ(0, Exact("abc\xC3\xA9", "abc\xC3\xA9"));
  EXPECT_GT(Exact("a", "A"), 0);
  EXPECT_LT(Exact("A", "a"), 0);
}

TEST(Utf8StringCompare, RemainingBytesDecide) {
  EXPECT_EQ(-1, Case("ab", "abc"));
  EXPECT_EQ(3, Case("ab\xE2\x82\xAC", "AB")) << "bytes, not characters";
  EXPECT_EQ(-2, Exact("", "ab"));
  EXPECT_EQ(2, Exact("ab", ""));
}

TEST(Utf8StringCompare, NullIsEmpty) {
  EXPECT_EQ(0, Utf8StringCaseInsensitiveCompare(nullptr, U("")));
  EXPECT_EQ(-1, Utf8StringExactCompare(nullptr, U("a")));
  EXPECT_EQ(1, Utf8StringExactCompare(U("a"), nullptr));
  EXPECT_EQ(0, Utf8StringCaseInsensitiveCompare(nullptr, nullptr, nullptr, nullptr));
}

TEST(Utf8StringCompare, RangesSeeThroughZeros) {
  EXPECT_EQ(0, Case("a", "a"));
  const unsigned char a[] = {'a', 0, 'b'}, b[] = {'A', 0, 'C'};
  EXPECT_LT(Utf8StringCaseInsensitiveCompare(a, a + 3, b, b + 3), 0);
  EXPECT_EQ(Utf8StringCaseInsensitiveCompare(a, a + 2, b, b + 2), 0);
}

TEST(Utf8StringCompare, MalformedTextRaisesWhenItIsReached) {
  EXPECT_THROW(Case("a\xFF", "ab"), exception::InvalidSequence);
  EXPECT_THROW(Exact("a\xC3", "ab"), exception::InvalidSequence);
  EXPECT_LT(Case("a\xFF", "b"), 0) << "not behind the first difference";
}
