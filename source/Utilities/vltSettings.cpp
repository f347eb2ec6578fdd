// Endpoints, ports and cache limits from the settings file, <install>/Data/kor.ini or a named one.
//
// One object opens the file and answers for each value; the exports name the values in a fixed
// order. The order shows: a missing text makes any result E_FAIL, and the jar is opened while the
// settings file is still held, which is the lock order of the two. A number has a default in every
// case; a text has one at index 3 only.
#include <stdlib.h>

#include <algorithm>

#include "source/Common/vltcmn.h"
#include "source/Utilities/vltSettingsKeys.h"
#include "source/Utilities/vltjar.h"
#include "source/Utilities/vltutils.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/String.h"

using namespace settings;
using zt::fnd::String;

namespace {

// An open settings file, or none, which answers with the defaults. Every output is optional: a
// value that the caller does not want is not read.
class Settings {
 public:
  // `named`: the file is <name>.ini, if there is a name.
  HRESULT open(bool named, const wchar_t* name) {
    m_directory = vltjar::ExistingDataDirectory();
    // Not an error: a client of a machine without an installation gets the defaults.
    if (m_directory.empty()) return S_OK;
    String file =
        m_directory + (named && name ? String(name) + L".ini" : String(vlt::layout::kSettings));
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
    read(kEventNameAppend + std::to_string(index), &value);
    vltDuplicateString2(String(value.c_str()).c_str(), out);
  }

  void u32(const PlainNumber& row, unsigned* out) const {
    if (!out) return;
    std::string value;
    *out = static_cast<unsigned>(row.fallback);
    if (read(row.key, &value)) *out = vltU32FromString2(String(value.c_str()).c_str());
  }

  void flag(const PlainNumber& row, unsigned* out) const {
    if (!out) return;
    std::string value;
    *out = static_cast<unsigned>(row.fallback);
    if (read(row.key, &value)) *out = vltI32FromString2(String(value.c_str()).c_str()) != 0;
  }

  long number(const PlainNumber& row) const {
    std::string value;
    return read(row.key, &value) ? strtol(value.c_str(), nullptr, 10) : row.fallback;
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
  settings.u32(kObjectCacheLimit, objectCacheLimit);
  settings.u32(kObjectCacheFlushPercentage, objectCacheFlushPercentage);
  settings.u32(kBufferCacheLimit, bufferCacheLimit);
  settings.u32(kBufferCacheMinimumLimit, bufferCacheMinimumLimit);
  settings.u32(kBufferCacheFlushPercentage, bufferCacheFlushPercentage);
  settings.u32(kGarbageCollectorInterval, garbageCollectorInterval);
  return status;
}

namespace {

void ReadRemoteEnabled(const Settings& settings, unsigned index, unsigned* out) {
  std::string key = kRemoteServerEnabled + std::to_string(index);
  settings.u32({key.c_str(), 0}, out);
  if (out) *out = *out != 0;
}

void ReadCheckpoints(const Settings& settings, long* numCheckpoints, unsigned* createCheckpoints) {
  if (numCheckpoints) *numCheckpoints = std::max(settings.number(kNumCheckpoints), 0L);
  if (createCheckpoints) *createCheckpoints = settings.number(kCreateCheckpoints) != 0;
}

void ReadCookie(const Settings& settings, int* lastServerCookie) {
  if (!lastServerCookie) return;
  // With the directory filled in the call below does not make it.
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
  settings.flag(kJournalingOptions, journalingOptions);
  if (maxBackupFrequency) *maxBackupFrequency = settings.number(kMaxBackupFrequency);
  settings.flag(kValidateDBStructure, validateDBStructure);
  ReadCheckpoints(settings, numCheckpoints, createCheckpoints);
  ReadCookie(settings, lastServerCookie);
  status = settings.text(kBootstrapEndpoint, index, bootstrapEndpoint, status);
  status = settings.text(kRemoteProtocol, index, remoteProtocol, status);
  status = settings.text(kRemoteEndpoint, index, remoteEndpoint, status);
  status = settings.text(kRemoteEventPort, index, remoteEventPort, status);
  status = settings.text(kLocalProtocol, index, localProtocol, status);
  return settings.text(kLocalEndpoint, index, localEndpoint, status);
}
