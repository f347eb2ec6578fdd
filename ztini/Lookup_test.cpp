#include <gtest/gtest.h>

#include <clocale>
#include <random>
#include <string>

#include "tests/support/CompiledLocales.h"
#include "tests/support/FailingAlloc.h"
#include "tests/support/TestDocument.h"
#include "ztini/NameCompare.h"

namespace {

using ztini::test::Document;
using ztini::test::FailFromAllocation;
using ztini::test::NewDocument;
using ztini::test::Parse;
using ztini::test::RawValue;
using ztini::test::Show;

Document Sample() { return Parse("[a]\nx=1\ny=2\n[b]\nz=\"3\"\n"); }

TEST(Lookup, NamesIgnoreCaseAndSurroundingWhiteSpace) {
  Document doc = Sample();
  EXPECT_EQ(IniSectionExists(doc.get(), " A\t"), 1);
  EXPECT_EQ(IniSectionExists(doc.get(), "c"), 0);
  EXPECT_EQ(IniItemExists(doc.get(), "A", " X "), 1);
  EXPECT_EQ(IniItemExists(doc.get(), "a", "z"), 0);
  EXPECT_EQ(IniItemExists(doc.get(), "c", "x"), 0);
}

TEST(Lookup, WhiteSpaceInsideANameCounts) {
  Document doc = Parse("[a b]\nx  y=1\n");
  EXPECT_EQ(IniSectionExists(doc.get(), "ab"), 0);
  EXPECT_EQ(IniItemExists(doc.get(), "a b", "x y"), 0);
  EXPECT_EQ(IniItemExists(doc.get(), "A B", "X  Y"), 1);
}

// The length of so long a name is not kept, and is no zero either.
TEST(Lookup, AnEmptyNameIsNoLongOne) {
  const std::string name(5000, 'n');
  Document doc = Parse("[a]\n" + name + "=1\n");
  EXPECT_EQ(IniItemExists(doc.get(), "a", name.c_str()), 1);
  EXPECT_EQ(IniItemExists(doc.get(), "a", ""), 0);
  EXPECT_EQ(IniItemExists(doc.get(), "a", " "), 0);
}

TEST(Lookup, HandlesAndPositions) {
  Document doc = Sample();
  IniSection* b = IniFindSection(doc.get(), "B");
  EXPECT_STREQ(IniSectionName(b), "b");
  EXPECT_EQ(IniFindSectionIndex(doc.get(), "b"), 2);
  EXPECT_EQ(IniFindSectionIndex(doc.get(), "c"), 0);
  IniSection* a = IniFindSection(doc.get(), "a");
  EXPECT_STREQ(IniEntryName(IniFindEntry(a, 0, "Y")), "y");
  EXPECT_EQ(IniFindEntry(a, 1, "Y"), nullptr);
  EXPECT_STREQ(IniEntryName(IniFindEntry(a, 1, "y")), "y");
  EXPECT_EQ(IniFindEntryIndex(a, 0, "Y"), 2);
  EXPECT_EQ(IniFindEntryIndex(a, 1, "Y"), 0);
}

TEST(Lookup, LinesAndOrigin) {
  Document doc = Sample();
  IniPut(doc.get(), "new", "x", "1", 0);
  EXPECT_EQ(IniLineOfSection(doc.get(), "a"), 1);
  EXPECT_EQ(IniLineOfSection(doc.get(), "b"), 4);
  EXPECT_EQ(IniLineOfSection(doc.get(), "new"), -1);
  EXPECT_EQ(IniLineOfSection(doc.get(), "none"), -1);
  EXPECT_EQ(IniSectionWasReadFromFile(IniFindSection(doc.get(), "a")), 1);
  EXPECT_EQ(IniSectionWasReadFromFile(IniFindSection(doc.get(), "new")), 0);
  EXPECT_EQ(IniSectionWasReadFromFile(nullptr), 0);
}

TEST(Lookup, GetGivesTheValueAndRemembersTheLine) {
  Document doc = Sample();
  const char* value = "before";
  EXPECT_EQ(IniGet(doc.get(), "a", "y", &value), 1);
  EXPECT_STREQ(value, "2");
  EXPECT_EQ(doc->lastItemLine, 3);
  EXPECT_EQ(IniGet(doc.get(), "b", "z", nullptr), 1);
  EXPECT_EQ(doc->lastItemLine, 5);
  EXPECT_EQ(IniGet(doc.get(), "a", "none", &value), 0);
  EXPECT_EQ(value, nullptr);
  EXPECT_EQ(doc->lastItemLine, 5);
}

TEST(Lookup, EnumerationIsOneBasedWithZeroAsLastAndMinusOneAsFirst) {
  Document doc = Sample();
  EXPECT_EQ(IniNumberOfSections(doc.get()), 2);
  EXPECT_EQ(IniNumberOfItems(doc.get(), "A"), 2);
  EXPECT_EQ(IniNumberOfItems(doc.get(), "none"), 0);
  const struct {
    int32_t n, result;
    const char *section, *item, *value;
  } rows[] = {{1, 1, "a", "x", "1"},
              {2, 1, "b", "y", "2"},
              {0, 1, "b", "y", "2"},
              {-1, 1, "a", "x", "1"},
              {3, 0, nullptr, nullptr, nullptr},
              {-2, 0, nullptr, nullptr, nullptr}};
  for (const auto& row : rows) {
    const char *section = "", *item = "", *value = "";
    EXPECT_EQ(IniNthSectionName(doc.get(), row.n, &section), row.result) << row.n;
    EXPECT_EQ(IniNthItemName(doc.get(), "a", row.n, &item), row.result) << row.n;
    EXPECT_EQ(IniNthItemPointerToString(doc.get(), "a", row.n, &value), row.result) << row.n;
    EXPECT_STREQ(section, row.section) << row.n;
    EXPECT_STREQ(item, row.item) << row.n;
    EXPECT_STREQ(value, row.value) << row.n;
  }
  EXPECT_EQ(IniNthItemName(doc.get(), "none", 1, nullptr), 0);
}

TEST(Lookup, EqualNamesFindTheFirstUnlessAnotherOneWasAskedForByNumber) {
  Document doc = Parse("[s]\nx=first\n[s]\nx=second\n[t]\ny=1\n", 2, 0);
  EXPECT_EQ(RawValue(doc, "s", "x"), "first");
  const char* name = nullptr;
  EXPECT_EQ(IniNthSectionName(doc.get(), 2, &name), 1);
  EXPECT_EQ(RawValue(doc, "s", "x"), "second");
  EXPECT_EQ(RawValue(doc, "t", "y"), "1");
  EXPECT_EQ(RawValue(doc, "s", "x"), "first");
}

// As above, in a list that has an index, and by another spelling.
TEST(Lookup, OfEqualNamesInALongListTheOneAskedForByNumberIsFound) {
  std::string text;
  for (int i = 0; i < 40; ++i) text += "[Name" + std::to_string(i) + "]\nK=1\n";
  Document doc = Parse(text + "[Twin]\nK=first\n[TWIN]\nK=second\n", 2, 0);
  EXPECT_EQ(RawValue(doc, "twin", "K"), "first");
  const char* name = nullptr;
  ASSERT_EQ(IniNthSectionName(doc.get(), 42, &name), 1);
  EXPECT_EQ(RawValue(doc, " twin ", "K"), "second");
  EXPECT_EQ(RawValue(doc, "name7", "K"), "1");
  EXPECT_EQ(RawValue(doc, "twin", "K"), "first");
  ASSERT_EQ(IniRemoveSection(doc.get(), "twin"), 1);
  EXPECT_EQ(RawValue(doc, "twin", "K"), "second");
}

TEST(Lookup, ValuePointersOutliveOtherChanges) {
  Document doc = Sample();
  const char *value = nullptr, *name = nullptr;
  IniGet(doc.get(), "a", "x", &value);
  IniNthItemName(doc.get(), "a", 1, &name);
  for (int i = 0; i < 1000; ++i) IniPut(doc.get(), "a", ("n" + std::to_string(i)).c_str(), "v", 0);
  IniRemoveItem(doc.get(), "a", "y");
  IniRemoveSection(doc.get(), "b");
  EXPECT_STREQ(value, "1");
  EXPECT_STREQ(name, "x");
}

TEST(Lookup, RenameTrimsAndKeepsItems) {
  Document doc = Sample();
  EXPECT_EQ(IniRenameSection(doc.get(), "A", "  Z z "), 1);
  EXPECT_EQ(Show(doc), "[Z z@1] x=1@2 y=2@3 [b@4] z=\"3\"@5");
  EXPECT_EQ(IniRenameSection(doc.get(), "a", "q"), 0);
  EXPECT_EQ(RawValue(doc, "z Z", "x"), "1");
  EXPECT_EQ(IniSectionExists(doc.get(), "a"), 0);
}

TEST(Lookup, RenameToAKnownNameMakesTwo) {
  Document doc = Sample();
  EXPECT_EQ(IniRenameSection(doc.get(), "b", "A"), 1);
  const char* name = nullptr;
  IniNthSectionName(doc.get(), 1, &name);
  EXPECT_EQ(RawValue(doc, "a", "x"), "1");
  EXPECT_EQ(IniNumberOfSections(doc.get()), 2);
}

TEST(Lookup, RenameWithoutMemoryChangesNothing) {
  Document doc = Sample();
  {
    FailFromAllocation fail(1);
    EXPECT_EQ(IniRenameSection(doc.get(), "a", "c"), kIniOutOfMemory);
  }
  EXPECT_EQ(IniSectionExists(doc.get(), "a"), 1);
  EXPECT_EQ(IniSectionExists(doc.get(), "c"), 0);
}

TEST(Lookup, RemoveItem) {
  Document doc = Sample();
  EXPECT_EQ(IniRemoveItem(doc.get(), "a", " X"), 1);
  EXPECT_EQ(IniRemoveItem(doc.get(), "a", "x"), 0);
  EXPECT_EQ(IniRemoveItem(doc.get(), "none", "x"), 0);
  EXPECT_EQ(Show(doc), "[a@1] y=2@3 [b@4] z=\"3\"@5");
}

TEST(Lookup, RemoveSectionClearsTheCacheOfThatSectionOnly) {
  Document doc = Sample();
  IniSection* b = IniFindSection(doc.get(), "b");
  EXPECT_EQ(doc->currentSection, b);
  EXPECT_EQ(IniRemoveSection(doc.get(), "B"), 1);
  EXPECT_EQ(doc->currentSection, nullptr);
  EXPECT_EQ(IniRemoveSection(doc.get(), "b"), 0);
  EXPECT_EQ(Show(doc), "[a@1] x=1@2 y=2@3");
}

TEST(Lookup, RemovingOneOfEqualNamesUncoversTheNext) {
  Document doc = Parse("[s]\nx=1\nx=2\nx=3\n", 2, 0);
  EXPECT_EQ(RawValue(doc, "s", "x"), "1");
  EXPECT_EQ(IniRemoveItem(doc.get(), "s", "x"), 1);
  EXPECT_EQ(RawValue(doc, "s", "x"), "2");
  EXPECT_EQ(IniRemoveItem(doc.get(), "s", "x"), 1);
  EXPECT_EQ(RawValue(doc, "s", "x"), "3");
}

TEST(Lookup, NullSectionIsTheLiteralNameOnly) {
  Document doc = NewDocument();
  IniPut(doc.get(), "(null)", "x", "1", 0);
  IniPut(doc.get(), "b", "x", "1", 0);
  EXPECT_EQ(IniSectionIsNull(IniFindSection(doc.get(), "(NULL)")), 1);
  EXPECT_EQ(IniSectionIsNull(IniFindSection(doc.get(), "b")), 0);
  EXPECT_EQ(IniSectionIsNull(nullptr), 0);
  IniRenameSection(doc.get(), "(null)", "(Null)");
  EXPECT_EQ(IniSectionIsNull(IniFindSection(doc.get(), "(null)")), 0);
}

TEST(Lookup, NullArgumentsAreNotFound) {
  Document doc = Sample();
  const char* text = "before";
  EXPECT_EQ(IniFindSection(nullptr, "a"), nullptr);
  EXPECT_EQ(IniFindSection(doc.get(), nullptr), nullptr);
  EXPECT_EQ(IniFindEntry(nullptr, 0, "x"), nullptr);
  EXPECT_EQ(IniFindEntry(IniFindSection(doc.get(), "a"), 0, nullptr), nullptr);
  EXPECT_EQ(IniFindEntryIndex(nullptr, 0, "x"), 0);
  EXPECT_EQ(IniSectionName(nullptr), nullptr);
  EXPECT_EQ(IniEntryName(nullptr), nullptr);
  EXPECT_EQ(IniGet(nullptr, "a", "x", &text), 0);
  EXPECT_EQ(text, nullptr);
  EXPECT_EQ(IniItemExists(doc.get(), "a", nullptr), 0);
  EXPECT_EQ(IniNumberOfSections(nullptr), 0);
  EXPECT_EQ(IniNumberOfItems(nullptr, "a"), 0);
  EXPECT_EQ(IniNthSectionName(nullptr, 1, &text), 0);
  EXPECT_EQ(IniNthItemName(nullptr, "a", 1, &text), 0);
  EXPECT_EQ(IniRenameSection(nullptr, "a", "b"), 0);
  EXPECT_EQ(IniRenameSection(doc.get(), "a", nullptr), 0);
  EXPECT_EQ(IniRemoveSection(nullptr, "a"), 0);
  EXPECT_EQ(IniRemoveItem(nullptr, "a", "x"), 0);
  EXPECT_EQ(IniRemoveItem(doc.get(), "a", nullptr), 0);
}

// The same answers from long lists, which are indexed, as from short ones.
TEST(Lookup, LongListsAnswerLikeShortOnes) {
  std::string text;
  for (int s = 0; s < 300; ++s) {
    text += "[Sec " + std::to_string(s) + "]\n";
    for (int i = 0; i < 40; ++i) {
      text += "Item " + std::to_string(i) + "=" + std::to_string(s * 100 + i) + "\n";
    }
  }
  Document doc = Parse(text);
  ASSERT_EQ(IniNumberOfSections(doc.get()), 300);
  for (int s = 299; s >= 0; --s) {
    const std::string section = " sEC " + std::to_string(s) + " ";
    ASSERT_EQ(IniFindSectionIndex(doc.get(), section.c_str()), s + 1);
    for (int i : {0, 17, 39}) {
      const std::string item = "\tITEM " + std::to_string(i);
      ASSERT_EQ(RawValue(doc, section.c_str(), item.c_str()), std::to_string(s * 100 + i));
    }
    ASSERT_EQ(RawValue(doc, section.c_str(), "Item 40"), "<absent>");
  }
}

// An 8-bit locale in which the letters above 127 have two cases.
class Latin1 {
 public:
  static std::string Missing() { return vlt::test::CompiledLocales::Missing(); }
  Latin1() { m_locales.make("de_DE", "ISO-8859-1"); }
  bool use() const { return m_locales.use("de_DE.ISO-8859-1"); }

 private:
  vlt::test::CompiledLocales m_locales;
};

TEST(Lookup, ALocaleChangeBetweenCallsIsFollowed) {
  if (const std::string missing = Latin1::Missing(); !missing.empty()) {
    GTEST_SKIP() << "NOT TESTED: " << missing;
  }
  const Latin1 latin1;
  Document doc = NewDocument();
  for (int i = 0; i < 100; ++i) {
    const std::string n = std::to_string(i);
    IniPut(doc.get(), ("\xe4 i" + n).c_str(), "x", n.c_str(), 0);
    IniPut(doc.get(), "all", ("\xe4" + n).c_str(), n.c_str(), 0);
  }
  EXPECT_EQ(RawValue(doc, "\xe4 I50", "x"), "50");
  EXPECT_EQ(RawValue(doc, "\xc4 I50", "x"), "<absent>");
  EXPECT_EQ(RawValue(doc, "all",
                     "\xc4"
                     "50"),
            "<absent>");
  ASSERT_TRUE(latin1.use());
  EXPECT_EQ(RawValue(doc, "\xc4 I50", "x"), "50");
  EXPECT_EQ(RawValue(doc, "all",
                     "\xc4"
                     "50"),
            "50");
  IniPut(doc.get(), "\xc4 i50", "x", "new", 0);
  EXPECT_EQ(IniNumberOfSections(doc.get()), 101);
  setlocale(LC_CTYPE, "C");
  // The index of the items is still that of the other locale when one of them goes.
  EXPECT_EQ(RawValue(doc, "\xc4 I50", "x"), "<absent>");
  EXPECT_EQ(RawValue(doc, "\xe4 I50", "x"), "new");
  EXPECT_EQ(IniRemoveItem(doc.get(), "all",
                          "\xe4"
                          "50"),
            1);
  EXPECT_EQ(RawValue(doc, "all",
                     "\xe4"
                     "50"),
            "<absent>");
  EXPECT_EQ(RawValue(doc, "all",
                     "\xe4"
                     "51"),
            "51");
}

// ---- The quick look-up beside the plain comparison of one name after the other

std::string RandomName(std::mt19937* random) {
  constexpr char kCharacters[] = "aAbBzZ{@[`09_ \t\xa0\xe4\xc4";
  std::string name;
  for (unsigned n = (*random)() % 6 + 1; n > 0; --n) {
    name += kCharacters[(*random)() % (sizeof kCharacters - 1)];
  }
  return name;
}

// What the comparison of names says, in order.
const IniEntry* PlainFind(const Document& doc, const std::string& name) {
  doc->fold.refresh();
  const IniSection* section = doc->section(1);
  for (int32_t n = 1; n <= section->items.count(); ++n) {
    const IniEntry* entry = section->item(n);
    if (ztini::CompareNames(doc->fold, entry->name, name.c_str()) == 0) return entry;
  }
  return nullptr;
}

void CompareRandomLookups(unsigned seeds, const char* put, const char* look) {
  int found = 0;
  for (unsigned seed = 0; seed < seeds; ++seed) {
    std::mt19937 random(seed);
    Document doc = NewDocument();
    setlocale(LC_CTYPE, put);
    IniPut(doc.get(), "s", "first", "v", 0);
    for (unsigned n = random() % 30; n > 0; --n) {
      IniPut(doc.get(), "s", RandomName(&random).c_str(), std::to_string(n).c_str(), 0);
    }
    setlocale(LC_CTYPE, look);
    for (int n = 0; n < 100; ++n) {
      const std::string name = RandomName(&random);
      const IniEntry* expected = PlainFind(doc, name);
      const char* value = nullptr;
      ASSERT_EQ(IniGet(doc.get(), "s", name.c_str(), &value), expected ? 1 : 0) << seed << name;
      ASSERT_EQ(value, expected ? expected->value : nullptr) << seed << name;
      found += expected != nullptr;
    }
  }
  EXPECT_GT(found, 0);
}

TEST(Lookup, RandomNamesAreFoundAsTheyCompare) { CompareRandomLookups(500, "C", "C"); }

TEST(Lookup, RandomNamesAreFoundAsTheyCompareInEveryPairOfLocales) {
  if (const std::string missing = Latin1::Missing(); !missing.empty()) {
    GTEST_SKIP() << "NOT TESTED: " << missing;
  }
  const Latin1 latin1;
  ASSERT_TRUE(latin1.use());
  const std::string name = setlocale(LC_CTYPE, nullptr);
  CompareRandomLookups(300, name.c_str(), name.c_str());
  CompareRandomLookups(300, name.c_str(), "C");
  CompareRandomLookups(300, "C", name.c_str());
  setlocale(LC_CTYPE, "C");
}

}  // namespace
