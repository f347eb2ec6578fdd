#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/file.h>

#include <string>

#include "tests/support/TempDir.h"
#include "zt/posix/Files.h"

namespace vlt::test {

// A shared place of the test's own for named mutexes.
struct MutexPlace {
  TempDir dir;
  MutexPlace() { setenv("ZTFNDTMPSHAREDFILEDIR", dir.path().c_str(), 1); }
  std::string file(const char* name) const { return dir / ("mutex/" + std::string(name)); }
};

// Whether the lock on the file is free for others, tested by a descriptor of its own.
inline bool FileIsFree(const std::string& path) {
  zt::posix::ScopedFd fd(::open(path.c_str(), O_RDWR | O_CLOEXEC));
  EXPECT_TRUE(fd.valid()) << path;
  return zt::posix::Flock(fd.get(), LOCK_EX | LOCK_NB) == 0;
}

}  // namespace vlt::test
