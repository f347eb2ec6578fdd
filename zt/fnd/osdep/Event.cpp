// A condition, a mutex and a flag. The waits loop on the flag, as POSIX lets a condition wake
// without a signal, and since of several waiters of an automatic event one takes the flag before
// the others test it. What a set wakes is therefore a question of efficiency only: a broadcast lets
// all pass a manual event, a signal is enough for an automatic one.
#include "zt/fnd/osdep/Event.h"

#include <pthread.h>
#include <sys/time.h>

#include <ctime>
#include <utility>

#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/PosixMutex.h"

namespace zt::fnd::osdep {
namespace {

constexpr unsigned int kNoLimit = 0xFFFFFFFFu;

timespec DeadlineIn(unsigned int ms) {
  timeval now;
  // The clock that an unconfigured condition waits by is that of the wall.
  gettimeofday(&now, nullptr);
  timespec deadline;
  deadline.tv_sec = now.tv_sec + ms / 1000;
  // Below two seconds in nanoseconds, which fits a long of 32 bits.
  deadline.tv_nsec = now.tv_usec * 1000L + (ms % 1000) * 1000000L;
  if (deadline.tv_nsec >= 1000000000L) {
    deadline.tv_sec += 1;
    deadline.tv_nsec -= 1000000000L;
  }
  return deadline;
}

}  // namespace

struct Event::Block {
  pthread_cond_t condition;
  PosixMutex mutex;
  const bool manualReset;
  bool signaled GUARDED_BY(mutex);

  Block(bool manual, bool initial) : manualReset(manual), signaled(initial) {
    pthread_cond_init(&condition, nullptr);
  }
  ~Block() { pthread_cond_destroy(&condition); }

  bool take() REQUIRES(mutex) { return manualReset ? signaled : std::exchange(signaled, false); }
};

Event::Event(bool manualReset, bool initialState) : m_block(new Block(manualReset, initialState)) {}

Event::~Event() { delete m_block; }

void Event::set() const {
  Hold hold(m_block->mutex);
  m_block->signaled = true;
  if (m_block->manualReset) {
    pthread_cond_broadcast(&m_block->condition);
  } else {
    pthread_cond_signal(&m_block->condition);
  }
}

void Event::reset() const {
  Hold hold(m_block->mutex);
  m_block->signaled = false;
}

void Event::resetIfAuto() {
  if (!m_block->manualReset) reset();
}

bool Event::check() const {
  Hold hold(m_block->mutex);
  return m_block->take();
}

void Event::wait() const {
  Hold hold(m_block->mutex);
  while (!m_block->signaled) pthread_cond_wait(&m_block->condition, m_block->mutex.native());
  m_block->take();
}

bool Event::wait(unsigned int ms) const {
  if (ms == 0) return check();
  if (ms == kNoLimit) {
    wait();
    return true;
  }
  timespec deadline = DeadlineIn(ms);
  Hold hold(m_block->mutex);
  while (!m_block->signaled) {
    // Any failure ends the wait, not only ETIMEDOUT: a wait that cannot be made must not become a
    // loop. The flag decides afterwards, as it may have been set at the last moment.
    if (pthread_cond_timedwait(&m_block->condition, m_block->mutex.native(), &deadline) != 0) break;
  }
  return m_block->take();
}

bool PumpEvent::wait(unsigned long ms, bool) const {
  if (!std::in_range<unsigned int>(ms)) ZT_RAISE(exception::OutOfRange());
  return Event::wait(static_cast<unsigned int>(ms));
}

}  // namespace zt::fnd::osdep
