#pragma once

#include <cstddef>
#include <cstdint>

// A block of memory that can be resized while others hold its handle.
struct ztini_HandleRecord {
  void* data;
  size_t size;
};
using ztini_Handle = ztini_HandleRecord*;

// A handle over `size` zero bytes; null when memory runs out. Free with ztini_PI_DisposeHandle.
ztini_Handle ztini_PI_NewHandle(size_t size);

// Frees the block and the handle; null is allowed.
void ztini_PI_DisposeHandle(ztini_Handle handle);

// Size in bytes; 0 for null.
size_t ztini_PI_GetHandleSize(ztini_Handle handle);

// Keeps the contents up to the smaller size and zero-fills growth. Returns 1, or 0 for null and
// when memory runs out; the old block is then as it was. The data pointer may change.
int32_t ztini_PI_SetHandleSize(ztini_Handle handle, size_t size);
