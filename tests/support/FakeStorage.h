#pragma once

// A storage object that answers as configured, and counts the references to it and its parts. For
// tests of what reads and writes attributes.
#include <gtest/gtest.h>
#include <string.h>

#include <algorithm>
#include <optional>
#include <string>
#include <vector>

#include "source/Common/vltAttributeValues.h"
#include "source/Common/vltcmn.h"
#include "source/Utilities/vltutils.h"

namespace vlt::test {

inline constexpr unsigned kId = 42;
inline constexpr HRESULT kFailure = E_UNEXPECTED;
inline constexpr GUID kGuid = {
    0x00112233, 0x4455, 0x6677, {0x88, 0x99, 0xAA, 0xBB, 0xCC, 0xDD, 0xEE, 0xFF}};
inline const std::wstring kGuidText = L"{00112233-4455-6677-8899-AABBCCDDEEFF}";
inline const std::wstring kZeroText = L"{00000000-0000-0000-0000-000000000000}";

inline const std::wstring kMinusOne = sizeof(long) == 8 ? L"4294967295" : L"-1";

// References of everything below together; 0 when a test ends.
inline int g_references = 0;

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

inline std::wstring Take(wchar_t* text) {
  std::wstring copy = text ? text : L"(null)";
  vltFree(text);
  return copy;
}

inline wchar_t g_untouched[] = L"(untouched)";

using Getter = HRESULT (*)(IvltObject*, unsigned, wchar_t**);

// Text that the getter gives for these answers, "(untouched)" if it gave none. All references must
// have come back.
inline std::wstring TextOf(const Answers& answers, HRESULT expected,
                           Getter getter = &vltGetAttributeValueAsString) {
  g_references = 0;
  Object object(answers);
  wchar_t* text = g_untouched;
  EXPECT_EQ(getter(&object, kId, &text), expected);
  EXPECT_EQ(g_references, 0);
  return text == g_untouched ? L"(untouched)" : Take(text);
}

inline constexpr Getter kInner = &vltGetAttributeValueAsString2;

inline Answers Type(int type) {
  Answers answers;
  answers.type = static_cast<_vltAttributeType>(type);
  return answers;
}

// One value of the type, and more than one of a list's.
inline Answers Filled(int type) {
  Answers answers = Type(type);
  answers.i32 = {1, 2};
  answers.u32 = {1, 2};
  answers.f64 = {1, 2};
  answers.guids = {kGuid, kGuid};
  answers.texts = {L"a", L"b"};
  answers.objects = {true, true};
  return answers;
}

inline constexpr int kReadable[] = {1, 2, 3, 4, 5, 6, 8, 9, 10, 11, 12, 13};
inline constexpr int kNotReadable[] = {0, 7, 14, 15, 99, -1};

}  // namespace vlt::test
