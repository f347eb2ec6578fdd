#pragma once

// Reference-counted objects in the manner of COM, without registry, apartments or marshalling.
//
// An implementation class derives from its interface first, then from
// CZTComObjectRootEx<CZTComMultiThreadModelNoCS>, and lists its interfaces in a static
// _GetEntries(). CZTComObject<T> makes it an object. Broken contracts abort the process: a null
// out-pointer, a release too many, a table without a first interface.

#include <cstdint>
#include <cstdlib>
#include <new>

#include "ztcom/ztcore/ztlock.h"
#include "ztcom/ztcore/ztunknown.h"

// Row of an interface map. The table ends with a row whose function is 0.
struct _ZTCOM_INTMAP_ENTRY {
  const GUID* iid;     // null: the row is used for all interfaces
  uintptr_t offset;    // of the interface from the object's start, or the function's argument
  uintptr_t function;  // kZtComSimpleEntry, 0 at the end, or a ZtComMapFunction
};
inline constexpr uintptr_t kZtComSimpleEntry = 1;
using ZtComMapFunction = HRESULT (*)(void* object, const GUID& iid, void** out, uintptr_t argument);

// Answers QueryInterface from the table. S_OK with a reference taken; otherwise *out is null and
// the result E_NOINTERFACE or that of the function row which refused. IID_IUnknown is the first
// row.
HRESULT ZTComInternalQueryInterface(void* object, const _ZTCOM_INTMAP_ENTRY* entries,
                                    const GUID& iid, void** out);

// 0 for results from 0 up, else 0x800A0000 with the magnitude.
HRESULT HResultFromZTResult(int result);

// The count, which CZTComObject changes by the rules of the implementation class's thread model.
class CZTComObjectRootBase {
 public:
  int32_t m_refCount = 0;
};

// Atomic counting without a section of the object's own: its data are the class's to guard.
struct CZTComMultiThreadModelNoCS {
  static int32_t Increment(int32_t* count) { return ZTInterlockedInc(count); }
  static int32_t Decrement(int32_t* count) { return ZTInterlockedDec(count); }
};

template <class ThreadModel>
class CZTComObjectRootEx : public CZTComObjectRootBase {
 public:
  using ThreadingModel = ThreadModel;
};

// The object of an implementation class T. Threads: the count may change from any thread.
template <class T>
class CZTComObject : public T {
 public:
  CZTComObject() = default;
  CZTComObject(const CZTComObject&) = delete;
  CZTComObject& operator=(const CZTComObject&) = delete;

  // Stores a new object with count 0: the caller takes the first reference. E_OUTOFMEMORY and null
  // when memory is out; what T's constructor throws passes.
  static HRESULT CreateInstance(CZTComObject<T>** out) {
    if (!out) abort();
    *out = new (std::nothrow) CZTComObject<T>;
    if (!*out) return E_OUTOFMEMORY;
    if ((*out)->m_refCount != 0) abort();
    return S_OK;
  }

  HRESULT QueryInterface(const GUID& iid, void** out) override {
    return ZTComInternalQueryInterface(this, T::_GetEntries(), iid, out);
  }

  uint32_t AddRef() override {
    if (ZTInterlockedGet(&this->m_refCount) == -1) abort();
    return static_cast<uint32_t>(T::ThreadingModel::Increment(&this->m_refCount));
  }

  // The last reference deletes the object in this thread; one too many aborts.
  uint32_t Release() override {
    if (ZTInterlockedGet(&this->m_refCount) < 1) abort();
    int32_t left = T::ThreadingModel::Decrement(&this->m_refCount);
    if (left == 0) delete this;
    return static_cast<uint32_t>(left);
  }

  // The count is 1 meanwhile, so that a QueryInterface and Release pair inside T's
  // destructor does not delete a second time.
  virtual ~CZTComObject() { this->m_refCount = 1; }

  // Kept for the layout of the dispatch table; does nothing.
  virtual HRESULT RemoteNext(unsigned int, wchar_t**, unsigned int*) { return S_OK; }
};

template <class T>
T* ZtAddRef(T* p) {
  if (p) p->AddRef();
  return p;
}

// The interface with a reference, or null.
template <class I, class T>
I* ZtTryQueryInterface(const GUID& iid, T* p) {
  void* out = nullptr;
  if (!p || p->QueryInterface(iid, &out) < 0) return nullptr;
  return static_cast<I*>(out);
}

// New object with count 1; throws the HRESULT as a plain int.
template <class T>
CZTComObject<T>* ZtATLNew() {
  CZTComObject<T>* object = nullptr;
  HRESULT result = CZTComObject<T>::CreateInstance(&object);
  if (result < 0) throw static_cast<int>(result);
  object->AddRef();
  return object;
}

// Holds one reference.
template <class T>
class CztComPtr {
 public:
  CztComPtr() = default;
  // A reference of its own; null is allowed. Attach takes over the caller's instead.
  explicit CztComPtr(T* p) : m_p(ZtAddRef(p)) {}
  CztComPtr(const CztComPtr& other) : m_p(ZtAddRef(other.m_p)) {}
  ~CztComPtr() {
    if (m_p) m_p->Release();
  }

  CztComPtr& operator=(const CztComPtr& other) { return *this = other.m_p; }

  // Assigning the object that is held already, by whichever of its interfaces, does nothing.
  CztComPtr& operator=(T* p) {
    if (isSameObject(p)) return *this;
    T* old = m_p;
    m_p = ZtAddRef(p);
    if (old) old->Release();
    return *this;
  }

  // Takes over a reference that the caller holds.
  static CztComPtr Attach(T* p) {
    CztComPtr out;
    out.m_p = p;
    return out;
  }

  // For calls that return a reference; drops what was held.
  T** out() {
    if (m_p) m_p->Release();
    m_p = nullptr;
    return &m_p;
  }

  // The pointer without a reference, good as long as this object holds it.
  T* get() const { return m_p; }
  T* operator->() const { return m_p; }
  explicit operator bool() const { return m_p != nullptr; }

 private:
  bool isSameObject(T* p) const {
    if (m_p == p) return true;
    if (!m_p || !p) return false;
    CztComPtr<IUnknown> mine =
        CztComPtr<IUnknown>::Attach(ZtTryQueryInterface<IUnknown>(IID_IUnknown, m_p));
    CztComPtr<IUnknown> theirs =
        CztComPtr<IUnknown>::Attach(ZtTryQueryInterface<IUnknown>(IID_IUnknown, p));
    return mine && mine.get() == theirs.get();
  }

  T* m_p = nullptr;
};
