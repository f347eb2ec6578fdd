// Files that another process has damaged, planted or keeps locked.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/ipc.h>
#include <sys/sem.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/CaughtSleeps.h"
#include "tests/support/Child.h"
#include "tests/support/EventKinds.h"
#include "tests/support/EventPlace.h"
#include "tests/support/InChild.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/ReusedDescriptor.h"
#include "tests/support/TempDir.h"
#include "tests/support/ThreadState.h"
#include "zt/fnd/ByteOrder.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/NamedEvent.h"
#include "zt/fnd/osdep/events/EventStateFile.h"
#include "zt/posix/Files.h"

using zt::posix::Flock;
using zt::posix::ScopedFd;

namespace zt::fnd::osdep {
namespace {

using vlt::test::Child;
using vlt::test::DescriptorOf;
using vlt::test::EventPlace;
using vlt::test::Eventually;
using vlt::test::Exists;
using vlt::test::kAutomatic;
using vlt::test::kClear;
using vlt::test::Keeper;
using vlt::test::kManual;
using vlt::test::kSet;
using vlt::test::OpenDescriptors;
using vlt::test::PosixErrorOf;
using vlt::test::ReadBytes;
using vlt::test::ReusedDescriptor;
using vlt::test::Sleeps;
using vlt::test::TempDir;
using vlt::test::Wide;
using vlt::test::WriteBytes;
typedef std::vector<std::string> Names;
typedef EventPlace::Slot Slot;

auto Open(const std::string& name, bool manual = kManual, bool initial = kClear) {
  return std::make_unique<NamedEvent>(Wide(name), manual, initial);
}

// Changes bytes in place, as another process would.
void Patch(const std::string& path, std::size_t at, const std::string& bytes) {
  ScopedFd fd(::open(path.c_str(), O_WRONLY | O_CLOEXEC));
  ASSERT_TRUE(fd.valid()) << path;
  ASSERT_EQ(static_cast<ssize_t>(bytes.size()),
            pwrite(fd.get(), bytes.data(), bytes.size(), static_cast<off_t>(at)));
}

std::string Number(std::uint32_t value) {
  value = little_endian::ToLittleEndian(value);
  return std::string(reinterpret_cast<const char*>(&value), sizeof value);
}

// A process that has an event in set 1 while the test spoils the state file.
struct Occupied {
  EventPlace place;
  Keeper keeper{[] { return Open("keeper"); }};
  std::string state = place.file("sem_1");

  // Where a new event goes; it must work there.
  Slot next() {
    EXPECT_TRUE(keeper.good());
    auto event = Open("next", kAutomatic, kSet);
    EXPECT_TRUE(event->check());
    event->set();
    EXPECT_TRUE(event->check());
    return place.slotOf("next");
  }
};

// ---- state files

TEST(NamedEventHostile, BadHeadersMakeTheSetUnusable) {
  const std::pair<std::size_t, std::string> damages[] = {
      {0, std::string("\x30", 1)},  // magic
      {5, std::string("\0", 1)},    // not ready
      {5, std::string("\2", 1)},    // nor is this
      {6, Number(4000000000u)},     // more slots than the kernel's set has
      {6, Number(129)},
  };
  for (const auto& [at, bytes] : damages) {
    Occupied set;
    Patch(set.state, at, bytes);
    std::string before = ReadBytes(set.state);
    EXPECT_EQ((Slot{2, 0}), set.next()) << at;
    EXPECT_EQ(before, ReadBytes(set.state)) << at;
  }
}

TEST(NamedEventHostile, ShortStateFileInUseMakesTheSetUnusable) {
  for (unsigned size : {0u, 17u, 18u, 30u}) {
    Occupied set;
    ASSERT_EQ(0, truncate(set.state.c_str(), size));
    EXPECT_EQ((Slot{2, 0}), set.next()) << size;
    EXPECT_EQ(size, ReadBytes(set.state).size());
  }
}

TEST(NamedEventHostile, UntrustworthyFreeListsAreSkipped) {
  const std::pair<std::size_t, std::string> damages[] = {
      {14, Number(0)},            // in use: a process died between two writes
      {14, Number(128)},          // just outside
      {14, Number(0x01023C4Du)},  // a key
      {14, Number(0xFFFFFFFFu)},  // the end, against the count
      {6, Number(0)},             // no slots at all
      {6, Number(1)},             // first free outside
  };
  for (const auto& [at, bytes] : damages) {
    Occupied set;
    Patch(set.state, at, bytes);
    std::string before = ReadBytes(set.state);
    EXPECT_EQ((Slot{2, 0}), set.next()) << at;
    EXPECT_EQ(before, ReadBytes(set.state)) << at;  // of the same size, too
  }
}

TEST(NamedEventHostile, BrokenLinkSpoilsTheNextAllocationOnly) {
  Occupied set;
  Patch(set.state, SlotRecord::Offset(1) + 2, Number(0x7FFFFFFFu));
  auto first = Open("first");
  EXPECT_EQ((Slot{1, 1}), set.place.slotOf("first"));
  EXPECT_EQ((Slot{2, 0}), set.next());
  first.reset();
  EXPECT_EQ(1298u, ReadBytes(set.state).size());
}

TEST(NamedEventHostile, FullByItsHeaderIsFull) {
  Occupied set;
  Patch(set.state, 10, Number(0));
  EXPECT_EQ((Slot{2, 0}), set.next());
}

TEST(NamedEventHostile, StateFileThatNobodyHoldsIsMadeAnewWhateverItSays) {
  EventPlace place;
  Open("warm up");
  std::string good = [&] {
    auto event = Open("name");
    return ReadBytes(place.file("sem_1"));
  }();
  std::string wrong = good;
  wrong[0] = 'x';
  for (const std::string& bytes : {good, wrong, std::string("\0\0", 2), std::string(5000, 'y')}) {
    WriteBytes(place.file("sem_1"), bytes);
    auto event = Open("name");
    EXPECT_EQ((Slot{1, 0}), place.slotOf("name"));
    std::string state = ReadBytes(place.file("sem_1"));
    EXPECT_EQ(std::max<std::size_t>(bytes.size(), 1298), state.size());  // never cut off
    EXPECT_EQ(Number(127), state.substr(10, 4));
    event.reset();
    EXPECT_EQ(Names(), place.files());
  }
}

TEST(NamedEventHostile, StateFileLockedByAStrangerIsSkipped) {
  EventPlace place;
  Open("warm up");
  ScopedFd stranger(::open(place.file("sem_1").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666));
  ASSERT_EQ(0, Flock(stranger.get(), LOCK_EX));
  auto event = Open("name");
  EXPECT_EQ((Slot{2, 0}), place.slotOf("name"));
}

// An opening that never gave up would meet the child's deadline.
TEST_IN_CHILD(NamedEventHostile, SetsLockedByAStrangerDoNotHoldAnOpenerIndefinitely) {
  EventPlace place;
  Open("warm up");
  std::vector<ScopedFd> stranger;
  for (int n = 1; n <= 20; ++n) {
    std::string path = place.file("sem_" + std::to_string(n));
    stranger.emplace_back(::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666));
    ASSERT_EQ(0, Flock(stranger.back().get(), LOCK_EX));
  }
  EXPECT_EQ(ENOLCK, PosixErrorOf([] { Open("name"); }));
  EXPECT_FALSE(Exists(place.file("name")));
}

TEST(NamedEventHostile, LinksPipesAndDirectoriesInTheStateFilesPlaceAreSkipped) {
  EventPlace place;
  Open("warm up");
  WriteBytes(place.file("victim"), "victim");
  chmod(place.file("victim").c_str(), 0600);
  ASSERT_EQ(0, symlink("victim", place.file("sem_1").c_str()));
  ASSERT_EQ(0, mkfifo(place.file("sem_2").c_str(), 0666));
  ASSERT_EQ(0, mkdir(place.file("sem_3").c_str(), 0777));
  WriteBytes(place.file("sem_4"), "");
  ASSERT_EQ(0, link(place.file("victim").c_str(), place.file("second").c_str()));
  auto event = Open("name");
  EXPECT_EQ((Slot{4, 0}), place.slotOf("name"));
  EXPECT_EQ("victim", ReadBytes(place.file("victim")));
  EXPECT_EQ(0600, vlt::test::ModeOf(place.file("victim")));
  event.reset();
  EXPECT_FALSE(Exists(place.file("sem_4")));
  EXPECT_TRUE(Exists(place.file("sem_3")));
  EXPECT_EQ(ELOOP, PosixErrorOf([] { Open("sem_1"); }));
}

// ---- the kernel's sets

TEST(NamedEventHostile, SmallerSetOfTheSameKeyMakesItUnusable) {
  EventPlace place;
  Open("warm up");
  WriteBytes(place.file("sem_1"), "");
  int small = semget(ftok(place.file("sem_1").c_str(), 1), 5, IPC_CREAT | IPC_EXCL | 0777);
  ASSERT_NE(-1, small);
  auto event = Open("name");
  EXPECT_EQ((Slot{2, 0}), place.slotOf("name"));
  EXPECT_EQ(0, semctl(small, 0, IPC_RMID));  // it was left alone
  event.reset();
  EXPECT_EQ(Names{"sem_1"}, place.files());  // keeps its inode, which the next file would get
  Open("name");
  EXPECT_EQ(Names(), place.files());
}

TEST(NamedEventHostile, SetOfAnEarlierLifeIsTakenOver) {
  EventPlace place;
  Open("warm up");
  WriteBytes(place.file("sem_1"), "");
  int old = semget(ftok(place.file("sem_1").c_str(), 1), 128, IPC_CREAT | IPC_EXCL | 0777);
  ASSERT_NE(-1, old);
  union {
    int value;
    void* unused;
  } seventeen = {17};
  ASSERT_EQ(0, semctl(old, 0, SETVAL, seventeen));
  auto event = Open("name", kAutomatic, kClear);
  EXPECT_EQ(old, place.setOf(1));
  EXPECT_FALSE(event->check());
  event.reset();
  EXPECT_EQ(-1, EventPlace::ValueOf(old, 0));
}

TEST(NamedEventHostile, RemovedSetIsAnErrorAtOpeningThatLeavesNothing) {
  Occupied set;
  auto mine = Open("mine");
  ASSERT_EQ(0, semctl(set.place.setOf(1), 0, IPC_RMID));
  std::string before = ReadBytes(set.state);
  int descriptors = OpenDescriptors();
  EXPECT_EQ(EINVAL, PosixErrorOf([] { Open("next"); }));
  EXPECT_EQ(before, ReadBytes(set.state));
  EXPECT_EQ((Names{"keeper", "mine", "sem_1"}), set.place.files());
  EXPECT_EQ(descriptors, OpenDescriptors());
}

// ---- lock files

TEST(NamedEventHostile, StaleLockFilesLeadToAFreshSlot) {
  EventPlace place;
  auto other = Open("other");
  const std::string contents[] = {
      "",
      std::string(8, '\0'),
      std::string(9, '\0'),
      std::string(9, '\xFF'),
      std::string(1, '\0') + Number(4000000000u) + Number(0),
      std::string(1, '\0') + Number(1) + Number(0),  // another process's slot
      std::string(1, '\0') + Number(1) + Number(1),  // a free one
      std::string(1, '\0') + Number(1) + Number(127),
      std::string(1, '\0') + Number(1) + Number(128),
      std::string(1, '\0') + Number(1) + Number(0xFFFFFFFFu),
      std::string(100000, 'z')};
  for (const std::string& bytes : contents) {
    WriteBytes(place.file("name"), bytes);
    auto event = Open("name", kAutomatic, kSet);
    EXPECT_EQ(std::string(1, '\0') + Number(1) + Number(1),
              ReadBytes(place.file("name")).substr(0, 9));
    EXPECT_TRUE(event->check());
    EXPECT_EQ((Names{"name", "other", "sem_1"}), place.files());  // no "sem_0", no "sem_4000000000"
  }
}

TEST(NamedEventHostile, PlantedPlacesOfTheEventAreRefused) {
  EventPlace place;
  Open("warm up");
  WriteBytes(place.file("victim"), "victim");
  chmod(place.file("victim").c_str(), 0600);
  ASSERT_EQ(0, symlink("victim", place.file("link").c_str()));
  ASSERT_EQ(0, mkfifo(place.file("fifo").c_str(), 0666));
  WriteBytes(place.file("first"), "x");
  ASSERT_EQ(0, link(place.file("first").c_str(), place.file("second").c_str()));
  int descriptors = OpenDescriptors();
  EXPECT_EQ(ELOOP, PosixErrorOf([] { Open("link"); }));
  EXPECT_EQ(ENXIO, PosixErrorOf([] { Open("fifo"); }));
  EXPECT_EQ(EMLINK, PosixErrorOf([] { Open("second"); }));
  EXPECT_EQ("victim", ReadBytes(place.file("victim")));
  EXPECT_EQ(0600, vlt::test::ModeOf(place.file("victim")));
  EXPECT_EQ(descriptors, OpenDescriptors());
}

TEST_IN_CHILD(NamedEventHostile, LockFileHeldAloneForLongIsEAGAIN) {
  EventPlace place;
  Open("warm up");
  ScopedFd stranger(::open(place.file("name").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666));
  ASSERT_EQ(0, Flock(stranger.get(), LOCK_EX));
  ASSERT_TRUE(vlt::test::CatchSleeps());
  EXPECT_EQ(EWOULDBLOCK, PosixErrorOf([] { Open("name"); }));
  EXPECT_EQ(std::vector<long long>(500, 1), vlt::test::CaughtSleeps());
  EXPECT_EQ(Names{"name"}, place.files());
}

// One process has the lock of a joiner, while the event it would have joined was closed.
TEST(NamedEventHostile, JoinOfAnEventThatIsBeingClosedBeginsAnew) {
  EventPlace place;
  Open("warm up");
  for (const std::string& bytes :
       {std::string(), std::string(1, '\0') + Number(1) + Number(3), std::string(9, '\xFF')}) {
    WriteBytes(place.file("name"), bytes);
    ScopedFd other(::open(place.file("name").c_str(), O_RDWR | O_CLOEXEC));
    ASSERT_EQ(0, Flock(other.get(), LOCK_SH));
    std::thread letGo([&, opener = gettid()] {
      EXPECT_TRUE(Eventually([&] { return Sleeps(opener); }));  // before it begins again
      other.reset();
    });
    EXPECT_TRUE(Open("name", kAutomatic, kSet)->check());
    letGo.join();
    EXPECT_EQ(Names(), place.files());
  }
}

TEST(NamedEventHostile, JoinOfAKilledHoldersEventBeginsAnew) {
  EventPlace place;
  ScopedFd sharer;
  {
    Keeper killed([] { return Open("name"); });
    ASSERT_TRUE(killed.good());
    sharer.reset(::open(place.file("name").c_str(), O_RDWR | O_CLOEXEC));
    ASSERT_EQ(0, Flock(sharer.get(), LOCK_SH));
    killed.kill();  // the set belongs to no process now, and an opener makes it again
  }
  std::thread letGo([&, opener = gettid()] {
    EXPECT_TRUE(Eventually([&] { return Sleeps(opener); }));
    sharer.reset();
  });
  EXPECT_TRUE(Open("name", kManual, kSet)->check());
  letGo.join();
  EXPECT_EQ(Names(), place.files());
}

// An opening that never gave up would meet the child's deadline.
TEST_IN_CHILD(NamedEventHostile, LockFileSharedIndefinitelyByAStrangerIsENOLCK) {
  EventPlace place;
  Open("warm up");
  ScopedFd stranger(::open(place.file("name").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666));
  ASSERT_EQ(0, Flock(stranger.get(), LOCK_SH));
  int descriptors = OpenDescriptors();
  EXPECT_EQ(ENOLCK, PosixErrorOf([] { Open("name"); }));
  EXPECT_EQ(descriptors, OpenDescriptors());
  EXPECT_EQ(Names{"name"}, place.files());
  EXPECT_EQ("", ReadBytes(place.file("name")));
}

TEST(NamedEventHostile, RemovedLockFileSplitsNobodyWhoComesLater) {
  EventPlace place;
  auto old = Open("name", kManual, kSet);
  std::filesystem::remove(place.file("name"));
  Keeper second([] { return Open("name"); });
  ASSERT_TRUE(second.good());
  Child third([] {
    auto event = Open("name");
    if (event->checkOnly()) return 1;
    event->set();
    return 0;
  });
  EXPECT_EQ(0, third.wait());
  EXPECT_TRUE(second.finish());
}

TEST(NamedEventHostile, ReplacedStateFileIsLeftToItsOwners) {
  EventPlace place;
  auto old = Open("old");
  int id = place.setOf(1);
  std::filesystem::remove(place.file("sem_1"));
  Keeper fresh([] { return Open("fresh"); });
  ASSERT_TRUE(fresh.good());
  EXPECT_EQ((Slot{1, 0}), place.slotOf("fresh"));
  old.reset();
  EXPECT_EQ(-1, EventPlace::ValueOf(id, 0));
  EXPECT_EQ((Names{"fresh", "sem_1"}), place.files());
  EXPECT_TRUE(fresh.finish());
  EXPECT_EQ(Names(), place.files());
}

// ---- the descriptors

TEST(NamedEventHostile, DescriptorsThatTheHostHasTakenAreTheHosts) {
  EventPlace place;
  TempDir dir;
  auto event = Open("name");
  ReusedDescriptor lock(dir / "lock", DescriptorOf(place.file("name")));
  ReusedDescriptor state(dir / "state", DescriptorOf(place.file("sem_1")));
  ASSERT_TRUE(lock.lock() && state.lock());
  event->set();
  EXPECT_TRUE(event->check());
  Child child([] { return 0; });
  EXPECT_EQ(0, child.wait());
  event.reset();
  for (const ReusedDescriptor* file : {&lock, &state}) {
    EXPECT_TRUE(file->isOpen() && file->unchanged());
    EXPECT_FALSE(file->free());
  }
  EXPECT_EQ((Names{"name", "sem_1"}), place.files());  // as a killed process leaves it
  Open("name");
  EXPECT_EQ(Names(), place.files());
}

// ---- the mutex of the state files

TEST(NamedEventHostile, CloseWithoutTheMutexThrowsNothingAndLeavesTheFiles) {
  EventPlace place;
  std::string mutexes = std::filesystem::path(place.file("")).parent_path().parent_path() / "mutex";
  Child child([&] {
    Open("warm up");
    int descriptors = OpenDescriptors();
    auto event = Open("name");
    std::filesystem::remove_all(mutexes);
    WriteBytes(mutexes, "in the way");
    if (PosixErrorOf([] { Open("other"); }) != ENOTDIR) return 1;
    event.reset();
    if (OpenDescriptors() != descriptors) return 2;
    std::filesystem::remove(mutexes);
    return 0;
  });
  EXPECT_EQ(0, child.wait());
  EXPECT_EQ((Names{"name", "sem_1"}), place.files());
  Open("name");
  EXPECT_EQ(Names(), place.files());
}

}  // namespace
}  // namespace zt::fnd::osdep
