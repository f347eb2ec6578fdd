// An O_PATH descriptor fixes a file without opening it, and the path of the descriptor in /proc
// opens that very file later.
#include "zt/posix/HeldFiles.h"

#include <linux/fs.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>

namespace zt::posix {
namespace {

// The path of a descriptor in /proc, through which O_PATH ones can be opened for real.
class DescriptorPath {
 public:
  explicit DescriptorPath(int fd) { snprintf(m_text, sizeof m_text, "/proc/self/fd/%d", fd); }
  const char* text() const { return m_text; }

 private:
  char m_text[32];
};

}  // namespace

Found LookUpWithoutLinks(const char* path, bool follow) {
  // Zeroed as a whole: the kernel refuses a request with values in fields that the flags do not
  // use.
  struct open_how how;
  memset(&how, 0, sizeof how);
  how.flags = static_cast<unsigned>(O_PATH | O_CLOEXEC | (follow ? 0 : O_NOFOLLOW));
  how.resolve = RESOLVE_NO_SYMLINKS;
  return ScopedFd(static_cast<int>(
      RetryEintr([&] { return syscall(SYS_openat2, AT_FDCWD, path, &how, sizeof how); })));
}

Found LookUpEntry(int directory, const char* name, int flags) {
  return OpenAt(directory, name, O_PATH | O_NOFOLLOW | flags);
}

ScopedFd HoldDirectory(int at, const char* name) { return OpenAt(at, name, O_PATH | O_DIRECTORY); }

ssize_t ReadLink(int, const char*, const Found& link, char* text, size_t sizeBytes) {
  return RetryEintr([&] { return readlinkat(link.fd.get(), "", text, sizeBytes); });
}

ScopedFd OpenFound(const Found& found, int flags) {
  return OpenAt(AT_FDCWD, DescriptorPath(found.fd.get()).text(), flags);
}

int RenameInOneStep(int directory, const char* from, const char* to) {
  return static_cast<int>(RetryEintr(
      [&] { return syscall(SYS_renameat2, directory, from, directory, to, RENAME_NOREPLACE); }));
}

int ChangeMode(int fd, mode_t mode) {
  int result = RetryEintr([&] { return fchmod(fd, mode); });
  if (result == 0 || errno != EBADF) return result;
  // O_PATH: fchmod does not take it.
  result = RetryEintr([&] { return chmod(DescriptorPath(fd).text(), mode); });
  if (result == 0 || errno != ENOENT) return result;
    // Without /proc: Linux 6.6 has a call for it, and a directory can be opened.
#ifdef SYS_fchmodat2
  constexpr long kChangeModeAt = SYS_fchmodat2;
#else
  constexpr long kChangeModeAt = 452;  // on every architecture
#endif
  if (RetryEintr([&] { return syscall(kChangeModeAt, fd, "", mode, AT_EMPTY_PATH); }) == 0) {
    return 0;
  }
  ScopedFd directory = OpenDirectory(fd);
  return directory ? RetryEintr([&] { return fchmod(directory.get(), mode); }) : -1;
}

}  // namespace zt::posix
