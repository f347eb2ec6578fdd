#include "zt/fnd/DLLAlloc.h"

#include <gtest/gtest.h>

#include <climits>
#include <cstring>
#include <memory>
#include <new>

namespace zt::fnd {
namespace {

// Hidden from the compiler, which would warn about it.
volatile unsigned long g_impossibleSize = ULONG_MAX - 1000;

TEST(DLLAlloc, MallocGivesABlockThatFreeTakes) {
  void* p = DLLMalloc(100);
  ASSERT_NE(p, nullptr);
  memset(p, 1, 100);
  DLLFree(p);
  DLLFree(nullptr);
}

TEST(DLLAlloc, MallocThatFailsThrowsOrReturnsNullByItsName) {
  EXPECT_THROW(DLLMalloc(g_impossibleSize), std::bad_alloc);
  EXPECT_EQ(DLLMallocNoThrow(g_impossibleSize), nullptr);
}

TEST(DLLAlloc, ReallocToNothingFreesAndReturnsNull) {
  EXPECT_EQ(nullptr, DLLReallocNoThrow(DLLMalloc(10), 0));
  EXPECT_EQ(nullptr, DLLRealloc(DLLMalloc(10), 0));
}

TEST(DLLAlloc, ReallocOfNullAllocates) {
  for (unsigned long size : {0ul, 10ul}) {
    void* p = DLLRealloc(nullptr, size);
    EXPECT_NE(p, nullptr) << size;
    DLLFree(p);
  }
}

TEST(DLLAlloc, ReallocKeepsTheBytes) {
  char* p = static_cast<char*>(DLLMalloc(4));
  memcpy(p, "abc", 4);
  p = static_cast<char*>(DLLRealloc(p, 100000));
  EXPECT_STREQ(p, "abc");
  DLLFree(p);
}

TEST(DLLAlloc, ReallocThatFailsLeavesTheOldBlock) {
  std::unique_ptr<char, void (*)(void*)> p(static_cast<char*>(DLLMalloc(4)), DLLFree);
  memcpy(p.get(), "abc", 4);
  EXPECT_THROW(DLLRealloc(p.get(), g_impossibleSize), std::bad_alloc);
  EXPECT_EQ(DLLReallocNoThrow(p.get(), g_impossibleSize), nullptr);
  EXPECT_STREQ(p.get(), "abc");
}

TEST(DLLAlloc, MakeDLLMallocThrowChangesNothing) {
  EXPECT_FALSE(MakeDLLMallocThrow(true));
  EXPECT_EQ(DLLMallocNoThrow(g_impossibleSize), nullptr);
  EXPECT_FALSE(MakeDLLMallocThrow(false));
  EXPECT_THROW(DLLMalloc(g_impossibleSize), std::bad_alloc);
}

struct Counted : DLLAlloced {
  explicit Counted(bool fail) {
    if (fail) throw 1;
  }
  char bytes[64];
};

TEST(DLLAlloc, ObjectsGoThroughTheAllocator) {
  Counted* p = new Counted(false);
  delete p;
  EXPECT_THROW(delete new Counted(true), int);
  alignas(Counted) unsigned char place[sizeof(Counted)];
  EXPECT_EQ(static_cast<void*>(place), new (place) Counted(false));
}

}  // namespace
}  // namespace zt::fnd
