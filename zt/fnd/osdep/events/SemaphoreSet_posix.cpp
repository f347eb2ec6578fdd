// A set is made by whoever has its state file alone: the bytes of an empty set are written, the
// kernel's set is made or found by the file's key, and the ready flag is set last. So a file
// without the flag is one whose maker died, and is made again. The last user to close clears the
// flag, removes the kernel's set and then the file, in this order, for the same reason.
//
// Removing is by IPC_RMID, which wakes every waiter of the set with EIDRM: a process that still
// waits there has an event whose files are gone, and must not wait indefinitely.
#include "zt/fnd/osdep/events/SemaphoreSet.h"

#include <sys/ipc.h>
#include <sys/sem.h>

#include <cerrno>
#include <cstring>
#include <string>
#include <utility>

#include "zt/fnd/ByteOrder.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/posix/Retry.h"

using zt::posix::RetryEintr;

namespace zt::fnd::osdep {
namespace {

constexpr int kSetMode = 0777;

// semctl(2) leaves the definition to its callers.
union SemctlArgument {
  int value;
  semid_ds* info;
  unsigned short* values;
};

int Semget(key_t key, unsigned count, int flags) {
  return RetryEintr([&] { return ::semget(key, static_cast<int>(count), flags | kSetMode); });
}

void RemoveSet(int id) {
  RetryEintr([&] { return ::semctl(id, 0, IPC_RMID); });
}

}  // namespace

SemaphoreSet::SemaphoreSet(EventRegistry& statics, unsigned number)
    : RefCountedCriticalSectionPolicy(&statics.section),
      m_statics(&statics),
      m_number(number),
      m_process(ProcessMark::Current()) {
  open();
}

// ---- opening

void SemaphoreSet::open() {
  const String name(("sem_" + std::to_string(m_number)).c_str());
  try {
    EventFile file = EventFile::Open(name);
    m_state = State::Unusable;
    if (file.exclusive() ? build(file) : join(file)) {
      m_file = std::move(file);
      m_file.settle();
      m_state = State::Usable;
      return;
    }
    // A set of the kernel outlives its maker. One that was found stays: it may be another's.
    if (m_made) RemoveSet(m_id);
  } catch (const PosixError& e) {  // Callers skip a set that is not available.
    if (e.whatcode() == EWOULDBLOCK) {
      m_state = State::Busy;
    } else if (m_state == State::Missing && EventFile::Exists(name)) {
      m_state = State::Closed;
    }
  } catch (const std::exception&) {  // The same.
  }
  m_id = -1;
}

// Makes file and set from nothing. The ready flag comes last and by itself.
bool SemaphoreSet::build(EventFile& file) {
  const StateFileBytes bytes = EncodeEmptySet();
  if (!file.write(bytes.data(), bytes.size(), 0)) return false;
  if (!makeSet(file)) return false;
  const unsigned char ready = 1;
  return file.write(&ready, 1, SetHeader::kReadyOffset) && file.share();
}

// A set of that key is one of an earlier life. Its values do not matter, as each event sets its own
// when it is opened.
bool SemaphoreSet::makeSet(EventFile& file) {
  int id = Semget(file.key(), kSlotsPerSet, IPC_CREAT | IPC_EXCL);
  m_made = id != -1;
  if (id == -1 && errno == EEXIST) {
    // If the set cannot be taken, the file has to keep the inode that led to it, or the next number
    // would get the inode, and the same set.
    file.discardAtClose(false);
    id = Semget(file.key(), kSlotsPerSet, 0);
  }
  return adopt(id);
}

bool SemaphoreSet::join(const EventFile& file) {
  SetHeader::Bytes bytes;
  SetHeader header;
  if (!file.read(bytes.data(), bytes.size(), 0) || !header.decode(bytes) || !header.ready) {
    return false;
  }
  return adopt(Semget(file.key(), header.count, 0));
}

// Keys are made of a few bits of the file's inode, so two files can come to one set. It stays with
// the object that has it.
bool SemaphoreSet::adopt(int id) {
  m_id = id;
  return id != -1 && !m_statics->hasSemaphoreSetOfId(id);
}

// ---- the state file

bool SemaphoreSet::readHeader(bool& ready, unsigned& count, unsigned& freeCount,
                              unsigned& firstFree) const {
  SetHeader::Bytes bytes;
  SetHeader header;
  bool good = m_file.read(bytes.data(), bytes.size(), 0) && header.decode(bytes);
  ready = header.ready;
  count = header.count;
  freeCount = header.freeCount;
  firstFree = header.firstFree;
  return good;
}

bool SemaphoreSet::readSlot(unsigned slot, SlotRecord& record) const {
  bool ready;
  unsigned count, freeCount, firstFree;
  if (!readHeader(ready, count, freeCount, firstFree)) return false;
  // Two limits: the count is what the file says, and any user can write there.
  if (slot >= count || slot >= kSlotsPerSet) return false;
  SlotRecord::Bytes bytes;
  if (!m_file.read(bytes.data(), bytes.size(), SlotRecord::Offset(slot))) return false;
  record = SlotRecord::Decode(bytes);
  return true;
}

// Reads and writes the span from the free count to the record as a whole.
bool SemaphoreSet::updateFreeRecords(int delta, unsigned newFirst, unsigned& oldFirst,
                                     unsigned slot, const SlotRecord* record) {
  constexpr size_t kBase = SetHeader::kFreeOffset;
  StateFileBytes span;
  size_t size = SetHeader::kSize - kBase;
  if (record) {
    if (slot >= kSlotsPerSet) return false;
    size = static_cast<size_t>(SlotRecord::Offset(slot + 1)) - kBase;
  }
  if (!m_file.read(span.data(), size, kBase)) return false;
  const auto freeCount = little_endian::Get<uint32_t>(&span[0]) + static_cast<uint32_t>(delta);
  little_endian::Put(&span[0], freeCount);
  oldFirst = little_endian::Get<uint32_t>(&span[4]);
  little_endian::Put(&span[4], newFirst);
  if (record) {
    const SlotRecord::Bytes bytes = record->encode();
    memcpy(&span[size - bytes.size()], bytes.data(), bytes.size());
  }
  return m_file.write(span.data(), size, kBase);
}

SemaphoreSet::Room SemaphoreSet::firstFree(unsigned& slot) const {
  bool ready;
  unsigned count, freeCount;
  if (!readHeader(ready, count, freeCount, slot) || !ready) return Room::Damaged;
  if (freeCount == 0) return Room::None;
  SlotRecord record;
  if (!readSlot(slot, record) || record.inUse) return Room::Damaged;
  return Room::Some;
}

bool SemaphoreSet::take(unsigned slot, bool manualReset, key_t key) {
  SlotRecord record;
  if (!readSlot(slot, record)) return false;
  // Not checked here: a wrong successor is found by firstFree() when it is to be taken.
  const unsigned next = static_cast<unsigned>(record.keyOrNext);
  record = SlotRecord{true, manualReset, key};
  unsigned oldFirst;
  return updateFreeRecords(-1, next, oldFirst, slot, &record);
}

void SemaphoreSet::giveBack(unsigned slot, key_t key) {
  SlotRecord record;
  if (!readSlot(slot, record) || !record.inUse || record.keyOrNext != key) return;
  bool ready;
  unsigned count, freeCount, first;
  if (!readHeader(ready, count, freeCount, first)) return;
  record = SlotRecord{false, false, static_cast<int32_t>(first)};
  updateFreeRecords(+1, slot, first, slot, &record);
}

bool SemaphoreSet::setValue(unsigned slot, int value) const {
  SemctlArgument argument = {value};
  return RetryEintr([&] { return ::semctl(m_id, static_cast<int>(slot), SETVAL, argument); }) != -1;
}

// ---- closing

SemaphoreSet::~SemaphoreSet() {
  if (!m_process.isCurrent()) {
    // The statics of the parent are out of bounds, and only its descriptor is this process's own.
    m_statics.detach();
    return;
  }
  close();
  m_statics->removeSemaphoreSet(*this);
}

void SemaphoreSet::close() {
  if (!usable()) return;
  try {
    Hold hold(m_statics->stateFileMutex);
    if (m_file.claim()) {
      const unsigned char notReady = 0;
      m_file.write(&notReady, 1, SetHeader::kReadyOffset);
      // The file of a set that belongs to another user stays, for the next to take the set over.
      if (RetryEintr([&] { return ::semctl(m_id, 0, IPC_RMID); }) != -1) m_file.unlink();
    }
    m_file.close();
  } catch (
      const std::exception&) {  // Without the mutex everything stays as a killed process leaves it.
    m_file.close();
  }
}

}  // namespace zt::fnd::osdep
