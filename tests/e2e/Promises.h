#pragma once

// What a client has been promised - every value whose saving was answered with S_OK - and the check for it
// in a new process.

#include <dlfcn.h>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <functional>
#include <new>
#include <string>
#include <vector>

#include "tests/e2e/Start.h"
#include "tests/support/BuildModule.h"

namespace vlt::test {

inline constexpr char kPromiseMark[] = "/vlt-promise";

// A number of the database or the jar: what was promised last, and what was asked for since then,
// without a promise, so that it may or may not be there.
template <class T>
struct PromisedValue {
  static constexpr int kMost = 64;
  T promised;
  int asked;
  T others[kMost];

  void ask(T value) {
    if (asked < kMost) others[asked++] = value;
  }
  void promise(T value) {
    promised = value;
    asked = 0;
  }
  bool isKeptBy(T found) const {
    return found == promised || std::find(others, others + asked, found) != others + asked;
  }
};

// Plain bytes: it lives in memory that processes share, and is copied at moments of a record.
struct Promises {
  static constexpr int kMost = 64;
  PromisedValue<unsigned> cacheSize = {33554432, 0, {}};
  PromisedValue<int> cookie = {0, 0, {}};
  bool jarIsUsed = false;
  GUID identity = {};
  bool hasIdentity = false, identityChanged = false;
  int components = 0;
  uint32_t component[kMost] = {};  // G() of each
};

class SharedPromises {
 public:
  explicit SharedPromises(const Promises& from = {})
      : m_promises(static_cast<Promises*>(mmap(nullptr, sizeof(Promises), PROT_READ | PROT_WRITE,
                                               MAP_SHARED | MAP_ANONYMOUS, -1, 0))) {
    *m_promises = from;
  }
  ~SharedPromises() { munmap(m_promises, sizeof(Promises)); }
  SharedPromises(const SharedPromises&) = delete;
  SharedPromises& operator=(const SharedPromises&) = delete;
  Promises& operator*() const { return *m_promises; }
  Promises* operator->() const { return m_promises; }

 private:
  Promises* m_promises;
};

// A client that keeps its promises up to date, and shows a tracer each change of them by a system call.
// Whatever a call throws counts as a refusal.
class PromisedClient {
 public:
  // `changed`: called before a value is asked for, and after it was promised or refused.
  explicit PromisedClient(Promises& promises, std::function<void()> changed = MakeMark)
      : m_promises(promises), m_changed(std::move(changed)) {}

  std::string start() {
    if (m_registrar) return "ok";
    try {
      return GetRegistrar(&m_registrar);
    } catch (const std::bad_alloc&) {
      return "bad_alloc";
    }
  }

  bool setCacheSize(unsigned size) {
    if (!m_registrar) return false;
    m_promises.cacheSize.ask(size);
    m_changed();
    bool done = Succeeds([&] {
      void* raw = nullptr;
      if (m_registrar->QueryInterface(IID_IvltRegistrar2, &raw) < 0) return E_NOINTERFACE;
      auto* registrar = static_cast<IvltRegistrar2*>(raw);
      HRESULT result = registrar->SetStorageServerCacheSize(size);
      registrar->Release();
      return result;
    });
    if (done) m_promises.cacheSize.promise(size);
    return m_changed(), done;
  }

  bool registerComponent(uint32_t id) {
    if (!m_registrar || m_promises.components == Promises::kMost) return false;
    bool done = Succeeds([&] {
      std::wstring name = L"Promised " + std::to_wstring(id);
      Offered d(vltComponentDataDictionary, name, G(id), L"/x/y.framework", L"pr");
      return m_registrar->RegisterComponent(&d.value);
    });
    if (done) m_promises.component[m_promises.components++] = id;
    return m_changed(), done;
  }

  bool setCookie(int cookie) {
    m_promises.jarIsUsed = true;
    m_promises.cookie.ask(cookie);
    m_changed();
    bool done = Succeeds([&] { return vltSetServerCookie(cookie); });
    if (done) m_promises.cookie.promise(cookie);
    return m_changed(), done;
  }

  bool askIdentity() {
    m_promises.jarIsUsed = true;
    GUID identity = {};
    bool done = Succeeds([&] { return vltGetServerIdentity(&identity); });
    if (done) {
      // What was answered once is answered always.
      if (m_promises.hasIdentity && vltDceGuidCompare(m_promises.identity, identity) != 0) {
        m_promises.identityChanged = true;
        return false;
      }
      m_promises.identity = identity;
      m_promises.hasIdentity = true;
    }
    return m_changed(), done;
  }

 private:
  static void MakeMark() { access(kPromiseMark, F_OK); }

  template <class Call>
  static bool Succeeds(Call call) {
    try {
      return call() == S_OK;
    } catch (...) {
      return false;
    }
  }

  Promises& m_promises;
  std::function<void()> m_changed;
  IvltRegistrar* m_registrar = nullptr;
};

// A library that makes identities, another one each time, loaded into this process and those that it forks.
class ChangingIdentities {
 public:
  ChangingIdentities() {
    BuildModule(m_dir / "libZT-RPC.so",
                "#include <time.h>\n#include <unistd.h>\n"
                "extern \"C\" int UuidCreate(unsigned* id) {\n"
                "  timespec now;\n  clock_gettime(CLOCK_REALTIME, &now);\n"
                "  id[0] = now.tv_nsec; id[1] = getpid(); id[2] = now.tv_sec; id[3] = 1;\n"
                "  return 0;\n}\n");
    m_library = dlopen((m_dir / "libZT-RPC.so").c_str(), RTLD_NOW);
    EXPECT_NE(m_library, nullptr) << dlerror();
  }
  ~ChangingIdentities() {
    if (m_library) dlclose(m_library);
  }
  ChangingIdentities(const ChangingIdentities&) = delete;
  ChangingIdentities& operator=(const ChangingIdentities&) = delete;

 private:
  TempDir m_dir;
  void* m_library = nullptr;
};

// What a start finds broken, as the exit code of a process; 0 if all is kept.
enum Broken : int {
  kStartRefused = 1,
  kCacheSizeLost = 2,
  kComponentLost = 4,
  kBundleLost = 8,
  kCookieLost = 16,
  kIdentityLost = 32
};

inline int WhatIsBroken(const Promises& promises, const std::vector<GUID>& bundles) {
  IvltRegistrar* r = nullptr;
  if (GetRegistrar(&r) != "ok") return kStartRefused;
  int broken = 0;
  if (!promises.cacheSize.isKeptBy(CacheSize(*r))) broken |= kCacheSizeLost;
  for (int n = 0; n < promises.components; ++n) {
    if (Find(*r, G(promises.component[n])) != S_OK) broken |= kComponentLost;
  }
  for (const GUID& id : bundles) {
    if (Find(*r, id) != S_OK) broken |= kBundleLost;
  }
  if (!promises.jarIsUsed) return broken;
  int cookie = -1;
  HRESULT result = vltGetServerSettings(3, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr,
                                        nullptr, &cookie, nullptr, nullptr, 0, nullptr, nullptr,
                                        nullptr, nullptr, nullptr);
  if (result != S_OK || !promises.cookie.isKeptBy(cookie)) broken |= kCookieLost;
  GUID identity = {};
  if (promises.identityChanged) broken |= kIdentityLost;
  if (promises.hasIdentity && (vltGetServerIdentity(&identity) != S_OK ||
                               vltDceGuidCompare(identity, promises.identity) != 0)) {
    broken |= kIdentityLost;
  }
  return broken;
}

inline std::string NameOfBroken(int broken) {
  if (broken == 0) return "";
  if (broken < 0 || broken >= 64) return "the start ends with " + std::to_string(broken);
  std::string text;
  const char* names[] = {"start refused",    "cache size lost", "component lost",
                         "bundle not found", "cookie lost",     "identity lost"};
  for (int bit = 0; bit < 6; ++bit) {
    if (broken & (1 << bit)) text += (text.empty() ? "" : ", ") + std::string(names[bit]);
  }
  return text;
}

}  // namespace vlt::test
