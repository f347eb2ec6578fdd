// The catalogue of calls at each point of fault injection, and with each system call failing for good.
// What comes out of a call may be a result or an exception, and nothing else; without the fault it works
// again, and the installation is whole. What exactly comes out of which call is in the tests of the hook
// points and of the jar.
#include <gtest/gtest.h>
#include <sys/syscall.h>

#include <cerrno>

#include "source/Common/vltHookPoints.h"
#include "tests/oom/Catalogue.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/FailingHeap.h"
#include "tests/support/Tracing.h"

namespace vlt::test::oom {
namespace {

// True if the call succeeds; false for a failure that it reports. What else leaves it ends the process.
bool Succeeds(const Call& call) {
  try {
    return call.run() >= 0;
  } catch (const std::bad_alloc&) {
  } catch (const zt::fnd::exception::Exception&) {
  } catch (int) {
  }
  return false;
}

void Arm(const std::string& point, const std::string& fault) {
  WriteBytes(g_root + "/VLTHooks.ini", "[Hook]\nName = " + point + "\n" + fault + " = true\n");
  vltRefreshHook();
}

class Faults : public testing::Test {
 protected:
  void SetUp() override {
    LoadGuidSource();
    MakeInstallation(m_installation);
  }

  // In a process of its own, in an empty directory; then a fresh process finds everything. `body`
  // writes the name of the call that it is about to make, as long as it can write.
  void run(const std::string& what, const std::function<int()>& body) {
    SCOPED_TRACE(what);
    TempDir workingDirectory;
    Child child([&] {
      if (!HasRegistrar() || chdir(workingDirectory.path().c_str()) != 0) return 9;
      return body();
    });
    EXPECT_EQ(child.wait(120000), 0) << ReadBytes(m_call);
    EXPECT_EQ(Child([&] { return FindsEverything(m_installation.root()); }).wait(), 0);
  }

  Installation m_installation;
  TempDir m_place;
  const std::string m_call = m_place / "call", m_failures = m_place / "failures";
};

// The fault is there for one call, which then is made without it.
TEST_F(Faults, AtEachPointEveryCallReportsAndWorksAgain) {
  const std::vector<Call> calls = AllCalls();
  long armed = 0, reported = 0;
  for (const hook::Point& point : hook::kPoints) {
    for (const char* fault :
         {"SimulateMemoryAllocationFailure", "SimulateMemoryAllocationFailureAndThrow"}) {
      run(std::string(point.name) + ", " + fault, [&] {
        long failures = 0;
        for (const Call& call : calls) {
          WriteBytes(m_call, call.name);
          if (!Succeeds(call)) return 10;
          Arm(point.name, fault);
          const bool succeeded = Succeeds(call);
          failures += !succeeded;
          Arm("none of them", fault);
          if (call.holds && !call.holds(succeeded)) return 11;
          if (!Succeeds(call)) return 12;
        }
        WriteBytes(m_failures, std::to_string(failures));
        return 0;
      });
      armed += static_cast<long>(calls.size());
      reported += std::stol("0" + ReadBytes(m_failures));
    }
  }
  printf("%ld armed calls, of which %ld report a failure\n", armed, reported);
  EXPECT_GT(reported, static_cast<long>(std::size(hook::kPoints)));
}

TEST_F(Faults, WithEachSystemCallFailingEveryCallReports) {
  if (!kCanLimitMemory) GTEST_SKIP() << "NOT TESTED: a sanitizer makes system calls of its own";
  const struct {
    const char* name;
    long number;
    int error;
  } rows[] = {
#ifdef SYS_openat2
      {"openat2", SYS_openat2, ENOMEM},
#endif
      {"openat", SYS_openat, EMFILE},       {"pread64", SYS_pread64, EIO},
      {"write", SYS_write, ENOSPC},         {"pwrite64", SYS_pwrite64, EIO},
      {"renameat", SYS_renameat, EIO},      {"unlinkat", SYS_unlinkat, EACCES},
      {"flock", SYS_flock, ENOLCK},         {"fchmod", SYS_fchmod, EPERM},
      {"getdents64", SYS_getdents64, EIO},  {"statx", SYS_statx, ENOSYS},
      {"getrandom", SYS_getrandom, ENOSYS},
  };
  const std::vector<Call> calls = AllCalls();
  long made = 0;
  for (const auto& row : rows) {
    run(row.name, [&] {
      for (const Call& call : calls) {
        WriteBytes(m_call, call.name);
        if (!Succeeds(call)) return 10;
      }
      if (!FailSystemCall(row.number, row.error)) return 11;
      for (const Call& call : calls) Succeeds(call);
      return 0;
    });
    made += static_cast<long>(calls.size());
  }
  printf("%ld calls of which a system call fails\n", made);
}

}  // namespace
}  // namespace vlt::test::oom
