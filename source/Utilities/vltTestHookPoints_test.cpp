// Every point armed with every fault: what comes out, what is told to others, what leaks, and what
// stays on the disk.
#include <gtest/gtest.h>
#include <malloc.h>
#include <string.h>

#include <chrono>
#include <filesystem>
#include <functional>
#include <memory>
#include <new>
#include <set>
#include <sstream>
#include <vector>

#include "source/Common/FakeStorage.h"
#include "source/Common/ZtUtils/General/vlTracer.h"
#include "source/Common/vltBindingClasses.h"
#include "source/Common/vltQuery.h"
#include "source/Common/vltcmn.h"
#include "source/Utilities/vltTestHook.h"
#include "source/Utilities/vltjar.h"
#include "source/Utilities/vltutils.h"
#include "tests/support/EventPlace.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/RegistrarClient.h"
#include "zt/fnd/osdep/NamedEvent.h"

namespace vlt::test {
namespace {

using Clock = std::chrono::steady_clock;
using zt::fnd::osdep::NamedEvent;

constexpr int kHangMs = 20;
constexpr unsigned long kMemoryBytes = 64ul << 20;

// ---- The actions. Each drives the code to its point and tells what came out.

enum Outcome {
  Success,
  OutOfMemory,  // told by the result, with all outputs as they should be then
  OtherFailure,
  Broken,  // outputs that do not fit the result
  BadAlloc,
};

Outcome Of(HRESULT result, bool intact = true) {
  if (!intact) return Broken;
  return result == S_OK ? Success : result == E_OUTOFMEMORY ? OutOfMemory : OtherFailure;
}

// What the result hands out, and nothing without it.
template <class T>
Outcome Of(HRESULT result, T* out, void (*free)(T*)) {
  bool fits = (result == S_OK) == (out != nullptr);
  if (out) free(out);
  return Of(result, fits);
}

void FreeText(wchar_t* text) { vltFree(text); }

template <class I>
void Release(I* object) {
  object->Release();
}

Outcome Append() {
  size_t capacity = 2;
  auto* buffer = static_cast<wchar_t*>(vltAlloc(capacity * sizeof(wchar_t)));
  if (!buffer) return BadAlloc;
  wcscpy(buffer, L"a");
  struct Guard {
    wchar_t*& text;
    ~Guard() { vltFree(text); }
  } guard{buffer};
  wchar_t* before = buffer;
  HRESULT result = vltAppendString2(&buffer, L"bc", &capacity);
  bool kept = buffer == before && wcscmp(buffer, L"a") == 0 && capacity == 362;
  return Of(result, result != E_OUTOFMEMORY || kept);
}

Outcome Duplicate() {
  wchar_t* out = nullptr;
  HRESULT result = vltDuplicateString2(L"a", &out);
  return Of(result, out, FreeText);
}

Outcome Clsid() {
  GUID g = {};
  wchar_t* out = nullptr;
  HRESULT result = vltStringFromCLSID(&g, &out);
  return Of(result, out, FreeText);
}

Outcome GuidText() {
  wchar_t* text = vltGuidToString(GUID{});
  bool empty = !text || !*text;
  vltFree(text);
  return empty ? OutOfMemory : Success;
}

Outcome Registrar() {
  IvltRegistrar* registrar = nullptr;
  HRESULT result = vltGetRegistrar(&registrar);
  return Of(result, registrar, Release<IvltRegistrar>);
}

Outcome Check() {
  IEnumString* errors = nullptr;
  HRESULT result = vltCheckComponent(GUID_NULL, &errors);
  // The sample's components lie nowhere; that is what the list then says.
  bool fits = (result == E_OUTOFMEMORY) == (errors == nullptr);
  if (errors) errors->Release();
  return !fits ? Broken : result == E_OUTOFMEMORY ? OutOfMemory : Success;
}

// An array of this type as text.
template <int Type>
Outcome Array() {
  Answers answers = Filled(Type);
  Object object(answers);
  g_references = 0;
  wchar_t* text = g_untouched;
  HRESULT result;
  try {
    result = vltGetAttributeValueAsString(&object, kId, &text);
  } catch (const std::bad_alloc&) {
    return g_references == 0 && text == g_untouched ? BadAlloc : Broken;
  }
  bool fits = (result == S_OK) == (text != g_untouched) && g_references == 0;
  if (text != g_untouched) vltFree(text);
  return Of(result, fits);
}

const zt::fnd::String kTable(
    L"{00000001-0000-0000-0000-000000000000}:2:{0000000A-0000-0000-0000-000000000000}:"
    L"{0000000B-0000-0000-0000-000000000000}:{00000002-0000-0000-0000-000000000000}:0");

// Both classes, or none.
Outcome AddClasses() {
  BindingClassesMap map;
  map.emplace(GUID{0xC, 0, 0, {}}, GUID{9, 0, 0, {}});
  _vltComponent2 record;
  memset(&record, 0, sizeof record);
  record.type = vltComponentObjectExpert;
  record.identifier.Data1 = 1;
  vltAddBindingClasses(&record, CvltBindingClasses(kTable), &map);
  return map.size() == 3 ? Success : map.size() == 1 ? OutOfMemory : Broken;
}

Outcome GetClasses() {
  BindingClassesMap map;
  map.emplace(GUID{0xA, 0, 0, {}}, GUID{1, 0, 0, {}});
  unsigned count = 0;
  GUID* found = nullptr;
  HRESULT result = vltGetComponentsForBindingClass(GUID{0xA, 0, 0, {}}, &count, &map, &found);
  bool fits = (result == S_OK) == (found != nullptr) && count == (found ? 1u : 0u);
  vltFree(found);
  return Of(result, fits);
}

Outcome ComponentVector() {
  auto components = CvltBindingClasses(kTable).GetComponentVector();
  return components.size() == 2 ? Success : components.size() == 0 ? OutOfMemory : Broken;
}

_vltQuery OneTerm(_vltQueryTerm* term) {
  memset(term, 0, sizeof *term);
  term->attributeType = vltI32Type;
  return {GUID_NULL, 0, 0, 1, term};
}

Outcome PrintQuery() {
  _vltQueryTerm term;
  _vltQuery query = OneTerm(&term);
  wchar_t* text = nullptr;
  HRESULT result = vltConvertQueryToString(&query, &text);
  return Of(result, text, FreeText);
}

// A stream that reads as a query of one term with the number 1.
struct Ones : IvltInputStream {
  virtual ~Ones() = default;
  HRESULT QueryInterface(const GUID&, void**) override { return E_NOINTERFACE; }
  uint32_t AddRef() override { return 1; }
  uint32_t Release() override { return 1; }
  HRESULT ReadType(_vltAttributeType* v) override { return *v = vltI32Type, S_OK; }
  HRESULT ReadID(vltAttributeID* v) override { return *v = 1, S_OK; }
  HRESULT ReadI32(int32_t* v) override { return *v = 1, S_OK; }
  HRESULT ReadU32(uint32_t* v) override { return *v = 1, S_OK; }
  HRESULT ReadF64(double* v) override { return *v = 1, S_OK; }
  HRESULT ReadGuid(GUID* v) override { return *v = GUID_NULL, S_OK; }
  HRESULT ReadString(wchar_t** v) override { return *v = nullptr, S_OK; }
};

Outcome ReadQuery() {
  Ones stream;
  _vltQuery query = {};
  HRESULT result = vltMarshalQueryFromStream(&stream, &query);
  bool fits = query.termCount == 1 && (result == S_OK) == (query.terms != nullptr);
  vltFreeQuery(&query);
  return Of(result, fits);
}

Outcome OpenJar() {
  std::unique_ptr<wchar_t[]> path(GetJarFilePath());
  CvlIniMgr* ini = nullptr;
  HRESULT result = VltjarOpenIniWithValidation(path.get(), &ini);
  bool fits = (result == S_OK) == (ini != nullptr);
  delete ini;
  return Of(result, fits);
}

// The first opening fails at the digest.
Outcome OpenJarAgain() {
  std::unique_ptr<wchar_t[]> path(GetJarFilePath());
  unsigned char other[16] = {1};
  if (VltjarSetChecksumForCacheFile(path.get(), other) != S_OK) return OtherFailure;
  return OpenJar();
}

Outcome SaveJar() { return Of(vltSetServerCookie(6)); }

// ---- The table.

struct Row {
  const char* point;
  Outcome (*action)();
  // What comes out when the hook answers 1, when it throws, and when it has taken all memory.
  Outcome answered, thrown;
  std::set<Outcome> exhausted;
  // In the line of the log; null for a point whose answer is ignored.
  const char* function;
};

constexpr const char* kGetClassesFunction =
    "HRESULT vltGetComponentsForBindingClass(GUID, u32*, BindingClassesMap*, GUID**)";
constexpr const char* kArrayFunction =
    "HRESULT vltGetArrayValueAsString(IvltObject*, vltAttributeID, vltAttributeType, "
    "zt::fnd::String&)";
constexpr const char* kOpenFunction =
    "HRESULT VltjarOpenIniWithValidation(const wchar_t*, CvlIniMgr**)";
const std::set<Outcome> kReport = {OutOfMemory};

const Row kRows[] = {
    {hook::kGetRegistrar2, Registrar, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltGetRegistrar2(const TCHAR*, const TCHAR*, IvltRegistrar**)"},
    {hook::kJarOpen, OpenJar, OutOfMemory, Success, kReport, kOpenFunction},
    {hook::kJarRetry, OpenJarAgain, OutOfMemory, BadAlloc, kReport, kOpenFunction},
    {hook::kCheckComponent, Check, OutOfMemory, BadAlloc, kReport,
     "BOOL vltCheckComponent(vltID, IEnumString**)"},
    {hook::kArrayI32, Array<8>, OutOfMemory, BadAlloc, kReport, kArrayFunction},
    {hook::kArrayU32, Array<9>, OutOfMemory, BadAlloc, kReport, kArrayFunction},
    {hook::kArrayF64, Array<10>, OutOfMemory, BadAlloc, kReport, kArrayFunction},
    {hook::kArrayGuid, Array<13>, OutOfMemory, BadAlloc, kReport, kArrayFunction},
    {hook::kArrayString, Array<11>, OutOfMemory, BadAlloc, kReport, kArrayFunction},
    {hook::kArrayReference, Array<12>, OutOfMemory, BadAlloc, kReport, kArrayFunction},
    {hook::kConvertQueryToString, PrintQuery, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltConvertQueryToString(const vltQuery*, wchar_t**)"},
    {hook::kMarshalQueryFromStream, ReadQuery, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltMarshalQueryFromStream(IvltInputStream*, vltQuery*)"},
    {hook::kGetComponentsForBindingClass, GetClasses, OutOfMemory, BadAlloc, kReport,
     kGetClassesFunction},
    {hook::kCopyComponentOfClass,
     GetClasses,
     Success,
     OutOfMemory,
     {Success, OutOfMemory, BadAlloc},
     nullptr},
    {hook::kAddBindingClass,
     AddClasses,
     Success,
     OutOfMemory,
     {Success, OutOfMemory, BadAlloc},
     nullptr},
    {hook::kGetComponentVector,
     ComponentVector,
     Success,
     OutOfMemory,
     {Success, OutOfMemory, BadAlloc},
     nullptr},
    {hook::kDuplicateString2, Duplicate, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltDuplicateString2(const wchar_t*, wchar_t**)"},
    {hook::kDuplicateString2, GuidText, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltDuplicateString2(const wchar_t*, wchar_t**)"},
    {hook::kAppendString2, Append, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltAppendString2(wchar_t**, const wchar_t*, size_t*)"},
    {hook::kStringFromClsid, Clsid, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltStringFromCLSID(const GUID*, wchar_t**)"},
    {hook::kStringFromClsid, GuidText, OutOfMemory, BadAlloc, kReport,
     "HRESULT vltStringFromCLSID(const GUID*, wchar_t**)"},
    {hook::kJarInvalidChecksumSet,
     SaveJar,
     Success,
     BadAlloc,
     {Success, OutOfMemory, BadAlloc},
     nullptr},
    {hook::kJarValidChecksumSet,
     SaveJar,
     Success,
     BadAlloc,
     {Success, OutOfMemory, BadAlloc},
     nullptr},
};

// ---- An installation with all kinds of components and a jar, and the processes on it.

class Site {
 public:
  Site() {
    m_installation.addDictionary("vltdd", "vltdd", GText(1), 1, "");
    m_installation.addObjectExpert("object", "object", GText(2));
    m_installation.addResourceExpert("resource", "resource", GText(3), "PNP0A03");
    std::filesystem::create_directory(m_installation.root() + "/Data");
    restoreJar();
    EXPECT_EQ(InChild([this] { expectKept(5); }), 0) << "at the first start";
  }

  // The end of a process that refreshes its hooks and does something.
  int run(const std::string& point, const std::string& flags, const std::function<int()>& body) {
    std::string file = m_installation.root() + "/VLTHooks.ini";
    WriteBytes(file, "[Hook]\nName = " + point + "\n" + flags);
    int code = Child([&] {
                 vltRefreshHook();
                 return body();
               }).wait();
    std::filesystem::remove(file);
    return code;
  }

  // A client that starts afterwards finds everything. Back to what was there before, then.
  void expectWhole(const Row& row) const {
    EXPECT_EQ(InChild([&] { expectKept(row.action == SaveJar ? 6 : 5); }), 0);
    for (const auto& entry : std::filesystem::recursive_directory_iterator(m_installation.root())) {
      EXPECT_NE(entry.path().extension(), ".bad") << entry.path();
    }
    restoreJar();
  }

 private:
  std::string jar() const { return m_installation.root() + "/Data/vltjar"; }

  void restoreJar() const {
    WriteBytes(
        jar() + ".ini",
        "[ServerSection]\nServerProcessID = 77\n\n[CookieSection]\nLastServerCookie = 5\n\n");
    std::filesystem::remove(jar() + ".vl5");
  }

  void expectKept(int cookie) const {
    IvltRegistrar* registrar = nullptr;
    ASSERT_EQ(vltGetRegistrar(&registrar), S_OK);
    for (uint32_t n : {1u, 2u, 3u}) EXPECT_EQ(Find(*registrar, G(n)), S_OK) << n;
    registrar->Release();
    std::unique_ptr<wchar_t[]> path(GetJarFilePath());
    std::unique_ptr<CvlIniMgr> ini;
    ASSERT_EQ(VltjarOpen(path.get(), &ini), S_OK);
    std::string value;
    EXPECT_GE(ini->GetItem("ServerSection", "ServerProcessID", &value), 0);
    EXPECT_EQ(value, "77");
    EXPECT_GE(ini->GetItem("CookieSection", "LastServerCookie", &value), 0);
    EXPECT_EQ(value, std::to_string(cookie));
  }

  Installation m_installation;
};

// Exit codes of the armed processes: kEnd and an outcome, or these.
constexpr int kEnd = 10, kLeaks = 97, kTooSoon = 96;

Outcome Perform(Outcome (*action)()) {
  try {
    return action();
  } catch (const std::bad_alloc&) {
    return BadAlloc;
  }
}

// Once, and again until all caches are filled: from then on nothing more may stay allocated.
int PerformOften(Outcome (*action)()) {
  constexpr int kRuns = 12, kWarm = 10;
  Outcome outcome = Perform(action);
  size_t used = 0;
  for (int run = 1; run < kRuns; ++run) {
    if (Perform(action) != outcome) return kEnd + Broken;
    if (run == kWarm) used = mallinfo2().uordblks;
  }
  return mallinfo2().uordblks == used && !Leaks() ? kEnd + outcome : kLeaks;
}

class HookPoints : public testing::Test {
 protected:
  // One armed process a row, and one that looks what it has left.
  template <class Body>
  void forEachRow(const std::string& flags, Body body) {
    for (const Row& row : kRows) {
      SCOPED_TRACE(row.point);
      body(row, [&](const std::function<int()>& run) { return m_site.run(row.point, flags, run); });
      m_site.expectWhole(row);
    }
  }

  EventPlace m_place;
  Site m_site;
};

TEST_F(HookPoints, EachPointHasARow) {
  std::set<std::string> points, rows;
  for (const auto& point : hook::kPoints) points.insert(point.name);
  for (const Row& row : kRows) rows.insert(row.point);
  EXPECT_EQ(points, rows);
  EXPECT_EQ(points.size(), std::size(hook::kPoints));
}

TEST_F(HookPoints, UnarmedActionsSucceed) {
  for (const Row& row : kRows) {
    SCOPED_TRACE(row.point);
    EXPECT_EQ(m_site.run("elsewhere", "", [&] { return PerformOften(row.action); }),
              kEnd + Success);
    m_site.expectWhole(row);
  }
}

TEST_F(HookPoints, ASimulatedFailureIsReportedWithItsFunction) {
  NamedEvent lockdown(L"LockdownVLTEvent", true, false);
  forEachRow("SimulateMemoryAllocationFailure = true\n", [&](const Row& row, auto run) {
    TempDir logs;
    EXPECT_EQ(run([&] {
                vlTracer::Initialize(vlTracer::kSeverityErrors, vlTracer::kTargetFile,
                                     Wide(logs.path()).c_str(), 0);
                return PerformOften(row.action);
              }),
              kEnd + row.answered);
    EXPECT_EQ(lockdown.checkOnly(), row.function != nullptr);
    lockdown.reset();
    std::set<std::string> lines, expected;
    for (const auto& log : std::filesystem::directory_iterator(logs.path())) {
      std::istringstream in(ReadBytes(log.path()));
      for (std::string line; std::getline(in, line);) lines.insert(line);
    }
    if (row.function)
      expected.insert(std::string("  Memory allocation failure in ") + row.function);
    EXPECT_EQ(lines, expected);
  });
}

TEST_F(HookPoints, AThrownFailureHasItsResult) {
  forEachRow("SimulateMemoryAllocationFailureAndThrow = true\n", [](const Row& row, auto run) {
    EXPECT_EQ(run([&] { return PerformOften(row.action); }), kEnd + row.thrown);
  });
}

TEST_F(HookPoints, AHangAnswersAfterItsTime) {
  std::string flags = "Hang = true\nHangTime = " + std::to_string(kHangMs) + "\n";
  forEachRow(flags, [](const Row& row, auto run) {
    EXPECT_EQ(run([&] {
                auto start = Clock::now();
                Outcome outcome = Perform(row.action);
                if (Clock::now() - start < std::chrono::milliseconds(kHangMs)) return kTooSoon;
                return Leaks() ? kLeaks : kEnd + outcome;
              }),
              kEnd + row.answered);
  });
}

TEST_F(HookPoints, ACrashIsANormalEnd) {
  forEachRow("Crash = true\n", [](const Row& row, auto run) {
    EXPECT_EQ(run([&] { return kEnd + Perform(row.action); }), 0);
  });
}

TEST_F(HookPoints, ExhaustedMemoryIsSurvived) {
  if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer holds the address space";
  forEachRow("MemoryAllocationFailure = true\n", [](const Row& row, auto run) {
    int end = run([&] {
      LimitMemoryTo(kMemoryBytes);
      return kEnd + Perform(row.action);
    });
    EXPECT_TRUE(row.exhausted.contains(static_cast<Outcome>(end - kEnd))) << end;
  });
}

TEST_F(HookPoints, AFailedCreationLeavesTheRegistrarToTheNextCall) {
  Installation installation;
  std::string file = installation.root() + "/VLTHooks.ini";
  WriteBytes(file, std::string("[Hook]\nName = ") + hook::kGetRegistrar2 +
                       "\nSimulateMemoryAllocationFailure = true\n");
  EXPECT_EQ(InChild([&] {
              vltRefreshHook();
              EXPECT_EQ(Registrar(), OutOfMemory);
              WriteBytes(file, "[Hook]\nName = elsewhere\n");
              vltRefreshHook();
              EXPECT_EQ(Registrar(), Success);
            }),
            0);
}

}  // namespace
}  // namespace vlt::test
