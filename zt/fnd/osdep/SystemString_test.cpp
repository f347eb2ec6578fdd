#include "zt/fnd/osdep/SystemString.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <cwchar>

#include "tests/support/Child.h"
#include "tests/support/MemoryLimit.h"
#include "zt/fnd/DLLAlloc.h"

using namespace zt::fnd;
using namespace zt::fnd::osdep;

namespace {

uint32_t CountOf(const wchar_t* s) {
  uint32_t count;
  memcpy(&count, reinterpret_cast<const char*>(s) - 4, 4);
  return count;
}

}  // namespace

TEST(SystemString, CountStandsInFrontOfTheText) {
  wchar_t* const s = SystemAllocStringLen(L"ab", 2);
  EXPECT_EQ(CountOf(s), 2u);
  EXPECT_STREQ(s, L"ab");
  DLLFree(reinterpret_cast<char*>(s) - 4);
}

TEST(SystemString, TakesForcedLengths) {
  wchar_t* const part = SystemAllocStringLen(L"abcdef", 3);
  EXPECT_STREQ(part, L"abc");
  SystemFreeString(part);
  wchar_t* const zeros = SystemAllocStringLen(L"a\0b", 3);
  EXPECT_EQ(wmemcmp(zeros, L"a\0b", 4), 0);
  EXPECT_EQ(CountOf(zeros), 3u);
  SystemFreeString(zeros);
  wchar_t* const empty = SystemAllocStringLen(L"", 0);
  EXPECT_STREQ(empty, L"");
  SystemFreeString(empty);
}

TEST(SystemString, NullTextLeavesRoomToFill) {
  wchar_t* const s = SystemAllocStringLen(nullptr, 5);
  ASSERT_NE(s, nullptr);
  EXPECT_EQ(CountOf(s), 5u);
  wmemset(s, L'x', 5);
  EXPECT_STREQ(s, L"xxxxx");
  SystemFreeString(s);
}

TEST(SystemString, CopiesTerminatedText) {
  wchar_t* const s = SystemAllocString(L"text");
  EXPECT_STREQ(s, L"text");
  EXPECT_EQ(CountOf(s), 4u);
  SystemFreeString(s);
  EXPECT_EQ(SystemAllocString(nullptr), nullptr);
  SystemFreeString(nullptr);
}

TEST(SystemString, SizesBeyond32BitsYieldNull) {
  for (const unsigned n : {0x3FFFFFFEu, 0x3FFFFFFFu, 0x40000000u, 0xFFFFFFFEu, 0xFFFFFFFFu}) {
    EXPECT_EQ(SystemAllocStringLen(nullptr, n), nullptr) << n;
  }
}

namespace {

int AllocateWithoutMemory() {
  vlt::test::LimitMemoryTo(4u << 20);
  return SystemAllocStringLen(nullptr, 16u << 20) ? 1 : 0;
}

}  // namespace

TEST(SystemString, MissingMemoryYieldsNull) {
  if (!vlt::test::kCanLimitMemory) GTEST_SKIP() << "the sanitizer owns the address space";
  vlt::test::Child child(AllocateWithoutMemory);
  EXPECT_EQ(child.wait(), 0);
}
