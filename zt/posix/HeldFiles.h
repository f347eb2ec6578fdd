#pragma once

#include <fcntl.h>
#include <sys/types.h>

#include <cerrno>

#include "zt/posix/Files.h"
#include "zt/posix/Retry.h"
#include "zt/posix/ScopedFd.h"

// Platform seam: what Files.cpp needs to judge a file before it is opened, and to rename without
// replacing. HeldFiles_linux.cpp keeps the rules without a race; HeldFiles_plain.cpp has POSIX
// alone, and says where that falls short.
//
// LookUpEntry and ChangeMode, of Files.h, are parts of it. Failures are as in Files.h.
namespace zt::posix {

inline ScopedFd OpenAt(int directory, const char* name, int flags, mode_t mode = 0) {
  return ScopedFd(RetryEintr([&] { return openat(directory, name, flags | O_CLOEXEC, mode); }));
}

inline ScopedFd Failure(int error) {
  errno = error;
  return ScopedFd();
}

// What a path without links names, in one call of the kernel. ELOOP for a path with links; ENOSYS,
// EPERM or EINVAL where the system has no such call: the caller then walks the path itself.
Found LookUpWithoutLinks(const char* path, bool follow);

// A directory as Found holds it; `name` is "/" or ".".
ScopedFd HoldDirectory(int at, const char* name);

// readlink(2) of the link that was looked up in `directory` by this name.
ssize_t ReadLink(int directory, const char* name, const Found& link, char* text, size_t sizeBytes);

// Opens the very file that was looked up. ENOENT where the system cannot: the caller then opens it
// by its path once more, and compares.
ScopedFd OpenFound(const Found& found, int flags);

// rename(2) inside a directory that replaces nothing, in one step: EEXIST where `to` is taken;
// ENOSYS, EPERM or EINVAL where the system or the file system has no such call.
int RenameInOneStep(int directory, const char* from, const char* to);

}  // namespace zt::posix
