#include "source/Common/vltFailure.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <exception>
#include <filesystem>

#include "source/Common/ZtUtils/General/vlTracer.h"
#include "tests/support/Child.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/NamedEvent.h"

namespace {

using namespace vlt::test;
using zt::fnd::osdep::NamedEvent;

const wchar_t* const kLockdown = L"LockdownVLTEvent";

TEST(vltFailure, SignalsWhoeverHoldsTheEventInAnotherProcess) {
  Signal open;
  Child watcher([&] {
    NamedEvent event(zt::fnd::String(kLockdown), true, false);
    if (event.check()) return 2;
    open.notify();
    return event.wait(20000) ? 0 : 1;
  });
  ASSERT_TRUE(open.await());
  EXPECT_EQ(vltReportOutOfMemory("void f()"), E_OUTOFMEMORY);
  EXPECT_EQ(watcher.wait(), 0);
}

TEST(vltFailure, LeavesNoEventWithoutAHolder) {
  vltReportOutOfMemory("void f()");
  NamedEvent event(zt::fnd::String(kLockdown), true, false);
  EXPECT_FALSE(event.check());
}

TEST(vltFailure, WhereNoEventCanBeHadTheResultIsTheSame) {
  TempDir dir;
  WriteBytes(dir / "file", "");
  EXPECT_EQ(Child([&] {
              setenv("ZTFNDTMPSHAREDFILEDIR", (dir / "file").c_str(), 1);
              try {
                NamedEvent event(zt::fnd::String(kLockdown), true, false);
                return 2;
              } catch (const std::exception&) {
              }
              return vltReportOutOfMemory("void f()") == E_OUTOFMEMORY ? 0 : 1;
            }).wait(),
            0);
}

// What the body writes to standard error.
template <class Body>
std::string Errors(Body body) {
  TempDir dir;
  Child([&] {
    int err = open((dir / "err").c_str(), O_CREAT | O_WRONLY, 0600);
    dup2(err, 2);
    body();
    return 0;
  }).wait();
  return ReadBytes(dir / "err");
}

void Start(unsigned mask) {
  vlTracer::Initialize(static_cast<vlTracer::SeverityLevel>(mask), vlTracer::kTargetError, nullptr,
                       0);
}

TEST(vltFailure, TracesUnderTheErrorBitOnly) {
  for (unsigned mask : {0u, 1u, 0xFFFFFFFDu}) {
    EXPECT_EQ(Errors([&] {
                Start(mask);
                vltTraceError("%d", 1);
              }),
              "");
  }
  EXPECT_EQ(Errors([] {
              Start(2);
              vltReportOutOfMemory("void f(int)");
              vltTraceError("%s %d", "text", 7);
            }),
            "  Memory allocation failure in void f(int)\n  text 7\n");
}

TEST(vltFailure, APendingCallbackStartsTheLog) {
  EXPECT_EQ(Errors([] {
              vlTracer::Initialize([] { Start(2); });
              vltTraceError("first");
            }),
            "  first\n");
}

TEST(vltFailure, LongMessagesAreCut) {
  std::string text = Errors([] {
    Start(2);
    vltTraceError("%s", std::string(10000, 'x').c_str());
  });
  EXPECT_EQ(text, "  " + std::string(2045, 'x') + "\n");
}

}  // namespace
