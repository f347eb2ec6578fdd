#include "zt/fnd/osdep/events/EventFile.h"

#include <sys/file.h>
#include <sys/ipc.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <utility>

#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/SharedObjectName.h"
#include "zt/fnd/osdep/Sleep.h"
#include "zt/posix/Files.h"
#include "zt/posix/Retry.h"

using zt::posix::Flock;
using zt::posix::RetryEintr;

namespace zt::fnd::osdep {
namespace {

constexpr const wchar_t* kDirectory = L"namedEvent";
constexpr int kLockRounds = 500;
// Each time another process has opened and closed the event in between, so many are no hang.
constexpr int kReplacedFiles = 10000;
constexpr int kProject = 1;  // of ftok

}  // namespace

bool GetLockAccessToFile(int fd) {
  for (int round = 0;; ++round) {
    // Alone or shared, whichever is free. Neither is while another process has it alone, for the
    // moment of its opening or closing.
    if (Flock(fd, LOCK_EX | LOCK_NB) == 0) return true;
    if (Flock(fd, LOCK_SH | LOCK_NB) == 0) return false;
    if (round == kLockRounds) ZT_RAISE(PosixError());
    Sleep(1);
  }
}

EventFile::EventFile(const AnsiString& path)
    : m_path(std::make_unique<const AnsiString>(path)),
      m_fd(CloseOnForkFd::OpenShared(path)),
      m_process(ProcessMark::Current()) {}

EventFile::EventFile(EventFile&& other) noexcept { *this = std::move(other); }

EventFile& EventFile::operator=(EventFile&& other) noexcept {
  close();
  m_path = std::move(other.m_path);
  m_fd = std::move(other.m_fd);
  m_process = other.m_process;
  m_exclusive = other.m_exclusive;
  m_discard = other.m_discard;
  m_key = other.m_key;
  return *this;
}

EventFile EventFile::Open(const String& name) {
  for (int attempt = 1;; ++attempt) {
    EventFile file(SharedObjectPath(String(kDirectory), name));
    file.m_exclusive = GetLockAccessToFile(file.m_fd.get());
    if (file.identify()) return file;
    if (attempt == kReplacedFiles) ZT_RAISE(PosixError(ENOLCK));
  }
}

bool EventFile::Exists(const String& name) noexcept {
  try {
    const AnsiString path = SharedObjectPath(String(kDirectory), name);
    struct stat info;
    return RetryEintr([&] { return ::lstat(path.c_str(), &info); }) == 0;
  } catch (const std::exception&) {  // Without the directory there is nothing in it.
    return false;
  }
}

// Learns what the locked file is; false if its name is gone or leads elsewhere. The key comes from
// the name, so it is good only if the name still leads here after it was made.
bool EventFile::identify() {
  struct stat info;
  if (::fstat(m_fd.get(), &info) != 0) ZT_RAISE(PosixError());
  // Empty: this opening has made it, or one that died before its first write.
  m_discard = info.st_size == 0;
  // ftok makes the key from the device and inode of the path, so that all who open the same file
  // come to the same semaphores.
  m_key = RetryEintr([&] { return ::ftok(m_path->c_str(), kProject); });
  if (m_key == -1) {
    if (errno != ENOENT) ZT_RAISE(PosixError());
    return false;
  }
  return m_fd.identity().isNamedBy(*m_path);
}

bool EventFile::read(void* bytes, size_t n, uint64_t offset) const noexcept {
  ssize_t got =
      RetryEintr([&] { return ::pread(m_fd.get(), bytes, n, static_cast<off_t>(offset)); });
  return got >= 0 && static_cast<size_t>(got) == n;
}

bool EventFile::write(const void* bytes, size_t n, uint64_t offset) const noexcept {
  return zt::posix::WriteAllAt(m_fd.get(), bytes, n, static_cast<off_t>(offset));
}

bool EventFile::share() noexcept {
  if (Flock(m_fd.get(), LOCK_SH) != 0) return false;
  m_exclusive = false;
  return true;
}

void EventFile::settle() noexcept {
  m_discard = false;
  m_fd.keepOnFork(true);
}

bool EventFile::claim() noexcept {
  // A child that is forked from here on has no copy, which would look like one more user that never
  // leaves.
  m_fd.keepOnFork(false);
  m_exclusive = Flock(m_fd.get(), LOCK_EX | LOCK_NB) == 0;
  return m_exclusive;
}

bool EventFile::unlink() const noexcept {
  if (!m_fd.identity().isNamedBy(*m_path)) return false;
  return zt::posix::Unlink(m_path->c_str()) == 0;
}

void EventFile::close() noexcept {
  if (!m_fd.valid()) return;
  // A copy that came through fork shares the open file with the parent: LOCK_UN would free the
  // parent's lock.
  if (m_process.isCurrent()) {
    int saved = errno;
    if (m_discard && m_exclusive) unlink();
    Flock(m_fd.get(), LOCK_UN);
    errno = saved;
  }
  m_fd.reset();
}

}  // namespace zt::fnd::osdep
