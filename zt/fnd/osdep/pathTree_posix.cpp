// Trees are listed level by level with FindFiles, and the list of a level is complete before its
// entries are touched, so that what a copy or a removal changes is not met by the listing. A copy
// follows links, which can lead back up: the chain of source directories, by device and inode, ends
// such a circle. A removal does not follow them.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <utility>
#include <vector>

#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/Vector.h"
#include "zt/fnd/osdep/BinaryFile.h"
#include "zt/fnd/osdep/FindFiles.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/path.h"
#include "zt/posix/Files.h"
#include "zt/posix/Retry.h"

using zt::posix::RetryEintr;

// Renaming, copying and the operations on trees, which need files and listings.
namespace zt::fnd::osdep {
namespace {

// Bytes, on the stack.
constexpr unsigned long kCopyBlock = 32768;

// Decides whether names that differ in case only are one file in RenameFile and CpFile.
bool IsFileSystemCaseSensitive() { return false; }

bool SameFileByName(const String& a, const String& b) {
  return IsFileSystemCaseSensitive() ? a.exactCompare(b) == 0 : a.compare(b) == 0;
}

void DemandAbsolute(const String& a, const String& b) {
  if (!path::IsAbs(a) || !path::IsAbs(b)) ZT_RAISE(exception::InvalidArgument());
}

enum class Links { Followed, Themselves };

// What an entry is.
struct Entry {
  bool exists = false;
  struct stat info = {};

  explicit Entry(const String& path, Links links = Links::Followed) {
    AnsiString narrow(path);
    int flags = links == Links::Followed ? 0 : AT_SYMLINK_NOFOLLOW;
    exists = RetryEintr([&] { return ::fstatat(AT_FDCWD, narrow.c_str(), &info, flags); }) == 0;
  }
  // A pipe or a device, which reading or writing could wait for without end.
  bool special() const { return exists && !S_ISREG(info.st_mode) && !S_ISDIR(info.st_mode); }
  bool sameAs(const Entry& other) const {
    return exists && other.exists && info.st_dev == other.info.st_dev &&
           info.st_ino == other.info.st_ino;
  }
};

void CopyBytes(const BinaryFile& from, BinaryFile& to) {
  char block[kCopyBlock];
  for (;;) {
    long got = from.read(block, kCopyBlock);
    if (got < 0) ZT_RAISE(exception::FileReadFailed());
    if (got == 0) return;
    if (to.write(block, static_cast<unsigned long>(got)) != got) {
      ZT_RAISE(exception::FileWriteFailed());
    }
  }
}

// CpFile; leaves the copy open, or nothing where there is nothing to copy.
void CopyInto(BinaryFile& copy, const String& from, const String& to, bool overwrite) {
  DemandAbsolute(from, to);
  if (!overwrite && path::DoesFileExist(to)) ZT_RAISE(exception::FileAlreadyExists());
  // Before anything is opened: opening the target with Truncate would empty the source.
  if (SameFileByName(from, to)) return;
  Entry source(from), target(to);
  if (source.sameAs(target)) return;
  if (source.special()) ZT_RAISE(exception::FileReadFailed());
  if (target.special()) ZT_RAISE(exception::FileWriteFailed());
  using Mode = BinaryFile::Mode;
  BinaryFile in;
  in.open(from, Mode::Read);
  Mode write = Mode::ReadWrite | Mode::Create;
  copy.open(to, overwrite ? write | Mode::Truncate : write);
  CopyBytes(in, copy);
}

// Puts the entries of the file's directory on disk; one that may not be read is left to the system.
void SyncDirectoryOf(const String& file) {
  AnsiString narrow(file);
  if (!zt::posix::SyncDirectoryOf(narrow.c_str())) ZT_RAISE(PosixError());
}

// The rename between file systems. A crash finds at least one of the two files whole: the copy is
// on the disk before the source goes.
void CopyAndRemove(const String& from, const String& to) {
  if (path::DoesFileExist(to)) path::RemoveFile(to);
  BinaryFile copy;
  CopyInto(copy, from, to, false);
  try {
    // Not copy.sync(), which takes a file system without fsync for a failure.
    if (!zt::posix::Sync(copy.descriptor())) ZT_RAISE(PosixError());
    SyncDirectoryOf(to);
    path::RemoveFile(from);
  } catch (...) {  // The file must not be in two places; the first failure is the one to report.
    AnsiString narrow(to);
    zt::posix::Unlink(narrow.c_str());
    throw;
  }
}

// A copy of a tree under way.
class TreeCopy {
 public:
  void copy(const String& from, const String& to) {
    if (!path::IsDirectory(from.c_str())) ZT_RAISE(exception::NonexistentException());
    Entry source(from);
    for (const Entry& above : m_chain) {
      // A link leads back to a directory that is being copied.
      if (source.sameAs(above)) ZT_RAISE(PosixError(ELOOP));
    }
    if (!path::IsDirectory(to.c_str())) path::CreateDir(to.c_str());
    if (m_chain.empty()) m_target = Entry(to);
    m_chain.push_back(source);
    for (const String& name :
         FindFiles().getFilenames(path::Join(from, String(L"*")), FindFiles::FindFlags::None)) {
      copyEntry(name, to);
    }
    m_chain.pop_back();
  }

 private:
  void copyEntry(const String& name, const String& to) {
    String base = path::BaseName(name);
    if (base.exactCompare(L".") == 0 || base.exactCompare(L"..") == 0) return;
    String target = path::Join(to, base);
    if (!path::IsDirectory(name.c_str())) {
      path::CpFile(name, target, true);
      return;
    }
    // A tree that is copied into itself does not contain its copy.
    if (Entry(name).sameAs(m_target)) return;
    path::MakePathEndInSlash(target);
    copy(name, target);
  }

  std::vector<Entry> m_chain;  // the source directories from the top down
  Entry m_target{String()};    // the top directory of the copy
};

String WithoutSlashesAtEnd(const wchar_t* path) {
  String text(path);
  String::size_type last = text.find_last_not_of(L'/');
  return last == String::npos ? text : text.substr(0, last + 1);
}

}  // namespace

void path::RemoveDirForce(const wchar_t* path) {
  if (!IsDirectory(path)) ZT_RAISE(exception::NonexistentException());
  // "link/" names what the link points to, which is to survive.
  String dir = WithoutSlashesAtEnd(path);
  if (IsSymLink(dir.c_str())) {
    RemoveFile(dir);
    return;
  }
  Vector<String> entries =
      FindFiles().getFilenames(Join(dir, String(L"*")), FindFiles::FindFlags::Hidden);
  for (const String& entry : entries) {
    if (IsDirectory(entry.c_str())) {
      RemoveDirForce(entry.c_str());
    } else {
      RemoveFile(entry);
    }
  }
  RemoveDir(dir.c_str());
}

void path::RenameFile(const String& from, const String& to) {
  DemandAbsolute(from, to);
  if (SameFileByName(from, to)) return;
  AnsiString narrowFrom(from), narrowTo(to);
  if (zt::posix::Rename(narrowFrom.c_str(), narrowTo.c_str()) == 0) return;
  if (errno != EXDEV) ZT_RAISE(PosixError());
  Entry target(to, Links::Themselves);
  // One file through two mounts, which the system takes for two file systems; where it sees that
  // two names are one file, it does nothing, too.
  if (Entry(from, Links::Themselves).sameAs(target)) return;
  // A link whose file is at its place already.
  if (Entry(from).sameAs(target)) return RemoveFile(from);
  CopyAndRemove(from, to);
}

void path::CpFile(const String& from, const String& to, bool overwrite) {
  BinaryFile copy;
  CopyInto(copy, from, to, overwrite);
}

void path::CpDir(const String& from, const String& to) {
  DemandAbsolute(from, to);
  TreeCopy().copy(from, to);
}

}  // namespace zt::fnd::osdep
