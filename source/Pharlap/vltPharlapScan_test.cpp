// The scan: which registration files are found, and what a merge makes of them.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "tests/support/SaveCounter.h"
#include "tests/support/TestRegistrar.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/OSException.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

constexpr char kDictionaries[] = "Data Dictionaries";
constexpr char kContents[] = "VLRContentsSection";

std::string InfoOf(const Installation& i, const std::string& bundle) {
  return i.root() + "/" + bundle + "/Resources/Info.vlr";
}

// The database after one start.
DatabaseText AfterStart(const Installation& i) {
  EXPECT_EQ(StartOnce(i), 0);
  return DatabaseText(i.database());
}

// ---- Finding

TEST_IN_CHILD(vltPharlapScanFind, DictionariesComeFirstWithTheirTimesInWholeSeconds) {
  Installation i;
  std::string expert = i.addObjectExpert("E", "Exp", GText(2));
  std::string dictionary = i.addDictionary("D", "Dict", GText(1), 3, "d");
  Installation::touch(dictionary, Installation::kInstalled + 5);
  LinuxStart r(i);
  CvltPharlapRegistrar::RegistrationFiles files;
  EXPECT_EQ(r->FindRegistrationFiles(files), S_OK);
  ASSERT_EQ(files.size(), 2u);
  EXPECT_EQ(files[0].first.exactCompare(S(dictionary)), 0);
  EXPECT_EQ(files[1].first.exactCompare(S(expert)), 0);
  auto seconds = [&](int n) {
    return static_cast<time_t>(files[n].second.toLKTIME(true) / 10000000 - 11644473600);
  };
  EXPECT_EQ(seconds(0), Installation::kInstalled + 5);
  EXPECT_EQ(seconds(1), Installation::kInstalled);
  EXPECT_EQ(files[1].second.toLKTIME(true) % 10000000, 0);
}

TEST_IN_CHILD(vltPharlapScanFind, BundlesAreListedInTheOrderOfTheDirectory) {
  Installation i;
  for (int n = 0; n < 20; ++n) {
    i.addObjectExpert("E" + std::to_string(n), "Exp" + std::to_string(n), GText(n));
  }
  std::vector<std::string> order;
  for (const auto& entry : fs::directory_iterator(i.root() + "/Experts")) {
    order.push_back(entry.path().string() + "/Resources/Info.vlr");
  }
  LinuxStart r(i);
  CvltPharlapRegistrar::RegistrationFiles files;
  EXPECT_EQ(r->FindRegistrationFiles(files), S_OK);
  ASSERT_EQ(files.size(), order.size());
  for (unsigned n = 0; n < files.size(); ++n) {
    EXPECT_EQ(files[n].first.exactCompare(S(order[n])), 0);
  }
}

// Masks fold case, the path inside the bundle does not.
TEST_IN_CHILD(vltPharlapScanFind, WhatIsNoBundleIsSkipped) {
  Installation i;
  fs::create_directories(i.root() + "/Experts/empty.vle/Resources");
  fs::create_directories(i.root() + "/Experts/bare.vle");
  fs::create_directories(i.root() + "/Experts/dir.vle/Resources/Info.vlr");
  i.addBundle("Experts", "other.framework", "[KORComponents]\na = \"a\"\n");
  i.addBundle(kDictionaries, "other.vle", "[KORComponents]\nb = \"b\"\n");
  i.addBundle("Experts", ".hidden.vle", "[KORComponents]\nc = \"c\"\n");
  fs::create_directories(i.root() + "/Experts/case.vle/resources");
  WriteBytes(i.root() + "/Experts/case.vle/resources/Info.vlr", "[KORComponents]\nd = \"d\"\n");
  WriteBytes(i.root() + "/Experts/file.vle", "a plain file");
  WriteBytes(i.root() + "/Experts/half.vle.bak", "");
  std::string found = i.addBundle("Experts", "UPPER.VLE", "[KORComponents]\ne = \"e\"\n");
  LinuxStart r(i);
  CvltPharlapRegistrar::RegistrationFiles files;
  EXPECT_EQ(r->FindRegistrationFiles(files), S_OK);
  ASSERT_EQ(files.size(), 1u);
  EXPECT_EQ(files[0].first.exactCompare(S(found)), 0);
}

TEST_IN_CHILD(vltPharlapScanFind, BundlesMayBeReachedThroughLinks) {
  Installation i;
  TempDir elsewhere;
  fs::create_directories(elsewhere / "real/Resources");
  WriteBytes(
      elsewhere / "real/Resources/Info.vlr",
      "[KORComponents]\nA = \"A\"\n[A]\nIdentifier = \"" + GText(1) + "\"\nFileName = \"A\"\n");
  fs::create_directories(i.root() + "/Experts");
  fs::create_directory_symlink(elsewhere / "real", i.root() + "/Experts/linked.vle");
  fs::create_symlink("missing", i.root() + "/Experts/dangling.vle");
  LinuxStart r(i);
  EXPECT_EQ(Find(*r, G(1)), S_OK);
}

TEST_IN_CHILD(vltPharlapScanFind, LinksThatGoInCirclesAreSkipped) {
  Installation i;
  i.addObjectExpert("E", "Exp", GText(2));
  fs::create_symlink("loop.vle", i.root() + "/Experts/loop.vle");
  fs::create_directories(i.root() + "/Experts/inner.vle/Resources");
  fs::create_symlink("Info.vlr", InfoOf(i, "Experts/inner.vle"));
  LinuxStart r(i);
  EXPECT_EQ(Find(*r, G(2)), S_OK);
}

// ---- Merging

TEST(vltPharlapScanMerge, FileNamesBecomePathsBelowTheInstallDirectory) {
  struct Row {
    bool dictionary;
    std::string given, stored;
  };
  Installation i;
  std::string dictionaries = i.root() + "/Data Dictionaries/", experts = i.root() + "/Experts/";
  const Row rows[] = {{true, "Foo", dictionaries + "Foo.framework"},
                      {false, "Foo", experts + "Foo.vle"},
                      {true, "Foo.bar", dictionaries + "Foo.bar"},
                      {false, "Foo.bar", experts + "Foo.bar"},
                      {true, "sub/Foo", "sub/Foo.framework"},
                      {false, "sub/Foo", "sub/Foo.vle"},
                      {false, "/abs/Foo", "/abs/Foo.vle"},
                      {false, "/abs/Foo.x", "/abs/Foo.x"},
                      {false, "a.b/Foo", "a.b/Foo.vle"},
                      {false, "Foo.", experts + "Foo."},
                      // A backslash is no separator for the extension, but keeps the directory off.
                      {false, R"(a\Foo)", R"(a\Foo.vle)"},
                      {false, R"(a.b\Foo)", R"(a.b\Foo)"}};
  int n = 0;
  for (const Row& row : rows) {
    std::string name = "C" + std::to_string(n++);
    std::string given = row.given;
    for (size_t at = 0; (at = given.find('\\', at)) != std::string::npos; at += 2) {
      given.insert(at, "\\");
    }
    i.addBundle(row.dictionary ? kDictionaries : "Experts",
                name + (row.dictionary ? ".framework" : ".vle"),
                "[KORComponents]\n" + name + " = \"" + name + "\"\n[" + name + "]\nFILENAME = \"" +
                    given + "\"\n" + (row.dictionary ? "SchemaVersion = 1\n" : ""));
  }
  DatabaseText db = AfterStart(i);
  n = 0;
  for (const Row& row : rows) {
    std::string name = "C" + std::to_string(n++), stored = row.stored;
    for (size_t at = 0; (at = stored.find('\\', at)) != std::string::npos; at += 2) {
      stored.insert(at, "\\");
    }
    EXPECT_EQ(db.quoted(name, "FILENAME"), stored) << row.given;
  }
}

TEST(vltPharlapScanMerge, IdentifiersLoseTheirBracesOnly) {
  std::string bare = GText(5);
  const std::pair<std::string, std::string> rows[] = {{bare, bare},
                                                      {"{" + bare + "}", bare},
                                                      {"{" + bare, "{" + bare},
                                                      {"{" + bare + "}}", "{" + bare + "}}"},
                                                      {"(" + bare + ")", "(" + bare + ")"},
                                                      {"short", "short"}};
  for (const auto& [given, stored] : rows) {
    Installation i;
    i.addBundle("Experts", "E.vle",
                "[KORComponents]\nE = \"E\"\n[E]\nidentifier = \"" + given + "\"\n");
    EXPECT_EQ(AfterStart(i).quoted("E", "identifier"), stored) << given;
  }
}

TEST(vltPharlapScanMerge, CopiesEverySectionQuotedAndKeepsWhatItDoesNotKnow) {
  Installation i;
  i.addBundle("Experts", "E.vle",
              "[Extra]\nnumber = 5\ntext = \"a\\tb \\q\\x41\"\n[KORComponents]\nE = \"E\"\n"
              "[E]\nUnknown Key = yes\n");
  DatabaseText db = AfterStart(i);
  EXPECT_EQ(db.raw("Extra", "number"), "\"5\"");
  // Decoded and encoded again: an escape that means nothing loses its backslash.
  EXPECT_EQ(db.raw("Extra", "text"), R"("a\tb qA")");
  EXPECT_EQ(db.raw("E", "Unknown Key"), "\"yes\"");
  EXPECT_EQ(db.quoted("KORComponents", "E"), "E");
  EXPECT_EQ(db.quoted(kContents, "E"), InfoOf(i, "Experts/E.vle"));
}

TEST(vltPharlapScanMerge, ADictionaryIsMarkedAsChangedBehindItsItems) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "d");
  i.addObjectExpert("E", "Exp", GText(2));
  DatabaseText db = AfterStart(i);
  EXPECT_EQ(db.items("Dict"),
            (DatabaseText::Items{{"Identifier", "\"" + GText(1) + "\""},
                                 {"FileName", "\"" + i.root() + "/Data Dictionaries/D.framework\""},
                                 {"SchemaVersion", "\"3\""},
                                 {"Prefix", "\"d\""},
                                 {"FragmentRegistered", "23"}}));
  EXPECT_FALSE(db.raw("Exp", "FragmentRegistered"));
}

// The value of the list's item names the component for the contents, its name for the start.
TEST_IN_CHILD(vltPharlapScanMerge, ValueAndNameOfTheListServeDifferentEnds) {
  Installation i;
  i.addBundle("Experts", "E.vle",
              "[korcomponents]\nName = \"Value\"\n[Name]\nIdentifier = \"" + GText(1) +
                  "\"\nFileName = \"N\"\n[Value]\nIdentifier = \"" + GText(2) + "\"\n");
  DatabaseText db = AfterStart(i);
  EXPECT_EQ(db.quoted("KORComponents", "Name"), "Value");
  EXPECT_EQ(db.quoted(kContents, "Value"), InfoOf(i, "Experts/E.vle"));
  EXPECT_FALSE(db.raw(kContents, "Name"));
  LinuxStart r(i);
  EXPECT_EQ(Find(*r, G(1)), S_OK);
  EXPECT_EQ(Find(*r, G(2)), E_INVALIDARG);
}

TEST(vltPharlapScanMerge, OfTwoFilesWithOneSectionTheLaterWinsKeyByKey) {
  Installation i;
  i.addBundle(kDictionaries, "D.framework",
              "[KORComponents]\nX = \"X\"\n[X]\nOnlyFirst = 1\nBoth = 1\n");
  i.addBundle("Experts", "E.vle", "[KORComponents]\nx = \"x\"\n[x]\nboth = 2\nOnlySecond = 2\n");
  DatabaseText db = AfterStart(i);
  EXPECT_EQ(
      db.items("X"),
      (DatabaseText::Items{{"OnlyFirst", "\"1\""}, {"Both", "\"2\""}, {"OnlySecond", "\"2\""}}));
  EXPECT_EQ(db.quoted(kContents, "X"), InfoOf(i, "Experts/E.vle"));
}

TEST_IN_CHILD(vltPharlapScanMerge, AFileWithoutSectionsCounts) {
  Installation i;
  std::string file = i.addBundle("Experts", "E.vle", "");
  DatabaseText db = AfterStart(i);
  EXPECT_EQ(db.quoted("Registration", file), Installation::stamp(Installation::kInstalled));
  LinuxStart r(i);
  EXPECT_EQ(r->MergeRegistrationFile(S(i.root() + "/"), file.c_str()), S_OK);
}

TEST(vltPharlapScanMerge, OpensTheFileUpButNotThroughALink) {
  Installation i;
  std::string file = i.addObjectExpert("E", "Exp", GText(2));
  chmod(file.c_str(), 0600);
  TempDir elsewhere;
  WriteBytes(elsewhere / "secret", "[KORComponents]\nS = \"S\"\n");
  chmod((elsewhere / "secret").c_str(), 0600);
  fs::create_directories(i.root() + "/Experts/S.vle/Resources");
  fs::create_symlink(elsewhere / "secret", InfoOf(i, "Experts/S.vle"));
  ASSERT_EQ(StartOnce(i), 0);
  EXPECT_EQ(ModeOf(file), 0777);
  EXPECT_EQ(ModeOf(elsewhere / "secret"), 0600);
  EXPECT_TRUE(DatabaseText(i.database()).raw("KORComponents", "S"));
}

}  // namespace
}  // namespace vlt::test
