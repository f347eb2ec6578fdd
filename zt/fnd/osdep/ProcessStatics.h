#pragma once

#include <pthread.h>

#include <cstdlib>
#include <utility>

#include "zt/fnd/RefCounted.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/PosixMutex.h"

namespace zt::fnd::osdep {

// The one Statics of this process: made on demand, shared by reference, let go at exit.
//
// A forked child starts without. What it inherits, a thread that is not in the child may have been
// changing at the fork: it is never touched nor released again, but kept in sight of leak checkers.
// Statics is reference-counted, has its process in `const ProcessMark process`, and lends the
// list of the inherited ones its `Statics* inherited`. All functions may be called by any thread at
// any time, before the first initialiser and after the last destructor, too.
template <class Statics>
class ProcessStatics {
 public:
  // Null if there are none yet.
  static RefPtr<Statics> Present() {
    RegisterForkHandlers();
    Hold hold(s_lock);
    DropInherited();
    return RefPtr<Statics>(s_statics);
  }

  // Where there are none, makes them. That happens outside the lock, as it may open files, or fork
  // handlers could wait for it; of two threads one makes them in vain.
  static RefPtr<Statics> Get() {
    RefPtr<Statics> present = Present();
    if (present) return present;
    RefPtr<Statics> fresh(new Statics);
    Hold hold(s_lock);
    DropInherited();
    if (!s_statics) s_statics = RefPtr<Statics>(fresh).detach();
    return RefPtr<Statics>(s_statics);
  }

  // Has fork() know of the statics before there are any; for those whose own handlers must run
  // before these.
  static void RegisterForkHandlers() { pthread_once(&s_once, Register); }

  // The lock, which no fork comes in between: for counts that a child keeps on what it inherited.
  static PosixMutex& Lock() RETURN_CAPABILITY(s_lock) { return s_lock; }

 private:
  // In the first call of a forked child: the statics that it has inherited become the head of the
  // list of those that are never used again.
  static void DropInherited() REQUIRES(s_lock) {
    if (!s_statics || s_statics->process.isCurrent()) return;
    s_statics->inherited = std::exchange(s_inherited, s_statics);
    s_statics = nullptr;
  }

  // Outside the lock, as the destructor closes files and may take a while; objects that are alive
  // then hold references of their own, so that the statics outlive them.
  static void AtExit() {
    Statics* last;
    {
      Hold hold(s_lock);
      DropInherited();
      last = std::exchange(s_statics, nullptr);
    }
    if (last) last->release();
  }

  static void LockForFork() ACQUIRE(s_lock) { s_lock.lock(); }
  static void UnlockAfterFork() RELEASE(s_lock) { s_lock.unlock(); }
  static void Register() {
    pthread_atfork(LockForFork, UnlockAfterFork, UnlockAfterFork);
    atexit(AtExit);
  }

  static inline pthread_once_t s_once = PTHREAD_ONCE_INIT;
  static inline constinit PosixMutex s_lock;
  static inline Statics* s_statics GUARDED_BY(s_lock) = nullptr;  // one reference
  static inline Statics* s_inherited GUARDED_BY(s_lock) = nullptr;
};

}  // namespace zt::fnd::osdep
