#pragma once

// What drives the library to each point where a fault can be injected, and what is to come of it.
#include <string.h>

#include <memory>
#include <new>
#include <set>

#include "source/Common/vltBindingClasses.h"
#include "source/Common/vltHookPoints.h"
#include "source/Common/vltQuery.h"
#include "source/Common/vltcmn.h"
#include "source/Utilities/vltjar.h"
#include "source/Utilities/vltutils.h"
#include "tests/support/FakeStorage.h"

namespace vlt::test::points {

// ---- The actions. Each drives the code to its point and returns what came out.

enum Outcome {
  Success,
  OutOfMemory,  // reported by the result, with all outputs as they should be then
  OtherFailure,
  Broken,  // outputs that do not fit the result
  BadAlloc,
};

inline Outcome Of(HRESULT result, bool intact = true) {
  if (!intact) return Broken;
  return result == S_OK ? Success : result == E_OUTOFMEMORY ? OutOfMemory : OtherFailure;
}

// What comes with success, and nothing without it.
template <class T>
inline Outcome Of(HRESULT result, T* out, void (*free)(T*)) {
  bool fits = (result == S_OK) == (out != nullptr);
  if (out) free(out);
  return Of(result, fits);
}

inline void FreeText(wchar_t* text) { vltFree(text); }

template <class I>
inline void Release(I* object) {
  object->Release();
}

inline Outcome Append() {
  size_t capacity = 2;
  auto* buffer = static_cast<wchar_t*>(vltAlloc(capacity * sizeof(wchar_t)));
  if (!buffer) return BadAlloc;
  wcscpy(buffer, L"a");
  struct Guard {
    wchar_t*& text;
    ~Guard() { vltFree(text); }
  } guard{buffer};
  wchar_t* before = buffer;
  HRESULT result = vltAppendString2(&buffer, L"bc", &capacity);
  bool kept = buffer == before && wcscmp(buffer, L"a") == 0 && capacity == 362;
  return Of(result, result != E_OUTOFMEMORY || kept);
}

inline Outcome Duplicate() {
  wchar_t* out = nullptr;
  HRESULT result = vltDuplicateString2(L"a", &out);
  return Of(result, out, FreeText);
}

inline Outcome Clsid() {
  GUID g = {};
  wchar_t* out = nullptr;
  HRESULT result = vltStringFromCLSID(&g, &out);
  return Of(result, out, FreeText);
}

inline Outcome GuidText() {
  wchar_t* text = vltGuidToString(GUID{});
  bool empty = !text || !*text;
  vltFree(text);
  return empty ? OutOfMemory : Success;
}

inline Outcome Registrar() {
  IvltRegistrar* registrar = nullptr;
  HRESULT result = vltGetRegistrar(&registrar);
  return Of(result, registrar, Release<IvltRegistrar>);
}

inline Outcome Check() {
  IEnumString* errors = nullptr;
  HRESULT result = vltCheckComponent(GUID_NULL, &errors);
  // The sample's components lie nowhere; that is what the list then says.
  bool fits = (result == E_OUTOFMEMORY) == (errors == nullptr);
  if (errors) errors->Release();
  return !fits ? Broken : result == E_OUTOFMEMORY ? OutOfMemory : Success;
}

// An array of this type as text.
template <int Type>
inline Outcome Array() {
  Answers answers = Filled(Type);
  Object object(answers);
  g_references = 0;
  wchar_t* text = g_untouched;
  HRESULT result;
  try {
    result = vltGetAttributeValueAsString(&object, kId, &text);
  } catch (const std::bad_alloc&) {
    return g_references == 0 && text == g_untouched ? BadAlloc : Broken;
  }
  bool fits = (result == S_OK) == (text != g_untouched) && g_references == 0;
  if (text != g_untouched) vltFree(text);
  return Of(result, fits);
}

inline const zt::fnd::String kTable(
    L"{00000001-0000-0000-0000-000000000000}:2:{0000000A-0000-0000-0000-000000000000}:"
    L"{0000000B-0000-0000-0000-000000000000}:{00000002-0000-0000-0000-000000000000}:0");

// Both classes, or none.
inline Outcome AddClasses() {
  BindingClassesMap map;
  map.emplace(GUID{0xC, 0, 0, {}}, GUID{9, 0, 0, {}});
  _vltComponent2 record;
  memset(&record, 0, sizeof record);
  record.type = vltComponentObjectExpert;
  record.identifier.Data1 = 1;
  vltAddBindingClasses(&record, CvltBindingClasses(kTable), &map);
  return map.size() == 3 ? Success : map.size() == 1 ? OutOfMemory : Broken;
}

inline Outcome GetClasses() {
  BindingClassesMap map;
  map.emplace(GUID{0xA, 0, 0, {}}, GUID{1, 0, 0, {}});
  unsigned count = 0;
  GUID* found = nullptr;
  HRESULT result = vltGetComponentsForBindingClass(GUID{0xA, 0, 0, {}}, &count, &map, &found);
  bool fits = (result == S_OK) == (found != nullptr) && count == (found ? 1u : 0u);
  vltFree(found);
  return Of(result, fits);
}

inline Outcome ComponentVector() {
  auto components = CvltBindingClasses(kTable).GetComponentVector();
  return components.size() == 2 ? Success : components.size() == 0 ? OutOfMemory : Broken;
}

inline _vltQuery OneTerm(_vltQueryTerm* term) {
  memset(term, 0, sizeof *term);
  term->attributeType = vltI32Type;
  return {GUID_NULL, 0, 0, 1, term};
}

inline Outcome PrintQuery() {
  _vltQueryTerm term;
  _vltQuery query = OneTerm(&term);
  wchar_t* text = nullptr;
  HRESULT result = vltConvertQueryToString(&query, &text);
  return Of(result, text, FreeText);
}

// A stream that reads as a query of one term with the number 1.
struct Ones : IvltInputStream {
  virtual ~Ones() = default;
  HRESULT QueryInterface(const GUID&, void**) override { return E_NOINTERFACE; }
  uint32_t AddRef() override { return 1; }
  uint32_t Release() override { return 1; }
  HRESULT ReadType(_vltAttributeType* v) override { return *v = vltI32Type, S_OK; }
  HRESULT ReadID(vltAttributeID* v) override { return *v = 1, S_OK; }
  HRESULT ReadI32(int32_t* v) override { return *v = 1, S_OK; }
  HRESULT ReadU32(uint32_t* v) override { return *v = 1, S_OK; }
  HRESULT ReadF64(double* v) override { return *v = 1, S_OK; }
  HRESULT ReadGuid(GUID* v) override { return *v = GUID_NULL, S_OK; }
  HRESULT ReadString(wchar_t** v) override { return *v = nullptr, S_OK; }
};

inline Outcome ReadQuery() {
  Ones stream;
  _vltQuery query = {};
  HRESULT result = vltMarshalQueryFromStream(&stream, &query);
  bool fits = query.termCount == 1 && (result == S_OK) == (query.terms != nullptr);
  vltFreeQuery(&query);
  return Of(result, fits);
}

inline Outcome OpenJar() {
  std::unique_ptr<wchar_t[]> path(GetJarFilePath());
  CvlIniMgr* ini = nullptr;
  HRESULT result = VltjarOpenIniWithValidation(path.get(), &ini);
  bool fits = (result == S_OK) == (ini != nullptr);
  delete ini;
  return Of(result, fits);
}

// The first opening fails at the digest.
inline Outcome OpenJarAgain() {
  std::unique_ptr<wchar_t[]> path(GetJarFilePath());
  unsigned char other[16] = {1};
  if (VltjarSetChecksumForCacheFile(path.get(), other) != S_OK) return OtherFailure;
  return OpenJar();
}

inline Outcome SaveJar() { return Of(vltSetServerCookie(6)); }

// ---- The table.

struct Row {
  const char* point;
  Outcome (*action)();
  // What comes out when the hook answers 1, when it throws, and when it has taken all memory.
  Outcome answered, thrown;
  std::set<Outcome> exhausted;
  // In the line of the log; null for a point whose answer is ignored.
  const char* function;
};

inline constexpr const char* kGetClassesFunction =
    "HRESULT vltGetComponentsForBindingClass(GUID, u32*, BindingClassesMap*, GUID**)";
inline constexpr const char* kArrayFunction =
    "HRESULT vltGetArrayValueAsString(IvltObject*, vltAttributeID, vltAttributeType, "
    "zt::fnd::String&)";
inline constexpr const char* kOpenFunction =
    "HRESULT VltjarOpenIniWithValidation(const wchar_t*, CvlIniMgr**)";
inline const std::set<Outcome> kReport = {OutOfMemory};

inline const Row kRows[] = {
    {hook::kGetRegistrar2, Registrar, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltGetRegistrar2(const TCHAR*, const TCHAR*, IvltRegistrar**)"},
    {hook::kJarOpen, OpenJar, OutOfMemory, Success, kReport, kOpenFunction},
    {hook::kJarRetry, OpenJarAgain, OutOfMemory, BadAlloc, kReport, kOpenFunction},
    {hook::kCheckComponent, Check, OutOfMemory, BadAlloc, kReport,
     "BOOL vltCheckComponent(vltID, IEnumString**)"},
    {hook::kArrayI32, Array<8>, OutOfMemory, BadAlloc, kReport, kArrayFunction},
    {hook::kArrayU32, Array<9>, OutOfMemory, BadAlloc, kReport, kArrayFunction},
    {hook::kArrayF64, Array<10>, OutOfMemory, BadAlloc, kReport, kArrayFunction},
    {hook::kArrayGuid, Array<13>, OutOfMemory, BadAlloc, kReport, kArrayFunction},
    {hook::kArrayString, Array<11>, OutOfMemory, BadAlloc, kReport, kArrayFunction},
    {hook::kArrayReference, Array<12>, OutOfMemory, BadAlloc, kReport, kArrayFunction},
    {hook::kConvertQueryToString, PrintQuery, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltConvertQueryToString(const vltQuery*, wchar_t**)"},
    {hook::kMarshalQueryFromStream, ReadQuery, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltMarshalQueryFromStream(IvltInputStream*, vltQuery*)"},
    {hook::kGetComponentsForBindingClass, GetClasses, OutOfMemory, BadAlloc, kReport,
     kGetClassesFunction},
    {hook::kCopyComponentOfClass,
     GetClasses,
     Success,
     OutOfMemory,
     {Success, OutOfMemory, BadAlloc},
     nullptr},
    {hook::kAddBindingClass,
     AddClasses,
     Success,
     OutOfMemory,
     {Success, OutOfMemory, BadAlloc},
     nullptr},
    {hook::kGetComponentVector,
     ComponentVector,
     Success,
     OutOfMemory,
     {Success, OutOfMemory, BadAlloc},
     nullptr},
    {hook::kDuplicateString2, Duplicate, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltDuplicateString2(const wchar_t*, wchar_t**)"},
    {hook::kDuplicateString2, GuidText, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltDuplicateString2(const wchar_t*, wchar_t**)"},
    {hook::kAppendString2, Append, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltAppendString2(wchar_t**, const wchar_t*, size_t*)"},
    {hook::kStringFromClsid, Clsid, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltStringFromCLSID(const GUID*, wchar_t**)"},
    {hook::kStringFromClsid, GuidText, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltStringFromCLSID(const GUID*, wchar_t**)"},
    {hook::kJarInvalidChecksumSet,
     SaveJar,
     Success,
     BadAlloc,
     {Success, OutOfMemory, BadAlloc},
     nullptr},
    {hook::kJarValidChecksumSet,
     SaveJar,
     Success,
     BadAlloc,
     {Success, OutOfMemory, BadAlloc},
     nullptr},
};

}  // namespace vlt::test::points
