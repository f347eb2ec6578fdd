#include "ztcom/ztcore/ztmemmgr.h"

#include "zt/fnd/DLLAlloc.h"
#include "zt/fnd/osdep/SystemString.h"

wchar_t* ZtSysAllocString(const wchar_t* text) { return zt::fnd::osdep::SystemAllocString(text); }
void ZtSysFreeString(wchar_t*& text) { zt::fnd::osdep::SystemFreeString(text); }

// Not the throwing one: the callers turn a null into a result code.
void* ZtTaskMemAlloc(unsigned long sizeBytes) { return zt::fnd::DLLMallocNoThrow(sizeBytes); }
void ZtTaskMemFree(void* p) { zt::fnd::DLLFree(p); }
