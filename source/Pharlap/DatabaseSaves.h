#pragma once

#include <string>

#include "source/DurableCopy.h"

class CvlIniMgr;

// How durable each save of the registration database is.
//
//   a save                          is on disk
//   outside a scan                  when it returns
//   the first one of a scan         its contents, before the file takes its name: most starts make
//                                   no other
//   each further one of a scan      with the end of the scan: until then the second name of the
//                                   database (source/DurableCopy.h) holds what was on disk before
//   the same, where a second name   its contents, before the file takes its name; the name with the
//   cannot be made                  end of the scan
//
// The database's lock is held while the object lives, or has been lost: then the second name, which
// may cover another process's saves by now, is left alone. Threads: one at a time.
class DatabaseSaves {
 public:
  // The database stays open as long as the object lives.
  DatabaseSaves(const std::string& file, CvlIniMgr& database);
  ~DatabaseSaves() { finishCopy(); }
  DatabaseSaves(const DatabaseSaves&) = delete;
  DatabaseSaves& operator=(const DatabaseSaves&) = delete;

  // To be called before each save. False if it must not be made: the second name cannot be removed,
  // and a later opening would take it up over that save.
  bool prepare();

  // A scan, for a scope. Its saves are on disk at its end, however it ends; what fails then is met
  // again by the next save.
  class ScanScope {
   public:
    explicit ScanScope(DatabaseSaves& saves);
    ~ScanScope() { m_saves.finishScan(); }
    ScanScope(const ScanScope&) = delete;
    ScanScope& operator=(const ScanScope&) = delete;

   private:
    DatabaseSaves& m_saves;
  };

 private:
  // The saves of the scan: none, the first, those that the second name covers, or that it cannot.
  enum class Scan { NotUnderWay, NoSave, First, Covered, Synced };

  void cover();
  void finishScan();
  void finishCopy();

  CvlIniMgr& m_database;
  DurableCopy m_copy;
  Scan m_scan = Scan::NotUnderWay;
};
