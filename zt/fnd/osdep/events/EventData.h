#pragma once

#include "zt/fnd/RefCounted.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/ProcessMark.h"
#include "zt/fnd/osdep/events/EventFile.h"
#include "zt/fnd/osdep/events/EventRegistry.h"
#include "zt/fnd/osdep/events/SemaphoreSet.h"

namespace zt::fnd::osdep {

// One open event; one object a name in a process.
//
// A slot in a semaphore set, which the event's lock file names. Where no other process has the
// event, the slot that a dead process left is taken over, if the set has outlived that process too
// and the kind of reset is the same; otherwise the first free slot of the lowest set is taken. The
// last one to close gives the slot back and removes the lock file. Destruction throws nothing.
class EventData : public RefCountedCriticalSectionPolicy {
 public:
  EventData(EventRegistry& statics, const String& name, bool manualReset);
  ~EventData() override;

  // Opens or joins. False if the event is being closed by others: nothing is held then, and the
  // caller has to begin again. `initialState` counts only where no other process has it. Throws as
  // getOrCreateNamedEvent; nothing is held then, and a file that this call has made is gone.
  bool open(bool initialState);

  bool isOfThisProcess() const { return m_process.isCurrent(); }

  // release(), with the section kept until it is over.
  void releaseInSection();

  const String& name() const { return m_name; }
  bool manualReset() const { return m_manualReset; }
  // The semaphore; for an event that is open.
  const SemaphoreSet& set() const { return *m_set; }
  unsigned slot() const { return m_slot; }

  // Values of the semaphore. The waiters of a manual event wait for zero, which lets all of them
  // pass and changes nothing; those of an automatic one decrement, which lets one of them pass.
  int signaledValue() const { return m_manualReset ? 0 : 1; }
  int clearValue() const { return m_manualReset ? 1 : 0; }

 private:
  class Undo;
  void openAlone(EventFile& file, bool initialState);
  bool takeOver(const EventFile& file, RefPtr<SemaphoreSet>& seen);
  void allocate(const EventFile& file);
  bool allocateIn(SemaphoreSet& set, unsigned slot, const EventFile& file);
  bool join(const EventFile& file);
  void close();

  RefPtr<EventRegistry> m_statics;
  const ProcessMark m_process;
  const String m_name;
  const bool m_manualReset;
  EventFile m_file;
  RefPtr<SemaphoreSet> m_set;
  unsigned m_slot = 0;
};

}  // namespace zt::fnd::osdep
