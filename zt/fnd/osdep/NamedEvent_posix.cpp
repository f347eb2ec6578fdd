// The operations of an open event are one system call each, on one semaphore of a System V set
// (semop(2)); how an event gets its semaphore, and gives it back, is in events/. The kernel does
// the waiting, between processes as between threads, so that no lock of this library is held while
// a caller waits.
#include <sys/ipc.h>
#include <sys/sem.h>

#include <cerrno>

#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/NamedEvent.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/Sleep.h"
#include "zt/fnd/osdep/events/EventData.h"
#include "zt/fnd/osdep/events/NamedEventGlobalStatics.h"
#include "zt/posix/Retry.h"

using zt::posix::RetryEintr;

namespace zt::fnd::osdep {
namespace {

constexpr unsigned int kNoLimit = 0xFFFFFFFFu;
// semop has no timed form by POSIX, and a SIGALRM would belong to the host.
constexpr unsigned int kPollMs = 50;

}  // namespace

NamedEvent::NamedEvent(const String& name, bool manualReset, bool initialState)
    : m_data(NamedEventGlobalStatics::Get()
                 ->getOrCreateNamedEvent(name, manualReset, initialState)
                 .detach()) {}

NamedEvent::~NamedEvent() { NamedEventGlobalStatics::Release(*m_data); }

// An assignment and not an addition: two sets with no waiter between them release one waiter.
void NamedEvent::assign(bool signaled) const {
  int value = signaled ? m_data->signaledValue() : m_data->clearValue();
  if (!m_data->set().setValue(m_data->slot(), value)) ZT_RAISE(PosixError());
}

void NamedEvent::set() const { assign(true); }

void NamedEvent::reset() const { assign(false); }

void NamedEvent::resetIfAuto() {
  if (!m_data->manualReset()) reset();
}

// Waits for zero or decrements. Never undone at the end of the process: a signal taken is taken.
int NamedEvent::operate(short flags) const {
  sembuf operation;
  operation.sem_num = static_cast<unsigned short>(m_data->slot());
  operation.sem_op = m_data->manualReset() ? 0 : -1;
  operation.sem_flg = flags;
  // EIDRM, the answer to a set that was removed, is how a waiter learns of it.
  return RetryEintr([&] { return ::semop(m_data->set().id(), &operation, 1); });
}

void NamedEvent::wait() const {
  if (operate(0) != 0) ZT_RAISE(PosixError());
}

bool NamedEvent::check() const {
  if (operate(IPC_NOWAIT) == 0) return true;
  if (errno != EAGAIN) ZT_RAISE(PosixError());
  return false;
}

bool NamedEvent::checkOnly() const {
  int value = RetryEintr(
      [&] { return ::semctl(m_data->set().id(), static_cast<int>(m_data->slot()), GETVAL); });
  if (value == -1) ZT_RAISE(PosixError());
  return m_data->manualReset() ? value == 0 : value > 0;
}

bool NamedEvent::wait(unsigned int ms) const {
  if (ms == 0) return check();
  if (ms == kNoLimit) {
    wait();
    return true;
  }
  for (;; ms -= kPollMs) {
    if (check()) return true;
    // The last and shortest turn: its sleep ends with the time.
    if (ms < kPollMs) {
      Sleep(ms);
      return check();
    }
    Sleep(kPollMs);
  }
}

}  // namespace zt::fnd::osdep
