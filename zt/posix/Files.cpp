// How rule 1 is kept. A path is never checked and then opened: what it names is first held, without
// being opened (HeldFiles.h), then judged, and only then is the same file opened for real. Whoever
// replaces a part of the path in between changes nothing about the file that was judged.
//
// The usual path has no link, and the kernel walks it in one call. Only where that reports ELOOP
// does Walk go component by component, so that the owner of each link can be compared with that of
// what it leads to.
#include "zt/posix/Files.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>

#include "zt/posix/HeldFiles.h"
#include "zt/posix/Retry.h"
#include "zt/posix/Transfer.h"

namespace zt::posix {
namespace {

constexpr int kMostLinks = 40;  // as the kernel's own limit
// A race is lost only if another process makes or removes the file at that very moment. The limit
// turns a process that does so endlessly into an error instead of a hang.
constexpr int kMostRaces = 100;
// Files set aside are never removed, so that a file that is damaged again and again could otherwise
// keep the search for a free name busy without end.
constexpr int kMostSetAside = 10000;
constexpr int kFirstFreeDescriptor = 3;
constexpr mode_t kAllModeBits = 07777;
// O_NONBLOCK, because between the judgement and the open by path (without /proc) a pipe can take
// the file's place, and its open would wait for a writer. Regular files ignore the flag.
constexpr int kAlways = O_CLOEXEC | O_NOCTTY | O_NONBLOCK;

struct Free {
  void operator()(char* text) const { free(text); }
};
using Text = std::unique_ptr<char, Free>;

// The third case lets users link among their own files. It is no hole: the owner of the target can
// change that file anyway.
bool IsTrusted(const struct stat& link, const struct stat& target) {
  return link.st_uid == 0 || link.st_uid == geteuid() || link.st_uid == target.st_uid;
}

// Walks a path one component at a time, so that each link on the way can be judged.
class Walk {
 public:
  // What the path names below `at`.
  Found resolve(int at, const char* path, bool follow);

 private:
  ScopedFd start(int at, const char* path);
  Found step(const Found& directory, const char* name, bool follow);
  Found followLink(int directory, const char* name, const Found& link, const struct stat& info);

  int m_links = 0;
};

// A directory is not held where its caller may not enter it.
ScopedFd CannotEnter(const Found& found) {
  return Failure(S_ISDIR(found.unheld->st_mode) ? EACCES : ENOTDIR);
}

ScopedFd Walk::start(int at, const char* path) {
  if (!*path) return Failure(ENOENT);
  return *path == '/' ? HoldDirectory(AT_FDCWD, "/") : HoldDirectory(at, ".");
}

Found Walk::followLink(int directory, const char* name, const Found& link,
                       const struct stat& info) {
  if (++m_links > kMostLinks) return Failure(ELOOP);
  // In the heap: the function is recursive, and host threads may have small stacks.
  Text text(static_cast<char*>(malloc(PATH_MAX)));
  if (!text) return Failure(ENOMEM);
  ssize_t length = ReadLink(directory, name, link, text.get(), PATH_MAX);
  if (length < 0) return Found();
  // A full buffer may be a text that was cut.
  if (length == PATH_MAX) return Failure(ENAMETOOLONG);
  text.get()[length] = 0;
  // Relative to the directory that holds the link, and judged link by link itself.
  Found target = resolve(directory, text.get(), true);
  struct stat led;
  if (!target.examine(&led)) return Found();
  if (!IsTrusted(info, led)) return Failure(ELOOP);
  return target;
}

Found Walk::step(const Found& directory, const char* name, bool follow) {
  int at = directory.fd.get();
  Found found = LookUpEntry(at, name);
  struct stat info;
  if (!found.examine(&info)) return Found();
  if (!S_ISLNK(info.st_mode) || !follow) return found;
  return followLink(at, name, found, info);
}

Found Walk::resolve(int at, const char* path, bool follow) {
  Found here = start(at, path);
  char name[NAME_MAX + 1];
  while (here) {
    path += strspn(path, "/");
    if (!*path) break;
    size_t length = strcspn(path, "/");
    if (length > NAME_MAX) return Failure(ENAMETOOLONG);
    // ".." is a name like any other: openat resolves it in the directory that was really reached.
    memcpy(name, path, length);
    name[length] = 0;
    path += length;
    bool last = !*path;
    if (!here.fd) return CannotEnter(here);
    here = step(here, name, follow || !last);
    // A slash at the end asks for a directory.
    struct stat info;
    if (here && *path && (!here.examine(&info) || !S_ISDIR(info.st_mode))) {
      return Failure(ENOTDIR);
    }
  }
  return here;
}

// The kernel walks a path without links in one call. ELOOP: it has one, which is judged by the slow
// walk; ENOSYS, EPERM and EINVAL: an older kernel, or a sandbox that does not know the call.
bool NeedsSlowWalk(int error) {
  return error == ELOOP || error == ENOSYS || error == EPERM || error == EINVAL;
}

bool SameFile(const ScopedFd& a, const Found& b) {
  struct stat left, right;
  return fstat(a.get(), &left) == 0 && b.examine(&right) && left.st_dev == right.st_dev &&
         left.st_ino == right.st_ino;
}

// Opens for real what was looked up.
ScopedFd Reopen(const Found& found, const char* path, int flags) {
  ScopedFd fd = OpenFound(found, flags | kAlways);
  // Or else by the path once more: the same file, or none.
  if (!fd && errno == ENOENT) {
    fd = OpenAt(AT_FDCWD, path, flags | kAlways);
    if (fd && !SameFile(fd, found)) return Failure(ELOOP);
  }
  return AboveStandardStreams(std::move(fd));
}

}  // namespace

ScopedFd AboveStandardStreams(ScopedFd fd) {
  if (!fd || fd.get() >= kFirstFreeDescriptor) return fd;
  return ScopedFd(fcntl(fd.get(), F_DUPFD_CLOEXEC, kFirstFreeDescriptor));
}

bool Found::examine(struct stat* info) const {
  if (!unheld) return fd.valid() && fstat(fd.get(), info) == 0;
  *info = *unheld;
  return true;
}

Found LookUp(const char* path, bool follow) {
  Found found = LookUpWithoutLinks(path, follow);
  if (found || !NeedsSlowWalk(errno)) return found;
  return Walk().resolve(AT_FDCWD, path, follow);
}

ScopedFd OpenExisting(const char* path, int flags, Kind kind, LastLink link) {
  for (int race = 0; race < kMostRaces; ++race) {
    Found found = LookUp(path, link == LastLink::Judged);
    struct stat info;
    if (!found.examine(&info)) return ScopedFd();
    // Only with LastLink::Refused: LookUp has followed all others.
    if (S_ISLNK(info.st_mode)) return Failure(ELOOP);
    if (S_ISDIR(info.st_mode)) {
      if (kind != Kind::FileOrDirectory) return Failure(EISDIR);
    } else if (!S_ISREG(info.st_mode)) {
      return Failure(ENXIO);
    }
    ScopedFd fd = Reopen(found, path, flags);
    // ELOOP: without /proc, where another file has taken the place; it is judged in its turn.
    if (fd || errno != ELOOP) return fd;
  }
  return Failure(ELOOP);
}

ScopedFd CreateNew(const char* path, int flags, mode_t mode) {
  Entry entry(path);
  return entry.valid() ? CreateNew(entry, flags, mode) : ScopedFd();
}

ScopedFd CreateNew(const Entry& entry, int flags, mode_t mode) {
  // O_EXCL with O_CREAT never follows a link in the last place (POSIX); the directory is the one
  // that was judged, whatever its path names by now.
  return AboveStandardStreams(OpenAt(entry.directory.get(), entry.name,
                                     flags | kAlways | O_CREAT | O_EXCL | O_NOFOLLOW, mode));
}

ScopedFd OpenOrCreate(const char* path, int flags, mode_t mode, LastLink link) {
  // Another process may make or remove the file between the two attempts.
  for (int race = 0; race < kMostRaces; ++race) {
    ScopedFd fd = OpenExisting(path, flags, Kind::File, link);
    if (fd || errno != ENOENT) return fd;
    fd = CreateNew(path, flags, mode);
    if (fd || errno != EEXIST) return fd;
    // What is there, but leads nowhere, is a dangling link.
    struct stat info;
    Found found = LookUp(path, false);
    if (found.examine(&info) && S_ISLNK(info.st_mode)) return Failure(ELOOP);
  }
  return Failure(EEXIST);
}

ScopedFd OpenDirectory(const char* path) {
  Found found = LookUp(path);
  if (!found) return ScopedFd();
  return Reopen(found, path, O_RDONLY | O_DIRECTORY);
}

ScopedFd OpenDirectory(int fd) { return OpenAt(fd, ".", O_RDONLY | O_DIRECTORY); }

namespace {

ScopedFd HoldForEntry(const char* path) {
  Found found = LookUp(path);
  return found.unheld ? CannotEnter(found) : std::move(found.fd);
}

}  // namespace

Entry::Entry(const char* path) : name(path) {
  // Slashes at the end belong to the name: they ask for a directory.
  size_t end = strlen(path);
  while (end > 0 && path[end - 1] == '/') --end;
  while (end > 0 && path[end - 1] != '/') --end;
  if (end == 0) {
    // Only slashes, or a name alone; the name is the whole path then.
    directory = HoldForEntry(*path == '/' ? "/" : ".");
    return;
  }
  name = path + end;
  Text text(static_cast<char*>(malloc(end + 1)));
  if (!text) {
    errno = ENOMEM;
    return;
  }
  memcpy(text.get(), path, end);
  text.get()[end] = 0;
  directory = HoldForEntry(text.get());
}

int Rename(const char* from, const char* to) {
  Entry source(from), target(to);
  if (!source.valid() || !target.valid()) return -1;
  return RetryEintr([&] {
    return renameat(source.directory.get(), source.name, target.directory.get(), target.name);
  });
}

int Unlink(const char* path) {
  Entry entry(path);
  return entry.valid() ? Unlink(entry) : -1;
}

int Unlink(const Entry& entry) {
  return RetryEintr([&] { return unlinkat(entry.directory.get(), entry.name, 0); });
}

int RenameBeside(const Entry& from, const char* name) {
  int directory = from.directory.get();
  return RetryEintr([&] { return renameat(directory, from.name, directory, name); });
}

int Link(const char* existing, const char* path) {
  Entry source(existing), target(path);
  if (!source.valid() || !target.valid()) return -1;
  return RetryEintr([&] {
    return linkat(source.directory.get(), source.name, target.directory.get(), target.name, 0);
  });
}

int RenameToNew(int directory, const char* from, const char* to) {
  // The one call that both renames and refuses to replace: link() and unlink() instead would show
  // the file under two names for a moment, which SetSharedMode refuses to touch.
  int result = RenameInOneStep(directory, from, to);
  if (result == 0 || (errno != ENOSYS && errno != EINVAL && errno != EPERM)) return result;
  // Some systems have no such call, and some file systems do not know the flag. The name is examined
  // first; a race here would need two files set aside at one moment under the file's lock.
  struct stat info;
  if (fstatat(directory, to, &info, AT_SYMLINK_NOFOLLOW) == 0) {
    errno = EEXIST;
    return -1;
  }
  return RetryEintr([&] { return renameat(directory, from, directory, to); });
}

int MoveAside(const char* path, const char* stamp) {
  Entry entry(path);
  if (!entry.valid()) return -1;
  char name[NAME_MAX + 1];
  for (int number = 0; number < kMostSetAside; ++number) {
    int length = number == 0
                     ? snprintf(name, sizeof name, "%s%s.bad", entry.name, stamp)
                     : snprintf(name, sizeof name, "%s%s.%d.bad", entry.name, stamp, number);
    if (length >= static_cast<int>(sizeof name)) {
      errno = ENAMETOOLONG;
      return -1;
    }
    // Tried and not looked up: only the rename itself can say that a name is free.
    if (RenameToNew(entry.directory.get(), entry.name, name) == 0) return 0;
    if (errno != EEXIST) return -1;
  }
  return -1;
}

int MakeRoom(const char* path) {
  // A directory in the place of a file is kept: what it holds is not this library's to remove.
  if (Unlink(path) == 0 || errno == ENOENT) return 0;
  // A directory: EISDIR on Linux, EPERM by POSIX.
  return errno == EISDIR || errno == EPERM ? MoveAside(path) : -1;
}

int SetSharedMode(int fd, const struct stat& info, mode_t mode) {
  // A second name may be one that another user has given to a file of root or of the caller, to
  // have its mode widened here. Directories have several links by nature.
  if (S_ISREG(info.st_mode) && info.st_nlink > 1) {
    errno = EMLINK;
    return -1;
  }
  if (info.st_uid != 0 && info.st_uid != geteuid()) {
    errno = EPERM;
    return -1;
  }
  return (info.st_mode & kAllModeBits) == mode ? 0 : ChangeMode(fd, mode);
}

int SetSharedMode(int fd, mode_t mode) {
  struct stat info;
  return fstat(fd, &info) == 0 ? SetSharedMode(fd, info, mode) : -1;
}

int SetSharedMode(const char* path, mode_t mode) {
  Found found = LookUp(path, false);
  struct stat info;
  if (!found.examine(&info)) return -1;
  if (S_ISLNK(info.st_mode)) return 0;
  return SetSharedMode(found.fd.get(), info, mode);
}

bool IsPassing(int error) {
  switch (error) {
    // ENOENT, EACCES, ENOTDIR, ELOOP and the like are answers about the file; these are not.
    case EIO:
    case ESTALE:
    case EINTR:
    case ENOMEM:
    case EMFILE:
    case ENFILE:
    case ENOSPC:
    case ETIMEDOUT:
      return true;
    default:
      return false;
  }
}

bool WriteAll(int fd, const void* data, size_t sizeBytes) {
  auto bytes = static_cast<const char*>(data);
  return MoveAll(sizeBytes, [&](size_t done, size_t rest) {
           return write(fd, bytes + done, rest);
         }) == sizeBytes;
}

bool WriteAllAt(int fd, const void* data, size_t sizeBytes, off_t offset) {
  auto bytes = static_cast<const char*>(data);
  return MoveAll(sizeBytes, [&](size_t done, size_t rest) {
           return pwrite(fd, bytes + done, rest, offset + static_cast<off_t>(done));
         }) == sizeBytes;
}

int Flock(int fd, int operation) {
  return RetryEintr([&] { return flock(fd, operation); });
}

bool Sync(int fd) {
  // EINVAL and ENOSYS: a file system without fsync. EROFS: nothing can be unwritten.
  if (RetryEintr([&] { return fsync(fd); }) == 0) return true;
  return errno == EINVAL || errno == ENOSYS || errno == EROFS;
}

bool SyncDirectory(const char* path) {
  ScopedFd fd = OpenDirectory(path);
  // The entry is made durable later by the system; refusing the caller's save for it would help no
  // user.
  if (!fd) return errno == EACCES;
  return Sync(fd.get());
}

bool SyncDirectoryOf(const char* path) {
  Entry entry(path);
  if (!entry.valid()) return false;
  ScopedFd fd = OpenDirectory(entry.directory.get());
  if (!fd) return errno == EACCES;
  return Sync(fd.get());
}

}  // namespace zt::posix
