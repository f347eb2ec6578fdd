// Out of memory: the 1st, 2nd, 3rd ... allocation of every call fails, once and for all that follow,
// until the call succeeds. No crash; a result or std::bad_alloc; nothing leaked; and the call
// works again afterwards.
//
// The program's own malloc stands before the C library's for every library of the process, so what the
// library under test asks for passes here.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include <atomic>
#include <filesystem>
#include <functional>
#include <new>

#include "source/Utilities/vltutils.h"
#include "tests/support/Child.h"
#include "tests/support/Installation.h"
#include "tests/support/Sanitizer.h"
#include "zt/fnd/Exception.h"

namespace {

std::atomic<long> g_countdown{-1};  // allocations until the failure; negative: not armed
std::atomic<bool> g_forEver{false};
std::atomic<bool> g_failed{false};
std::atomic<long> g_live{0};

// True if this allocation is to fail.
[[maybe_unused]] bool Refuse() {  // unused where the sanitizer has the malloc
  long left = g_countdown;
  if (left < 0) return false;
  if (left > 0) {
    --g_countdown;
    return false;
  }
  g_failed = true;
  if (!g_forEver) g_countdown = -1;
  return true;
}

}  // namespace

#if !VLT_ADDRESS_SANITIZER && !VLT_THREAD_SANITIZER
extern "C" {
void* __libc_malloc(size_t);
void* __libc_calloc(size_t, size_t);
void* __libc_realloc(void*, size_t);
void __libc_free(void*);

void* malloc(size_t sizeBytes) {
  if (Refuse()) return errno = ENOMEM, nullptr;
  void* p = __libc_malloc(sizeBytes);
  if (p) ++g_live;
  return p;
}
void* calloc(size_t count, size_t sizeBytes) {
  if (Refuse()) return errno = ENOMEM, nullptr;
  void* p = __libc_calloc(count, sizeBytes);
  if (p) ++g_live;
  return p;
}
void* realloc(void* old, size_t sizeBytes) {
  if (Refuse()) return errno = ENOMEM, nullptr;
  void* p = __libc_realloc(old, sizeBytes);
  if (p && !old) ++g_live;
  return p;
}
void free(void* p) {
  if (p) --g_live;
  __libc_free(p);
}
}
#endif

namespace {

using namespace vlt::test;

enum Outcome { kWorks = 0, kTold = 1, kBadAlloc = 2, kNoFailure = 77 };

// Runs the call with the n-th allocation failing.
Outcome Attempt(const std::function<HRESULT()>& call, long n, bool forEver) {
  g_forEver = forEver;
  g_failed = false;
  g_countdown = n;
  Outcome outcome;
  try {
    outcome = call() < 0 ? kTold : kWorks;
  } catch (const std::bad_alloc&) {
    outcome = kBadAlloc;
  } catch (const zt::fnd::exception::Exception&) {
    outcome = kTold;  // A system call that failed for want of memory is told by its own exception.
  } catch (int) {
    outcome = kTold;
  }
  g_countdown = -1;
  return g_failed ? outcome : kNoFailure;
}

HRESULT Take(wchar_t* text) {
  if (!text) return E_OUTOFMEMORY;
  vltFree(text);
  return S_OK;
}

IvltRegistrar* g_registrar = nullptr;

HRESULT ReadOne() {
  _vltComponent2 record;
  memset(&record, 0, sizeof record);
  HRESULT result = g_registrar->GetComponent(GUID{1, 0, 0, {}}, &record);
  if (result >= 0) vltutilsFreeComponent2(record);
  return result;
}

HRESULT Enumerate() {
  IvltEnumComponent* e = nullptr;
  HRESULT result = g_registrar->EnumComponents(vltComponentObjectExpert, &e);
  if (result < 0) return result;
  _vltComponent2 record;
  memset(&record, 0, sizeof record);
  unsigned fetched = 0;
  while (e->Next(1, &record, &fetched) == S_OK) {
    vltutilsFreeComponent2(record);
    memset(&record, 0, sizeof record);
  }
  e->Release();
  return S_OK;
}

HRESULT ClientSettings() {
  // What was handed out before an exception is the caller's all the same.
  struct Texts {
    wchar_t* t[5] = {};
    ~Texts() {
      for (wchar_t* text : t) vltFree(text);
    }
  } texts;
  wchar_t** t = texts.t;
  return vltGetClientSettings(3, 1, 0, nullptr, &t[0], &t[1], &t[2], &t[3], &t[4]);
}

HRESULT CheckAll() {
  IEnumString* list = nullptr;
  vltCheckComponent(GUID_NULL, &list);
  if (!list) return E_OUTOFMEMORY;
  wchar_t* text = nullptr;
  unsigned fetched;
  while (list->Next(1, &text, &fetched) == S_OK) vltFree(text);
  list->Release();
  return S_OK;
}

HRESULT Binding() {
  void* raw = nullptr;
  g_registrar->QueryInterface(IID_IvltDynamicRegistrar, &raw);
  auto* dynamic = static_cast<IvltDynamicRegistrar*>(raw);
  unsigned count = 0;
  GUID* found = nullptr;
  HRESULT result = S_OK;
  try {
    result = dynamic->GetComponentsForBindingClass(vltComponentObjectExpert, GUID{0xA, 0, 0, {}},
                                                   &count, &found);
  } catch (...) {
    dynamic->Release();
    throw;
  }
  vltFree(found);
  dynamic->Release();
  return result;
}

struct Call {
  const char* name;
  std::function<HRESULT()> run;
};

std::vector<Call> Calls() {
  return {
      {"vltAlloc",
       [] {
         void* p = vltAlloc(16);
         vltFree(p);
         return p ? S_OK : E_OUTOFMEMORY;
       }},
      {"vltU32ToString", [] { return Take(vltU32ToString(7)); }},
      {"vltI32ToString", [] { return Take(vltI32ToString(-7)); }},
      {"vltF64ToString", [] { return Take(vltF64ToString(0.5)); }},
      {"vltGuidToString", [] { return Take(vltGuidToString(GUID{})); }},
      {"vltGuidToStructString", [] { return Take(vltGuidToStructString(GUID{})); }},
      {"vltGuidFromString",
       [] {
         vltGuidFromString(L"00112233-4455-6677-8899-AABBCCDDEEFF");
         return S_OK;
       }},
      {"vltIsDefaultStorage",
       [] {
         vltIsDefaultStorage(L"/a/config.vlt");
         return S_OK;
       }},
      {"vltIsOfflineStorage",
       [] {
         unsigned offline;
         wchar_t* storage = nullptr;
         vltIsOfflineStorage(L"VLTOFFLINESTORAGE=name", &offline, &storage);
         return Take(storage);
       }},
      {"vltGetStringResource",
       [] {
         char* text = nullptr;
         HRESULT result = vltGetStringResource(":", L"/x/a.vle", L"BINDING_CLASSES", &text, 1024);
         vltFree(text);
         return result;
       }},
      {"vltGetClientSettings", ClientSettings},
      {"vltSetServerCookie", [] { return vltSetServerCookie(5); }},
      {"vltAddSvrProcessIDToJar", [] { return vltAddSvrProcessIDToJar(L"s", 1); }},
      {"vltCheckComponent", CheckAll},
      {"vltRefreshHook",
       [] {
         vltRefreshHook();
         return S_OK;
       }},
      {"GetComponent", ReadOne},
      {"EnumComponents and Next", Enumerate},
      {"GetConfigurationPath",
       [] {
         wchar_t* path = nullptr;
         g_registrar->GetConfigurationPath(&path);
         return Take(path);
       }},
      {"SetConfigurationPath", [] { return g_registrar->SetConfigurationPath(L"/a/b.vlt"); }},
      {"SetSchemaVersion",
       [] {
         unsigned version = 0;
         g_registrar->GetSchemaVersion(&version);
         return g_registrar->SetSchemaVersion(version + 1);
       }},
      {"GetComponentsForBindingClass", Binding},
  };
}

// The first report of a failure makes what all later ones use, and keeps it.
void ReportOnce() {
  for (long n = 0; n < 8; ++n) Attempt([] { return Take(vltGuidToString(GUID{})); }, n, false);
}

// Every allocation of the call in turn, in one process that has made the call once before. Its exit
// code says what went wrong; the number of failures tried goes through the pipe.
int Sweep(const Call& call, bool forEver, long* tried) {
  ReportOnce();
  if (call.run() < 0) return 10;
  for (long n = 0;; ++n) {
    // Twice: what the system makes at its first failure, and keeps, is no leak; a leak grows again.
    long afterFirst = 0;
    for (int round = 0; round < 2; ++round) {
      if (Attempt(call.run, n, forEver) == kNoFailure) {
        *tried = n;
        return 0;
      }
      if (call.run() < 0) return 11;
      if (round == 0) afterFirst = g_live;
    }
    if (g_live > afterFirst) return 12;
  }
}

void MakeInstallation(Installation& installation) {
  std::string guid = "00000001-0000-0000-0000-000000000000";
  installation.addObjectExpert("a", "A", guid,
                               "{" + guid + "}:1:{0000000A-0000-0000-0000-000000000000}");
  installation.addDictionary("d", "D", "00000002-0000-0000-0000-000000000000", 3, "d");
}

class OutOfMemory : public testing::TestWithParam<bool> {};

TEST_P(OutOfMemory, EveryCallSurvivesEveryFailedAllocation) {
  if (!vlt::test::kCanLimitMemory) GTEST_SKIP() << "the sanitizer has a malloc of its own";
  long total = 0, calls = 0;
  for (const Call& call : Calls()) {
    Installation installation;
    MakeInstallation(installation);
    TempDir answer;
    Child child([&] {
      if (vltGetRegistrar(&g_registrar) < 0) return 9;
      long tried = 0;
      int result = Sweep(call, GetParam(), &tried);
      WriteBytes(answer / "tried", std::to_string(tried));
      return result;
    });
    EXPECT_EQ(child.wait(120000), 0) << call.name;
    if (Exists(answer / "tried")) total += std::stol(ReadBytes(answer / "tried"));
    ++calls;
  }
  printf("%ld calls, %ld allocations failed (%s)\n", calls, total,
         GetParam() ? "and all behind them" : "one at a time");
}

// Whatever fails in the first start, the next one finds everything.
TEST_P(OutOfMemory, AFailedFirstStartLosesNothing) {
  if (!vlt::test::kCanLimitMemory) GTEST_SKIP() << "the sanitizer has a malloc of its own";
  Installation installation;
  MakeInstallation(installation);
  long tried = 0;
  for (long n = 0;; n += n < 200 ? 7 : 97, ++tried) {
    std::filesystem::remove(installation.database());
    std::filesystem::remove(installation.sidecar());
    Child first([&] {
      auto start = [] {
        IvltRegistrar* registrar = nullptr;
        return vltGetRegistrar(&registrar);
      };
      return static_cast<int>(Attempt(start, n, GetParam()));
    });
    int outcome = first.wait();
    ASSERT_TRUE(outcome == kWorks || outcome == kTold || outcome == kBadAlloc ||
                outcome == kNoFailure)
        << n << ": " << outcome;
    Child next([] {
      if (vltGetRegistrar(&g_registrar) < 0) return 1;
      return ReadOne() == S_OK ? 0 : 2;
    });
    ASSERT_EQ(next.wait(), 0) << n;
    if (outcome == kNoFailure) break;
  }
  printf("%ld first starts\n", tried);
  EXPECT_GT(tried, 10);
}

INSTANTIATE_TEST_SUITE_P(Failures, OutOfMemory, testing::Bool(),
                         [](const auto& info) { return info.param ? "ForEver" : "Once"; });

}  // namespace
