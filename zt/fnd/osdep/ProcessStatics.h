#pragma once

#include <pthread.h>
#include <sys/types.h>
#include <unistd.h>

#include <cstdlib>
#include <utility>

#include "zt/fnd/RefCounted.h"

namespace zt {
namespace fnd {
namespace osdep {

// Holds a plain POSIX mutex for a scope; for locks that are taken across fork().
class PosixMutexHold {
 public:
  explicit PosixMutexHold(pthread_mutex_t& mutex) : m_mutex(mutex) { pthread_mutex_lock(&m_mutex); }
  ~PosixMutexHold() { pthread_mutex_unlock(&m_mutex); }
  PosixMutexHold(const PosixMutexHold&) = delete;
  PosixMutexHold& operator=(const PosixMutexHold&) = delete;

 private:
  pthread_mutex_t& m_mutex;
};

// The one Statics of this process: made on demand, shared by reference, let go at exit.
//
// A forked child starts without. What it inherits, a thread that is not in the child may have been
// changing at the fork: it is never touched nor released again, but kept in sight of leak checkers.
// Statics is reference-counted, is told its process by `const pid_t pid`, and lends the list of the
// inherited ones its `Statics* inherited`. All functions may be called by any thread at any time,
// before the first initialiser and after the last destructor, too.
template <class Statics>
class ProcessStatics {
 public:
  // Null if there are none yet.
  static RefPtr<Statics> Present() {
    pthread_once(&s_once, Register);
    PosixMutexHold hold(s_lock);
    DropInherited();
    return RefPtr<Statics>(s_statics);
  }

  // Where there are none, makes them. That happens outside the lock, as it may open files, or fork
  // handlers could wait for it; of two threads one makes them in vain.
  static RefPtr<Statics> Get() {
    RefPtr<Statics> present = Present();
    if (present) return present;
    RefPtr<Statics> fresh(new Statics);
    PosixMutexHold hold(s_lock);
    DropInherited();
    if (s_statics == nullptr) s_statics = RefPtr<Statics>(fresh).detach();
    return RefPtr<Statics>(s_statics);
  }

  // The lock, which no fork comes in between: for counts that a child keeps on what it inherited.
  static pthread_mutex_t& Lock() { return s_lock; }

 private:
  // The process id tells a child apart that was made without the handlers of fork(), too.
  static void DropInherited() {
    if (s_statics == nullptr || s_statics->pid == getpid()) return;
    s_statics->inherited = std::exchange(s_inherited, s_statics);
    s_statics = nullptr;
  }

  static void AtExit() {
    Statics* last;
    {
      PosixMutexHold hold(s_lock);
      DropInherited();
      last = std::exchange(s_statics, nullptr);
    }
    if (last != nullptr) last->release();
  }

  static void LockForFork() { pthread_mutex_lock(&s_lock); }
  static void UnlockAfterFork() { pthread_mutex_unlock(&s_lock); }
  static void Register() {
    pthread_atfork(LockForFork, UnlockAfterFork, UnlockAfterFork);
    std::atexit(AtExit);
  }

  static inline pthread_once_t s_once = PTHREAD_ONCE_INIT;
  static inline pthread_mutex_t s_lock = PTHREAD_MUTEX_INITIALIZER;
  static inline Statics* s_statics = nullptr;    // one reference; guarded by s_lock
  static inline Statics* s_inherited = nullptr;  // guarded by s_lock
};

}  // namespace osdep
}  // namespace fnd
}  // namespace zt
