#include "zt/fnd/osdep/events/EventFile.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/ipc.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <filesystem>
#include <thread>

#include "tests/support/CaughtSleeps.h"
#include "tests/support/Child.h"
#include "tests/support/EventPlace.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/InChild.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/TempDir.h"
#include "tests/support/ThreadState.h"
#include "zt/posix/Files.h"

using zt::posix::Flock;
using zt::posix::ScopedFd;

namespace zt::fnd::osdep {
namespace {

using vlt::test::Child;
using vlt::test::EventPlace;
using vlt::test::Eventually;
using vlt::test::Exists;
using vlt::test::Keeper;
using vlt::test::ModeOf;
using vlt::test::OpenDescriptors;
using vlt::test::PosixErrorOf;
using vlt::test::ReadBytes;
using vlt::test::Sleeps;
using vlt::test::WriteBytes;

ScopedFd OpenRaw(const std::string& path) {
  return ScopedFd(::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666));
}

struct Raw {
  vlt::test::TempDir dir;
  std::string path = dir / "file";
  ScopedFd open() const { return OpenRaw(path); }
};

TEST(EventFileLockAccess, AloneIsTrueAndBesideSharersFalse) {
  Raw raw;
  ScopedFd first = raw.open(), second = raw.open(), third = raw.open();
  EXPECT_TRUE(GetLockAccessToFile(first.get()));
  ASSERT_EQ(0, Flock(first.get(), LOCK_SH));
  EXPECT_FALSE(GetLockAccessToFile(second.get()));
  EXPECT_FALSE(GetLockAccessToFile(third.get()));
  first.reset();
  second.reset();
  EXPECT_NE(0, Flock(raw.open().get(), LOCK_EX | LOCK_NB));  // the third still shares
}

TEST(EventFileLockAccess, WaitsForTheExclusivePhaseOfAnother) {
  Raw raw;
  ScopedFd first = raw.open(), second = raw.open();
  ASSERT_TRUE(GetLockAccessToFile(first.get()));
  std::atomic<bool> waited{false};
  std::thread finisher([&, opener = gettid()] {
    EXPECT_TRUE(Eventually([&] { return Sleeps(opener); }));  // in the middle of its rounds
    waited = true;
    Flock(first.get(), LOCK_SH);
  });
  EXPECT_FALSE(GetLockAccessToFile(second.get()));
  EXPECT_TRUE(waited);
  finisher.join();
}

TEST_IN_CHILD(EventFileLockAccess, GivesUpAfterFiveHundredRoundsOfAMillisecond) {
  Raw raw;
  ScopedFd first = raw.open(), second = raw.open();
  ASSERT_EQ(0, Flock(first.get(), LOCK_EX));
  ASSERT_TRUE(vlt::test::CatchSleeps());
  EXPECT_EQ(EWOULDBLOCK, PosixErrorOf([&] { GetLockAccessToFile(second.get()); }));
  EXPECT_EQ(std::vector<long long>(500, 1), vlt::test::CaughtSleeps());
  first.reset();
  EXPECT_EQ(0, Flock(raw.open().get(), LOCK_EX | LOCK_NB));
}

TEST(EventFileLockAccess, RefusedLocksEndInTheirErrno) {
  Raw raw;
  Child child([&] {
    ScopedFd fd = raw.open();
    if (!vlt::test::FailSystemCall(SYS_flock, ENOLCK)) return 1;
    return PosixErrorOf([&] { GetLockAccessToFile(fd.get()); }) == ENOLCK ? 0 : 2;
  });
  EXPECT_EQ(0, child.wait());
}

TEST(EventFile, IsMadeOpenToAllAndKnowsWhatItIs) {
  EventPlace place;
  EventFile file = EventFile::Open(L"name");
  EXPECT_TRUE(file.valid());
  EXPECT_TRUE(file.exclusive());
  EXPECT_EQ(ftok(place.file("name").c_str(), 1), file.key());
  EXPECT_EQ(0666, ModeOf(place.file("name")));
  EXPECT_EQ(0777, ModeOf(std::filesystem::path(place.file("name")).parent_path()));
}

TEST(EventFile, SecondOpenerSharesOnceTheFirstDoes) {
  EventPlace place;
  EventFile first = EventFile::Open(L"name");
  EXPECT_TRUE(first.share());
  EXPECT_FALSE(first.exclusive());
  EXPECT_TRUE(first.write("abc", 3, 0));
  EventFile second = EventFile::Open(L"name");
  EXPECT_FALSE(second.exclusive());
  EXPECT_EQ(first.key(), second.key());
  first.close();
  EXPECT_TRUE(second.claim());
  EXPECT_TRUE(second.exclusive());
}

TEST(EventFile, ShortTransfersAreFailures) {
  EventPlace place;
  EventFile file = EventFile::Open(L"name");
  char bytes[4];
  EXPECT_FALSE(file.read(bytes, 4, 0));
  ASSERT_TRUE(file.write("abcd", 4, 2));
  EXPECT_TRUE(file.read(bytes, 4, 2));
  EXPECT_FALSE(file.read(bytes, 4, 3));
  EXPECT_FALSE(file.read(bytes, 4, 1u << 30));
  EXPECT_EQ(std::string("\0\0abcd", 6), ReadBytes(place.file("name")));
}

TEST(EventFile, ContentsAreNeverCutOff) {
  EventPlace place;
  EventFile::Open(L"name").close();
  WriteBytes(place.file("name"), "longer than nine bytes");
  EventFile file = EventFile::Open(L"name");
  EXPECT_TRUE(file.write("123456789", 9, 0));
  file.close();
  EXPECT_EQ("123456789an nine bytes", ReadBytes(place.file("name")));
}

TEST(EventFile, UnlinkTakesTheNameOfItsOwnFileOnly) {
  EventPlace place;
  EventFile file = EventFile::Open(L"name");
  std::filesystem::remove(place.file("name"));
  EXPECT_FALSE(file.unlink());
  WriteBytes(place.file("name"), "a stranger's");
  EXPECT_FALSE(file.unlink());
  EXPECT_TRUE(Exists(place.file("name")));
  file = EventFile::Open(L"name");
  EXPECT_TRUE(file.unlink());
  EXPECT_FALSE(Exists(place.file("name")));
}

// The closer of an event removes the file while an opener waits for its lock.
TEST(EventFile, OpenerOfARemovedFileTakesTheNewOne) {
  EventPlace place;
  EventFile closing = EventFile::Open(L"name");
  vlt::test::Signal waiting;
  Child opener([&] {
    waiting.notify();
    EventFile file = EventFile::Open(L"name");
    char byte;
    if (!file.exclusive() || file.read(&byte, 1, 0)) return 1;
    return file.key() == ftok(place.file("name").c_str(), 1) && file.unlink() ? 0 : 2;
  });
  ASSERT_TRUE(waiting.await());
  // In the middle of its rounds, which sleep a millisecond each.
  EXPECT_TRUE(Eventually([&] { return Sleeps(opener.pid()); }));
  ASSERT_TRUE(closing.write("old", 3, 0));
  ASSERT_TRUE(closing.unlink());
  closing.close();
  EXPECT_EQ(0, opener.wait());
  EXPECT_FALSE(Exists(place.file("name")));
}

TEST(EventFile, OpenAndUnlinkByManyNeverHoldsAStrangersFile) {
  EventPlace place;
  auto storm = [&] {
    for (int i = 0; i < 400; ++i) {
      EventFile file = EventFile::Open(L"name");
      struct stat named;
      if (::stat(place.file("name").c_str(), &named) != 0) return 1;  // an orphan is held
      if (ftok(place.file("name").c_str(), 1) != file.key()) return 2;
      if (file.exclusive() ? i % 2 == 0 && !file.unlink() : file.claim() && !file.unlink())
        return 3;
    }
    return 0;
  };
  Child a(storm), b(storm), c(storm), d(storm);
  for (Child* child : {&a, &b, &c, &d}) EXPECT_EQ(0, child->wait());
}

TEST(EventFile, FailuresLeaveNoDescriptor) {
  EventPlace place;
  EventFile::Open(L"other").close();
  int before = OpenDescriptors();
  ASSERT_EQ(0, mkfifo(place.file("fifo").c_str(), 0666));
  WriteBytes(place.file("victim"), "x");
  ASSERT_EQ(0, symlink("victim", place.file("link").c_str()));
  EXPECT_EQ(ENXIO, PosixErrorOf([] { EventFile::Open(L"fifo"); }));
  EXPECT_EQ(ELOOP, PosixErrorOf([] { EventFile::Open(L"link"); }));
  EXPECT_EQ(EISDIR, PosixErrorOf([] { EventFile::Open(L""); }));
  EXPECT_EQ(ENAMETOOLONG, PosixErrorOf([] { EventFile::Open(String(256, L'n')); }));
  ScopedFd holder = OpenRaw(place.file("held"));
  ASSERT_EQ(0, Flock(holder.get(), LOCK_EX));
  EXPECT_EQ(EWOULDBLOCK, PosixErrorOf([] { EventFile::Open(L"held"); }));
  holder.reset();
  EXPECT_EQ(before, OpenDescriptors());
}

// In a process of its own, where no other object's descriptor is closed by a fork.
TEST_IN_CHILD(EventFile, ChildOfAnOpeningHasNoCopyAndOneOfASettledFileUnlocksNothing) {
  EventPlace place;
  auto openInAChild = [] { return Child(OpenDescriptors).wait(); };
  int without = openInAChild();
  EventFile file = EventFile::Open(L"name");
  EXPECT_EQ(openInAChild(), without);
  ASSERT_TRUE(file.share());
  file.settle();
  EXPECT_EQ(openInAChild(), without + 1);
  EXPECT_EQ(Child([&] {
              file.close();
              return OpenDescriptors();
            }).wait(),
            without);
  EXPECT_NE(0, Flock(OpenRaw(place.file("name")).get(), LOCK_EX | LOCK_NB));
}

TEST(EventFile, FileOfAnOpeningThatFailsIsGone) {
  EventPlace place;
  EventFile::Open(L"name").close();
  EXPECT_FALSE(Exists(place.file("name")));
  { EventFile file = EventFile::Open(L"name"); }
  EXPECT_FALSE(Exists(place.file("name")));
  EventFile settled = EventFile::Open(L"name");
  settled.settle();
  settled.close();
  EXPECT_TRUE(Exists(place.file("name")));
  WriteBytes(place.file("name"), "was there");
  EventFile::Open(L"name").close();
  EXPECT_EQ("was there", ReadBytes(place.file("name")));
}

TEST(EventFile, SharedOrReplacedFilesAreNotDiscarded) {
  EventPlace place;
  EventFile first = EventFile::Open(L"name");
  ASSERT_TRUE(first.share());
  EventFile::Open(L"name").close();  // finds it empty, but not alone
  EXPECT_TRUE(Exists(place.file("name")));
  first.close();
  EXPECT_TRUE(Exists(place.file("name")));
  EventFile replaced = EventFile::Open(L"name");
  std::filesystem::remove(place.file("name"));
  WriteBytes(place.file("name"), "a stranger's");
  replaced.close();
  EXPECT_TRUE(Exists(place.file("name")));
}

TEST(EventFile, MovedFilesHaveOneOwner) {
  EventPlace place;
  int before = OpenDescriptors();
  {
    EventFile first = EventFile::Open(L"name");
    EventFile second = std::move(first);
    EXPECT_FALSE(first.valid());
    EXPECT_TRUE(second.valid());
    EventFile other = EventFile::Open(L"other");
    second = std::move(other);
    EXPECT_FALSE(Exists(place.file("name")));
    EXPECT_NE(0, Flock(OpenRaw(place.file("other")).get(), LOCK_EX | LOCK_NB));
  }
  EXPECT_EQ(before, OpenDescriptors());
}

}  // namespace
}  // namespace zt::fnd::osdep
