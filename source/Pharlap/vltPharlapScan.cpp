// The scan of the installation: finding registration files, merging what is new or changed,
// dropping what has vanished.
#include <errno.h>
#include <string.h>
#include <sys/stat.h>

#include <algorithm>
#include <utility>

#include "source/Common/vltFileSecurity.h"
#include "source/Pharlap/contentsWalk.h"
#include "source/Pharlap/registrarText.h"
#include "source/Pharlap/vltPharlapRegistrar.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/DateTime.h"
#include "zt/fnd/osdep/FindFiles.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/StringCompare.h"
#include "zt/fnd/osdep/path.h"
#include "ztini/StringTools.h"

using zt::fnd::osdep::path;
using namespace registrar;
using zt::fnd::AnsiString;
using zt::fnd::String;
using zt::fnd::Vector;
using zt::fnd::osdep::StringCaseCompare;

namespace {

constexpr const wchar_t* kRegistrationFile = L"Resources/Info.vlr";
constexpr const char* kChangedMark = "23";
constexpr const char* kHeaderless = "(null)";

bool SameName(const std::string& a, const char* b) { return StringCaseCompare(a.c_str(), b) == 0; }

bool HasLineEnd(const std::string& text) { return text.find_first_of("\r\n") != std::string::npos; }

// Whether an item of this name is still that item when the file is read again: what follows a "="
// would be its value, a header or a comment no item at all.
bool CanBeItemName(const std::string& text) {
  size_t first = text.find_first_not_of(" \t\v\f");
  return first != std::string::npos && text[first] != ';' && text[first] != '[' &&
         text.find('=') == std::string::npos && !HasLineEnd(text);
}

// Nothing can be found at the path, now or later: no entry, a file where a directory should be, links
// that go in circles, or a name that no file can have.
bool NamesNothing(int error) {
  return error == ENOENT || error == ENOTDIR || error == ELOOP || error == ENAMETOOLONG;
}

// Another user's bundle that this user may not enter. It is none of this process's business, and must
// not keep it from the others.
bool MayNotLook(int error) { return error == EACCES || error == EPERM; }

// Time of the last change, in whole seconds, if the path names a regular file. One look answers
// both whether the file is there and how old it is. A bundle that is no directory, or has something
// else in the file's place, has no registration file; what else keeps the look from being taken is
// raised.
bool RegistrationTime(const String& file, zt::fnd::AbsTime* time) {
  struct stat info;
  if (stat(AnsiString(file).c_str(), &info) != 0) {
    int error = errno;
    if (NamesNothing(error) || MayNotLook(error)) return false;
    ZT_RAISE(zt::fnd::osdep::PosixError(error));
  }
  if (!S_ISREG(info.st_mode)) return false;
  timeval changed = {};
  changed.tv_sec = info.st_mtime;
  *time = zt::fnd::osdep::TimevalToAbsTime(changed);
  return true;
}

void ListBundles(const String& directory, const String& mask,
                 CvltPharlapRegistrar::RegistrationFiles& files) {
  Vector<String> names = zt::fnd::osdep::FindFiles().getFilenames(path::Join(directory, mask));
  for (const String& name : names) {
    String bundle = path::IsAbs(name) ? name : path::Join(directory, name);
    String file = path::Join(bundle, String(kRegistrationFile));
    // The path becomes the name of an item, where a line end would write lines of its own.
    if (HasLineEnd(Narrow(file))) continue;
    zt::fnd::AbsTime time;
    if (RegistrationTime(file, &time)) files.push_back({file, time});
  }
}

// True if the path names a regular file, or may do so where this user may not look: what was registered
// from there stays. A relative path names no registration file, wherever it came from. Other failures are
// raised.
bool FileIsThere(const std::string& file) {
  if (!path::IsAbs(Widen(file))) return false;
  try {
    return path::DoesFileExist(Widen(file));
  } catch (const zt::fnd::osdep::PosixError& error) {
    int code = static_cast<int>(error.whatcode());
    if (MayNotLook(code)) return true;
    // The bundle may have been replaced by a file of its name, or by a link to itself.
    if (!NamesNothing(code)) throw;
    return false;
  }
}

}  // namespace

HRESULT CvltPharlapRegistrar::FindRegistrationFiles(RegistrationFiles& files) {
  String directory;
  // Unlike elsewhere, a directory that cannot be made ends the search.
  HRESULT result = vlrMakeRootDirectory(kDictionaries, &directory);
  if (result < 0) return result;
  ListBundles(directory, String(L"*.framework"), files);
  result = vlrMakeRootDirectory(kExperts, &directory);
  if (result < 0) return result;
  ListBundles(directory, String(L"*.vle"), files);
  return S_OK;
}

bool CvltPharlapRegistrar::isRegistered(const std::string& file, uint32_t low, uint32_t high) {
  std::string stamp;
  if (m_registrationIni->GetItem(kRegistrations, file.c_str(), &stamp) < 0) return false;
  unsigned long storedLow = 0, storedHigh = 0;
  return sscanf(stamp.c_str(), "%lu %lu", &storedLow, &storedHigh) == 2 && storedLow == low &&
         storedHigh == high;
}

void CvltPharlapRegistrar::eraseComponentsOf(const std::string& file) {
  if (!m_contentsFiles.mayHave(file)) return;
  // Erasing a component that bears the name of a list edits the list; the walk is over its copy.
  std::vector<ContentsItem> contents = ReadContents(*m_registrationIni);
  m_contentsFiles.learn(contents);
  std::vector<std::string> eraseList;
  for (const ContentsItem& item : contents) {
    if (!SameName(item.file, file.c_str())) continue;
    m_contentsFiles.forget();  // Of two items of one name the second shows when the first is gone.
    if (!IsReserved(item.component)) m_registrationIni->EraseSection(item.component.c_str());
    m_registrationIni->EraseItem(kComponents, item.component.c_str());
    // Of an item in pieces only the last piece goes. The others are met again, and point to the
    // component that is about to be merged once more.
    std::string name;
    if (m_registrationIni->GetNthItemName(kContents, item.last + 1, &name) >= 0) {
      eraseList.push_back(name);
    }
  }
  for (const std::string& name : eraseList) {
    m_registrationIni->EraseItem(kContents, name.c_str());
  }
}

HRESULT CvltPharlapRegistrar::UpdateRegistrationFile() {
  String directory = m_installDirectory;
  path::MakePathEndInSlash(directory);
  RegistrationFiles files;
  FindRegistrationFiles(files);
  m_contentsFiles.forget();  // Others may have changed the section since the last time.
  for (const auto& [file, time] : files) {
    std::string narrow = Narrow(file);
    m_filesSeen.insert(narrow);
    auto ticks = static_cast<uint64_t>(time.toLKTIME(true));
    auto low = static_cast<uint32_t>(ticks), high = static_cast<uint32_t>(ticks >> 32);
    if (isRegistered(narrow, low, high)) continue;
    bool opened = openFragment(narrow.c_str());
    // A file that could not be opened just now keeps its components and its old stamp, so that the next
    // start tries again. One that cannot be used has been set aside, and is not met again.
    if (!opened && FileIsThere(narrow)) continue;
    eraseComponentsOf(narrow);
    if (opened) MergeRegistrationFile(directory, narrow.c_str());
    m_fragment.reset();
    std::string stamp = Decimal(low) + " " + Decimal(high);
    m_registrationIni->SetItem(kRegistrations, narrow.c_str(), stamp.c_str(), true);
    SaveChanges();
  }
  HRESULT result = RemoveDeletedComponents();
  m_filesSeen.clear();
  if (std::exchange(m_droppedPlanted, false)) SaveChanges();
  return result;
}

HRESULT CvltPharlapRegistrar::ProcessFileName(bool isDictionary, const String& installDirectory,
                                              std::string& file) {
  String whole = Widen(file);
  String base = path::BaseName(whole);
  if (base.find(L'.') == String::npos) {
    base += isDictionary ? L".framework" : L".vle";
    whole = path::Join(path::DirName(whole), base);
  }
  file = Narrow(whole);
  if (file.find_first_of("\\/") == std::string::npos) {
    String below = installDirectory + (isDictionary ? kDictionaries : kExperts) + L"/";
    file = Narrow(below) + file;
  }
  return S_OK;
}

void CvltPharlapRegistrar::mergeItem(CvlIniMgr& fragment, const String& installDirectory,
                                     const char* file, const std::string& section,
                                     const std::string& item, HRESULT* result) {
  std::string value;
  if (fragment.GetItem(section.c_str(), item.c_str(), &value) < 0) return;
  if (SameName(item, kFileName)) {
    bool isDictionary = fragment.ItemExists(section.c_str(), kSchemaVersion) >= 0;
    *result = ProcessFileName(isDictionary, installDirectory, value);
  } else if (SameName(item, kIdentifier)) {
    if (StripBracesFromGuid(value.data()) == S_OK) value.resize(strlen(value.c_str()));
  }
  m_registrationIni->SetItem(section.c_str(), item.c_str(), value.c_str(), true);
  if (ztini_StrICmpWithoutSurrWhiteSpace(section.c_str(), kContents) == 0) m_contentsFiles.forget();
  // A value that is no name would write something else into the database, down to whole lines.
  if (SameName(section, kComponents) && CanBeItemName(value)) {
    m_registrationIni->SetItem(kContents, value.c_str(), file, true);
    m_contentsFiles.add(*m_registrationIni, value);
  }
}

bool CvltPharlapRegistrar::openFragment(const char* file) {
  try {
    m_fragment = std::make_unique<CvlIniMgr>(file, false, nullptr, false, true);
    return true;
  } catch (...) {
    // A file that cannot be parsed has been set aside by its manager already. Any other reason - no
    // memory, no descriptor - says nothing about the file, which stays.
    return false;
  }
}

HRESULT CvltPharlapRegistrar::MergeRegistrationFile(const String& installDirectory,
                                                    const char* file) {
  if (!m_fragment && !openFragment(file)) return E_FAIL;
  std::unique_ptr<CvlIniMgr> fragment = std::move(m_fragment);
  HRESULT result = S_OK;
  int sections = fragment->GetNumberOfSections();
  for (int s = 1; s <= sections; ++s) {
    std::string section;
    if (fragment->GetNthSectionName(s, &section) < 0) continue;
    // Written without a header, so that its items would fall to whichever section stands before.
    if (section == kHeaderless) continue;
    // A component that is named like a section of the database itself must not overlay it. The list of
    // components is one of those, and is extended.
    if (IsReserved(section) && !SameName(section, kComponents) &&
        fragment->ItemExists(kComponents, section.c_str()) >= 0) {
      continue;
    }
    bool changed = true;
    result = HasDDChanged(*fragment, Widen(section).c_str(), changed);
    int items = fragment->GetNumberOfItems(section.c_str());
    for (int i = 1; i <= items; ++i) {
      std::string item;
      if (fragment->GetNthItemName(section.c_str(), i, &item) < 0) continue;
      mergeItem(*fragment, installDirectory, file, section, item, &result);
    }
    if (fragment->ItemExists(section.c_str(), kSchemaVersion) >= 0) {
      m_registrationIni->SetItem(section.c_str(), kFragmentRegistered, changed ? kChangedMark : "0",
                                 false);
    }
  }
  return result;
}

void CvltPharlapRegistrar::RemoveComponentsIfFileDoesNotExist(char* section, char* file,
                                                              Vector<String>& eraseList, int first,
                                                              int last) {
  if (m_filesSeen.count(file) || FileIsThere(file)) return;
  if (!path::IsAbs(Widen(file))) m_droppedPlanted = true;
  if (!IsReserved(section)) m_registrationIni->EraseSection(section);
  m_registrationIni->EraseItem(kComponents, section);
  std::string whole = file;
  size_t separator = whole.rfind('\\');
  if (separator == std::string::npos) separator = whole.rfind('/');
  m_registrationIni->EraseItem(kRegistrations, whole.substr(separator + 1).c_str());
  m_registrationIni->EraseItem(kRegistrations, file);
  for (int number = first; number <= last; ++number) {
    std::string name;
    if (m_registrationIni->GetNthItemName(kContents, number + 1, &name) >= 0) {
      eraseList.push_back(Widen(name));
    }
  }
}

HRESULT CvltPharlapRegistrar::RemoveDeletedComponents() {
  Vector<String> eraseList;
  for (ContentsItem& item : ReadContents(*m_registrationIni)) {
    RemoveComponentsIfFileDoesNotExist(item.component.data(), item.file.data(), eraseList,
                                       item.first, item.last);
  }
  HRESULT result = S_OK;
  for (const String& name : eraseList) {
    result = m_registrationIni->EraseItem(kContents, Narrow(name).c_str());
  }
  return result;
}
