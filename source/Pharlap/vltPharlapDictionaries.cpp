// Data dictionaries: their registration, the flag that reports a change, and the previous ones.
#include <string.h>

#include "source/Common/vltFileSecurity.h"
#include "source/Common/vltResultOf.h"
#include "source/Common/vltcmn.h"
#include "source/Pharlap/registrarText.h"
#include "source/Pharlap/vltPharlapRegistrar.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/path.h"

using zt::fnd::osdep::path;
using namespace registrar;
using zt::fnd::String;
using zt::fnd::Vector;

namespace {

// The early-trace lines of this file. Source and numbers are frozen; they do not follow the code.
constexpr const char* kEarlyTraceSource = "./source/Pharlap/vltPharlapRegistrar";

struct EarlyTraceLine {
  long number;
  const char* what;
  const char* where = "";
};
constexpr EarlyTraceLine kNoIdentifier = {1857, "id"};
constexpr EarlyTraceLine kNoFileName = {1870, "file name"};
constexpr EarlyTraceLine kNoSchemaVersion = {1882, "schema version"};
constexpr EarlyTraceLine kNoFragmentIdentifier = {1902, "id", " in product vlr"};
constexpr EarlyTraceLine kPortConfiguration = {2208, "Portcfg options"};

// Reads an item; reports a failure, and an empty value where that counts as one. Returns the code.
HRESULT ReadOrWarn(const CvlIniMgr& ini, const std::string& section, const char* item,
                   bool mayBeEmpty, const EarlyTraceLine& line, std::string* value) {
  value->clear();
  HRESULT result = ini.GetItem(section.c_str(), item, value);
  if (result >= 0 && (mayBeEmpty || !value->empty())) return result;
  if ((vltGetTraceFlagsImpl() & kEarlyTraceMask) >= kEarlyTraceWarnings) {
    vltEarlyTrace(kEarlyTraceSource, line.number,
                  "Warning: Could not read %s from section %s%s, result = %ld", line.what,
                  section.c_str(), line.where, static_cast<long>(result));
  }
  return result;
}

bool HasPortConfiguration(const _vltStartupOptions* options) {
  constexpr size_t kFlagsOffset = 4;
  constexpr unsigned char kPortConfigurationBit = 0x80;
  // The structure is the storage's: of it only this bit is known here, by its place.
  return options &&
         (reinterpret_cast<const unsigned char*>(options)[kFlagsOffset] & kPortConfigurationBit);
}

}  // namespace

HRESULT CvltPharlapRegistrar::RegisterDataDictionary(_vltComponent2* record) {
  DatabaseHold hold(*this);
  if (BeginChange() < 0) return E_FAIL;
  // A dictionary is a section of its name; the list of components has the name as item and as
  // value.
  std::string section = Narrow(record->name);
  if (IsReserved(section)) return E_FAIL;
  const vltDictVariant& variant = record->dictionary;
  RecordText text;
  text.identifier = record->identifier;
  text.file = Narrow(record->fileName);
  text.schemaVersion = variant.schemaVersion;
  text.fragmentRegistered = variant.fragmentRegistered;
  text.lastInstalledSchemaVersion = variant.lastInstalledSchemaVersion;
  text.prefix = Narrow(variant.prefix);
  // What was not set is not saved as if it were.
  HRESULT setResult = WriteDictionary(*m_registrationIni, section, text);
  if (setResult < 0) return setResult;
  HRESULT result = SaveChanges();

  // After the save, which waits for the disk: the map's lock is never held across that.
  ComponentMap::Hold map(components());
  CvltComponent* component = nullptr;
  if (InternalGetComponentNoScan(record->identifier, component) < 0) return result;
  ReplaceText(&component->record().name, record->name);
  ReplaceText(&component->record().fileName, record->fileName);
  // A component of another type under this identifier has no place for the rest.
  if (component->record().type != vltComponentDataDictionary) return result;
  vltDictVariant& known = component->record().dictionary;
  ReplaceText(&known.prefix, variant.prefix);
  known.schemaVersion = variant.schemaVersion;
  known.fragmentRegistered = variant.fragmentRegistered;
  known.lastInstalledSchemaVersion = variant.lastInstalledSchemaVersion;
  return result;
}

HRESULT CvltPharlapRegistrar::HasDDChanged(CvlIniMgr& fragment, const wchar_t* wideSection,
                                           bool& changed) {
  std::string section = Narrow(wideSection);
  changed = true;
  if (fragment.ItemExists(section.c_str(), kSchemaVersion) < 0) {
    changed = false;
    return S_OK;
  }
  if (m_registrationIni->SectionExists(section.c_str()) < 0) return S_OK;

  // Every dictionary that is merged counts as changed: a merge happens only for a file with another
  // time stamp. What follows is here for its warnings and its result.
  std::string text;
  GUID known = GUID_NULL;
  HRESULT result =
      ReadOrWarn(*m_registrationIni, section, kIdentifier, false, kNoIdentifier, &text);
  if (result >= 0 && !text.empty()) known = GuidOf(text.c_str());
  ReadOrWarn(*m_registrationIni, section, kFileName, true, kNoFileName, &text);
  ReadOrWarn(*m_registrationIni, section, kSchemaVersion, false, kNoSchemaVersion, &text);

  GUID brought = GUID_NULL;
  result = ReadOrWarn(fragment, section, kIdentifier, false, kNoFragmentIdentifier, &text);
  if (result >= 0 && !text.empty()) brought = GuidOf(text.c_str());
  if (brought == GUID_NULL || !(brought == known)) return result;
  HRESULT versionResult = fragment.GetItem(section.c_str(), kSchemaVersion, &text);
  return versionResult < 0 ? versionResult : result;
}

HRESULT CvltPharlapRegistrar::ResetDDUpdatedFlags() {
  DatabaseHold hold(*this);
  HRESULT result = S_OK;
  bool modified = false;
  if (m_registrationIni && BeginChange() < 0) return E_FAIL;
  int sections = m_registrationIni ? m_registrationIni->GetNumberOfSections() : 0;
  for (int n = 1; n <= sections; ++n) {
    std::string section, flag;
    if (m_registrationIni->GetNthSectionName(n, &section) < 0) continue;
    if (m_registrationIni->ItemExists(section.c_str(), kSchemaVersion) < 0) continue;
    result = m_registrationIni->GetItem(section.c_str(), kFragmentRegistered, &flag);
    // Most flags are clear: without a change nothing is written.
    if (result < 0 || flag.empty() || Number(flag) == 0) continue;
    result = m_registrationIni->SetItem(section.c_str(), kFragmentRegistered, "0", false);
    modified = true;
  }
  if (!modified) return result;
  result = SaveChanges();
  ComponentMap::Hold map(components());
  for (auto& [identifier, component] : *map) {
    _vltComponent2& record = component->record();
    if (record.type == vltComponentDataDictionary) record.dictionary.fragmentRegistered = 0;
  }
  return result;
}

HRESULT CvltPharlapRegistrar::previousDictionariesFolder(String* folder) {
  HRESULT result = vlrMakeRootDirectory(vlt::layout::kDictionaries, folder);
  if (result < 0) return result;
  *folder = vlt::layout::DirectoryIn(*folder, vlt::layout::kPreviousDictionaries);
  // A result of the interface, not an error of the caller's program.
  return vlt::ResultOf<zt::fnd::exception::AccessDenied>(
      E_FAIL, [&] { return vltMakeSharedDirectory(*folder); });
}

HRESULT CvltPharlapRegistrar::GetPrevDictsLastFolder(Vector<String>& names) {
  String folder;
  HRESULT result = previousDictionariesFolder(&folder);
  if (result < 0) return result;
  return vltGetComponentNamesFromDirectory(folder, String(L"framework"), names);
}

HRESULT CvltPharlapRegistrar::GetPreviousDictionaries(const _vltStartupOptions*,
                                                      unsigned int* count, wchar_t*** paths) {
  if (!count || !paths) return S_OK;
  Vector<String> names;
  HRESULT result = GetPrevDictsLastFolder(names);
  if (result < 0) return result;
  *count = names.size();
  if (names.size() == 0) return result;
  auto* texts = static_cast<wchar_t**>(vltTaskMemAlloc(names.size() * sizeof(wchar_t*)));
  if (!texts) return E_OUTOFMEMORY;
  for (unsigned i = 0; i < names.size(); ++i) {
    texts[i] = Dup(names[i].c_str());
    if (texts[i]) continue;
    // The caller gets all of the paths or none.
    while (i > 0) vltTaskMemFree(texts[--i]);
    vltTaskMemFree(texts);
    return E_OUTOFMEMORY;
  }
  *paths = texts;
  return result;
}

HRESULT CvltPharlapRegistrar::RemovePreviousDictionaries(const _vltStartupOptions* options) {
  if (HasPortConfiguration(options)) {
    if (vltGetTraceFlagsImpl() & kEarlyTraceMask) {
      vltEarlyTrace(kEarlyTraceSource, kPortConfiguration.number,
                    "Error: %s specified for pharlap registrar remove previous dictionaries.",
                    kPortConfiguration.what);
    }
    return E_FAIL;
  }
  Vector<String> names;
  HRESULT result = GetPrevDictsLastFolder(names);
  if (result < 0) return result;
  auto remove = [&result](const String& file) {
    // The others can still go.
    if (!vlt::Attempt<zt::fnd::exception::Exception>([&] { path::RemoveFile(file); })) {
      result = E_FAIL;
    }
  };
  for (const String& name : names) remove(name);
  if (result < 0 || names.size() == 0) return result;
  String folder;
  result = previousDictionariesFolder(&folder);
  if (result < 0) return result;
  // Last, and only where all dictionaries went: it describes those that are left.
  remove(folder + vlt::layout::kDatabase);
  return result;
}
