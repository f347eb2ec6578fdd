#pragma once

#include <utility>

#include "tests/oom/Registrar.h"

// Attribute values as text, over an object of the storage that always answers. It is one of a kind and
// counts no references.
namespace vlt::test::oom {

template <class I>
class Fixed : public I {
 public:
  virtual ~Fixed() = default;
  HRESULT QueryInterface(const GUID&, void**) override { return E_NOINTERFACE; }
  uint32_t AddRef() override { return 1; }
  uint32_t Release() override { return 1; }
};

class FakeMeta : public Fixed<IvltMetaAttribute> {
 public:
  HRESULT GetAttributeType(_vltAttributeType* out) override {
    *out = type;
    return S_OK;
  }
  _vltAttributeType type = vltI32Type;
};

class FakeClass : public Fixed<IvltClass> {
 public:
  HRESULT GetMetaAttribute(vltAttributeID, IvltMetaAttribute** out) override {
    *out = &meta;
    return S_OK;
  }
  FakeMeta meta;
};

class FakeObject : public Fixed<IvltObject> {
 public:
  explicit FakeObject(_vltAttributeType type) { m_class.meta.type = type; }
  FakeClass m_class;

  HRESULT GetObjectID(GUID* id) override { return give(id, kExpert); }
  HRESULT GetClass(IvltClass** out) override {
    *out = &m_class;
    return S_OK;
  }
  HRESULT SetI32Attribute(vltAttributeID, int32_t) override { return S_OK; }
  HRESULT SetU32Attribute(vltAttributeID, uint32_t) override { return S_OK; }
  HRESULT SetF64Attribute(vltAttributeID, double) override { return S_OK; }
  HRESULT SetGuidAttribute(vltAttributeID, GUID) override { return S_OK; }
  HRESULT SetStringAttribute(vltAttributeID, const wchar_t*) override { return S_OK; }
  HRESULT GetI32Attribute(vltAttributeID, int32_t* v) override { return give(v, -1); }
  HRESULT GetU32Attribute(vltAttributeID, uint32_t* v) override { return give(v, 2u); }
  HRESULT GetF64Attribute(vltAttributeID, double* v) override { return give(v, 0.5); }
  HRESULT GetGuidAttribute(vltAttributeID, GUID* v) override { return give(v, kExpert); }
  HRESULT GetStringAttribute(vltAttributeID, wchar_t** v) override { return giveText(v); }
  HRESULT GetReferenceAttribute(vltAttributeID, IvltObject** v) override {
    return give(v, static_cast<IvltObject*>(this));
  }
  HRESULT GetI32ArrayAttribute(vltAttributeID, uint32_t n, int32_t* v, uint32_t* c) override {
    return list(n, v, c, -1);
  }
  HRESULT GetU32ArrayAttribute(vltAttributeID, uint32_t n, uint32_t* v, uint32_t* c) override {
    return list(n, v, c, 2u);
  }
  HRESULT GetF64ArrayAttribute(vltAttributeID, uint32_t n, double* v, uint32_t* c) override {
    return list(n, v, c, 0.5);
  }
  HRESULT GetGuidArrayAttribute(vltAttributeID, uint32_t n, GUID* v, uint32_t* c) override {
    return list(n, v, c, kExpert);
  }
  HRESULT GetStringArrayAttribute(vltAttributeID, uint32_t n, wchar_t** v, uint32_t* c) override {
    *c = 3;
    for (uint32_t i = 0; i < n && i < 3; ++i) giveText(&v[i]);  // null where memory is out
    return S_OK;
  }
  HRESULT GetReferenceArrayAttribute(vltAttributeID, uint32_t n, IvltObject** v,
                                     uint32_t* c) override {
    return list(n, v, c, static_cast<IvltObject*>(this));
  }

 private:
  template <class T>
  static HRESULT give(T* to, T value) {
    *to = value;
    return S_OK;
  }
  static HRESULT giveText(wchar_t** to) {
    *to = static_cast<wchar_t*>(vltAlloc(2 * sizeof(wchar_t)));
    if (!*to) return E_OUTOFMEMORY;
    (*to)[0] = L'x';
    (*to)[1] = 0;
    return S_OK;
  }
  template <class T>
  static HRESULT list(uint32_t capacity, T* to, uint32_t* count, T value) {
    *count = 3;
    for (uint32_t i = 0; i < capacity && i < 3; ++i) to[i] = value;
    return S_OK;
  }
};

inline HRESULT ValueAsString(_vltAttributeType type) {
  FakeObject object(type);
  Text text;
  return text.with(vltGetAttributeValueAsString(&object, 1, text.out()));
}

inline HRESULT SetFromString(_vltAttributeType type, const wchar_t* text) {
  FakeObject object(type);
  return vltSetAttributeValueFromString(&object, 1, text);
}

inline std::vector<Call> ValueCalls() {
  std::vector<Call> calls;
  for (auto type : {vltI32Type, vltU32Type, vltF64Type, vltStringType, vltReferenceType,
                    vltGuidType, vltI32ArrayType, vltU32ArrayType, vltF64ArrayType,
                    vltStringArrayType, vltReferenceArrayType, vltGuidArrayType}) {
    calls.push_back({"vltGetAttributeValueAsString of type " + std::to_string(type),
                     [type] { return ValueAsString(type); }});
  }
  const std::pair<_vltAttributeType, const wchar_t*> settable[] = {
      {vltI32Type, L"-1"},
      {vltU32Type, L"2"},
      {vltF64Type, L"0.5"},
      {vltStringType, L"text"},
      {vltGuidType, L"{00000001-0000-0000-0000-000000000000}"}};
  for (auto [type, text] : settable) {
    calls.push_back({"vltSetAttributeValueFromString of type " + std::to_string(type),
                     [type = type, text = text] { return SetFromString(type, text); }});
  }
  return calls;
}

}  // namespace vlt::test::oom
