// Each operation narrows its path once and makes the system calls on that. Questions answer false
// where they cannot be answered, but for DoesFileExist, whose callers must not take a failing disk
// for a missing file.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>

#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/RandomBytes.h"
#include "zt/fnd/osdep/path.h"
#include "zt/posix/Environment.h"
#include "zt/posix/Files.h"
#include "zt/posix/Retry.h"

using zt::posix::RetryEintr;

// The operations on single entries of the file system.
namespace zt::fnd::osdep {
namespace {

using MallocText = std::unique_ptr<char, void (*)(void*)>;

constexpr unsigned int kModeBits = 0xFFFF;
constexpr mode_t kPrivateDirMode = 0700;

void DemandAbsolute(const wchar_t* path) {
  if (!path::IsPathAbsolute(path)) ZT_RAISE(exception::InvalidArgument());
}

int Stat(const char* path, struct stat* info) {
  return RetryEintr([&] { return ::stat(path, info); });
}

int LStat(const char* path, struct stat* info) {
  return RetryEintr([&] { return ::lstat(path, info); });
}

bool IsDirectoryText(const char* path) {
  struct stat info;
  return Stat(path, &info) == 0 && S_ISDIR(info.st_mode);
}

// Links are judged on the way (zt/posix/Files.h): nothing is made below a link that another user
// has put there.
bool LeadsToDirectory(const char* path) {
  struct stat info;
  return zt::posix::LookUp(path).examine(&info) && S_ISDIR(info.st_mode);
}

// Makes one directory, in the directory that the path led to when it was looked up; 0, or the errno
// of the failed step.
int MakeOneDir(const char* path, bool useMode, mode_t mode) {
  zt::posix::Entry entry(path);
  if (!entry.valid()) return errno;
  int parent = entry.directory.get();
  mode_t first = useMode ? mode : kPrivateDirMode;
  if (RetryEintr([&] { return ::mkdirat(parent, entry.name, first); }) != 0) return errno;
  if (!useMode) return 0;
  // The umask may have cut the mode.
  zt::posix::Found made = zt::posix::LookUpEntry(parent, entry.name, O_DIRECTORY);
  if (made && zt::posix::ChangeMode(made.fd.get(), mode) == 0) return 0;
  int failure = errno;
  // A directory with another mode than asked for is not left: the next caller would take it for a
  // good one.
  RetryEintr([&] { return ::unlinkat(parent, entry.name, AT_REMOVEDIR); });
  return failure;
}

void CreateDirWorker(const wchar_t* path, bool useMode, mode_t mode) {
  DemandAbsolute(path);
  AnsiString narrow{String(path)};
  std::string text(narrow.c_str());
  text.erase(text.rfind('/') + 1);
  if (text.empty()) ZT_RAISE(exception::InvalidArgument());
  if (LeadsToDirectory(text.c_str())) return;
  // From the top down; levels that are directories are left alone.
  for (std::string::size_type slash = 0; slash != std::string::npos;) {
    slash = text.find('/', slash + 1);
    std::string prefix = text.substr(0, slash);
    if (LeadsToDirectory(prefix.empty() ? "/" : prefix.c_str())) continue;
    int failure = MakeOneDir(prefix.c_str(), useMode, mode);
    if (failure == 0) continue;
    if (failure == EEXIST) ZT_RAISE(exception::ObjectAlreadyExists());
    ZT_RAISE(exception::AccessDenied(prefix.c_str()));
  }
}

// The names that tempnam gives, without its warning to the linker: that another process may take
// the name first is known to the callers, who open what they make with O_EXCL.

// The environment's directory counts before the caller's, for who is not set-user-id.
std::string TempDirectory(const char* wanted) {
  const char* environment = zt::posix::TrustedEnvironment("TMPDIR");
  for (const char* dir : {environment, wanted, P_tmpdir}) {
    if (dir && *dir && IsDirectoryText(dir)) return dir;
  }
  errno = ENOENT;
  ZT_RAISE(PosixError());
}

constexpr size_t kPrefixLength = 5, kRandomLength = 6;
constexpr char kNameCharacters[] = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789";
constexpr int kMostNames = 1 << 16;

// A path that names nothing now: the directory, some of the prefix, and characters at random.
std::string FreeName(const std::string& directory, const char* prefix) {
  std::string start = directory;
  while (start.size() > 1 && start.back() == '/') start.pop_back();
  if (start != "/") start += '/';
  start.append(prefix, strnlen(prefix, kPrefixLength));
  for (int i = 0; i < kMostNames; ++i) {
    uint64_t random;
    if (!RandomBytes(&random, sizeof random)) ZT_RAISE(PosixError());
    std::string name = start;
    for (size_t n = 0; n < kRandomLength; ++n) {
      // Six digits of base 62 take 36 of the 64 bits.
      name += kNameCharacters[random % (sizeof kNameCharacters - 1)];
      random /= sizeof kNameCharacters - 1;
    }
    struct stat info;
    if (LStat(name.c_str(), &info) == 0) continue;
    if (errno != ENOENT) ZT_RAISE(PosixError());
    return name;
  }
  errno = EEXIST;
  ZT_RAISE(PosixError());
}

}  // namespace

String path::GetCWD() {
  for (;;) {
    // getcwd allocates what is needed: no length of a path is certain.
    MallocText text(::getcwd(nullptr, 0), free);
    if (text) return String(text.get());
    if (errno != EINTR) ZT_RAISE(PosixError());
  }
}

String path::SetCWD(String dir) {
  String old = GetCWD();
  AnsiString narrow(dir);
  if (::chdir(narrow.c_str()) != 0) ZT_RAISE(PosixError());
  return old;
}

String path::AbsPath(const String& path) {
  if (path.exactCompare(L".") == 0) return GetCWD();
  return IsAbs(path) ? path : Join(GetCWD(), path);
}

String path::TempDirName() {
  const char* dir = zt::posix::TrustedEnvironment("TMPDIR");
  return dir ? String(dir) : String(L"/var/tmp/");
}

String path::TempFileName(const String& prefix, const String& dir) {
  if (prefix.empty()) ZT_RAISE(exception::InvalidArgument());
  String where = dir.empty() ? TempDirName() : dir;
  DemandAbsolute(where.c_str());
  if (!IsDirectory(where.c_str())) ZT_RAISE(exception::NonexistentException());
  AnsiString narrowDir(where), narrowPrefix(prefix);
  std::string name = FreeName(TempDirectory(narrowDir.c_str()), narrowPrefix.c_str());
  return String(name.c_str());
}

bool path::IsDirectory(const wchar_t* path) {
  return IsPathAbsolute(path) && IsDirectoryText(AnsiString(String(path)).c_str());
}

bool path::IsSymLink(const wchar_t* path) {
  struct stat info;
  return IsPathAbsolute(path) && LStat(AnsiString(String(path)).c_str(), &info) == 0 &&
         S_ISLNK(info.st_mode);
}

bool path::DoesFileExist(const String& path) {
  DemandAbsolute(path.c_str());
  AnsiString narrow(path);
  struct stat info;
  if (Stat(narrow.c_str(), &info) == 0) return S_ISREG(info.st_mode);
  if (errno != ENOENT) ZT_RAISE(PosixError());
  return false;
}

void path::CreateDir(const wchar_t* path) { CreateDirWorker(path, false, 0); }

void path::CreateDir(const wchar_t* path, unsigned int mode) {
  CreateDirWorker(path, true, static_cast<mode_t>(mode & kModeBits));
}

void path::RemoveFile(const wchar_t* path) {
  DemandAbsolute(path);
  AnsiString narrow{String(path)};
  if (zt::posix::Unlink(narrow.c_str()) != 0) ZT_RAISE(PosixError());
}

void path::RemoveFile(const String& path) { RemoveFile(path.c_str()); }

void path::RemoveDir(const wchar_t* path) {
  if (!IsDirectory(path)) ZT_RAISE(exception::NonexistentException());
  // rmdir refuses a link; the link itself is what the caller wants gone, not the directory that it
  // leads to.
  if (IsSymLink(path)) {
    RemoveFile(path);
    return;
  }
  AnsiString narrow{String(path)};
  if (RetryEintr([&] { return ::rmdir(narrow.c_str()); }) != 0) {
    ZT_RAISE(exception::AccessDenied(narrow.c_str()));
  }
}

void path::CreateSymLink(const String& link, const String& target) {
  AnsiString narrowTarget(target), narrowLink(link);
  if (RetryEintr([&] { return ::symlink(narrowTarget.c_str(), narrowLink.c_str()); }) != 0) {
    ZT_RAISE(PosixError());
  }
}

String path::ResolveSymLink(const String& path) {
  if (!IsSymLink(path.c_str())) ZT_RAISE(exception::InvalidArgument());
  AnsiString narrow(path);
  struct stat info;
  if (LStat(narrow.c_str(), &info) != 0) ZT_RAISE(PosixError());
  // A link that was replaced by a longer one since is cut; its text was out of date anyway.
  std::string text(static_cast<size_t>(info.st_size), '\0');
  ssize_t length = RetryEintr([&] { return ::readlink(narrow.c_str(), text.data(), text.size()); });
  if (length < 0) ZT_RAISE(PosixError());
  // A link without a length, as of the process file system. Some C libraries report no error.
  if (text.empty()) ZT_RAISE(PosixError(EINVAL));
  return String(text.data(), static_cast<String::size_type>(length));
}

}  // namespace zt::fnd::osdep
