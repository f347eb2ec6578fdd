#include "tests/support/Emulation.h"

#include <fnmatch.h>
#include <gtest/gtest.h>
#include <sys/prctl.h>
#include <sys/syscall.h>

#include <cstdio>
#include <sstream>
#include <string>

namespace vlt::test {
namespace {

constexpr const char* kAccess = "the emulator gives a descriptor without access the right to read";
constexpr const char* kLimit = "the emulator keeps no limit of memory";
constexpr const char* kFilter = "the emulator knows no filter of system calls";
constexpr const char* kFork =
    "a fork beside busy threads may leave a lock of the emulator's held in the child";
#if defined(__arm__)
constexpr const char* kPeak = "the emulator maps all memory of a 32-bit program when it starts";
#else
constexpr const char* kPeak = nullptr;
#endif
#if defined(__s390x__)
constexpr const char* kMode = "the emulator reports the mode of a semaphore set as 0";
constexpr const char* kUtf8 =
    "the emulator's CU14, by which iconv reads UTF-8, refuses U+0800 to U+0FFF";
#else
constexpr const char *kMode = nullptr, *kUtf8 = nullptr;
#endif

struct Row {
  const char* pattern;
  const char* reason;  // null: this processor's emulator can
};

constexpr Row kRows[] = {
    {"AutoBuffer.FailedAllocationLeavesTheBytes", kLimit},
    {"BinaryFile.ModesOpenAsToldBitByBit", kAccess},
    {"CztMemoryStream.WithoutMemoryNothingChanges", kLimit},
    {"DurableCopy.AFailedSyncKeepsIt", kFilter},
    {"DurableCopy.OneThatCannotBeLookedAtCountsAsLeft", kFilter},
    {"DurableCopy.TakeUpFailsWhereItCannotRead", kFilter},
    {"DurableCopy.WithoutHardLinksThereIsNone", kFilter},
    {"EventFileLockAccess.GivesUpAfterFiveHundredRoundsOfAMillisecond", kFilter},
    {"EventFileLockAccess.RefusedLocksEndInTheirErrno", kFilter},
    {"FileNumbers.AreThereInASandboxThatRefusesTheNewerCall", kFilter},
    {"FileReplace.AFailedSyncIsAFailedSave", kFilter},
    {"Files.SyncReportsRealFailuresOnly", kFilter},
    {"Files.TheRuleHoldsWithoutTheKernelsOwnWalk", kFilter},
    {"GuardedIniFile.AFailedSaveLeavesTheOldDigest", kFilter},
    {"GuardedIniFile.ASidecarThatCannotBeReadLeavesTheFile", kFilter},
    {"GuardedIniFileInspect.AnUnreadableSidecarFailsTheOpening", kFilter},
    {"Locales/LocaleTextIConv.*/Utf8", kUtf8},
    {"Mutex.RefusedFileLockIsThrownWithItsErrnoAndLeavesTheSection", kFilter},
    {"Mutex.UnlockThatTheSystemRefusesThrowsNothing", kFilter},
    {"MutexFork.ForksDuringHeavyUseLeaveUsableChildren", kFork},
    {"NamedEvent.TimedWaitSleeps50MsAndThenTheRest", kFilter},
    {"NamedEventHostile.LockFileHeldAloneForLongIsEAGAIN", kFilter},
    {"NamedEventLimits.KernelWithoutSemaphoresIsENOLCK", kFilter},
    {"NamedEventOpen.KernelSetHas128SemaphoresForEverybody", kMode},
    {"NamedEventOpen.OtherKindInAnotherProcessIsENOLCKAndChangesNothing", kFilter},
    {"path.CreateDirWhoseModeCannotBeSetTakesTheDirectoryAway", kFilter},
    {"pathTree.RenameBetweenFileSystemsKeepsTheSourceUntilTheCopyIsOnTheDisk", kFilter},
    {"pathTree.RenameToAFileSystemWithoutFsyncMovesTheFile", kFilter},
    {"Preference.WithoutMemoryOrDescriptorsThereIsNoAnswer", kFilter},
    {"SharedUnixObject.FailureToSetTheModeIsAlwaysEPERM", kFilter},
    {"SharedUnixObject.RefusedModeIsAcceptedForFilesAndDirectories", kFilter},
    {"String.GrowthFallsBackToTheExactSizeWhenMemoryIsShort", kLimit},
    {"String.WithoutMemoryEveryOperationFailsAndChangesNothing", kLimit},
    {"SystemString.MissingMemoryYieldsNull", kLimit},
    {"vltAttributeLists.ACountThatIsNotTrueIsOutOfMemory", kLimit},
    {"vltBindingClasses.OutOfMemoryGivesAnEmptyComponentVector", kLimit},
    {"vltBindingClasses.OutOfMemoryIsAResultOfTheQuery", kLimit},
    {"vltjarGuardedFile.WithADirectoryThatCannotBeMovedTheFileStays", kFilter},
    {"vlTracer.AFailedLockDoesNotStopTheOutput", kFilter},
    {"vltStringResources.AWantOfMemoryIsNotRemembered", kLimit},
    {"vltTestHook.AHangTimeThatIsGoneByTheNextRefreshIsForgotten", kFilter},
    {"vltTestHook.ASecondExhaustionGoesOnWithBlocksOfTheSameSize", kLimit},
    {"vltTestHook.ExhaustMemoryTakesWhatThereIs", kLimit},
    {"vltTestHook.HangWithoutATimeLastsForAsLongAsASleepCan", kFilter},
    {"vltTestHook.PrecedenceIsHangCrashSimulateThrowExhaust", kFilter},
    {"vltTestHookPoints.ASimulatedFailureAllocatesNothing", kPeak},
    {"vltTestHookPoints.ExhaustedMemoryIsSurvived", kLimit},
};

// What a program waits in, and the call that the emulator makes for it, as an x86-64 kernel numbers it.
constexpr struct {
  long ours, kernels;
} kWaits[] = {
    {SYS_read, 0},
    {SYS_write, 1},
    {SYS_writev, 20},
    {SYS_nanosleep, 35},
    {SYS_flock, 73},
    {SYS_futex, 202},
    {SYS_clock_nanosleep, 230},
#if defined(SYS_futex_time64)
    {SYS_futex_time64, 202},
#endif
#if defined(SYS_clock_nanosleep_time64)
    {SYS_clock_nanosleep_time64, 230},
#endif
#if defined(SYS_ipc)
    {SYS_ipc, 220},
#endif
#if defined(SYS_semop)
    {SYS_semop, 220},
#endif
#if defined(SYS_semtimedop)
    {SYS_semtimedop, 220},
#endif
#if defined(SYS_semtimedop_time64)
    {SYS_semtimedop_time64, 220},
#endif
};

// By the positive patterns of a filter, "a*:b.c-d".
bool IsAsked(const std::string& filter, const std::string& test) {
  std::istringstream patterns(filter.substr(0, filter.find('-')));
  for (std::string pattern; std::getline(patterns, pattern, ':');) {
    if (fnmatch(pattern.c_str(), test.c_str(), 0) == 0) return true;
  }
  return false;
}

}  // namespace

// The one call that an emulator refuses and every kernel knows: a filter would be its own.
bool IsEmulated() { return prctl(PR_GET_SECCOMP) < 0; }

long NumberInProc(long systemCallNumber) {
  if (!IsEmulated()) return systemCallNumber;
  for (const auto& wait : kWaits) {
    if (wait.ours == systemCallNumber) return wait.kernels;
  }
  return -1;
}

const char* BeyondEmulators(const char* test) {
  for (const Row& row : kRows) {
    if (fnmatch(row.pattern, test, 0) == 0) return row.reason;
  }
  return nullptr;
}

void LeaveOutBeyondEmulators() {
  if (!IsEmulated()) return;
  const std::string asked = testing::GTEST_FLAG(filter);
  std::string filter = asked + (asked.find('-') == std::string::npos ? "-" : ":");
  const testing::UnitTest& all = *testing::UnitTest::GetInstance();
  for (int s = 0; s < all.total_test_suite_count(); ++s) {
    const testing::TestSuite& suite = *all.GetTestSuite(s);
    for (int t = 0; t < suite.total_test_count(); ++t) {
      const std::string name = std::string(suite.name()) + "." + suite.GetTestInfo(t)->name();
      const char* reason = BeyondEmulators(name.c_str());
      if (!reason) continue;
      filter += name + ":";
      // As GoogleTest says it, so that ctest counts the test as skipped.
      if (IsAsked(asked, name)) printf("[  SKIPPED ] %s: NOT TESTED: %s\n", name.c_str(), reason);
    }
  }
  testing::GTEST_FLAG(filter) = filter;
}

}  // namespace vlt::test
