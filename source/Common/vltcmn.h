#pragma once

// The implementations of the exported conversions. The rest of the library calls them by these
// names, with a digit after the export's, so that nothing inside goes through the exported
// symbols.
//
// Returned texts are vltTaskMemAlloc blocks. All functions are reentrant.

#include "source/Common/vltInterfaces.h"
#include "zt/fnd/String.h"

// ---- Memory of whatever crosses the surface.

// Null for 0x80000000 bytes or more, on 64 bits too, or when memory is out.
void* vltTaskMemAlloc(size_t sizeBytes);
void vltTaskMemFree(void* p);
// Frees the texts that the record's type has; leaves the pointers as they are.
void vltFreeComponent2(_vltComponent2& record);
void vltFreeComponent(_vltComponent& record);

// Owner of one vltTaskMemAlloc block.
template <class T>
class TaskMem {
 public:
  explicit TaskMem(T* p = nullptr) : m_p(p) {}
  ~TaskMem() { vltTaskMemFree(const_cast<void*>(static_cast<const void*>(m_p))); }
  TaskMem(TaskMem&& other) noexcept : m_p(other.release()) {}
  TaskMem(const TaskMem&) = delete;
  TaskMem& operator=(const TaskMem&) = delete;

  // The block, which stays this object's; null for none.
  T* get() const { return m_p; }
  explicit operator bool() const { return m_p != nullptr; }
  // For functions with an out-parameter; what was owned before is not freed.
  T** out() { return &m_p; }
  // The block, which is the caller's from here on.
  T* release() {
    T* p = m_p;
    m_p = nullptr;
    return p;
  }

 private:
  T* m_p;
};

// ---- Numbers. Null when memory is out; null text reads as 0.
wchar_t* vltU32ToString2(unsigned v);
// The 32 bits print as an unsigned long would: "4294967295" for -1 where long has 64 bits.
wchar_t* vltI32ToString2(int v);
wchar_t* vltF64ToString2(double v);
unsigned vltU32FromString2(const wchar_t* s);
int vltI32FromString2(const wchar_t* s);
double vltF64FromString2(const wchar_t* s);
const wchar_t* vltBoolToString2(int v);
int vltBoolFromString2(const wchar_t* s);

// Copy of the text, widened in the first form; null for null, or when memory is out.
wchar_t* Dup(const char* text);
wchar_t* Dup(const wchar_t* text);

// ---- GUIDs.
wchar_t* vltGuidToString2(GUID g);          // null, or empty, when memory is out
wchar_t* vltGuidToStructString2(GUID g);    // null when memory is out
GUID vltGuidFromString2(const wchar_t* s);  // the null GUID for bad text
int vltDceGuidCompare2(const GUID& a, const GUID& b);
// S_OK; E_FAIL when the entry refuses; VLT_E_UUID_LIBRARY, VLT_E_UUID_ENTRY, *out then untouched.
HRESULT vltCreateGuid2(GUID* out);
// 0, or 1 and the null GUID for text that is no GUID in braces.
int vltCLSIDFromString(const wchar_t* s, GUID* out);
int vltStringToGUID(const wchar_t* s, GUID* out);
// E_POINTER, or E_OUTOFMEMORY after its report.
HRESULT vltStringFromCLSID(const GUID* g, wchar_t** out);
// Empty when memory is out.
zt::fnd::String vltGUIDToString(const GUID& g);

// ---- Texts.

// E_POINTER for a null argument, E_OUTOFMEMORY; *out is then untouched.
HRESULT vltDuplicateString(const wchar_t* s, wchar_t** out);
// The same, with a hook point and a report before E_OUTOFMEMORY.
HRESULT vltDuplicateString2(const wchar_t* s, wchar_t** out);
// Appends to a vltTaskMemAlloc text of *capacity characters, and grows it by steps of 360 when less
// than one is left over. After E_OUTOFMEMORY the text stays and *capacity keeps its raised value.
HRESULT vltAppendString2(wchar_t** buffer, const wchar_t* tail, size_t* capacity);

// In place; 1 for null or empty, else 0. A character that toupper does not take (above 255) stays.
int vltStruprImpl(char* s);
int vltWcsuprImpl(wchar_t* s);

// ---- Type vocabulary. Static texts, never null.
const wchar_t* vltAttributeTypeToString3(_vltAttributeType t);  // "i32_array"
const wchar_t* vltAttributeTypeToString4(_vltAttributeType t);  // "vltI32ArrayType"
const wchar_t* vltAttributeTypeToVltTypeString2(_vltAttributeType t);
const wchar_t* vltAttributeTypeToLumTypeString2(_vltAttributeType t);
const wchar_t* vltAttributeTypeToLumTypeName2(_vltAttributeType t);
const wchar_t* vltAttributeTypeToLumDataTypeString2(_vltAttributeType t);
const wchar_t* vltAttributeStorageToString2(_vltAttributeStorage s);
const wchar_t* vltClientToString2(_vltClient c);
_vltAttributeType vltAttributeTypeFromString2(const wchar_t* s);
_vltAttributeStorage vltAttributeStorageFromString2(const wchar_t* s);
_vltClient vltClientFromString2(const wchar_t* s);

// ---- Database tags and attribute ids.
unsigned vltLumMakeTypedTag2(unsigned short type, unsigned short id);
int vltIsLumBlob2(unsigned short tag);
unsigned short vltAttributeTypeToInternalLumDataType2(_vltAttributeType t);
unsigned short vltAttributeTypeToExternalLumDataType2(_vltAttributeType t);
unsigned vltInternalBlobArrayTypeToBits2(_vltAttributeType t);
unsigned vltExternalBlobArrayTypeToBits2(_vltAttributeType t);
unsigned vltMakeInternalAttributeID2(unsigned id, _vltAttributeType t);
unsigned vltMakeExternalAttributeID2(unsigned id, _vltAttributeType t);
unsigned vltAttributeIDExternalToInternal2(unsigned id);
unsigned vltAttributeIDInternalToExternal2(unsigned id);
