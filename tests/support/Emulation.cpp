#include "tests/support/Emulation.h"

#include <fnmatch.h>
#include <gtest/gtest.h>
#include <sys/prctl.h>

#include <cstdio>
#include <sstream>
#include <string>

namespace vlt::test {
namespace {

constexpr const char* kAccess = "the emulator gives a descriptor without access the right to read";
constexpr const char* kLimit = "the emulator keeps no limit of memory";
constexpr const char* kFilter = "the emulator knows no filter of system calls";
constexpr const char* kMode = "big-endian, the emulator reports the mode of a semaphore set as 0";
constexpr const char* kState = "/proc shows the emulator's waits, not the program's";

struct Row {
  const char* pattern;
  const char* reason;
};

constexpr Row kRows[] = {
    {"AutoBuffer.FailedAllocationLeavesTheBytes", kLimit},
    {"BinaryFile.ExactTransferSurvivesSignals", kState},
    {"BinaryFile.ModesOpenAsToldBitByBit", kAccess},
    {"CztMemoryStream.WithoutMemoryNothingChanges", kLimit},
    {"DurableCopy.AFailedSyncKeepsIt", kFilter},
    {"DurableCopy.OneThatCannotBeLookedAtCountsAsLeft", kFilter},
    {"DurableCopy.TakeUpFailsWhereItCannotRead", kFilter},
    {"DurableCopy.WithoutHardLinksThereIsNone", kFilter},
    {"EventFile.OpenerOfARemovedFileTakesTheNewOne", kState},
    {"EventFileLockAccess.WaitsForTheExclusivePhaseOfAnother", kState},
    {"EventFileLockAccess.GivesUpAfterFiveHundredRoundsOfAMillisecond", kFilter},
    {"FileReplace.AFailedSyncIsAFailedSave", kFilter},
    {"Files.SyncReportsRealFailuresOnly", kFilter},
    {"Files.TheRuleHoldsWithoutTheKernelsOwnWalk", kFilter},
    {"GuardedIniFile.AFailedSaveLeavesTheOldDigest", kFilter},
    {"GuardedIniFile.ASidecarThatCannotBeReadLeavesTheFile", kFilter},
    {"GuardedIniFileInspect.AnUnreadableSidecarFailsTheOpening", kFilter},
    {"IniFileLock.AForkedChildDoesNotFreeItsParentsLock", kState},
    {"IniFileLock.AnotherProcessWaitsAndGoesOnWhenTheHolderIsKilled", kState},
    {"IniFileLock.AnotherThreadWaits", kState},
    {"IniFileLock.MayBeGivenUpByAnotherThreadAndTakenAgain", kState},
    {"Mutex.InterruptedWaitIsResumed", kState},
    {"Mutex.KilledHolderDoesNotBlockTheNext", kState},
    {"Mutex.RefusedFileLockIsThrownWithItsErrnoAndLeavesTheSection", kFilter},
    {"Mutex.SecondObjectInTheSameThreadBlocksInFlock", kState},
    {"Mutex.UnlockThatTheSystemRefusesThrowsNothing", kFilter},
    {"MutexFork.ChildWaitsForTheParentAndThenHolds", kState},
    {"MutexFork.ForkWhileAnotherThreadHoldsLeavesAUsableChild", kState},
    {"NamedEvent.AutomaticSetReleasesOneOfThreeWaiters", kState},
    {"NamedEvent.KilledWaiterChangesNothingForTheOthers", kState},
    {"NamedEvent.ManualSetReleasesAllWaitersInAllProcessesAndStays", kState},
    {"NamedEvent.PulseBetweenTwoLooksGoesUnseen", kState},
    {"NamedEvent.PulseReleasesThoseWhoWaitWithoutLimit", kState},
    {"NamedEvent.RemovalUnderAWaiterAndLaterCallsAreErrors", kState},
    {"NamedEvent.SignalHandlersDoNotEndAWait", kState},
    {"NamedEvent.TimedWaitSeesASignal", kState},
    {"NamedEvent.TimedWaitSleeps50MsAndThenTheRest", kFilter},
    {"NamedEvent.WaitOfAllOnesHasNoLimit", kState},
    {"NamedEventFork.ForkWhileAnotherThreadIsInsideLeavesAUsableChild", kState},
    {"NamedEventHostile.JoinOfAnEventThatIsBeingClosedBeginsAnew", kState},
    {"NamedEventHostile.LockFileHeldAloneForLongIsEAGAIN", kFilter},
    {"NamedEventLimits.KernelWithoutSemaphoresIsENOLCK", kFilter},
    {"NamedEventOpen.KernelSetHas128SemaphoresForEverybody", kMode},
    {"NamedEventOpen.OpenerWaitsWhileAnotherSetsTheFileUp", kState},
    {"NamedEventOpen.OtherKindInAnotherProcessIsENOLCKAndChangesNothing", kFilter},
    {"path.CreateDirWhoseModeCannotBeSetTakesTheDirectoryAway", kFilter},
    {"pathTree.RenameBetweenFileSystemsKeepsTheSourceUntilTheCopyIsOnTheDisk", kFilter},
    {"pathTree.RenameToAFileSystemWithoutFsyncMovesTheFile", kFilter},
    {"Preference.WithoutMemoryOrDescriptorsThereIsNoAnswer", kFilter},
    {"RefCounted.SectionCountedObjectGoesInsideItsSection", kState},
    {"SharedUnixObject.FailureToSetTheModeIsAlwaysEPERM", kFilter},
    {"SharedUnixObject.RefusedModeIsAcceptedForFilesAndDirectories", kFilter},
    {"Sleep.SignalDoesNotCutItShort", kState},
    {"String.GrowthFallsBackToTheExactSizeWhenMemoryIsShort", kLimit},
    {"String.WithoutMemoryEveryOperationFailsAndChangesNothing", kLimit},
    {"SystemString.MissingMemoryYieldsNull", kLimit},
    {"vltAttributeLists.ACountThatIsNotTrueIsOutOfMemory", kLimit},
    {"vltBindingClasses.OutOfMemoryGivesAnEmptyComponentVector", kLimit},
    {"vltBindingClasses.OutOfMemoryIsAResultOfTheQuery", kLimit},
    {"vltjarGuardedFile.AShortSidecarIsJudgedUnderTheLock", kState},
    {"vltjarGuardedFile.WithADirectoryThatCannotBeMovedTheFileStays", kFilter},
    {"vltlinuxosStringResource.AWantOfMemoryIsNotRemembered", kLimit},
    {"vltPharlapDatabase.IsOpenUntilTheRegistrarGoesAndFreeThen", kState},
    {"vlTracer.AFailedLockDoesNotStopTheOutput", kFilter},
    {"vlTracerFork.ChildOfAForkDuringAWriteKeepsNoLock", kState},
    {"vlTracerHostile.TheEndDoesNotWaitForAWriteThatDoesNotEnd", kState},
    {"vltTestHook.AHangTimeThatIsGoneByTheNextRefreshIsForgotten", kFilter},
    {"vltTestHook.ExhaustMemoryTakesWhatThereIs", kLimit},
    {"vltTestHook.HangWithoutATimeLastsForAsLongAsASleepCan", kFilter},
    {"vltTestHook.PrecedenceIsHangCrashSimulateThrowExhaust", kFilter},
    {"vltTestHookPoints.ExhaustedMemoryIsSurvived", kLimit},
    {"ztSyncCS.IsRecursiveAndExcludesOtherThreads", kState},
    {"ztSyncEvent.OtherNegativeTimeoutsAreLongOnes", kState},
    {"ztSyncEvent.UnlockSetsAndEndsAWaitWithoutLimit", kState},
    {"ztSyncMutex.InitiallyOwnedAndRecursive", kState},
    {"ztSyncMutex.LockOfZeroBlocks", kState},
    {"ztSyncMutex.NullAndEmptyNamesAreOneAcrossProcesses", kState},
    {"ztSyncSemaphore.TimeoutLimitsEachWaitAndNotTheCall", kState},
    {"ztSyncSemaphore.TimeoutOfNothingSleepsUntilThereIsAUnit", kState},
    {"ztSyncStatefulMutex.AnyOtherWaitIsWithoutLimit", kState},
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
