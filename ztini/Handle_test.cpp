#include "ztini/Handle.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "tests/support/FailingAlloc.h"

namespace {

using ztini::test::FailFromAllocation;

std::string Bytes(ztini_Handle handle) {
  return std::string(static_cast<char*>(handle->data), handle->size);
}

TEST(Handle, NewBlockIsZeroFilled) {
  ztini_Handle handle = ztini_PI_NewHandle(300);
  ASSERT_NE(handle, nullptr);
  EXPECT_EQ(ztini_PI_GetHandleSize(handle), 300u);
  EXPECT_EQ(Bytes(handle), std::string(300, '\0'));
  ztini_PI_DisposeHandle(handle);
}

TEST(Handle, GrowthKeepsContentsAndZeroFillsTheRest) {
  ztini_Handle handle = ztini_PI_NewHandle(3);
  memcpy(handle->data, "abc", 3);
  EXPECT_EQ(ztini_PI_SetHandleSize(handle, 1000), 1);
  EXPECT_EQ(Bytes(handle), "abc" + std::string(997, '\0'));
  EXPECT_EQ(ztini_PI_SetHandleSize(handle, 2), 1);
  EXPECT_EQ(Bytes(handle), "ab");
  EXPECT_EQ(ztini_PI_SetHandleSize(handle, 4), 1);
  EXPECT_EQ(Bytes(handle), std::string("ab\0\0", 4));
  ztini_PI_DisposeHandle(handle);
}

TEST(Handle, SizeZeroIsAUsableHandle) {
  ztini_Handle handle = ztini_PI_NewHandle(0);
  ASSERT_NE(handle, nullptr);
  EXPECT_EQ(ztini_PI_GetHandleSize(handle), 0u);
  EXPECT_EQ(ztini_PI_SetHandleSize(handle, 2), 1);
  EXPECT_EQ(Bytes(handle), std::string(2, '\0'));
  ztini_PI_DisposeHandle(handle);
}

TEST(Handle, FailedResizeLeavesTheBlockIntact) {
  ztini_Handle handle = ztini_PI_NewHandle(3);
  memcpy(handle->data, "abc", 3);
  {
    FailFromAllocation fail(1);
    EXPECT_EQ(ztini_PI_SetHandleSize(handle, 100000), 0);
  }
  EXPECT_EQ(Bytes(handle), "abc");
  ztini_PI_DisposeHandle(handle);
}

TEST(Handle, NewFailsWithNullAtEveryAllocation) {
  for (int number = 1; number <= 2; ++number) {
    FailFromAllocation fail(number);
    EXPECT_EQ(ztini_PI_NewHandle(10), nullptr) << number;
  }
}

TEST(Handle, NullIsAllowed) {
  ztini_PI_DisposeHandle(nullptr);
  EXPECT_EQ(ztini_PI_GetHandleSize(nullptr), 0u);
  EXPECT_EQ(ztini_PI_SetHandleSize(nullptr, 5), 0);
}

}  // namespace
