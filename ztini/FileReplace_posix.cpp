// With kIniWriteSafely the target is never changed in place. The new bytes go to a file beside it,
// which gets the target's mode and owner, is synced as far as asked, and is then renamed over the
// target: readers, and a crash, find the old file or the new one. Beside it, because a rename works
// inside one file system only.
//
// Everything that can fail is done before the rename, but for one step: the sync of the directory,
// which puts the rename itself on disk and so can only follow it. Its failure is reported, although
// the new file is in place.
#include "ztini/FileReplace.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <utility>

#include "zt/posix/Files.h"
#include "zt/posix/Retry.h"
#include "ztini/StringTools.h"

using zt::posix::RetryEintr;
using zt::posix::ScopedFd;

namespace ztini {
namespace {

constexpr char kExtension[] = "TMP";
constexpr char kUniqueName[] = "ini$$.TMPXXXXXX";
constexpr mode_t kUniqueMode = 0644;
constexpr mode_t kNewFileMode = 0666;  // less the process's mask
// Without set-user-id and set-group-id, which the owner of the old file may not give a file of
// ours.
constexpr mode_t kModeBits = 01777;

// The first `length` bytes of the head and the tail.
char* Join(const char* head, size_t length, const char* tail) {
  const size_t tailSize = strlen(tail) + 1;
  char* text = static_cast<char*>(Allocate(length + tailSize));
  if (!text) return nullptr;
  memcpy(text, head, length);
  memcpy(text + length, tail, tailSize);
  return text;
}

// Whether a file could be made at a path where there is none; leaves none. Another process's
// file, made meanwhile, is neither emptied nor removed.
bool CanCreate(const char* path) {
  ScopedFd fresh = zt::posix::CreateNew(path, O_WRONLY, kNewFileMode);
  if (fresh) return zt::posix::Unlink(path) == 0;
  // A dangling link. The rename replaces the link; nothing is made where it leads.
  return errno == EEXIST;
}

bool Replaceable(const char* path) {
  // Opened for writing, although the rename would not need it: a file that the user may not write
  // to is not to be replaced either, which the directory's rights alone would allow.
  if (zt::posix::OpenExisting(path, O_RDWR)) return true;
  return errno == ENOENT && CanCreate(path);
}

}  // namespace

char* SiblingTemporaryName(const char* target) {
  const char* slash = strrchr(target, '/');
  const char* dot = slash ? strrchr(slash, '.') : nullptr;
  if (!dot || strcmp(dot + 1, kExtension) == 0) return Join(target, strlen(target), ".TMP");
  return Join(target, static_cast<size_t>(dot + 1 - target), kExtension);
}

char* UniqueTemporaryTemplate(const char* target) {
  const char* slash = strrchr(target, '/');
  return Join(target, slash ? static_cast<size_t>(slash + 1 - target) : 0, kUniqueName);
}

FileReplacement::FileReplacement(const char* target, int32_t writeOptions)
    : m_target(target), m_options(writeOptions) {}

FileReplacement::~FileReplacement() { discard(); }

void FileReplacement::discard() {
  m_file.reset();
  if (m_pending) removeWritten();
  m_pending = false;
}

int32_t FileReplacement::open() {
  if (!(m_options & kIniWriteSafely)) return openTarget();
  if (!Replaceable(m_target)) return kIniNotReplaceable;
  return openTemporary();
}

int32_t FileReplacement::openTarget() {
  m_file = zt::posix::OpenOrCreate(m_target, O_WRONLY, kNewFileMode);
  // Truncated only once it is known to be a file of ours to write.
  if (!m_file || RetryEintr([&] { return ftruncate(m_file.get(), 0); }) != 0) {
    return kIniCannotCreate;
  }
  m_pending = true;
  return 0;
}

int32_t FileReplacement::openTemporary() {
  const bool unique = (m_options & kIniWriteUniqueTemporary) != 0;
  m_temporary.reset(unique ? UniqueTemporaryTemplate(m_target) : SiblingTemporaryName(m_target));
  if (!m_temporary) return kIniOutOfMemory;
  m_file = unique ? openUnique() : openSibling();
  if (!m_file) return unique ? kIniNoTemporary : kIniCannotCreate;
  m_pending = true;
  return 0;
}

ScopedFd FileReplacement::openUnique() {
  // mkostemp makes the file with O_EXCL and mode 0600; what others may do with it is set on the
  // descriptor.
  ScopedFd fd = zt::posix::AboveStandardStreams(ScopedFd(mkostemp(m_temporary.get(), O_CLOEXEC)));
  if (fd) fchmod(fd.get(), kUniqueMode);
  return fd;
}

// A writer that was killed leaves the sibling, perhaps as another user's file that cannot be
// opened; and nothing planted at its name may be written through.
ScopedFd FileReplacement::openSibling() {
  m_place.emplace(m_temporary.get());
  if (!m_place->valid()) return ScopedFd();
  ScopedFd fresh = zt::posix::CreateNew(*m_place, O_WRONLY, kNewFileMode);
  if (fresh || errno != EEXIST) return fresh;
  if (zt::posix::MakeRoom(m_temporary.get()) != 0) return ScopedFd();
  return zt::posix::CreateNew(*m_place, O_WRONLY, kNewFileMode);
}

// The sibling's directory is the target's, and one descriptor of it serves the whole save.
int FileReplacement::rename() const {
  if (!m_place) return zt::posix::Rename(written(), m_target);
  return zt::posix::RenameBeside(*m_place, targetName());
}

void FileReplacement::removeWritten() const {
  if (m_place) {
    zt::posix::Unlink(*m_place);
  } else {
    zt::posix::Unlink(written());
  }
}

const char* FileReplacement::targetName() const {
  const char* slash = strrchr(m_target, '/');
  return slash ? slash + 1 : m_target;
}

bool FileReplacement::statTarget(struct stat* status) const {
  if (m_place &&
      fstatat(m_place->directory.get(), targetName(), status, AT_SYMLINK_NOFOLLOW) == 0 &&
      !S_ISLNK(status->st_mode)) {
    return true;
  }
  return zt::posix::LookUp(m_target).examine(status);
}

int32_t FileReplacement::write(const char* bytes, size_t size) {
  return zt::posix::WriteAll(m_file.get(), bytes, size) ? 0 : kIniWriteFailed;
}

// Before the rename, so that a kill right after it leaves no file that others cannot write. `own`
// is the state of the written file.
void FileReplacement::inheritFromTarget(const struct stat& own) {
  struct stat status;
  if (!statTarget(&status)) return;
  const int fd = m_file.get();
  const mode_t mode = status.st_mode & kModeBits;
  const bool isOwners = status.st_uid == own.st_uid && status.st_gid == own.st_gid;
  if (((own.st_mode & kModeBits) != mode && fchmod(fd, mode) != 0) ||
      (!isOwners && fchown(fd, status.st_uid, status.st_gid) != 0)) {
    // A writer who is not the owner keeps the file for itself; that is no reason not to save.
  }
}

// Some file systems report at the close what they could not write. An interrupted close has closed
// the descriptor all the same.
int32_t FileReplacement::closeFile() {
  return close(m_file.release()) == 0 || errno == EINTR ? 0 : kIniWriteFailed;
}

int32_t FileReplacement::commit(IniDurability durability, IniFileState* state) {
  const bool synced = durability != IniDurability::None;
  struct stat own;
  bool known = fstat(m_file.get(), &own) == 0;
  if (known && safely()) inheritFromTarget(own);
  int32_t status = synced && !zt::posix::Sync(m_file.get()) ? kIniWriteFailed : 0;
  // Some file systems set the time of the last write when they write it back.
  if (synced) known = fstat(m_file.get(), &own) == 0;
  // Before the close, and by the descriptor: by the path it could be another process's file
  // already.
  if (state && known) *state = IniFileStateOf(own);
  const int32_t closed = closeFile();
  if (status == 0) status = closed;
  // After the close, whose failure means that bytes are missing.
  if (status == 0 && safely() && rename() != 0) {
    status = kIniNotReplaceable;
  }
  if (status != 0) {
    discard();
    return status;
  }
  m_pending = false;
  const bool whole = durability != IniDurability::Synced || zt::posix::SyncDirectoryOf(m_target);
  return whole ? 0 : kIniWriteFailed;
}

}  // namespace ztini

IniFileState IniFileStateOf(const struct stat& status) {
  return {status.st_dev, status.st_ino, status.st_size, status.st_mtim.tv_sec,
          status.st_mtim.tv_nsec};
}

int32_t ztini_SyncFile(const char* path) {
  if (!path) return kIniBadPath;
  ScopedFd file = zt::posix::OpenExisting(path, O_RDONLY);
  if (!file) return kIniBadPath;
  // A descriptor for reading will do: fsync is about the file.
  const bool synced = zt::posix::Sync(file.get()) && zt::posix::SyncDirectoryOf(path);
  return synced ? 0 : kIniWriteFailed;
}

void ztini_RemoveFileIfExists(const char* path) {
  if (path) zt::posix::Unlink(path);
}
