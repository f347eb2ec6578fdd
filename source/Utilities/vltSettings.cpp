// Endpoints, ports and cache limits from the settings file, <install>/Data/kor.ini or a named one.
#include <stdlib.h>

#include <iterator>

#include "source/Common/vltcmn.h"
#include "source/Utilities/vltjar.h"
#include "source/Utilities/vltutils.h"
#include "zt/fnd/String.h"

using zt::fnd::String;

namespace {

constexpr const char* kSection = "STORAGE";

// The one index that has defaults.
constexpr unsigned kDefaultIndex = 3;

struct IndexedText {
  const char* key;
  const wchar_t* atDefaultIndex;
};
constexpr IndexedText kBootstrapEndpoint = {"BootstrapEndpoint", L"62602"};
constexpr IndexedText kRemoteProtocol = {"RemoteServerProtocol", L"ncacn_ip_tcp"};
constexpr IndexedText kRemoteEndpoint = {"RemoteServerEndpoint", L"51700"};
constexpr IndexedText kRemoteEventPort = {"RemoteEventPort", L"57616"};
constexpr IndexedText kLocalProtocol = {"LocalServerProtocol", L"ncalrpc"};
constexpr IndexedText kLocalEndpoint = {"LocalServerEndpoint", L"61900"};

// An open settings file, or none, which answers with the defaults. Every output is optional: a value
// that nobody wants is not read.
class Settings {
 public:
  // `named`: the file is <name>.ini, if there is a name.
  HRESULT open(bool named, const wchar_t* name) {
    m_directory = vltjar::ExistingDataDirectory();
    if (m_directory.empty()) return S_OK;
    String file = m_directory + (named && name ? String(name) + L".ini" : String(L"kor.ini"));
    m_opened = VltjarOpen(file.c_str(), &m_ini);
    return m_opened;
  }

  // False if the file was there to be opened, and could not be.
  bool usable() const { return m_ini || m_directory.empty(); }
  const String& directory() const { return m_directory; }

  bool read(const std::string& key, std::string* value) const {
    return m_ini && m_ini->GetItem(kSection, key.c_str(), value) >= 0;
  }

  // E_FAIL, and the output untouched, where there is neither a value nor a default; else `status`.
  HRESULT text(const IndexedText& row, unsigned index, wchar_t** out, HRESULT status) const {
    if (!out) return status;
    std::string value;
    if (read(row.key + std::to_string(index), &value)) {
      vltDuplicateString2(String(value.c_str()).c_str(), out);
    } else if (index == kDefaultIndex) {
      vltDuplicateString2(row.atDefaultIndex, out);
    } else {
      return E_FAIL;
    }
    return status;
  }

  void eventNameAppend(unsigned index, wchar_t** out) const {
    if (!out) return;
    std::string value;
    read("EventNameAppend" + std::to_string(index), &value);
    vltDuplicateString2(String(value.c_str()).c_str(), out);
  }

  void u32(const char* key, unsigned fallback, unsigned* out) const {
    if (!out) return;
    std::string value;
    *out = read(key, &value) ? vltU32FromString2(String(value.c_str()).c_str()) : fallback;
  }

  void flag(const char* key, unsigned fallback, unsigned* out) const {
    if (!out) return;
    std::string value;
    *out = fallback;
    if (read(key, &value)) *out = vltI32FromString2(String(value.c_str()).c_str()) != 0;
  }

  // False, with the fallback, without a value.
  bool number(const char* key, long fallback, long* out) const {
    std::string value;
    bool found = read(key, &value);
    *out = found ? atol(value.c_str()) : fallback;
    return found;
  }

 private:
  String m_directory;
  HRESULT m_opened = S_OK;
  std::unique_ptr<CvlIniMgr> m_ini;
};

}  // namespace

HRESULT vltGetClientSettings(unsigned index, unsigned remote, unsigned offline, const wchar_t* name,
                             wchar_t** bootstrapEndpoint, wchar_t** protocol, wchar_t** endpoint,
                             wchar_t** eventPort, wchar_t** eventNameAppend) {
  Settings settings;
  HRESULT status = settings.open(offline != 0, name);
  if (!settings.usable()) return status;
  settings.eventNameAppend(index, eventNameAppend);
  status = settings.text(kBootstrapEndpoint, index, bootstrapEndpoint, status);
  if (remote) {
    status = settings.text(kRemoteProtocol, index, protocol, status);
    status = settings.text(kRemoteEndpoint, index, endpoint, status);
    return settings.text(kRemoteEventPort, index, eventPort, status);
  }
  status = settings.text(kLocalProtocol, index, protocol, status);
  if (!offline) return settings.text(kLocalEndpoint, index, endpoint, status);
  // The answer of the jar is the answer, whatever was missing before.
  return endpoint ? GetOfflineEndpt(const_cast<wchar_t*>(name), endpoint) : status;
}

HRESULT vltGetClientCacheSettings(unsigned* objectCacheLimit, unsigned* objectCacheFlushPercentage,
                                  unsigned* bufferCacheLimit, unsigned* bufferCacheMinimumLimit,
                                  unsigned* bufferCacheFlushPercentage,
                                  unsigned* garbageCollectorInterval, unsigned useName,
                                  const wchar_t* name) {
  Settings settings;
  HRESULT status = settings.open(useName != 0, name);
  if (!settings.usable()) return status;
  settings.u32("ClientObjectCacheLimit", 150000, objectCacheLimit);
  settings.u32("ClientObjectCacheFlushPercentage", 20, objectCacheFlushPercentage);
  settings.u32("ClientBufferCacheLimit", 0x2000000, bufferCacheLimit);
  settings.u32("ClientBufferCacheMinimumLimit", 0x200000, bufferCacheMinimumLimit);
  settings.u32("ClientBufferCacheFlushPercentage", 20, bufferCacheFlushPercentage);
  settings.u32("GarbageCollectorInterval", 20000, garbageCollectorInterval);
  return status;
}

namespace {

void ReadRemoteEnabled(const Settings& settings, unsigned index, unsigned* out) {
  settings.u32(("RemoteServerEnabled" + std::to_string(index)).c_str(), 0, out);
  if (out) *out = *out != 0;
}

void ReadCheckpoints(const Settings& settings, long* numCheckpoints, unsigned* createCheckpoints) {
  long value;
  if (numCheckpoints) {
    settings.number("NumCheckpoints", 100, &value);
    *numCheckpoints = value < 0 ? 0 : value;
  }
  if (createCheckpoints) {
    settings.number("CreateCheckpoints", 1, &value);
    *createCheckpoints = value != 0;
  }
}

void ReadCookie(const Settings& settings, int* lastServerCookie) {
  if (!lastServerCookie) return;
  String dataDir = settings.directory();
  vltGetServerCookieFromFile(lastServerCookie, dataDir);  // Without a cookie the rest still counts.
}

}  // namespace

HRESULT vltGetServerSettings(unsigned index, unsigned* remoteEnabled, wchar_t** bootstrapEndpoint,
                             wchar_t** remoteProtocol, wchar_t** remoteEndpoint,
                             wchar_t** remoteEventPort, wchar_t** localProtocol,
                             wchar_t** localEndpoint, int* lastServerCookie,
                             wchar_t** eventNameAppend, long* maxBackupFrequency, unsigned useName,
                             const wchar_t* name, unsigned* journalingOptions,
                             unsigned* validateDBStructure, long* numCheckpoints,
                             unsigned* createCheckpoints) {
  Settings settings;
  HRESULT status = settings.open(useName != 0, name);
  if (!settings.usable()) return status;
  ReadRemoteEnabled(settings, index, remoteEnabled);
  settings.eventNameAppend(index, eventNameAppend);
  settings.flag("JournalingOptions", 1, journalingOptions);
  if (maxBackupFrequency) settings.number("MaxBackupFrequency", 86400, maxBackupFrequency);
  settings.flag("ValidateDBStructure", 1, validateDBStructure);
  ReadCheckpoints(settings, numCheckpoints, createCheckpoints);
  ReadCookie(settings, lastServerCookie);
  status = settings.text(kBootstrapEndpoint, index, bootstrapEndpoint, status);
  status = settings.text(kRemoteProtocol, index, remoteProtocol, status);
  status = settings.text(kRemoteEndpoint, index, remoteEndpoint, status);
  status = settings.text(kRemoteEventPort, index, remoteEventPort, status);
  status = settings.text(kLocalProtocol, index, localProtocol, status);
  return settings.text(kLocalEndpoint, index, localEndpoint, status);
}
