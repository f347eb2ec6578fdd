#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <string>

#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/Retry.h"
#include "zt/fnd/osdep/ScopedFd.h"
#include "zt/fnd/osdep/SharedUnixObject.h"
#include "zt/fnd/osdep/Sleep.h"
#include "zt/fnd/osdep/path.h"

namespace zt {
namespace fnd {
namespace osdep {
namespace {

constexpr const wchar_t* kDefaultBase = L"/var/tmp/zentrex/shared";
constexpr const char* kBaseVariable = "ZTFNDTMPSHAREDFILEDIR";
constexpr mode_t kDirMode = 0777;
constexpr mode_t kFileMode = 0666;
constexpr int kRefusedDirs = 5;
constexpr int kRounds = 100;  // a race may be lost at each level of a path
constexpr int kRefusedOpens = 3;
constexpr int kVanishedOpens = 100;

// Makes the directories. Other processes make the same ones: the loser of a race finds a level that
// stands already, and one of another user may be seen before its mode is set. Nor is a success the
// end: a path whose end is no "/" has its last component left out.
void MakeDirectories(const String& path) {
  int refused = 0;
  for (int round = 0; round < kRounds && !path::IsDirectory(path.c_str()); ++round) {
    try {
      path::CreateDir(path.c_str(), kDirMode);
    } catch (const exception::ObjectAlreadyExists&) {  // A level of a race, or a file for good.
    } catch (const exception::AccessDenied&) {         // A level whose mode is about to be opened.
      if (++refused >= kRefusedDirs) throw;
      Sleep(1);
    }
  }
}

int OpenDirectory(const char* path, int flags) {
  return RetryEintr([&] { return ::open(path, flags | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC); });
}

// fchmod for a directory that may not be read; that needs a way around the descriptor.
int ChangeModeOfUnreadable(const char* path) {
  ScopedFd fd(OpenDirectory(path, O_PATH));
  if (!fd.valid()) return -1;
  std::string link = "/proc/self/fd/" + std::to_string(fd.get());
  return RetryEintr([&] { return ::chmod(link.c_str(), kDirMode); });
}

// chmod that does not follow a link in the last place.
int ChangeDirMode(const char* path) {
  ScopedFd fd(OpenDirectory(path, O_RDONLY));
  if (fd.valid()) return RetryEintr([&] { return ::fchmod(fd.get(), kDirMode); });
  return errno == EACCES ? ChangeModeOfUnreadable(path) : -1;
}

// Opens, or returns -1 with errno.
ScopedFd OpenShared(const AnsiString& path) {
  constexpr int kFlags = O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY;
  return ScopedFd(RetryEintr([&] { return ::open(path.c_str(), kFlags, kFileMode); }));
}

// Opens through the moments in which another user's file has not got its mode yet.
ScopedFd OpenSharedPatiently(const AnsiString& path) {
  for (int refused = 0;;) {
    ScopedFd fd = OpenShared(path);
    if (fd.valid()) return fd;
    if (errno != EACCES || ++refused >= kRefusedOpens) ZT_RAISE(PosixError());
    Sleep(1);
  }
}

void OpenToEverybody(int fd) {
  if (RetryEintr([&] { return ::fchmod(fd, kFileMode); }) == 0) return;
  if (errno != EPERM) ZT_RAISE(PosixError(EPERM));
}

}  // namespace

String GetSharedUnixBase() {
  // Not from the environment of somebody who runs a program with more rights than his own.
  const char* base = ::secure_getenv(kBaseVariable);
  return base != nullptr && base[0] == '/' ? String(base) : String(kDefaultBase);
}

AnsiString BuildSharedUnixFilePath(const String& dirName, const String& fileName) {
  String dir = path::Join(GetSharedUnixBase(), dirName);
  path::MakePathEndInSlash(dir);
  CreateSharedUnixDir(dir);
  return AnsiString(path::Join(dir, fileName));
}

void CreateSharedUnixDir(const String& path) {
  MakeDirectories(path);
  if (!path::IsDirectory(path.c_str())) ZT_RAISE(PosixError(ENOTDIR));
  // With a slash at the end a link would be followed after all.
  String::size_type last = path.find_last_not_of(L'/');
  AnsiString narrow(last == String::npos ? path : path.substr(0, last + 1));
  if (ChangeDirMode(narrow.c_str()) != 0 && errno != EPERM) ZT_RAISE(PosixError());
}

int CreateSharedUnixFile(const AnsiString& path) {
  for (int vanished = 0;; ++vanished) {
    ScopedFd fd = OpenSharedPatiently(path);
    struct stat info;
    if (::fstat(fd.get(), &info) != 0) ZT_RAISE(PosixError());
    if (!S_ISREG(info.st_mode)) ZT_RAISE(PosixError(ENXIO));
    if (info.st_nlink > 1) ZT_RAISE(PosixError(EMLINK));
    if (info.st_nlink == 0 && vanished < kVanishedOpens) continue;  // removed just now
    OpenToEverybody(fd.get());
    return fd.release();
  }
}

FileIdentity FileIdentity::Of(int fd) {
  struct stat info;
  if (::fstat(fd, &info) != 0) ZT_RAISE(PosixError());
  FileIdentity identity;
  identity.device = info.st_dev;
  identity.inode = info.st_ino;
  return identity;
}

bool FileIdentity::isBehind(int fd) const noexcept {
  struct stat info;
  int saved = errno;
  bool known = ::fstat(fd, &info) == 0;
  bool open = known || errno != EBADF;
  errno = saved;
  return known ? info.st_dev == device && info.st_ino == inode : open;
}

bool FileIdentity::isNamedBy(const AnsiString& path) const {
  struct stat info;
  if (RetryEintr([&] { return ::lstat(path.c_str(), &info); }) != 0) {
    return errno != ENOENT && errno != ENOTDIR;
  }
  return info.st_dev == device && info.st_ino == inode;
}

}  // namespace osdep
}  // namespace fnd
}  // namespace zt
