#include "source/Pharlap/vltPharlapRegistrar.h"

#include <dirent.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "source/Common/vltFileSecurity.h"
#include "source/Pharlap/registrarText.h"
#include "tests/support/SaveCounter.h"
#include "tests/support/TestRegistrar.h"
#include "vlloader/source/vlloader.h"
#include "zt/fnd/Exception.h"

namespace vlt::test {
namespace {

constexpr uid_t kNobody = 65534;

std::vector<std::string> Entries(const std::string& directory) {
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(directory)) {
    names.push_back(entry.path().filename());
  }
  std::sort(names.begin(), names.end());
  return names;
}

// Other users must reach the installation below the test's own directories.
void OpenUp(const Installation& i) {
  chmod(std::filesystem::path(i.root()).parent_path().c_str(), 0755);
  chmod(getenv("ZTFNDTMPSHAREDFILEDIR"), 0777);
}

// ---- GUID texts

template <class Char>
void ExpectStripped(const std::basic_string<Char>& text, HRESULT result,
                    const std::basic_string<Char>& left) {
  std::basic_string<Char> buffer = text + Char();
  EXPECT_EQ(CvltPharlapRegistrar::StripBracesFromGuid(buffer.data()), result);
  EXPECT_EQ(std::basic_string<Char>(buffer.c_str()), left);
}

TEST(vltPharlapRegistrarGuidText, BracesAreCutFromTheWholeFormOnly) {
  std::string bare = GText(7);
  struct Row {
    std::string text;
    HRESULT result;
    std::string left;
  };
  const Row rows[] = {{"{" + bare + "}", S_OK, bare},
                      {bare, S_FALSE, bare},
                      {"", S_FALSE, ""},
                      {"{" + bare + "}x", S_FALSE, "{" + bare + "}x"},
                      {"(" + bare + "}", E_FAIL, "(" + bare + "}"},
                      {"{" + bare + ")", E_FAIL, "{" + bare + ")"},
                      {"{" + std::string(36, '}') + "}", S_OK, std::string(36, '}')}};
  for (const Row& row : rows) {
    ExpectStripped(row.text, row.result, row.left);
    ExpectStripped(Wide(row.text), row.result, Wide(row.left));
  }
  EXPECT_EQ(CvltPharlapRegistrar::StripBracesFromGuid(static_cast<char*>(nullptr)), E_POINTER);
  EXPECT_EQ(CvltPharlapRegistrar::StripBracesFromGuid(static_cast<wchar_t*>(nullptr)), E_POINTER);
}

// ---- Interfaces

TEST_IN_CHILD(vltPharlapRegistrarInterfaces, EachAnswersAndForwardsItsReferences) {
  Installation i;
  LinuxStart r(i);
  void* out = nullptr;
  for (const GUID& iid : {IID_IUnknown, IID_IvltRegistrar2, IID_IvltRegistrar}) {
    EXPECT_EQ(r->QueryInterface(iid, &out), S_OK);
    EXPECT_EQ(out, static_cast<IvltRegistrar2*>(&*r));
    EXPECT_EQ(r->Release(), 1u);
  }
  for (const GUID& iid :
       {IID_IvltPharlapRegistrarEx, IID_IvltDynamicRegistrar, IID_IvltDowngradeRegistrar}) {
    ASSERT_EQ(r->QueryInterface(iid, &out), S_OK);
    auto* side = static_cast<IUnknown*>(out);
    EXPECT_EQ(side->AddRef(), 3u);
    void* back = nullptr;
    EXPECT_EQ(side->QueryInterface(IID_IUnknown, &back), S_OK);
    EXPECT_EQ(back, static_cast<IvltRegistrar2*>(&*r));
    EXPECT_EQ(r->Release(), 3u);
    EXPECT_EQ(side->Release(), 2u);
    EXPECT_EQ(side->Release(), 1u);
  }
  EXPECT_EQ(r->QueryInterface(IID_IvltEnumComponent, &out), E_NOINTERFACE);
  EXPECT_EQ(out, nullptr);
  EXPECT_EQ(r->QueryInterface(IID_IUnknown, nullptr), E_POINTER);
}

// The side interfaces are called through their own tables, which must lead to the registrar's operations.
TEST_IN_CHILD(vltPharlapRegistrarInterfaces, SideInterfacesReachTheirOperations) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "d");
  LinuxStart r(i);
  void* out = nullptr;
  ASSERT_EQ(r->QueryInterface(IID_IvltPharlapRegistrarEx, &out), S_OK);
  EXPECT_EQ(static_cast<IvltPharlapRegistrarEx*>(out)->ResetDDUpdatedFlags(), S_OK);
  static_cast<IvltPharlapRegistrarEx*>(out)->Release();
  ASSERT_EQ(r->QueryInterface(IID_IvltDowngradeRegistrar, &out), S_OK);
  auto* downgrade = static_cast<IvltDowngradeRegistrar*>(out);
  unsigned count = 5;
  wchar_t** paths = nullptr;
  EXPECT_EQ(downgrade->GetPreviousDictionaries(nullptr, &count, &paths), S_FALSE);
  EXPECT_EQ(count, 0u);
  EXPECT_EQ(downgrade->RemovePreviousDictionaries(nullptr), S_FALSE);
  downgrade->Release();
  EXPECT_EQ(Bound(*r, vltComponentObjectExpert, G(9), VLT_E_NO_COMPONENT).size(), 0u);
}

TEST_IN_CHILD(vltPharlapRegistrarInterfaces, WhatIsNotKeptHereFailsAndTouchesNothing) {
  Installation i;
  LinuxStart r(i);
  wchar_t here[] = L"x";
  wchar_t* text = here;
  unsigned number = 7;
  EXPECT_EQ(r->GetSDKPath(&text), E_FAIL);
  EXPECT_EQ(r->GetSDKPath(nullptr), E_FAIL);
  EXPECT_EQ(r->SetSDKPath(L"/x"), E_FAIL);
  EXPECT_EQ(r->GetStorageClientCacheSize(&number), E_FAIL);
  EXPECT_EQ(r->SetStorageClientCacheSize(1), E_FAIL);
  EXPECT_EQ(r->GetSnapshotPath(&text), E_FAIL);
  EXPECT_EQ(r->SetSnapshotPath(L"/x"), E_FAIL);
  EXPECT_EQ(r->UnregisterComponent(kVltdd), E_FAIL);
  EXPECT_EQ(text, here);
  EXPECT_EQ(number, 7u);
  EXPECT_EQ(Find(*r, kVltdd), S_OK);
}

// ---- Settings

TEST_IN_CHILD(vltPharlapRegistrarSettings, SchemaVersionIsWrittenWhenItDiffersOnly) {
  Installation i;
  SaveCounter saves(i.root(), "vlt.vlr");
  LinuxStart r(i);
  EXPECT_EQ(r->database().EraseItem("KOR", "SchemaVersion"), S_OK);
  EXPECT_EQ(r->SaveChanges(), S_OK);
  EXPECT_FALSE(DatabaseText(i.database()).raw("KOR", "SchemaVersion"));
  int before = saves.count();
  EXPECT_EQ(r->SetSchemaVersion(0), S_OK);
  EXPECT_EQ(saves.count(), before + 1);
  EXPECT_EQ(DatabaseText(i.database()).raw("KOR", "SchemaVersion"), "0");
  EXPECT_EQ(r->SetSchemaVersion(0), S_OK);
  EXPECT_EQ(saves.count(), before + 1);
  EXPECT_EQ(r->SetSchemaVersion(0xFFFFFFFF), S_OK);
  EXPECT_EQ(DatabaseText(i.database()).raw("KOR", "SchemaVersion"), "4294967295");
  unsigned version = 7;
  EXPECT_EQ(r->GetSchemaVersion(&version), S_OK);
  EXPECT_EQ(version, 0xFFFFFFFFu);
  EXPECT_EQ(r->GetSchemaVersion(nullptr), E_POINTER);
  // Equal as numbers is equal.
  r->database().SetItem("KOR", "SchemaVersion", "0012", true);
  before = saves.count();
  EXPECT_EQ(r->SetSchemaVersion(12), S_OK);
  EXPECT_EQ(saves.count(), before);
}

TEST_IN_CHILD(vltPharlapRegistrarSettings, WhatCannotBeReadIsTheDefault) {
  Installation i;
  LinuxStart r(i);
  unsigned number = 7;
  EXPECT_EQ(r->GetStorageServerCacheSize(&number), S_OK);
  EXPECT_EQ(number, 33554432u);
  EXPECT_EQ(r->GetStorageServerCacheSize(nullptr), E_POINTER);
  r->database().SetItem("KOR", "CacheSize", "", true);
  number = 7;
  EXPECT_EQ(r->GetStorageServerCacheSize(&number), S_OK);
  EXPECT_EQ(number, 33554432u);
  r->database().SetItem("KOR", "CacheSize", "words", true);
  EXPECT_EQ(r->GetStorageServerCacheSize(&number), S_OK);
  EXPECT_EQ(number, 0u);
  r->database().SetItem("KOR", "SchemaVersion", "", true);
  number = 7;
  EXPECT_EQ(r->GetSchemaVersion(&number), S_OK);
  EXPECT_EQ(number, 0u);
}

TEST(vltPharlapRegistrarSettings, CacheSizeIsWrittenEachTimeAndOutlivesTheProcess) {
  Installation i;
  SaveCounter saves(i.root(), "vlt.vlr");
  ExpectInChild([&] {
    LinuxStart r(i);
    int before = saves.count();
    EXPECT_EQ(r->SetStorageServerCacheSize(4096), S_OK);
    EXPECT_EQ(r->SetStorageServerCacheSize(4096), S_OK);
    EXPECT_EQ(saves.count(), before + 2);
  });
  EXPECT_EQ(DatabaseText(i.database()).raw("KOR", "CacheSize"), "4096");
  EXPECT_EQ(Hex(ReadBytes(i.sidecar())), Md5Sum(i.database()));
  ExpectInChild([&] {
    LinuxStart r(i);
    unsigned number = 0;
    EXPECT_EQ(r->GetStorageServerCacheSize(&number), S_OK);
    EXPECT_EQ(number, 4096u);
  });
}

TEST(vltPharlapRegistrarSettings, SchemaVersionIsZeroAgainAtEachStart) {
  Installation i;
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_EQ(r->SetSchemaVersion(9), S_OK);
  });
  ExpectInChild([&] {
    LinuxStart r(i);
    unsigned version = 7;
    EXPECT_EQ(r->GetSchemaVersion(&version), S_OK);
    EXPECT_EQ(version, 0u);
  });
}

TEST_IN_CHILD(vltPharlapRegistrarSettings, ConfigurationPathForms) {
  Installation i;
  LinuxStart r(i);
  std::wstring data = Wide(i.root()) + L"/Data/";
  auto get = [&] {
    wchar_t* path = nullptr;
    HRESULT result = r->GetConfigurationPath(&path);
    return Path(result, path);
  };
  EXPECT_EQ(get(), data + L"config3.vlt");
  EXPECT_EQ(r->GetConfigurationPath(nullptr), E_POINTER);
  EXPECT_EQ(r->SetConfigurationPath(nullptr), E_POINTER);
  r->database().SetItem("KOR", "ConfigFile", "CONFIG3.VLT", true);
  EXPECT_EQ(get(), data + L"CONFIG3.VLT");
  r->database().SetItem("KOR", "ConfigFile", "other.vlt", true);
  EXPECT_EQ(get(), L"other.vlt");
  r->database().SetItem("KOR", "ConfigFile", "", true);
  EXPECT_EQ(get(), L"/Library/Application Support/Zentrex/KOR/Data/config3.vlt");
  r->database().EraseItem("KOR", "ConfigFile");
  EXPECT_EQ(get(), L"/Library/Application Support/Zentrex/KOR/Data/config3.vlt");
  EXPECT_EQ(r->SetConfigurationPath(L"Config3.VLT"), S_OK);
  EXPECT_EQ(get(), data + L"Config3.VLT");
}

TEST_IN_CHILD(vltPharlapRegistrarSettings, ConfigurationPathIsWrittenWhenItDiffersBeyondCase) {
  Installation i;
  SaveCounter saves(i.root(), "vlt.vlr");
  LinuxStart r(i);
  EXPECT_EQ(r->SetConfigurationPath(L"/A/\"b\"\\c.vlt"), S_OK);
  int before = saves.count();
  EXPECT_EQ(r->SetConfigurationPath(L"/a/\"B\"\\C.VLT"), S_OK);
  EXPECT_EQ(saves.count(), before);
  EXPECT_EQ(DatabaseText(i.database()).raw("KOR", "ConfigFile"), R"("/A/\"b\"\\c.vlt")");
  EXPECT_EQ(r->SetConfigurationPath(L"relative"), S_OK);
  EXPECT_EQ(saves.count(), before + 1);
  EXPECT_EQ(DatabaseText(i.database()).raw("KOR", "ConfigFile"), "\"relative\"");
}

// The next start puts its own path back, as the stored one differs from it.
TEST(vltPharlapRegistrarSettings, ConfigurationPathIsThatOfTheRootAtEachStart) {
  Installation i;
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_EQ(r->SetConfigurationPath(L"/elsewhere"), S_OK);
  });
  EXPECT_EQ(StartOnce(i), 0);
  EXPECT_EQ(DatabaseText(i.database()).quoted("KOR", "ConfigFile"), i.root() + "/Data/config3.vlt");
}

TEST_IN_CHILD(vltPharlapRegistrarSettings, ALongConfigurationPathIsKeptWhole) {
  Installation i;
  std::wstring path = L"/" + std::wstring(70000, L'p');
  LinuxStart r(i);
  EXPECT_EQ(r->SetConfigurationPath(path.c_str()), S_OK);
  wchar_t* got = nullptr;
  HRESULT result = r->GetConfigurationPath(&got);
  EXPECT_EQ(Path(result, got), path);
}

// A bare name in a process that has no right to make the missing data directory.
TEST(vltPharlapRegistrarSettings, ABareNameIsHandedOutEvenWithAFailure) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs root, to become a user without rights";
  Installation i;
  OpenUp(i);
  ASSERT_EQ(StartOnce(i), 0);
  ASSERT_TRUE(std::filesystem::remove(i.root() + "/Data"));
  ExpectInChild([&] {
    ASSERT_EQ(setresuid(kNobody, kNobody, kNobody), 0);
    LinuxStart r(i);
    r->database().SetItem("KOR", "ConfigFile", "config3.vlt", true);
    wchar_t* path = nullptr;
    HRESULT result = r->GetConfigurationPath(&path);
    EXPECT_EQ(Path(result, path, E_FAIL), Wide(i.root()) + L"/Data/config3.vlt");
  });
}

// ---- Start

TEST(vltPharlapRegistrarStart, MakesDirectoriesAndFilesOpenToAllWhateverTheUmask) {
  Installation i;
  ScopedUmask mask(077);
  ASSERT_EQ(StartOnce(i), 0);
  for (const char* name : {"/Data", "/Data Dictionaries", "/Experts", "/vlt.vlr", "/vlt.vl5"}) {
    EXPECT_EQ(ModeOf(i.root() + name), 0777) << name;
  }
  EXPECT_EQ(Entries(i.root()), (std::vector<std::string>{"Data", "Data Dictionaries", "Experts",
                                                         "vlt.vl5", "vlt.vlr"}));
  EXPECT_EQ(Entries(i.root() + "/Data").size(), 0u);
}

TEST(vltPharlapRegistrarStart, LeavesTheModesOfDirectoriesThatAreThere) {
  Installation i;
  for (const char* name : {"/Data", "/Data Dictionaries", "/Experts"}) {
    ASSERT_EQ(mkdir((i.root() + name).c_str(), 0750), 0);
  }
  ASSERT_EQ(StartOnce(i), 0);
  for (const char* name : {"/Data", "/Data Dictionaries", "/Experts"}) {
    EXPECT_EQ(ModeOf(i.root() + name), 0750) << name;
  }
}

TEST_IN_CHILD(vltPharlapRegistrarStart, WritesTheBuiltInDictionary) {
  Installation i;
  ASSERT_EQ(StartOnce(i), 0);
  DatabaseText db(i.database());
  EXPECT_EQ(db.sections(), (std::vector<std::string>{"KOR", "KORComponents", "vltdd"}));
  std::string file = i.root() + "/Data Dictionaries/vltdd.framework";
  EXPECT_EQ(db.items("vltdd"),
            (DatabaseText::Items{{"Identifier", "\"790F6A90-E0D8-11D3-AA15-005004D131EE\""},
                                 {"FileName", "\"" + file + "\""},
                                 {"SchemaVersion", "0"},
                                 {"FragmentRegistered", "0"},
                                 {"LastInstalledSchemaVersion", "0"},
                                 {"Prefix", "\"vl\""}}));
  LinuxStart r(i);
  Received d;
  ASSERT_EQ(r->GetComponent(kVltdd, &d.value), S_OK);
  EXPECT_EQ(d.value.type, vltComponentDataDictionary);
  EXPECT_EQ(d.value.version, 2u);
  EXPECT_EQ(d.name(), L"vltdd");
  EXPECT_EQ(d.file(), Wide(file));
  EXPECT_EQ(d.prefix(), L"vl");
  EXPECT_EQ(d.value.dictionary.schemaVersion, 0u);
  EXPECT_EQ(d.value.dictionary.lastInstalledSchemaVersion, 0u);
}

TEST(vltPharlapRegistrarStart, WithoutADirectoryTheNamesStayBare) {
  Installation i;
  Installation::setDir("");
  ExpectInChild([&] {
    EXPECT_EQ(GetCurrentVltPath(), nullptr);
    LinuxStart r(i);
    EXPECT_EQ(Find(*r, kVltdd), S_OK);
    wchar_t* path = nullptr;
    HRESULT result = r->GetConfigurationPath(&path);
    EXPECT_EQ(Path(result, path, E_FAIL), L"config3.vlt");
    CvltPharlapRegistrar::RegistrationFiles files;
    EXPECT_EQ(r->FindRegistrationFiles(files), E_FAIL);
    EXPECT_EQ(files.size(), 0u);
  });
  DatabaseText db(i.database());
  EXPECT_EQ(db.quoted("KOR", "ConfigFile"), "config3.vlt");
  EXPECT_EQ(db.quoted("vltdd", "FileName"), "vltdd.framework");
  EXPECT_EQ(Entries(i.root()), (std::vector<std::string>{"vlt.vl5", "vlt.vlr"}));
}

TEST(vltPharlapRegistrarStart, MissingRightsToMakeDirectoriesAreSwallowed) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs root, to become a user without rights";
  Installation i;
  OpenUp(i);
  chmod(i.root().c_str(), 0555);
  TempDir place;
  chmod(place.path().c_str(), 0777);
  ExpectInChild([&] {
    ASSERT_EQ(setresuid(kNobody, kNobody, kNobody), 0);
    Started<AccessibleLinuxRegistrar> r(S(place / "vlt.vlr"), S(i.root()));
    EXPECT_EQ(Find(*r, kVltdd), S_OK);
    CvltPharlapRegistrar::RegistrationFiles files;
    EXPECT_EQ(r->FindRegistrationFiles(files), E_FAIL);
  });
  EXPECT_TRUE(Entries(i.root()).empty());
  EXPECT_EQ(ModeOf(place / "vlt.vlr"), 0777);
}

TEST_IN_CHILD(vltPharlapRegistrarStart, AFileInADirectorysPlaceIsRaisedAndFreesTheLock) {
  Installation i;
  WriteBytes(i.root() + "/Data", "in the way");
  EXPECT_THROW(LinuxStart r(i), zt::fnd::exception::ObjectAlreadyExists);
  EXPECT_EQ(unlink((i.root() + "/Data").c_str()), 0);
  LinuxStart again(i);
  EXPECT_EQ(Find(*again, kVltdd), S_OK);
}

// ---- Freeing

// Whether texts are freed shows to the leak check of InChild, and to AddressSanitizer if twice.
TEST_IN_CHILD(vltPharlapRegistrarStart, ItsEndFreesTheTextsOfComponentsThatKeepTheirsElsewhere) {
  Installation i;
  i.addResourceExpert("M", "Motion Expert Driver", GText(4), "PNP\\4");
  LinuxStart r(i);
  Received found;
  ASSERT_EQ(r->GetComponent(G(4), &found.value), S_OK);
  EXPECT_EQ(found.name(), L"Motion Expert Driver");
}

}  // namespace
}  // namespace vlt::test
