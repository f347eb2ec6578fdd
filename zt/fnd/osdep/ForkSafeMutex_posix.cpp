// A fork copies the mutexes of all threads in the state of that moment, and the child has none of
// the threads that would unlock them. So before a fork a handler takes every AtFork::Wait mutex
// that the forking thread does not hold itself: what they guard is whole then, and the child gets
// them as the forking thread's own, to be unlocked in both processes. What could not be taken in
// time is made again in the child and marked as interrupted.
//
// The handler may not deadlock with threads that hold one mutex and wait for another, in whatever
// order. It takes the mutexes in the order of ranks and gives each a short turn; where one is
// missed, it gives back all others, so that the holder can go on, and starts over with the missed
// one. The patience of a second bounds the whole, since a fork that never returns is worse than an
// interrupted mutex.
#include <algorithm>
#include <cstdint>
#include <ctime>
#include <utility>

#include "zt/fnd/osdep/CloseOnFork.h"
#include "zt/fnd/osdep/ForkSafeMutex.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/LockUntil.h"
#include "zt/fnd/osdep/MutexGlobalStatics.h"
#include "zt/fnd/osdep/PosixMutex.h"
#include "zt/fnd/osdep/ProcessStatics.h"
#include "zt/fnd/osdep/events/NamedEventGlobalStatics.h"

namespace zt::fnd::osdep {
namespace {

constexpr int64_t kNanosecondsPerSecond = 1000000000;
constexpr int64_t kPatience = kNanosecondsPerSecond;  // of a fork, in all
constexpr int64_t kTurn = kPatience / 20;             // for one mutex, while others are held

int64_t Now() {
  // The monotonic clock: setting the time of day must not lengthen a fork.
  timespec now;
  clock_gettime(CLOCK_MONOTONIC, &now);
  return int64_t{now.tv_sec} * kNanosecondsPerSecond + now.tv_nsec;
}

}  // namespace

// All mutexes of the process, in the order of their ranks. Plain objects, ready before any
// initialiser and good after every destructor.
class ForkSafeMutex::Registry {
 public:
  static void Add(ForkSafeMutex& mutex) {
    pthread_once(&s_once, Register);
    Hold hold(s_lock);
    ForkSafeMutex** place = &s_first;
    // Of equal ranks the earlier one stays first.
    while (*place && (*place)->m_rank <= mutex.m_rank) place = &(*place)->m_next;
    mutex.m_next = *place;
    *place = &mutex;
  }

  static void Remove(ForkSafeMutex& mutex) {
    Hold hold(s_lock);
    ForkSafeMutex** place = &s_first;
    while (*place != &mutex) place = &(*place)->m_next;
    *place = mutex.m_next;
  }

 private:
  static void RegisterAtLoad() __attribute__((constructor));

  // Handlers before a fork run from the last registered to the first. Those of the floor below go
  // first here: what they hold, a thread with one of these mutexes may need to get on.
  static void Register() {
    CloseOnForkFd::RegisterForkHandlers();
    ProcessStatics<MutexGlobalStatics>::RegisterForkHandlers();
    ProcessStatics<NamedEventGlobalStatics>::RegisterForkHandlers();
    pthread_atfork(BeforeFork, InParent, InChild);
  }

  static void BeforeFork() ACQUIRE(s_lock) {
    s_lock.lock();
    const int64_t end = Now() + kPatience;
    ForkSafeMutex* missed = TakeAll(nullptr, end);
    while (missed && Now() < end) {
      GiveBack();
      missed = TakeAll(missed, end);
    }
  }

  // Takes `first`, where one is given, before the others, and waits for it to the end: its holder
  // may have been waiting for one that comes earlier in the order. The others have a short turn
  // each. Returns the first that was missed; once the end has come all that are free are taken.
  static ForkSafeMutex* TakeAll(ForkSafeMutex* first, int64_t end) REQUIRES(s_lock) {
    ForkSafeMutex* missed = nullptr;
    if (first && !Take(*first, end)) missed = first;
    for (ForkSafeMutex* m = s_first; m; m = m->m_next) {
      if (m == first || m->m_atFork != AtFork::Wait || m->mine()) continue;
      if (Take(*m, std::min(Now() + kTurn, end))) continue;
      if (!missed) missed = m;
      // Before the end a missed one means beginning again; after it nothing is gained by that, and
      // the rest is taken as far as it is free.
      if (Now() < end) break;
    }
    return missed;
  }

  static bool Take(ForkSafeMutex& mutex, int64_t moment) {
    return mutex.m_takenByFork = LockUntil(mutex.m_mutex, moment);
  }

  static void GiveBack() REQUIRES(s_lock) {
    for (ForkSafeMutex* m = s_first; m; m = m->m_next) {
      if (std::exchange(m->m_takenByFork, false)) pthread_mutex_unlock(&m->m_mutex);
    }
  }

  static void InParent() RELEASE(s_lock) {
    GiveBack();
    s_lock.unlock();
  }

  static void InChild() RELEASE(s_lock) {
    for (ForkSafeMutex* m = s_first; m; m = m->m_next) m->renew();
    s_lock.unlock();
  }

  static inline pthread_once_t s_once = PTHREAD_ONCE_INIT;
  static inline constinit PosixMutex s_lock;
  static inline ForkSafeMutex* s_first GUARDED_BY(s_lock) = nullptr;
};

// Not at the first use: a fork that is under way then runs the handlers of before no more, and copies
// whatever a thread has locked since. The child would have it locked for good.
void ForkSafeMutex::Registry::RegisterAtLoad() { pthread_once(&s_once, Register); }

ForkSafeMutex::ForkSafeMutex(AtFork atFork, int rank) : m_atFork(atFork), m_rank(rank) {
  Registry::Add(*this);
}

ForkSafeMutex::~ForkSafeMutex() {
  Registry::Remove(*this);
  pthread_mutex_destroy(&m_mutex);
}

// Another thread's answer may be out of date, but is never true.
bool ForkSafeMutex::mine() const noexcept {
  return m_owned.load(std::memory_order_acquire) &&
         pthread_equal(m_owner.load(std::memory_order_relaxed), pthread_self()) != 0;
}

void ForkSafeMutex::own() noexcept {
  m_owner.store(pthread_self(), std::memory_order_relaxed);
  m_owned.store(true, std::memory_order_release);
  m_depth = 1;
}

void ForkSafeMutex::lock() {
  if (mine()) {
    ++m_depth;
    return;
  }
  pthread_mutex_lock(&m_mutex);
  own();
}

bool ForkSafeMutex::try_lock() {
  if (mine()) {
    ++m_depth;
    return true;
  }
  if (pthread_mutex_trylock(&m_mutex) != 0) return false;
  own();
  return true;
}

void ForkSafeMutex::unlock() {
  if (--m_depth > 0) return;
  m_owned.store(false, std::memory_order_release);
  pthread_mutex_unlock(&m_mutex);
}

// In the child, whose one thread this is.
void ForkSafeMutex::renew() noexcept {
  if (mine()) return;
  if (std::exchange(m_takenByFork, false)) {
    pthread_mutex_unlock(&m_mutex);
    return;
  }
  // Held also if the owner has not written itself down yet, or no longer.
  if (pthread_mutex_trylock(&m_mutex) != 0) m_interrupted = true;
  // A mutex that another thread holds cannot be unlocked or destroyed by this one (POSIX leaves
  // both undefined); a new one is put in its place.
  const pthread_mutex_t fresh = PTHREAD_MUTEX_INITIALIZER;
  m_mutex = fresh;
  m_owned = false;
  m_depth = 0;
}

}  // namespace zt::fnd::osdep
