// What the jar holds: the server's process, cookie and identity, and the offline endpoints.
//
// Every value is one critical section of the jar's lock: opened, read or changed, saved and closed
// in one call. A reader that finds nothing writes what it returns, so that all processes that ask
// from then on get the same.
//
// Ports of offline storages are given in a circle. Whether one is in use only the offline-storage
// family could say, which is not part of this library: by its constant failure every candidate
// counts as free, and the search ends at its first round.
#include <errno.h>
#include <stdio.h>
#include <stdlib.h>

#include "source/Common/vltFileSecurity.h"
#include "source/Common/vltResultOf.h"
#include "source/Common/vltcmn.h"
#include "source/Utilities/vltjar.h"
#include "source/Utilities/vltutils.h"
#include "vlloader/source/InstallLayout.h"
#include "vlloader/source/vlloader.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/path.h"
#include "zt/posix/Files.h"

using vltjar::Narrow;
using zt::fnd::String;
using zt::fnd::osdep::path;

namespace {

constexpr const char* kCookieSection = "CookieSection";
constexpr const char* kLastServerCookie = "LastServerCookie";
constexpr const char* kOfflineSection = "OfflineStorageSection";
constexpr const char* kNextEndpoint = "NextEndpt";

constexpr int kFirstEndpoint = 61901;
constexpr int kEndpointLimit = 62101;
// Twice around the circle: with a family that answers, every port may be in use.
constexpr int kMostRounds = 400;

// By strtol, since atoi leaves open what it returns for a number that is too large.
int NumberIn(const std::string& text) {
  return static_cast<int>(strtol(text.c_str(), nullptr, 10));
}

// <install>/Data/, whether it is there or not; empty without an install directory.
String DataDirectory() {
  String root = vlt::layout::InstallRoot();
  return root.empty() ? root : vlt::layout::DirectoryIn(root, vlt::layout::kData);
}

// Fills in an empty dataDir and makes the directory if it is missing.
HRESULT PrepareDataDirectory(String& dataDir) {
  if (!dataDir.empty()) return S_OK;
  dataDir = DataDirectory();
  if (dataDir.empty()) return E_FAIL;
  // A result of the exports, not an error of the caller's program.
  return vlt::ResultOf<zt::fnd::exception::AccessDenied>(
      E_FAIL, [&] { return vltMakeSharedDirectory(dataDir); });
}

bool DirectoryIsUnknown(const String& directory) {
  return !zt::posix::LookUp(Narrow(directory.c_str()).c_str()) && zt::posix::IsPassing(errno);
}

// Runs `use` on the opened jar, if it can be opened.
template <class Use>
HRESULT WithJar(const wchar_t* jar, Use use) {
  std::unique_ptr<CvlIniMgr> ini;
  HRESULT result = VltjarOpen(jar, &ini);
  return ini ? use(*ini) : result;
}

template <class Use>
HRESULT WithPreparedJar(String& dataDir, Use use) {
  HRESULT result = PrepareDataDirectory(dataDir);
  if (result < 0) return result;
  std::unique_ptr<wchar_t[]> jar(GetJarFilePath());
  // The directory stays absent: there is nothing to read or to keep. One that cannot be examined
  // for the moment is not absent, and what it holds must not be reported as missing.
  if (!jar) return DirectoryIsUnknown(dataDir) ? E_FAIL : result;
  return WithJar(jar.get(), [&](CvlIniMgr& ini) { return use(jar.get(), ini); });
}

// For names of the library's own: setting one fails only when out of memory. Then nothing is saved:
// a success of the save would report the item as saved.
HRESULT SetAndSave(const wchar_t* jar, CvlIniMgr& ini, const char* section, const char* item,
                   const std::string& value) {
  if (ini.SetItem(section, item, value.c_str(), false) < 0) return E_OUTOFMEMORY;
  return VltjarSaveChanges(jar, &ini);
}

}  // namespace

String vltjar::ExistingDataDirectory() {
  String directory = DataDirectory();
  // Twice: a failure of the machine, which may have passed, must not be taken for "not there".
  for (int attempt = 0; attempt < 2; ++attempt) {
    if (path::IsDirectory(directory.c_str())) return directory;
  }
  return String();
}

wchar_t* GetJarFilePath() {
  String directory = vltjar::ExistingDataDirectory();
  if (directory.empty()) return nullptr;
  String file = directory + vlt::layout::kJar;
  auto* copy = new wchar_t[file.length() + 1];
  wcscpy(copy, file.c_str());
  return copy;
}

// What would fill the entries of offline storages lies outside this library.
HRESULT UpdateOfflineStorageInfo(const String&, CvlIniMgr*) { return E_FAIL; }
HRESULT ValidateOfflineStorage(const String&, int*, CvlIniMgr*) { return E_FAIL; }
HRESULT RemoveOfflineStorageInfo(const String&, CvlIniMgr*) { return E_FAIL; }

HRESULT vltAddSvrProcessIDToJar(const wchar_t* section, long processID) {
  String dataDir;
  return WithPreparedJar(dataDir, [&](const wchar_t* jar, CvlIniMgr& ini) {
    // The section is the caller's: a name that no section can have is not kept.
    HRESULT result = ini.SetItem(Narrow(section).c_str(), "ServerProcessID",
                                 std::to_string(processID).c_str(), false);
    return result < 0 ? result : VltjarSaveChanges(jar, &ini);
  });
}

HRESULT vltSetServerCookie(int cookie) {
  std::unique_ptr<wchar_t[]> jar(GetJarFilePath());
  if (!jar) return E_FAIL;
  return WithJar(jar.get(), [&](CvlIniMgr& ini) {
    return SetAndSave(jar.get(), ini, kCookieSection, kLastServerCookie, std::to_string(cookie));
  });
}

HRESULT vltGetServerCookieFromFile(int* out, String& dataDir) {
  return WithPreparedJar(dataDir, [&](const wchar_t* jar, CvlIniMgr& ini) {
    std::string value;
    HRESULT result = ini.GetItem(kCookieSection, kLastServerCookie, &value);
    *out = result >= 0 ? NumberIn(value) : 0;
    if (result >= 0) return result;
    return SetAndSave(jar, ini, kCookieSection, kLastServerCookie, "0");
  });
}

HRESULT vltGetServerIdentity(GUID* out) {
  if (!out) return E_POINTER;
  String dataDir = vltjar::ExistingDataDirectory();
  return vltGetServerIdentityFromFile(out, dataDir);
}

HRESULT vltGetServerIdentityFromFile(GUID* out, String& dataDir) {
  return WithPreparedJar(dataDir, [&](const wchar_t* jar, CvlIniMgr& ini) {
    std::string value;
    HRESULT result = ini.GetItem(vltjar::kServerSection, vltjar::kServerIdentity, &value);
    if (result >= 0) {
      *out = vltGuidFromString2(String(value.c_str()).c_str());
      return result;
    }
    // The result is that of the look-up, E_FAIL: the export promises no more than that none was
    // made.
    if (vltCreateGuid2(out) < 0) return result;
    TaskMem<wchar_t> text(vltGuidToString2(*out));
    // Never an empty identity: it could not be read again.
    if (!text || !*text.get()) return E_OUTOFMEMORY;
    return SetAndSave(jar, ini, vltjar::kServerSection, vltjar::kServerIdentity,
                      Narrow(text.get()));
  });
}

namespace {

// The next port of the circle; the one after it is stored for the next caller.
std::string TakeCandidate(CvlIniMgr& ini) {
  std::string value;
  int candidate = kFirstEndpoint;
  if (ini.GetItem(kOfflineSection, kNextEndpoint, &value) >= 0) candidate = NumberIn(value);
  int next = candidate < kEndpointLimit - 1 ? candidate + 1 : kFirstEndpoint;
  ini.SetItem(kOfflineSection, kNextEndpoint, std::to_string(next).c_str(), false);
  return std::to_string(candidate);
}

bool IsFree(CvlIniMgr& ini, const std::string& candidate) {
  std::string storage;
  int inUse = 1;
  return ini.GetItem(kOfflineSection, candidate.c_str(), &storage) < 0 ||
         ValidateOfflineStorage(String(storage.c_str()), &inUse, &ini) < 0;
}

std::string FindEndpoint(CvlIniMgr& ini, const String& storage) {
  std::string entry;
  if (ini.GetItem(kOfflineSection, Narrow(storage.c_str()).c_str(), &entry) >= 0) {
    int inUse = 1;
    ValidateOfflineStorage(storage, &inUse, &ini);
    return entry;
  }
  std::string candidate = TakeCandidate(ini);
  for (int round = 1; round < kMostRounds && !IsFree(ini, candidate); ++round) {
    candidate = TakeCandidate(ini);
  }
  return candidate;
}

}  // namespace

HRESULT vltGetUniqueOfflineEndpointFromFile(String storage, String& endpoint, String dataDir) {
  return WithPreparedJar(dataDir, [&](const wchar_t* jar, CvlIniMgr& ini) {
    endpoint = String(FindEndpoint(ini, storage).c_str());
    return VltjarSaveChanges(jar, &ini);
  });
}

HRESULT GetOfflineEndpt(wchar_t* storage, wchar_t** endpoint) {
  std::unique_ptr<wchar_t[]> jar(GetJarFilePath());
  if (!jar) return E_FAIL;
  // Held across the reading and the saving inside, so that both are one step for other processes.
  CvlIniMgr hold = CvlIniMgr::LockOnly(Narrow(jar.get()));
  String found;
  HRESULT result =
      vltGetUniqueOfflineEndpointFromFile(String(storage ? storage : L""), found, String());
  return result < 0 ? result : vltDuplicateString2(found.c_str(), endpoint);
}
