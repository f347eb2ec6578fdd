#pragma once

#include <sys/types.h>

namespace zt::posix {

// Platform seam: the numbers of the file that a descriptor leads to, as fstat(2) has them. False
// with errno. Does not make the next write to the file slower, where the system can do that. Safe in
// a signal handler.
bool GetFileNumbers(int fd, dev_t& device, ino_t& inode);

}  // namespace zt::posix
