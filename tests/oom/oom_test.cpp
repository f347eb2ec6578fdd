// Out of memory in every function and operation of the shared library: see tests/support/FailingHeap.h.
//
// Each call has a process and an installation of its own. Behind its sweep a fresh process must find the
// installation whole.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <map>
#include <sstream>

#include "tests/oom/Catalogue.h"
#include "tests/support/Child.h"
#include "tests/support/FailingHeap.h"
#include "tests/support/Installation.h"
#include "tests/support/TempDir.h"

// What is saved need not reach the disk here, and waiting for it thousands of times is all that would
// take time.
extern "C" __attribute__((visibility("default"))) int fsync(int) { return 0; }

namespace vlt::test::oom {
namespace {

using namespace heap;

// The first report of a failure makes what all later ones use, and keeps it.
void ReportOnce() {
  for (long n = 0; n < 8; ++n) Attempt([] { return Take(vltGuidToString(GUID{})); }, n, false);
}

// The names of the functions that the library exports, as its symbol table has them.
std::vector<std::string> ExportedFunctions() {
  Dl_info info;
  EXPECT_NE(dladdr(reinterpret_cast<void*>(&vltAlloc), &info), 0);
  std::istringstream in(RunProgram({"nm", "-D", "--defined-only", info.dli_fname}).out);
  std::vector<std::string> names;
  for (std::string address, type, name; in >> address >> type >> name;) {
    if (type == "T") names.push_back(name.substr(0, name.find('@')));
  }
  return names;
}

TEST(OomCalls, EveryExportedFunctionIsAmongThem) {
  std::vector<std::string> exported = ExportedFunctions();
  EXPECT_GE(exported.size(), 60u);
  const std::vector<Call> calls = AllCalls();
  for (const std::string& name : exported) {
    bool swept = std::any_of(calls.begin(), calls.end(), [&](const Call& call) {
      return call.name.substr(0, call.name.find(' ')) == name;
    });
    EXPECT_TRUE(swept) << name;
  }
}

class Oom : public testing::TestWithParam<bool> {
 protected:
  void SetUp() override {
    if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer has a malloc of its own";
    LoadGuidSource();
  }
};

TEST_P(Oom, EveryCallSurvivesEveryFailedAllocation) {
  long total = 0, calls = 0, without = 0;
  for (const Call& call : AllCalls()) {
    Installation installation;
    MakeInstallation(installation);
    TempDir answer, workingDirectory;
    Child child([&] {
      if (!HasRegistrar() || chdir(workingDirectory.path().c_str()) != 0) return 9;
      ReportOnce();
      long tried = 0;
      Trouble trouble = Sweep(call, GetParam(), &tried);
      WriteBytes(answer / "tried", std::to_string(tried));
      return static_cast<int>(trouble);
    });
    int trouble = child.wait(120000);
    long tried = Exists(answer / "tried") ? std::stol(ReadBytes(answer / "tried")) : -1;
    EXPECT_EQ(trouble, kNone) << call.name << ", allocation " << tried;
    // One call has its settings file in the working directory.
    EXPECT_TRUE(call.name == "vltGetLocalConfigurationURL" ||
                std::filesystem::is_empty(workingDirectory.path()))
        << call.name;
    EXPECT_EQ(Child([&] { return FindsEverything(installation.root()); }).wait(), 0) << call.name;
    printf("%6ld  %s\n", tried, call.name.c_str());
    total += tried;
    without += tried == 0;
    ++calls;
  }
  printf("%ld calls, %ld of them without allocations, %ld allocations failed (%s)\n", calls,
         without, total, GetParam() ? "and all that follow" : "one at a time");
}

// Calls that do more the first time in a process: a process for each allocation. Whatever failed, the
// same process and a later one have it then.
TEST_P(Oom, FirstCallsSurviveEveryFailedAllocation) {
  const Call firsts[] = {
      {"vltGetTraceFlags", [] { return vltGetTraceFlags() == 0x21 ? S_OK : E_FAIL; }},
      {"vltGetServerIdentity",
       [] {
         GUID guid;
         return vltGetServerIdentity(&guid);
       }},
      {"vltGetLocalConfigurationURL", [] {
         Text url;
         return url.with(vltGetLocalConfigurationURL(url.out()));
       }}};
  for (const Call& call : firsts) {
    Installation installation;
    MakeInstallation(installation);
    TempDir workingDirectory;
    WriteBytes(g_root + "/vlttrace.txt", "1 2\n");
    long n = 0;
    for (int outcome = 0; outcome != kNoFailure; ++n) {
      Child first([&] {
        if (chdir(workingDirectory.path().c_str()) != 0) return static_cast<int>(kFailsAfterwards);
        Outcome first = Attempt(call.run, n, GetParam());
        return call.run() < 0 ? kFailsAfterwards : static_cast<int>(first);
      });
      outcome = first.wait();
      ASSERT_TRUE(outcome == kWorks || outcome == kReported || outcome == kBadAlloc ||
                  outcome == kNoFailure)
          << call.name << ' ' << n << ": " << outcome;
    }
    printf("%6ld  %s, first call\n", n - 1, call.name.c_str());
    EXPECT_GT(n, 1);
  }
}

// Whatever fails in the first start, the next one finds everything.
TEST_P(Oom, AFailedFirstStartLosesNothing) {
  Installation installation;
  MakeInstallation(installation);
  long tried = 0;
  for (long n = 0;; n += n < 200 ? 7 : 29, ++tried) {
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
    ASSERT_TRUE(outcome == kWorks || outcome == kReported || outcome == kBadAlloc ||
                outcome == kNoFailure)
        << n << ": " << outcome;
    ASSERT_EQ(Child([&] { return FindsEverything(installation.root()); }).wait(), 0) << n;
    if (outcome == kNoFailure) break;
  }
  printf("%ld first starts\n", tried);
  EXPECT_GT(tried, 10);
}

// A start that fails over a database that is there sets nothing aside: what was saved is found.
TEST_P(Oom, AFailedLaterStartLosesNothing) {
  Installation installation;
  MakeInstallation(installation);
  auto remember = [] {
    if (!HasRegistrar()) return 1;
    As<IvltRegistrar2> registrar(IID_IvltRegistrar2);
    return registrar->SetStorageServerCacheSize(4711) == S_OK ? 0 : 2;
  };
  ASSERT_EQ(Child(remember).wait(), 0);
  // All of the look-up and the opening, then of what follows every seventh.
  long tried = 0, n = 0;
  for (int outcome = 0; outcome != kNoFailure; n += n < 150 ? 1 : 7, ++tried) {
    Child start([&] {
      return static_cast<int>(
          Attempt([] { return HasRegistrar() ? S_OK : E_FAIL; }, n, GetParam()));
    });
    outcome = start.wait();
    ASSERT_TRUE(outcome == kWorks || outcome == kReported || outcome == kBadAlloc ||
                outcome == kNoFailure)
        << n << ": " << outcome;
    Child next([&] {
      int result = FindsEverything(installation.root());
      return result != 0 ? result : ServerCacheSize() == 4711 ? 0 : 4;
    });
    ASSERT_EQ(next.wait(), 0) << n;
  }
  printf("%ld later starts\n", tried);
  EXPECT_GT(tried, 10);
}

INSTANTIATE_TEST_SUITE_P(Failures, Oom, testing::Bool(), [](const auto& info) {
  return info.param ? "WithAllThatFollow" : "Once";
});

}  // namespace
}  // namespace vlt::test::oom
