#include "zt/fnd/osdep/FindFiles.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>
#include <wchar.h>

#include <algorithm>
#include <cerrno>
#include <random>
#include <string>
#include <vector>

#include "tests/support/InChild.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/StringCompare.h"
#include "zt/fnd/osdep/path.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::TempDir;
using vlt::test::Wide;
using vlt::test::WriteBytes;
using Flags = FindFiles::FindFlags;
using Names = std::vector<std::string>;

Names Sorted(const Vector<String>& found) {
  Names names;
  for (const String& name : found) names.push_back(AnsiString(name).c_str());
  std::sort(names.begin(), names.end());
  return names;
}

Names Find(const std::string& mask) { return Sorted(FindFiles().getFilenames(Wide(mask))); }
Names Find(const std::string& mask, Flags flags) {
  return Sorted(FindFiles().getFilenames(Wide(mask), flags));
}

// a.txt, B.TXT, .hidden, sub/, .dot/ and three links.
struct Tree {
  TempDir dir;
  Tree() {
    WriteBytes(dir / "a.txt", "");
    WriteBytes(dir / "B.TXT", "");
    WriteBytes(dir / ".hidden", "");
    dir.makeDir("sub");
    dir.makeDir(".dot");
    symlink("a.txt", (dir / "lfile").c_str());
    symlink((dir / "sub").c_str(), (dir / "ldir").c_str());
    symlink("nowhere", (dir / "ldangling").c_str());
  }
  std::string operator/(const char* name) const { return dir / name; }
  Names full(const Names& names) const {
    Names result;
    for (const std::string& name : names) result.push_back(dir / name);
    std::sort(result.begin(), result.end());
    return result;
  }
};

TEST(FindFiles, StarLeavesHiddenNamesOutUnlessAsked) {
  Tree t;
  const Names plain = {"B.TXT", "a.txt", "ldangling", "ldir", "lfile", "sub"};
  EXPECT_EQ(t.full(plain), Find(t / "*"));
  EXPECT_EQ(t.full(plain), Find(t / "*", Flags::None));
  Names all = plain;
  all.insert(all.end(), {".hidden", ".dot"});
  EXPECT_EQ(t.full(all), Find(t / "*", Flags::Hidden));
}

TEST(FindFiles, MasksIgnoreCase) {
  Tree t;
  EXPECT_EQ(t.full({"B.TXT", "a.txt"}), Find(t / "*.TXT"));
  EXPECT_EQ(t.full({"B.TXT"}), Find(t / "b.*"));
  EXPECT_EQ(t.full({"B.TXT", "a.txt"}), Find(t / "?.Tx?"));
  EXPECT_EQ(Names(), Find(t / "*.hid*"));
}

TEST(FindFiles, MaskThatEndsInASeparatorListsNothing) {
  Tree t;
  EXPECT_EQ(Names(), Find(t / "sub/"));
  EXPECT_EQ(Names(), Find(t / ""));
  EXPECT_EQ(Names(), Find(t / "sub\\"));
  EXPECT_EQ(Names(), Find(t / "missing/", Flags::Hidden));
}

TEST(FindFiles, MissingDirectoryIsQuietWithoutFlagsOnly) {
  Tree t;
  EXPECT_EQ(Names(), Find(t / "missing/*"));
  try {
    Find(t / "missing/*", Flags::None);
    ADD_FAILURE();
  } catch (const PosixError& e) {
    EXPECT_EQ(static_cast<unsigned>(ENOENT), e.whatcode());
  }
  EXPECT_THROW(Find(t / "a.txt/*", Flags::Hidden), PosixError);
  EXPECT_EQ(Names(), Find(t / "a.txt/*"));
  // The directory of a mask in the root is the empty one.
  EXPECT_EQ(Names(), Find("/*"));
  EXPECT_THROW(Find("/*", Flags::None), PosixError);
}

TEST(FindFiles, DirectoriesOnlyEndInASlash) {
  Tree t;
  EXPECT_EQ(t.full({"ldir/", "sub/"}), Find(t / "*", Flags::Directories));
  EXPECT_EQ(t.full({".dot/", "ldir/", "sub/"}), Find(t / "*", Flags::Directories | Flags::Hidden));
}

TEST(FindFiles, LinksAreReplacedByTheirText) {
  Tree t;
  Names expected = t.full({"B.TXT", "a.txt", "sub", "sub"});
  expected.insert(expected.end(), {"a.txt", "nowhere"});
  std::sort(expected.begin(), expected.end());
  EXPECT_EQ(expected, Find(t / "*", Flags::FollowLinks));
  // With the slash a link to a directory is one no more.
  EXPECT_EQ(t.full({"ldir/", "sub/"}), Find(t / "*", Flags::Directories | Flags::FollowLinks));
}

TEST(FindFiles, DotEntriesStandAtTheEndWhateverThePattern) {
  Tree t;
  Vector<String> found = FindFiles().getFilenames(Wide(t / "a*"), Flags::DotEntries);
  ASSERT_EQ(found.size(), 3u);
  EXPECT_EQ(t / "a.txt", AnsiString(found[0]).c_str());
  EXPECT_EQ(t / ".", AnsiString(found[1]).c_str());
  EXPECT_EQ(t / "..", AnsiString(found[2]).c_str());
  EXPECT_EQ(FindFiles().getFilenames(Wide(t / "nothing"), Flags::DotEntries).size(), 2u);
}

TEST(FindFiles, RelativeMasks) {
  Tree t;
  String before = path::SetCWD(Wide(t.dir.path()));
  EXPECT_EQ((Names{"./B.TXT", "./a.txt"}), Find("*.txt"));
  EXPECT_EQ((Names{"./sub"}), Find("sub"));
  EXPECT_EQ(Names(), Find("*", Flags::Directories));
  WriteBytes(t / "sub/x", "");
  EXPECT_EQ((Names{"sub/x"}), Find("sub/*"));
  EXPECT_EQ((Names{"sub/x"}), Find("sub\\x"));
  EXPECT_EQ(Names(), Find(""));
  path::SetCWD(before);
}

TEST(FindFiles, LaterSeparatorSplitsTheMask) {
  TempDir dir;
  dir.makeDir("d\\e");
  WriteBytes(dir / "d\\e/f", "");
  EXPECT_EQ((Names{dir / "d\\e/f"}), Find(dir / "d\\e/*"));
  // The last one is "\" here: the directory is "d", which is not there.
  EXPECT_EQ(Names(), Find(dir / "d\\*"));
}

TEST(FindFiles, ManyEntriesAreAllListed) {
  TempDir dir;
  for (int i = 0; i < 3000; ++i) WriteBytes(dir / ("n" + std::to_string(i)), "");
  EXPECT_EQ(Find(dir / "n*").size(), 3000u);
}

TEST(FindFilesWildcard, Table) {
  const struct {
    const wchar_t* pattern;
    const wchar_t* name;
    bool fits;
  } rows[] = {
      {L"*", L"", true},
      {L"*", L"abc", true},
      {L"", L"", true},
      {L"", L"a", false},
      {L"?", L"", false},
      {L"?", L"a", true},
      {L"??", L"a", false},
      {L"a*c", L"abc", true},
      {L"a*c", L"ac", true},
      {L"a*c", L"acx", false},
      {L"***a", L"bca", true},
      {L"*.vle", L"X.VLE", true},
      {L"a*b*c", L"aXbYbZc", true},
      {L"a*b*c", L"aXcYb", false},
      {L"*ab", L"aab", true},
      {L"[a]", L"a", false},
      {L"[a]", L"[A]", true},
      {L"a?c*", L"abc", true},
      {L"*?", L"", false},
      {L"*?", L"x", true},
      {L"\\*", L"*", false},
      {L"abc", L"abcd", false},
      {L"abcd", L"abc", false},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(row.fits, WildcardFit(row.pattern, row.name)) << String(row.pattern).length();
  }
}

// The rule as it is worded: a "*" takes any run of characters, none first.
bool PlainFit(const wchar_t* pattern, const wchar_t* name) {
  if (*pattern == L'*') {
    return PlainFit(pattern + 1, name) || (*name != L'\0' && PlainFit(pattern, name + 1));
  }
  if (*name == L'\0') return *pattern == L'\0';
  bool fits = *pattern == L'?' || StringCaseCompare(pattern, pattern + 1, name, name + 1) == 0;
  return fits && PlainFit(pattern + 1, name + 1);
}

TEST(FindFilesWildcard, RandomPatternsFitAsByThePlainRule) {
  std::minstd_rand random(1);
  auto text = [&](const wchar_t* alphabet, unsigned longest) {
    std::wstring made(random() % (longest + 1), L'a');
    for (wchar_t& c : made) c = alphabet[random() % wcslen(alphabet)];
    return made;
  };
  int fitting = 0;
  for (int i = 0; i < 100000; ++i) {
    std::wstring pattern = text(L"aAb.*?*", 6), name = text(L"aBb.", 7);
    bool fits = PlainFit(pattern.c_str(), name.c_str());
    ASSERT_EQ(fits, WildcardFit(pattern.c_str(), name.c_str()))
        << AnsiString(pattern.c_str()).c_str() << ' ' << AnsiString(name.c_str()).c_str();
    fitting += fits;
  }
  EXPECT_GT(fitting, 10000);
}

// One that tried every split of the name would meet the child's deadline.
TEST_IN_CHILD(FindFilesWildcard, HostilePatternEndsSoon) {
  String pattern, name(5000, L'a');
  for (int i = 0; i < 500; ++i) pattern += L"*a";
  pattern += L"b";
  EXPECT_FALSE(WildcardFit(pattern.c_str(), name.c_str()));
}

}  // namespace
}  // namespace zt::fnd::osdep
