#include "source/Pharlap/vltPharlapRegistrar.h"

#include <string.h>
#include <wchar.h>

#include "source/Common/vltFileSecurity.h"
#include "source/Common/vltcmn.h"
#include "source/IniSidecar.h"
#include "source/Pharlap/registrarText.h"
#include "vlloader/source/vlloader.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/path.h"
#include "ztini/ztini.h"

using zt::fnd::osdep::path;
using namespace registrar;
using zt::fnd::String;

namespace {

constexpr GUID kBuiltInDictionary = {
    0x790F6A90, 0xE0D8, 0x11D3, {0xAA, 0x15, 0x00, 0x50, 0x04, 0xD1, 0x31, 0xEE}};

}  // namespace

String vlrInstallRoot() {
  const char* text = GetCurrentVltPath();
  String root(text ? text : "");
  if (!root.empty()) path::MakePathEndInSlash(root);
  return root;
}

HRESULT vlrMakeRootDirectory(const wchar_t* name, String* directory) {
  *directory = vlrInstallRoot();
  if (directory->empty()) return E_FAIL;
  *directory += name;
  path::MakePathEndInSlash(*directory);
  try {
    return vltMakeSharedDirectory(*directory);
  } catch (const zt::fnd::exception::AccessDenied&) {
    // A client without the rights still reads what another user's process has registered.
    return E_FAIL;
  }
}

CvltPharlapRegistrar::CvltPharlapRegistrar(const String& registrationFilePath,
                                           const String& installDirectory, bool init)
    : m_installDirectory(installDirectory), m_registrationFilePath(registrationFilePath) {
  if (init) Init();
}

CvltPharlapRegistrar::~CvltPharlapRegistrar() {
  m_registrationIni.reset();  // First of all, so that the lock is free for the next process.
  for (auto& [identifier, component] : components().map) {
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
  m_durable = false;
  m_registrationIni->SetDurable(false);
  initSettings();
  registerBuiltInDictionary();
  UpdateRegistrationFile();
  readComponents();
  m_resources.forget();
  m_durable = true;
  m_registrationIni->SetDurable(true);
  if (m_saved) ztini_SyncFile(Narrow(m_registrationFilePath).c_str());
}

void CvltPharlapRegistrar::initSettings() {
  String configuration;
  dataDirectory(&configuration);
  configuration += L"config3.vlt";
  SetConfigurationPath(configuration.c_str());
  SetSchemaVersion(0);
}

void CvltPharlapRegistrar::registerBuiltInDictionary() {
  String file;
  vlrMakeRootDirectory(kDictionaries, &file);
  file += L"vltdd.framework";
  String name(L"vltdd"), prefix(L"vl");
  _vltComponent2 record;
  memset(&record, 0, sizeof record);
  record.size = sizeof record;
  record.version = kDictionaryVersion;
  record.type = vltComponentDataDictionary;
  record.name = name.begin();
  record.identifier = kBuiltInDictionary;
  record.fileName = file.begin();
  record.dictionary.prefix = prefix.begin();
  RegisterDataDictionary(&record);
}

void CvltPharlapRegistrar::readComponents() {
  int count = m_registrationIni->GetNumberOfItems(kComponents);
  for (int n = 1; n <= count; ++n) {
    std::string section;
    if (m_registrationIni->GetNthItemName(kComponents, n, &section) < 0 || section.empty())
      continue;
    ReadComponent(Widen(section).c_str());
  }
}

// ---- The database file

HRESULT CvltPharlapRegistrar::OpenIniWithValidation() {
  std::string file = Narrow(m_registrationFilePath);
  // From the sidecar on: another process may be about to mend what this one would set aside.
  std::unique_ptr<IniFileLock> hold = IniFileLock::ForFile(file.c_str());
  unsigned char* found = nullptr;
  HRESULT result = GetChecksumForCacheFile(&found);
  std::unique_ptr<unsigned char[]> digest(found);
  try {
    if (result < 0) DeleteIniFile();
    if (result == S_FALSE) result = S_OK;
    m_registrationIni = std::make_unique<CvlIniMgr>(file.c_str(), false, digest.get(), false, true);
  } catch (...) {
    // Whatever it was: a digest that differs, a file that has just been set aside, a failure that
    // may have passed. The second opening takes the file as it is, and its failure counts.
    m_registrationIni = std::make_unique<CvlIniMgr>(file.c_str(), false, nullptr, false, true);
  }
  return result;
}

std::string CvltPharlapRegistrar::sidecarName() const {
  return CvlIniMgr::SidecarName(Narrow(m_registrationFilePath));
}

HRESULT CvltPharlapRegistrar::GetChecksumForCacheFile(unsigned char** digest) {
  *digest = nullptr;
  try {
    return IniSidecar::Read(sidecarName(), digest);
  } catch (const std::bad_alloc&) {
    throw;  // Says nothing of the sidecar: the database must not be set aside for it.
  } catch (const std::exception&) {
    return E_FAIL;  // A sidecar that cannot be read for any reason is an unusable one.
  }
}

HRESULT CvltPharlapRegistrar::SetChecksumForCacheFile(const unsigned char* digest) {
  try {
    return IniSidecar::Write(sidecarName(), digest, m_durable);
  } catch (const std::exception&) {
    return E_FAIL;  // The database stands; only its digest is old, which the next opening survives.
  }
}

bool CvltPharlapRegistrar::ChecksumFileExists() {
  try {
    return path::DoesFileExist(Widen(sidecarName()));
  } catch (const std::exception&) {
    return false;  // Not to be seen is not there: the mark is written, or fails, and that is
                   // ignored.
  }
}

HRESULT CvltPharlapRegistrar::DeleteIniFile() {
  try {
    CvlIniMgr::SetAside(m_registrationFilePath);
    return S_OK;
  } catch (const zt::fnd::exception::Exception&) {
    return E_FAIL;  // What cannot be set aside is opened as it is.
  }
}

HRESULT CvltPharlapRegistrar::SaveChanges() {
  if (!m_registrationIni) return S_OK;
  m_resources.forget();
  m_saved = true;
  // Without the mark, a crash in the first save would leave a database that looks as if it had
  // never had a sidecar, and so cannot be told from a whole one.
  if (!ChecksumFileExists()) SetChecksumForCacheFile(IniSidecar::kInvalidMark);
  unsigned char* written = nullptr;
  HRESULT result = m_registrationIni->WriteAndGetChecksum(&written);
  std::unique_ptr<unsigned char[]> digest(written);
  if (result < 0 || !digest) return result;
  return SetChecksumForCacheFile(digest.get());
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
constexpr const wchar_t* kBareConfiguration = L"config3.vlt";

}  // namespace

HRESULT CvltPharlapRegistrar::GetSchemaVersion(unsigned int* version) {
  if (!version) return E_POINTER;
  std::lock_guard hold(m_iniLock);
  *version = Setting(m_registrationIni.get(), kSchemaVersion, 0);
  return S_OK;
}

// A name of our own is not set only where memory is out. Then nothing is saved, or the caller would be
// told that it was.
HRESULT CvltPharlapRegistrar::setAndSave(const char* key, const char* value, bool quote) {
  if (m_registrationIni->SetItem(kGlobalSection, key, value, quote) < 0) return E_OUTOFMEMORY;
  return SaveChanges();
}

HRESULT CvltPharlapRegistrar::SetSchemaVersion(unsigned int version) {
  std::lock_guard hold(m_iniLock);
  if (!m_registrationIni) return E_FAIL;
  std::string present;
  if (m_registrationIni->GetItem(kGlobalSection, kSchemaVersion, &present) >= 0 &&
      !present.empty() && Number(present) == version) {
    return S_OK;
  }
  return setAndSave(kSchemaVersion, Decimal(version).c_str(), false);
}

HRESULT CvltPharlapRegistrar::GetStorageServerCacheSize(unsigned int* sizeBytes) {
  if (!sizeBytes) return E_POINTER;
  std::lock_guard hold(m_iniLock);
  *sizeBytes = Setting(m_registrationIni.get(), kCacheSize, kDefaultCacheSizeBytes);
  return S_OK;
}

HRESULT CvltPharlapRegistrar::SetStorageServerCacheSize(unsigned int sizeBytes) {
  std::lock_guard hold(m_iniLock);
  if (!m_registrationIni) return E_FAIL;
  return setAndSave(kCacheSize, Decimal(sizeBytes).c_str(), false);
}

HRESULT CvltPharlapRegistrar::dataDirectory(String* directory) {
  return vlrMakeRootDirectory(L"Data", directory);
}

HRESULT CvltPharlapRegistrar::GetConfigurationPath(wchar_t** path) {
  if (!path) return E_POINTER;
  *path = nullptr;
  std::lock_guard hold(m_iniLock);
  std::string stored;
  if (!m_registrationIni || m_registrationIni->GetItem(kGlobalSection, kConfigFile, &stored) < 0 ||
      stored.empty()) {
    return vlrDuplicateString(L"/Library/Application Support/Zentrex/KOR/Data/config3.vlt", path);
  }
  String value = Widen(stored);
  if (value != kBareConfiguration) return vlrDuplicateString(value.c_str(), path);
  String whole;
  HRESULT result = dataDirectory(&whole);
  whole += value;
  *path = Dup(whole.c_str());
  return *path ? result : E_OUTOFMEMORY;
}

HRESULT CvltPharlapRegistrar::SetConfigurationPath(const wchar_t* path) {
  if (!path) return E_POINTER;
  std::lock_guard hold(m_iniLock);
  if (!m_registrationIni) return E_FAIL;
  std::string stored;
  if (m_registrationIni->GetItem(kGlobalSection, kConfigFile, &stored) >= 0 && !stored.empty() &&
      Widen(stored) == path) {
    return S_OK;
  }
  String value(path);
  if (value == kBareConfiguration) {
    dataDirectory(&value);
    value += path;
  }
  return setAndSave(kConfigFile, Narrow(value).c_str(), true);
}

// ---- GUID texts

namespace {

constexpr size_t kBracedLength = 38;

template <class Char>
HRESULT StripBraces(Char* text, size_t length) {
  if (length != kBracedLength) return S_FALSE;
  if (text[0] != '{' || text[kBracedLength - 1] != '}') return E_FAIL;
  memmove(text, text + 1, (kBracedLength - 2) * sizeof(Char));
  text[kBracedLength - 2] = 0;
  return S_OK;
}

}  // namespace

HRESULT CvltPharlapRegistrar::StripBracesFromGuid(char* text) {
  return text ? StripBraces(text, strlen(text)) : E_POINTER;
}

HRESULT CvltPharlapRegistrar::StripBracesFromGuid(wchar_t* text) {
  return text ? StripBraces(text, wcslen(text)) : E_POINTER;
}
