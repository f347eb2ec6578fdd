#pragma once

#include <map>

#include "zt/fnd/RefCounted.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/CriticalSection.h"
#include "zt/fnd/osdep/EventData.h"
#include "zt/fnd/osdep/Mutex.h"
#include "zt/fnd/osdep/ProcessMark.h"
#include "zt/fnd/osdep/SemaphoreSet.h"
#include "zt/fnd/osdep/SharedObjectName.h"

namespace zt {
namespace fnd {
namespace osdep {

// The named events of this process.
//
// A forked child starts with fresh ones: the inherited ones, which a thread may have been changing
// at the fork, are never touched again.
// Lock order: section, an event's lock file, state-file mutex, a set's state file. The section is
// held throughout an opening or closing, and all counting of EventData and SemaphoreSet is inside it.
class NamedEventGlobalStatics : public RefCountedThreadSafePolicy {
 public:
  // The statics of the calling process, made where there are none. Throws what Mutex throws.
  static RefPtr<NamedEventGlobalStatics> Get();

  NamedEventGlobalStatics();

  // The set of this number, usable or not. For callers inside the section.
  RefPtr<SemaphoreSet> getOrCreateSemaphoreSet(unsigned number);

  // The event of this name, opened or joined. Throws PosixError: EINVAL if this process has it with
  // the other kind of reset, ENOLCK if another has, or if no semaphore can be had; and what opening
  // the files and locking the mutex throws.
  RefPtr<EventData> getOrCreateNamedEvent(const String& name, bool manualReset, bool initialState);

  // Take the object out of the map, if it is there.
  void removeSemaphoreSet(const SemaphoreSet& set);
  void removeNamedEvent(const EventData& event);

  bool hasSemaphoreSetOfId(int id) const;

  // Counts an event down that came through fork(), whose own section cannot be entered.
  static void ReleaseInherited(const EventData& event);

  const ProcessMark process;
  NamedEventGlobalStatics* inherited = nullptr;  // list of those that this process may not use
  CriticalSection section;                       // recursive
  Mutex stateFileMutex;

 private:
  RefPtr<EventData> openOrFind(const String& name, bool manualReset, bool initialState);

  std::map<unsigned, SemaphoreSet*> m_sets GUARDED_BY(section);
  std::map<String, EventData*, SharedObjectNameLess> m_events GUARDED_BY(section);
};

}  // namespace osdep
}  // namespace fnd
}  // namespace zt
