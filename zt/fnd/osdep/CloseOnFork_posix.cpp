#include "zt/fnd/osdep/CloseOnFork.h"

#include <pthread.h>
#include <unistd.h>

#include <cstddef>
#include <utility>
#include <vector>

#include "zt/fnd/String.h"
#include "zt/fnd/osdep/ProcessStatics.h"
#include "zt/fnd/osdep/ScopedFd.h"
#include "zt/fnd/osdep/SharedUnixObject.h"

namespace zt {
namespace fnd {
namespace osdep {
namespace {

// Plain objects, ready before any initialiser and good after every destructor.
pthread_once_t s_once = PTHREAD_ONCE_INIT;
pthread_mutex_t s_lock = PTHREAD_MUTEX_INITIALIZER;  // guards what follows; innermost of all locks
std::vector<bool>* s_marked = nullptr;               // by descriptor number
unsigned s_forks = 0;

void BeforeFork() {
  pthread_mutex_lock(&s_lock);
  ++s_forks;
}

void InParent() { pthread_mutex_unlock(&s_lock); }

void InChild() {
  if (s_marked != nullptr) {
    for (std::size_t fd = 0; fd < s_marked->size(); ++fd) {
      if (!(*s_marked)[fd]) continue;
      ::close(static_cast<int>(fd));
      (*s_marked)[fd] = false;
    }
  }
  pthread_mutex_unlock(&s_lock);
}

void Register() { pthread_atfork(BeforeFork, InParent, InChild); }

unsigned ForksSoFar() {
  PosixMutexHold hold(s_lock);
  return s_forks;
}

// Marks the descriptor unless there was a fork since the count was taken, which may have copied it.
bool MarkIfNoFork(int fd, unsigned forks) {
  PosixMutexHold hold(s_lock);
  if (s_forks != forks) return false;
  if (s_marked == nullptr) s_marked = new std::vector<bool>;
  std::size_t index = static_cast<std::size_t>(fd);
  if (s_marked->size() <= index) s_marked->resize(index + 64);
  (*s_marked)[index] = true;
  return true;
}

void Mark(int fd, bool marked) noexcept {
  PosixMutexHold hold(s_lock);
  std::size_t index = static_cast<std::size_t>(fd);
  if (s_marked != nullptr && index < s_marked->size()) (*s_marked)[index] = marked;
}

}  // namespace

CloseOnForkFd::CloseOnForkFd(CloseOnForkFd&& other) noexcept { *this = std::move(other); }

CloseOnForkFd& CloseOnForkFd::operator=(CloseOnForkFd&& other) noexcept {
  reset();
  m_fd = std::exchange(other.m_fd, -1);
  m_pid = other.m_pid;
  m_kept = other.m_kept;
  return *this;
}

CloseOnForkFd CloseOnForkFd::OpenShared(const AnsiString& path) {
  pthread_once(&s_once, Register);
  for (;;) {
    unsigned forks = ForksSoFar();
    ScopedFd fd(CreateSharedUnixFile(path));
    if (MarkIfNoFork(fd.get(), forks)) return CloseOnForkFd(fd.release(), getpid());
    // The copy in the child is of an open file that nobody locks; this process takes another.
  }
}

void CloseOnForkFd::keepOnFork(bool keep) noexcept {
  if (!valid()) return;
  Mark(m_fd, !keep);
  m_kept = keep;
}

void CloseOnForkFd::reset() noexcept {
  if (!valid()) return;
  bool ours = m_pid == getpid();
  // Before the descriptor is closed, as its number may serve another file then.
  if (ours) Mark(m_fd, false);
  ScopedFd closes(ours || m_kept ? m_fd : -1);
  m_fd = -1;
}

}  // namespace osdep
}  // namespace fnd
}  // namespace zt
