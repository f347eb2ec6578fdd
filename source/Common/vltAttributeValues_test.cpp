#include "source/Common/vltAttributeValues.h"

#include <gtest/gtest.h>
#include <signal.h>

#include <functional>

#include "tests/support/FakeStorage.h"
#include "tests/support/InChild.h"

namespace vlt::test {
namespace {

using zt::fnd::String;

struct Case {
  int type;
  std::function<void(Answers&)> fill;
  std::wstring text;
};

Answers For(const Case& c) {
  Answers answers = Type(c.type);
  c.fill(answers);
  return answers;
}

const std::vector<Case>& Singles() {
  static const std::vector<Case> cases = {
      {1, [](Answers& a) { a.i32 = {17}; }, L"17"},
      {1, [](Answers& a) { a.i32 = {-1}; }, kMinusOne},
      {2, [](Answers& a) { a.u32 = {4294967295u}; }, L"4294967295"},
      {3, [](Answers& a) { a.f64 = {0.1}; }, L"0.1"},
      {4, [](Answers& a) { a.texts = {L"a,\u00E9\n"}; }, L"a,\u00E9\n"},
      {4, [](Answers& a) { a.texts = {L""}; }, L""},
      {4, [](Answers& a) { a.texts = {std::nullopt}; }, L"(null)"},
      {5, [](Answers& a) { a.objects = {true}; }, kGuidText},
      {5, [](Answers& a) { a.objects = {false}; }, kZeroText},
      {6, [](Answers& a) { a.guids = {kGuid}; }, kGuidText}};
  return cases;
}

const std::vector<Case>& Lists() {
  static const std::vector<Case> cases = {
      {8, [](Answers&) {}, L"{}"},
      {8, [](Answers& a) { a.i32 = {7}; }, L"{7}"},
      {8, [](Answers& a) { a.i32 = {-1}; }, L"{" + kMinusOne + L"}"},
      {8,
       [](Answers& a) {
         a.i32 = {1, 2, 3};
       },
       L"{1,2,3}"},
      {9, [](Answers&) {}, L"{}"},
      {9, [](Answers& a) { a.u32 = {4294967295u}; }, L"{4294967295}"},
      {9,
       [](Answers& a) {
         a.u32 = {1, 2};
       },
       L"{1,2}"},
      {10, [](Answers&) {}, L"{}"},
      {10, [](Answers& a) { a.f64 = {1.5}; }, L"{1.5}"},
      {10,
       [](Answers& a) {
         a.f64 = {1.5, -2, 1e300};
       },
       L"{1.5,-2,1e+300}"},
      {11, [](Answers&) {}, L"{}"},
      {11, [](Answers& a) { a.texts = {L"a"}; }, L"{a}"},
      {11,
       [](Answers& a) {
         a.texts = {L"a", L"b,c"};
       },
       L"{a,b,c}"},
      {11,
       [](Answers& a) {
         a.texts = {L"", std::nullopt, L"x"};
       },
       L"{,,x}"},
      {12, [](Answers&) {}, L"{}"},
      {12, [](Answers& a) { a.objects = {true}; }, L"{" + kGuidText + L"}"},
      {12,
       [](Answers& a) {
         a.objects = {true, false, true};
       },
       L"{" + kGuidText + L",NULL," + kGuidText + L"}"},
      {13, [](Answers&) {}, L"{}"},
      {13, [](Answers& a) { a.guids = {kGuid}; }, L"{" + kGuidText + L"}"},
      {13,
       [](Answers& a) {
         a.guids = {kGuid, GUID_NULL};
       },
       L"{" + kGuidText + L"," + kZeroText + L"}"}};
  return cases;
}

TEST(vltAttributeValues, TextsOfEveryType) {
  for (const auto* cases : {&Singles(), &Lists()}) {
    for (const Case& c : *cases) {
      EXPECT_EQ(TextOf(For(c), S_OK), c.text) << c.type;
      EXPECT_EQ(TextOf(For(c), S_OK, kInner), c.text) << c.type;
    }
  }
}

TEST(vltAttributeValues, OtherSuccessesPassThrough) {
  for (const Case& c : Singles()) {
    Answers answers = For(c);
    answers.result = S_FALSE;
    EXPECT_EQ(TextOf(answers, S_FALSE), c.text) << c.type;
  }
  for (const Case& c : Lists()) {
    Answers answers = For(c);
    answers.result = answers.sizeResult = S_FALSE;
    EXPECT_EQ(TextOf(answers, S_FALSE), c.text) << c.type;
  }
}

TEST(vltAttributeValues, BlobsFastReferencesAndUnknownTypesHaveNone) {
  for (int type : kNotReadable) {
    for (Getter getter : {Getter{&vltGetAttributeValueAsString}, kInner}) {
      EXPECT_EQ(TextOf(Filled(type), E_FAIL, getter), L"(untouched)") << type;
    }
  }
}

TEST(vltAttributeValues, EachFailingStepOfTheTypeIsReturned) {
  for (int type : kReadable) {
    for (HRESULT Answers::*step :
         {&Answers::classResult, &Answers::metaResult, &Answers::typeResult}) {
      Answers answers = Filled(type);
      answers.*step = kFailure;
      for (Getter getter : {Getter{&vltGetAttributeValueAsString}, kInner}) {
        EXPECT_EQ(TextOf(answers, kFailure, getter), L"(untouched)") << type;
      }
    }
  }
}

TEST(vltAttributeValues, AFailedReadLeavesTheTextAlone) {
  for (int type : kReadable) {
    Answers answers = Filled(type);
    answers.result = kFailure;
    EXPECT_EQ(TextOf(answers, kFailure), L"(untouched)") << type;
    answers.sizeResult = kFailure;
    EXPECT_EQ(TextOf(answers, kFailure), L"(untouched)") << type;
  }
}

TEST(vltAttributeValues, TheInnerGetterWritesFailedReferencesAndArrays) {
  Answers answers = Filled(vltReferenceType);
  answers.result = kFailure;
  EXPECT_EQ(TextOf(answers, kFailure, kInner), kZeroText);
  for (int type : {1, 2, 3, 4, 6}) {
    answers.type = static_cast<_vltAttributeType>(type);
    EXPECT_EQ(TextOf(answers, kFailure, kInner), L"(untouched)") << type;
  }
  for (int type = 8; type <= 13; ++type) {
    answers = Filled(type);
    std::wstring whole = TextOf(answers, S_OK, kInner);
    answers.result = kFailure;  // of the elements, which are reported all the same
    EXPECT_EQ(TextOf(answers, kFailure, kInner), whole) << type;
    answers.sizeResult = kFailure;
    EXPECT_EQ(TextOf(answers, kFailure, kInner), L"{}") << type;
  }
}

TEST(vltAttributeValues, AnIdentityThatFailsReadsAsZeros) {
  Answers answers = Filled(vltReferenceType);
  answers.identityResult = kFailure;
  EXPECT_EQ(TextOf(answers, S_OK), kZeroText);
  answers.type = vltReferenceArrayType;
  EXPECT_EQ(TextOf(answers, S_OK), L"{" + kZeroText + L"," + kZeroText + L"}");
}

TEST(vltAttributeValues, NullPointersAreRefused) {
  Answers answers = Filled(1);
  Object object(answers);
  wchar_t* text = nullptr;
  _vltAttributeType type;
  String list;
  for (Getter getter : {Getter{&vltGetAttributeValueAsString}, kInner}) {
    EXPECT_EQ(getter(nullptr, kId, &text), E_POINTER);
    EXPECT_EQ(getter(&object, kId, nullptr), E_POINTER);
  }
  EXPECT_EQ(vltSetAttributeValueFromString(nullptr, kId, L""), E_POINTER);
  EXPECT_EQ(vltGetAttributeType(nullptr, kId, &type), E_POINTER);
  EXPECT_EQ(vltGetAttributeType(&object, kId, nullptr), E_POINTER);
  EXPECT_EQ(vltGetArrayValueAsString(nullptr, kId, vltI32ArrayType, list), E_POINTER);
}

// ---- The type

TEST(vltAttributeValuesType, IsThatOfTheMetaAttribute) {
  g_references = 0;
  for (int wanted : {0, 7, 14, 99}) {
    Answers answers = Type(wanted);
    answers.typeResult = S_FALSE;
    Object object(answers);
    _vltAttributeType type = vltI32Type;
    EXPECT_EQ(vltGetAttributeType(&object, kId, &type), S_FALSE);
    EXPECT_EQ(type, wanted);
    EXPECT_EQ(g_references, 0);
  }
}

TEST(vltAttributeValuesType, ASuccessWithoutAnObjectAborts) {
  for (bool Answers::*null : {&Answers::nullClass, &Answers::nullMeta}) {
    int code = InChild([null] {
      Answers answers = Filled(1);
      answers.*null = true;
      TextOf(answers, S_OK);
    });
    EXPECT_EQ(code, 128 + SIGABRT);
  }
}

// ---- Setting

TEST(vltAttributeValuesSet, TextsBecomeValues) {
  struct Row {
    int type;
    const wchar_t* text;
    const char* call;
  };
  for (const Row& row :
       {Row{1, L"-17 apples", "i32 -17"}, Row{1, L"apples", "i32 0"}, Row{1, nullptr, "i32 0"},
        Row{2, L"4294967295", "u32 4294967295"}, Row{2, L"-1", "u32 4294967295"},
        Row{3, L"1.5e1", "f64 15.000000"}, Row{3, L"", "f64 0.000000"},
        Row{4, L"text", "string text"}, Row{4, L"", "string "}, Row{4, nullptr, "string (null)"},
        Row{6, L"{00112233-4455-6677-8899-AABBCCDDEEFF}", "guid"},
        Row{6, L"00112233-4455-6677-8899-aabbccddeeff", "guid"}, Row{6, L"text", "null guid"},
        Row{6, nullptr, "null guid"}}) {
    for (HRESULT result : {S_OK, S_FALSE, kFailure}) {
      g_references = 0;
      Answers answers = Type(row.type);
      answers.result = result;
      Object object(answers);
      EXPECT_EQ(vltSetAttributeValueFromString(&object, kId, row.text), result);
      EXPECT_EQ(object.calls, std::vector<std::string>{row.call});
      EXPECT_EQ(g_references, 0);
    }
  }
}

TEST(vltAttributeValuesSet, OtherTypesAreRefusedAndNothingIsCalled) {
  for (int type : {0, 5, 7, 8, 9, 10, 11, 12, 13, 14, 15, 99, -1}) {
    g_references = 0;
    Answers answers = Filled(type);
    Object object(answers);
    EXPECT_EQ(vltSetAttributeValueFromString(&object, kId, L"1"), E_FAIL) << type;
    EXPECT_TRUE(object.calls.empty());
    EXPECT_TRUE(object.capacities.empty());
    EXPECT_EQ(g_references, 0);
  }
}

TEST(vltAttributeValuesSet, EachFailingStepOfTheTypeIsReturned) {
  for (HRESULT Answers::*step :
       {&Answers::classResult, &Answers::metaResult, &Answers::typeResult}) {
    g_references = 0;
    Answers answers = Type(1);
    answers.*step = kFailure;
    Object object(answers);
    EXPECT_EQ(vltSetAttributeValueFromString(&object, kId, L"1"), kFailure);
    EXPECT_TRUE(object.calls.empty());
    EXPECT_EQ(g_references, 0);
  }
}

}  // namespace
}  // namespace vlt::test
