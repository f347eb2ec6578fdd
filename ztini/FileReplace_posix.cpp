#include "ztini/FileReplace.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <utility>

#include "ztini/Retry.h"
#include "ztini/StringTools.h"

namespace ztini {
namespace {

constexpr char kExtension[] = "TMP";
constexpr char kUniqueName[] = "ini$$.TMPXXXXXX";
constexpr mode_t kUniqueMode = 0644;
constexpr mode_t kModeBits = 07777;

// The first `length` bytes of the head and the tail.
char* Join(const char* head, size_t length, const char* tail) {
  const size_t tailSize = strlen(tail) + 1;
  char* text = static_cast<char*>(Allocate(length + tailSize));
  if (!text) return nullptr;
  memcpy(text, head, length);
  memcpy(text + length, tail, tailSize);
  return text;
}

bool Exists(const char* path) {
  struct stat status;
  return stat(path, &status) == 0;
}

// Whether a file could be made at a path where there is none; leaves none behind. O_EXCL first:
// a file that another process makes meanwhile must not be emptied or removed.
bool CanCreate(const char* path) {
  ScopedFd fresh = CreateNew(path);
  if (!fresh && errno == EEXIST) {
    if (Exists(path)) return static_cast<bool>(OpenExisting(path));
    fresh = OpenOrCreate(path);  // a dangling link
  }
  if (!fresh) return false;
  unlink(path);
  return true;
}

bool Replaceable(const char* path) {
  return Exists(path) ? static_cast<bool>(OpenExisting(path)) : CanCreate(path);
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
  m_stream.reset();
  if (m_pending) unlink(written());
  m_pending = false;
}

int32_t FileReplacement::open() {
  if (!(m_options & kIniWriteSafely)) return openTarget();
  if (!Replaceable(m_target)) return kIniNotReplaceable;
  return openTemporary();
}

int32_t FileReplacement::openTarget() {
  ScopedFd fd = OpenOrCreate(m_target);
  if (!fd || !Truncate(fd)) return kIniCannotCreate;
  m_pending = true;
  return finish(std::move(fd));
}

int32_t FileReplacement::openTemporary() {
  const bool unique = (m_options & kIniWriteUniqueTemporary) != 0;
  m_temporary.reset(unique ? UniqueTemporaryTemplate(m_target) : SiblingTemporaryName(m_target));
  if (!m_temporary) return kIniOutOfMemory;
  ScopedFd fd = unique ? openUnique() : openSibling();
  if (!fd) return unique ? kIniNoTemporary : kIniCannotCreate;
  m_pending = true;
  return finish(std::move(fd));
}

ScopedFd FileReplacement::openUnique() {
  ScopedFd fd(mkostemp(m_temporary.get(), O_CLOEXEC));
  if (fd) fchmod(fd.get(), kUniqueMode);
  return fd;
}

// A writer that was killed leaves the sibling behind, perhaps as another user's file that cannot be
// opened; and nothing planted at its name may be written through.
ScopedFd FileReplacement::openSibling() {
  unlink(m_temporary.get());
  return CreateNew(m_temporary.get());
}

int32_t FileReplacement::finish(ScopedFd fd) {
  m_stream = StreamOver(std::move(fd), "wb");
  return m_stream ? 0 : kIniCannotCreate;
}

// Before the rename, so that a kill right after it leaves no file that others cannot write.
void FileReplacement::inheritFromTarget() {
  struct stat status;
  if (stat(m_target, &status) != 0) return;
  const int fd = fileno(m_stream.get());
  if (fchmod(fd, status.st_mode & kModeBits) != 0 ||
      fchown(fd, status.st_uid, status.st_gid) != 0) {
    // A writer who is not the owner keeps the file for itself; that is no reason not to save.
  }
}

// The bytes were flushed before. An interrupted close has closed the descriptor all the same.
int32_t FileReplacement::closeStream() {
  return fclose(m_stream.release()) == 0 || errno == EINTR ? 0 : kIniWriteFailed;
}

int32_t FileReplacement::commit(IniDurability durability) {
  const bool synced = durability == IniDurability::Synced;
  if (safely()) inheritFromTarget();
  int32_t status = synced && !SyncDescriptor(fileno(m_stream.get())) ? kIniWriteFailed : 0;
  const int32_t closed = closeStream();
  if (status == 0) status = closed;
  if (status == 0 && safely() && rename(written(), m_target) != 0) status = kIniNotReplaceable;
  if (status != 0) {
    discard();
    return status;
  }
  m_pending = false;
  // The rename cannot be taken back any more, so a failure here must not be reported as one.
  if (synced) SyncDirectoryOf(m_target);
  return 0;
}

}  // namespace ztini

int32_t ztini_SyncFile(const char* path) {
  ztini::Stream file = path ? ztini::OpenForReading(path) : nullptr;
  if (!file) return kIniBadPath;
  const bool synced = ztini::SyncDescriptor(fileno(file.get())) && ztini::SyncDirectoryOf(path);
  return synced ? 0 : kIniWriteFailed;
}

void ztini_RemoveFileIfExists(const char* path) {
  if (path) unlink(path);
}
