#include "source/Database/registrationFiles.h"

#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <sys/stat.h>

#include <tuple>

#include "source/Database/databaseText.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/DateTime.h"
#include "zt/fnd/osdep/FindFiles.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/path.h"
#include "zt/posix/Files.h"

using zt::fnd::String;
using zt::fnd::Vector;
using zt::fnd::osdep::path;

namespace registrar {
namespace {

constexpr const wchar_t* kRegistrationFile = L"Resources/Info.vlr";

// Nothing can be found at the path, now or later: no entry, a file where a directory should be,
// links that go in circles, or a name that no file can have.
bool NamesNothing(int error) {
  return error == ENOENT || error == ENOTDIR || error == ELOOP || error == ENAMETOOLONG;
}

// Another user's bundle that this user may not enter. It is none of this process's business, and
// must not keep it from the others.
bool MayNotLook(int error) { return error == EACCES || error == EPERM; }

// Looks at files below one directory, which is opened once: the kernel then walks the end of each
// path only.
class FilesBelow {
 public:
  explicit FilesBelow(const std::string& directory)
      : m_prefix(directory), m_directory(zt::posix::OpenDirectory(directory.c_str())) {
    if (m_prefix.empty() || m_prefix.back() != '/') m_prefix += '/';
  }
  // As stat(2), which does not find a path that is too long either.
  int state(const std::string& file, struct stat* info) const {
    const bool isBelow = m_directory && file.size() < PATH_MAX && file.starts_with(m_prefix);
    return isBelow ? fstatat(m_directory.get(), file.c_str() + m_prefix.size(), info, 0)
                   : stat(file.c_str(), info);
  }

 private:
  std::string m_prefix;
  zt::posix::ScopedFd m_directory;
};

// One call answers both whether the file is there and how old it is.
bool RegistrationTime(const FilesBelow& files, const std::string& file, zt::fnd::AbsTime* time) {
  struct stat info;
  if (files.state(file, &info) != 0) {
    int error = errno;
    if (NamesNothing(error) || MayNotLook(error)) return false;
    ZT_RAISE(zt::fnd::osdep::PosixError(error));
  }
  // A pipe in this place would be waited for.
  if (!S_ISREG(info.st_mode)) return false;
  timeval changed = {};
  // Without the fraction, which not every file system keeps: the stamp in the database is compared
  // for equality.
  changed.tv_sec = info.st_mtime;
  *time = zt::fnd::osdep::TimevalToAbsTime(changed);
  return true;
}

}  // namespace

bool HasLineEnd(const std::string& text) {
  return text.find('\n') != std::string::npos || text.find('\r') != std::string::npos;
}

void AppendRegistrationFiles(const String& directory, const String& mask,
                             RegistrationFiles& files) {
  Vector<String> names = zt::fnd::osdep::FindFiles().getFilenames(path::Join(directory, mask));
  if (names.empty()) return;
  const FilesBelow below(Narrow(directory));
  const String inBundle(L"/" + String(kRegistrationFile));
  const std::string narrowInBundle = Narrow(inBundle);
  for (String& bundle : names) {
    if (!path::IsAbs(bundle)) bundle = path::Join(directory, bundle);
    const std::string file = Narrow(bundle) + narrowInBundle;
    // The path becomes the name of an item, where a line end would write lines of its own.
    if (HasLineEnd(file)) continue;
    zt::fnd::AbsTime time;
    if (!RegistrationTime(below, file, &time)) continue;
    files.emplace_back(std::piecewise_construct, std::forward_as_tuple(bundle, inBundle),
                       std::forward_as_tuple(time));
  }
}

bool FileIsThere(const std::string& file) {
  if (!path::IsAbs(Widen(file))) return false;
  try {
    return path::DoesFileExist(Widen(file));
  } catch (const zt::fnd::osdep::PosixError& error) {
    int code = static_cast<int>(error.whatcode());
    // Kept: this user cannot see whether it is gone, and dropping its components would take them
    // from all users.
    if (MayNotLook(code)) return true;
    // The bundle may have been replaced by a file of its name, or by a link to itself.
    if (!NamesNothing(code)) throw;
    return false;
  }
}

}  // namespace registrar
