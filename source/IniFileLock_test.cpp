#include "source/IniFileLock.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <filesystem>
#include <thread>

#include "tests/support/Child.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/MutexPlace.h"
#include "tests/support/Sanitizer.h"
#include "tests/support/TempDir.h"
#include "tests/support/TestIni.h"
#include "tests/support/ThreadState.h"
#include "zt/fnd/Exception.h"

namespace {

using namespace vlt::test;

TEST(IniFileLock, NameHasNoSeparatorAndIsInCapitals) {
  auto name = [](const char* file) {
    return std::string(zt::fnd::AnsiString(IniFileLock::NameForFile(file)).c_str());
  };
  EXPECT_EQ(name("/d/vltjar.ini"), "DVLTJARINI");
  EXPECT_EQ(name("C:\\a b.ini"), "CA BINI");
  std::string longPath = "/" + std::string(300, 'a');
  EXPECT_LE(name(longPath.c_str()).size(), 255u);
  EXPECT_NE(name(longPath.c_str()), name((longPath + "b").c_str()));
  EXPECT_EQ(name(("/" + std::string(255, 'a')).c_str()), std::string(255, 'A'));
}

TEST(IniFileLock, IsRecursiveInAThread) {
  TempDir dir;
  std::string file = dir / "x.ini";
  CvlIniMgr outer = CvlIniMgr::LockOnly(file);
  {
    CvlIniMgr inner = CvlIniMgr::OpenAndSaveAtEnd(file);
    inner.SetItem("s", "a", "1", true);
  }
  CvlIniMgr again = CvlIniMgr::OpenForUpdate(file);
  EXPECT_EQ(Value(again, "s", "a"), "1");
}

TEST(IniFileLock, AnotherThreadWaits) {
  TempDir dir;
  std::string file = dir / "x.ini";
  std::unique_ptr<CvlIniMgr> outer(new CvlIniMgr(CvlIniMgr::LockOnly(file)));
  Signal entered;
  WatchedThread other([&] {
    CvlIniMgr mine = CvlIniMgr::LockOnly(file);
    entered.notify();
  });
  EXPECT_TRUE(other.blocksInLock());
  EXPECT_FALSE(entered.await(0));
  outer.reset();
  EXPECT_TRUE(entered.await());
  other.join();
}

TEST(IniFileLock, AnotherProcessWaitsAndGoesOnWhenTheHolderIsKilled) {
  TempDir dir;
  std::string file = dir / "x.ini";
  Signal held, never, entered;
  Child holder([&] {
    CvlIniMgr mine = CvlIniMgr::LockOnly(file);
    held.notify();
    never.await();
    return 0;
  });
  ASSERT_TRUE(held.await());
  Child waiter([&] {
    CvlIniMgr mine = CvlIniMgr::LockOnly(file);
    entered.notify();
    return 0;
  });
  EXPECT_TRUE(Eventually([&] { return BlockedIn(waiter.pid(), SYS_flock); }));
  EXPECT_FALSE(entered.await(0));
  holder.kill(SIGKILL);
  EXPECT_TRUE(entered.await());
  EXPECT_EQ(waiter.wait(), 0);
}

TEST(IniFileLock, MayBeGivenUpByAnotherThreadAndTakenAgain) {
  TempDir dir;
  std::string file = dir / "x.ini";
  std::unique_ptr<CvlIniMgr> mine(new CvlIniMgr(CvlIniMgr::LockOnly(file)));
  std::thread([&] { mine.reset(); }).join();
  CvlIniMgr again = CvlIniMgr::LockOnly(file);
  Child other([&] {
    CvlIniMgr blocked = CvlIniMgr::LockOnly(file);
    return 0;
  });
  EXPECT_TRUE(Eventually([&] { return BlockedIn(other.pid(), SYS_flock); }));
}

// The thread that began the hold must not take the lock for its own while another one ends the hold.
TEST_IN_CHILD(IniFileLock, TheFirstOwnerWaitsForTheThreadThatGivesUp) {
  MutexPlace place;
  zt::fnd::String name(L"name");
  // ThreadSanitizer takes a section that ends with another thread for held for good, and
  // counts 64 of them at most.
  constexpr int kRounds = VLT_THREAD_SANITIZER ? 40 : 300;
  for (int round = 0; round < kRounds; ++round) {
    auto first = std::make_unique<IniFileLock>(name);
    std::atomic<bool> ending{false};
    std::thread other([&] {
      ending = true;
      first.reset();
    });
    while (!ending) {
    }
    { IniFileLock again(name); }
    other.join();
    ASSERT_TRUE(FileIsFree(place.file("name"))) << round;
  }
}

TEST(IniFileLock, AForkedChildDoesNotFreeItsParentsLock) {
  TempDir dir;
  std::string file = dir / "x.ini";
  std::unique_ptr<CvlIniMgr> mine(new CvlIniMgr(CvlIniMgr::LockOnly(file)));
  EXPECT_EQ(Child([&] {
              mine.reset();
              return 0;
            }).wait(),
            0);
  Signal entered;
  Child waiter([&] {
    CvlIniMgr other = CvlIniMgr::LockOnly(file);
    entered.notify();
    return 0;
  });
  EXPECT_TRUE(Eventually([&] { return BlockedIn(waiter.pid(), SYS_flock); }));
  EXPECT_FALSE(entered.await(0));
  mine.reset();
  EXPECT_TRUE(entered.await());
  EXPECT_EQ(waiter.wait(), 0);
}

TEST(IniFileLock, IsFreeAfterAConstructorThatThrows) {
  TempDir dir;
  std::string file = dir / "x.ini";
  WriteBytes(file, "[a]\n");
  EXPECT_EQ(Open(file, std::string(16, 'q')), 1);
  EXPECT_EQ(Child([&] { return Open(file); }).wait(), 0);
}

}  // namespace
