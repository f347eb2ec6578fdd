// The text is parsed in one pass from separator to separator. There is no error: files in the field
// hold texts that were cut or written by hand, and what can be read of them counts. Once built, a
// table is only read, so that it needs no lock.
#include "source/Common/vltBindingClasses.h"

#include <cstring>
#include <cwchar>
#include <new>
#include <vector>

#include "source/Common/vltFailure.h"
#include "source/Common/vltHookPoints.h"
#include "source/Common/vltTestHook.h"
#include "source/Common/vltcmn.h"

using zt::fnd::String;
using zt::fnd::Vector;

namespace {

constexpr wchar_t kSeparator = L':';

GUID GuidField(const String& text, unsigned begin, unsigned end) {
  return vltGuidFromString2(text.substr(begin, end - begin).c_str());
}

// Reads up to n fields from `next`, the separator in front of the first. Leaves `next` at the
// separator after the last one, or at npos at the end of the text, which also bounds a count out
// of nowhere.
Vector<GUID> ClassFields(const String& text, long n, unsigned* next) {
  Vector<GUID> classes;
  for (; n > 0 && *next != String::npos; --n) {
    unsigned begin = *next + 1;
    *next = text.find(kSeparator, begin);
    classes.push_back(GuidField(text, begin, *next == String::npos ? text.length() : *next));
  }
  return classes;
}

}  // namespace

CvltBindingClasses::CvltBindingClasses(const String& text) {
  unsigned pos = 0;
  for (;;) {
    unsigned colon = text.find(kSeparator, pos);
    // An entry without a count is the end, not an entry with no classes.
    if (colon == String::npos || colon + 1 == text.length()) return;
    GUID id = GuidField(text, pos, colon);
    unsigned next = text.find(kSeparator, colon + 1);
    unsigned countEnd = next == String::npos ? text.length() : next;
    // A count that is no number, or is negative, means no classes.
    long n = wcstol(text.substr(colon + 1, countEnd - colon - 1).c_str(), nullptr, 10);
    Vector<GUID> classes = ClassFields(text, n, &next);
    m_table[id].swap(classes);
    if (next == String::npos) return;
    pos = next + 1;
  }
}

Vector<GUID> CvltBindingClasses::GetComponentVector() const {
  Vector<GUID> components;
  try {
    for (const auto& [component, classes] : m_table) {
      if (components.size()) vlt::hook::Strikes(vlt::hook::kGetComponentVector);
      components.push_back(component);
    }
  } catch (const std::bad_alloc&) {
    // Without memory no component of the table can be reported; the registrar goes on without it.
    components.clear();
    vltReportOutOfMemory("zt::fnd::Vector<_GUID> CvltBindingClasses::GetComponentVector() const");
  }
  return components;
}

void CvltBindingClasses::GetBindingClassesForComponent(GUID component,
                                                       Vector<GUID>& classes) const {
  auto found = m_table.find(component);
  if (found != m_table.end()) classes = found->second;
}

Vector<GUID> CvltBindingClasses::GetDictionaryManagedClasses(const Vector<GUID>&) const {
  return Vector<GUID>();
}

void vltAddBindingClasses(const _vltComponent2* record, const CvltBindingClasses& classes,
                          BindingClassesMap* map) {
  Vector<GUID> wanted;
  std::vector<BindingClassesMap::iterator> entered;
  try {
    classes.GetBindingClassesForComponent(record->identifier, wanted);
    // Before the first entry: the undo below must not need memory.
    entered.reserve(wanted.size());
    for (unsigned i = 0; i < wanted.size(); ++i) {
      if (i == 1) vlt::hook::Strikes(vlt::hook::kAddBindingClass);
      entered.push_back(map->emplace(wanted[i], record->identifier));
    }
  } catch (const std::bad_alloc&) {
    // All or nothing: half of an expert's classes would send its objects to another expert.
    for (auto entry : entered) map->erase(entry);
    vltReportOutOfMemory(
        "void vltAddBindingClasses(const vltComponent2*, const CvltBindingClasses&, "
        "BindingClassesMap*)");
  }
}

namespace {

constexpr const char* kGetComponentsSignature =
    "HRESULT vltGetComponentsForBindingClass(GUID, u32*, BindingClassesMap*, GUID**)";

}  // namespace

HRESULT vltGetComponentsForBindingClass(GUID bindingClass, unsigned int* count,
                                        BindingClassesMap* map, GUID** components) {
  auto [begin, end] = map->equal_range(bindingClass);
  if (begin == end) return VLT_E_NO_COMPONENT;
  Vector<GUID> found;
  try {
    for (auto entry = begin; entry != end; ++entry) {
      vlt::hook::Strikes(vlt::hook::kCopyComponentOfClass);
      found.push_back(entry->second);
    }
  } catch (const std::bad_alloc&) {
    // The interface knows a result for it.
    return vltReportOutOfMemory(kGetComponentsSignature);
  }
  size_t sizeBytes = found.size() * sizeof(GUID);
  void* array = nullptr;
  if (!vlt::hook::Strikes(vlt::hook::kGetComponentsForBindingClass)) {
    array = vltTaskMemAlloc(sizeBytes);
  }
  if (!array) return vltReportOutOfMemory(kGetComponentsSignature);
  memcpy(array, found.begin(), sizeBytes);
  *components = static_cast<GUID*>(array);
  *count = found.size();
  return S_OK;
}
