#include "ztcom/ztcore/ztlock.h"

#include <atomic>
#include <cstdlib>

struct CZTMutex::State {
  // Atomic because IsNesting reads them without the mutex. Only the answer for the calling thread
  // matters, and that thread wrote what it reads.
  std::atomic<int32_t> locked{0};
  std::atomic<pthread_t> owner{};
  pthread_mutex_t mutex = PTHREAD_MUTEX_INITIALIZER;
};

CZTMutex::CZTMutex() : m_state(new State) {}

CZTMutex::~CZTMutex() {
  pthread_mutex_destroy(&m_state->mutex);
  delete m_state;
}

void CZTMutex::Lock() {
  pthread_mutex_lock(&m_state->mutex);
  if (m_state->locked) abort();
  m_state->owner = pthread_self();
  m_state->locked = 1;
}

void CZTMutex::Unlock() {
  // Before the mutex is free: afterwards another thread may already have set both.
  m_state->locked = 0;
  m_state->owner = pthread_t{};
  pthread_mutex_unlock(&m_state->mutex);
}

bool CZTMutex::IsNesting() const {
  return m_state->locked && pthread_equal(m_state->owner, pthread_self());
}

// Sequentially consistent: a thread that takes the last reference away must see what the others
// wrote. Built-in functions, as libc++ has std::atomic_ref since its version 19 only.
int ZTInterlockedInc(int* counter) { return __atomic_add_fetch(counter, 1, __ATOMIC_SEQ_CST); }
int ZTInterlockedDec(int* counter) { return __atomic_sub_fetch(counter, 1, __ATOMIC_SEQ_CST); }
int ZTInterlockedGet(int* counter) { return __atomic_load_n(counter, __ATOMIC_SEQ_CST); }
pthread_t ZTGetThreadId() { return pthread_self(); }
