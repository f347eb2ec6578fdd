// The start, in Init: the database is opened under its lock, which stays with the object; its
// settings and the built-in dictionary are written; the installation is compared with it
// (vltPharlapScan.cpp); and every section of the list of components becomes a component in the map
// (vltPharlapExperts.cpp). All of that is one scan for DatabaseSaves, so that it waits for the disk
// a few times in all. From then on questions are answered from memory, and only what a client
// changes is written.
#include "source/Pharlap/vltPharlapRegistrar.h"

#include <string.h>
#include <wchar.h>

#include <vector>

#include "source/Common/vltFileSecurity.h"
#include "source/Common/vltResultOf.h"
#include "source/Common/vltcmn.h"
#include "source/Pharlap/registrarText.h"
#include "vlloader/source/InstallLayout.h"
#include "vlloader/source/vlloader.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/path.h"
#include "ztini/ztini.h"

using zt::fnd::osdep::path;
using namespace registrar;
using zt::fnd::String;

namespace {

// Fails by exceptions, and has no hook points and no messages.
constexpr GuardedIniKind kDatabase = {.useEscapes = true};

}  // namespace

HRESULT vlrMakeRootDirectory(const wchar_t* name, String* directory) {
  *directory = vlt::layout::InstallRoot();
  if (directory->empty()) return E_FAIL;
  *directory = vlt::layout::DirectoryIn(*directory, name);
  // A client without the rights still reads what another user's process has registered.
  return vlt::ResultOf<zt::fnd::exception::AccessDenied>(
      E_FAIL, [&] { return vltMakeSharedDirectory(*directory); });
}

CvltPharlapRegistrar::CvltPharlapRegistrar(const String& registrationFilePath,
                                           const String& installDirectory, bool init)
    : m_installDirectory(installDirectory), m_file(Narrow(registrationFilePath), kDatabase) {
  if (init) Init();
}

CvltPharlapRegistrar::~CvltPharlapRegistrar() {
  // Under the lock; and the lock before the rest, so that it is free for the next process.
  m_saves.reset();
  m_registrationIni.reset();
  ComponentMap::Hold map(components());
  for (auto& [identifier, component] : *map) {
    // The records' texts go whole here, whatever their names; a zeroed record leaves the object's
    // own destructor nothing to free.
    vltFreeComponent2(component->record());
    memset(&component->record(), 0, sizeof component->record());
  }
}

HRESULT CvltPharlapRegistrar::QueryInterface(const GUID& iid, void** out) {
  HRESULT result = CvltRegistrar::QueryInterface(iid, out);
  if (result != E_NOINTERFACE) return result;
  if (iid == IID_IvltPharlapRegistrarEx) {
    *out = static_cast<IvltPharlapRegistrarEx*>(this);
  } else if (iid == IID_IvltDynamicRegistrar) {
    *out = static_cast<IvltDynamicRegistrar*>(this);
  } else if (iid == IID_IvltDowngradeRegistrar) {
    *out = static_cast<IvltDowngradeRegistrar*>(this);
  } else {
    return E_NOINTERFACE;
  }
  AddRef();
  return S_OK;
}

void CvltPharlapRegistrar::Init() {
  if (OpenIniWithValidation() < 0 || !m_registrationIni) return;
  m_saves = std::make_unique<DatabaseSaves>(m_file.file(), *m_registrationIni);
  DatabaseSaves::ScanScope scan(*m_saves);
  update();
}

void CvltPharlapRegistrar::update() {
  initSettings();
  registerBuiltInDictionary();
  // Its result is dropped, as those of the two before are: a registration that fails does not keep
  // clients from what is registered already.
  UpdateRegistrationFile();
  readComponents();
  m_resources.forget();
}

CvltPharlapRegistrar::DatabaseHold::DatabaseHold(CvltPharlapRegistrar& registrar)
    : m_hold(registrar.m_iniLock) {
  if (registrar.m_iniLock.takeInterrupted() && registrar.m_registrationIni) {
    registrar.m_registrationIni->AbandonDocument();
  }
}

void CvltPharlapRegistrar::ContinueInThisProcess() {
  DatabaseHold hold(*this);
  BeginChange();
}

HRESULT CvltPharlapRegistrar::BeginChange() {
  return m_registrationIni ? m_registrationIni->MakeSureOfLock() : E_FAIL;
}

void CvltPharlapRegistrar::initSettings() {
  String configuration;
  // Without an installation the text is empty, and the bare name is what is stored.
  dataDirectory(&configuration);
  configuration += vlt::layout::kConfiguration;
  SetConfigurationPath(configuration.c_str());
  SetSchemaVersion(0);
}

void CvltPharlapRegistrar::registerBuiltInDictionary() {
  String directory;
  vlrMakeRootDirectory(vlt::layout::kDictionaries, &directory);
  RecordText text = BuiltInDictionary(Narrow(directory));
  String name = Widen(kBuiltInDictionary), file = Widen(*text.file), prefix = Widen(*text.prefix);
  _vltComponent2 record;
  memset(&record, 0, sizeof record);
  record.size = sizeof record;
  record.version = text.version;
  record.type = text.type;
  record.name = name.begin();
  record.identifier = text.identifier;
  record.fileName = file.begin();
  record.dictionary.prefix = prefix.begin();
  RegisterDataDictionary(&record);
}

void CvltPharlapRegistrar::readComponents() {
  // As they are before the first is read, which may put its file's directory into the database.
  std::vector<String> names;
  const IniDocument::Section list(*m_registrationIni, kComponents);
  const int count = list.count();
  names.reserve(static_cast<size_t>(count));
  for (int n = 1; n <= count; ++n) names.emplace_back(list.itemName(n));
  for (const String& name : names) {
    if (!name.empty()) ReadComponent(name.c_str());
  }
}

// ---- The database file

HRESULT CvltPharlapRegistrar::OpenIniWithValidation() {
  // Held from the second name on, which decides what the first one is.
  std::unique_ptr<IniFileLock> hold = IniFileLock::ForFile(m_file.file().c_str());
  // Nothing is known of a file that cannot be read now. It stays, and the caller may try again.
  if (!DurableCopy::takeUp(m_file.file())) throw 1;
  HRESULT result = m_file.open(&m_registrationIni);
  if (!m_registrationIni) throw 1;
  return result;
}

HRESULT CvltPharlapRegistrar::SaveChanges() {
  if (!m_registrationIni) return S_OK;
  m_resources.forget();
  // Before the save: a second name that is left would be taken up over it by the next opening.
  if (m_saves && !m_saves->prepare()) return E_FAIL;
  return m_file.save(*m_registrationIni);
}

// ---- Settings

namespace {

// Number of a setting, or the fallback when it cannot be read or is empty.
uint32_t Setting(const CvlIniMgr* ini, const char* key, uint32_t fallback) {
  std::string text;
  if (!ini || ini->GetItem(kGlobalSection, key, &text) < 0 || text.empty()) return fallback;
  return Number(text);
}

constexpr uint32_t kDefaultCacheSizeBytes = 0x2000000;

}  // namespace

HRESULT CvltPharlapRegistrar::GetSchemaVersion(unsigned int* version) {
  if (!version) return E_POINTER;
  DatabaseHold hold(*this);
  *version = Setting(m_registrationIni.get(), kSchemaVersion, 0);
  return S_OK;
}

// Setting an item of the library's own name fails only when out of memory. Then nothing is saved: a
// success of the save would report the item as saved.
HRESULT CvltPharlapRegistrar::setAndSave(const char* key, const char* value, bool quote) {
  if (m_registrationIni->SetItem(kGlobalSection, key, value, quote) < 0) return E_OUTOFMEMORY;
  return SaveChanges();
}

HRESULT CvltPharlapRegistrar::SetSchemaVersion(unsigned int version) {
  DatabaseHold hold(*this);
  // Before the comparison: it may read the file again, and the setting with it.
  if (BeginChange() < 0) return E_FAIL;
  std::string present;
  if (m_registrationIni->GetItem(kGlobalSection, kSchemaVersion, &present) >= 0 &&
      !present.empty() && Number(present) == version) {
    return S_OK;
  }
  return setAndSave(kSchemaVersion, Decimal(version).c_str(), false);
}

HRESULT CvltPharlapRegistrar::GetStorageServerCacheSize(unsigned int* sizeBytes) {
  if (!sizeBytes) return E_POINTER;
  DatabaseHold hold(*this);
  *sizeBytes = Setting(m_registrationIni.get(), kCacheSize, kDefaultCacheSizeBytes);
  return S_OK;
}

HRESULT CvltPharlapRegistrar::SetStorageServerCacheSize(unsigned int sizeBytes) {
  DatabaseHold hold(*this);
  if (BeginChange() < 0) return E_FAIL;
  return setAndSave(kCacheSize, Decimal(sizeBytes).c_str(), false);
}

HRESULT CvltPharlapRegistrar::dataDirectory(String* directory) {
  return vlrMakeRootDirectory(vlt::layout::kData, directory);
}

HRESULT CvltPharlapRegistrar::GetConfigurationPath(wchar_t** path) {
  if (!path) return E_POINTER;
  *path = nullptr;
  DatabaseHold hold(*this);
  std::string stored;
  if (!m_registrationIni || m_registrationIni->GetItem(kGlobalSection, kConfigFile, &stored) < 0 ||
      stored.empty()) {
    return vlrDuplicateString(L"/Library/Application Support/Zentrex/KOR/Data/config3.vlt", path);
  }
  String value = Widen(stored);
  if (value != vlt::layout::kConfiguration) return vlrDuplicateString(value.c_str(), path);
  String whole;
  HRESULT result = dataDirectory(&whole);
  whole += value;
  *path = Dup(whole.c_str());
  return *path ? result : E_OUTOFMEMORY;
}

HRESULT CvltPharlapRegistrar::SetConfigurationPath(const wchar_t* path) {
  if (!path) return E_POINTER;
  DatabaseHold hold(*this);
  if (BeginChange() < 0) return E_FAIL;
  std::string stored;
  if (m_registrationIni->GetItem(kGlobalSection, kConfigFile, &stored) >= 0 && !stored.empty() &&
      Widen(stored) == path) {
    return S_OK;
  }
  String value(path);
  if (value == vlt::layout::kConfiguration) {
    dataDirectory(&value);
    value += path;
  }
  return setAndSave(kConfigFile, Narrow(value).c_str(), true);
}

// ---- GUID texts

HRESULT CvltPharlapRegistrar::StripBracesFromGuid(char* text) {
  return text ? StripBraces(text, strlen(text)) : E_POINTER;
}

HRESULT CvltPharlapRegistrar::StripBracesFromGuid(wchar_t* text) {
  return text ? StripBraces(text, wcslen(text)) : E_POINTER;
}
