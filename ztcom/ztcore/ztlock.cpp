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
// wrote.
int ZTInterlockedInc(int* counter) { return std::atomic_ref<int>(*counter).fetch_add(1) + 1; }
int ZTInterlockedDec(int* counter) { return std::atomic_ref<int>(*counter).fetch_sub(1) - 1; }
int ZTInterlockedGet(int* counter) { return std::atomic_ref<int>(*counter).load(); }
pthread_t ZTGetThreadId() { return pthread_self(); }
