#pragma once

#include <map>

#include "zt/fnd/String.h"
#include "zt/fnd/osdep/ProcessMark.h"
#include "zt/fnd/osdep/SharedObjectName.h"
#include "zt/fnd/osdep/events/EventData.h"
#include "zt/fnd/osdep/events/EventRegistry.h"
#include "zt/fnd/osdep/events/SemaphoreSet.h"

namespace zt::fnd::osdep {

// The named events of this process.
//
// A forked child starts with fresh ones: the inherited ones, which a thread may have been changing
// at the fork, are never touched again.
class NamedEventGlobalStatics : public EventRegistry {
 public:
  // The statics of the calling process, made where there are none. Throws what Mutex throws.
  static RefPtr<NamedEventGlobalStatics> Get();

  NamedEventGlobalStatics();

  RefPtr<SemaphoreSet> getOrCreateSemaphoreSet(unsigned number) override;
  bool hasSemaphoreSetOfId(int id) const override;
  void removeSemaphoreSet(const SemaphoreSet& set) override;
  void removeNamedEvent(const EventData& event) override;

  // The event of this name, opened or joined. Throws PosixError: EINVAL if this process has it with
  // the other kind of reset, ENOLCK if another has, or if no semaphore is available; and what
  // opening the files and locking the mutex throws.
  RefPtr<EventData> getOrCreateNamedEvent(const String& name, bool manualReset, bool initialState);

  // Takes one reference away, in a forked child too, where the parent's event stays as it is and
  // its section cannot be entered.
  static void Release(EventData& event);

  const ProcessMark process;
  NamedEventGlobalStatics* inherited = nullptr;  // list of those that this process may not use

 private:
  RefPtr<EventData> openOrFind(const String& name, bool manualReset, bool initialState);

  std::map<unsigned, SemaphoreSet*> m_sets GUARDED_BY(section);
  std::map<String, EventData*, SharedObjectNameLess> m_events GUARDED_BY(section);
};

}  // namespace zt::fnd::osdep
