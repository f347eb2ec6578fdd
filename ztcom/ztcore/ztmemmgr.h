#pragma once

// Allocators of what interfaces hand across.

// Length-counted wide text (zt/fnd/osdep/SystemString.h): null for null or when memory is out.
wchar_t* ZtSysAllocString(const wchar_t* text);
void ZtSysFreeString(wchar_t*& text);  // null is ignored; the pointer stays as it is

// Block of the module allocator; null when memory is out.
void* ZtTaskMemAlloc(unsigned long sizeBytes);
void ZtTaskMemFree(void* p);
