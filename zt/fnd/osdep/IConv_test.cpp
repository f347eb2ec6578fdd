#include "zt/fnd/osdep/IConv.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "tests/support/TempDir.h"
#include "zt/fnd/Exception.h"

using namespace zt::fnd;
using namespace zt::fnd::osdep;

namespace {

std::wstring ToWide(const std::string& text, const char* from, size_t room = 64) {
  std::vector<wchar_t> out(room + 1, L'#');
  wchar_t* end = out.data() + room;
  IConv(text.data(), text.data() + text.size(), from, out.data(), end, kWideEncoding);
  EXPECT_EQ(out[room], L'#') << "written beyond the room";
  return std::wstring(out.data(), end);
}

std::string ToNarrow(const std::wstring& text, const char* to, size_t room = 64) {
  std::vector<char> out(room + 1, '#');
  char* end = out.data() + room;
  IConv(text.data(), text.data() + text.size(), kWideEncoding, out.data(), end, to);
  EXPECT_EQ(out[room], '#') << "written beyond the room";
  return std::string(out.data(), end);
}

}  // namespace

TEST(IConv, ConvertsBothWays) {
  EXPECT_EQ(L"a\xE9\x20AC", ToWide("a\xC3\xA9\xE2\x82\xAC", "UTF-8"));
  EXPECT_EQ("a\xC3\xA9\xE2\x82\xAC", ToNarrow(L"a\xE9\x20AC", "UTF-8"));
  EXPECT_EQ(L"a\xE9", ToWide("a\xE9", "ISO-8859-1"));
  EXPECT_EQ("a\xE9", ToNarrow(L"a\xE9", "ISO-8859-1"));
  EXPECT_EQ(std::wstring(L"a\0b", 3), ToWide(std::string("a\0b", 3), "UTF-8"));
}

TEST(IConv, EachBadUnitBecomesOneQuestionMark) {
  EXPECT_EQ(L"a??b", ToWide("a\xFF\xFE"
                            "b",
                            "UTF-8"));
  EXPECT_EQ(L"??", ToWide("\xE2\x82", "UTF-8")) << "cut at the end: one for each byte";
  EXPECT_EQ(L"?(", ToWide("\xC3(", "UTF-8"));
  EXPECT_EQ("a?b", ToNarrow(L"a\x20AC"
                            L"b",
                            "ISO-8859-1"));
  EXPECT_EQ("??", ToNarrow(L"\xD800\x110000", "UTF-8"));
}

TEST(IConv, ShortageOfRoomTruncates) {
  EXPECT_EQ(L"ab", ToWide("abcd", "UTF-8", 2));
  EXPECT_EQ(L"", ToWide("abcd", "UTF-8", 0));
  EXPECT_EQ("ab", ToNarrow(L"abcd", "UTF-8", 2));
  EXPECT_EQ("a?", ToNarrow(L"a\x20AC", "UTF-8", 2)) << "some room, but not enough, is bad text";
}

TEST(IConv, UnknownEncodingRaisesAlsoForNothing) {
  EXPECT_THROW(ToWide("a", "no-such-code"), exception::InvalidLocale);
  EXPECT_THROW(ToWide("", "no-such-code"), exception::InvalidLocale);
  EXPECT_THROW(ToNarrow(L"a", "en_US.UTF-8"), exception::InvalidLocale) << "a locale, no encoding";
}

TEST(IConv, LeavesNoDescriptorOpen) {
  const int before = vlt::test::OpenDescriptors();
  for (int i = 0; i < 50; ++i) ToWide("a\xFF", "UTF-8");
  EXPECT_EQ(before, vlt::test::OpenDescriptors());
}
