#pragma once

// What the swept calls work on: the registrar of the process, which the child has before its sweep, and a
// small installation.
#include <string.h>

#include <string>
#include <vector>

#include "source/Utilities/vltutils.h"
#include "tests/support/FailingHeap.h"

namespace vlt::test::oom {

using heap::Call;

inline IvltRegistrar* g_registrar = nullptr;
inline std::string g_root;  // of the installation

inline constexpr GUID kExpert = {1, 0, 0, {}};
inline constexpr GUID kDictionary = {2, 0, 0, {}};
inline constexpr GUID kResourceExpert = {3, 0, 0, {}};
inline constexpr GUID kBindingClass = {0xA, 0, 0, {}};

// A returned text: freed, and a failure if there is none.
inline HRESULT Take(wchar_t* text) {
  if (!text) return E_OUTOFMEMORY;
  vltFree(text);
  return S_OK;
}

// For calls that cannot fail, or whose result is no HRESULT.
template <class Value>
HRESULT Done(const Value&) {
  return S_OK;
}

// The result, if it is the one that the call has by design.
inline HRESULT ByDesign(HRESULT result, HRESULT designed) {
  return result == designed ? S_OK : result < 0 ? result : E_UNEXPECTED;
}

// Another interface of the registrar, released at the end of the scope.
template <class I>
class As {
 public:
  explicit As(const GUID& iid) {
    void* out = nullptr;
    g_registrar->QueryInterface(iid, &out);
    m_interface = static_cast<I*>(out);
  }
  ~As() {
    if (m_interface) m_interface->Release();
  }
  As(const As&) = delete;
  As& operator=(const As&) = delete;
  I* operator->() const { return m_interface; }

 private:
  I* m_interface;
};

// A record to be filled, and ended.
struct Record : _vltComponent2 {
  Record() { clear(); }
  ~Record() { vltutilsFreeComponent2(*this); }
  Record(const Record&) = delete;
  Record& operator=(const Record&) = delete;
  void clear() { memset(static_cast<_vltComponent2*>(this), 0, sizeof(_vltComponent2)); }
  void next() {
    vltutilsFreeComponent2(*this);
    clear();
  }
};

// A text out-parameter, freed at the end of the scope, also when an exception leaves.
struct Text {
  wchar_t* value = nullptr;
  ~Text() { vltFree(value); }
  wchar_t** out() { return &value; }
  HRESULT with(HRESULT result) const { return result >= 0 && !value ? E_OUTOFMEMORY : result; }
};

}  // namespace vlt::test::oom
