// A recursive mutex of the system with the owner and depth beside it, which the system does not
// reveal. Both are written by the owner only, while it holds the mutex; other threads read the
// owner merely to see that it is not themselves. For that answer no ordering is needed: a thread
// always sees its own last store, and a foreign value, however old, is never its own id.
#include "zt/fnd/osdep/CriticalSection.h"

#include <pthread.h>

#include <atomic>
#include <cerrno>
#include <cstdint>

#include "zt/fnd/osdep/AbandonedMutex.h"

namespace zt::fnd::osdep {

struct UnixCriticalSection::Block {
  // Atomic, because threads that are not the owner compare it with themselves.
  std::atomic<pthread_t> owner{pthread_t()};
  pthread_mutex_t mutex;
  std::atomic<int32_t> count{0};

  void recordOwner() {
    owner.store(pthread_self(), std::memory_order_relaxed);
    count.fetch_add(1, std::memory_order_relaxed);
  }
};

UnixCriticalSection::UnixCriticalSection() : m_block(new Block) {
  pthread_mutexattr_t attributes;
  pthread_mutexattr_init(&attributes);
  pthread_mutexattr_settype(&attributes, PTHREAD_MUTEX_RECURSIVE);
  pthread_mutex_init(&m_block->mutex, &attributes);
  pthread_mutexattr_destroy(&attributes);
}

UnixCriticalSection::~UnixCriticalSection() {
  // A section whose owner never left it (the owner's lock was released by another thread) cannot be
  // destroyed as a mutex; its memory alone is given back, or left where the system still uses it.
  if (m_block->count.load(std::memory_order_relaxed) == 0) {
    pthread_mutex_destroy(&m_block->mutex);
  } else if (!AbandonedMutexMayGo()) {
    return;
  }
  delete m_block;
}

void UnixCriticalSection::enter() const {
  pthread_mutex_lock(&m_block->mutex);
  m_block->recordOwner();
}

bool UnixCriticalSection::tryEnter() const {
  int status = pthread_mutex_trylock(&m_block->mutex);
  if (status == EBUSY || status == EINVAL) return false;
  m_block->recordOwner();
  return true;
}

void UnixCriticalSection::leave() const {
  if (!inOwningThread()) return;
  int32_t count = m_block->count.load(std::memory_order_relaxed);
  if (count > 0) m_block->count.store(--count, std::memory_order_relaxed);
  // Before the unlock: afterwards another thread may already have written itself there.
  if (count == 0) m_block->owner.store(pthread_t(), std::memory_order_relaxed);
  pthread_mutex_unlock(&m_block->mutex);
}

bool UnixCriticalSection::inOwningThread() const {
  return pthread_equal(m_block->owner.load(std::memory_order_relaxed), pthread_self()) != 0;
}

CriticalSection::CriticalSection() : m_section(new UnixCriticalSection) {}
CriticalSection::~CriticalSection() { delete m_section; }
void CriticalSection::enter() const { m_section->enter(); }
void CriticalSection::leave() const { m_section->leave(); }

}  // namespace zt::fnd::osdep
