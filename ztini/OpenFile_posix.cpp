#include "ztini/OpenFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <utility>

#include "ztini/Alloc.h"
#include "ztini/Retry.h"
#include "ztini/StringTools.h"

namespace ztini {
namespace {

constexpr mode_t kNewFileMode = 0666;  // less the process's mask

ScopedFd Open(const char* path, int flags) {
  return ScopedFd(
      RetryEintr([&] { return open(path, flags | O_CLOEXEC | O_NOCTTY, kNewFileMode); }));
}

// O_NONBLOCK means nothing to a regular file, and keeps open() from waiting for the other end of a
// pipe. What else may stand at the path is refused after the fact, since asking first would race.
ScopedFd OpenRegular(const char* path, int flags) {
  ScopedFd fd = Open(path, flags | O_NONBLOCK);
  struct stat status;
  if (fd && (fstat(fd.get(), &status) != 0 || !S_ISREG(status.st_mode))) return ScopedFd(-1);
  return fd;
}

}  // namespace

ScopedFd::~ScopedFd() {
  if (m_fd >= 0) close(m_fd);
}

int ScopedFd::release() { return std::exchange(m_fd, -1); }

Stream OpenForReading(const char* path) {
  ScopedFd fd = Open(path, O_RDONLY | O_NONBLOCK);
  struct stat status;
  if (!fd || fstat(fd.get(), &status) != 0) return nullptr;
  if (!S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode)) return nullptr;
  return StreamOver(std::move(fd), "rb");
}

ScopedFd OpenExisting(const char* path) { return OpenRegular(path, O_RDWR); }

ScopedFd OpenOrCreate(const char* path) { return OpenRegular(path, O_WRONLY | O_CREAT); }

ScopedFd CreateNew(const char* path) {
  return Open(path, O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW);
}

bool Truncate(const ScopedFd& fd) {
  return RetryEintr([&] { return ftruncate(fd.get(), 0); }) == 0;
}

Stream StreamOver(ScopedFd fd, const char* mode) {
  Stream stream(fd ? fdopen(fd.get(), mode) : nullptr);
  if (stream) fd.release();
  return stream;
}

bool SyncDescriptor(int fd) {
  if (RetryEintr([&] { return fsync(fd); }) == 0) return true;
  return errno == EINVAL || errno == ENOSYS || errno == EROFS;
}

bool SyncDirectoryOf(const char* path) {
  OwnedText directory(ztini_StrDup(path));
  if (!directory) return false;
  char* slash = strrchr(directory.get(), '/');
  if (slash) slash[1] = 0;
  ScopedFd fd = Open(slash ? directory.get() : ".", O_RDONLY | O_DIRECTORY);
  return fd && SyncDescriptor(fd.get());
}

}  // namespace ztini
