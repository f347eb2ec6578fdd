// The scan of the installation: finding registration files, merging what is new or changed,
// dropping what has vanished. What is done to the database is done by registrar::Scan.
#include "source/Pharlap/LiveScan.h"

#include <optional>

#include "source/Database/contentsWalk.h"
#include "source/Pharlap/registrarText.h"
#include "source/Pharlap/vltPharlapRegistrar.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/osdep/path.h"

using zt::fnd::osdep::path;
using namespace registrar;
using zt::fnd::String;
using zt::fnd::Vector;

HRESULT CvltPharlapRegistrar::FindRegistrationFiles(RegistrationFiles& files) {
  String directory;
  // Unlike elsewhere, a directory that cannot be made ends the search.
  HRESULT result = vlrMakeRootDirectory(vlt::layout::kDictionaries, &directory);
  if (result < 0) return result;
  AppendRegistrationFiles(directory, String(L"*.framework"), files);
  result = vlrMakeRootDirectory(vlt::layout::kExperts, &directory);
  if (result < 0) return result;
  AppendRegistrationFiles(directory, String(L"*.vle"), files);
  return S_OK;
}

// The scan that is under way, or one for the scope: its steps can be called by themselves.
class CvltPharlapRegistrar::ScanHold {
 public:
  explicit ScanHold(CvltPharlapRegistrar& owner) : m_current(owner.m_scan) {
    if (m_current) return;
    m_own.emplace(owner.database());
    m_current = &*m_own;
  }
  ~ScanHold() {
    if (m_own) m_current = nullptr;
  }
  ScanHold(const ScanHold&) = delete;
  ScanHold& operator=(const ScanHold&) = delete;
  registrar::LiveScan* operator->() const { return m_current; }

 private:
  std::optional<registrar::LiveScan> m_own;
  registrar::LiveScan*& m_current;
};

HRESULT CvltPharlapRegistrar::UpdateRegistrationFile() {
  String directory = m_installDirectory;
  path::MakePathEndInSlash(directory);
  std::optional<RegistrationFiles> files(std::in_place);
  FindRegistrationFiles(*files);
  ScanHold scan(*this);
  // One save for each changed file: a start that is killed has merged what it has merged, and the
  // next one begins with the rest.
  for (const auto& [wideFile, time] : *files) {
    std::string file = Narrow(wideFile);
    if (scan->isUpToDate(file, time)) continue;
    bool opened = scan->openFragment(file);
    // A file that could not be opened just now keeps its components and its old stamp, so that the
    // next start tries again. One that cannot be used has been set aside, and is not met again.
    if (!opened && FileIsThere(file)) continue;
    scan->eraseComponentsOf(file);
    if (opened) MergeRegistrationFile(directory, file.c_str());
    scan->setStamp(file, time);
    SaveChanges();
  }
  // Of many bundles, the paths take as much memory as the components will.
  files.reset();
  // After the merges: a component that moved from one file to another belongs to the new one by
  // now.
  HRESULT result = RemoveDeletedComponents();
  // Otherwise without a save: what has gone from the disk is found gone again at the next start.
  if (scan->droppedPlanted()) SaveChanges();
  return result;
}

HRESULT CvltPharlapRegistrar::MergeRegistrationFile(const String& installDirectory,
                                                    const char* file) {
  ScanHold scan(*this);
  std::unique_ptr<CvlIniMgr> fragment = scan->takeFragment(file);
  if (!fragment) return E_FAIL;
  HRESULT result = S_OK;
  int sections = fragment->GetNumberOfSections();
  for (int n = 1; n <= sections; ++n) {
    std::string section;
    if (fragment->GetNthSectionName(n, &section) < 0) continue;
    if (!registrar::Scan::isMerged(*fragment, section)) continue;
    bool changed = true;
    result = HasDDChanged(*fragment, Widen(section).c_str(), changed);
    // A file name takes the place of that result: it is always processed.
    if (scan->mergeSection(*fragment, installDirectory, file, section, changed)) result = S_OK;
  }
  return result;
}

void CvltPharlapRegistrar::RemoveComponentsIfFileDoesNotExist(char* section, char* file,
                                                              Vector<String>& eraseList, int first,
                                                              int last) {
  ScanHold scan(*this);
  if (scan->isPresent(file)) return;
  scan->erase(section, file);
  for (int number = first; number <= last; ++number) {
    std::string name;
    if (m_registrationIni->GetNthItemName(kContents, number + 1, &name) >= 0) {
      eraseList.push_back(Widen(name));
    }
  }
}

HRESULT CvltPharlapRegistrar::RemoveDeletedComponents() {
  Vector<String> eraseList;
  // Over a copy: erasing changes the list.
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
