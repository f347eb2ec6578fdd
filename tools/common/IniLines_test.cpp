#include "tools/common/IniLines.h"

#include <gtest/gtest.h>

namespace vltctl {
namespace {

using Kind = IniLine::Kind;

TEST(IniLines, HaveTheirNumbersAndSections) {
  auto lines =
      LinesOf("\xEF\xBB\xBF; note\r\n\r\na = 1\n[ S ] rest\n A =\t\" x \" \nb\nc=\n[]\nd='q'");
  const Kind kinds[] = {Kind::Comment, Kind::Blank, Kind::Item, Kind::Header, Kind::Item,
                        Kind::Bad,     Kind::Bad,   Kind::Bad,  Kind::Item};
  ASSERT_EQ(lines.size(), std::size(kinds));
  for (size_t i = 0; i < lines.size(); ++i) {
    EXPECT_EQ(lines[i].number, i + 1);
    EXPECT_EQ(lines[i].kind, kinds[i]) << i + 1;
  }
  EXPECT_EQ(lines[2].section, "");
  EXPECT_EQ(lines[4].section, "S");
  EXPECT_EQ(lines[4].name, "A");
  EXPECT_EQ(lines[4].value, " x ");
  EXPECT_EQ(lines[8].value, "q");
  EXPECT_EQ(lines[5].text, "b");
}

TEST(IniLines, TheLastItemOfANameCounts) {
  auto lines = LinesOf("[s]\nk=1\n[t]\nk=2\n[S]\nK=3\n");
  ASSERT_NE(FindItem(lines, "s", "k"), nullptr);
  EXPECT_EQ(FindItem(lines, "s", "k")->number, 6u);
  EXPECT_EQ(FindItem(lines, "s", "x"), nullptr);
}

TEST(IniLines, OfNothingThereAreNone) {
  EXPECT_TRUE(LinesOf("").empty());
  EXPECT_EQ(LinesOf("\n").size(), 1u);
  EXPECT_EQ(LinesOf("\n\r\n").size(), 2u);
}

}  // namespace
}  // namespace vltctl
