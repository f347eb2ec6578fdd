#pragma once

#include <cstdint>

#include "zt/fnd/String.h"
#include "zt/fnd/osdep/CriticalSection.h"
#include "zt/fnd/osdep/Event.h"
#include "zt/fnd/osdep/Mutex.h"
#include "zt/fnd/osdep/NamedEvent.h"
#include "zt/fnd/osdep/ThreadAnnotations.h"

// Locks and events of the OS layer in one polymorphic shape, for code that holds a lockable thing
// without knowing which. Exceptions of the primitive pass through.
namespace Toolyard {

// A timeout is in milliseconds, -1 for none.
class CztSyncObject {
 public:
  CztSyncObject() = default;
  CztSyncObject(const CztSyncObject&) = delete;
  CztSyncObject& operator=(const CztSyncObject&) = delete;
  virtual ~CztSyncObject() = default;
  // Whether a wait handles messages meanwhile. There are none on this system: the flag is kept and
  // passed on.
  virtual void SetPumpMsgs(bool pumpMsgs) { m_pumpMsgs = pumpMsgs; }
  // What taking and giving back mean is the class's: for an event they are waiting and setting.
  virtual bool Lock(int timeoutMs) = 0;
  virtual bool Unlock() = 0;

 protected:
  bool m_pumpMsgs = false;
};

// Recursive lock of one process. Lock waits without limit, whatever the timeout, and is true.
class CztCS : public CztSyncObject {
 public:
  bool Lock(int timeoutMs) override;
  bool Unlock() override;

 private:
  zt::fnd::osdep::CriticalSection m_section;
};

// Lock known by name to the machine's processes; recursive per object. Lock waits without limit,
// whatever the timeout, and is true. A null or empty name becomes "UNNAMED_MUTEX".
class CztMutex : public CztSyncObject {
 public:
  CztMutex(const wchar_t* name, bool initiallyOwned);
  CztMutex(bool pumpMsgs, const wchar_t* name, bool initiallyOwned);
  bool Lock(int timeoutMs) override;
  bool Unlock() override;
  // Takes the mutex if that needs no wait; false if not, or if it fails.
  bool TryLock() { return m_mutex.tryLock(); }

 private:
  zt::fnd::osdep::Mutex m_mutex;
};

// Event of one process. The name means nothing to the event.
class CztEvent : public CztSyncObject {
 public:
  CztEvent(const char* name, bool initialState, bool manualReset);
  CztEvent(bool pumpMsgs, const char* name, bool initialState, bool manualReset);

  // Waits for the event; true, whether it came or the time ran out. Negative timeouts but -1 count
  // as unsigned 32-bit numbers.
  bool Lock(int timeoutMs) override;
  bool Unlock() override;  // sets the event

 private:
  zt::fnd::osdep::PumpEvent m_event;
  zt::fnd::String m_name;
};

// Semaphore of one process. The name means nothing to it.
//
//   count      Lock                               Release(n)
//   above 0    count - 1, true                    count + n, at most the maximum
//   0 or less  waits for a release, then looks    the same; wakes the waiters if units are left
//              again
//
// Waiters are served in no order.
class CztSemaphore : public CztSyncObject {
 public:
  CztSemaphore(const wchar_t* name, int maximum, int initial);

  // Takes a unit, and returns only then: the timeout limits each wait, not the call. One of 0 is a
  // wait without limit.
  bool Lock(int timeoutMs) override;
  bool Unlock() override;  // Release(1)

  // Returns the count before the call.
  int Release(int n);

 private:
  bool take() const;

  mutable int32_t m_count GUARDED_BY(m_section);
  const int32_t m_maximum;
  zt::fnd::osdep::PumpEvent m_event;  // set while units are left, once there was a release
  zt::fnd::osdep::CriticalSection m_section;
  zt::fnd::String m_name;
};

// Lock known by name to the machine's processes, with a named event that shows others whether it is
// held, without their touching the lock. The event follows only where the caller says so: it is set
// after the lock was taken and reset before it is given back.
//
// Mutex and event are named name + "-mutex" and name + "-event".
class CztStatefulMutex : public CztSyncObject {
 public:
  explicit CztStatefulMutex(const zt::fnd::String& name);

  bool Lock(int timeoutMs) override;  // LockAndSetState(true, timeoutMs)
  bool Unlock() override;             // UnlockAndResetState(true)

  // With a wait of 0 the lock is tried, and false says that another has it; any other wait is one
  // without limit, and true. If the event cannot be set, the lock is given back and the exception
  // passed on.
  bool LockAndSetState(bool setState, int wait);

  // Gives the lock back also where the event cannot be reset; that exception passes on. True.
  bool UnlockAndResetState(bool resetState);

 private:
  zt::fnd::osdep::Mutex m_mutex;
  zt::fnd::osdep::NamedEvent m_event;
};

}  // namespace Toolyard
