#include "tests/support/Emulation.h"

#include <gtest/gtest.h>
#include <sys/syscall.h>

namespace vlt::test {
namespace {

TEST(Emulation, AKernelsOwnProcessorIsNotEmulated) {
#if defined(__x86_64__) || defined(__i386__)
  EXPECT_FALSE(IsEmulated());
  EXPECT_EQ(NumberInProc(SYS_flock), SYS_flock);
#else
  GTEST_SKIP() << "NOT TESTED: this processor may be emulated";
#endif
}

TEST(Emulation, WhatAnEmulatorCannotDoHasAReason) {
  EXPECT_EQ(BeyondEmulators("ByteOrder.PutAndGetAreLittleEndianAtAnyPlace"), nullptr);
  EXPECT_STREQ(BeyondEmulators("FileReplace.AFailedSyncIsAFailedSave"),
               "the emulator knows no filter of system calls");
}

}  // namespace
}  // namespace vlt::test
