// Opening: which slot an event gets, and what is in the files.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/ipc.h>
#include <sys/sem.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cstring>
#include <filesystem>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "tests/support/CaughtSleeps.h"
#include "tests/support/Child.h"
#include "tests/support/EventKinds.h"
#include "tests/support/EventPlace.h"
#include "tests/support/NamedEventFiles.h"
#include "tests/support/PosixErrorOf.h"
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
using vlt::test::EventPlace;
using vlt::test::Exists;
using vlt::test::HeaderOf;
using vlt::test::kAutomatic;
using vlt::test::kClear;
using vlt::test::Keeper;
using vlt::test::kManual;
using vlt::test::kSet;
using vlt::test::ModeOf;
using vlt::test::OpenDescriptors;
using vlt::test::PosixErrorOf;
using vlt::test::ReadBytes;
using vlt::test::RecordOf;
using vlt::test::Wide;
using vlt::test::WriteBytes;
using Names = std::vector<std::string>;

using Slot = EventPlace::Slot;

constexpr auto Open = [](const std::string& name, bool manual = kManual, bool initial = kClear) {
  return vlt::test::OpenEvent(name, manual, initial);
};

// The errno that opening the name fails with in another process; 0 if it does not. It does not sleep.
int ErrorElsewhere(const std::string& name, bool manual) {
  return Child([&] {
           EXPECT_TRUE(vlt::test::CatchSleeps());
           int error = PosixErrorOf([&] { Open(name, manual); });
           EXPECT_TRUE(vlt::test::CaughtSleeps().empty());
           return error == -1 ? 0 : error;
         })
      .wait();
}

// ---- one process

TEST(NamedEventOpen, FirstEventTakesSlotZeroOfSetOne) {
  EventPlace place;
  auto event = Open("name");
  EXPECT_EQ((Names{"name", "sem_1"}), place.files());
  EXPECT_EQ(ReadBytes(place.file("name")), std::string("\0\1\0\0\0\0\0\0\0", 9));
  std::string state = ReadBytes(place.file("sem_1"));
  ASSERT_EQ(state.size(), 1298u);
  EXPECT_EQ(state.substr(0, 18),
            std::string("\x31\x5E\xE3\x15\0\1\x80\0\0\0\x7F\0\0\0\1\0\0\0", 18));
  unsigned char record[10] = {1, 1};
  little_endian::Put(&record[2], int64_t{ftok(place.file("name").c_str(), 1)});
  EXPECT_EQ(std::string(std::begin(record), std::end(record)), state.substr(18, 10));
  EXPECT_EQ(state.substr(28, 10), std::string("\0\0\2\0\0\0\0\0\0\0", 10));
  EXPECT_EQ(state.substr(1288), std::string("\0\0\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF", 10));
}

TEST(NamedEventOpen, KernelSetHas128SemaphoresForEverybody) {
  EventPlace place;
  auto event = Open("name");
  semid_ds info = {};
  int id = EventPlace::SetOfKey(ftok(place.file("sem_1").c_str(), 1));
  ASSERT_EQ(semctl(id, 0, IPC_STAT, &info), 0);
  EXPECT_EQ(info.sem_nsems, 128u);
  EXPECT_EQ(info.sem_perm.mode & 0777u, 0777u);
}

TEST(NamedEventOpen, FilesAreOpenToAllWhateverTheUmask) {
  EventPlace place;
  Keeper keeper([] {
    umask(0077);
    return Open("name");
  });
  ASSERT_TRUE(keeper.good());
  EXPECT_EQ(ModeOf(place.file("name")), 0666);
  EXPECT_EQ(ModeOf(place.file("sem_1")), 0666);
  EXPECT_EQ(ModeOf(std::filesystem::path(place.file("name")).parent_path()), 0777);
  EXPECT_TRUE(keeper.finish());
}

TEST(NamedEventOpen, LastCloseRemovesFilesAndSet) {
  EventPlace place;
  int before = EventPlace::CountSets();
  Open("warm up");
  int descriptors = OpenDescriptors();
  auto event = Open("name");
  int id = place.setOf(1);
  ASSERT_GE(id, 0);
  event.reset();
  EXPECT_EQ(Names(), place.files());
  EXPECT_EQ(EventPlace::ValueOf(id, 0), -1);
  EXPECT_EQ(before, EventPlace::CountSets());
  EXPECT_EQ(descriptors, OpenDescriptors());
}

TEST(NamedEventOpen, ClosedSlotGoesToTheFrontOfTheFreeList) {
  EventPlace place;
  auto a = Open("a"), b = Open("b", kAutomatic), c = Open("c");
  EXPECT_EQ((Slot{1, 1}), place.slotOf("b"));
  b.reset();
  EXPECT_FALSE(Exists(place.file("b")));
  SetHeader header = HeaderOf(place.file("sem_1"));
  EXPECT_EQ(header.freeCount, 126u);
  EXPECT_EQ(header.firstFree, 1u);
  SlotRecord record = RecordOf(place.file("sem_1"), 1);
  EXPECT_FALSE(record.inUse);
  EXPECT_FALSE(record.manualReset);
  EXPECT_EQ(record.keyOrNext, 3);
  a.reset();
  EXPECT_EQ(HeaderOf(place.file("sem_1")).firstFree, 0u);
  // Last in, first out.
  auto d = Open("d"), e = Open("e"), f = Open("f");
  EXPECT_EQ((Slot{1, 0}), place.slotOf("d"));
  EXPECT_EQ((Slot{1, 1}), place.slotOf("e"));
  EXPECT_EQ((Slot{1, 3}), place.slotOf("f"));
}

TEST(NamedEventOpen, The129thEventGoesToSetTwo) {
  EventPlace place;
  std::vector<std::unique_ptr<NamedEvent>> events;
  for (int i = 0; i < 128; ++i) events.push_back(Open("e" + std::to_string(i)));
  EXPECT_FALSE(Exists(place.file("sem_2")));
  SetHeader full = HeaderOf(place.file("sem_1"));
  EXPECT_EQ(full.freeCount, 0u);
  EXPECT_EQ(full.firstFree, kNoSlot);
  auto last = Open("e128");
  EXPECT_EQ((Slot{2, 0}), place.slotOf("e128"));
  EXPECT_NE(place.setOf(1), place.setOf(2));
  // A slot given back to a full set ends its list with eight bytes of ones.
  events[7].reset();
  EXPECT_EQ(ReadBytes(place.file("sem_1")).substr(18 + 70, 10),
            std::string("\0\0\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF", 10));
  // The lowest set with space first.
  auto again = Open("again");
  EXPECT_EQ((Slot{1, 7}), place.slotOf("again"));
  last.reset();
  EXPECT_FALSE(Exists(place.file("sem_2")));
  events.clear();
  again.reset();
  EXPECT_EQ(Names(), place.files());
}

TEST(NamedEventOpen, EventsOfManySetsAreIndependent) {
  EventPlace place;
  std::vector<std::unique_ptr<NamedEvent>> events;
  for (int i = 0; i < 300; ++i) events.push_back(Open("e" + std::to_string(i), kAutomatic));
  EXPECT_EQ((Slot{3, 43}), place.slotOf("e299"));
  for (size_t i = 0; i < events.size(); i += 7) events[i]->set();
  for (size_t i = 0; i < events.size(); ++i) EXPECT_EQ(i % 7 == 0, events[i]->check()) << i;
  events.clear();
  EXPECT_EQ(Names(), place.files());
}

TEST(NamedEventOpen, ObjectsOfOneNameShareTheEvent) {
  EventPlace place;
  auto first = Open("name", kAutomatic);
  int descriptors = OpenDescriptors();
  auto second = Open("name", kAutomatic, kSet);
  EXPECT_EQ(descriptors, OpenDescriptors());
  EXPECT_FALSE(second->checkOnly());  // the initial state is ignored
  first->set();
  EXPECT_TRUE(second->check());
  first.reset();
  EXPECT_TRUE(Exists(place.file("name")));
  second->set();
  EXPECT_TRUE(second->check());
}

TEST(NamedEventOpen, OtherKindInOneProcessIsEINVAL) {
  EventPlace place;
  auto event = Open("name", kManual, kSet);
  std::string before = ReadBytes(place.file("sem_1"));
  EXPECT_EQ(PosixErrorOf([] { Open("name", kAutomatic); }), EINVAL);
  EXPECT_EQ(PosixErrorOf([] { Open("NAME", kAutomatic); }), EINVAL);
  EXPECT_TRUE(event->checkOnly());
  EXPECT_EQ(before, ReadBytes(place.file("sem_1")));
  event.reset();
  EXPECT_EQ(PosixErrorOf([] { Open("name", kAutomatic); }), -1);
}

TEST(NamedEventOpen, NamesFoldInAProcessAndNotInTheFileSystem) {
  EventPlace place;
  auto lower = Open("name"), upper = Open("NAME");
  EXPECT_EQ((Names{"name", "sem_1"}), place.files());
  lower->set();
  EXPECT_TRUE(upper->checkOnly());
  Keeper other([] { return Open("NAME", kAutomatic, kClear); });
  ASSERT_TRUE(other.good());
  EXPECT_EQ((Names{"NAME", "name", "sem_1"}), place.files());
  EXPECT_EQ((Slot{1, 1}), place.slotOf("NAME"));
  EXPECT_TRUE(other.finish());
}

TEST(NamedEventOpen, NamesOfTheWrongShape) {
  EventPlace place;
  auto other = Open("other");
  int descriptors = OpenDescriptors();
  std::string before = ReadBytes(place.file("sem_1"));
  EXPECT_EQ(PosixErrorOf([] { Open(""); }), EISDIR);
  EXPECT_EQ(PosixErrorOf([] { Open("no/such"); }), ENOENT);
  EXPECT_EQ(PosixErrorOf([] { Open(std::string(256, 'n')); }), ENAMETOOLONG);
  EXPECT_EQ(PosixErrorOf([] { Open(std::string(255, 'n')); }), -1);
  EXPECT_EQ(descriptors, OpenDescriptors());
  EXPECT_EQ(before, ReadBytes(place.file("sem_1")));
  EXPECT_EQ((Names{"other", "sem_1"}), place.files());
}

// ---- several processes

TEST(NamedEventOpen, TwoProcessesOpenANewNameAtOnceAndGetOneSlot) {
  EventPlace place;
  for (int round = 0; round < 40; ++round) {
    vlt::test::Signal go, opened[2], end;
    std::vector<Child> children;
    for (int i = 0; i < 2; ++i) {
      children.emplace_back([&, i] {
        go.await();
        auto event = Open("name", kAutomatic, kClear);
        opened[i].notify();
        end.await();
        // What the first one sets, the second one gets.
        if (i == 0) event->set();
        return i == 0 || event->wait(20000) ? 0 : 1;
      });
    }
    go.notify();
    go.notify();
    ASSERT_TRUE(opened[0].await() && opened[1].await());
    EXPECT_EQ((Names{"name", "sem_1"}), place.files());
    EXPECT_EQ((Slot{1, 0}), place.slotOf("name"));
    EXPECT_EQ(HeaderOf(place.file("sem_1")).freeCount, 127u);
    end.notify();
    end.notify();
    for (Child& child : children) EXPECT_EQ(child.wait(), 0);
    EXPECT_EQ(Names(), place.files());
  }
}

TEST(NamedEventOpen, OpenerWaitsWhileAnotherSetsTheFileUp) {
  EventPlace place;
  auto other = Open("other");
  // The exclusive phase of another opener, played with a descriptor of the test.
  ScopedFd busy(::open(place.file("name").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666));
  ASSERT_EQ(Flock(busy.get(), LOCK_EX), 0);
  vlt::test::Signal begun;
  Child opener([&] {
    begun.notify();
    return Open("name", kAutomatic, kSet)->check() ? 0 : 1;
  });
  ASSERT_TRUE(begun.await());
  EXPECT_TRUE(vlt::test::Eventually([&] { return vlt::test::Sleeps(opener.pid()); }));
  EXPECT_TRUE(opener.running());
  EXPECT_EQ(ReadBytes(place.file("name")), "");
  Flock(busy.get(), LOCK_UN);  // the opener has a copy of the descriptor
  EXPECT_EQ(opener.wait(), 0);
}

TEST(NamedEventOpen, OtherKindInAnotherProcessIsENOLCKAndChangesNothing) {
  EventPlace place;
  for (bool manual : {kManual, kAutomatic}) {
    auto event = Open("name", manual, kSet);
    std::string state = ReadBytes(place.file("sem_1")), lock = ReadBytes(place.file("name"));
    EXPECT_EQ(ErrorElsewhere("name", !manual), ENOLCK);
    EXPECT_EQ(state, ReadBytes(place.file("sem_1")));
    EXPECT_EQ(lock, ReadBytes(place.file("name")));
    EXPECT_TRUE(event->checkOnly());
    EXPECT_EQ(ErrorElsewhere("name", manual), 0);
  }
}

TEST(NamedEventOpen, JoiningIgnoresTheInitialState) {
  EventPlace place;
  for (bool manual : {kManual, kAutomatic}) {
    for (bool initial : {kSet, kClear}) {
      auto event = Open("name", manual, initial);
      Child joiner([&] { return Open("name", manual, !initial)->checkOnly() == initial ? 0 : 1; });
      EXPECT_EQ(joiner.wait(), 0);
      EXPECT_EQ(initial, event->checkOnly());
    }
  }
}

TEST(NamedEventOpen, EventLivesUntilTheLastProcessCloses) {
  EventPlace place;
  auto mine = Open("name");
  Keeper other([] { return Open("name"); });
  ASSERT_TRUE(other.good());
  mine->set();
  mine.reset();
  EXPECT_EQ((Names{"name", "sem_1"}), place.files());
  EXPECT_EQ(HeaderOf(place.file("sem_1")).freeCount, 127u);
  mine = Open("name", kManual, kClear);
  EXPECT_TRUE(mine->checkOnly());  // the state has stayed, too
  mine.reset();
  EXPECT_TRUE(other.finish());
  EXPECT_EQ(Names(), place.files());
}

TEST(NamedEventOpen, SetLivesUntilTheLastOfItsEventsGoes) {
  EventPlace place;
  Keeper other([] { return Open("other"); });
  ASSERT_TRUE(other.good());
  int id = place.setOf(1);
  auto mine = Open("mine");
  EXPECT_EQ((Slot{1, 1}), place.slotOf("mine"));
  EXPECT_TRUE(other.finish());
  EXPECT_EQ((Names{"mine", "sem_1"}), place.files());
  EXPECT_EQ(id, place.setOf(1));
  mine->set();
  mine.reset();
  EXPECT_EQ(Names(), place.files());
  EXPECT_EQ(EventPlace::ValueOf(id, 0), -1);
}

}  // namespace
}  // namespace zt::fnd::osdep
