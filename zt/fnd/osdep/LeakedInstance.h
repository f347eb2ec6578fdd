#pragma once

#include <atomic>

namespace zt::fnd::osdep {

// The one T of the process, made by the first call and never destroyed, as other libraries call in
// from their exit handlers.
//
// In place of a static in a function, whose guard hangs a child that was forked while another
// thread was making the object. Two threads that come first at once both make one, and one of the
// two goes again; so T's constructor and destructor change nothing outside the object. Throws what
// the constructor throws. Threads: any.
template <class T>
T& LeakedInstance() {
  static constinit std::atomic<T*> instance{nullptr};
  T* present = instance.load(std::memory_order_acquire);
  if (present) return *present;
  T* fresh = new T;
  if (instance.compare_exchange_strong(present, fresh, std::memory_order_acq_rel)) return *fresh;
  delete fresh;
  return *present;
}

}  // namespace zt::fnd::osdep
