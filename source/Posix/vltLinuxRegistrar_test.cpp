#include "source/Posix/vltLinuxRegistrar.h"

#include <gtest/gtest.h>

#include <algorithm>

#include "tests/support/SaveCounter.h"
#include "tests/support/TestRegistrar.h"
#include "zt/fnd/Exception.h"

namespace vlt::test {
namespace {

std::string B(uint32_t n) { return "{" + GText(n) + "}"; }

bool Same(const std::vector<GUID>& found, const std::vector<GUID>& wanted) {
  return found == wanted;
}

// Two experts with one file, and the classes of both in the text of either.
std::string TwoExperts(const std::string& first, const std::string& second) {
  std::string text = "[KORComponents]\nA = \"A\"\nB = \"B\"\n";
  text += "[A]\nIdentifier = \"" + GText(1) + "\"\nFileName = \"One\"\n";
  if (!first.empty()) text += "BINDING_CLASSES = \"" + first + "\"\n";
  text += "[B]\nIdentifier = \"" + GText(2) + "\"\nFileName = \"One\"\nPnP = \"p\"\n";
  if (!second.empty()) text += "BINDING_CLASSES = \"" + second + "\"\n";
  return text;
}

// ---- Filling the maps

TEST_IN_CHILD(vltLinuxRegistrar, ClassesOfBothTypesAnswerByType) {
  Installation i;
  i.addObjectExpert("O", "Obj", GText(1), B(1) + ":2:" + B(8) + ":" + B(9));
  i.addResourceExpert("R", "Res", GText(2), "PNP", B(2) + ":1:" + B(8));
  LinuxStart r(i);
  EXPECT_TRUE(Same(Bound(*r, vltComponentObjectExpert, G(8)), {G(1)}));
  EXPECT_TRUE(Same(Bound(*r, vltComponentObjectExpert, G(9)), {G(1)}));
  EXPECT_TRUE(Same(Bound(*r, vltComponentResourceExpert, G(8)), {G(2)}));
  Bound(*r, vltComponentResourceExpert, G(9), VLT_E_NO_COMPONENT);
}

TEST_IN_CHILD(vltLinuxRegistrar, AClassOfTwoExpertsAnswersWithBoth) {
  Installation i;
  i.addObjectExpert("O", "Obj", GText(1), B(1) + ":1:" + B(8));
  i.addObjectExpert("P", "Obj2", GText(2), B(2) + ":1:" + B(8));
  LinuxStart r(i);
  std::vector<GUID> found = Bound(*r, vltComponentObjectExpert, G(8));
  std::sort(found.begin(), found.end());
  EXPECT_TRUE(Same(found, {G(1), G(2)}));
}

TEST_IN_CHILD(vltLinuxRegistrar, OtherTypesAndNullsAreToldApart) {
  Installation i;
  LinuxStart r(i);
  for (int type : {0, 2, 6, 7, 99}) {
    unsigned count = 7;
    GUID* components = reinterpret_cast<GUID*>(&count);
    EXPECT_EQ(r->GetComponentsForBindingClass(static_cast<_vltComponentType>(type), G(8), &count,
                                              &components),
              static_cast<HRESULT>(0x80040306));
    EXPECT_EQ(count, 0u);
    EXPECT_EQ(components, nullptr);
  }
  unsigned count = 7;
  GUID* components = nullptr;
  EXPECT_EQ(r->GetComponentsForBindingClass(vltComponentObjectExpert, G(8), nullptr, &components),
            E_POINTER);
  EXPECT_EQ(r->GetComponentsForBindingClass(vltComponentObjectExpert, G(8), &count, nullptr),
            E_POINTER);
  EXPECT_EQ(count, 7u);
}

TEST_IN_CHILD(vltLinuxRegistrar, TwoExpertsOfOneFileShareOneTable) {
  Installation i;
  i.addBundle("Experts", "One.vle", TwoExperts(B(1) + ":1:" + B(8), B(2) + ":1:" + B(9)));
  LinuxStart r(i);
  EXPECT_EQ(r->m_bindingClassesByFile.size(), 1u);
  EXPECT_TRUE(Same(Bound(*r, vltComponentObjectExpert, G(8)), {G(1)}));
  EXPECT_TRUE(Same(Bound(*r, vltComponentResourceExpert, G(9)), {G(2)}));
}

TEST_IN_CHILD(vltLinuxRegistrar, TheTextOfOneComponentMaySpeakForAnother) {
  Installation i;
  i.addBundle("Experts", "One.vle",
              TwoExperts("", B(2) + ":1:" + B(9) + ":" + B(1) + ":1:" + B(8)));
  LinuxStart r(i);
  EXPECT_TRUE(Same(Bound(*r, vltComponentObjectExpert, G(8)), {G(1)}));
  EXPECT_TRUE(Same(Bound(*r, vltComponentResourceExpert, G(9)), {G(2)}));
}

// By base name, over all components: another directory makes another table of the same text.
TEST_IN_CHILD(vltLinuxRegistrar, TextsAreFoundByBaseName) {
  Installation i;
  i.addBundle("Experts", "a.vle",
              "[KORComponents]\nA = \"A\"\n[A]\nIdentifier = \"" + GText(1) +
                  "\"\nFileName = \"/one/X.vle\"\n");
  i.addBundle("Experts", "b.vle",
              "[KORComponents]\nB = \"B\"\n[B]\nIdentifier = \"" + GText(2) +
                  "\"\nFileName = \"/two/x.VLE\"\nBINDING_CLASSES = \"" + B(1) + ":1:" + B(8) +
                  "\"\n");
  LinuxStart r(i);
  EXPECT_EQ(r->m_bindingClassesByFile.size(), 2u);
  EXPECT_TRUE(Same(Bound(*r, vltComponentObjectExpert, G(8)), {G(1)}));
}

TEST_IN_CHILD(vltLinuxRegistrar, AComponentOutsideItsFilesTableEntersNothing) {
  Installation i;
  i.addObjectExpert("O", "Obj", GText(1), B(5) + ":1:" + B(8));
  LinuxStart r(i);
  EXPECT_EQ(Find(*r, G(1)), S_OK);
  EXPECT_EQ(r->m_bindingClassesByFile.size(), 1u);
  Bound(*r, vltComponentObjectExpert, G(8), VLT_E_NO_COMPONENT);
  Offered o(vltComponentObjectExpert, L"Obj", G(1), Wide(i.root()) + L"/Experts/O.vle");
  EXPECT_EQ(r->PopulateBindingClasses(&o.value), S_OK);
}

TEST_IN_CHILD(vltLinuxRegistrar, WithoutATextAnExpertIsAnExpert) {
  Installation i;
  i.addBundle("Experts", "O.vle",
              "[KORComponents]\nObj = \"Obj\"\n[Obj]\nIdentifier = \"" + GText(1) +
                  "\"\nFileName = \"O\"\nBINDING_CLASSES = \"\"\n");
  i.addObjectExpert("P", "Plain", GText(2));
  LinuxStart r(i);
  EXPECT_EQ(Find(*r, G(1)), S_OK);
  EXPECT_EQ(Find(*r, G(2)), S_OK);
  EXPECT_TRUE(r->m_bindingClassesByFile.empty());
  Offered o(vltComponentObjectExpert, L"Obj", G(1), Wide(i.root()) + L"/Experts/O.vle");
  EXPECT_EQ(r->PopulateBindingClasses(&o.value), E_FAIL);
  o.value.fileName = nullptr;
  EXPECT_EQ(r->PopulateBindingClasses(&o.value), E_FAIL);
}

// The text is cut at 1023 bytes, in the middle of a GUID: what is whole counts.
TEST_IN_CHILD(vltLinuxRegistrar, ATextBeyondItsLimitIsCut) {
  Installation i;
  std::string text = B(1) + ":60";
  for (uint32_t n = 100; n < 160; ++n) text += ":" + B(n);
  i.addObjectExpert("O", "Obj", GText(1), text);
  size_t whole = (1023 - (B(1) + ":60").size()) / (B(1).size() + 1);
  LinuxStart r(i);
  for (uint32_t n = 100; n < 160; ++n) {
    bool kept = n - 100 < whole;
    Bound(*r, vltComponentObjectExpert, G(n), kept ? S_OK : VLT_E_NO_COMPONENT);
  }
  EXPECT_TRUE(Same(Bound(*r, vltComponentObjectExpert, GUID_NULL), {G(1)}));
}

// ---- Registration

TEST(vltLinuxRegistrar, RegistrationKeepsTheBracesAndWritesNoClassesOfAnUnknownFile) {
  Installation i;
  ExpectInChild([&] {
    LinuxStart r(i);
    Offered o(vltComponentObjectExpert, L"Obj", G(1), L"/x/O.vle");
    Offered p(vltComponentResourceExpert, L"Res", G(2), L"/x/R.vle", L"pnp");
    EXPECT_EQ(r->RegisterComponent(&o.value), S_OK);
    EXPECT_EQ(r->RegisterComponent(&p.value), S_OK);
  });
  DatabaseText db(i.database());
  EXPECT_EQ(db.items("Obj"),
            (DatabaseText::Items{{"Identifier", "\"" + B(1) + "\""}, {"FileName", "\"O.vle\""}}));
  EXPECT_EQ(db.items("Res"), (DatabaseText::Items{{"Identifier", "\"" + B(2) + "\""},
                                                  {"FileName", "\"R.vle\""},
                                                  {"PnP", "\"pnp\""}}));
}

TEST(vltLinuxRegistrar, RegistrationRepeatsTheClassAtTheComponentsPosition) {
  Installation i;
  // The second component of the table, in GUID order: position 1 of its three classes.
  std::string table = B(1) + ":1:" + B(7) + ":" + B(2) + ":3:" + B(10) + ":" + B(11) + ":" + B(12);
  i.addResourceExpert("One", "Res", GText(2), "p", table);
  ExpectInChild([&] {
    LinuxStart r(i);
    Offered o(vltComponentResourceExpert, L"Again", G(2), Wide(i.root()) + L"/Experts/One.vle",
              L"pnp");
    EXPECT_EQ(r->RegisterComponent(&o.value), S_OK);
  });
  EXPECT_EQ(DatabaseText(i.database()).items("Again"),
            (DatabaseText::Items{{"Identifier", "\"" + B(2) + "\""},
                                 {"FileName", "\"One.vle\""},
                                 {"PnP", "\"pnp\""},
                                 {"BINDING_CLASSES", "\"" + B(2) + ":3:" + B(11) + ":" + B(11) +
                                                         ":" + B(11) + "\""}}));
}

TEST(vltLinuxRegistrar, APositionBeyondTheClassesIsRaisedAndTheDatabaseStaysUsable) {
  Installation i;
  i.addObjectExpert("One", "Obj", GText(2), B(1) + ":0:" + B(2) + ":1:" + B(7));
  ExpectInChild([&] {
    LinuxStart r(i);
    Offered o(vltComponentObjectExpert, L"Obj", G(2), Wide(i.root()) + L"/Experts/One.vle");
    EXPECT_THROW(r->RegisterComponent(&o.value), zt::fnd::exception::OutOfRange);
    EXPECT_EQ(DatabaseText(i.database()).quoted("Obj", "Identifier"), GText(2));
    Received known;
    ASSERT_EQ(r->GetComponent(G(2), &known.value), S_OK);
    EXPECT_EQ(known.file(), Wide(i.root()) + L"/Experts/One.vle");
    EXPECT_EQ(r->SetStorageServerCacheSize(5), S_OK);
  });
  // The items before the classes were set, and went out with the next save.
  DatabaseText db(i.database());
  EXPECT_EQ(db.raw("KOR", "CacheSize"), "5");
  EXPECT_EQ(
      db.items("Obj"),
      (DatabaseText::Items{{"Identifier", "\"" + B(2) + "\""},
                           {"FileName", "\"One.vle\""},
                           {"BINDING_CLASSES", "\"" + B(1) + ":0:" + B(2) + ":1:" + B(7) + "\""}}));
  EXPECT_EQ(Hex(ReadBytes(i.sidecar())), Md5Sum(i.database()));
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_EQ(Find(*r, G(2)), S_OK);
  });
}

TEST(vltLinuxRegistrar, AComponentWithoutClassesIsWrittenWithItsCount) {
  Installation i;
  i.addObjectExpert("One", "Obj", GText(2), B(1) + ":0:" + B(2) + ":0");
  ExpectInChild([&] {
    LinuxStart r(i);
    Offered o(vltComponentObjectExpert, L"Obj", G(2), Wide(i.root()) + L"/Experts/One.vle");
    EXPECT_EQ(r->RegisterComponent(&o.value), S_OK);
  });
  EXPECT_EQ(DatabaseText(i.database()).quoted("Obj", "BINDING_CLASSES"), B(2) + ":0");
}

// The table is looked up by the whole path, in the spelling it was read with.
TEST(vltLinuxRegistrar, RegistrationLooksTheFileUpAsItIsGiven) {
  Installation i;
  i.addObjectExpert("One", "Obj", GText(2), B(2) + ":1:" + B(7));
  ExpectInChild([&] {
    LinuxStart r(i);
    for (const std::wstring& file : {std::wstring(L"One.vle"), Wide(i.root()) + L"/Experts/ONE.vle",
                                     Wide(i.root()) + L"/Experts//One.vle"}) {
      Offered o(vltComponentObjectExpert, L"New", G(2), file);
      EXPECT_EQ(r->RegisterComponent(&o.value), S_OK);
    }
  });
  EXPECT_FALSE(DatabaseText(i.database()).raw("New", "BINDING_CLASSES"));
}

// Its bare name is still on the disk when the next start asks for the text.
TEST(vltLinuxRegistrar, TheStartAfterARegistrationFindsTheClassesAgain) {
  Installation i;
  i.addObjectExpert("One", "Obj", GText(2), B(2) + ":1:" + B(7));
  ExpectInChild([&] {
    LinuxStart r(i);
    Offered o(vltComponentObjectExpert, L"Obj", G(2), Wide(i.root()) + L"/Experts/One.vle");
    EXPECT_EQ(r->RegisterComponent(&o.value), S_OK);
  });
  EXPECT_EQ(DatabaseText(i.database()).quoted("Obj", "FileName"), "One.vle");
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_TRUE(Same(Bound(*r, vltComponentObjectExpert, G(7)), {G(2)}));
  });
}

}  // namespace
}  // namespace vlt::test
