#pragma once

// Finds the installed storage and reaches it by name, so that a program need not link it.
//
// There are two reference counts, one on the other: KorInitialize and KorFinalize count users;
// every forwarding call counts a load that nothing takes back, unless KorInitialize came first. So
// only a program that calls KorInitialize before anything else unloads the storage with
// KorFinalize.
//
// A storage that could not be loaded is not looked for again until the clean-up.
// Threads: one recursive lock guards all state; forwarded calls run outside it, but for those of
// KorInitialize and KorFinalize.

#include <string>

#include "source/Common/vltTypes.h"

// Domain of the preference "Dir", and the install directory where it is not set.
inline constexpr const char* kKorPreferenceDomain = "com.zentrex.kor";
inline constexpr const char* kKorDefaultDirectory = "/Library/Application Support/Zentrex/KOR";

// Install directory of this moment: the preference "Dir", or the default where it is not set or
// longer than 1023 bytes. Empty if the preference is. Narrow text, as it goes to the file system.
std::string vlLookUpInstallDirectory();

// Install directory as it was at the first call; null if that was empty. The text stays until a
// clean-up.
const char* GetCurrentVltPath();
const char* GetCurrentKorPath();
// Nothing is known of these: null. The version is an empty text.
const char* GetInstalledVltPath();
const char* GetInstalledVltVersion();
const char* GetCurrentVltVersion();
const char* GetInstalledKorPath();
const char* GetInstalledKorVersion();
const char* GetInstalledKorCommand();
const char* GetCurrentKorCommand();
const char* GetCurrentKorVersion();

// Loads the storage and starts it with its "vltInitialize"; its result, or S_OK if it has none.
// Further calls only count, up to 1000000, from where the count never falls again.
HRESULT KorInitialize();
// E_FAIL without KorInitialize. The last one runs "vltFinalize", gives its result, and unloads.
HRESULT KorFinalize();
// Takes one load back; the last one unloads, and the preference is read again afterwards.
void KorCleanup();

// The storage's configuration object for a URL, or null. *status, which may be null, gets the
// storage's result: E_FAIL if it is not there, or answers success without an object.
void* GetKorConfiguration(unsigned flags, wchar_t* url);
void* GetKorConfiguration2(unsigned flags, wchar_t* url, int* status);
// The same from start-up options; null options give E_POINTER, and nothing is loaded.
void* GetKorConfigurationEx(_vltStartupOptions* options, int* status);
// True if the storage and this library could both be loaded from the install directory.
bool IsKorStoragePresent();

// Forwarded to this library as it is installed. 0, null or the null GUID if it is not there.
void* KorFree(void* p);
wchar_t* KorGuidToString(GUID g);
GUID KorGuidFromString(const char* s);
wchar_t* KorU32ToString(unsigned v);
