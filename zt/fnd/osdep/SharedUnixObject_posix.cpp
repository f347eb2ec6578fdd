// Several processes, of several users, make the same directories and files at the same time, and
// each must end with ones that all can use. Between making something and setting its mode it is
// closed to other users for a moment, and a file may be removed by its last user just as another
// one opens it. So every step is tried again, a fixed number of times with a pause: races are over
// in a millisecond, and what fails for good is reported after a few.
//
// The modes are set on descriptors, after the opening: the umask of the process that is first must
// not decide for all others, and umask(2) itself would change the whole process.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <string>

#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/SharedUnixObject.h"
#include "zt/fnd/osdep/Sleep.h"
#include "zt/fnd/osdep/path.h"
#include "zt/posix/Environment.h"
#include "zt/posix/FileNumbers.h"
#include "zt/posix/Files.h"
#include "zt/posix/Retry.h"

using zt::posix::RetryEintr;
using zt::posix::ScopedFd;

namespace zt::fnd::osdep {
namespace {

constexpr const wchar_t* kDefaultBase = L"/var/tmp/zentrex/shared";
constexpr const char* kBaseVariable = "ZTFNDTMPSHAREDFILEDIR";
constexpr mode_t kDirMode = 0777;
constexpr mode_t kFileMode = 0666;
// Attempts, a millisecond apart: the time for another user's process to set the mode of a directory
// that it has just made.
constexpr int kRefusedDirs = 5;
constexpr int kRounds = 100;  // a race may be lost at each level of a path
constexpr int kRefusedOpens = 3;
// So often in a row only by a process that opens and removes the file in a loop.
constexpr int kVanishedOpens = 100;
// Of things moved aside for one opening: whoever puts new ones there faster is refused.
constexpr int kClearings = 10;

// Makes the directories. Other processes make the same ones: the loser of a race finds a level that
// exists already, and one of another user may be seen before its mode is set. Nor is a success the
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

// What may be in the place of a file: a link, a directory, a pipe or a device, a file with a second
// name.
bool IsInTheWay(int error) {
  return error == ELOOP || error == EISDIR || error == ENXIO || error == EMLINK;
}

[[noreturn]] void RaiseInTheWay(const AnsiString& path, int error) {
  std::string message = std::string("\"") + path.c_str() +
                        "\" is no file of its own: remove it, or have its owner remove it";
  ZT_RAISE(PosixError(message.c_str(), error));
}

struct OpenedFile {
  ScopedFd fd;
  struct stat info;
};

// Opens through the moments in which another user's file has not got its mode yet.
OpenedFile OpenSharedPatiently(const AnsiString& path, InTheWay way) {
  for (int refused = 0, cleared = 0;;) {
    OpenedFile file;
    file.fd =
        zt::posix::OpenOrCreate(path.c_str(), O_RDWR, kFileMode, zt::posix::LastLink::Refused);
    if (file.fd && ::fstat(file.fd.get(), &file.info) != 0) ZT_RAISE(PosixError());
    if (file.fd && file.info.st_nlink <= 1) return file;
    int error = file.fd ? EMLINK : errno;
    file.fd.reset();
    if (IsInTheWay(error)) {
      bool gone = way == InTheWay::MovedAside && ++cleared < kClearings &&
                  (zt::posix::MoveAside(path.c_str()) == 0 || errno == ENOENT);
      if (!gone) RaiseInTheWay(path, error);
    } else if (error != EACCES || ++refused >= kRefusedOpens) {
      ZT_RAISE(PosixError(error));
    } else {
      Sleep(1);
    }
  }
}

void ShareDirectory(const zt::posix::Found& found) {
  struct stat info;
  if (!found.examine(&info)) ZT_RAISE(PosixError());
  if (!S_ISDIR(info.st_mode)) ZT_RAISE(PosixError(ENOTDIR));
  // EPERM: it belongs to another user, whose process sets the mode.
  if (zt::posix::SetSharedMode(found.fd.get(), info, kDirMode) != 0 && errno != EPERM) {
    ZT_RAISE(PosixError());
  }
}

}  // namespace

String GetSharedUnixBase() {
  // Not from the environment of a user who runs a program with more rights than their own.
  const char* base = zt::posix::TrustedEnvironment(kBaseVariable);
  return base && base[0] == '/' ? String(base) : String(kDefaultBase);
}

AnsiString BuildSharedUnixFilePath(const String& dirName, const String& fileName) {
  String dir = path::Join(GetSharedUnixBase(), dirName);
  path::MakePathEndInSlash(dir);
  CreateSharedUnixDir(dir);
  return AnsiString(path::Join(dir, fileName));
}

void CreateSharedUnixDir(const String& path) {
  // With a slash at the end a link would be followed after all.
  String::size_type last = path.find_last_not_of(L'/');
  AnsiString narrow(last == String::npos ? path : path.substr(0, last + 1));
  // Nearly every call finds the directory there.
  zt::posix::Found found = zt::posix::LookUp(narrow.c_str(), false);
  if (!found) {
    MakeDirectories(path);
    // MakeDirectories leaves the judgement to its caller, as it may end by its rounds.
    if (!path::IsDirectory(path.c_str())) ZT_RAISE(PosixError(ENOTDIR));
    found = zt::posix::LookUp(narrow.c_str(), false);
  }
  ShareDirectory(found);
}

int CreateSharedUnixFile(const AnsiString& path, InTheWay way, FileIdentity* identity) {
  for (int vanished = 0;; ++vanished) {
    OpenedFile file = OpenSharedPatiently(path, way);
    if (file.info.st_nlink == 0 && vanished < kVanishedOpens) continue;  // removed just now
    if (zt::posix::SetSharedMode(file.fd.get(), file.info, kFileMode) != 0 && errno != EPERM) {
      ZT_RAISE(PosixError(EPERM));
    }
    if (identity) *identity = {file.info.st_dev, file.info.st_ino};
    return file.fd.release();
  }
}

bool FileIdentity::isBehind(int fd) const noexcept {
  dev_t itsDevice;
  ino_t itsInode;
  int saved = errno;
  // EBADF is the one failure that answers the question; any other leaves the descriptor the benefit
  // of the doubt, so that a failing disk does not look like a lost lock.
  bool known = zt::posix::GetFileNumbers(fd, itsDevice, itsInode);
  bool open = known || errno != EBADF;
  errno = saved;
  return known ? itsDevice == device && itsInode == inode : open;
}

bool FileIdentity::isNamedBy(const AnsiString& path) const {
  struct stat info;
  if (RetryEintr([&] { return ::lstat(path.c_str(), &info); }) != 0) {
    return errno != ENOENT && errno != ENOTDIR;
  }
  return info.st_dev == device && info.st_ino == inode;
}

}  // namespace zt::fnd::osdep
