// Every point armed with every fault: what comes out, what is reported to others, what leaks, and
// what stays on the disk.
#include <gtest/gtest.h>
#include <malloc.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <memory>
#include <new>
#include <set>
#include <sstream>
#include <vector>

#include "source/Common/ZtUtils/General/vlTracer.h"
#include "source/Common/vltTestHook.h"
#include "source/Common/vltcmn.h"
#include "source/Utilities/vltjar.h"
#include "source/Utilities/vltutils.h"
#include "tests/support/EventPlace.h"
#include "tests/support/HookPointRows.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/RegistrarClient.h"
#include "zt/fnd/osdep/NamedEvent.h"

namespace vlt::test {
namespace {

using Clock = std::chrono::steady_clock;
using zt::fnd::osdep::NamedEvent;
using namespace points;

constexpr int kHangMs = 20;
constexpr unsigned long kMemoryBytes = 64ul << 20;

// ---- An installation with all kinds of components and a jar, and the processes on it.

class Site {
 public:
  Site() {
    m_installation.addDictionary("dictionary", "dictionary", GText(1), 3, "prefix");
    m_installation.addObjectExpert("object", "object", GText(2));
    m_installation.addResourceExpert("resource", "resource", GText(3), "PNP0A03");
    std::filesystem::create_directory(m_installation.root() + "/Data");
    restoreJar();
    SCOPED_TRACE("at the first start");
    ExpectInChild([this] { expectKept(5); });
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
    ExpectInChild([&] { expectKept(row.action == SaveJar ? 6 : 5); });
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

// Again and again, with one outcome. What leaks makes each run leave more allocated than the one
// before; the heap's caches do not.
int PerformOften(Outcome (*action)()) {
  constexpr int kWarm = 8, kRuns = 14;
  Outcome outcome = Perform(action);
  bool grows = mallinfo2().uordblks != 0;  // the sanitizers know themselves
  size_t used = 0;
  for (int run = 1; run < kRuns; ++run) {
    if (Perform(action) != outcome) return kEnd + Broken;
    size_t now = mallinfo2().uordblks;
    if (run > kWarm && now <= used) grows = false;
    used = now;
  }
  return grows || Leaks() ? kLeaks : kEnd + outcome;
}

void* volatile g_lost;

// What the check above is worth.
Outcome Lose() {
  g_lost = vltAlloc(100);
  g_lost = nullptr;
  return Success;
}

class vltTestHookPoints : public testing::Test {
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

TEST_F(vltTestHookPoints, EachPointHasARow) {
  std::set<std::string> points, rows;
  for (const auto& point : hook::kPoints) points.insert(point.name);
  for (const Row& row : kRows) rows.insert(row.point);
  EXPECT_EQ(points, rows);
  EXPECT_EQ(points.size(), std::size(hook::kPoints));
}

TEST_F(vltTestHookPoints, ALeakWouldShow) {
  EXPECT_EQ(m_site.run("elsewhere", "", [] { return PerformOften(Lose); }), kLeaks);
}

TEST_F(vltTestHookPoints, UnarmedActionsSucceed) {
  for (const Row& row : kRows) {
    SCOPED_TRACE(row.point);
    EXPECT_EQ(m_site.run("elsewhere", "", [&] { return PerformOften(row.action); }),
              kEnd + Success);
    m_site.expectWhole(row);
  }
}

TEST_F(vltTestHookPoints, ASimulatedFailureIsReportedWithItsFunction) {
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

TEST_F(vltTestHookPoints, WithAMaskOfNothingAFailureLeavesNoLog) {
  TempDir logs;
  EXPECT_EQ(m_site.run(hook::kStringFromClsid, "SimulateMemoryAllocationFailure = true\n",
                       [&] {
                         vlTracer::Initialize(static_cast<vlTracer::SeverityLevel>(0),
                                              vlTracer::kTargetFile, Wide(logs.path()).c_str(), 0);
                         return kEnd + Perform(Clsid);
                       }),
            kEnd + OutOfMemory);
  EXPECT_TRUE(std::filesystem::is_empty(logs.path()));
}

// The most memory that this process has ever had mapped.
long PeakKb() {
  std::ifstream in("/proc/self/status");
  for (std::string word; in >> word;) {
    long kb;
    if (word == "VmPeak:" && in >> kb) return kb;
  }
  return -1;
}

TEST_F(vltTestHookPoints, ASimulatedFailureAllocatesNothing) {
  if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer maps memory of its own";
  auto run = [&](const char* point) {
    return m_site.run(point, "SimulateMemoryAllocationFailure = true\n", [] {
      constexpr long kLengthMb = 64;
      std::wstring text((kLengthMb << 20) / sizeof(wchar_t), L'x');
      long before = PeakKb();
      wchar_t* copy = nullptr;
      HRESULT result = vltDuplicateString2(text.c_str(), &copy);
      bool grew = PeakKb() - before >= kLengthMb << 10;
      vltFree(copy);
      return (result == S_OK ? 10 : result == E_OUTOFMEMORY ? 20 : 30) + grew;
    });
  };
  EXPECT_EQ(run("elsewhere"), 11);
  EXPECT_EQ(run(hook::kDuplicateString2), 20);
}

TEST_F(vltTestHookPoints, AThrownFailureHasItsResult) {
  forEachRow("SimulateMemoryAllocationFailureAndThrow = true\n", [](const Row& row, auto run) {
    EXPECT_EQ(run([&] { return PerformOften(row.action); }), kEnd + row.thrown);
  });
}

TEST_F(vltTestHookPoints, AHangAnswersAfterItsTime) {
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

TEST_F(vltTestHookPoints, ACrashIsANormalEnd) {
  forEachRow("Crash = true\n", [](const Row& row, auto run) {
    EXPECT_EQ(run([&] { return kEnd + Perform(row.action); }), 0);
  });
}

TEST_F(vltTestHookPoints, ExhaustedMemoryIsSurvived) {
  if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer holds the address space";
  forEachRow("MemoryAllocationFailure = true\n", [](const Row& row, auto run) {
    int end = run([&] {
      LimitMemoryTo(kMemoryBytes);
      return kEnd + Perform(row.action);
    });
    EXPECT_TRUE(row.exhausted.contains(static_cast<Outcome>(end - kEnd))) << end;
  });
}

TEST_F(vltTestHookPoints, AFailedCreationLeavesTheRegistrarToTheNextCall) {
  Installation installation;
  std::string file = installation.root() + "/VLTHooks.ini";
  WriteBytes(file, std::string("[Hook]\nName = ") + hook::kGetRegistrar2 +
                       "\nSimulateMemoryAllocationFailure = true\n");
  ExpectInChild([&] {
    vltRefreshHook();
    EXPECT_EQ(Registrar(), OutOfMemory);
    WriteBytes(file, "[Hook]\nName = elsewhere\n");
    vltRefreshHook();
    EXPECT_EQ(Registrar(), Success);
  });
}

}  // namespace
}  // namespace vlt::test
