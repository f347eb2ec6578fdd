#pragma once

#include <cstddef>
#include <cstdlib>
#include <memory>
#include <new>
#include <utility>

namespace ztini {

// The engine has containers of its own (List, NameList, NameIndex, Arena, TextBuffer) because
// memory may run out at any call, which is then a status: the standard ones report it by
// exceptions, and nothing throws here.
//
// Every block of the engine comes from this function and goes back through free(), so that texts
// returned to callers are ordinary malloc blocks. It is realloc; tests put a failing one in its
// place, before they start threads.
using ReallocFunction = void* (*)(void* block, size_t size);
extern ReallocFunction g_realloc;

// Uninitialised bytes; null when memory runs out, never for a size of 0.
inline void* Allocate(size_t size) { return g_realloc(nullptr, size ? size : 1); }

// realloc: null leaves the old block as it is.
inline void* Reallocate(void* block, size_t size) { return g_realloc(block, size ? size : 1); }

struct FreeBlock {
  void operator()(void* block) const { free(block); }
};
using OwnedText = std::unique_ptr<char, FreeBlock>;

// new and delete over the same allocator; New returns null instead of throwing.
template <class T, class... Arguments>
T* New(Arguments&&... arguments) {
  void* block = Allocate(sizeof(T));
  return block ? new (block) T(std::forward<Arguments>(arguments)...) : nullptr;
}

template <class T>
void Delete(T* object) {
  if (!object) return;
  object->~T();
  free(object);
}

}  // namespace ztini
