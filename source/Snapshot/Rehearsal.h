#pragma once

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "source/Database/Scan.h"
#include "source/Database/recordText.h"
#include "source/Database/registrationFiles.h"
#include "source/Database/resourceTexts.h"
#include "source/IniDocument.h"
#include "source/Snapshot/snapshot.hpp"

class CvltBindingClasses;

namespace vlt::snapshot {

// Where an installation is, and where it was when its database was written. Both end in a slash.
struct Place {
  std::string here, recorded;

  // The path of the database's world for one of this machine, and back.
  std::string toRecorded(const std::string& path) const { return exchange(path, here, recorded); }
  std::string toHere(const std::string& path) const { return exchange(path, recorded, here); }

 private:
  static std::string exchange(const std::string& path, const std::string& from,
                              const std::string& to);
};

// The scan of a rehearsal: files are where the installation is now.
class PlacedScan : public registrar::Scan {
 public:
  PlacedScan(IniDocument& database, const Place& place) : Scan(database), m_place(place) {}

 private:
  bool isThere(const std::string& file) const override;

  const Place& m_place;
};

// What a registrar does when it starts, on a copy of its database in memory. The steps are those of
// CvltPharlapRegistrar::Init, in its order. Throws std::bad_alloc, and zt::fnd::osdep::PosixError
// where the system cannot say now whether a file is there. Threads: one.
class Rehearsal {
 public:
  // The bytes of the database. Those that cannot be parsed are an empty one.
  Rehearsal(const std::string& bytes, const Place& place);
  ~Rehearsal();

  bool isParsable() const { return m_isParsable; }
  IniDocument& document() { return m_document; }
  // The bytes of the database on disk, and how often they were saved.
  const std::string& onDisk() const { return m_onDisk; }
  unsigned saves() const { return m_saves; }

  // The settings and the dictionary that every start writes.
  void beginStart();
  // Compares the files with the database.
  FileState stateOf(const std::string& file, const zt::fnd::AbsTime& time);
  // Merges a file that is new or changed. One that cannot be read is skipped, and stays as it is.
  enum class Merge { Merged, SetAside, Skipped };
  Merge merge(const std::string& file, const zt::fnd::AbsTime& time);
  // Drops the components whose registration file is gone; those files, once each, in `vanished`.
  void removeVanished(std::vector<std::string>* vanished);
  // Reads all that is listed.
  void readComponents(std::vector<Component>* components, std::vector<Binding>* bindings);

 private:
  void save();
  void set(const char* key, const std::string& value, bool quote);
  bool completeFileName(const std::string& section, registrar::RecordText* record);
  void bind(const GUID& component, Type type, const std::string& file,
            std::vector<Binding>* bindings);
  std::string textOfClasses(const std::string& file);
  registrar::ResourceTexts& textsBeside(const std::string& file);

  const Place m_place;
  IniDocument m_document;
  bool m_isParsable;
  PlacedScan m_scan;
  std::string m_onDisk;
  unsigned m_saves = 0;
  // By directory, until the next save.
  std::map<std::string, std::unique_ptr<registrar::ResourceTexts>> m_texts;
  std::map<std::string, std::unique_ptr<CvltBindingClasses>> m_classesByFile;
};

// What a section that is listed says. `place` for the path of its registration file.
Component Describe(const IniDocument& document, const Place& place, const std::string& section,
                   const registrar::RecordText& record);

// UTF-8 of a text of the database.
std::string Utf8(const std::string& text);
std::string GuidText(const GUID& guid);

}  // namespace vlt::snapshot
