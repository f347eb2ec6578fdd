#pragma once

// The jar: a small guarded INI file, <install>/Data/vltjar.ini, in which the storage server and its
// clients on one machine leave each other facts that outlive a process.
//
//   section                 key                 value
//   as the caller names it  ServerProcessID     process id
//   CookieSection           LastServerCookie    signed decimal
//   ServerSection           ServerIdentity      GUID in braces
//   OfflineStorageSection   NextEndpt           next candidate port, 61901 to 62100 in a circle
//   OfflineStorageSection   a storage's name    its endpoint; written by others
//
// Every change is one critical section among all processes, and on disk when its call returns.
// Results are those of the save; E_FAIL without an install directory or the right to make its data
// directory. Where the data directory stays absent a function does nothing and returns S_OK.
// Lock order: the settings file before the jar.

#include <memory>

#include "source/Common/vltTypes.h"
#include "source/vlIniMgr.h"
#include "zt/fnd/String.h"

// Path of the jar, new[]; null unless the data directory exists. Makes nothing.
wchar_t* GetJarFilePath();

// ---- Guarded files of the rendezvous: the jar and the settings files.

// Opens the file, checked against its sidecar. *out may be set although the result is negative: the
// sidecar was short, and the file was begun again. A digest that differs costs nothing; a file that
// cannot be parsed is set aside. E_FAIL and null where the sidecar cannot be read at the moment:
// nothing is set aside for that. Throws what the second opening throws, the int 1 of CvlIniMgr
// included.
HRESULT VltjarOpenIniWithValidation(const wchar_t* path, CvlIniMgr** out);
// The same, owned. Without an object the result is negative.
HRESULT VltjarOpen(const wchar_t* path, std::unique_ptr<CvlIniMgr>* out);
// Writes file and sidecar. A crash at any moment leaves the old or the new file.
HRESULT VltjarSaveChanges(const wchar_t* path, CvlIniMgr* ini);
// Sets the file aside and removes its sidecar. E_FAIL if the system refuses, E_UNEXPECTED
// otherwise.
HRESULT VltjarDeleteIniFile(const wchar_t* path);
bool VltjarChecksumFileExists(const wchar_t* path);
// S_OK and a new[] digest; S_FALSE if there is none; E_FAIL if it is short or cannot be read;
// E_OUTOFMEMORY.
HRESULT VltjarGetChecksumForCacheFile(const wchar_t* path, unsigned char** digest);
HRESULT VltjarSetChecksumForCacheFile(const wchar_t* path, const unsigned char* digest);

// ---- Values of the jar. An empty dataDir is filled in, and the directory made if it was missing.

// 0, which is then written, when there is none.
HRESULT vltGetServerCookieFromFile(int* out, zt::fnd::String& dataDir);
// Made at the first call on a machine, by vltCreateGuid; E_FAIL where that fails.
HRESULT vltGetServerIdentityFromFile(GUID* out, zt::fnd::String& dataDir);
// The storage's entry, or the next port.
HRESULT vltGetUniqueOfflineEndpointFromFile(zt::fnd::String storage, zt::fnd::String& endpoint,
                                            zt::fnd::String dataDir);
// The same for a client, as a vltTaskMemAlloc text. E_FAIL without a jar.
HRESULT GetOfflineEndpt(wchar_t* storage, wchar_t** endpoint);

// ---- The offline-storage family is not there: E_FAIL.
HRESULT UpdateOfflineStorageInfo(const zt::fnd::String& storage, CvlIniMgr* ini);
HRESULT ValidateOfflineStorage(const zt::fnd::String& storage, int* inUse, CvlIniMgr* ini);
HRESULT RemoveOfflineStorageInfo(const zt::fnd::String& storage, CvlIniMgr* ini);

namespace vltjar {

inline constexpr const char* kServerSection = "ServerSection";
inline constexpr const char* kServerIdentity = "ServerIdentity";

// <install>/Data/, or empty if that is no directory.
zt::fnd::String ExistingDataDirectory();

// In the process's locale; null counts as empty.
std::string Narrow(const wchar_t* text);

}  // namespace vltjar
