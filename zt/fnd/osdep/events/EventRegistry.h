#pragma once

#include "zt/fnd/RefCounted.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/CriticalSection.h"
#include "zt/fnd/osdep/Mutex.h"

namespace zt::fnd::osdep {

class EventData;
class SemaphoreSet;

// What the events and sets of a process need of the statics that count them: the locks, and the
// maps that they are found in.
class EventRegistry : public RefCountedThreadSafePolicy {
 public:
  // The set of this number, usable or not. For callers inside the section.
  virtual RefPtr<SemaphoreSet> getOrCreateSemaphoreSet(unsigned number) = 0;
  // Whether a set of this process has the kernel's set of this id already.
  virtual bool hasSemaphoreSetOfId(int id) const = 0;

  // Take the object out of its map, if it is there.
  virtual void removeSemaphoreSet(const SemaphoreSet& set) = 0;
  virtual void removeNamedEvent(const EventData& event) = 0;

  // Recursive. Held throughout an opening or closing; all counting of EventData and SemaphoreSet is
  // inside it. Lock order: section, an event's lock file, state-file mutex, a set's state file.
  CriticalSection section;
  Mutex stateFileMutex{String(L"zt_fnd_osdep_NamedEvent_StateFileMutex")};
};

}  // namespace zt::fnd::osdep
