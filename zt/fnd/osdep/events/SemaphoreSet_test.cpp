#include "zt/fnd/osdep/events/SemaphoreSet.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <string>
#include <vector>

#include "tests/support/EventPlace.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/ByteOrder.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/events/NamedEventGlobalStatics.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::EventPlace;
using vlt::test::OpenDescriptors;
using vlt::test::ReadBytes;
using vlt::test::WriteBytes;
using Names = std::vector<std::string>;
using Room = SemaphoreSet::Room;

struct Set {
  EventPlace place;
  RefPtr<NamedEventGlobalStatics> statics = NamedEventGlobalStatics::Get();
  Hold<CriticalSection> hold{statics->section};
  RefPtr<SemaphoreSet> set = statics->getOrCreateSemaphoreSet(1);
  std::string path = place.file("sem_1");

  void patch(size_t at, uint32_t value) const {
    std::string bytes = ReadBytes(path);
    ASSERT_LE(at + sizeof value, bytes.size());
    little_endian::Put(reinterpret_cast<unsigned char*>(bytes.data()) + at, value);
    FILE* file = fopen(path.c_str(), "r+b");
    ASSERT_NE(file, nullptr);
    EXPECT_EQ(bytes.size(), fwrite(bytes.data(), 1, bytes.size(), file));
    fclose(file);
  }
};

TEST(SemaphoreSet, IsBuiltReadyAndAllFree) {
  Set s;
  ASSERT_TRUE(s.set->usable());
  bool ready = false;
  unsigned count = 0, freeCount = 0, firstFree = 9;
  EXPECT_TRUE(s.set->readHeader(ready, count, freeCount, firstFree));
  EXPECT_TRUE(ready);
  EXPECT_EQ(count, 128u);
  EXPECT_EQ(freeCount, 128u);
  EXPECT_EQ(firstFree, 0u);
  EXPECT_EQ(s.set->id(), s.place.setOf(1));
  EXPECT_EQ(s.set->number(), 1u);
  EXPECT_EQ(SemaphoreSet::State::Usable, s.set->state());
}

TEST(SemaphoreSet, ReadHeaderDoesNotAskForReady) {
  Set s;
  s.patch(4, 0);  // reserved, ready, and the low half of the count
  s.patch(6, 128);
  bool ready = true;
  unsigned count, freeCount, firstFree;
  EXPECT_TRUE(s.set->readHeader(ready, count, freeCount, firstFree));
  EXPECT_FALSE(ready);
  EXPECT_EQ(count, 128u);
}

TEST(SemaphoreSet, BadHeaderClearsAllOutputs) {
  Set s;
  s.patch(0, 0x15E35E30);
  bool ready = true;
  unsigned count = 7, freeCount = 7, firstFree = 7;
  EXPECT_FALSE(s.set->readHeader(ready, count, freeCount, firstFree));
  EXPECT_FALSE(ready);
  EXPECT_EQ(count + freeCount + firstFree, 0u);
  ASSERT_EQ(truncate(s.path.c_str(), 17), 0);
  ready = true;
  count = freeCount = firstFree = 7;
  EXPECT_FALSE(s.set->readHeader(ready, count, freeCount, firstFree));
  EXPECT_FALSE(ready);
  EXPECT_EQ(count + freeCount + firstFree, 0u);
}

TEST(SemaphoreSet, UpdateChangesCountAndFirstFreeAlone) {
  Set s;
  std::string before = ReadBytes(s.path);
  unsigned old = 99;
  EXPECT_TRUE(s.set->updateFreeRecords(-1, 0x01020304, old));
  EXPECT_EQ(old, 0u);
  std::string after = ReadBytes(s.path);
  EXPECT_EQ(before.substr(0, 10), after.substr(0, 10));
  EXPECT_EQ(after.substr(10, 8), std::string("\x7F\0\0\0\4\3\2\1", 8));
  EXPECT_EQ(before.substr(18), after.substr(18));
  EXPECT_TRUE(s.set->updateFreeRecords(+1, kNoSlot, old));
  EXPECT_EQ(old, 0x01020304u);
  EXPECT_EQ(ReadBytes(s.path).substr(10, 8), std::string("\x80\0\0\0\xFF\xFF\xFF\xFF", 8));
}

TEST(SemaphoreSet, UpdateOfAShortFileFails) {
  Set s;
  unsigned old;
  ASSERT_EQ(truncate(s.path.c_str(), 17), 0);
  EXPECT_FALSE(s.set->updateFreeRecords(-1, 1, old));
  EXPECT_EQ(ReadBytes(s.path).size(), 17u);
}

TEST(SemaphoreSet, TakeAndGiveBackAreEachOthersReverse) {
  Set s;
  const std::string before = ReadBytes(s.path);
  for (int round = 0; round < 2; ++round) {
    for (unsigned expected = 0; expected < 128; ++expected) {
      unsigned slot = 999;
      ASSERT_EQ(Room::Some, s.set->firstFree(slot));
      ASSERT_EQ(expected, slot);
      ASSERT_TRUE(s.set->take(slot, true, 0x01000000 + static_cast<int>(slot)));
    }
    unsigned slot;
    EXPECT_EQ(Room::None, s.set->firstFree(slot));
    for (unsigned i = 128; i-- > 0;) s.set->giveBack(i, 0x01000000 + static_cast<int>(i));
    EXPECT_EQ(before, ReadBytes(s.path));
  }
}

TEST(SemaphoreSet, GiveBackOfAnothersSlotDoesNothing) {
  Set s;
  ASSERT_TRUE(s.set->take(0, false, 42));
  std::string before = ReadBytes(s.path);
  s.set->giveBack(0, 43);
  s.set->giveBack(1, 42);
  s.set->giveBack(128, 42);
  s.set->giveBack(0xFFFFFFFFu, 42);
  EXPECT_EQ(before, ReadBytes(s.path));
}

TEST(SemaphoreSet, SlotsOutsideTheFileAreNotRead) {
  Set s;
  SlotRecord record;
  EXPECT_TRUE(s.set->readSlot(127, record));
  EXPECT_FALSE(s.set->readSlot(128, record));
  EXPECT_FALSE(s.set->readSlot(0xFFFFFFFFu, record));
  s.patch(6, 0xFFFFFFFFu);
  EXPECT_FALSE(s.set->readSlot(128, record));
  EXPECT_FALSE(s.set->readSlot(0xFFFFFFF0u, record));
  s.patch(6, 2);
  EXPECT_TRUE(s.set->readSlot(1, record));
  EXPECT_FALSE(s.set->readSlot(2, record));
}

TEST(SemaphoreSet, OneObjectANumberInAProcess) {
  Set s;
  RefPtr<SemaphoreSet> again = s.statics->getOrCreateSemaphoreSet(1);
  EXPECT_EQ(s.set.get(), again.get());
  RefPtr<SemaphoreSet> other = s.statics->getOrCreateSemaphoreSet(2);
  EXPECT_NE(s.set.get(), other.get());
  EXPECT_NE(s.set->id(), other->id());
  other = nullptr;
  EXPECT_EQ(Names{"sem_1"}, s.place.files());
  again = nullptr;
  EXPECT_EQ(Names{"sem_1"}, s.place.files());
  s.set = nullptr;
  EXPECT_EQ(Names(), s.place.files());
}

TEST(SemaphoreSet, UnusableSetStaysInTheMapWhileItIsHeld) {
  EventPlace place;
  RefPtr<NamedEventGlobalStatics> statics = NamedEventGlobalStatics::Get();
  Hold hold(statics->section);
  statics->getOrCreateSemaphoreSet(1);  // makes the directory
  ASSERT_EQ(mkdir(place.file("sem_1").c_str(), 0777), 0);
  int descriptors = OpenDescriptors();
  RefPtr<SemaphoreSet> set = statics->getOrCreateSemaphoreSet(1);
  EXPECT_FALSE(set->usable());
  EXPECT_EQ(SemaphoreSet::State::Closed, set->state());
  EXPECT_EQ(set->id(), -1);
  EXPECT_EQ(descriptors, OpenDescriptors());
  ASSERT_EQ(rmdir(place.file("sem_1").c_str()), 0);
  EXPECT_EQ(set.get(), statics->getOrCreateSemaphoreSet(1).get());
  set = nullptr;
  EXPECT_TRUE(statics->getOrCreateSemaphoreSet(1)->usable());
}

}  // namespace
}  // namespace zt::fnd::osdep
