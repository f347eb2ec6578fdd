#pragma once

#include "zt/fnd/StringFwd.h"

namespace zt::fnd::osdep {

class EventData;

// Event known by name to every process of the machine.
//
//              set         reset   resetIfAuto     check, wait            checkOnly
//   signaled   signaled    clear   clear if auto   true; auto clears      true
//   clear      signaled    clear   clear           false; wait waits      false
//
// A set releases all waiters of a manual-reset event, which stays signaled until it is reset, and
// one waiter of an automatic one. Sets do not add up. The state is one semaphore of the kernel and
// nothing else: a signal sent before a waiter comes is kept, and a waiter may die at any moment.
//
// The event lives as long as some process has it open; the last one to close removes it, with its
// file in "namedEvent/" of the shared directory (docs/event-files.md). A process that dies leaves
// its events for the next opener of the name. Objects of one name in one process share one event;
// names that differ in case only are one in a process, while the file system decides between
// processes. A forked child may go on using the parent's objects until the parent closes them, and
// beyond a parent that was killed; its destroying them takes nothing from the parent.
//
// Threads: any may use any object; only construction and destruction take a lock. A failed system
// call throws PosixError, which is also how a waiter learns that the event's semaphores were
// removed.
class NamedEvent {
 public:
  // Opens or joins the event; `initialState` counts only where no process has it. Waits up to half
  // a second for a process that has its file alone, tries again for up to two seconds where it is
  // closed while it is joined, and waits for the mutex of the state files. Throws PosixError:
  // EINVAL if this process has the event with the other kind of reset, ENOLCK if another process
  // has, if it cannot be joined, or if no semaphore is available; and what CreateSharedUnixFile and
  // Mutex::lock throw.
  NamedEvent(const String& name, bool manualReset, bool initialState);
  ~NamedEvent();
  NamedEvent(const NamedEvent&) = delete;
  NamedEvent& operator=(const NamedEvent&) = delete;

  void set() const;
  void reset() const;
  void resetIfAuto();

  // Blocks until the event is signaled.
  void wait() const;

  // True if the event was signaled in time. 0 is check(); 0xFFFFFFFF waits without limit. Any other
  // wait looks every 50 ms, so that it sees a signal up to 50 ms late, and can miss one that is
  // reset in between.
  bool wait(unsigned int ms) const;

  // True if signaled; an automatic event is clear then. Never blocks.
  bool check() const;

  // True if signaled; changes nothing.
  bool checkOnly() const;

 private:
  void assign(bool signaled) const;
  int operate(short flags) const;

  EventData* m_data;
};

}  // namespace zt::fnd::osdep
