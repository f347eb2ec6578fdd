// The exported surface: each conversion forwards to its implementation.
#include "source/Utilities/vltutils.h"

#include "source/Common/Posix/vltlinuxos.h"
#include "source/Common/vltAttributeValues.h"
#include "source/Common/vltFileSecurity.h"
#include "source/Common/vltcmn.h"

// Nothing here is more than a name: the implementations have names of their own
// (source/Common/vltcmn.h), and the library calls those, so that no inner call goes through a
// symbol that a host may interpose.
void* vltAlloc(size_t size) { return vltTaskMemAlloc(size); }
void vltFree(void* p) { vltTaskMemFree(p); }
int vltutilsFreeComponent2(_vltComponent2& c) { return vltFreeComponent2(c), 0; }

HRESULT vltGetOldRegistrar(void** out) {
  if (!out) return E_POINTER;
  *out = nullptr;
  return E_NOTIMPL;
}

HRESULT vltGetStringResource(const char* separator, const wchar_t* file, const wchar_t* key,
                             char** out, unsigned maxLength) {
  return vltGetStringResourceImpl(separator, file, key, out, maxLength);
}
int vltGetBinaryResource() { return 0; }
HRESULT vltSetFileSecurity(const zt::fnd::String& path, int mode, bool recursive) {
  return vltSetFileSecurityImpl(path, mode, recursive);
}
unsigned vltGetTraceFlags() { return vltGetTraceFlagsImpl(); }

int vltStrupr(char* s) { return vltStruprImpl(s); }
int vltWcsupr(wchar_t* s) { return vltWcsuprImpl(s); }

wchar_t* vltU32ToString(unsigned v) { return vltU32ToString2(v); }
unsigned vltU32FromString(const wchar_t* s) { return vltU32FromString2(s); }
wchar_t* vltI32ToString(int v) { return vltI32ToString2(v); }
int vltI32FromString(const wchar_t* s) { return vltI32FromString2(s); }
wchar_t* vltF64ToString(double v) { return vltF64ToString2(v); }
double vltF64FromString(const wchar_t* s) { return vltF64FromString2(s); }
const wchar_t* vltBoolToString(int v) { return vltBoolToString2(v); }
int vltBoolFromString(const wchar_t* s) { return vltBoolFromString2(s); }
HRESULT vltCreateGuid(GUID* out) { return vltCreateGuid2(out); }
int vltDceGuidCompare(const GUID& a, const GUID& b) { return vltDceGuidCompare2(a, b); }
GUID vltGuidFromString(const wchar_t* s) { return vltGuidFromString2(s); }
wchar_t* vltGuidToString(GUID g) { return vltGuidToString2(g); }
wchar_t* vltGuidToStructString(GUID g) { return vltGuidToStructString2(g); }

_vltAttributeStorage vltAttributeStorageFromString(const wchar_t* s) {
  return vltAttributeStorageFromString2(s);
}
const wchar_t* vltAttributeStorageToString(_vltAttributeStorage s) {
  return vltAttributeStorageToString2(s);
}
_vltAttributeType vltAttributeTypeFromString(const wchar_t* s) {
  return vltAttributeTypeFromString2(s);
}
// The digits do not match here: the second text form came to the surface under the name 2.
const wchar_t* vltAttributeTypeToString(_vltAttributeType t) {
  return vltAttributeTypeToString3(t);
}
const wchar_t* vltAttributeTypeToString2(_vltAttributeType t) {
  return vltAttributeTypeToString4(t);
}
_vltClient vltClientFromString(const wchar_t* s) { return vltClientFromString2(s); }
const wchar_t* vltClientToString(_vltClient c) { return vltClientToString2(c); }
const wchar_t* vltAttributeTypeToVltTypeString(_vltAttributeType t) {
  return vltAttributeTypeToVltTypeString2(t);
}
const wchar_t* vltAttributeTypeToLumTypeString(_vltAttributeType t) {
  return vltAttributeTypeToLumTypeString2(t);
}
const wchar_t* vltAttributeTypeToLumTypeName(_vltAttributeType t) {
  return vltAttributeTypeToLumTypeName2(t);
}
const wchar_t* vltAttributeTypeToLumDataTypeString(_vltAttributeType t) {
  return vltAttributeTypeToLumDataTypeString2(t);
}
unsigned short vltAttributeTypeToExternalLumDataType(_vltAttributeType t) {
  return vltAttributeTypeToExternalLumDataType2(t);
}
unsigned short vltAttributeTypeToInternalLumDataType(_vltAttributeType t) {
  return vltAttributeTypeToInternalLumDataType2(t);
}
unsigned vltAttributeIDExternalToInternal(unsigned id) {
  return vltAttributeIDExternalToInternal2(id);
}
unsigned vltAttributeIDInternalToExternal(unsigned id) {
  return vltAttributeIDInternalToExternal2(id);
}
unsigned vltMakeExternalAttributeID(unsigned id, _vltAttributeType t) {
  return vltMakeExternalAttributeID2(id, t);
}
unsigned vltMakeInternalAttributeID(unsigned id, _vltAttributeType t) {
  return vltMakeInternalAttributeID2(id, t);
}
int vltIsLumBlob(unsigned tag) { return vltIsLumBlob2(static_cast<unsigned short>(tag)); }
unsigned vltLumMakeTypedTag(unsigned type, unsigned id) {
  return vltLumMakeTypedTag2(static_cast<unsigned short>(type), static_cast<unsigned short>(id));
}

HRESULT vltGetAttributeValueAsString(IvltObject* object, unsigned id, wchar_t** text) {
  return vltGetAttributeValueAsStringImpl(object, id, text);
}
HRESULT vltSetAttributeValueFromString(IvltObject* object, unsigned id, const wchar_t* text) {
  return vltSetAttributeValueFromString2(object, id, text);
}

int vltUseZTRPC() { return 1; }
int vltStandAlone() { return 1; }
