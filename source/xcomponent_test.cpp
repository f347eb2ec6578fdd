#include "source/xcomponent.h"

#include <gtest/gtest.h>
#include <string.h>
#include <wchar.h>

#include "source/Common/vltcmn.h"
#include "source/Utilities/vltutils.h"

namespace {

constexpr GUID kId = {1, 2, 3, {4, 5, 6, 7, 8, 9, 10, 11}};

// A record with every field set to something of its own; its texts are heap blocks.
_vltComponent2 FullRecord(_vltComponentType type) {
  _vltComponent2 r;
  memset(&r, 0, sizeof r);
  r.size = 4711;
  r.version = 5;
  r.type = type;
  r.name = Dup(L"name");
  r.identifier = kId;
  r.fileName = Dup(L"/file");
  memcpy(r.opaqueQuad, "12345678", 8);
  r.opaqueWord = -9;
  if (type == vltComponentDataDictionary) {
    r.dictionary = {11, Dup(L"aux1"), Dup(L"pre"), 12, Dup(L"aux2"), 13};
  } else if (type == vltComponentResourceExpert) {
    r.resource.pnp = Dup(L"pnp");
  } else {
    r.expert = {21, 22};
  }
  return r;
}

TEST(Component, DefaultBuiltHasStampsAndNothingElse) {
  CvltComponent c;
  EXPECT_EQ(c.record().size, sizeof(_vltComponent2));
  EXPECT_EQ(c.record().version, 0xFFFFFFFFu);
  EXPECT_EQ(memcmp(&c.record().identifier, &GUID_NULL, 16), 0);
  EXPECT_EQ(c.record().type, vltComponentNone);
  EXPECT_EQ(c.record().name, nullptr);
  EXPECT_EQ(c.record().fileName, nullptr);
  EXPECT_EQ(c.record().dictionary.lastInstalledSchemaVersion, 0u);
}

TEST(Component, DeepCopyOfADictionaryOwnsEveryText) {
  _vltComponent2 source = FullRecord(vltComponentDataDictionary);
  _vltComponent2 copy;
  memset(&copy, 0xAA, sizeof copy);
  ASSERT_EQ(CvltComponent::Copy2(&copy, &source), S_OK);
  EXPECT_EQ(copy.size, 4711u);
  EXPECT_EQ(copy.version, 5u);
  EXPECT_STREQ(copy.name, L"name");
  EXPECT_NE(copy.name, source.name);
  EXPECT_STREQ(copy.fileName, L"/file");
  EXPECT_EQ(memcmp(copy.opaqueQuad, "12345678", 8), 0);
  EXPECT_EQ(copy.opaqueWord, -9);
  EXPECT_STREQ(copy.dictionary.auxString1, L"aux1");
  EXPECT_NE(copy.dictionary.auxString1, source.dictionary.auxString1);
  EXPECT_STREQ(copy.dictionary.prefix, L"pre");
  EXPECT_STREQ(copy.dictionary.auxString2, L"aux2");
  EXPECT_EQ(copy.dictionary.schemaVersion, 11u);
  EXPECT_EQ(copy.dictionary.fragmentRegistered, 12u);
  EXPECT_EQ(copy.dictionary.lastInstalledSchemaVersion, 13u);
  vltutilsFreeComponent2(copy);
  vltutilsFreeComponent2(source);
}

TEST(Component, NullTextsStayNullInACopy) {
  _vltComponent2 source = FullRecord(vltComponentDataDictionary);
  vltFree(source.dictionary.auxString1);
  source.dictionary.auxString1 = nullptr;
  _vltComponent2 copy;
  memset(&copy, 0xAA, sizeof copy);
  EXPECT_EQ(CvltComponent::Copy2(&copy, &source), S_OK);
  EXPECT_EQ(copy.dictionary.auxString1, nullptr);
  vltutilsFreeComponent2(copy);
  vltutilsFreeComponent2(source);
}

TEST(Component, ExpertsCopyTheirWordsAndTypeSevenDoesNot) {
  for (auto type : {vltComponentObjectExpert, vltComponentUIProvider, vltComponentType7}) {
    _vltComponent2 source = FullRecord(type);
    _vltComponent2 copy;
    memset(&copy, 0, sizeof copy);
    EXPECT_EQ(CvltComponent::Copy2(&copy, &source), S_OK);
    EXPECT_EQ(copy.type, type);
    EXPECT_EQ(copy.opaqueWord, -9);
    bool copied = type != vltComponentType7;
    EXPECT_EQ(copy.expert.expertWord0, copied ? 21 : 0);
    EXPECT_EQ(copy.expert.expertWord1, copied ? 22 : 0);
    vltutilsFreeComponent2(copy);
    vltutilsFreeComponent2(source);
  }
}

TEST(Component, WideningStampsSizeAndVersion) {
  _vltComponent2 from = FullRecord(vltComponentResourceExpert);
  _vltComponent first = {from.type,       from.name, from.identifier, from.fileName, {},
                         from.opaqueWord, {}};
  memcpy(first.opaqueQuad, from.opaqueQuad, 8);
  first.resource = from.resource;
  _vltComponent2 copy;
  memset(&copy, 0xAA, sizeof copy);
  EXPECT_EQ(CvltComponent::Copy(&copy, &first), S_OK);
  EXPECT_EQ(copy.size, sizeof(_vltComponent2));
  EXPECT_EQ(copy.version, 3u);
  EXPECT_STREQ(copy.resource.pnp, L"pnp");
  EXPECT_NE(copy.resource.pnp, from.resource.pnp);
  EXPECT_EQ(memcmp(copy.opaqueQuad, "12345678", 8), 0);
  vltutilsFreeComponent2(copy);
  vltFreeComponent(first);
}

TEST(Component, NarrowingKeepsWhatTheOlderGenerationsHave) {
  _vltComponent2 dictionary = FullRecord(vltComponentDataDictionary);
  CvltComponent holder(&dictionary, true);
  _vltComponent2point1 one;
  _vltComponent2point2 two;
  memset(&one, 0xAA, sizeof one);
  memset(&two, 0xAA, sizeof two);
  ASSERT_EQ(holder.CopyTo(&one), S_OK);
  ASSERT_EQ(holder.CopyTo(&two), S_OK);
  EXPECT_STREQ(one.dictionary.auxString2, L"aux2");
  EXPECT_EQ(two.dictionary.lastInstalledSchemaVersion, 13u);
  EXPECT_STREQ(two.name, L"name");
  for (wchar_t* text :
       {one.name, one.fileName, one.dictionary.auxString1, one.dictionary.prefix,
        one.dictionary.auxString2, two.name, two.fileName, two.dictionary.auxString1,
        two.dictionary.prefix, two.dictionary.auxString2}) {
    vltFree(text);
  }
}

TEST(Component, AttachTakesThePointersAndKeepsTheVersion) {
  _vltComponent2 from = FullRecord(vltComponentUIProvider);
  _vltComponent first = {from.type, from.name, from.identifier, from.fileName, {}, 0, {}};
  first.expert = from.expert;
  CvltComponent c(&first, true);
  EXPECT_EQ(c.record().name, from.name);
  EXPECT_EQ(c.record().size, sizeof(_vltComponent2));
  EXPECT_EQ(c.record().version, 0xFFFFFFFFu);
  EXPECT_EQ(c.record().expert.expertWord1, 22);
  _vltComponent2 seven = FullRecord(vltComponentType7);
  CvltComponent d(&seven, true);
  EXPECT_EQ(d.record().size, 4711u);
  EXPECT_EQ(d.record().version, 5u);
  EXPECT_EQ(d.record().expert.expertWord0, 21);
}

TEST(Component, SwapExchangesOneTypeOnly) {
  _vltComponent2 a = FullRecord(vltComponentResourceExpert);
  _vltComponent2 b = FullRecord(vltComponentResourceExpert);
  b.size = 1;
  b.version = 2;
  wchar_t* pnp = a.resource.pnp;
  CvltComponent ca(&a, true), cb(&b, true);
  ca.Swap(cb);
  EXPECT_EQ(cb.record().resource.pnp, pnp);
  EXPECT_EQ(cb.record().size, 4711u);
  EXPECT_EQ(ca.record().version, 2u);
  EXPECT_EQ(ca.record().name, b.name);
  _vltComponent2 other = FullRecord(vltComponentObjectExpert);
  CvltComponent co(&other, true);
  ca.Swap(co);
  EXPECT_EQ(co.record().name, other.name);
  EXPECT_EQ(ca.record().name, b.name);
}

TEST(Component, ClearZeroesTheCommonFieldsAndKeepsStamps) {
  _vltComponent2 r = FullRecord(vltComponentDataDictionary);
  CvltComponent c(&r, true);
  c.Clear();
  EXPECT_EQ(c.record().type, vltComponentNone);
  EXPECT_EQ(c.record().name, nullptr);
  EXPECT_EQ(c.record().fileName, nullptr);
  EXPECT_EQ(c.record().opaqueWord, 0);
  EXPECT_EQ(c.record().opaqueQuad[0], 0);
  EXPECT_EQ(c.record().size, 4711u);
}

TEST(Component, MotionExpertsKeepNameAndPnp) {
  _vltComponent2 r = FullRecord(vltComponentResourceExpert);
  vltFree(r.name);
  r.name = Dup(L"Motion Expert Driver");
  { CvltComponent c(&r, true); }
  // Both blocks are still alive and the caller's to end.
  EXPECT_STREQ(r.name, L"Motion Expert Driver");
  EXPECT_STREQ(r.resource.pnp, L"pnp");
  vltFree(r.name);
  vltFree(r.resource.pnp);
}

TEST(Component, AnyOtherNameIsFreedWhole) {
  // The leak checker of the sanitizer build is what sees the difference.
  for (const wchar_t* name : {L"Motion Driver", L"Expert", L"motion expert"}) {
    _vltComponent2 r = FullRecord(vltComponentResourceExpert);
    vltFree(r.name);
    r.name = Dup(name);
    CvltComponent c(&r, true);
    c.Clear();
    EXPECT_EQ(c.record().name, nullptr);
  }
}

TEST(Component, DynamicComponentRemembersItsLibrary) {
  auto* library = reinterpret_cast<zt::fnd::osdep::SharedLibrary*>(uintptr_t{8});
  _vltComponent2 r = FullRecord(vltComponentObjectExpert);
  CvltDynComponent copied(&r, library, false);
  EXPECT_EQ(copied.library(), library);
  EXPECT_STREQ(copied.record().name, L"name");
  EXPECT_NE(copied.record().name, r.name);
  CvltDynComponent attached(&r, true);
  EXPECT_EQ(attached.library(), nullptr);
  EXPECT_EQ(attached.record().name, r.name);
  EXPECT_EQ(CvltDynComponent().library(), nullptr);
}

}  // namespace
