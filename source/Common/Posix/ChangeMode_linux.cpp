#include <errno.h>
#include <fcntl.h>
#include <sys/stat.h>

#include "source/Common/Posix/ChangeMode.h"

int vlChangeModeNoFollow(const char* path, int mode) {
  // The C library opens the path without following it and goes through that descriptor, so nobody
  // can put a link in its place in between. Linux has no mode bits for links themselves.
  int result = fchmodat(AT_FDCWD, path, static_cast<mode_t>(mode), AT_SYMLINK_NOFOLLOW);
  return result != 0 && errno == EOPNOTSUPP ? 0 : result;
}
