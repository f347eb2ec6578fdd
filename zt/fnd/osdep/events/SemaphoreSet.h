#pragma once

#include <sys/types.h>

#include "zt/fnd/RefCounted.h"
#include "zt/fnd/osdep/events/EventFile.h"
#include "zt/fnd/osdep/events/EventRegistry.h"
#include "zt/fnd/osdep/events/EventStateFile.h"

namespace zt::fnd::osdep {

// One System V semaphore set of 128, with its state file "sem_" + number; one object a number in a
// process. The set and its file go with the last object of all processes.
//
// Construction never fails: an object without a set is unusable, and callers go on to the next
// number. Whoever has the state file alone makes it again, whatever is in it; others join it.
//
// Every operation on the file needs the state-file mutex. A change is one transfer, so that a
// process killed at any moment leaves a file from before it or after it. What the file says is
// checked before it is used: any user can write there. Destruction throws nothing; what it cannot
// take away stays for the next one who has the file alone.
class SemaphoreSet : public RefCountedCriticalSectionPolicy {
 public:
  SemaphoreSet(EventRegistry& statics, unsigned number);
  ~SemaphoreSet() override;

  unsigned number() const { return m_number; }
  // Unusable: the file was locked, but there is no set. Busy: another process had it alone all the
  // time. Closed: what has the file's name cannot be opened. Missing: no file could be made.
  enum class State { Usable, Unusable, Busy, Closed, Missing };
  State state() const { return m_state; }
  bool usable() const { return m_file.valid(); }
  int id() const { return m_id; }

  // False, with all outputs 0 or false, on a short read or a wrong magic. Does not ask for ready.
  bool readHeader(bool& ready, unsigned& count, unsigned& freeCount, unsigned& firstFree) const;

  // Record of a slot below the header's count, and below 128, which no file of this kind exceeds;
  // false if it cannot be read.
  bool readSlot(unsigned slot, SlotRecord& record) const;

  // Adds `delta` to the free count, returns the first free slot and stores `newFirst` in its
  // place; with `record`, in the same transfer, the new record of `slot`. False if a transfer
  // failed.
  bool updateFreeRecords(int delta, unsigned newFirst, unsigned& oldFirst, unsigned slot = 0,
                         const SlotRecord* record = nullptr);

  enum class Room { Some, None, Damaged };
  // The slot that take() would return. Damaged: the free list cannot be trusted.
  Room firstFree(unsigned& slot) const;

  // Takes the first free slot, as firstFree() returned it, for the event whose lock file has this
  // key.
  bool take(unsigned slot, bool manualReset, key_t key);

  // Puts a slot back, unless it is not this event's.
  void giveBack(unsigned slot, key_t key);

  // Gives a semaphore its value. False with errno.
  bool setValue(unsigned slot, int value) const;

 private:
  void open();
  bool build(EventFile& file);
  bool makeSet(EventFile& file);
  bool join(const EventFile& file);
  bool adopt(int id);
  void close();

  // Holds the process's statics, and with them the section in which objects are counted.
  RefPtr<EventRegistry> m_statics;
  const unsigned m_number;
  const ProcessMark m_process;
  EventFile m_file;
  int m_id = -1;
  bool m_made = false;  // this object made the set
  State m_state = State::Missing;
};

}  // namespace zt::fnd::osdep
