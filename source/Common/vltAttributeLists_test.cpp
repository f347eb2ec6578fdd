// Lists of values as one text.
#include <gtest/gtest.h>

#include <functional>
#include <new>

#include "tests/support/ArmedHook.h"
#include "tests/support/FakeStorage.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/MemoryLimit.h"

namespace vlt::test {
namespace {

using zt::fnd::String;

HRESULT List(const Answers& answers, String& text, std::vector<uint32_t>* capacities = nullptr) {
  g_references = 0;
  Object object(answers);
  HRESULT result = vltGetArrayValueAsString(&object, kId, answers.type, text);
  EXPECT_EQ(g_references, 0);
  if (capacities) *capacities = object.capacities;
  return result;
}

std::wstring ListText(const Answers& answers, HRESULT expected) {
  String text(L"old");
  EXPECT_EQ(List(answers, text), expected);
  return text.c_str();
}

TEST(vltAttributeLists, TypesThatAreNoneGiveAnEmptyOne) {
  for (int type : {0, 1, 2, 3, 4, 5, 6, 7, 14, 15, -1}) {
    EXPECT_EQ(ListText(Filled(type), E_FAIL), L"{}") << type;
  }
}

TEST(vltAttributeLists, AsksForTheSizeAndThenForTheElements) {
  for (int type = 8; type <= 13; ++type) {
    String text;
    std::vector<uint32_t> capacities;
    EXPECT_EQ(List(Filled(type), text, &capacities), S_OK);
    EXPECT_EQ(capacities, (std::vector<uint32_t>{0, 2})) << type;
    EXPECT_EQ(List(Type(type), text, &capacities), S_OK);
    EXPECT_EQ(capacities, std::vector<uint32_t>{0}) << type;
    Answers failing = Filled(type);
    failing.sizeResult = kFailure;
    EXPECT_EQ(List(failing, text, &capacities), kFailure);
    EXPECT_EQ(capacities, std::vector<uint32_t>{0}) << type;
  }
}

TEST(vltAttributeLists, FewerElementsThanAnnounced) {
  for (int type = 8; type <= 13; ++type) {
    Answers answers = Filled(type);
    answers.announced = 5;
    EXPECT_EQ(ListText(answers, S_OK), ListText(Filled(type), S_OK)) << type;
    answers.given = 0;
    EXPECT_EQ(ListText(answers, S_OK), L"{}") << type;
    answers.result = kFailure;
    EXPECT_EQ(ListText(answers, kFailure), L"{}") << type;
  }
}

TEST(vltAttributeLists, MoreElementsThanThereIsRoomFor) {
  for (int type = 8; type <= 13; ++type) {
    Answers answers = Filled(type);
    answers.given = 0xFFFFFFFF;
    EXPECT_EQ(ListText(answers, S_OK), ListText(Filled(type), S_OK)) << type;
  }
}

TEST(vltAttributeLists, ElementsThatDoNotComeAreZeros) {
  const std::pair<int, const wchar_t*> rows[] = {
      {8, L"{0,0}"}, {9, L"{0,0}"}, {10, L"{0,0}"}, {11, L"{,}"}, {12, L"{NULL,NULL}"}};
  for (const auto& [type, text] : rows) {
    Answers answers = Type(type);
    answers.announced = answers.given = 2;
    answers.result = kFailure;
    EXPECT_EQ(ListText(answers, kFailure), text);
  }
}

TEST(vltAttributeLists, ManyElementsTakeTimeInProportion) {
  Answers answers = Type(vltU32ArrayType);
  answers.u32.assign(200000, 7);
  EXPECT_EQ(ListText(answers, S_OK).size(), 400001u);
}

TEST_IN_CHILD(vltAttributeLists, ACountThatIsNotTrueIsOutOfMemory) {
  if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer holds the address space";
  LimitMemoryTo(64 << 20);
  for (int type = 8; type <= 13; ++type) {
    Answers answers = Filled(type);
    answers.announced = 0xFFFFFFFF;
    EXPECT_EQ(ListText(answers, E_OUTOFMEMORY), L"{") << type;
    EXPECT_EQ(TextOf(answers, E_OUTOFMEMORY), L"(untouched)") << type;
  }
}

TEST(vltAttributeLists, HookPointsActAsAFailedAllocation) {
  const std::pair<int, const char*> points[] = {{8, "TestHookNT\"./source/Common/vltcmn\"96"},
                                                {9, "TestHookNT\"./source/Common/vltcmn\"111"},
                                                {10, "TestHookNT\"./source/Common/vltcmn\"126"},
                                                {13, "TestHookNT\"./source/Common/vltcmn\"141"},
                                                {11, "TestHookNT\"./source/Common/vltcmn\"158"},
                                                {12, "TestHookNT\"./source/Common/vltcmn\"174"}};
  for (const auto& [type, point] : points) {
    SCOPED_TRACE(point);
    ExpectInArmedChild(point, kFailedAllocation, [type = type] {
      for (int other = 8; other <= 13; ++other) {
        if (other == type) {
          EXPECT_EQ(ListText(Filled(other), E_OUTOFMEMORY), L"{");
          EXPECT_EQ(TextOf(Filled(other), E_OUTOFMEMORY), L"(untouched)");
          EXPECT_EQ(TextOf(Filled(other), E_OUTOFMEMORY, kInner), L"{");
        } else {
          EXPECT_EQ(ListText(Filled(other), S_OK).back(), L'}');
        }
        EXPECT_EQ(ListText(Type(other), S_OK), L"{}");  // passed before an allocation only
      }
    });
  }
}

TEST(vltAttributeLists, AnExceptionGivesEverythingBack) {
  ExpectInArmedChild(hook::kStringFromClsid, kThrownBadAlloc, [] {
    for (int type : {5, 6, 12, 13}) {
      g_references = 0;
      Answers answers = Filled(type);
      Object object(answers);
      wchar_t* text = g_untouched;
      EXPECT_THROW(vltGetAttributeValueAsString(&object, kId, &text), std::bad_alloc) << type;
      EXPECT_EQ(text, g_untouched);
      EXPECT_EQ(g_references, 0);
    }
  });
}

TEST(vltAttributeLists, ATextThatMemoryDoesNotSufficeForIsNullAndInAListEmpty) {
  ExpectInArmedChild(hook::kDuplicateString2, kFailedAllocation, [] {
    for (int type : {12, 13}) EXPECT_EQ(ListText(Filled(type), S_OK), L"{,}");
    for (int type : {5, 6}) EXPECT_EQ(TextOf(Filled(type), S_OK), L"(null)");
    Answers failing = Filled(5);
    failing.result = kFailure;
    EXPECT_EQ(TextOf(failing, kFailure, kInner), L"(null)");
    failing = Filled(6);
    failing.result = kFailure;
    EXPECT_EQ(TextOf(failing, kFailure, kInner), L"(untouched)");
  });
}

}  // namespace
}  // namespace vlt::test
