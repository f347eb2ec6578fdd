// The database remembers which file each component came from, in the list of contents, and with
// which time each file was merged, in the list of registrations. A scan compares the second list
// with the directories, and touches the components of changed files only: those are erased first,
// by the first list, and then merged from the file, section by section.
//
// Registration files are written by others and may hold anything. What would change the database's
// own sections, or write lines of its own into them, is left out; the stamp of a file of which an
// item could not be set is left out too, so that the next start merges it again.
#include "source/Database/Scan.h"

#include <stdio.h>
#include <string.h>

#include <charconv>
#include <system_error>
#include <vector>

#include "source/Database/databaseText.h"
#include "source/Database/registrationFiles.h"
#include "source/IniDocument.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/osdep/StringCompare.h"
#include "zt/fnd/osdep/path.h"
#include "ztini/StringTools.h"

using zt::fnd::String;
using zt::fnd::osdep::path;

namespace registrar {
namespace {

constexpr const char* kChangedMark = "23";
constexpr const char* kHeaderless = "(null)";

bool SameName(const std::string& a, const char* b) {
  return zt::fnd::osdep::StringCaseCompare(a.c_str(), b) == 0;
}

// Whether an item of this name is still that item when the file is read again: what follows a "="
// would be its value, a header or a comment no item at all.
bool CanBeItemName(const std::string& text) {
  size_t first = text.find_first_not_of(" \t\v\f");
  return first != std::string::npos && text[first] != ';' && text[first] != '[' &&
         text.find('=') == std::string::npos && !HasLineEnd(text);
}

// The two halves of a time in the database.
struct Stamp {
  explicit Stamp(const zt::fnd::AbsTime& time) {
    auto ticks = static_cast<uint64_t>(time.toLKTIME(true));
    low = static_cast<uint32_t>(ticks);
    high = static_cast<uint32_t>(ticks >> 32);
  }
  std::string text() const { return Decimal(low) + " " + Decimal(high); }
  bool isIn(const char* stored) const {
    // As text() writes it: without the time that sscanf takes for a pattern.
    const char* const end = stored + strlen(stored);
    auto read = [end](const char* from, uint32_t* number) {
      auto [after, error] = std::from_chars(from, end, *number);
      return error == std::errc() ? after : nullptr;
    };
    uint32_t first = 0, second = 0;
    const char* const space = read(stored, &first);
    if (space && space != end && *space == ' ' && read(space + 1, &second) == end && first == low &&
        second == high) {
      return true;
    }
    unsigned long one = 0, other = 0;
    return sscanf(stored, "%lu %lu", &one, &other) == 2 && one == low && other == high;
  }

  uint32_t low, high;
};

}  // namespace

bool FilesSeen::has(std::string_view file) {
  // Components of one file come one after the other.
  for (size_t n = m_next; n < m_files.size() && n < m_next + 2; ++n) {
    if (m_files[n] != file) continue;
    m_next = n;
    return true;
  }
  if (m_places.empty()) {
    for (size_t n = 0; n < m_files.size(); ++n) m_places.emplace(m_files[n], n);
  }
  auto found = m_places.find(file);
  if (found == m_places.end()) return false;
  m_next = found->second;
  return true;
}

Scan::Scan(IniDocument& database) : m_database(database) {}

bool Scan::isUpToDate(const std::string& file, const zt::fnd::AbsTime& time) {
  m_filesSeen.add(file);
  const char* stored = IniDocument::Section(m_database, kRegistrations).value(file.c_str());
  if (!stored) return false;
  // Any difference counts, not only a later time: a bundle that is replaced by an older one has
  // changed as well.
  return Stamp(time).isIn(stored);
}

void Scan::setStamp(const std::string& file, const zt::fnd::AbsTime& time) {
  if (m_isIncomplete) {
    m_database.EraseItem(kRegistrations, file.c_str());
    return;
  }
  m_database.SetItem(kRegistrations, file.c_str(), Stamp(time).text().c_str(), true);
}

void Scan::eraseComponentsOf(const std::string& file) {
  if (!m_contentsFiles.mayHave(file)) return;
  // Erasing a component that bears the name of a list edits the list; the walk is over its copy.
  std::vector<ContentsItem> contents = ReadContents(m_database);
  m_contentsFiles.learn(contents);
  std::vector<std::string> eraseList;
  for (const ContentsItem& item : contents) {
    if (!SameName(item.file, file.c_str())) continue;
    m_contentsFiles.forget();  // Of two items of one name the second shows when the first is gone.
    if (!IsReserved(item.component)) m_database.EraseSection(item.component.c_str());
    m_database.EraseItem(kComponents, item.component.c_str());
    // Of an item in pieces only the last piece goes. The others are met again, and point to the
    // component that is about to be merged once more.
    std::string name;
    if (m_database.GetNthItemName(kContents, item.last + 1, &name) >= 0) eraseList.push_back(name);
  }
  for (const std::string& name : eraseList) m_database.EraseItem(kContents, name.c_str());
}

bool Scan::isMerged(const IniDocument& fragment, const std::string& section) {
  // Written without a header, so that its items would fall to whichever section comes before.
  if (section == kHeaderless) return false;
  // A component that is named like a section of the database itself must not overlay it. The list
  // of components is one of those, and is extended.
  return !IsReserved(section) || SameName(section, kComponents) ||
         fragment.ItemExists(kComponents, section.c_str()) < 0;
}

void Scan::set(const std::string& section, const std::string& item, const std::string& value,
               bool quote) {
  if (m_database.SetItem(section.c_str(), item.c_str(), value.c_str(), quote) < 0) {
    m_isIncomplete = true;
  }
}

bool Scan::mergeItem(const IniDocument& fragment, const String& installDirectory,
                     const std::string& file, const std::string& section, const std::string& item) {
  std::string value;
  if (fragment.GetItem(section.c_str(), item.c_str(), &value) < 0) {
    m_isIncomplete = true;
    return false;
  }
  // File names become paths and identifiers lose their braces, which is how the database has always
  // kept them. All else is copied as it is.
  bool isFileName = SameName(item, kFileName);
  if (isFileName) {
    bool isDictionary = fragment.ItemExists(section.c_str(), kSchemaVersion) >= 0;
    value = ProcessFileName(isDictionary, installDirectory, value);
  } else if (SameName(item, kIdentifier)) {
    value = WithoutBraces(value);
  }
  set(section, item, value, true);
  if (ztini_StrICmpWithoutSurrWhiteSpace(section.c_str(), kContents) == 0) m_contentsFiles.forget();
  // A value that is no name would write something else into the database, down to whole lines.
  if (SameName(section, kComponents) && CanBeItemName(value)) {
    set(kContents, value, file, true);
    m_contentsFiles.add(m_database, value);
  }
  return isFileName;
}

bool Scan::mergeSection(const IniDocument& fragment, const String& installDirectory,
                        const std::string& file, const std::string& section, bool changed) {
  bool hasFileName = false;
  int items = fragment.GetNumberOfItems(section.c_str());
  for (int i = 1; i <= items; ++i) {
    std::string item;
    if (fragment.GetNthItemName(section.c_str(), i, &item) < 0) continue;
    if (mergeItem(fragment, installDirectory, file, section, item)) hasFileName = true;
  }
  if (fragment.ItemExists(section.c_str(), kSchemaVersion) >= 0) {
    set(section, kFragmentRegistered, changed ? kChangedMark : "0", false);
  }
  return hasFileName;
}

bool Scan::isPresent(std::string_view file) {
  return m_filesSeen.has(file) || isThere(std::string(file));
}

bool Scan::isThere(const std::string& file) const { return FileIsThere(file); }

void Scan::erase(const std::string& component, const std::string& file) {
  // No merge writes a relative path: the entry was made by hand, or by a registration file that
  // named the list as its section.
  if (!path::IsAbs(Widen(file))) m_droppedPlanted = true;
  if (!IsReserved(component)) m_database.EraseSection(component.c_str());
  m_database.EraseItem(kComponents, component.c_str());
  // The file may be registered by its whole path or by its bare name, which follows the last
  // separator of either system.
  size_t separator = file.rfind('\\');
  if (separator == std::string::npos) separator = file.rfind('/');
  m_database.EraseItem(kRegistrations, file.substr(separator + 1).c_str());
  m_database.EraseItem(kRegistrations, file.c_str());
}

std::string ProcessFileName(bool isDictionary, const String& installDirectory,
                            const std::string& file) {
  String whole = Widen(file);
  String base = path::BaseName(whole);
  if (base.find(L'.') == String::npos) {
    base += isDictionary ? L".framework" : L".vle";
    whole = path::Join(path::DirName(whole), base);
  }
  std::string name = Narrow(whole);
  // A separator of either system makes it a path, which is kept: the component lies outside the
  // usual directories.
  if (name.find_first_of("\\/") != std::string::npos) return name;
  String below = vlt::layout::DirectoryIn(
      installDirectory, isDictionary ? vlt::layout::kDictionaries : vlt::layout::kExperts);
  return Narrow(below) + name;
}

}  // namespace registrar
