#pragma once

#include "zt/fnd/osdep/ThreadAnnotations.h"

namespace zt::fnd::osdep {

// Holds a lock for a scope, in the sight of clang's -Wthread-safety. A lock is a CAPABILITY with
// lock() and unlock(); what lock() throws passes through. One lock, one scope: a hold is neither
// copied nor moved, so that its scope's end is its own, on an exception's way out too.
//
//   Hold hold(m_lock);
template <class Lock>
class SCOPED_CAPABILITY Hold {
 public:
  explicit Hold(Lock& lock) ACQUIRE(lock) : m_lock(lock) { m_lock.lock(); }
  ~Hold() RELEASE() { m_lock.unlock(); }
  Hold(const Hold&) = delete;
  Hold& operator=(const Hold&) = delete;

 private:
  Lock& m_lock;
};

// Gives a lock that the caller has taken back at the end of the scope, unless it is kept. For locks
// whose ownership crosses functions, which are not checked.
template <class Lock>
class UnlockUnlessKept {
 public:
  explicit UnlockUnlessKept(Lock& lock) : m_lock(&lock) {}
  ~UnlockUnlessKept() {
    if (m_lock) m_lock->unlock();
  }
  UnlockUnlessKept(const UnlockUnlessKept&) = delete;
  UnlockUnlessKept& operator=(const UnlockUnlessKept&) = delete;

  // The lock is the caller's beyond the scope.
  void keep() noexcept { m_lock = nullptr; }

 private:
  Lock* m_lock;
};

}  // namespace zt::fnd::osdep
