// A scan of the first start makes a save for each registration file, and a sync for each would take
// longer than all the rest. The first save is synced by its contents, as most starts make no other.
// From the second one on the file on disk gets a second name (source/DurableCopy.h), and no save is
// synced until the scan ends.
#include "source/Pharlap/DatabaseSaves.h"

#include <utility>

#include "source/vlIniMgr.h"

DatabaseSaves::DatabaseSaves(const std::string& file, CvlIniMgr& database)
    : m_database(database), m_copy(file) {}

DatabaseSaves::ScanScope::ScanScope(DatabaseSaves& saves) : m_saves(saves) {
  m_saves.m_scan = Scan::NoSave;
  // Left by a scan that was killed: it covers this one's saves from the first on.
  if (m_saves.m_copy.isLeft()) m_saves.cover();
}

// From here on the second name covers the scan's saves, where it can be made.
void DatabaseSaves::cover() {
  bool covered = m_database.HoldsLock() && m_copy.begin();
  m_scan = covered ? Scan::Covered : Scan::Synced;
  m_database.SetDurability(covered ? IniDurability::None : IniDurability::ContentOnly);
}

bool DatabaseSaves::prepare() {
  switch (m_scan) {
    case Scan::NotUnderWay:
      // A scan's end that failed, or another process's scan that was killed while this one had lost
      // the lock.
      if (m_copy.isLeft()) m_copy.begin();
      return m_copy.finish();
    case Scan::NoSave:
      m_scan = Scan::First;
      m_database.SetDurability(IniDurability::ContentOnly);
      return true;
    case Scan::First:
      cover();
      return true;
    case Scan::Covered:
    case Scan::Synced:
      break;
  }
  return true;
}

void DatabaseSaves::finishScan() {
  Scan saves = std::exchange(m_scan, Scan::NotUnderWay);
  // Before the second name goes: a client's save, which may come next, is on its own again.
  m_database.SetDurability(IniDurability::Synced);
  if (saves == Scan::Covered) finishCopy();
  if (saves == Scan::First || saves == Scan::Synced) m_copy.syncDirectory();
}

// Without the lock - in a child that was forked in the scan, or after the lock file was removed -
// the second name may cover another process's saves by now.
void DatabaseSaves::finishCopy() {
  if (m_database.HoldsLock()) {
    m_copy.finish();
  } else {
    m_copy.leave();
  }
}
