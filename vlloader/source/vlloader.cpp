// The storage is reached by names of entries, fetched once when it is loaded. What is loaded is
// guarded by one lock; forwarded calls take the entry under it and make the call outside, since a
// storage may take its time and may call back.
//
// Loads and users are counted apart. A forwarding call counts a load, since its caller relies on
// the storage from then on and never says when no longer; only users, who call KorInitialize and
// KorFinalize, can end it.
#include "vlloader/source/vlloader.h"

#include <climits>
#include <cstdio>
#include <memory>

#include "vlloader/source/Preference.h"
#include "vlloader/source/StorageModule.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/ForkSafeMutex.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/LeakedInstance.h"
#include "ztcom/ztcore/ztunknown.h"

using zt::fnd::osdep::AtFork;
using zt::fnd::osdep::ForkSafeMutex;
using zt::fnd::osdep::Hold;
using zt::fnd::osdep::LeakedInstance;

namespace {

constexpr int kSaturated = 1000000;
constexpr size_t kLongestPath = 1023;

using GetConfiguration = HRESULT (*)(wchar_t* url, unsigned flags, void** out);
using GetConfigurationEx = HRESULT (*)(_vltStartupOptions* options, void** out);
using Initialize = HRESULT (*)(void*);
using Finalize = HRESULT (*)();
using U32ToString = wchar_t* (*)(unsigned);
using GuidFromString = GUID (*)(const wchar_t*);
using GuidToString = wchar_t* (*)(GUID);
using Free = void (*)(void*);

struct Entries {
  GetConfiguration getConfiguration = nullptr;
  GetConfigurationEx getConfigurationEx = nullptr;
  Initialize initialize = nullptr;
  Finalize finalize = nullptr;
  U32ToString u32ToString = nullptr;
  GuidFromString guidFromString = nullptr;
  GuidToString guidToString = nullptr;
  Free free = nullptr;
};

// What is loaded, and its own lock: Hold hold(loader).
//
// A child that was forked while another thread was loading or unloading, for longer than a fork
// waits, starts with nothing loaded. What is half changed is left as it is, out of reach.
class CAPABILITY("loader") Loader {
 public:
  void lock() ACQUIRE() NO_THREAD_SAFETY_ANALYSIS {
    m_lock.lock();
    if (m_lock.takeInterrupted()) forget();
  }
  void unlock() RELEASE() NO_THREAD_SAFETY_ANALYSIS { m_lock.unlock(); }

  bool pathInitialized GUARDED_BY(this) = false;
  bool loadTried GUARDED_BY(this) = false;
  int loads GUARDED_BY(this) = 0;
  bool inEffect GUARDED_BY(this) = false;  // between KorInitialize and the last KorFinalize
  int users GUARDED_BY(this) = 0;
  // Never reallocates, so that a text returned before a clean-up stays readable memory.
  std::string path GUARDED_BY(this) = [] {
    std::string empty;
    empty.reserve(kLongestPath);
    return empty;
  }();
  std::unique_ptr<StorageModule> storage GUARDED_BY(this), utilities GUARDED_BY(this);
  Entries entries GUARDED_BY(this);

 private:
  void forget() REQUIRES(this) {
    pathInitialized = loadTried = inEffect = false;
    loads = users = 0;
    (void)storage.release();
    (void)utilities.release();
    entries = Entries();
  }

  ForkSafeMutex m_lock{AtFork::Wait, 30};
};

Loader& TheLoader() { return LeakedInstance<Loader>(); }

const char* NullIfEmpty(const std::string& text) { return text.empty() ? nullptr : text.c_str(); }

void PathInit(Loader& l) REQUIRES(l) {
  if (l.pathInitialized) return;
  const std::string found = vlLookUpInstallDirectory();
  l.path.assign(found);  // by bytes: to move it would give the text's memory away
  l.pathInitialized = true;
}

template <class Function>
void Fetch(const StorageModule& module, const char* name, Function* out) {
  *out = reinterpret_cast<Function>(module.find(name));
}

void FetchEntries(Loader& l) REQUIRES(l) {
  Fetch(*l.storage, "vltGetConfiguration", &l.entries.getConfiguration);
  Fetch(*l.storage, "vltGetConfigurationEx", &l.entries.getConfigurationEx);
  Fetch(*l.storage, "vltInitialize", &l.entries.initialize);
  Fetch(*l.storage, "vltFinalize", &l.entries.finalize);
  Fetch(*l.utilities, "vltU32ToString", &l.entries.u32ToString);
  Fetch(*l.utilities, "vltGuidFromString", &l.entries.guidFromString);
  Fetch(*l.utilities, "vltGuidToString", &l.entries.guidToString);
  Fetch(*l.utilities, "vltFree", &l.entries.free);
}

void Init(Loader& l) REQUIRES(l) {
  if (l.inEffect) return;
  if (l.loadTried) {
    // The count stops at its limit: a wrapped one would unload under its users.
    if (l.loads < INT_MAX) ++l.loads;
    return;
  }
  PathInit(l);
  l.loadTried = true;
  if (l.path.empty()) {
    puts("Failed to get kor install path.");
    return;
  }
  l.utilities = StorageModule::Open(l.path, "vltutils");
  l.storage = StorageModule::Open(l.path, "vlt");
  if (!l.storage || !l.utilities) return;
  FetchEntries(l);
  l.loads = 1;
}

// The entries after a load was counted, for a call outside the lock.
Entries LoadedEntries() {
  Loader& l = TheLoader();
  Hold hold(l);
  Init(l);
  return l.entries;
}

template <class Call>
void* Configuration(bool present, int* status, Call call) {
  if (!present) {
    if (status) *status = E_FAIL;
    return nullptr;
  }
  void* configuration = nullptr;
  HRESULT result = call(&configuration);
  // A success without an object would have the caller use null.
  if (status) *status = result >= 0 && !configuration ? E_FAIL : result;
  return configuration;
}

const char* Path() {
  Loader& l = TheLoader();
  Hold hold(l);
  PathInit(l);
  return NullIfEmpty(l.path);
}

}  // namespace

std::string vlLookUpInstallDirectory() {
  auto directory = vlReadPreference(kKorPreferenceDomain, "Dir");
  return directory && directory->size() <= kLongestPath ? *directory : kKorDefaultDirectory;
}

const char* GetCurrentVltPath() { return Path(); }
const char* GetCurrentKorPath() { return Path(); }

// The look-up of these went with the installer that wrote them; the calls stay for their callers.
const char* GetInstalledVltPath() { return Path(), nullptr; }
const char* GetInstalledVltVersion() { return Path(), nullptr; }
const char* GetCurrentVltVersion() { return Path(), nullptr; }
const char* GetInstalledKorPath() { return Path(), nullptr; }
const char* GetInstalledKorVersion() { return Path(), nullptr; }
const char* GetInstalledKorCommand() { return Path(), nullptr; }
const char* GetCurrentKorCommand() { return Path(), nullptr; }
const char* GetCurrentKorVersion() { return Path(), ""; }

HRESULT KorInitialize() {
  Loader& l = TheLoader();
  Hold hold(l);
  if (l.inEffect) {
    if (l.users < kSaturated) ++l.users;
    return S_OK;
  }
  Init(l);
  HRESULT result = l.entries.initialize ? l.entries.initialize(nullptr) : S_OK;
  // Also where the storage's start has failed: the caller got its result, and owes a KorFinalize
  // all the same.
  l.inEffect = true;
  l.users = 1;
  return result;
}

HRESULT KorFinalize() {
  Loader& l = TheLoader();
  Hold hold(l);
  if (!l.inEffect) return E_FAIL;
  if (--l.users != 0) {
    if (l.users > kSaturated - 2) l.users = kSaturated;
    return S_OK;
  }
  HRESULT result = l.entries.finalize ? l.entries.finalize() : S_OK;
  KorCleanup();
  l.inEffect = false;
  return result;
}

void KorCleanup() {
  Loader& l = TheLoader();
  Hold hold(l);
  if (--l.loads != 0) return;
  l.loadTried = false;
  // The storage before the utilities that it may use to its end.
  l.storage.reset();
  l.utilities.reset();
  l.entries = Entries();
  l.path.clear();
  l.pathInitialized = false;
}

void* GetKorConfiguration(unsigned flags, wchar_t* url) {
  return GetKorConfiguration2(flags, url, nullptr);
}

void* GetKorConfiguration2(unsigned flags, wchar_t* url, int* status) {
  auto entry = LoadedEntries().getConfiguration;
  return Configuration(entry, status, [&](void** out) { return entry(url, flags, out); });
}

void* GetKorConfigurationEx(_vltStartupOptions* options, int* status) {
  if (!options) {
    if (status) *status = E_POINTER;
    return nullptr;
  }
  auto entry = LoadedEntries().getConfigurationEx;
  return Configuration(entry, status, [&](void** out) { return entry(options, out); });
}

bool IsKorStoragePresent() {
  Loader& l = TheLoader();
  Hold hold(l);
  Init(l);
  return l.storage && l.utilities;
}

void* KorFree(void* p) {
  auto entry = LoadedEntries().free;
  if (entry) entry(p);
  return nullptr;
}

wchar_t* KorGuidToString(GUID g) {
  auto entry = LoadedEntries().guidToString;
  return entry ? entry(g) : nullptr;
}

GUID KorGuidFromString(const char* s) {
  auto entry = LoadedEntries().guidFromString;
  // The entry takes wide text.
  return entry ? entry(zt::fnd::String(s ? s : "").c_str()) : GUID_NULL;
}

wchar_t* KorU32ToString(unsigned v) {
  auto entry = LoadedEntries().u32ToString;
  return entry ? entry(v) : nullptr;
}
