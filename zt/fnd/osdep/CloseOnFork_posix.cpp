// Linux has close-on-exec but no close-on-fork, so that the library keeps a table of descriptors
// and closes them itself, in a handler of fork() that runs in the child before fork() returns. The
// table is indexed by the number and has for each the serial of the opening and the identity of the
// file; both have to match before a number is used, since the host may close any descriptor and get
// the number again for a file of its own.
//
// s_lock is held across fork(), which makes "opened and in the table" one step for the child:
// either the mark is there, and the child closes the descriptor, or the counter of forks has moved,
// and the opening begins again with a file that no child has.
#include "zt/fnd/osdep/CloseOnFork.h"

#include <pthread.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <utility>
#include <vector>

#include "zt/fnd/String.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/PosixMutex.h"
#include "zt/posix/ScopedFd.h"

using zt::posix::ScopedFd;

namespace zt::fnd::osdep {
namespace {

// Plain objects, ready before any initialiser and good after every destructor.
pthread_once_t s_once = PTHREAD_ONCE_INIT;
constinit PosixMutex s_lock;  // innermost of all locks
struct Mark {
  uint64_t serial = 0;  // of the opening that the number belongs to; 0 for none
  FileIdentity file;    // which it leads to, unless the host has closed it
  bool closesInChild = false;
};
std::vector<Mark>* s_marks GUARDED_BY(s_lock) = nullptr;  // by descriptor number
uint64_t s_serial GUARDED_BY(s_lock) = 0;
// Counted before the fork, so that the copy in the child counts it too.
unsigned s_forks GUARDED_BY(s_lock) = 0;

void BeforeFork() ACQUIRE(s_lock) {
  s_lock.lock();
  ++s_forks;
}

void InParent() RELEASE(s_lock) { s_lock.unlock(); }

// Makes system calls only, as other threads may have been anywhere at the fork.
void InChild() RELEASE(s_lock) {
  for (size_t fd = 0; s_marks && fd < s_marks->size(); ++fd) {
    Mark& mark = (*s_marks)[fd];
    if (!mark.closesInChild) continue;
    // close() and not ScopedFd: only calls that POSIX allows after a fork in a process of several
    // threads.
    if (mark.file.isBehind(static_cast<int>(fd))) ::close(static_cast<int>(fd));
    mark = Mark();
  }
  s_lock.unlock();
}

void Register() { pthread_atfork(BeforeFork, InParent, InChild); }

// Not at the first use, for the reason that ForkSafeMutex_posix.cpp has.
__attribute__((constructor)) void RegisterAtLoad() { CloseOnForkFd::RegisterForkHandlers(); }

unsigned ForksSoFar() {
  Hold hold(s_lock);
  return s_forks;
}

// Marks the descriptor and returns its serial number; 0 if there was a fork since the count was
// taken, which may have copied it.
uint64_t MarkIfNoFork(int fd, const FileIdentity& file, unsigned forks) {
  Hold hold(s_lock);
  if (s_forks != forks) return 0;
  if (!s_marks) s_marks = new std::vector<Mark>;
  size_t index = static_cast<size_t>(fd);
  // Ahead of need: a resize for each descriptor would copy the table each time.
  if (s_marks->size() <= index) s_marks->resize(index + 64);
  (*s_marks)[index] = Mark{++s_serial, file, true};
  return s_serial;
}

// The mark of this opening; null if another has the number.
Mark* FindMark(int fd, uint64_t serial) noexcept REQUIRES(s_lock) {
  size_t index = static_cast<size_t>(fd);
  if (!s_marks || index >= s_marks->size()) return nullptr;
  Mark& mark = (*s_marks)[index];
  return mark.serial == serial ? &mark : nullptr;
}

}  // namespace

CloseOnForkFd::CloseOnForkFd(CloseOnForkFd&& other) noexcept { *this = std::move(other); }

CloseOnForkFd& CloseOnForkFd::operator=(CloseOnForkFd&& other) noexcept {
  reset();
  m_fd = std::exchange(other.m_fd, -1);
  m_serial = other.m_serial;
  m_file = other.m_file;
  m_process = other.m_process;
  m_kept = other.m_kept;
  return *this;
}

void CloseOnForkFd::RegisterForkHandlers() { pthread_once(&s_once, Register); }

CloseOnForkFd CloseOnForkFd::OpenShared(const AnsiString& path, InTheWay way) {
  RegisterForkHandlers();
  for (;;) {
    unsigned forks = ForksSoFar();
    CloseOnForkFd result;
    ScopedFd fd(CreateSharedUnixFile(path, way, &result.m_file));
    result.m_serial = MarkIfNoFork(fd.get(), result.m_file, forks);
    // The copy in the child is of an open file that is never locked; this process takes another.
    if (result.m_serial == 0) continue;
    result.m_process = ProcessMark::Current();
    result.m_fd = fd.release();
    return result;
  }
}

// What came through fork() is asked for without the lock, as it may be let go under one that a fork
// takes after this one.
int CloseOnForkFd::get() const noexcept {
  if (!valid()) return -1;
  // In a child only a kept descriptor is its own.
  if (!m_process.isCurrent()) {
    if (!m_kept) return -1;
  } else {
    Hold hold(s_lock);
    if (!FindMark(m_fd, m_serial)) return -1;
  }
  return m_file.isBehind(m_fd) ? m_fd : -1;
}

void CloseOnForkFd::keepOnFork(bool keep) noexcept {
  if (!valid()) return;
  Hold hold(s_lock);
  if (Mark* mark = FindMark(m_fd, m_serial)) mark->closesInChild = !keep;
  m_kept = keep;
}

void CloseOnForkFd::reset() noexcept {
  ScopedFd closes(get());
  if (valid() && m_process.isCurrent()) {
    // Both in one hold: the child of a fork between them would keep a descriptor without a mark, and
    // its lock.
    Hold hold(s_lock);
    if (Mark* mark = FindMark(m_fd, m_serial)) *mark = Mark();
    closes.reset();
  }
  m_fd = -1;
}

}  // namespace zt::fnd::osdep
