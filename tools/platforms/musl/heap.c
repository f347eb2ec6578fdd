// The C library's heap by the names under which the tests' own malloc (tests/support/FailingHeap.cpp) calls it, and
// which musl lacks. Every test program of ./dev platforms musl needs this shared object.
#define _GNU_SOURCE
#include <dlfcn.h>
#include <errno.h>
#include <malloc.h>
#include <stdatomic.h>
#include <stddef.h>
#include <stdint.h>
#include <string.h>

static void* (*g_malloc)(size_t);
static void* (*g_realloc)(void*, size_t);
static void (*g_free)(void*);
static atomic_size_t g_used;

// The search for the next definition begins after this object, in the C library.
#define FOUND(function, name) \
  if (!function) function = (__typeof__(function))dlsym(RTLD_NEXT, name)

static void* counted(void* block) {
  if (block) g_used += malloc_usable_size(block);
  return block;
}

void* __libc_malloc(size_t sizeBytes) {
  FOUND(g_malloc, "malloc");
  return counted(g_malloc(sizeBytes));
}

// Not by the C library's calloc, which calls the tests' own malloc in turn.
void* __libc_calloc(size_t count, size_t sizeBytes) {
  if (sizeBytes && count > SIZE_MAX / sizeBytes) {
    errno = ENOMEM;
    return NULL;
  }
  void* block = __libc_malloc(count * sizeBytes);
  return block ? memset(block, 0, count * sizeBytes) : NULL;
}

void* __libc_realloc(void* old, size_t sizeBytes) {
  FOUND(g_realloc, "realloc");
  size_t before = old ? malloc_usable_size(old) : 0;
  void* block = counted(g_realloc(old, sizeBytes));
  if (block) g_used -= before;
  return block;
}

// Where malloc is replaced, musl's aligned_alloc fails; its malloc aligns to 16 bytes.
void* __libc_memalign(size_t alignment, size_t sizeBytes) {
  return alignment <= 16 ? __libc_malloc(sizeBytes) : NULL;
}

void __libc_free(void* block) {
  FOUND(g_free, "free");
  if (block) g_used -= malloc_usable_size(block);
  g_free(block);
}

struct mallinfo2 mallinfo2(void) { return (struct mallinfo2){.uordblks = g_used}; }

int mallopt(int what, int value) { return 0; }
