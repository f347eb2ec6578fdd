#include "zt/fnd/osdep/Mutex.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <future>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/EventPlace.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/MutexPlace.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/OSException.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::BlockedIn;
using vlt::test::Child;
using vlt::test::Eventually;
using vlt::test::FileIsFree;
using vlt::test::Keeper;
using vlt::test::ModeOf;
using vlt::test::MutexPlace;
using vlt::test::PosixErrorOf;
using vlt::test::ReadBytes;
using vlt::test::TempDir;
using vlt::test::Wide;
using vlt::test::WriteBytes;

bool TryElsewhere(const Mutex& mutex) {
  return std::async(std::launch::async,
                    [&] {
                      bool taken = mutex.tryLock();
                      if (taken) mutex.unlock();
                      return taken;
                    })
      .get();
}

// A process that holds the name until it is killed.
Keeper HolderOf(const char* name) {
  return Keeper([name] {
    auto mutex = std::make_unique<Mutex>(Wide(name));
    mutex->lock();
    return mutex;
  });
}

TEST(Mutex, LeavesAnEmptyFileOpenToAll) {
  MutexPlace place;
  {
    Mutex mutex(L"name");
    mutex.lock();
    EXPECT_FALSE(FileIsFree(place.file("name")));
    mutex.unlock();
  }
  EXPECT_EQ(ModeOf(place.dir / "mutex"), 0777);
  EXPECT_EQ(ModeOf(place.file("name")), 0666);
  EXPECT_EQ(ReadBytes(place.file("name")), "");
}

TEST(Mutex, ModesStandUnderARestrictiveUmask) {
  MutexPlace place;
  Child child([] {
    umask(0077);
    Mutex mutex(L"name");
    return mutex.tryLock() ? 0 : 1;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ModeOf(place.dir / "mutex"), 0777);
  EXPECT_EQ(ModeOf(place.file("name")), 0666);
}

TEST(Mutex, LockedThreeTimesIsFreeAfterTheThirdUnlock) {
  MutexPlace place;
  Mutex mutex(L"name");
  mutex.lock();
  EXPECT_TRUE(mutex.tryLock());
  mutex.lock();
  for (int i = 0; i < 2; ++i) {
    mutex.unlock();
    EXPECT_FALSE(FileIsFree(place.file("name"))) << i;
    EXPECT_FALSE(TryElsewhere(mutex)) << i;
  }
  mutex.unlock();
  EXPECT_TRUE(FileIsFree(place.file("name")));
  EXPECT_TRUE(TryElsewhere(mutex));
}

TEST(Mutex, ThreadsWithObjectsOfTheirOwnExcludeOneAnother) {
  MutexPlace place;
  int count = 0;  // guarded by nothing but the mutex
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&] {
      Mutex mutex(L"name");
      for (int i = 0; i < 500; ++i) {
        mutex.lock();
        ++count;
        mutex.unlock();
      }
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(count, 2000);
}

TEST(Mutex, ThreadsThatShareOneObjectExcludeOneAnother) {
  MutexPlace place;
  Mutex mutex(L"name");
  int count = 0;
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&] {
      for (int i = 0; i < 500; ++i) {
        if (i % 2 == 0 || !mutex.tryLock()) mutex.lock();
        ++count;
        mutex.unlock();
      }
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(count, 2000);
}

TEST(Mutex, OtherThreadOfTheProcessIsRefusedWhileHeld) {
  MutexPlace place;
  Mutex mutex(L"name"), sibling(L"name");
  mutex.lock();
  EXPECT_FALSE(TryElsewhere(mutex));
  EXPECT_FALSE(TryElsewhere(sibling));
  mutex.unlock();
  EXPECT_TRUE(TryElsewhere(sibling));
}

TEST(Mutex, ProcessesLoseNoStep) {
  MutexPlace place;
  WriteBytes(place.dir / "count", std::string(sizeof(int), '\0'));
  std::vector<Child> children;
  for (int c = 0; c < 4; ++c) {
    children.emplace_back([&] {
      Mutex mutex(L"name");
      int fd = ::open((place.dir / "count").c_str(), O_RDWR | O_CLOEXEC);
      for (int i = 0; i < 300; ++i) {
        int n;
        mutex.lock();
        if (pread(fd, &n, sizeof n, 0) != sizeof n) return 1;
        ++n;
        if (pwrite(fd, &n, sizeof n, 0) != sizeof n) return 2;
        mutex.unlock();
      }
      return 0;
    });
  }
  for (Child& child : children) EXPECT_EQ(child.wait(), 0);
  int n;
  memcpy(&n, ReadBytes(place.dir / "count").data(), sizeof n);
  EXPECT_EQ(n, 1200);
}

TEST(Mutex, TryLockWhileAnotherProcessHoldsItIsFalseAndLeavesNoTrace) {
  MutexPlace place;
  Mutex mutex(L"name");
  Keeper holder = HolderOf("name");
  ASSERT_TRUE(holder.good());
  EXPECT_FALSE(mutex.tryLock());
  EXPECT_FALSE(TryElsewhere(mutex));
  holder.kill();
  // The section is free for any thread, and one unlock frees the file.
  EXPECT_TRUE(TryElsewhere(mutex));
  EXPECT_TRUE(mutex.tryLock());
  mutex.unlock();
  EXPECT_TRUE(FileIsFree(place.file("name")));
}

TEST(Mutex, KilledHolderDoesNotBlockTheNext) {
  MutexPlace place;
  Keeper holder = HolderOf("name");
  ASSERT_TRUE(holder.good());
  Child waiter([] {
    Mutex mutex(L"name");
    mutex.lock();
    mutex.unlock();
    return 0;
  });
  EXPECT_TRUE(Eventually([&] { return BlockedIn(waiter.pid(), SYS_flock); }));
  holder.kill();
  EXPECT_EQ(waiter.wait(), 0);
}

TEST(Mutex, InterruptedWaitIsResumed) {
  MutexPlace place;
  Keeper holder = HolderOf("name");
  ASSERT_TRUE(holder.good());
  Child waiter([] {
    struct sigaction action = {};
    action.sa_handler = [](int) {};
    sigaction(SIGUSR1, &action, nullptr);  // without SA_RESTART
    Mutex mutex(L"name");
    mutex.lock();
    return FileIsFree(std::string(getenv("ZTFNDTMPSHAREDFILEDIR")) + "/mutex/name") ? 1 : 0;
  });
  for (int i = 0; i < 10; ++i) {
    ASSERT_TRUE(Eventually([&] { return BlockedIn(waiter.pid(), SYS_flock); }));
    waiter.kill(SIGUSR1);
  }
  EXPECT_TRUE(waiter.running());
  holder.kill();
  EXPECT_EQ(waiter.wait(), 0);
}

TEST(Mutex, NamesThatDifferInCaseShareASectionAndHaveTwoFiles) {
  MutexPlace place;
  Mutex upper(L"Foo"), lower(L"foo");
  upper.lock();
  EXPECT_FALSE(TryElsewhere(lower));  // the section
  EXPECT_TRUE(FileIsFree(place.file("foo")));
  lower.lock();  // the same thread passes the section, and the file is another one
  EXPECT_FALSE(FileIsFree(place.file("foo")));
  lower.unlock();
  EXPECT_TRUE(FileIsFree(place.file("foo")));
  EXPECT_FALSE(FileIsFree(place.file("Foo")));
  upper.unlock();
  EXPECT_TRUE(FileIsFree(place.file("Foo")));
  EXPECT_TRUE(TryElsewhere(lower));
}

TEST(Mutex, SecondObjectInTheSameThreadBlocksInFlock) {
  MutexPlace place;
  Child child([] {
    Mutex first(L"name"), second(L"name");
    first.lock();
    if (second.tryLock()) return 1;
    second.lock();
    return 2;
  });
  EXPECT_TRUE(Eventually([&] { return BlockedIn(child.pid(), SYS_flock); }));
  EXPECT_TRUE(child.running());
  child.kill(SIGKILL);
  EXPECT_EQ(128 + SIGKILL, child.wait());
}

TEST(Mutex, UnlockOfAFreeMutexChangesNothing) {
  MutexPlace place;
  Mutex mutex(L"name"), sibling(L"name");
  mutex.unlock();
  mutex.unlock();
  mutex.lock();
  sibling.unlock();  // not held through this one
  EXPECT_FALSE(FileIsFree(place.file("name")));
  EXPECT_FALSE(TryElsewhere(mutex));
  mutex.unlock();
  EXPECT_TRUE(FileIsFree(place.file("name")));
  EXPECT_TRUE(TryElsewhere(mutex));
}

TEST(Mutex, UnlockByAnotherThreadFreesTheFileAndLeavesTheSection) {
  MutexPlace place;
  Mutex mutex(L"name");
  mutex.lock();
  std::thread([&] { mutex.unlock(); }).join();
  EXPECT_TRUE(FileIsFree(place.file("name")));
  EXPECT_FALSE(TryElsewhere(mutex));
  mutex.lock();  // the owner goes on as before
  EXPECT_FALSE(FileIsFree(place.file("name")));
  mutex.unlock();
  EXPECT_TRUE(FileIsFree(place.file("name")));
  mutex.unlock();  // and gives back what the other thread could not
  EXPECT_TRUE(TryElsewhere(mutex));
}

TEST(Mutex, DestructionFreesWhatIsHeld) {
  MutexPlace place;
  Mutex sibling(L"name");
  {
    Mutex mutex(L"name");
    mutex.lock();
    mutex.lock();
  }
  EXPECT_TRUE(FileIsFree(place.file("name")));
  EXPECT_TRUE(TryElsewhere(sibling));
}

TEST(Mutex, DestructionByAnotherThreadFreesTheFile) {
  MutexPlace place;
  auto mutex = std::make_unique<Mutex>(Wide("name"));
  mutex->lock();
  std::thread([&] { mutex.reset(); }).join();
  EXPECT_TRUE(FileIsFree(place.file("name")));
  Mutex next(L"name");  // the section went with its last object
  EXPECT_TRUE(TryElsewhere(next));
}

TEST(Mutex, DescriptorsComeBack) {
  MutexPlace place;
  Mutex first(L"other");
  int before = vlt::test::OpenDescriptors();
  { Mutex mutex(L"name"), again(L"name"); }
  EXPECT_EQ(before, vlt::test::OpenDescriptors());
}

// ---- hostile places

TEST(Mutex, FileThatCannotBeMadeIsAPosixErrorWithoutTrace) {
  MutexPlace place;
  ASSERT_EQ(mkdir((place.dir / "mutex").c_str(), 0777), 0);
  int before = vlt::test::OpenDescriptors();
  auto make = [](const std::string& name) { return PosixErrorOf([&] { Mutex m(Wide(name)); }); };
  EXPECT_EQ(make(""), EISDIR);
  EXPECT_EQ(make(std::string(256, 'n')), ENAMETOOLONG);
  EXPECT_EQ(make("no/such"), ENOENT);
  EXPECT_EQ(before, vlt::test::OpenDescriptors());
  EXPECT_EQ(make(std::string(255, 'n')), -1);
}

TEST(Mutex, WhatIsInThePlaceOfTheFileIsMovedAside) {
  MutexPlace place;
  ASSERT_EQ(mkdir((place.dir / "mutex").c_str(), 0777), 0);
  ASSERT_EQ(mkfifo(place.file("fifo").c_str(), 0666), 0);
  ASSERT_EQ(mkdir(place.file("directory").c_str(), 0777), 0);
  WriteBytes(place.dir / "victim", "x");
  chmod((place.dir / "victim").c_str(), 0600);
  ASSERT_EQ(symlink("../victim", place.file("link").c_str()), 0);
  ASSERT_EQ(link((place.dir / "victim").c_str(), place.file("second").c_str()), 0);
  for (const char* name : {"fifo", "directory", "link", "second"}) {
    Mutex mutex(Wide(name));
    mutex.lock();
    EXPECT_FALSE(FileIsFree(place.file(name))) << name;
    mutex.unlock();
  }
  EXPECT_EQ(ReadBytes(place.dir / "victim"), "x");
  EXPECT_EQ(ModeOf(place.dir / "victim"), 0600);
}

TEST(Mutex, FileInTheDirectorysPlaceIsENOTDIR) {
  MutexPlace place;
  WriteBytes(place.dir / "mutex", "x");
  EXPECT_EQ(PosixErrorOf([] { Mutex m(L"name"); }), ENOTDIR);
}

TEST(Mutex, ReplacedFileIsLockedInPlaceOfTheOldOne) {
  MutexPlace place;
  Mutex mutex(L"name");
  ASSERT_EQ(unlink(place.file("name").c_str()), 0);
  mutex.lock();
  EXPECT_EQ(ModeOf(place.file("name")), 0666);
  EXPECT_FALSE(FileIsFree(place.file("name")));
  mutex.unlock();
  EXPECT_TRUE(FileIsFree(place.file("name")));
  // The same by tryLock, with another process on the new file.
  ASSERT_EQ(unlink(place.file("name").c_str()), 0);
  Keeper holder = HolderOf("name");
  ASSERT_TRUE(holder.good());
  EXPECT_FALSE(mutex.tryLock());
  holder.kill();
  EXPECT_TRUE(mutex.tryLock());
  mutex.unlock();
}

TEST(Mutex, RemovedDirectoryIsMadeAgain) {
  MutexPlace place;
  Mutex mutex(L"name");
  std::filesystem::remove_all(place.dir / "mutex");
  mutex.lock();
  EXPECT_EQ(ModeOf(place.dir / "mutex"), 0777);
  EXPECT_FALSE(FileIsFree(place.file("name")));
  mutex.unlock();
}

TEST(Mutex, FailedLockLeavesTheSection) {
  MutexPlace place;
  Mutex mutex(L"name");
  std::filesystem::remove_all(place.dir / "mutex");
  WriteBytes(place.dir / "mutex", "in the way");
  EXPECT_EQ(PosixErrorOf([&] { mutex.lock(); }), ENOTDIR);
  EXPECT_FALSE(mutex.tryLock());
  std::filesystem::remove(place.dir / "mutex");
  EXPECT_TRUE(TryElsewhere(mutex));
  EXPECT_TRUE(FileIsFree(place.file("name")));
}

TEST(Mutex, RefusedFileLockIsThrownWithItsErrnoAndLeavesTheSection) {
  MutexPlace place;
  Child child([] {
    Mutex mutex(L"name");
    if (!vlt::test::FailSystemCall(SYS_flock, ENOLCK)) return 1;
    if (PosixErrorOf([&] { mutex.lock(); }) != ENOLCK) return 2;
    if (mutex.tryLock()) return 3;
    // The section is free: another thread gets as far as the file.
    int error = -1;
    std::thread([&] { error = PosixErrorOf([&] { mutex.lock(); }); }).join();
    return error == ENOLCK ? 0 : 4;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(Mutex, UnlockThatTheSystemRefusesThrowsNothing) {
  MutexPlace place;
  Child child([&] {
    Mutex mutex(L"name");
    mutex.lock();
    if (!vlt::test::FailSystemCall(SYS_flock, EIO)) return 1;
    mutex.unlock();
    return 0;
  });
  EXPECT_EQ(child.wait(), 0);
}

// ---- the end of the process

void UseAfterTheStaticsWent() {
  Mutex mutex(L"late");
  mutex.lock();
  mutex.unlock();
  WriteBytes(std::string(getenv("ZTFNDTMPSHAREDFILEDIR")) + "/done", "x");
}

TEST(Mutex, WorksInExitFunctionsThatRunAfterItsOwn) {
  MutexPlace place;
  Child child([]() -> int {
    atexit(UseAfterTheStaticsWent);  // before the first use, so it runs after
    {
      Mutex mutex(L"name");
      mutex.lock();
    }
    exit(0);
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ReadBytes(place.dir / "done"), "x");
}

}  // namespace
}  // namespace zt::fnd::osdep
