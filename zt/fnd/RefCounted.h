#pragma once

#include <utility>

#include "zt/fnd/DLLAlloc.h"
#include "zt/fnd/osdep/AtomicInt.h"
#include "zt/fnd/osdep/CriticalSection.h"
#include "zt/fnd/osdep/Hold.h"

namespace zt::fnd {

// Base of objects with a reference count that any thread may change. The count starts at 0: whoever
// makes the object takes the first reference, by a RefPtr. The object goes with its last reference,
// in the thread that released it, and by its virtual destructor. Objects come from the module
// allocator, so that another module may release them.
class RefCountedThreadSafePolicy : public DLLAlloced {
 public:
  RefCountedThreadSafePolicy() : m_references(0) {}
  virtual ~RefCountedThreadSafePolicy() = default;
  RefCountedThreadSafePolicy(const RefCountedThreadSafePolicy&) = delete;
  RefCountedThreadSafePolicy& operator=(const RefCountedThreadSafePolicy&) = delete;

  void addRef() const { m_references.increment(); }
  void release() const {
    if (m_references.decrement() == 0) delete this;
  }

 private:
  mutable osdep::AtomicInt m_references;
};

// Base of objects with a reference count that one thread at a time may change.
class RefCountedThreadUnsafePolicy : public DLLAlloced {
 public:
  RefCountedThreadUnsafePolicy() = default;
  virtual ~RefCountedThreadUnsafePolicy() = default;
  RefCountedThreadUnsafePolicy(const RefCountedThreadUnsafePolicy&) = delete;
  RefCountedThreadUnsafePolicy& operator=(const RefCountedThreadUnsafePolicy&) = delete;

  void addRef() const { ++m_references; }
  void release() const {
    if (--m_references == 0) delete this;
  }

 private:
  mutable int m_references = 0;
};

// Base of objects that are counted, and destroyed, inside a section that belongs to another object
// and has to outlive the last release().
class RefCountedCriticalSectionPolicy : public RefCountedThreadUnsafePolicy {
 public:
  explicit RefCountedCriticalSectionPolicy(const osdep::CriticalSection* section)
      : m_section(section) {}

  void addRef() const {
    osdep::Hold hold(*m_section);
    RefCountedThreadUnsafePolicy::addRef();
  }
  void release() const {
    const osdep::CriticalSection& section = *m_section;  // the object may go first
    osdep::Hold hold(section);
    RefCountedThreadUnsafePolicy::release();
  }

 private:
  const osdep::CriticalSection* m_section;
};

// Counted pointer to an object that has addRef() and release().
template <class T>
class RefPtr {
 public:
  // Takes a reference of its own; null is allowed. Implicit, so that a function may return a plain
  // pointer as a RefPtr.
  RefPtr(T* object = nullptr) : m_object(object) {
    if (m_object) m_object->addRef();
  }
  RefPtr(const RefPtr& other) : RefPtr(other.m_object) {}
  RefPtr(RefPtr&& other) noexcept : m_object(other.detach()) {}
  ~RefPtr() {
    if (m_object) m_object->release();
  }
  // By swap: the old object goes last, when this pointer has its new one already.
  RefPtr& operator=(RefPtr other) noexcept {
    std::swap(m_object, other.m_object);
    return *this;
  }

  // The pointer, which stays this object's; null for none.
  T* get() const noexcept { return m_object; }
  T* operator->() const noexcept { return m_object; }
  T& operator*() const noexcept { return *m_object; }
  explicit operator bool() const noexcept { return m_object != nullptr; }

  // Returns the pointer and keeps none: the reference is the caller's from here on.
  T* detach() noexcept { return std::exchange(m_object, nullptr); }

 private:
  T* m_object;
};

}  // namespace zt::fnd
