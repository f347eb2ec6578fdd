#include <sys/stat.h>

#include "zt/posix/FileNumbers.h"

namespace zt::posix {

bool GetFileNumbers(int fd, dev_t& device, ino_t& inode) {
  struct stat info;
  if (fstat(fd, &info) != 0) return false;
  device = info.st_dev;
  inode = info.st_ino;
  return true;
}

}  // namespace zt::posix
