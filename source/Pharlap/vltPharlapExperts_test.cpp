// Single components: registration of experts, reading of sections, what clients get.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "tests/support/FailingHeap.h"
#include "tests/support/FileSizeLimit.h"
#include "tests/support/SaveCounter.h"
#include "tests/support/TestRegistrar.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

constexpr uint32_t kObjectSize = sizeof(void*) == 8 ? 120 : 76;

// Runs on both classes: what one does the other does, unless a test says so.
template <class Start>
class vltPharlapExpertsReading : public testing::Test {};
using BothClasses = testing::Types<PharlapStart, LinuxStart>;
TYPED_TEST_SUITE(vltPharlapExpertsReading, BothClasses);

std::string OneExpert(const std::string& items) {
  return "[KORComponents]\nE = \"E\"\n[E]\nIdentifier = \"" + GText(1) + "\"\n" + items;
}

// ---- Registration

TEST_IN_CHILD(vltPharlapExperts, OtherTypesAreRefusedAndWriteNothing) {
  Installation i;
  LinuxStart r(i);
  EXPECT_EQ(r->SaveChanges(), S_OK);
  std::string before = ReadBytes(i.database());
  for (int type : {0, 1, 3, 6, 7, -1, 99}) {
    Offered c(static_cast<_vltComponentType>(type), L"X", G(1), L"/x/a.vle");
    EXPECT_EQ(r->RegisterComponent(&c.value), E_FAIL) << type;
  }
  EXPECT_EQ(r->SaveChanges(), S_OK);
  EXPECT_EQ(ReadBytes(i.database()), before);
}

TEST(vltPharlapExperts, TheParentStoresTheBareNameAndIdentifier) {
  Installation i;
  ExpectInChild([&] {
    PharlapStart r(i);
    Offered o(vltComponentObjectExpert, L"Obj", G(1), L"/x/y/a.vle");
    Offered p(vltComponentResourceExpert, L"Res", G(2), L"b.vle", L"PNP\\1");
    EXPECT_EQ(r->RegisterComponent(&o.value), S_OK);
    EXPECT_EQ(r->RegisterComponent(&p.value), S_OK);
    EXPECT_EQ(Find(*r, G(1)), E_INVALIDARG);
  });
  DatabaseText db(i.database());
  EXPECT_EQ(db.items("Obj"), (DatabaseText::Items{{"Identifier", "\"" + GText(1) + "\""},
                                                  {"FileName", "\"a.vle\""}}));
  EXPECT_EQ(db.items("Res"), (DatabaseText::Items{{"Identifier", "\"" + GText(2) + "\""},
                                                  {"FileName", "\"b.vle\""},
                                                  {"PnP", R"("PNP\\1")"}}));
  EXPECT_EQ(db.quoted("KORComponents", "Obj"), "Obj");
}

TEST(vltPharlapExperts, TheNextStartPutsABareNameWhereExpertsAre) {
  Installation i;
  ExpectInChild([&] {
    LinuxStart r(i);
    Offered o(vltComponentObjectExpert, L"Obj", G(1), L"/x/y/a.vle");
    EXPECT_EQ(r->RegisterComponent(&o.value), S_OK);
  });
  EXPECT_EQ(DatabaseText(i.database()).quoted("Obj", "FileName"), "a.vle");
  SaveCounter saves(i.root(), "vlt.vlr");
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_EQ(saves.count(), 2);  // the built-in dictionary and the rewritten name
    Received c;
    ASSERT_EQ(r->GetComponent(G(1), &c.value), S_OK);
    EXPECT_EQ(c.file(), Wide(i.root()) + L"/Experts/a.vle");
  });
  EXPECT_EQ(DatabaseText(i.database()).quoted("Obj", "FileName"), i.root() + "/Experts/a.vle");
  ASSERT_EQ(StartOnce(i), 0);
  EXPECT_EQ(saves.count(), 1);  // the built-in dictionary alone
}

TEST_IN_CHILD(vltPharlapExperts, TheCopyInMemoryGetsTheBareName) {
  Installation i;
  i.addResourceExpert("E", "Res", GText(1), "old");
  LinuxStart r(i);
  Offered o(vltComponentResourceExpert, L"Renamed", G(1), L"/x/y/a.vle", L"new");
  EXPECT_EQ(r->RegisterComponent(&o.value), S_OK);
  Received c;
  ASSERT_EQ(r->GetComponent(G(1), &c.value), S_OK);
  EXPECT_EQ(c.name(), L"Renamed");
  EXPECT_EQ(c.file(), L"a.vle");
  EXPECT_EQ(c.pnp(), L"new");
}

TEST_IN_CHILD(vltPharlapExperts, AFailedSaveIsTheResultAndMemoryIsUpToDateAllTheSame) {
  Installation i;
  i.addObjectExpert("E", "Obj", GText(1));
  LinuxStart r(i);
  FileSizeLimit full(16);
  Offered o(vltComponentObjectExpert, L"Obj", G(1), L"/x/new.vle");
  EXPECT_EQ(r->RegisterComponent(&o.value), E_FAIL);
  Received c;
  ASSERT_EQ(r->GetComponent(G(1), &c.value), S_OK);
  EXPECT_EQ(c.file(), L"new.vle");
}

// The record in memory is of another type: nothing of the other variant may be touched.
TEST_IN_CHILD(vltPharlapExperts, ARecordOfAnotherTypeUnderTheSameIdentifierDoesNoHarm) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "prefix");
  i.addResourceExpert("E", "Res", GText(2), "pnp");
  LinuxStart r(i);
  Offered a(vltComponentResourceExpert, L"A", G(1), L"/x/a.vle", L"other");
  Offered b(vltComponentDataDictionary, L"B", G(2), L"/x/b", L"other");
  EXPECT_EQ(r->RegisterComponent(&a.value), S_OK);
  EXPECT_EQ(r->RegisterComponent(&b.value), S_OK);
  Received dictionary, expert;
  ASSERT_EQ(r->GetComponent(G(1), &dictionary.value), S_OK);
  ASSERT_EQ(r->GetComponent(G(2), &expert.value), S_OK);
  EXPECT_EQ(dictionary.name(), L"A");
  EXPECT_EQ(dictionary.file(), L"a.vle");
  EXPECT_EQ(dictionary.prefix(), L"prefix");
  EXPECT_EQ(expert.name(), L"B");
  EXPECT_EQ(expert.file(), L"/x/b");
  EXPECT_EQ(expert.pnp(), L"pnp");
}

// ---- Reading

TYPED_TEST(vltPharlapExpertsReading, TheStampIsThatOfTheObject) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "d");
  i.addObjectExpert("E", "Obj", GText(2));
  i.addResourceExpert("R", "Res", GText(3), "PNP");
  ExpectInChild([&] {
    TypeParam r(i);
    struct Row {
      uint32_t n;
      _vltComponentType type;
      uint32_t version;
    };
    for (const Row& row :
         {Row{1, vltComponentDataDictionary, 2}, Row{2, vltComponentObjectExpert, 3},
          Row{3, vltComponentResourceExpert, 3}}) {
      Received c;
      ASSERT_EQ(r->GetComponent(G(row.n), &c.value), S_OK);
      EXPECT_EQ(c.value.size, kObjectSize);
      EXPECT_EQ(c.value.type, row.type);
      EXPECT_EQ(c.value.version, row.version);
      const unsigned char zero[8] = {};
      EXPECT_EQ(memcmp(c.value.opaqueQuad, zero, 8), 0);
      EXPECT_EQ(c.value.opaqueWord, 0);
    }
  });
}

TYPED_TEST(vltPharlapExpertsReading, MissingAndEmptyNumbersHaveTheirDefaults) {
  Installation i;
  i.addBundle("Data Dictionaries", "A.framework",
              "[KORComponents]\nA = \"A\"\n[A]\nIdentifier = \"" + GText(1) +
                  "\"\nSchemaVersion = \"\"\nLastInstalledSchemaVersion = \"\"\n");
  i.addBundle("Data Dictionaries", "B.framework",
              "[KORComponents]\nB = \"B\"\n[B]\nIdentifier = \"" + GText(2) +
                  "\"\nSchemaVersion = 4294967295\nLastInstalledSchemaVersion = 7\n");
  ExpectInChild([&] {
    TypeParam r(i);
    Received a, b;
    ASSERT_EQ(r->GetComponent(G(1), &a.value), S_OK);
    EXPECT_EQ(a.value.dictionary.schemaVersion, 0u);
    EXPECT_EQ(a.value.dictionary.fragmentRegistered, 23u);
    EXPECT_EQ(a.value.dictionary.lastInstalledSchemaVersion, 0xFFFFFFFFu);
    EXPECT_EQ(a.value.fileName, nullptr);
    EXPECT_EQ(a.value.dictionary.prefix, nullptr);
    EXPECT_EQ(a.value.dictionary.auxString1, nullptr);
    EXPECT_EQ(a.value.dictionary.auxString2, nullptr);
    ASSERT_EQ(r->GetComponent(G(2), &b.value), S_OK);
    EXPECT_EQ(b.value.dictionary.schemaVersion, 4294967295u);
    EXPECT_EQ(b.value.dictionary.lastInstalledSchemaVersion, 7u);
  });
}

TYPED_TEST(vltPharlapExpertsReading, KeysDecideTheType) {
  const std::pair<const char*, _vltComponentType> rows[] = {
      {"SchemaVersion = 1\nPnP = \"p\"\n", vltComponentDataDictionary},
      {"schemaversion = 1\n", vltComponentDataDictionary},
      {"PnP = \"\"\n", vltComponentResourceExpert},
      {"Prefix = \"x\"\n", vltComponentObjectExpert}};
  for (const auto& row : rows) {
    const char* items = row.first;
    _vltComponentType type = row.second;
    Installation i;
    i.addBundle("Experts", "E.vle", OneExpert(items));
    ExpectInChild([&] {
      TypeParam r(i);
      Received c;
      ASSERT_EQ(r->GetComponent(G(1), &c.value), S_OK);
      EXPECT_EQ(c.value.type, type) << items;
      if (type == vltComponentResourceExpert) {
        EXPECT_EQ(c.pnp(), L"");
      }
    });
  }
}

TYPED_TEST(vltPharlapExpertsReading, BadIdentifiersStandUnderTheNullOne) {
  for (const char* identifier : {"words", "", "{790F6A90-E0D8-11D3-AA15-005004D131E}"}) {
    Installation i;
    i.addBundle("Experts", "E.vle",
                std::string("[KORComponents]\nE = \"E\"\n[E]\nIdentifier = \"") + identifier +
                    "\"\nFileName = \"E\"\n");
    ExpectInChild([&] {
      TypeParam r(i);
      Received c;
      ASSERT_EQ(r->GetComponent(GUID_NULL, &c.value), S_OK) << identifier;
      EXPECT_EQ(c.name(), L"E");
    });
  }
}

TYPED_TEST(vltPharlapExpertsReading, AListedNameWithoutASectionIsAnObjectExpertWithoutFile) {
  Installation i;
  i.addBundle("Experts", "E.vle", "[KORComponents]\nNowhere = \"Nowhere\"\n");
  ExpectInChild([&] {
    TypeParam r(i);
    Received c;
    ASSERT_EQ(r->GetComponent(GUID_NULL, &c.value), S_OK);
    EXPECT_EQ(c.value.type, vltComponentObjectExpert);
    EXPECT_EQ(c.value.fileName, nullptr);
    EXPECT_EQ(c.name(), L"Nowhere");
  });
}

TYPED_TEST(vltPharlapExpertsReading, OfTwoSectionsWithOneIdentifierTheLaterIsKept) {
  Installation i;
  i.addBundle("Experts", "E.vle",
              "[KORComponents]\nA = \"A\"\nB = \"B\"\n[B]\nIdentifier = \"" + GText(1) +
                  "\"\nPnP = \"p\"\nFileName = \"B\"\n[A]\nIdentifier = \"{" + GText(1) +
                  "}\"\nFileName = \"A\"\n");
  ExpectInChild([&] {
    TypeParam r(i);
    Received c;
    ASSERT_EQ(r->GetComponent(G(1), &c.value), S_OK);
    EXPECT_EQ(c.name(), L"B");
    EXPECT_EQ(Names(*r, vltComponentObjectExpert).size(), 0u);
  });
}

TYPED_TEST(vltPharlapExpertsReading, FileNamesWithAnySeparatorStayAsTheyAre) {
  Installation i;
  i.addBundle("Experts", "E.vle", OneExpert("FileName = \"dir/E.x\"\n"));
  i.addBundle("Experts", "F.vle",
              "[KORComponents]\nF = \"F\"\n[F]\nIdentifier = \"" + GText(2) +
                  "\"\nFileName = \"dir\\\\F.x\"\n");
  ExpectInChild([&] {
    TypeParam r(i);
    Received e, f;
    ASSERT_EQ(r->GetComponent(G(1), &e.value), S_OK);
    EXPECT_EQ(e.file(), L"dir/E.x");
    ASSERT_EQ(r->GetComponent(G(2), &f.value), S_OK);
    EXPECT_EQ(f.file(), L"dir\\F.x");
  });
}

// An empty name is a name for an object expert; for a resource expert the two classes differ.
template <class Start>
std::wstring FileOfEmpty(const Installation& i, GUID id) {
  TempDir out;
  ExpectInChild([&] {
    Start r(i);
    Received c;
    ASSERT_EQ(r->GetComponent(id, &c.value), S_OK);
    std::wstring file = c.file();
    WriteBytes(out / "file", std::string(file.begin(), file.end()));
  });
  return Wide(ReadBytes(out / "file"));
}

TEST(vltPharlapExperts, AnEmptyFileNameDependsOnTypeAndClass) {
  Installation i;
  ExpectInChild([&] {
    LinuxStart r(i);
    CvlIniMgr& db = r->database();
    for (const char* name : {"Obj", "Res"}) {
      db.SetItem("KORComponents", name, name, true);
      db.SetItem(name, "FileName", "", true);
    }
    db.SetItem("Obj", "Identifier", GText(1).c_str(), true);
    db.SetItem("Res", "Identifier", GText(2).c_str(), true);
    db.SetItem("Res", "PnP", "p", true);
    EXPECT_EQ(r->SaveChanges(), S_OK);
  });
  std::wstring experts = Wide(i.root()) + L"/Experts/";
  EXPECT_EQ(FileOfEmpty<LinuxStart>(i, G(2)), L"(null)");
  EXPECT_EQ(DatabaseText(i.database()).raw("Res", "FileName"), "\"\"");
  EXPECT_EQ(FileOfEmpty<LinuxStart>(i, G(1)), experts);
  EXPECT_EQ(DatabaseText(i.database()).quoted("Obj", "FileName"), i.root() + "/Experts/");
  EXPECT_EQ(FileOfEmpty<PharlapStart>(i, G(2)), experts);
}

// ---- What clients get

TEST_IN_CHILD(vltPharlapExpertsClients, GetComponentAnswersByItsCodes) {
  Installation i;
  i.addResourceExpert("R", "Res", GText(3), "PNP");
  LinuxStart r(i);
  EXPECT_EQ(r->GetComponent(G(3), nullptr), E_POINTER);
  Received a, b;
  EXPECT_EQ(r->GetComponent(G(4), &a.value), E_INVALIDARG);
  ASSERT_EQ(r->GetComponent(G(3), &a.value), S_OK);
  ASSERT_EQ(r->GetComponent(G(3), &b.value), S_OK);
  EXPECT_NE(a.value.resource.pnp, b.value.resource.pnp);
  EXPECT_EQ(a.pnp(), L"PNP");
}

TEST_IN_CHILD(vltPharlapExpertsClients, DuplicateCopiesTheTextsOfTheType) {
  Installation i;
  LinuxStart r(i);
  wchar_t one[] = L"one", two[] = L"two";
  Offered d(vltComponentDataDictionary, L"N", G(1), L"/f", L"p");
  d.value.dictionary.auxString1 = one;
  d.value.dictionary.auxString2 = two;
  d.value.opaqueWord = 77;
  Received copy;
  EXPECT_EQ(r->Duplicate(&copy.value, &d.value), S_OK);
  EXPECT_STREQ(copy.value.dictionary.auxString1, L"one");
  EXPECT_STREQ(copy.value.dictionary.auxString2, L"two");
  EXPECT_EQ(copy.prefix(), L"p");
  EXPECT_NE(copy.value.dictionary.auxString1, one);
  EXPECT_EQ(copy.value.opaqueWord, 77);
  EXPECT_EQ(copy.value.version, 3u);
  Offered e(vltComponentObjectExpert, L"N", G(1), L"/f");
  e.value.name = nullptr;
  e.value.expert = {5, 6};
  Received expert;
  EXPECT_EQ(r->Duplicate(&expert.value, &e.value), S_OK);
  EXPECT_EQ(expert.value.name, nullptr);
  EXPECT_EQ(expert.value.expert.expertWord1, 6);
}

TEST_IN_CHILD(vltPharlapExpertsClients, EnumComponentsWantsAPlaceAndLeavesItOnFailure) {
  Installation i;
  LinuxStart r(i);
  EXPECT_EQ(r->EnumComponents(vltComponentDataDictionary, nullptr), E_POINTER);
  auto* mark = reinterpret_cast<IvltEnumComponent*>(&r);
  IvltEnumComponent* enumerator = mark;
  bool failed = false;
  for (int nth = 1; nth < 20 && !failed; ++nth) {
    enumerator = mark;
    FailAllocation fail(nth);
    try {
      if (r->EnumComponents(vltComponentDataDictionary, &enumerator) == S_OK) {
        enumerator->Release();
        break;
      }
      failed = true;
    } catch (const std::bad_alloc&) {
    }
    EXPECT_EQ(enumerator, mark);
  }
  EXPECT_TRUE(failed);
  EXPECT_EQ(r->AddRef(), 2u);  // the failed ones gave their references back
  EXPECT_EQ(r->Release(), 1u);
}

// A bundle that comes while the process runs is known to the next one only.
TEST(vltPharlapExpertsClients, ScanLooksAtNothing) {
  Installation i;
  ExpectInChild([&] {
    LinuxStart r(i);
    i.addObjectExpert("E", "Late", GText(2));
    EXPECT_EQ(r->Scan(), S_OK);
    EXPECT_EQ(Find(*r, G(2)), E_INVALIDARG);
    EXPECT_TRUE(Names(*r, vltComponentObjectExpert).empty());
  });
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_EQ(Find(*r, G(2)), S_OK);
  });
}

}  // namespace
}  // namespace vlt::test
