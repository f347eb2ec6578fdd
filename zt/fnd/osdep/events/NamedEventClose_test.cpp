// Closing, in order and by death: what goes, what stays, and who gets what stayed.
#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/EventKinds.h"
#include "tests/support/EventPlace.h"
#include "tests/support/InChild.h"
#include "tests/support/NamedEventFiles.h"
#include "tests/support/ScopedLocale.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/NamedEvent.h"

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
using vlt::test::ReadBytes;
using vlt::test::RecordOf;
using vlt::test::WriteBytes;
using Names = std::vector<std::string>;
using Slot = EventPlace::Slot;

constexpr auto Open = [](const std::string& name, bool manual = kManual, bool initial = kClear) {
  return vlt::test::OpenEvent(name, manual, initial);
};

// ---- the host's locale

// The host may change its locale at any time; files and entries are found under any.
TEST_IN_CHILD(NamedEventClose, ClosesUnderAnotherLocaleThanItWasOpenedUnder) {
  EventPlace place;
  vlt::test::ScopedLocale plain(LC_ALL, "C");
  auto first = std::make_unique<NamedEvent>(L"\xCA", kManual, kClear);
  auto second = std::make_unique<NamedEvent>(L"\xE9", kManual, kClear);
  vlt::test::ScopedLocale utf8(LC_CTYPE, "C.UTF-8");
  second.reset();
  first.reset();
  ASSERT_EQ(Names(), place.files());
  NamedEvent again(L"\xE9", kAutomatic, kSet);
  EXPECT_TRUE(Exists(place.file("\xC3\xA9")));
  EXPECT_TRUE(again.check());
  EXPECT_FALSE(again.check());
}

// ---- processes that die

TEST(NamedEventClose, KilledProcessLeavesItsSlotToTheNextOpener) {
  EventPlace place;
  auto other = Open("other");
  for (bool manual : {kManual, kAutomatic}) {
    Keeper killed([&] { return Open("name", manual, kClear); });
    ASSERT_TRUE(killed.good());
    Slot slot = place.slotOf("name");
    killed.kill();
    EXPECT_TRUE(Exists(place.file("name")));
    auto another = Open("another");  // takes another slot
    for (bool initial : {kSet, kClear}) {
      Keeper next([&] { return Open("name", manual, initial); });
      ASSERT_TRUE(next.good());
      EXPECT_EQ(slot, place.slotOf("name"));
      EXPECT_EQ(HeaderOf(place.file("sem_1")).freeCount, 125u);
      Child asks([&] { return Open("name", manual, !initial)->checkOnly() == initial ? 0 : 1; });
      EXPECT_EQ(asks.wait(), 0);
      next.kill();
    }
    Open("name", manual);  // closing takes everything away again
    EXPECT_FALSE(Exists(place.file("name")));
    EXPECT_EQ(HeaderOf(place.file("sem_1")).freeCount, 126u);
  }
}

TEST(NamedEventClose, SetWhoseUsersAllDiedIsMadeAnew) {
  EventPlace place;
  int id = -1;
  {
    Keeper killed([] {
      std::vector<std::unique_ptr<NamedEvent>> events;
      for (int i = 0; i < 5; ++i) events.push_back(Open("e" + std::to_string(i)));
      return events;
    });
    ASSERT_TRUE(killed.good());
    id = place.setOf(1);
    killed.kill();
  }
  EXPECT_EQ((Slot{1, 4}), place.slotOf("e4"));
  auto event = Open("e4", kManual, kSet);
  EXPECT_EQ((Slot{1, 0}), place.slotOf("e4"));
  EXPECT_EQ(HeaderOf(place.file("sem_1")).freeCount, 127u);
  EXPECT_EQ(id, place.setOf(1));  // the kernel's set is taken over
  EXPECT_TRUE(event->checkOnly());
  // A name whose file leads to a slot that is another's by now gets one of its own.
  auto e0 = Open("e0");
  EXPECT_EQ((Slot{1, 1}), place.slotOf("e0"));
  event.reset();
  e0.reset();
  EXPECT_EQ((Names{"e1", "e2", "e3"}), place.files());
  for (int i = 1; i < 4; ++i) Open("e" + std::to_string(i));
  EXPECT_EQ(Names(), place.files());
}

TEST(NamedEventClose, SlotOfADeadEventOfTheOtherKindIsNotTaken) {
  EventPlace place;
  auto other = Open("other");
  Keeper killed([] { return Open("name", kManual); });
  ASSERT_TRUE(killed.good());
  killed.kill();
  auto event = Open("name", kAutomatic, kSet);
  EXPECT_EQ((Slot{1, 2}), place.slotOf("name"));
  EXPECT_TRUE(event->check());
  EXPECT_TRUE(RecordOf(place.file("sem_1"), 1).inUse);
}

TEST(NamedEventClose, HolderThatDiesBetweenTwoOthersIsNotMissed) {
  EventPlace place;
  Keeper first([] { return Open("name"); });
  Keeper second([] { return Open("name"); });
  ASSERT_TRUE(first.good() && second.good());
  first.kill();
  auto third = Open("name");
  EXPECT_EQ((Slot{1, 0}), place.slotOf("name"));
  EXPECT_TRUE(second.finish());
  third.reset();
  EXPECT_EQ(Names(), place.files());
}

// ---- closing in a changed world

TEST(NamedEventClose, CloseLeavesALockFileThatIsNotItsOwn) {
  EventPlace place;
  auto event = Open("name"), other = Open("other");
  std::filesystem::remove(place.file("name"));
  Keeper stranger([] { return Open("name"); });
  ASSERT_TRUE(stranger.good());
  EXPECT_EQ((Slot{1, 2}), place.slotOf("name"));
  event.reset();
  EXPECT_TRUE(Exists(place.file("name")));
  EXPECT_EQ((Slot{1, 2}), place.slotOf("name"));
  EXPECT_FALSE(RecordOf(place.file("sem_1"), 0).inUse);  // its own slot went back
  EXPECT_TRUE(stranger.finish());
  EXPECT_FALSE(Exists(place.file("name")));
}

TEST(NamedEventClose, CloseGivesBackOnlyWhatIsItsOwn) {
  EventPlace place;
  auto event = Open("name"), other = Open("other");
  std::string state = ReadBytes(place.file("sem_1"));
  state[18 + 2] = static_cast<char>(state[18 + 2] ^ 0x55);  // another key
  WriteBytes(place.file("sem_1"), state);
  event.reset();
  EXPECT_EQ(state, ReadBytes(place.file("sem_1")));
  EXPECT_FALSE(Exists(place.file("name")));
}

TEST(NamedEventClose, SetThatAnotherUserRemovesLastStaysForTheNext) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs two users, so the superuser";
  EventPlace place;
  auto event = Open("name");
  int id = place.setOf(1);
  Keeper other([] {
    if (setgid(65534) != 0 || setuid(65534) != 0) throw std::runtime_error("setuid");
    return Open("name");
  });
  ASSERT_TRUE(other.good());
  event.reset();
  EXPECT_TRUE(other.finish());  // may not remove the set
  EXPECT_EQ(Names{"sem_1"}, place.files());
  EXPECT_FALSE(HeaderOf(place.file("sem_1")).ready);
  EXPECT_EQ(id, place.setOf(1));
  event = Open("name", kManual, kSet);
  EXPECT_TRUE(HeaderOf(place.file("sem_1")).ready);
  EXPECT_EQ(id, place.setOf(1));
  EXPECT_EQ((Slot{1, 0}), place.slotOf("name"));
  EXPECT_TRUE(event->checkOnly());
  event.reset();
  EXPECT_EQ(Names(), place.files());
}

TEST(NamedEventClose, EventsOfAnotherUserAreJoined) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs two users, so the superuser";
  EventPlace place;
  Keeper other([] {
    umask(0077);
    if (setgid(65534) != 0 || setuid(65534) != 0) throw std::runtime_error("setuid");
    return Open("name", kAutomatic, kSet);
  });
  ASSERT_TRUE(other.good());
  EXPECT_TRUE(Open("name", kAutomatic)->check());
  Child third([] {
    if (setgid(65533) != 0 || setuid(65533) != 0) return 1;
    Open("name", kAutomatic)->set();
    return 0;
  });
  EXPECT_EQ(third.wait(), 0);
  EXPECT_TRUE(Open("name", kAutomatic)->check());
  EXPECT_TRUE(other.finish());
  EXPECT_EQ(Names(), place.files());
}

TEST(NamedEventClose, StaticEventsCloseWhenTheProgramEnds) {
  EventPlace place;
  Child child([]() -> int {
    static NamedEvent event(L"name", kManual, kSet);
    exit(event.checkOnly() ? 0 : 1);
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(Names(), place.files());
}

void OpenAfterTheStaticsWent() {
  if (!Open("late", kManual, kSet)->checkOnly()) _exit(9);
}

TEST(NamedEventClose, EventsWorkInExitFunctionsThatRunAfterTheirOwn) {
  EventPlace place;
  Child child([]() -> int {
    atexit(OpenAfterTheStaticsWent);  // before the first use, so it runs after
    Open("name");
    exit(0);
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(Names(), place.files());
}

TEST(NamedEventClose, ObjectThatOutlivesTheStaticsCloses) {
  EventPlace place;
  Child child([]() -> int {
    static std::unique_ptr<NamedEvent> late;
    atexit([] { late.reset(); });
    late = Open("name");
    exit(0);
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(Names(), place.files());
}

TEST(NamedEventClose, EndWithoutClosingLeavesEverythingForTheNext) {
  EventPlace place;
  Child child([] {
    new NamedEvent(L"name", kManual, kSet);
    return 0;  // _exit
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ((Names{"name", "sem_1"}), place.files());
  Open("name");
  EXPECT_EQ(Names(), place.files());
}

}  // namespace
}  // namespace zt::fnd::osdep
