// Dictionaries: registration, the decision on change, the flag, and the previous ones.
#include <gtest/gtest.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "source/Common/vltcmn.h"
#include "tests/support/FileSizeLimit.h"
#include "tests/support/SaveCounter.h"
#include "tests/support/TestRegistrar.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

// ---- Registration

TEST(vltPharlapDictionaries, RegistrationWritesItsItemsInOrderAndSaves) {
  Installation i;
  ExpectInChild([&] {
    LinuxStart r(i);
    Offered d(vltComponentDataDictionary, L"New One", G(9), L"/x/New.framework", L"n\"1");
    d.value.dictionary.schemaVersion = 4294967295u;
    d.value.dictionary.fragmentRegistered = 1;
    d.value.dictionary.lastInstalledSchemaVersion = 12;
    EXPECT_EQ(r->RegisterComponent(&d.value), S_OK);
    EXPECT_EQ(Find(*r, G(9)), E_INVALIDARG);  // known from the next start on
  });
  DatabaseText db(i.database());
  EXPECT_EQ(db.quoted("KORComponents", "New One"), "New One");
  EXPECT_EQ(db.items("New One"), (DatabaseText::Items{{"Identifier", "\"" + GText(9) + "\""},
                                                      {"FileName", "\"/x/New.framework\""},
                                                      {"SchemaVersion", "4294967295"},
                                                      {"FragmentRegistered", "1"},
                                                      {"LastInstalledSchemaVersion", "12"},
                                                      {"Prefix", R"("n\"1")"}}));
  EXPECT_FALSE(db.raw("VLRContentsSection", "New One"));
  EXPECT_EQ(Hex(ReadBytes(i.sidecar())), Md5Sum(i.database()));
  ExpectInChild([&] {
    LinuxStart r(i);
    Received d;
    ASSERT_EQ(r->GetComponent(G(9), &d.value), S_OK);
    EXPECT_EQ(d.prefix(), L"n\"1");
    EXPECT_EQ(d.value.dictionary.schemaVersion, 4294967295u);
    EXPECT_EQ(d.value.dictionary.lastInstalledSchemaVersion, 12u);
  });
}

TEST_IN_CHILD(vltPharlapDictionaries, RegistrationBringsTheCopyInMemoryUpToDate) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "old");
  LinuxStart r(i);
  Offered d(vltComponentDataDictionary, L"Renamed", G(1), L"/x/New", L"new");
  d.value.dictionary.schemaVersion = 8;
  d.value.dictionary.lastInstalledSchemaVersion = 7;
  EXPECT_EQ(r->RegisterComponent(&d.value), S_OK);
  Received known;
  ASSERT_EQ(r->GetComponent(G(1), &known.value), S_OK);
  EXPECT_EQ(known.name(), L"Renamed");
  EXPECT_EQ(known.file(), L"/x/New");
  EXPECT_EQ(known.prefix(), L"new");
  EXPECT_EQ(known.value.dictionary.schemaVersion, 8u);
  EXPECT_EQ(known.value.dictionary.fragmentRegistered, 0u);
  EXPECT_EQ(known.value.dictionary.lastInstalledSchemaVersion, 7u);
}

TEST(vltPharlapDictionaries, NullTextsAreEmpty) {
  Installation i;
  ExpectInChild([&] {
    LinuxStart r(i);
    Offered d(vltComponentDataDictionary, L"vltdd", kVltdd, L"", L"");
    d.value.fileName = d.value.dictionary.prefix = nullptr;
    EXPECT_EQ(r->RegisterComponent(&d.value), S_OK);
    Received known;
    ASSERT_EQ(r->GetComponent(kVltdd, &known.value), S_OK);
    EXPECT_EQ(known.value.fileName, nullptr);
    EXPECT_EQ(known.value.dictionary.prefix, nullptr);
  });
  EXPECT_EQ(DatabaseText(i.database()).raw("vltdd", "Prefix"), "\"\"");
}

TEST_IN_CHILD(vltPharlapDictionaries, AFailedSaveIsTheResultAndMemoryIsUpToDateAllTheSame) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "old");
  LinuxStart r(i);
  FileSizeLimit full(16);
  Offered d(vltComponentDataDictionary, L"Dict", G(1), L"/x", L"new");
  EXPECT_EQ(r->RegisterComponent(&d.value), E_FAIL);
  Received known;
  ASSERT_EQ(r->GetComponent(G(1), &known.value), S_OK);
  EXPECT_EQ(known.prefix(), L"new");
}

// ---- The flag

TEST(vltPharlapDictionariesFlag, IsSetByEveryMergeAndReadByClients) {
  Installation i;
  std::string file = i.addDictionary("D", "Dict", GText(1), 3, "d");
  auto flag = [&](bool reset) {
    unsigned value = 99;
    Signal unused;
    TempDir out;
    ExpectInChild([&] {
      LinuxStart r(i);
      Received d;
      ASSERT_EQ(r->GetComponent(G(1), &d.value), S_OK);
      WriteBytes(out / "flag", std::to_string(d.value.dictionary.fragmentRegistered));
      if (reset) {
        EXPECT_EQ(r->ResetDDUpdatedFlags(), S_OK);
      }
    });
    value = static_cast<unsigned>(std::stoul(ReadBytes(out / "flag")));
    return value;
  };
  EXPECT_EQ(flag(false), 23u);
  EXPECT_EQ(flag(true), 23u);
  EXPECT_EQ(flag(false), 0u);
  // The same identifier, the same number: a change all the same.
  Installation::touch(file, Installation::kInstalled + 1);
  EXPECT_EQ(flag(true), 23u);
  EXPECT_EQ(flag(false), 0u);
}

TEST(vltPharlapDictionariesFlag, ResetWritesOnceAndClearsMemory) {
  Installation i;
  i.addDictionary("A", "DictA", GText(1), 3, "a");
  i.addDictionary("B", "DictB", GText(2), 3, "b");
  i.addObjectExpert("E", "Exp", GText(3));
  SaveCounter saves(i.root(), "vlt.vlr");
  ExpectInChild([&] {
    LinuxStart r(i);
    int before = saves.count();
    EXPECT_EQ(r->ResetDDUpdatedFlags(), S_OK);
    EXPECT_EQ(saves.count(), before + 1);
    for (unsigned n : {1u, 2u}) {
      Received d;
      ASSERT_EQ(r->GetComponent(G(n), &d.value), S_OK);
      EXPECT_EQ(d.value.dictionary.fragmentRegistered, 0u);
    }
    std::string bytes = ReadBytes(i.database());
    EXPECT_EQ(r->ResetDDUpdatedFlags(), S_OK);
    EXPECT_EQ(saves.count(), before + 1);
    EXPECT_EQ(ReadBytes(i.database()), bytes);
  });
  EXPECT_EQ(DatabaseText(i.database()).raw("DictA", "FragmentRegistered"), "0");
  EXPECT_EQ(DatabaseText(i.database()).raw("DictB", "FragmentRegistered"), "0");
}

// The settings have a "SchemaVersion" too, and no flag: the failure shows when they come last.
TEST_IN_CHILD(vltPharlapDictionariesFlag, ResetReportsTheLastSectionWithASchema) {
  Installation i;
  LinuxStart r(i);
  EXPECT_EQ(r->ResetDDUpdatedFlags(), S_OK);
  EXPECT_EQ(r->database().SetItem("Last", "SchemaVersion", "1", true), S_OK);
  EXPECT_EQ(r->ResetDDUpdatedFlags(), E_FAIL);
  for (const char* value : {"", "0", "words"}) {
    r->database().SetItem("Last", "FragmentRegistered", value, true);
    EXPECT_EQ(r->ResetDDUpdatedFlags(), S_OK) << value;
  }
  std::string kept;
  r->database().GetItem("Last", "FragmentRegistered", &kept);
  EXPECT_EQ(kept, "words");
}

// ---- What counts as changed

struct Comparison {
  std::string fragment;  // items of section S
  std::optional<std::string> database;
  bool changed;
  HRESULT result;
};

TEST_IN_CHILD(vltPharlapDictionariesChanged, EveryDictionaryAndNothingElse) {
  const std::string id = "Identifier = \"" + GText(1) + "\"\n";
  const std::string other = "Identifier = \"" + GText(2) + "\"\n";
  const std::string same = id + "FileName = \"f\"\nSchemaVersion = 3\n";
  const std::string newer = id + "FileName = \"f\"\nSchemaVersion = 4\n";
  const std::string changedId = other + "SchemaVersion = 3\n";
  const Comparison rows[] = {
      {"FileName = \"f\"\n", same, false, S_OK},    // no dictionary
      {same, std::nullopt, true, S_OK},             // not known yet
      {same, same, true, S_OK},                     // nothing differs
      {newer, same, true, S_OK},                    //
      {changedId, same, true, S_OK},                //
      {"SchemaVersion = 3\n", same, true, E_FAIL},  // no identifier to compare
      {same, "FileName = \"f\"\n", true, S_OK},     // none known either
      {"Identifier = \"\"\nSchemaVersion = 3\n", same, true, S_OK},
      {"Identifier = \"words\"\nSchemaVersion = 3\n", same, true, S_OK},
      {id + "SchemaVersion = \"\"\n", same, true, S_OK}};
  Installation i;
  LinuxStart r(i);
  for (const Comparison& row : rows) {
    TempDir dir;
    WriteBytes(dir / "f.vlr", std::string("[S]\n") + row.fragment);
    WriteBytes(dir / "d.vlr", std::string("[S]\n") + row.database.value_or(""));
    CvlIniMgr fragment = CvlIniMgr::OpenForUpdate(dir / "f.vlr");
    r->database().EraseSection("S");
    CvlIniMgr wanted = CvlIniMgr::OpenForUpdate(dir / "d.vlr");
    for (int n = 1; row.database && n <= wanted.GetNumberOfItems("S"); ++n) {
      std::string name, value;
      wanted.GetNthItemName("S", n, &name);
      wanted.GetItem("S", name.c_str(), &value);
      r->database().SetItem("S", name.c_str(), value.c_str(), true);
    }
    bool changed = !row.changed;
    EXPECT_EQ(r->HasDDChanged(fragment, L"S", changed), row.result) << row.fragment;
    EXPECT_EQ(changed, row.changed) << row.fragment;
  }
}

// What a child prints while `body` runs.
std::string Printed(const Installation& i,
                    const std::function<void(AccessibleLinuxRegistrar&)>& body) {
  TempDir out;
  ExpectInChild([&] {
    ASSERT_TRUE(freopen((out / "text").c_str(), "w", stdout));
    LinuxStart r(i);
    body(*r);
    fflush(stdout);
  });
  return ReadBytes(out / "text");
}

void CompareEmptyDictionaries(AccessibleLinuxRegistrar& r, const std::string& place) {
  WriteBytes(place, "[S]\nSchemaVersion = 3\n");
  CvlIniMgr fragment(place.c_str(), false, nullptr, false, true);
  r.database().SetItem("S", "x", "1", true);
  bool changed = false;
  r.HasDDChanged(fragment, L"S", changed);
}

TEST(vltPharlapDictionariesChanged, WarnsOfWhatIsMissingWhenAskedTo) {
  TempDir place;
  for (const char* flags : {"0 0", "1 0", "2 0", "3 0"}) {
    Installation i;
    WriteBytes(i.root() + "/vlttrace.txt", flags);
    std::string text = Printed(i, [&](AccessibleLinuxRegistrar& r) {
      CompareEmptyDictionaries(r, place / "fragment.vlr");
    });
    if (*flags < '2') {
      EXPECT_EQ(text, "") << flags;
      continue;
    }
    const char* const kSource = "./source/Pharlap/vltPharlapRegistrar";
    const std::pair<int, std::string> lines[] = {
        {1857, "Warning: Could not read id from section S, result = -2147467259"},
        {1870, "Warning: Could not read file name from section S, result = -2147467259"},
        {1882, "Warning: Could not read schema version from section S, result = -2147467259"},
        {1902, "Warning: Could not read id from section S in product vlr, result = -2147467259"}};
    size_t at = 0;
    for (const auto& [line, message] : lines) {
      std::string head = std::string(kSource) + "(" + std::to_string(line) + ") : trace ";
      size_t found = text.find(head, at);
      ASSERT_NE(found, std::string::npos) << head << "\n" << text;
      at = text.find('\n', found);
      EXPECT_EQ(text.substr(at - message.size() - 2, message.size() + 2), ": " + message);
    }
  }
}

// ---- Previous dictionaries

std::string LastFolder(const Installation& i) { return i.root() + "/Data Dictionaries/Last/"; }

TEST(vltPharlapDictionariesPrevious, TheFolderIsMadeOpenToAll) {
  Installation i;
  ScopedUmask mask(077);
  ExpectInChild([&] {
    LinuxStart r(i);
    zt::fnd::Vector<zt::fnd::String> names;
    EXPECT_EQ(r->GetPrevDictsLastFolder(names), S_FALSE);
    EXPECT_EQ(names.size(), 0u);
  });
  EXPECT_EQ(ModeOf(i.root() + "/Data Dictionaries/Last"), 0777);
}

TEST_IN_CHILD(vltPharlapDictionariesPrevious, FullPathsAreHandedOut) {
  Installation i;
  fs::create_directories(LastFolder(i) + "A.framework");
  fs::create_directories(LastFolder(i) + "other.vle");
  WriteBytes(LastFolder(i) + "B.framework", "");
  LinuxStart r(i);
  unsigned count = 0;
  wchar_t** paths = nullptr;
  EXPECT_EQ(r->GetPreviousDictionaries(nullptr, &count, &paths), S_OK);
  std::vector<std::wstring> found;
  for (unsigned n = 0; n < count; ++n) {
    found.push_back(paths[n]);
    vltFree(paths[n]);
  }
  vltFree(paths);
  std::sort(found.begin(), found.end());
  EXPECT_EQ(found, (std::vector<std::wstring>{Wide(LastFolder(i) + "A.framework"),
                                              Wide(LastFolder(i) + "B.framework")}));
}

TEST_IN_CHILD(vltPharlapDictionariesPrevious, NullOutParametersDoNothing) {
  Installation i;
  LinuxStart r(i);
  unsigned count = 7;
  wchar_t* mark = nullptr;
  wchar_t** paths = &mark;
  EXPECT_EQ(r->GetPreviousDictionaries(nullptr, &count, nullptr), S_OK);
  EXPECT_EQ(r->GetPreviousDictionaries(nullptr, nullptr, &paths), S_OK);
  EXPECT_EQ(count, 7u);
  EXPECT_EQ(paths, &mark);
  EXPECT_FALSE(Exists(i.root() + "/Data Dictionaries/Last"));
  EXPECT_EQ(r->GetPreviousDictionaries(nullptr, &count, &paths), S_FALSE);
  EXPECT_EQ(count, 0u);
  EXPECT_EQ(paths, &mark);
}

TEST_IN_CHILD(vltPharlapDictionariesPrevious, WithoutARootEverythingFails) {
  Installation i;
  Installation::setDir("");
  LinuxStart r(i);
  unsigned count = 7;
  wchar_t** paths = nullptr;
  EXPECT_EQ(r->GetPreviousDictionaries(nullptr, &count, &paths), E_FAIL);
  EXPECT_EQ(count, 7u);
  EXPECT_EQ(r->RemovePreviousDictionaries(nullptr), E_FAIL);
}

TEST(vltPharlapDictionariesPrevious, MissingRightsAreAResult) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs root, to become a user without rights";
  Installation i;
  chmod(fs::path(i.root()).parent_path().c_str(), 0755);
  chmod(getenv("ZTFNDTMPSHAREDFILEDIR"), 0777);
  ASSERT_EQ(StartOnce(i), 0);
  chmod((i.root() + "/Data Dictionaries").c_str(), 0755);
  ExpectInChild([&] {
    ASSERT_EQ(setresuid(65534, 65534, 65534), 0);
    LinuxStart r(i);
    zt::fnd::Vector<zt::fnd::String> names;
    EXPECT_EQ(r->GetPrevDictsLastFolder(names), E_FAIL);
  });
}

TEST(vltPharlapDictionariesPrevious, RemovalTakesFilesAndThenTheirDatabase) {
  Installation i;
  fs::create_directories(LastFolder(i));
  for (const char* name : {"A.framework", "B.framework", "vlt.vlr", "kept.txt"}) {
    WriteBytes(LastFolder(i) + name, "x");
  }
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_EQ(r->RemovePreviousDictionaries(nullptr), S_OK);
  });
  EXPECT_FALSE(Exists(LastFolder(i) + "A.framework"));
  EXPECT_FALSE(Exists(LastFolder(i) + "B.framework"));
  EXPECT_FALSE(Exists(LastFolder(i) + "vlt.vlr"));
  EXPECT_TRUE(Exists(LastFolder(i) + "kept.txt"));
}

TEST(vltPharlapDictionariesPrevious, AnEmptyFolderKeepsItsDatabase) {
  Installation i;
  fs::create_directories(LastFolder(i));
  WriteBytes(LastFolder(i) + "vlt.vlr", "x");
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_EQ(r->RemovePreviousDictionaries(nullptr), S_FALSE);
  });
  EXPECT_TRUE(Exists(LastFolder(i) + "vlt.vlr"));
}

TEST(vltPharlapDictionariesPrevious, AMissingDatabaseIsAFailure) {
  Installation i;
  fs::create_directories(LastFolder(i));
  WriteBytes(LastFolder(i) + "A.framework", "x");
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_EQ(r->RemovePreviousDictionaries(nullptr), E_FAIL);
  });
  EXPECT_FALSE(Exists(LastFolder(i) + "A.framework"));
}

TEST(vltPharlapDictionariesPrevious, ABundleThatIsADirectoryStaysAndTheOthersGo) {
  Installation i;
  fs::create_directories(LastFolder(i) + "A.framework");
  for (const char* name : {"B.framework", "C.framework", "vlt.vlr"}) {
    WriteBytes(LastFolder(i) + name, "x");
  }
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_EQ(r->RemovePreviousDictionaries(nullptr), E_FAIL);
  });
  EXPECT_TRUE(Exists(LastFolder(i) + "A.framework"));
  EXPECT_FALSE(Exists(LastFolder(i) + "B.framework"));
  EXPECT_FALSE(Exists(LastFolder(i) + "C.framework"));
  EXPECT_TRUE(Exists(LastFolder(i) + "vlt.vlr"));
}

TEST(vltPharlapDictionariesPrevious, PortConfigurationOptionsAreRefusedWithAWord) {
  Installation i;
  fs::create_directories(LastFolder(i));
  WriteBytes(LastFolder(i) + "A.framework", "x");
  for (const char* flags : {"0 0", "1 0"}) {
    WriteBytes(i.root() + "/vlttrace.txt", flags);
    std::string text = Printed(i, [&](AccessibleLinuxRegistrar& r) {
      const unsigned char with[8] = {0, 0, 0, 0, 0x80};
      EXPECT_EQ(r.RemovePreviousDictionaries(reinterpret_cast<const _vltStartupOptions*>(with)),
                E_FAIL);
    });
    const std::string message =
        ": Error: Portcfg options specified for pharlap registrar remove previous dictionaries.\n";
    if (*flags == '0') {
      EXPECT_EQ(text, "");
    } else {
      EXPECT_EQ(text.find("./source/Pharlap/vltPharlapRegistrar(2208) : trace "), 0u) << text;
      EXPECT_NE(text.find(message), std::string::npos) << text;
    }
  }
  EXPECT_TRUE(Exists(LastFolder(i) + "A.framework"));
}

TEST_IN_CHILD(vltPharlapDictionariesPrevious, OtherOptionsDoNotStandInTheWay) {
  Installation i;
  LinuxStart r(i);
  const unsigned char without[8] = {0xFF, 0xFF, 0xFF, 0xFF, 0x7F, 0xFF, 0xFF, 0xFF};
  auto* options = reinterpret_cast<const _vltStartupOptions*>(without);
  EXPECT_EQ(r->RemovePreviousDictionaries(options), S_FALSE);
}

// ---- Loading test

TEST_IN_CHILD(vltPharlapDictionaries, TheLoadingTestSucceedsWhateverLoads) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "d");
  i.addBundle(
      "Data Dictionaries", "N.framework",
      "[KORComponents]\nN = \"N\"\n[N]\nIdentifier = \"" + GText(2) + "\"\nSchemaVersion = 1\n");
  EXPECT_EQ(vltLoadDataDictionaries2(nullptr), E_POINTER);
  LinuxStart r(i);
  Received none;
  ASSERT_EQ(r->GetComponent(G(2), &none.value), S_OK);
  EXPECT_EQ(none.value.fileName, nullptr);
  EXPECT_EQ(vltLoadDataDictionaries2(&*r), S_OK);
}

}  // namespace
}  // namespace vlt::test
