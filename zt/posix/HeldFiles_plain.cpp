// POSIX cannot hold a file without opening it. So directories and regular files are opened, for
// reading or else for writing, and compared with what was seen before; of all else, and of a file
// that the caller may do neither with, only its state is known (Found::unheld).
//
// What that falls short of: a device or a pipe that takes the place of a file between the two calls
// is opened (without waiting); the mode of what is not held cannot be changed; and a directory that
// may be entered but not read stops a walk where there is no O_SEARCH.
#include "zt/posix/HeldFiles.h"

#include <sys/stat.h>
#include <unistd.h>

namespace zt::posix {
namespace {

#ifdef O_SEARCH
constexpr int kDirectory = O_SEARCH | O_DIRECTORY;
#else
constexpr int kDirectory = O_RDONLY | O_DIRECTORY;
#endif
constexpr int kMostRaces = 100;

bool IsSame(const struct stat& a, const struct stat& b) {
  return a.st_dev == b.st_dev && a.st_ino == b.st_ino &&
         (a.st_mode & S_IFMT) == (b.st_mode & S_IFMT);
}

bool IsRefusal(int error) {
  return error == EACCES || error == EPERM || error == EROFS || error == ETXTBSY;
}

// What was seen, opened for whatever the caller may do with it.
ScopedFd Hold(int directory, const char* name, mode_t mode) {
  constexpr int kAlways = O_NOFOLLOW | O_NONBLOCK | O_NOCTTY;
  if (S_ISDIR(mode)) return OpenAt(directory, name, kDirectory | kAlways);
  ScopedFd fd = OpenAt(directory, name, O_RDONLY | kAlways);
  return fd || !IsRefusal(errno) ? std::move(fd) : OpenAt(directory, name, O_WRONLY | kAlways);
}

}  // namespace

Found LookUpWithoutLinks(const char*, bool) { return Failure(ENOSYS); }

Found LookUpEntry(int directory, const char* name, int flags) {
  for (int race = 0; race < kMostRaces; ++race) {
    struct stat seen, held;
    if (fstatat(directory, name, &seen, AT_SYMLINK_NOFOLLOW) != 0) return Failure(errno);
    if ((flags & O_DIRECTORY) && !S_ISDIR(seen.st_mode)) return Failure(ENOTDIR);
    if (!S_ISDIR(seen.st_mode) && !S_ISREG(seen.st_mode)) return seen;
    ScopedFd fd = Hold(directory, name, seen.st_mode);
    if (!fd && IsRefusal(errno)) return seen;
    if (fd && fstat(fd.get(), &held) == 0 && IsSame(seen, held)) return fd;
    // Gone or replaced in between is looked up again; what the machine cannot do is reported.
    if (!fd && IsPassing(errno)) return Found();
  }
  return Failure(ELOOP);
}

ScopedFd HoldDirectory(int at, const char* name) { return OpenAt(at, name, kDirectory); }

ssize_t ReadLink(int directory, const char* name, const Found& link, char* text, size_t sizeBytes) {
  ssize_t length = RetryEintr([&] { return readlinkat(directory, name, text, sizeBytes); });
  struct stat info, judged;
  if (length < 0 || fstatat(directory, name, &info, AT_SYMLINK_NOFOLLOW) != 0) return -1;
  if (link.examine(&judged) && IsSame(info, judged)) return length;
  errno = ELOOP;
  return -1;
}

ScopedFd OpenFound(const Found&, int) { return Failure(ENOENT); }

int RenameInOneStep(int, const char*, const char*) {
  errno = ENOSYS;
  return -1;
}

int ChangeMode(int fd, mode_t mode) {
  if (fd < 0) {  // Not held, which is to say closed to the caller, or neither file nor directory.
    errno = EPERM;
    return -1;
  }
  return RetryEintr([&] { return fchmod(fd, mode); });
}

}  // namespace zt::posix
