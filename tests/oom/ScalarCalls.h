#pragma once

#include <stdio.h>

#include "source/Common/ZtUtils/General/vlTracer.h"
#include "tests/oom/Registrar.h"

namespace vlt::test::oom {

inline std::vector<Call> MemoryAndTextCalls() {
  return {
      {"vltAlloc",
       [] {
         void* p = vltAlloc(16);
         vltFree(p);
         return p ? S_OK : E_OUTOFMEMORY;
       }},
      {"vltFree",
       [] {
         vltFree(nullptr);
         return S_OK;
       }},
      {"vltutilsFreeComponent2",
       [] {
         _vltComponent2 record;
         memset(&record, 0, sizeof record);
         record.type = vltComponentDataDictionary;
         return vltutilsFreeComponent2(record);
       }},
      {"vltStrupr",
       [] {
         char text[] = "text";
         return vltStrupr(text);
       }},
      {"vltWcsupr",
       [] {
         wchar_t text[] = L"text";
         return vltWcsupr(text);
       }},
      {"vltU32ToString", [] { return Take(vltU32ToString(7)); }},
      {"vltU32FromString", [] { return Done(vltU32FromString(L"0x7")); }},
      {"vltI32ToString", [] { return Take(vltI32ToString(-7)); }},
      {"vltI32FromString", [] { return Done(vltI32FromString(L"-7")); }},
      {"vltF64ToString", [] { return Take(vltF64ToString(0.5)); }},
      {"vltF64FromString", [] { return Done(vltF64FromString(L"0.5")); }},
      {"vltBoolToString", [] { return Done(vltBoolToString(1)); }},
      {"vltBoolFromString", [] { return Done(vltBoolFromString(L"Yes")); }},
      {"vltCreateGuid",
       [] {
         GUID guid;
         return vltCreateGuid(&guid);
       }},
      {"vltDceGuidCompare", [] { return Done(vltDceGuidCompare(kExpert, kDictionary)); }},
      {"vltGuidFromString",
       [] { return Done(vltGuidFromString(L"00112233-4455-6677-8899-AABBCCDDEEFF")); }},
      {"vltGuidToString", [] { return Take(vltGuidToString(GUID{})); }},
      {"vltGuidToStructString", [] { return Take(vltGuidToStructString(GUID{})); }},
  };
}

inline std::vector<Call> VocabularyCalls() {
  constexpr auto kType = vltStringArrayType;
  return {
      {"vltAttributeStorageFromString",
       [] { return Done(vltAttributeStorageFromString(L"static")); }},
      {"vltAttributeStorageToString",
       [] { return Done(vltAttributeStorageToString(_vltAttributeStorage{1})); }},
      {"vltAttributeTypeFromString", [] { return Done(vltAttributeTypeFromString(L"i32_array")); }},
      {"vltAttributeTypeToString", [] { return Done(vltAttributeTypeToString(kType)); }},
      {"vltAttributeTypeToString2", [] { return Done(vltAttributeTypeToString2(kType)); }},
      {"vltClientFromString", [] { return Done(vltClientFromString(L"programmatic")); }},
      {"vltClientToString", [] { return Done(vltClientToString(_vltClient{1})); }},
      {"vltAttributeTypeToVltTypeString",
       [] { return Done(vltAttributeTypeToVltTypeString(kType)); }},
      {"vltAttributeTypeToLumTypeString",
       [] { return Done(vltAttributeTypeToLumTypeString(kType)); }},
      {"vltAttributeTypeToLumTypeName", [] { return Done(vltAttributeTypeToLumTypeName(kType)); }},
      {"vltAttributeTypeToLumDataTypeString",
       [] { return Done(vltAttributeTypeToLumDataTypeString(kType)); }},
      {"vltAttributeTypeToExternalLumDataType",
       [] { return Done(vltAttributeTypeToExternalLumDataType(kType)); }},
      {"vltAttributeTypeToInternalLumDataType",
       [] { return Done(vltAttributeTypeToInternalLumDataType(kType)); }},
      {"vltAttributeIDExternalToInternal",
       [] { return Done(vltAttributeIDExternalToInternal(0x80000005)); }},
      {"vltAttributeIDInternalToExternal",
       [] { return Done(vltAttributeIDInternalToExternal(0x80000005)); }},
      {"vltMakeExternalAttributeID", [] { return Done(vltMakeExternalAttributeID(5, kType)); }},
      {"vltMakeInternalAttributeID", [] { return Done(vltMakeInternalAttributeID(5, kType)); }},
      {"vltIsLumBlob", [] { return Done(vltIsLumBlob(5)); }},
      {"vltLumMakeTypedTag", [] { return Done(vltLumMakeTypedTag(5, 6)); }},
      {"vltUseZTRPC", [] { return Done(vltUseZTRPC()); }},
      {"vltStandAlone", [] { return Done(vltStandAlone()); }},
      {"vltGetBinaryResource", [] { return Done(vltGetBinaryResource()); }},
  };
}

// A trace object as components outside build them.
class TraceObject final : public vlTracer {
 public:
  TraceObject() : vlTracer('L', "function") {}
  char* GetStringContentsA(char* buffer, unsigned long sizeBytes) override {
    snprintf(buffer, sizeBytes, "Func: %s", m_functionName);
    return buffer;
  }
};

inline std::vector<Call> DiagnosticCalls() {
  return {
      {"vltTestHook", [] { return Done(vltTestHook("no such point")); }},
      {"vltRefreshHook",
       [] {
         vltRefreshHook();
         return S_OK;
       }},
      {"vltGetTraceFlags", [] { return Done(vltGetTraceFlags()); }},
      {"_ZN12vlt_vlTracer11TraceOutputEcPKcb",
       [] {
         vlt_vlTracer::TraceOutput('E', "a line", true);
         return S_OK;
       }},
      {"_ZN12vlt_vlTracer12GetTraceMaskEv", [] { return Done(vlt_vlTracer::GetTraceMask()); }},
      {"_ZN12vlt_vlTracer15TraceArgsHelperEv",
       [] {
         TraceObject object;
         reinterpret_cast<vlt_vlTracer*>(static_cast<vlTracer*>(&object))->TraceArgsHelper();
         return S_OK;
       }},
  };
}

}  // namespace vlt::test::oom
