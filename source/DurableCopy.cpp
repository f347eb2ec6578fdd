// The second name is a hard link, so that it costs no copy and appears whole. Each step ends with a
// sync of what the next one relies on: the file's bytes before it gets the second name, the
// directory before the first save that is not synced, and all of it again before the second name
// goes. A power cut between any two of them leaves a state that takeUp() can judge by the sidecar
// alone.
#include "source/DurableCopy.h"

#include <errno.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdint>

#include "source/Cmd5vlt.h"
#include "source/IniSidecar.h"
#include "source/vlIniMgr.h"
#include "zt/posix/Files.h"
#include "zt/posix/Retry.h"
#include "ztini/OpenFile.h"
#include "ztini/ztini.h"

using zt::posix::RetryEintr;
using zt::posix::ScopedFd;

namespace {

enum class Match { Yes, No, Unknown };

// Whether the file's bytes have the digest.
Match Compare(const ScopedFd& file, const IniSidecar::Digest& expected) {
  unsigned char block[16384];
  Cmd5vlt md5;
  for (int64_t size = 0;;) {
    ssize_t got = RetryEintr([&] { return read(file.get(), block, sizeof block); });
    if (got < 0) return Match::Unknown;
    if (got == 0) break;
    // Any user can make it larger than anything that a save writes.
    if ((size += got) > ztini::kLargestFileBytes) return Match::No;
    md5.addString(block, static_cast<unsigned>(got));
  }
  IniSidecar::Digest found;
  md5.getDigest(found.data());
  return found == expected ? Match::Yes : Match::No;
}

Match MatchesSidecar(const std::string& file) {
  IniSidecar::Digest expected;
  switch (IniSidecar::Read(CvlIniMgr::SidecarName(file), &expected)) {
    case IniSidecar::State::Present:
      break;
    case IniSidecar::State::Unreadable:
      return Match::Unknown;
    default:
      return Match::No;
  }
  ScopedFd fd = zt::posix::OpenExisting(file.c_str(), O_RDONLY);
  // Unknown, and not No: a file that cannot be opened for lack of descriptors must not be replaced
  // by an older one.
  if (!fd) return errno == ENOENT ? Match::No : Match::Unknown;
  return Compare(fd, expected);
}

enum class Left { No, Yes, InTheWay, Unknown };

// What is at the second name. begin() leaves regular files; all else was planted.
Left WhatIsLeft(const std::string& copy) {
  struct stat info;
  if (!zt::posix::LookUp(copy.c_str(), false).examine(&info)) {
    return zt::posix::IsPassing(errno) ? Left::Unknown : Left::No;
  }
  return S_ISREG(info.st_mode) ? Left::Yes : Left::InTheWay;
}

bool SameFile(const std::string& a, const std::string& b) {
  using zt::posix::Found;
  Found left = zt::posix::LookUp(a.c_str(), false), right = zt::posix::LookUp(b.c_str(), false);
  struct stat one, other;
  return left && right && left.examine(&one) && right.examine(&other) &&
         one.st_dev == other.st_dev && one.st_ino == other.st_ino;
}

}  // namespace

DurableCopy::DurableCopy(const std::string& file) : m_file(file), m_copy(NameFor(file)) {}

DurableCopy::~DurableCopy() { finish(); }

bool DurableCopy::isLeft() const {
  Left left = WhatIsLeft(m_copy);
  return left == Left::Yes || left == Left::Unknown;
}

bool DurableCopy::begin() {
  // One that a process has left which did not finish is older than what the file holds now, but no
  // value has been promised since. It stays what counts until everything is on disk.
  m_pending = isLeft();
  // The directory is synced all the same: the name may have been made just before the other process
  // died.
  if (m_pending) {
    syncDirectory();
    return WhatIsLeft(m_copy) == Left::Yes;
  }
  if (ztini_SyncFile(m_file.c_str()) != 0) return false;
  // File systems without hard links end here, and the contents of each save are then synced
  // instead.
  if (zt::posix::Link(m_file.c_str(), m_copy.c_str()) != 0) return false;
  m_pending = syncDirectory();
  // A name that may not outlive a power cut protects nothing.
  if (!m_pending) zt::posix::Unlink(m_copy.c_str());
  return m_pending;
}

bool DurableCopy::finish() {
  if (!m_pending) return true;
  if (ztini_SyncFile(m_file.c_str()) != 0) return false;
  // Only now, when no power cut can bring back one of the files in between.
  if (zt::posix::MakeRoom(m_copy.c_str()) != 0) return false;
  m_pending = false;
  return true;
}

bool DurableCopy::syncDirectory() const { return zt::posix::SyncDirectoryOf(m_file.c_str()); }

bool DurableCopy::takeUp(const std::string& file) {
  std::string copy = NameFor(file);
  switch (WhatIsLeft(copy)) {
    case Left::No:
      return true;
    case Left::Unknown:
      return false;
    case Left::InTheWay:
      zt::posix::MakeRoom(copy.c_str());
      return true;
    case Left::Yes:
      break;
  }
  switch (MatchesSidecar(file)) {
    case Match::Unknown:
      return false;
    case Match::Yes:
      return true;  // The second name stays until the next scan has finished.
    case Match::No:
      break;
  }
  // rename() does nothing where both are names of one file.
  int result = SameFile(file, copy) ? zt::posix::Unlink(copy.c_str())
                                    : zt::posix::Rename(copy.c_str(), file.c_str());
  // Without the right to do it the file is used as it is, like any other whose sidecar does not
  // match.
  if (result != 0) return errno == EACCES || errno == EPERM || errno == EROFS;
  // Its failure is not reported: until the rename is on disk, the next opening does the same again.
  zt::posix::SyncDirectoryOf(file.c_str());
  return true;
}
