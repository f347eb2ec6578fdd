#include "source/Utilities/vltTestHook.h"

#include <gtest/gtest.h>
#include <string.h>
#include <sys/resource.h>

#include <chrono>
#include <functional>
#include <new>

#include "source/Common/vltBindingClasses.h"
#include "source/Common/vltcmn.h"
#include "source/Utilities/vltutils.h"
#include "tests/support/Child.h"
#include "tests/support/Installation.h"

namespace {

using namespace vlt::test;

// The install directory is read once a process, so each start is a child of its own. Its exit code is
// the body's result; the hook file is written first.
int Armed(const std::string& hookFile, const std::function<int()>& body) {
  Installation installation;
  if (!hookFile.empty()) WriteBytes(installation.root() + "/VLTHooks.ini", hookFile);
  return Child([&] {
           vltRefreshHook();
           return body();
         })
      .wait();
}

std::string Hook(const std::string& name, const std::string& flags) {
  return "[Hook]\nName = " + name + "\n" + flags;
}

constexpr const char* kSimulate = "SimulateMemoryAllocationFailure = TRUE\n";
constexpr const char* kThrow = "SimulateMemoryAllocationFailureAndThrow = True\n";

TEST(Hook, WithoutAFileNothingIsArmedAndNoFileAppears) {
  Installation installation;
  EXPECT_EQ(Child([&] {
              vltRefreshHook();
              return vltTestHook("") == 0 && vltTestHook("x") == 0 && vltTestHook(nullptr) == 0 ? 0
                                                                                                : 1;
            }).wait(),
            0);
  EXPECT_FALSE(Exists(installation.root() + "/VLTHooks.ini"));
}

TEST(Hook, NameIsComparedExactly) {
  EXPECT_EQ(Armed(Hook("Point", kSimulate),
                  [] {
                    return vltTestHook("Point") == 1 && vltTestHook("point") == 0 &&
                                   vltTestHook("Points") == 0
                               ? 0
                               : 1;
                  }),
            0);
}

TEST(Hook, WithoutANameNoFlagIsRead) {
  Installation installation;
  std::string file = installation.root() + "/VLTHooks.ini";
  WriteBytes(file, "[Hook]\nCrash = true\n");
  EXPECT_EQ(Child([&] {
              vltRefreshHook();
              WriteBytes(file, "[Hook]\nName = p\n");
              vltRefreshHook();
              return vltTestHook("p") == 1 ? 7 : 8;  // armed, and no flag was kept: no exit(0)
            }).wait(),
            7);
}

TEST(Hook, FlagsStayWhileTheNameIsReplaced) {
  Installation installation;
  std::string file = installation.root() + "/VLTHooks.ini";
  WriteBytes(file, Hook("a", kThrow));
  EXPECT_EQ(Child([&] {
              vltRefreshHook();
              WriteBytes(file, Hook("b", "SimulateMemoryAllocationFailureAndThrow = false\n"));
              vltRefreshHook();
              if (vltTestHook("a") != 0) return 1;
              try {
                vltTestHook("b");
              } catch (const std::bad_alloc&) {
                return 0;
              }
              return 2;
            }).wait(),
            0);
}

TEST(Hook, CrashEndsTheProcessNormally) {
  EXPECT_EQ(Armed(Hook("p", "Crash = true\n"),
                  [] {
                    vltTestHook("p");
                    return 5;
                  }),
            0);
}

TEST(Hook, HangGoesBeforeCrashAndAnswersOne) {
  EXPECT_EQ(Armed(Hook("p", "Crash = true\nHang = true\nHangTime = 60\n"),
                  [] {
                    auto start = std::chrono::steady_clock::now();
                    unsigned answer = vltTestHook("p");
                    auto taken = std::chrono::steady_clock::now() - start;
                    return answer == 1 && taken >= std::chrono::milliseconds(60) ? 6 : 7;
                  }),
            6);
}

TEST(Hook, HangWithoutATimeLastsForTheTimeBeing) {
  Installation installation;
  WriteBytes(installation.root() + "/VLTHooks.ini", Hook("p", "Hang = true\n"));
  Signal before;
  Child child([&] {
    vltRefreshHook();
    before.notify();
    vltTestHook("p");
    return 0;
  });
  ASSERT_TRUE(before.await());
  EXPECT_TRUE(Eventually([&] {
    return BlockedIn(child.pid(), 230 /* clock_nanosleep */) ||
           BlockedIn(child.pid(), 35 /* nanosleep */) || sizeof(void*) == 4;
  }));
  EXPECT_TRUE(child.running());
}

TEST(Hook, PrecedenceIsSimulateThenThrow) {
  EXPECT_EQ(Armed(Hook("p", std::string(kThrow) + kSimulate),
                  [] { return vltTestHook("p") == 1 ? 0 : 1; }),
            0);
}

TEST(Hook, ABadHookFileArmsNothing) {
  EXPECT_EQ(Armed(std::string("\xFF\xFE[\0", 4), [] { return vltTestHook("p") == 0 ? 0 : 1; }), 0);
}

TEST(Hook, ExhaustMemoryTakesWhatThereIsAndGoesOnFromThere) {
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
  GTEST_SKIP() << "the sanitizer's own memory does not fit below the limit";
#endif
  EXPECT_EQ(Armed(Hook("p", "MemoryAllocationFailure = true\n"),
                  [] {
                    rlimit limit = {400u << 20, 400u << 20};
                    if (setrlimit(RLIMIT_AS, &limit) != 0) return 1;
                    if (vltTestHook("p") != 1) return 2;
                    void* large = malloc(64u << 20);
                    if (large) return 3;
                    return vltTestHook("p") == 1 ? 0 : 4;  // again: a limit of 1000 small blocks
                  }),
            0);
}

// ---- The points. Each action drives the code to its point and tells what came out.

int Code(HRESULT result) { return result == S_OK ? 0 : result == E_OUTOFMEMORY ? 1 : 2; }

int AppendAction() {
  size_t capacity = 2;
  auto* buffer = static_cast<wchar_t*>(vltAlloc(capacity * sizeof(wchar_t)));
  wcscpy(buffer, L"a");
  wchar_t* before = buffer;
  HRESULT result = vltAppendString2(&buffer, L"bc", &capacity);
  bool kept = buffer == before && wcscmp(buffer, L"a") == 0 && capacity == 362;
  vltFree(buffer);
  return result == E_OUTOFMEMORY && !kept ? 3 : Code(result);
}

int DuplicateAction() {
  wchar_t* out = nullptr;
  HRESULT result = vltDuplicateString2(L"a", &out);
  if (result < 0 && out) return 3;
  vltFree(out);
  return Code(result);
}

int ClsidAction() {
  GUID g = {};
  wchar_t* out = nullptr;
  HRESULT result = vltStringFromCLSID(&g, &out);
  if (result < 0 && out) return 3;
  vltFree(out);
  return Code(result);
}

int GuidTextAction() {
  wchar_t* text = vltGuidToString(GUID{});
  bool empty = !text || !*text;
  vltFree(text);
  return empty ? 1 : 0;
}

int RegistrarAction() {
  IvltRegistrar* registrar = nullptr;
  HRESULT result = vltGetRegistrar(&registrar);
  if (result < 0 && registrar) return 3;
  if (registrar) registrar->Release();
  return Code(result);
}

const zt::fnd::String kTable(
    L"{00000001-0000-0000-0000-000000000000}:2:{0000000A-0000-0000-0000-000000000000}:"
    L"{0000000B-0000-0000-0000-000000000000}:{00000002-0000-0000-0000-000000000000}:0");

_vltComponent2 Expert() {
  _vltComponent2 record;
  memset(&record, 0, sizeof record);
  record.type = vltComponentObjectExpert;
  record.identifier.Data1 = 1;
  return record;
}

// Both classes, or none; anything between is 3.
int AddClassesAction() {
  BindingClassesMap map;
  map.emplace(GUID{0xC, 0, 0, {}}, GUID{9, 0, 0, {}});
  _vltComponent2 record = Expert();
  vltAddBindingClasses(&record, CvltBindingClasses(kTable), &map);
  return map.size() == 3 ? 0 : map.size() == 1 ? 1 : 3;
}

int GetClassesAction() {
  BindingClassesMap map;
  map.emplace(GUID{0xA, 0, 0, {}}, GUID{1, 0, 0, {}});
  unsigned count = 0;
  GUID* found = nullptr;
  HRESULT result = vltGetComponentsForBindingClass(GUID{0xA, 0, 0, {}}, &count, &map, &found);
  if (result < 0 && (found || count)) return 3;
  vltFree(found);
  return Code(result);
}

int VectorAction() {
  auto components = CvltBindingClasses(kTable).GetComponentVector();
  return components.size() == 2 ? 0 : components.size() == 0 ? 1 : 3;
}

// 4 for a std::bad_alloc that leaves the action.
int Perform(int (*action)()) {
  try {
    return action();
  } catch (const std::bad_alloc&) {
    return 4;
  }
}

struct Point {
  const char* name;
  int (*action)();
  // What the action gives when the hook answers 1, and when it throws.
  int answered, thrown;
};

// At a point before a throwing allocation only the exception counts; it is handled there. Before the
// others only the answer does, and an exception passes out.
const Point kPoints[] = {
    {vlt::hook::kGetRegistrar2, RegistrarAction, 1, 4},
    {vlt::hook::kGetComponentsForBindingClass, GetClassesAction, 1, 4},
    {vlt::hook::kCopyComponentOfClass, GetClassesAction, 0, 1},
    {vlt::hook::kAddBindingClass, AddClassesAction, 0, 1},
    {vlt::hook::kGetComponentVector, VectorAction, 0, 1},
    {vlt::hook::kDuplicateString2, DuplicateAction, 1, 4},
    {vlt::hook::kDuplicateString2, GuidTextAction, 1, 4},
    {vlt::hook::kAppendString2, AppendAction, 1, 4},
    {vlt::hook::kStringFromClsid, ClsidAction, 1, 4},
    {vlt::hook::kStringFromClsid, GuidTextAction, 1, 4},
};

TEST(HookPoints, UnarmedActionsSucceed) {
  for (const Point& point : kPoints) {
    EXPECT_EQ(Armed("", [&] { return Perform(point.action); }), 0) << point.name;
  }
}

TEST(HookPoints, ASimulatedFailureHasItsResult) {
  for (const Point& point : kPoints) {
    EXPECT_EQ(Armed(Hook(point.name, kSimulate), [&] { return Perform(point.action); }),
              point.answered)
        << point.name;
  }
}

TEST(HookPoints, AThrownFailureHasItsResult) {
  for (const Point& point : kPoints) {
    EXPECT_EQ(Armed(Hook(point.name, kThrow), [&] { return Perform(point.action); }), point.thrown)
        << point.name;
  }
}

TEST(HookPoints, AHangAnswersAfterItsTime) {
  for (const Point& point : kPoints) {
    EXPECT_EQ(Armed(Hook(point.name, "Hang = true\nHangTime = 1\n"),
                    [&] { return Perform(point.action); }),
              point.answered)
        << point.name;
  }
}

TEST(HookPoints, ACrashIsANormalEnd) {
  for (const Point& point : kPoints) {
    EXPECT_EQ(Armed(Hook(point.name, "Crash = true\n"), [&] { return 10 + Perform(point.action); }),
              0)
        << point.name;
  }
}

TEST(HookPoints, ExhaustedMemoryIsSurvived) {
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
  GTEST_SKIP() << "the sanitizer's own memory does not fit below the limit";
#endif
  for (const Point& point : kPoints) {
    int result = Armed(Hook(point.name, "MemoryAllocationFailure = true\n"), [&] {
      rlimit limit = {400u << 20, 400u << 20};
      if (setrlimit(RLIMIT_AS, &limit) != 0) return 99;
      return Perform(point.action);
    });
    EXPECT_LE(result, 4) << point.name;  // a result or a bad_alloc, and no crash
    EXPECT_NE(result, 3) << point.name;
  }
}

TEST(HookPoints, AFailedCreationLeavesTheRegistrarToTheNextCall) {
  Installation installation;
  std::string file = installation.root() + "/VLTHooks.ini";
  WriteBytes(file, Hook(vlt::hook::kGetRegistrar2, kSimulate));
  EXPECT_EQ(Child([&] {
              vltRefreshHook();
              if (RegistrarAction() != 1) return 1;
              WriteBytes(file, Hook("elsewhere", ""));
              vltRefreshHook();
              return RegistrarAction();
            }).wait(),
            0);
}

}  // namespace
