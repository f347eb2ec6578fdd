#pragma once

// Which classes of objects an expert binds to, and who binds to a class.

#include <map>

#include "source/Common/vltTypes.h"
#include "zt/fnd/Guid.h"
#include "zt/fnd/String.h"
#include "zt/fnd/Vector.h"

// Table of one text: component GUID, count n, n class GUIDs, with ":" between all fields and
// entries.
//
//   {P}:2:{Q}:{R}:{S}:0     P binds to Q and R, S to nothing
//
// GUIDs may lack their braces; a field that is no GUID reads as the null GUID. An entry without
// count ends the table; one with fewer classes than its count has those that are there. Of two
// entries for one component the later counts. Threads: read-only once built.
class CvltBindingClasses {
 public:
  explicit CvltBindingClasses(const zt::fnd::String& text);

  // The components in GUID order; empty after a report when memory is out.
  zt::fnd::Vector<GUID> GetComponentVector() const;
  // Replaces `classes` by those of the component; leaves them for an unknown one.
  void GetBindingClassesForComponent(GUID component, zt::fnd::Vector<GUID>& classes) const;
  // No dictionary manages classes: empty.
  zt::fnd::Vector<GUID> GetDictionaryManagedClasses(const zt::fnd::Vector<GUID>& components) const;

 private:
  std::map<GUID, zt::fnd::Vector<GUID>> m_table;
};

// Class GUID to component GUIDs, in the order of their entry.
using BindingClassesMap = std::multimap<GUID, GUID>;

// Enters the record's component under each of its classes, or, when memory is out, under none: the
// map is then as before, and the failure is reported but not returned.
void vltAddBindingClasses(const _vltComponent2* record, const CvltBindingClasses& classes,
                          BindingClassesMap* map);

// Components that bind to the class, as a vltTaskMemAlloc array. VLT_E_NO_COMPONENT if there are
// none, E_OUTOFMEMORY after a report; the out-parameters are then untouched.
HRESULT vltGetComponentsForBindingClass(GUID bindingClass, unsigned int* count,
                                        BindingClassesMap* map, GUID** components);
