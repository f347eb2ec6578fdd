#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "source/Database/contentsWalk.h"
#include "zt/fnd/AbsTime.h"
#include "zt/fnd/String.h"

class IniDocument;

namespace registrar {

// The files that a scan has met. They are asked for again in nearly the same order, so that the next
// one in line is mostly the right one; the others are found by a hash.
class FilesSeen {
 public:
  void add(const std::string& file) {
    m_files.push_back(file);
    m_places.clear();
  }
  bool has(std::string_view file);

 private:
  std::vector<std::string> m_files;
  size_t m_next = 0;                                      // in m_files
  std::unordered_map<std::string_view, size_t> m_places;  // of all of m_files, or empty
};

// What one comparison of the installation with the database knows, and the changes of the database
// that it makes. Its user walks the files and their sections.
//
// Changes the open document only; saving is the caller's. An item that cannot be set, because
// memory is out, is left out; its file gets no stamp, so that the next start merges it again.
// Threads: one.
class Scan {
 public:
  // The database stays open as long as the object lives.
  explicit Scan(IniDocument& database);
  virtual ~Scan() = default;
  Scan(const Scan&) = delete;
  Scan& operator=(const Scan&) = delete;

  // Notes that the file is in the installation. True if the database has it with this time.
  bool isUpToDate(const std::string& file, const zt::fnd::AbsTime& time);
  // Remembers that the file was merged with this time, unless an item of it is missing.
  void setStamp(const std::string& file, const zt::fnd::AbsTime& time);

  // To be called before a file is merged.
  void beginFile() { m_isIncomplete = false; }

  // Erases what the database has from the file.
  void eraseComponentsOf(const std::string& file);

  // Whether the section is merged: it has a header, and is no component that is named like a
  // section of the database itself. The list of components is merged, too.
  static bool isMerged(const IniDocument& fragment, const std::string& section);
  // Copies the items of one section of the registration file; `changed` becomes the mark of a
  // dictionary. True if it has a file name.
  bool mergeSection(const IniDocument& fragment, const zt::fnd::String& installDirectory,
                    const std::string& file, const std::string& section, bool changed);

  // Whether the file is still in the installation, as far as this user can see.
  bool isPresent(std::string_view file);
  // Erases a component whose registration file is gone, but for its items in the list of contents.
  void erase(const std::string& component, const std::string& file);
  // Whether an entry was erased that no file can have made: such must not come back with the next
  // start.
  bool droppedPlanted() const { return m_droppedPlanted; }

 protected:
  // Whether a file that was not seen is there.
  virtual bool isThere(const std::string& file) const;

 private:
  void set(const std::string& section, const std::string& item, const std::string& value,
           bool quote);
  bool mergeItem(const IniDocument& fragment, const zt::fnd::String& installDirectory,
                 const std::string& file, const std::string& section, const std::string& item);

  IniDocument& m_database;
  FilesSeen m_filesSeen;
  ContentsFiles m_contentsFiles;
  bool m_droppedPlanted = false;
  bool m_isIncomplete = false;  // what was merged since beginFile
};

// Makes the short file name of a registration file a path: adds the extension of its kind to a name
// without one, and puts a name without a directory below `installDirectory`, which ends in a slash.
std::string ProcessFileName(bool isDictionary, const zt::fnd::String& installDirectory,
                            const std::string& file);

}  // namespace registrar
