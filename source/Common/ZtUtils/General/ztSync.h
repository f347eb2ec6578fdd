#pragma once

#include "zt/fnd/String.h"
#include "zt/fnd/osdep/CriticalSection.h"
#include "zt/fnd/osdep/Mutex.h"

// Locks and events of the OS layer in one polymorphic shape, for code that holds a lockable thing
// without knowing which. Exceptions of the primitive behind pass through.
namespace Toolyard {

// A timeout is in milliseconds, -1 for none.
class CztSyncObject {
 public:
  CztSyncObject() = default;
  CztSyncObject(const CztSyncObject&) = delete;
  CztSyncObject& operator=(const CztSyncObject&) = delete;
  virtual ~CztSyncObject() = default;
  virtual void SetPumpMsgs(bool pumpMsgs) { m_pumpMsgs = pumpMsgs; }
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

 private:
  zt::fnd::osdep::Mutex m_mutex;
};

// Holds a lock for a scope.
class CztHold {
 public:
  explicit CztHold(CztSyncObject& lock) : m_lock(lock), m_held(lock.Lock(-1)) {}
  ~CztHold() {
    if (m_held) m_lock.Unlock();
  }
  CztHold(const CztHold&) = delete;
  CztHold& operator=(const CztHold&) = delete;

 private:
  CztSyncObject& m_lock;
  bool m_held;
};

}  // namespace Toolyard
