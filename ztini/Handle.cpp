#include "ztini/Handle.h"

#include <cstring>

#include "ztini/Alloc.h"

ztini_Handle ztini_PI_NewHandle(size_t size) {
  ztini_Handle handle = ztini::New<ztini_HandleRecord>();
  if (!handle) return nullptr;
  handle->data = ztini::Allocate(size);
  handle->size = size;
  if (!handle->data) {
    ztini::Delete(handle);
    return nullptr;
  }
  memset(handle->data, 0, size);
  return handle;
}

void ztini_PI_DisposeHandle(ztini_Handle handle) {
  if (!handle) return;
  free(handle->data);
  ztini::Delete(handle);
}

size_t ztini_PI_GetHandleSize(ztini_Handle handle) { return handle ? handle->size : 0; }

int32_t ztini_PI_SetHandleSize(ztini_Handle handle, size_t size) {
  if (!handle) return 0;
  void* data = ztini::Reallocate(handle->data, size);
  if (!data) return 0;
  // realloc leaves what it adds as the heap had it.
  if (size > handle->size) memset(static_cast<char*>(data) + handle->size, 0, size - handle->size);
  handle->data = data;
  handle->size = size;
  return 1;
}
