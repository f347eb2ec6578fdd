// Files and directories of the installation are shared by all users, and each is given mode 0777 by
// the process that makes it. Two dangers shape this source. Between making something and opening it
// a process may be killed, which would leave it closed to all others: directories are therefore
// made under another name and renamed when they are ready. And in directories that all may write
// to, another user may put a link where a file was: modes are therefore changed through descriptors
// (zt/posix/Files.h), never by a path that could lead elsewhere.
#include "source/Common/vltFileSecurity.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <memory>
#include <string>

#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/DateTime.h"
#include "zt/fnd/osdep/path.h"
#include "zt/posix/Files.h"

using zt::fnd::AnsiString;
using zt::fnd::String;
using zt::fnd::osdep::path;
using zt::posix::Found;
using zt::posix::ScopedFd;

namespace {

constexpr mode_t kParentMode = 0755;

// A fixed name, so that one that a killed process leaves is found and used by the next.
constexpr const char* kUnfinished = ".NEW";

std::string WithoutSlashes(const String& directory) {
  std::string target = AnsiString(directory).c_str();
  target.erase(target.find_last_not_of('/') + 1);
  return target;
}

bool IsDirectoryAt(int parent, const char* name) {
  struct stat info;
  return fstatat(parent, name, &info, AT_SYMLINK_NOFOLLOW) == 0 && S_ISDIR(info.st_mode);
}

// Makes the directory under another name, with its mode, and gives it its name: a process that is
// killed between making a directory and changing its mode would leave one that no other user can
// enter. False, with nothing left, where that cannot be done; the plain way then reports why, or
// makes the levels above.
bool MakeOpenDirectory(const String& directory) {
  std::string target = WithoutSlashes(directory);
  // A relative path, and the root, are left to path::CreateDir, which refuses the one and finds the
  // other.
  if (target.empty() || target[0] != '/') return false;
  zt::posix::Entry entry(target.c_str());
  if (!entry.valid()) return false;
  int parent = entry.directory.get();
  std::string unfinished = std::string(entry.name) + kUnfinished;
  // EEXIST: a killed process has left it, or another one is making it now. Whoever renames first
  // wins.
  if (mkdirat(parent, unfinished.c_str(), kSharedMode) != 0 && errno != EEXIST) return false;
  Found made = zt::posix::LookUpEntry(parent, unfinished.c_str(), O_DIRECTORY);
  if (made && zt::posix::SetSharedMode(made.fd.get(), kSharedMode) == 0 &&
      zt::posix::RenameToNew(parent, unfinished.c_str(), entry.name) == 0) {
    return zt::posix::SyncDirectoryOf(target.c_str());
  }
  // Another process may have finished the same directory.
  unlinkat(parent, unfinished.c_str(), AT_REMOVEDIR);
  return IsDirectoryAt(parent, entry.name);
}

// Puts the entries of all levels of a path on disk: some of them may be new.
void SyncLevels(const String& directory) {
  for (std::string level = WithoutSlashes(directory); !level.empty();
       level.erase(level.rfind('/'))) {
    zt::posix::SyncDirectoryOf(level.c_str());
  }
}

HRESULT ResultOf(int status) { return status == 0 ? S_OK : E_FAIL; }

// Mode changes of a tree by descriptors: whatever is moved or replaced meanwhile, no change goes
// through a link or leaves the tree.
class TreeMode {
 public:
  explicit TreeMode(int mode) : m_mode(static_cast<mode_t>(mode)) {}

  // What was looked up and all that is in it, without entries whose name begins with a dot. The
  // first failure ends the walk.
  HRESULT change(const Found& found) {
    struct stat info;
    if (!found.examine(&info)) return E_FAIL;
    if (S_ISLNK(info.st_mode)) return S_OK;
    HRESULT status = ResultOf(zt::posix::ChangeMode(found.fd.get(), m_mode));
    return S_ISDIR(info.st_mode) ? changeEntries(found.fd.get(), status) : status;
  }

 private:
  // Leaves the status alone if there are no entries; else returns that of the last one visited.
  HRESULT changeEntries(int directory, HRESULT status) {
    // The descriptor of the walk is no open file, and cannot be listed.
    ScopedFd fd = zt::posix::OpenDirectory(directory);
    std::unique_ptr<DIR, int (*)(DIR*)> entries(fd.valid() ? fdopendir(fd.get()) : nullptr,
                                                closedir);
    if (!entries) return status;  // a directory that may not be read has no entries to be seen
    fd.release();
    while (const dirent* entry = readdir(entries.get())) {
      if (entry->d_name[0] == '.') continue;
      Found found = zt::posix::LookUpEntry(dirfd(entries.get()), entry->d_name);
      if (!found && errno == ENOENT) continue;  // removed just now
      status = found ? change(found) : E_FAIL;
      if (status < 0) break;
    }
    return status;
  }

  mode_t m_mode;
};

}  // namespace

HRESULT vltSetFileSecurityImpl(const String& path, int mode, bool recursive) {
  AnsiString narrow(path);
  Found found = zt::posix::LookUp(narrow.c_str(), false);
  struct stat info;
  if (!found.examine(&info)) return E_FAIL;
  if (S_ISLNK(info.st_mode)) return S_OK;
  if (!recursive) return ResultOf(zt::posix::ChangeMode(found.fd.get(), static_cast<mode_t>(mode)));
  return TreeMode(mode).change(found);
}

HRESULT vlrSetFileSecurity(const String& path, int mode) {
  return ResultOf(zt::posix::SetSharedMode(AnsiString(path).c_str(), static_cast<mode_t>(mode)));
}

HRESULT vltMakeSharedDirectory(const String& directory) {
  if (path::IsDirectory(directory.c_str()) || MakeOpenDirectory(directory)) return S_OK;
  try {
    // The levels above are no place to share, but every user has to come through: made by root under a
    // strict mask they would shut all others out.
    path::CreateDir(directory.c_str(), kParentMode);
  } catch (const zt::fnd::exception::ObjectAlreadyExists&) {
    // Another process was first, which is as good. A file in its place is not.
    if (!path::IsDirectory(directory.c_str())) throw;
  }
  SyncLevels(directory);
  return vlrSetFileSecurity(directory, kSharedMode);
}

String vlrGetCurrentLocalTime() {
  constexpr auto kLocal = static_cast<zt::fnd::osdep::TimeStringType>(1);
  return zt::fnd::osdep::AbsTimeToString(zt::fnd::osdep::CurrentSystemTime(), L"_%m%d%Y", L"", 0,
                                         kLocal, false, nullptr, 0);
}
