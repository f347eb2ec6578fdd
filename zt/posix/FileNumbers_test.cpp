#include "zt/posix/FileNumbers.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>

#include "tests/support/Child.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/TempDir.h"
#include "zt/posix/ScopedFd.h"

namespace zt::posix {
namespace {

using vlt::test::Child;
using vlt::test::TempDir;
using vlt::test::WriteBytes;

bool AreThoseOfFstat(int fd) {
  struct stat info;
  dev_t device = 0;
  ino_t inode = 0;
  return fstat(fd, &info) == 0 && GetFileNumbers(fd, device, inode) && device == info.st_dev &&
         inode == info.st_ino;
}

TEST(FileNumbers, AreThoseOfFstatForFilesPipesAndDevices) {
  TempDir dir;
  WriteBytes(dir / "file", "x");
  ScopedFd file(open((dir / "file").c_str(), O_RDONLY | O_CLOEXEC));
  EXPECT_TRUE(AreThoseOfFstat(file.get()));
  ASSERT_EQ(unlink((dir / "file").c_str()), 0);
  EXPECT_TRUE(AreThoseOfFstat(file.get()));
  ScopedFd device(open("/dev/null", O_RDONLY | O_CLOEXEC));
  EXPECT_TRUE(AreThoseOfFstat(device.get()));
  ScopedFd directory(open("/proc/self", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  EXPECT_TRUE(AreThoseOfFstat(directory.get()));
  int ends[2];
  ASSERT_EQ(pipe2(ends, O_CLOEXEC), 0);
  ScopedFd out(ends[0]), in(ends[1]);
  EXPECT_TRUE(AreThoseOfFstat(in.get()));
}

TEST(FileNumbers, ClosedDescriptorIsEBADF) {
  dev_t device;
  ino_t inode;
  EXPECT_FALSE(GetFileNumbers(-1, device, inode));
  EXPECT_EQ(errno, EBADF);
}

TEST(FileNumbers, AreThereInASandboxThatRefusesTheNewerCall) {
  TempDir dir;
  WriteBytes(dir / "file", "x");
  for (int error : {ENOSYS, EPERM}) {
    Child child([&] {
      ScopedFd file(open((dir / "file").c_str(), O_RDONLY | O_CLOEXEC));
      if (!vlt::test::FailSystemCall(SYS_statx, error)) return 1;
      struct stat info;
      // With 64-bit times on 32 bits, the C library's fstat() is that call itself.
      if (sizeof(void*) == 4 && fstat(file.get(), &info) != 0) return 0;
      return AreThoseOfFstat(file.get()) ? 0 : 2;
    });
    EXPECT_EQ(child.wait(), 0) << error;
  }
}

}  // namespace
}  // namespace zt::posix
