// How an event gets its semaphore. The lock file of the event's name says which: set number and
// slot. Whoever finds itself alone with that file (exclusive) decides: it takes over the slot of a
// dead process where all records still agree, or takes a free one. Everyone else joins what the
// file says. The state-file mutex is held meanwhile, as the free lists of the sets are shared by
// all events.
//
// The order of writes is what makes a kill harmless: the lock file, then the slot's record, then
// the semaphore's value, then the shared lock. A process that dies in between leaves a file that
// names a slot of another key, or a slot that the next opener of the name takes over.
#include <sys/stat.h>

#include <cerrno>
#include <string>
#include <utility>

#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/events/EventData.h"

namespace zt::fnd::osdep {
namespace {

// Counts the sets without a slot, up to the number after which the search ends.
//
// Some take long to find out, and count for more: a file that cannot be made 2 ms, one that another
// process keeps locked half a second. Any user may put what cannot be opened under the names of
// state files, though, so that some thousands of those count nothing.
class Search {
 public:
  // False at the end of the search.
  bool goesOnAfter(const SemaphoreSet& set, SemaphoreSet::Room room) {
    // A full set is a sign of life: the free one may be the next.
    if (room == SemaphoreSet::Room::None) {
      m_unusable = 0;
    } else if (set.state() != SemaphoreSet::State::Closed || ++m_closed > kClosedSets) {
      m_unusable += Weight(set.state());
    }
    return m_unusable < kUnusableSets;
  }

 private:
  static constexpr unsigned kUnusableSets = 1024;  // in a row
  static constexpr unsigned kClosedSets = 4096;    // in all

  static unsigned Weight(SemaphoreSet::State state) {
    switch (state) {
      case SemaphoreSet::State::Busy:
        return 128;
      case SemaphoreSet::State::Closed:
      case SemaphoreSet::State::Missing:
        return 4;
      default:
        return 1;
    }
  }

  unsigned m_unusable = 0, m_closed = 0;
};

// A set of this number belongs to a program that keeps its events elsewhere.
bool IsReserved(unsigned number) {
  std::string marker = "/tmp/zentrex/zt_fnd_osdep_NamedEvent_sem_" + std::to_string(number);
  struct stat info;
  return ::stat(marker.c_str(), &info) == 0;
}

bool ReadPlace(const EventFile& file, EventPlace& place) {
  EventPlace::Bytes bytes;
  if (!file.read(bytes.data(), bytes.size(), 0)) return false;
  place = EventPlace::Decode(bytes);
  return true;
}

}  // namespace

EventData::EventData(EventRegistry& statics, const String& name, bool manualReset)
    : RefCountedCriticalSectionPolicy(&statics.section),
      m_statics(&statics),
      m_process(ProcessMark::Current()),
      m_name(name),
      m_manualReset(manualReset) {}

// ---- opening

// Takes back the slot of an opening that fails; the lock file, which leads nowhere then, goes too.
class EventData::Undo {
 public:
  Undo(EventData& event, EventFile& file) : m_event(&event), m_file(file) {}
  ~Undo() {
    if (!m_event || !m_event->m_set) return;
    m_event->m_set->giveBack(m_event->m_slot, m_file.key());
    m_event->m_set = nullptr;
    m_file.discardAtClose(true);
  }
  Undo(const Undo&) = delete;
  Undo& operator=(const Undo&) = delete;
  void dismiss() { m_event = nullptr; }

 private:
  EventData* m_event;
  EventFile& m_file;
};

bool EventData::open(bool initialState) {
  EventFile file = EventFile::Open(m_name);
  {
    Hold hold(m_statics->stateFileMutex);
    if (file.exclusive()) {
      openAlone(file, initialState);
    } else if (!join(file)) {
      return false;
    }
  }
  m_file = std::move(file);
  m_file.settle();
  return true;
}

void EventData::openAlone(EventFile& file, bool initialState) {
  RefPtr<SemaphoreSet> seen;  // kept until the end, as the slot may come from it after all
  Undo undo(*this, file);
  if (!takeOver(file, seen)) allocate(file);
  if (!m_set->setValue(m_slot, initialState ? signaledValue() : clearValue())) {
    ZT_RAISE(PosixError());
  }
  if (!file.share()) ZT_RAISE(PosixError());
  undo.dismiss();
}

// Takes the slot that the lock file names if it still is this event's.
bool EventData::takeOver(const EventFile& file, RefPtr<SemaphoreSet>& seen) {
  EventPlace place;
  if (!ReadPlace(file, place)) return false;
  seen = m_statics->getOrCreateSemaphoreSet(place.set);
  SlotRecord record;
  if (!seen->usable() || !seen->readSlot(place.slot, record)) return false;
  // Each field is another way in which the slot can have passed to an event of another name.
  if (!record.inUse || record.manualReset != m_manualReset || record.keyOrNext != file.key()) {
    return false;
  }
  m_set = seen;
  m_slot = place.slot;
  return true;
}

void EventData::allocate(const EventFile& file) {
  Search search;
  for (unsigned number = 1;; ++number) {
    if (IsReserved(number)) continue;
    RefPtr<SemaphoreSet> set = m_statics->getOrCreateSemaphoreSet(number);
    unsigned slot = 0;
    SemaphoreSet::Room room = set->usable() ? set->firstFree(slot) : SemaphoreSet::Room::Damaged;
    if (room == SemaphoreSet::Room::Some && allocateIn(*set, slot, file)) return;
    if (!search.goesOnAfter(*set, room)) ZT_RAISE(PosixError(ENOLCK));
  }
}

// The lock file first: one that names another event's slot is recognised, while a used slot
// that no lock file names would be lost.
bool EventData::allocateIn(SemaphoreSet& set, unsigned slot, const EventFile& file) {
  const EventPlace::Bytes bytes = EventPlace{set.number(), slot}.encode();
  if (!file.write(bytes.data(), bytes.size(), 0)) ZT_RAISE(PosixError(ENOLCK));
  // A failed transfer: the search goes on with the next set, and the lock file is written again for
  // it.
  if (!set.take(slot, m_manualReset, file.key())) return false;
  m_set = RefPtr<SemaphoreSet>(&set);
  m_slot = slot;
  return true;
}

// Attaches to an event that others have. False if what the files say is not this event's: then it
// is being closed, or a process has died with it. The wrong kind of reset is final.
bool EventData::join(const EventFile& file) {
  EventPlace place;
  if (!ReadPlace(file, place)) return false;
  RefPtr<SemaphoreSet> set = m_statics->getOrCreateSemaphoreSet(place.set);
  SlotRecord record;
  if (!set->usable() || !set->readSlot(place.slot, record)) return false;
  if (!record.inUse || record.keyOrNext != file.key()) return false;
  // Not a closing event: waiting for it would not help.
  if (record.manualReset != m_manualReset) ZT_RAISE(PosixError(ENOLCK));
  m_set = set;
  m_slot = place.slot;
  return true;
}

// ---- closing

void EventData::releaseInSection() {
  RefPtr<EventRegistry> hold(m_statics);  // the section has to outlive the release
  release();
}

EventData::~EventData() {
  if (!m_process.isCurrent()) {
    // The statics of the parent are out of bounds; what is this process's own is the descriptors.
    m_statics.detach();
    if (SemaphoreSet* set = m_set.detach()) set->RefCountedThreadUnsafePolicy::release();
    return;
  }
  if (!m_file.valid()) return;
  close();
  m_statics->removeNamedEvent(*this);
}

void EventData::close() {
  // Whoever gets the file alone is the last one. A failed attempt gives up the shared lock too, so
  // that of two that close at once the later one succeeds.
  if (m_file.claim()) {
    try {
      Hold hold(m_statics->stateFileMutex);
      m_set->giveBack(m_slot, m_file.key());
      m_file.unlink();
    } catch (const std::exception&) {  // Everything stays as a killed process leaves it.
    }
  }
  m_file.close();
}

}  // namespace zt::fnd::osdep
