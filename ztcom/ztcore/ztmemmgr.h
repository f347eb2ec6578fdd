#pragma once

// Allocators of what crosses an interface.

// Length-counted wide text (zt/fnd/osdep/SystemString.h): null for null or when memory is out. The
// caller frees it with ZtSysFreeString.
wchar_t* ZtSysAllocString(const wchar_t* text);
void ZtSysFreeString(wchar_t*& text);  // null is ignored; the pointer stays as it is

// Block of the module allocator, not initialised; null when memory is out. Freed with
// ZtTaskMemFree, also by another module; null is ignored.
void* ZtTaskMemAlloc(unsigned long sizeBytes);
void ZtTaskMemFree(void* p);
