#include "zt/posix/FileNumbers.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/sysmacros.h>
#include <unistd.h>
#ifndef STATX_INO  // not in musl before 1.2.5
#include <linux/stat.h>
#endif

#include <cerrno>

namespace zt::posix {

// fstat() asks for the times, too: since Linux 6.13 a file whose times were asked for gets new ones
// with the next write, which takes as long again as the write.
bool GetFileNumbers(int fd, dev_t& device, ino_t& inode) {
  struct statx wanted;
  if (syscall(SYS_statx, fd, "", AT_EMPTY_PATH, STATX_INO, &wanted) == 0) {
    device = makedev(wanted.stx_dev_major, wanted.stx_dev_minor);
    inode = static_cast<ino_t>(wanted.stx_ino);
    return true;
  }
  // Sandboxes refuse what they do not know.
  struct stat info;
  if (errno == EBADF || fstat(fd, &info) != 0) return false;
  device = info.st_dev;
  inode = info.st_ino;
  return true;
}

}  // namespace zt::posix
