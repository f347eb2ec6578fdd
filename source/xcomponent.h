#pragma once

// The component record as an object, and its conversions between generations.

#include "source/Common/vltTypes.h"

namespace zt::fnd::osdep {
class SharedLibrary;
}

// Owns one component record and its texts.
//
// Every text is a block of its own from ZtTaskMemAlloc. Copies are deep; Attach takes the texts of
// the source over. Threads: none of its own; the registrar's map lock guards the objects inside it.
class CvltComponent {
 public:
  // Null identifier, no texts; size is that of the record, version 0xFFFFFFFF.
  CvltComponent();
  // Takes over the source's texts, or copies them. A failed copy leaves a component without texts.
  CvltComponent(_vltComponent* source, bool attach);
  CvltComponent(_vltComponent2* source, bool attach);
  CvltComponent(const CvltComponent&) = delete;
  CvltComponent& operator=(const CvltComponent&) = delete;
  virtual ~CvltComponent();

  // Zeroes all but size and version.
  void InitDataMembers();

  // Takes the source's pointers as they are. What was owned before is not freed.
  void Attach(_vltComponent* source);
  void Attach2(_vltComponent2* source);

  // Exchanges the records of two components of one type; else nothing.
  void Swap(CvltComponent& other);

  // Frees the texts and zeroes the common fields; the variant keeps its old values, which the type
  // 0 makes unreachable. A component whose name holds both "Motion" and "Expert" keeps its name and
  // pnp blocks indefinitely: such components have given those pointers to clients.
  void Clear();

  // Deep copies of a source record into an uninitialised target.
  //
  // The first negative result of name and fileName ends the copy; of the variant's texts the last
  // one's result counts, and an earlier one that failed is null. E_OUTOFMEMORY is the only failure.
  // The target then owns nothing and its texts, as far as the copy came, are null.
  static HRESULT Copy(_vltComponent2* target, const _vltComponent* source);
  static HRESULT Copy2(_vltComponent2* target, const _vltComponent2* source);
  static HRESULT Copy2(_vltComponent2point1* target, const _vltComponent2* source);
  static HRESULT Copy2(_vltComponent2point2* target, const _vltComponent2* source);

  HRESULT CopyTo(_vltComponent2* target) const { return Copy2(target, &m_record); }
  HRESULT CopyTo(_vltComponent2point1* target) const { return Copy2(target, &m_record); }
  HRESULT CopyTo(_vltComponent2point2* target) const { return Copy2(target, &m_record); }

  // A null source gives a null target and S_OK.
  static HRESULT DuplicateStringNullOK(const wchar_t* source, wchar_t** target);

  _vltComponent2& record() { return m_record; }
  const _vltComponent2& record() const { return m_record; }

 private:
  _vltComponent2 m_record;
};

static_assert(sizeof(CvltComponent) == (sizeof(void*) == 8 ? 120 : 76), "object size stamp");

// A component whose code its maker has loaded. The library is only remembered, never released.
class CvltDynComponent : public CvltComponent {
 public:
  CvltDynComponent() = default;
  CvltDynComponent(_vltComponent* source, bool attach) : CvltComponent(source, attach) {}
  CvltDynComponent(_vltComponent2* source, bool attach) : CvltComponent(source, attach) {}
  CvltDynComponent(_vltComponent* source, zt::fnd::osdep::SharedLibrary* library, bool attach)
      : CvltComponent(source, attach), m_library(library) {}
  CvltDynComponent(_vltComponent2* source, zt::fnd::osdep::SharedLibrary* library, bool attach)
      : CvltComponent(source, attach), m_library(library) {}

  zt::fnd::osdep::SharedLibrary* library() const { return m_library; }

 private:
  zt::fnd::osdep::SharedLibrary* m_library = nullptr;
};
