// What tests of the heap ask glibc for, as heap.c answers it.
#pragma once
#pragma GCC system_header  // for #include_next

#include_next <malloc.h>

struct mallinfo2 {
  size_t uordblks;  // bytes in use
};

// Blocks from which size on come from the system one by one: musl's limit cannot be set.
#define M_MMAP_THRESHOLD (-3)

#ifdef __cplusplus
extern "C" {
#endif
struct mallinfo2 mallinfo2(void);
int mallopt(int what, int value);
#ifdef __cplusplus
}
#endif
