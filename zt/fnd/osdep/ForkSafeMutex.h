#pragma once

#include <pthread.h>

#include <atomic>
#include <cstdint>

#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/ThreadAnnotations.h"

namespace zt::fnd::osdep {

// What a fork() does with a mutex that another thread holds.
enum class AtFork {
  Wait,   // waits until it is free, so that what it guards is whole in the child; a second at most
  Renew,  // does not wait: for holds across waits without limit
};

// Recursive mutex between the threads of a process that a forked child can always take.
//
//   holder at the fork     AtFork::Wait                        AtFork::Renew
//   none                   free                                free
//   the forking thread     held by it, as deep as before       the same
//   another thread         fork waits for it; free             free, and interrupted
//   the same, for more     free, and interrupted               -
//   than a second
//
// "Free" is the state in the child; in the parent nothing changes. Where the mutex was interrupted,
// what it guards may be half changed in the child: takeInterrupted() says so.
//
// The ranks say in which order a fork waits for the mutexes, which is the order in which code that
// holds several mostly takes them: 10 registrar, 20 its creation, 30 loader, 40 open database, 50
// component map, 60 start of the log, 62 its lines, 65 trace of the object core, 70 hooks, 80
// loading of modules, 90 times of the system, 95 text conversion. A fork that meets a holder who is
// waiting for what the fork has taken gives that back and begins with the holder's.
//
// A mutex is not made or destroyed while one of AtFork::Wait is held: a fork would wait its second
// out. Threads: any. A process made without the handlers of fork() (vfork, clone) has none of this.
class CAPABILITY("mutex") ForkSafeMutex {
 public:
  ForkSafeMutex(AtFork atFork, int rank);
  ~ForkSafeMutex();  // not while held
  ForkSafeMutex(const ForkSafeMutex&) = delete;
  ForkSafeMutex& operator=(const ForkSafeMutex&) = delete;

  void lock();  // waits without limit
  bool try_lock();
  void unlock();

  // Whether another thread held the mutex when this process was forked. True once.
  bool takeInterrupted() noexcept { return m_interrupted.exchange(false); }

 private:
  class Registry;

  bool mine() const noexcept;
  void own() noexcept;
  void renew() noexcept;

  // Not recursive itself: that kind knows its owner by the number of the thread in the system,
  // which is another in the child.
  pthread_mutex_t m_mutex = PTHREAD_MUTEX_INITIALIZER;
  std::atomic<pthread_t> m_owner{};
  std::atomic<bool> m_owned{false};
  uint32_t m_depth = 0;  // the owner's
  std::atomic<bool> m_interrupted{false};
  const AtFork m_atFork;
  const int m_rank;
  bool m_takenByFork = false;
  ForkSafeMutex* m_next = nullptr;  // in the order of the ranks
};

using ForkSafeHold = Hold<ForkSafeMutex>;

}  // namespace zt::fnd::osdep
