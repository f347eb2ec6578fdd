#include "source/xcomponent.h"

#include <gtest/gtest.h>
#include <string.h>
#include <wchar.h>

#include <type_traits>
#include <utility>

#include "source/Common/vltcmn.h"
#include "source/Utilities/vltutils.h"
#include "tests/support/FailingHeap.h"
#include "zt/fnd/Guid.h"

namespace vlt::test {
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

TEST(xcomponent, DefaultBuiltHasStampsAndNothingElse) {
  CvltComponent c;
  EXPECT_EQ(c.record().size, sizeof(_vltComponent2));
  EXPECT_EQ(c.record().version, 0xFFFFFFFFu);
  EXPECT_EQ(memcmp(&c.record().identifier, &GUID_NULL, 16), 0);
  EXPECT_EQ(c.record().type, vltComponentNone);
  EXPECT_EQ(c.record().name, nullptr);
  EXPECT_EQ(c.record().fileName, nullptr);
  EXPECT_EQ(c.record().dictionary.lastInstalledSchemaVersion, 0u);
}

TEST(xcomponent, DeepCopyOfADictionaryOwnsEveryText) {
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

TEST(xcomponent, NullTextsStayNullInACopy) {
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

TEST(xcomponent, ExpertsCopyTheirWordsAndTypeSevenDoesNot) {
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

TEST(xcomponent, WideningStampsSizeAndVersion) {
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

template <class Narrow>
class xcomponentNarrowing : public testing::Test {};
using Narrows = testing::Types<_vltComponent2point1, _vltComponent2point2>;
TYPED_TEST_SUITE(xcomponentNarrowing, Narrows);

// Ends the texts of a record of either generation.
template <class Narrow>
void FreeNarrow(Narrow& r) {
  vltFree(r.name);
  vltFree(r.fileName);
  if (r.type == vltComponentDataDictionary) {
    for (wchar_t* text : {r.dictionary.auxString1, r.dictionary.prefix, r.dictionary.auxString2}) {
      vltFree(text);
    }
  } else if (r.type == vltComponentResourceExpert) {
    vltFree(r.resource.pnp);
  }
}

template <class Narrow>
void ExpectNarrowVariant(const Narrow& copy, const _vltComponent2& source) {
  if (copy.type == vltComponentDataDictionary) {
    EXPECT_EQ(copy.dictionary.schemaVersion, 11u);
    EXPECT_STREQ(copy.dictionary.auxString1, L"aux1");
    EXPECT_NE(copy.dictionary.auxString1, source.dictionary.auxString1);
    EXPECT_STREQ(copy.dictionary.prefix, L"pre");
    EXPECT_EQ(copy.dictionary.fragmentRegistered, 12u);
    EXPECT_STREQ(copy.dictionary.auxString2, L"aux2");
    if constexpr (requires { copy.dictionary.lastInstalledSchemaVersion; }) {
      EXPECT_EQ(copy.dictionary.lastInstalledSchemaVersion, 13u);
    }
  } else if (copy.type == vltComponentResourceExpert) {
    EXPECT_STREQ(copy.resource.pnp, L"pnp");
    EXPECT_NE(copy.resource.pnp, source.resource.pnp);
  } else {
    bool copied = copy.type != vltComponentType7;
    EXPECT_EQ(copy.expert.expertWord0, copied ? 21 : -1);
    EXPECT_EQ(copy.expert.expertWord1, copied ? 22 : -1);
  }
}

TYPED_TEST(xcomponentNarrowing, KeepsWhatTheOlderGenerationHas) {
  for (auto type : {vltComponentDataDictionary, vltComponentObjectExpert,
                    vltComponentResourceExpert, vltComponentUIProvider, vltComponentType7}) {
    SCOPED_TRACE(type);
    _vltComponent2 source = FullRecord(type);
    CvltComponent holder(&source, true);
    TypeParam copy;
    memset(&copy, 0xFF, sizeof copy);
    ASSERT_EQ(holder.CopyTo(&copy), S_OK);
    EXPECT_EQ(copy.type, type);
    EXPECT_STREQ(copy.name, L"name");
    EXPECT_NE(copy.name, source.name);
    EXPECT_TRUE(copy.identifier == kId);
    EXPECT_STREQ(copy.fileName, L"/file");
    EXPECT_NE(copy.fileName, source.fileName);
    ExpectNarrowVariant(copy, source);
    FreeNarrow(copy);
  }
}

TEST(xcomponent, AttachTakesThePointersAndKeepsTheVersion) {
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

// The other record of a type: every field differs from FullRecord's.
_vltComponent2 OtherRecord(_vltComponentType type) {
  _vltComponent2 r = FullRecord(type);
  r.size = 1;
  r.version = 2;
  r.identifier.Data1 = 77;
  memcpy(r.opaqueQuad, "abcdefgh", 8);
  r.opaqueWord = 8;
  if (type == vltComponentDataDictionary) {
    r.dictionary.schemaVersion = 31;
    r.dictionary.fragmentRegistered = 32;
    r.dictionary.lastInstalledSchemaVersion = 33;
  } else if (type != vltComponentResourceExpert) {
    r.expert = {41, 42};
  }
  return r;
}

// Every field of the type; the texts by their pointers.
void ExpectSame(const _vltComponent2& found, const _vltComponent2& wanted) {
  EXPECT_EQ(found.size, wanted.size);
  EXPECT_EQ(found.version, wanted.version);
  EXPECT_EQ(found.type, wanted.type);
  EXPECT_EQ(found.name, wanted.name);
  EXPECT_TRUE(found.identifier == wanted.identifier);
  EXPECT_EQ(found.fileName, wanted.fileName);
  EXPECT_EQ(memcmp(found.opaqueQuad, wanted.opaqueQuad, sizeof found.opaqueQuad), 0);
  EXPECT_EQ(found.opaqueWord, wanted.opaqueWord);
  if (wanted.type == vltComponentDataDictionary) {
    const vltDictVariant &f = found.dictionary, &w = wanted.dictionary;
    EXPECT_EQ(f.schemaVersion, w.schemaVersion);
    EXPECT_EQ(f.auxString1, w.auxString1);
    EXPECT_EQ(f.prefix, w.prefix);
    EXPECT_EQ(f.fragmentRegistered, w.fragmentRegistered);
    EXPECT_EQ(f.auxString2, w.auxString2);
    EXPECT_EQ(f.lastInstalledSchemaVersion, w.lastInstalledSchemaVersion);
  } else if (wanted.type == vltComponentResourceExpert) {
    EXPECT_EQ(found.resource.pnp, wanted.resource.pnp);
  } else {
    EXPECT_EQ(found.expert.expertWord0, wanted.expert.expertWord0);
    EXPECT_EQ(found.expert.expertWord1, wanted.expert.expertWord1);
  }
}

constexpr _vltComponentType kTypes[] = {vltComponentDataDictionary, vltComponentObjectExpert,
                                        vltComponentResourceExpert, vltComponentUIProvider,
                                        vltComponentType7};

TEST(xcomponent, SwapExchangesEveryFieldOfEveryType) {
  for (auto type : kTypes) {
    SCOPED_TRACE(type);
    _vltComponent2 a = FullRecord(type), b = OtherRecord(type);
    CvltComponent ca(&a, true), cb(&b, true);
    ca.Swap(cb);
    ExpectSame(ca.record(), b);
    ExpectSame(cb.record(), a);
  }
}

// Without a variant the words stay where they are.
TEST(xcomponent, SwapOfOtherTypesExchangesTheCommonFields) {
  _vltComponent2 a = FullRecord(vltComponentNone), b = OtherRecord(vltComponentNone);
  CvltComponent ca(&a, true), cb(&b, true);
  ca.record().expert = a.expert;
  cb.record().expert = b.expert;
  ca.Swap(cb);
  std::swap(a.expert, b.expert);
  ExpectSame(ca.record(), b);
  ExpectSame(cb.record(), a);
}

TEST(xcomponent, SwapOfDifferentTypesChangesNothing) {
  for (auto first : kTypes) {
    for (auto second : kTypes) {
      if (first == second) continue;
      SCOPED_TRACE(testing::Message() << first << " and " << second);
      _vltComponent2 a = FullRecord(first), b = OtherRecord(second);
      CvltComponent ca(&a, true), cb(&b, true);
      ca.Swap(cb);
      ExpectSame(ca.record(), a);
      ExpectSame(cb.record(), b);
    }
  }
}

TEST(xcomponent, SwapLeavesTheLibrary) {
  auto* library = reinterpret_cast<zt::fnd::osdep::SharedLibrary*>(uintptr_t{8});
  _vltComponent2 a = FullRecord(vltComponentObjectExpert),
                 b = OtherRecord(vltComponentObjectExpert);
  CvltDynComponent ca(&a, library, true), cb(&b, true);
  ca.Swap(cb);
  EXPECT_EQ(ca.library(), library);
  EXPECT_EQ(cb.library(), nullptr);
}

TEST(xcomponent, ClearZeroesTheCommonFieldsAndKeepsStampsAndVariant) {
  for (auto type : kTypes) {
    SCOPED_TRACE(type);
    _vltComponent2 r = FullRecord(type), cleared = r;
    CvltComponent c(&r, true);
    c.Clear();
    cleared.name = cleared.fileName = nullptr;
    cleared.identifier = GUID_NULL;
    memset(cleared.opaqueQuad, 0, sizeof cleared.opaqueQuad);
    cleared.opaqueWord = 0;
    EXPECT_EQ(c.record().type, vltComponentNone);
    _vltComponent2 found = c.record();
    found.type = type;  // so that the variant is compared as what it was
    ExpectSame(found, cleared);
  }
}

TEST(xcomponent, MotionExpertsKeepNameAndPnp) {
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

// Blocks that a component of this name, which takes its record over, leaves allocated.
long LeftBehindBy(const wchar_t* name, _vltComponentType type) {
  long before = heap::LiveBlocks();
  _vltComponent2 r = FullRecord(type);
  vltFree(r.name);
  r.name = Dup(name);
  { CvltComponent c(&r, true); }
  return heap::LiveBlocks() - before;
}

TEST(xcomponent, AnyOtherNameIsFreedWhole) {
  heap::LiveBlocks();
  for (const wchar_t* name :
       {L"Motion Driver", L"Expert", L"motion expert", L"Motion expert", L""}) {
    for (auto type : {vltComponentResourceExpert, vltComponentDataDictionary}) {
      EXPECT_EQ(LeftBehindBy(name, type), 0) << name << type;
    }
  }
}

// ---- Copies that fail

// Copies into a record of the generation, with the n-th allocation, from 0, failing: nothing stays,
// and no text of the target dangles. False once the copy has succeeded.
template <class Target, class Source>
bool FailsAtAndLeavesNothing(const Source& source, long n) {
  Target target;
  memset(&target, 0xAA, sizeof target);
  long before = heap::LiveBlocks();
  HRESULT result = S_OK;
  heap::Outcome outcome = heap::Attempt(
      [&] {
        if constexpr (std::is_same_v<Source, _vltComponent>) {
          return result = CvltComponent::Copy(&target, &source);
        } else {
          return result = CvltComponent::Copy2(&target, &source);
        }
      },
      n, false);
  if (outcome != heap::kReported) {
    // Of a dictionary's texts the last one's result counts.
    EXPECT_EQ(result, S_OK);
    FreeNarrow(target);
    EXPECT_EQ(heap::LiveBlocks(), before);
    return outcome == heap::kWorks;
  }
  EXPECT_EQ(result, E_OUTOFMEMORY);
  EXPECT_EQ(heap::LiveBlocks(), before) << "allocation " << n;
  EXPECT_EQ(target.name, nullptr);
  EXPECT_EQ(target.fileName, nullptr);
  return true;
}

template <class Target, class Source>
long FailedAllocations(const Source& source) {
  long n = 0;
  while (FailsAtAndLeavesNothing<Target>(source, n)) ++n;
  return n;
}

TEST(xcomponentMemory, ACopyThatFailsLeavesNothing) {
  if (!kCanLimitMemory) {
    printf("NOT TESTED: the sanitizer has a malloc of its own\n");
    GTEST_SKIP();
  }
  for (auto type : kTypes) {
    SCOPED_TRACE(type);
    _vltComponent2 source = FullRecord(type);
    _vltComponent first = {type, source.name, kId, source.fileName, {}, 0, {}};
    first.dictionary = source.dictionary;
    long texts = type == vltComponentDataDictionary   ? 5
                 : type == vltComponentResourceExpert ? 3
                                                      : 2;
    EXPECT_EQ(FailedAllocations<_vltComponent2>(first), texts);
    EXPECT_EQ(FailedAllocations<_vltComponent2>(source), texts);
    EXPECT_EQ(FailedAllocations<_vltComponent2point1>(source), texts);
    EXPECT_EQ(FailedAllocations<_vltComponent2point2>(source), texts);
    vltutilsFreeComponent2(source);
  }
}

// A component that was to be a copy is one without texts, and ends like any other.
TEST(xcomponentMemory, AComponentWhoseCopyFailedHoldsNoTexts) {
  if (!kCanLimitMemory) {
    printf("NOT TESTED: the sanitizer has a malloc of its own\n");
    GTEST_SKIP();
  }
  _vltComponent2 source = FullRecord(vltComponentResourceExpert);
  long before = heap::LiveBlocks();
  for (long n = 0; n < 3; ++n) {
    EXPECT_EQ(heap::Attempt(
                  [&] {
                    CvltComponent copy(&source, false);
                    return copy.record().name || copy.record().fileName ? S_OK : E_OUTOFMEMORY;
                  },
                  n, false),
              heap::kReported);
    EXPECT_EQ(heap::LiveBlocks(), before) << n;
  }
  vltutilsFreeComponent2(source);
}

TEST(xcomponent, DynamicComponentRemembersItsLibrary) {
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
}  // namespace vlt::test
