#pragma once

// What a client of the registrar does in tests: fill records, read them, walk enumerators. Only the
// public surface is used, so the header serves tests of the inside and of the shared library alike.

#include <gtest/gtest.h>
#include <string.h>

#include <string>
#include <vector>

#include "source/Utilities/vltutils.h"

namespace vlt::test {

inline GUID G(uint32_t n) {
  return {n, 0x1111, 0x4222, {0x83, 0x33, 0x44, 0x44, 0x44, 0x44, 0x44, 0x44}};
}

// The text form of G(n), without braces.
inline std::string GText(uint32_t n) {
  char text[64];
  snprintf(text, sizeof text, "%08X-1111-4222-8333-444444444444", static_cast<unsigned>(n));
  return text;
}

inline constexpr GUID kVltdd = {
    0x790F6A90, 0xE0D8, 0x11D3, {0xAA, 0x15, 0x00, 0x50, 0x04, 0xD1, 0x31, 0xEE}};

// A record that a registrar fills; ends its texts.
struct Received {
  _vltComponent2 value;
  Received() { memset(&value, 0, sizeof value); }
  ~Received() { vltutilsFreeComponent2(value); }
  Received(const Received&) = delete;
  Received& operator=(const Received&) = delete;

  static std::wstring text(const wchar_t* s) { return s ? s : L"(null)"; }
  std::wstring name() const { return text(value.name); }
  std::wstring file() const { return text(value.fileName); }
  std::wstring prefix() const { return text(value.dictionary.prefix); }
  std::wstring pnp() const { return text(value.resource.pnp); }
};

// A record to register, over texts of its own.
struct Offered {
  Offered(_vltComponentType type, const std::wstring& name, GUID id, const std::wstring& file,
          const std::wstring& extra = L"")
      : m_name(name), m_file(file), m_extra(extra) {
    memset(&value, 0, sizeof value);
    value.size = sizeof value;
    value.version = 3;
    value.type = type;
    value.name = m_name.data();
    value.identifier = id;
    value.fileName = m_file.data();
    if (type == vltComponentDataDictionary) value.dictionary.prefix = m_extra.data();
    if (type == vltComponentResourceExpert) value.resource.pnp = m_extra.data();
  }
  Offered(const Offered&) = delete;
  Offered& operator=(const Offered&) = delete;

  _vltComponent2 value;

 private:
  std::wstring m_name, m_file, m_extra;
};

inline HRESULT Find(IvltRegistrar& registrar, GUID id) {
  Received r;
  HRESULT result = registrar.GetComponent(id, &r.value);
  if (result < 0) memset(&r.value, 0, sizeof r.value);
  return result;
}

// Names of all components of the type, in the enumerator's order.
inline std::vector<std::wstring> Names(IvltRegistrar& registrar, _vltComponentType type) {
  std::vector<std::wstring> names;
  IvltEnumComponent* enumerator = nullptr;
  EXPECT_EQ(registrar.EnumComponents(type, &enumerator), S_OK);
  if (!enumerator) return names;
  for (;;) {
    Received r;
    unsigned fetched = 0;
    if (enumerator->Next(1, &r.value, &fetched) != S_OK) break;
    names.push_back(r.name());
  }
  enumerator->Release();
  return names;
}

inline HRESULT SetCacheSize(IvltRegistrar& r, unsigned size) {
  void* raw = nullptr;
  if (r.QueryInterface(IID_IvltRegistrar2, &raw) < 0) return E_NOINTERFACE;
  HRESULT result = static_cast<IvltRegistrar2*>(raw)->SetStorageServerCacheSize(size);
  r.Release();
  return result;
}

inline unsigned CacheSize(IvltRegistrar& r) {
  void* raw = nullptr;
  unsigned size = 0;
  if (r.QueryInterface(IID_IvltRegistrar2, &raw) < 0) return 0;
  static_cast<IvltRegistrar2*>(raw)->GetStorageServerCacheSize(&size);
  r.Release();
  return size;
}

inline std::wstring Wide(const std::string& text) { return std::wstring(text.begin(), text.end()); }

// Path that the registrar returns, freed.
inline std::wstring Path(HRESULT result, wchar_t* path, HRESULT expected = S_OK) {
  EXPECT_EQ(result, expected);
  std::wstring text = path ? path : L"(null)";
  vltFree(path);
  return text;
}

// Components that bind to the class, in the order of the answer.
inline std::vector<GUID> Bound(IvltRegistrar& registrar, _vltComponentType type, GUID bindingClass,
                               HRESULT expected = S_OK) {
  void* raw = nullptr;
  EXPECT_EQ(registrar.QueryInterface(IID_IvltDynamicRegistrar, &raw), S_OK);
  auto* dynamic = static_cast<IvltDynamicRegistrar*>(raw);
  unsigned count = 7;
  GUID* array = nullptr;
  EXPECT_EQ(dynamic->GetComponentsForBindingClass(type, bindingClass, &count, &array), expected);
  std::vector<GUID> found;
  if (array) found.assign(array, array + count);
  vltFree(array);
  dynamic->Release();
  return found;
}

}  // namespace vlt::test
