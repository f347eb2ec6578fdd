#include "source/Common/vltAttributeValues.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <string.h>

#include <functional>
#include <optional>

#include "source/Common/vltcmn.h"
#include "source/Utilities/vltHookPoints.h"
#include "source/Utilities/vltutils.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/MemoryLimit.h"

namespace vlt::test {
namespace {

using zt::fnd::String;

constexpr unsigned kId = 42;
constexpr HRESULT kFailure = E_UNEXPECTED;
constexpr GUID kGuid = {
    0x00112233, 0x4455, 0x6677, {0x88, 0x99, 0xAA, 0xBB, 0xCC, 0xDD, 0xEE, 0xFF}};
const std::wstring kGuidText = L"{00112233-4455-6677-8899-AABBCCDDEEFF}";
const std::wstring kZeroText = L"{00000000-0000-0000-0000-000000000000}";

const std::wstring kMinusOne = sizeof(long) == 8 ? L"4294967295" : L"-1";

// References of everything below together; 0 when a test ends.
int g_references = 0;

template <class I>
class Counted : public I {
 public:
  virtual ~Counted() = default;
  HRESULT QueryInterface(const GUID&, void**) override { return E_NOINTERFACE; }
  uint32_t AddRef() override { return static_cast<uint32_t>(++g_references); }
  uint32_t Release() override { return static_cast<uint32_t>(--g_references); }
};

// What the storage answers. A failing step leaves garbage in its output, as a storage may.
struct Answers {
  _vltAttributeType type = vltUnspecifiedType;
  HRESULT classResult = S_OK, metaResult = S_OK, typeResult = S_OK;
  bool nullClass = false, nullMeta = false;
  HRESULT result = S_OK;                     // of a getter or setter, and of a list's elements
  HRESULT sizeResult = S_OK;                 // of a list's size
  std::optional<uint32_t> announced, given;  // counts other than that of the values
  HRESULT identityResult = S_OK;

  std::vector<int32_t> i32;
  std::vector<uint32_t> u32;
  std::vector<double> f64;
  std::vector<GUID> guids;
  std::vector<std::optional<std::wstring>> texts;
  std::vector<bool> objects;  // false: a null one
};

template <class I>
I* Garbage() {
  return reinterpret_cast<I*>(uintptr_t{1});
}

class Meta : public Counted<IvltMetaAttribute> {
 public:
  explicit Meta(const Answers& answers) : m_answers(answers) {}
  HRESULT GetAttributeType(_vltAttributeType* type) override {
    *type = m_answers.type;
    return m_answers.typeResult;
  }

 private:
  const Answers& m_answers;
};

class Class : public Counted<IvltClass> {
 public:
  explicit Class(const Answers& answers) : m_answers(answers), m_meta(answers) {}
  HRESULT GetMetaAttribute(vltAttributeID id, IvltMetaAttribute** out) override {
    EXPECT_EQ(id, kId);
    if (m_answers.metaResult < 0) *out = Garbage<IvltMetaAttribute>();
    if (m_answers.metaResult < 0 || m_answers.nullMeta) return m_answers.metaResult;
    *out = &m_meta;
    m_meta.AddRef();
    return m_answers.metaResult;
  }

 private:
  const Answers& m_answers;
  Meta m_meta;
};

class Object : public Counted<IvltObject> {
 public:
  explicit Object(const Answers& answers) : m_answers(answers), m_class(answers) {}

  std::vector<std::string> calls;
  std::vector<uint32_t> capacities;

  HRESULT GetObjectID(GUID* id) override {
    if (m_answers.identityResult >= 0) *id = kGuid;
    return m_answers.identityResult;
  }
  HRESULT GetClass(IvltClass** out) override {
    if (m_answers.classResult < 0) *out = Garbage<IvltClass>();
    if (m_answers.classResult < 0 || m_answers.nullClass) return m_answers.classResult;
    *out = &m_class;
    m_class.AddRef();
    return m_answers.classResult;
  }

  HRESULT SetI32Attribute(vltAttributeID id, int32_t v) override {
    return called(id, "i32 " + std::to_string(v));
  }
  HRESULT SetU32Attribute(vltAttributeID id, uint32_t v) override {
    return called(id, "u32 " + std::to_string(v));
  }
  HRESULT SetF64Attribute(vltAttributeID id, double v) override {
    return called(id, "f64 " + std::to_string(v));
  }
  HRESULT SetGuidAttribute(vltAttributeID id, GUID v) override {
    return called(id, memcmp(&v, &kGuid, sizeof v) == 0       ? "guid"
                      : memcmp(&v, &GUID_NULL, sizeof v) == 0 ? "null guid"
                                                              : "another guid");
  }
  HRESULT SetStringAttribute(vltAttributeID id, const wchar_t* v) override {
    std::wstring text = v ? v : L"(null)";
    return called(id, "string " + std::string(text.begin(), text.end()));
  }

  HRESULT GetI32Attribute(vltAttributeID id, int32_t* out) override {
    return single(id, m_answers.i32, out);
  }
  HRESULT GetU32Attribute(vltAttributeID id, uint32_t* out) override {
    return single(id, m_answers.u32, out);
  }
  HRESULT GetF64Attribute(vltAttributeID id, double* out) override {
    return single(id, m_answers.f64, out);
  }
  HRESULT GetGuidAttribute(vltAttributeID id, GUID* out) override {
    return single(id, m_answers.guids, out);
  }
  HRESULT GetStringAttribute(vltAttributeID id, wchar_t** out) override {
    EXPECT_EQ(id, kId);
    *out = m_answers.result < 0 ? Garbage<wchar_t>() : copy(m_answers.texts.at(0));
    return m_answers.result;
  }
  HRESULT GetReferenceAttribute(vltAttributeID id, IvltObject** out) override {
    EXPECT_EQ(id, kId);
    *out = m_answers.result < 0 ? Garbage<IvltObject>() : reference(m_answers.objects.at(0));
    return m_answers.result;
  }

  HRESULT GetI32ArrayAttribute(vltAttributeID id, uint32_t capacity, int32_t* buffer,
                               uint32_t* count) override {
    return list(id, capacity, buffer, count, m_answers.i32, [](int32_t v) { return v; });
  }
  HRESULT GetU32ArrayAttribute(vltAttributeID id, uint32_t capacity, uint32_t* buffer,
                               uint32_t* count) override {
    return list(id, capacity, buffer, count, m_answers.u32, [](uint32_t v) { return v; });
  }
  HRESULT GetF64ArrayAttribute(vltAttributeID id, uint32_t capacity, double* buffer,
                               uint32_t* count) override {
    return list(id, capacity, buffer, count, m_answers.f64, [](double v) { return v; });
  }
  HRESULT GetGuidArrayAttribute(vltAttributeID id, uint32_t capacity, GUID* buffer,
                                uint32_t* count) override {
    return list(id, capacity, buffer, count, m_answers.guids, [](GUID v) { return v; });
  }
  HRESULT GetStringArrayAttribute(vltAttributeID id, uint32_t capacity, wchar_t** buffer,
                                  uint32_t* count) override {
    return list(id, capacity, buffer, count, m_answers.texts,
                [](const std::optional<std::wstring>& v) { return copy(v); });
  }
  HRESULT GetReferenceArrayAttribute(vltAttributeID id, uint32_t capacity, IvltObject** buffer,
                                     uint32_t* count) override {
    return list(id, capacity, buffer, count, m_answers.objects,
                [this](bool v) { return reference(v); });
  }

 private:
  HRESULT called(vltAttributeID id, const std::string& call) {
    EXPECT_EQ(id, kId);
    calls.push_back(call);
    return m_answers.result;
  }
  template <class T>
  HRESULT single(vltAttributeID id, const std::vector<T>& values, T* out) {
    EXPECT_EQ(id, kId);
    if (!values.empty()) *out = values[0];
    return m_answers.result;
  }
  static wchar_t* copy(const std::optional<std::wstring>& text) {
    return text ? Dup(text->c_str()) : nullptr;
  }
  IvltObject* reference(bool there) {
    if (!there) return nullptr;
    AddRef();
    return this;
  }
  template <class Values, class T, class Make>
  HRESULT list(vltAttributeID id, uint32_t capacity, T* buffer, uint32_t* count,
               const Values& values, Make make) {
    EXPECT_EQ(id, kId);
    auto size = static_cast<uint32_t>(values.size());
    capacities.push_back(capacity);
    if (capacity == 0) {
      EXPECT_EQ(buffer, nullptr);
      *count = m_answers.announced.value_or(size);
      return m_answers.sizeResult;
    }
    uint32_t there = std::min({capacity, size, m_answers.given.value_or(size)});
    for (uint32_t i = 0; i < there; ++i) buffer[i] = make(values[i]);
    *count = m_answers.given.value_or(there);
    return m_answers.result;
  }

  const Answers& m_answers;
  Class m_class;
};

std::wstring Take(wchar_t* text) {
  std::wstring copy = text ? text : L"(null)";
  vltFree(text);
  return copy;
}

wchar_t g_untouched[] = L"(untouched)";

using Getter = HRESULT (*)(IvltObject*, unsigned, wchar_t**);

// Text that the getter gives for these answers, "(untouched)" if it gave none. All references must
// have come back.
std::wstring TextOf(const Answers& answers, HRESULT expected,
                    Getter getter = &vltGetAttributeValueAsString) {
  g_references = 0;
  Object object(answers);
  wchar_t* text = g_untouched;
  EXPECT_EQ(getter(&object, kId, &text), expected);
  EXPECT_EQ(g_references, 0);
  return text == g_untouched ? L"(untouched)" : Take(text);
}

constexpr Getter kInner = &vltGetAttributeValueAsString2;

Answers Type(int type) {
  Answers answers;
  answers.type = static_cast<_vltAttributeType>(type);
  return answers;
}

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

// One value of the type, and more than one of a list's.
Answers Filled(int type) {
  Answers answers = Type(type);
  answers.i32 = {1, 2};
  answers.u32 = {1, 2};
  answers.f64 = {1, 2};
  answers.guids = {kGuid, kGuid};
  answers.texts = {L"a", L"b"};
  answers.objects = {true, true};
  return answers;
}

const int kReadable[] = {1, 2, 3, 4, 5, 6, 8, 9, 10, 11, 12, 13};
const int kNotReadable[] = {0, 7, 14, 15, 99, -1};

TEST(AttributeValue, TextsOfEveryType) {
  for (const auto* cases : {&Singles(), &Lists()}) {
    for (const Case& c : *cases) {
      EXPECT_EQ(TextOf(For(c), S_OK), c.text) << c.type;
      EXPECT_EQ(TextOf(For(c), S_OK, kInner), c.text) << c.type;
    }
  }
}

TEST(AttributeValue, OtherSuccessesPassThrough) {
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

TEST(AttributeValue, BlobsFastReferencesAndUnknownTypesHaveNone) {
  for (int type : kNotReadable) {
    for (Getter getter : {Getter{&vltGetAttributeValueAsString}, kInner}) {
      EXPECT_EQ(TextOf(Filled(type), E_FAIL, getter), L"(untouched)") << type;
    }
  }
}

TEST(AttributeValue, EachFailingStepOfTheTypeIsReturned) {
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

TEST(AttributeValue, AFailedReadLeavesTheTextAlone) {
  for (int type : kReadable) {
    Answers answers = Filled(type);
    answers.result = kFailure;
    EXPECT_EQ(TextOf(answers, kFailure), L"(untouched)") << type;
    answers.sizeResult = kFailure;
    EXPECT_EQ(TextOf(answers, kFailure), L"(untouched)") << type;
  }
}

TEST(AttributeValue, TheInnerGetterWritesFailedReferencesAndArrays) {
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
    answers.result = kFailure;  // of the elements, which are told all the same
    EXPECT_EQ(TextOf(answers, kFailure, kInner), whole) << type;
    answers.sizeResult = kFailure;
    EXPECT_EQ(TextOf(answers, kFailure, kInner), L"{}") << type;
  }
}

TEST(AttributeValue, AnIdentityThatFailsReadsAsZeros) {
  Answers answers = Filled(vltReferenceType);
  answers.identityResult = kFailure;
  EXPECT_EQ(TextOf(answers, S_OK), kZeroText);
  answers.type = vltReferenceArrayType;
  EXPECT_EQ(TextOf(answers, S_OK), L"{" + kZeroText + L"," + kZeroText + L"}");
}

TEST(AttributeValue, NullPointersAreRefused) {
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

TEST(AttributeType, IsThatOfTheMetaAttribute) {
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

TEST(AttributeType, ASuccessWithoutAnObjectAborts) {
  for (bool Answers::*null : {&Answers::nullClass, &Answers::nullMeta}) {
    int code = InChild([null] {
      Answers answers = Filled(1);
      answers.*null = true;
      TextOf(answers, S_OK);
    });
    EXPECT_EQ(code, 128 + SIGABRT);
  }
}

// ---- Lists

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

TEST(AttributeList, TypesThatAreNoneGiveAnEmptyOne) {
  for (int type : {0, 1, 2, 3, 4, 5, 6, 7, 14, 15, -1}) {
    EXPECT_EQ(ListText(Filled(type), E_FAIL), L"{}") << type;
  }
}

TEST(AttributeList, AsksForTheSizeAndThenForTheElements) {
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

TEST(AttributeList, FewerElementsThanAnnounced) {
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

TEST(AttributeList, MoreElementsThanThereIsRoomFor) {
  for (int type = 8; type <= 13; ++type) {
    Answers answers = Filled(type);
    answers.given = 0xFFFFFFFF;
    EXPECT_EQ(ListText(answers, S_OK), ListText(Filled(type), S_OK)) << type;
  }
}

TEST(AttributeList, ElementsThatDoNotComeAreZeros) {
  const std::pair<int, const wchar_t*> rows[] = {
      {8, L"{0,0}"}, {9, L"{0,0}"}, {10, L"{0,0}"}, {11, L"{,}"}, {12, L"{NULL,NULL}"}};
  for (const auto& [type, text] : rows) {
    Answers answers = Type(type);
    answers.announced = answers.given = 2;
    answers.result = kFailure;
    EXPECT_EQ(ListText(answers, kFailure), text);
  }
}

TEST(AttributeList, ManyElementsTakeTimeInProportion) {
  Answers answers = Type(vltU32ArrayType);
  answers.u32.assign(200000, 7);
  EXPECT_EQ(ListText(answers, S_OK).size(), 400001u);
}

TEST(AttributeList, ACountThatIsNotTrueIsOutOfMemory) {
  if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer holds the address space";
  int code = InChild([] {
    LimitMemoryTo(64 << 20);
    for (int type = 8; type <= 13; ++type) {
      Answers answers = Filled(type);
      answers.announced = 0xFFFFFFFF;
      EXPECT_EQ(ListText(answers, E_OUTOFMEMORY), L"{") << type;
      EXPECT_EQ(TextOf(answers, E_OUTOFMEMORY), L"(untouched)") << type;
    }
  });
  EXPECT_EQ(code, 0);
}

// Runs expectations in a process that is armed at this point.
int Armed(const char* point, const char* fault, const std::function<void()>& body) {
  Installation installation;
  WriteBytes(installation.root() + "/VLTHooks.ini",
             std::string("[Hook]\nName = ") + point + "\n" + fault + " = true\n");
  return InChild([&] {
    vltRefreshHook();
    body();
  });
}

constexpr const char* kSimulate = "SimulateMemoryAllocationFailure";
constexpr const char* kThrow = "SimulateMemoryAllocationFailureAndThrow";

TEST(AttributeList, HookPointsActAsAFailedAllocation) {
  const std::pair<int, const char*> points[] = {{8, "TestHookNT\"./source/Common/vltcmn\"96"},
                                                {9, "TestHookNT\"./source/Common/vltcmn\"111"},
                                                {10, "TestHookNT\"./source/Common/vltcmn\"126"},
                                                {13, "TestHookNT\"./source/Common/vltcmn\"141"},
                                                {11, "TestHookNT\"./source/Common/vltcmn\"158"},
                                                {12, "TestHookNT\"./source/Common/vltcmn\"174"}};
  for (const auto& [type, point] : points) {
    int code = Armed(point, kSimulate, [type = type] {
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
    EXPECT_EQ(code, 0) << point;
  }
}

TEST(AttributeList, AnExceptionGivesEverythingBack) {
  int code = Armed(hook::kStringFromClsid, kThrow, [] {
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
  EXPECT_EQ(code, 0);
}

TEST(AttributeList, AnElementWithoutATextIsOutOfMemory) {
  int code = Armed(hook::kDuplicateString2, kSimulate, [] {
    for (int type : {12, 13}) EXPECT_EQ(ListText(Filled(type), E_OUTOFMEMORY), L"{,}");
    for (int type : {5, 6}) {
      EXPECT_EQ(TextOf(Filled(type), E_OUTOFMEMORY), L"(untouched)");
      Answers failing = Filled(type);
      failing.result = kFailure;
      EXPECT_EQ(TextOf(failing, kFailure, kInner), L"(untouched)");
    }
  });
  EXPECT_EQ(code, 0);
}

// ---- Setting

TEST(AttributeSet, TextsBecomeValues) {
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

TEST(AttributeSet, OtherTypesAreRefusedAndNothingIsCalled) {
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

TEST(AttributeSet, EachFailingStepOfTheTypeIsReturned) {
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
