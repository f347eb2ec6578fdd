// The semaphore is a count and a manual-reset event for those who found none left. Waiters take the
// section, look at the count, and wait for the event if there is none; a wake is a hint only, since
// another thread may have taken the unit. Event and count change together inside the section, so
// that no waiter sleeps while a released unit is left.
#include <algorithm>
#include <cstdint>
#include <limits>

#include "source/Common/ZtUtils/General/ztSync.h"
#include "zt/fnd/osdep/Hold.h"

namespace Toolyard {
namespace {

constexpr int kNoLimit = -1;

void WaitFor(const zt::fnd::osdep::PumpEvent& event, int timeoutMs, bool pumpMsgs) {
  if (timeoutMs == kNoLimit) {
    event.wait(pumpMsgs);
  } else {
    // Widened without the sign: the event takes no more than 32 bits.
    event.wait(static_cast<unsigned long>(static_cast<uint32_t>(timeoutMs)), pumpMsgs);
  }
}

}  // namespace

// ---- CztEvent

CztEvent::CztEvent(const char* name, bool initialState, bool manualReset)
    : m_event(manualReset, initialState, true), m_name(name ? name : "") {}

CztEvent::CztEvent(bool pumpMsgs, const char* name, bool initialState, bool manualReset)
    : CztEvent(name, initialState, manualReset) {
  m_pumpMsgs = pumpMsgs;
}

bool CztEvent::Lock(int timeoutMs) {
  WaitFor(m_event, timeoutMs, m_pumpMsgs);
  return true;
}

bool CztEvent::Unlock() {
  m_event.set();
  return true;
}

// ---- CztSemaphore

CztSemaphore::CztSemaphore(const wchar_t* name, int maximum, int initial)
    : m_count(initial), m_maximum(maximum), m_event(true, false, true), m_name(name ? name : L"") {}

bool CztSemaphore::Lock(int timeoutMs) {
  // A wait of no time would come back at once, again and again, until there is a unit.
  const int eachMs = timeoutMs == 0 ? kNoLimit : timeoutMs;
  while (!take()) WaitFor(m_event, eachMs, m_pumpMsgs);
  return true;
}

bool CztSemaphore::take() const {
  zt::fnd::osdep::Hold hold(m_section);
  if (m_count <= 0) return false;
  if (--m_count == 0) m_event.reset();
  return true;
}

bool CztSemaphore::Unlock() {
  Release(1);
  return true;
}

int CztSemaphore::Release(int n) {
  zt::fnd::osdep::Hold hold(m_section);
  const int32_t before = m_count;
  const int64_t sum =
      std::max<int64_t>(static_cast<int64_t>(before) + n, std::numeric_limits<int32_t>::min());
  m_count = static_cast<int32_t>(std::min<int64_t>(sum, m_maximum));
  // With nothing left a set event would keep the waiters running in circles.
  if (m_count > 0) {
    m_event.set();
  } else {
    m_event.reset();
  }
  return before;
}

// ---- CztStatefulMutex

CztStatefulMutex::CztStatefulMutex(const zt::fnd::String& name)
    : m_mutex(name + L"-mutex"), m_event(name + L"-event", true, false) {}

bool CztStatefulMutex::Lock(int timeoutMs) { return LockAndSetState(true, timeoutMs); }

bool CztStatefulMutex::Unlock() { return UnlockAndResetState(true); }

bool CztStatefulMutex::LockAndSetState(bool setState, int wait) {
  if (wait != 0) {
    m_mutex.lock();
  } else if (!m_mutex.tryLock()) {
    return false;
  }
  zt::fnd::osdep::UnlockUnlessKept release(m_mutex);
  // Inside the lock: two holders in a row could otherwise set and reset in the wrong order.
  if (setState) m_event.set();
  release.keep();
  return true;
}

bool CztStatefulMutex::UnlockAndResetState(bool resetState) {
  zt::fnd::osdep::UnlockUnlessKept release(m_mutex);
  if (resetState) m_event.reset();
  return true;
}

}  // namespace Toolyard
