// The lock of a guarded file, lost without a word: by fork, by a host that closes descriptors, by a
// cleaner that removes the lock file.
#include <gtest/gtest.h>
#include <unistd.h>

#include <functional>
#include <memory>
#include <string>

#include "source/vlIniMgr.h"
#include "tests/support/Child.h"
#include "tests/support/MutexPlace.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/String.h"

namespace {

using namespace vlt::test;

std::unique_ptr<CvlIniMgr> Open(const std::string& file) {
  return std::unique_ptr<CvlIniMgr>(new CvlIniMgr(CvlIniMgr::OpenForUpdate(file)));
}

// Sets an item as a client does that holds the object for long: makes sure of the lock, changes,
// saves.
HRESULT Set(CvlIniMgr& ini, const char* item, const char* value) {
  HRESULT result = ini.MakeSureOfLock();
  if (result < 0) return result;
  ini.SetItem("s", item, value, false);
  unsigned char* digest = nullptr;
  result = ini.WriteAndGetChecksum(&digest);
  delete[] digest;
  return result;
}

struct GuardedPlace {
  MutexPlace locks;
  TempDir dir;
  std::string file = dir / "x.ini";

  GuardedPlace() { WriteBytes(file, "[s]\na = 1\n"); }
  std::string lockFile() const {
    std::string name(zt::fnd::AnsiString(IniFileLock::NameForFile(file.c_str())).c_str());
    return locks.file(name.c_str());
  }
};

// The ways to lose a lock in one process.
struct Loss {
  const char* what;
  std::function<void(const GuardedPlace&)> lose;
};

const Loss kLosses[] = {
    {"closed descriptors",
     [](const GuardedPlace&) {
       for (int fd = 3; fd < 1024; ++fd) close(fd);
     }},
    {"a removed lock file", [](const GuardedPlace& p) { unlink(p.lockFile().c_str()); }},
};

TEST(vlIniMgrLock, ALostLockIsTakenAgain) {
  for (const Loss& loss : kLosses) {
    GuardedPlace place;
    Child child([&] {
      auto ini = Open(place.file);
      loss.lose(place);
      if (Set(*ini, "a", "2") != S_OK) return 1;
      return FileIsFree(place.lockFile()) ? 2 : 0;
    });
    EXPECT_EQ(child.wait(), 0) << loss.what;
    EXPECT_EQ(ReadBytes(place.file), "[s]\na = 2\n") << loss.what;
  }
}

TEST(vlIniMgrLock, WhatAnotherProcessHasWrittenMeanwhileStays) {
  for (const Loss& loss : kLosses) {
    GuardedPlace place;
    Child child([&] {
      auto ini = Open(place.file);
      loss.lose(place);
      Child other([&] { return Set(*Open(place.file), "b", "other's") == S_OK ? 0 : 1; });
      if (other.wait() != 0) return 1;
      return Set(*ini, "a", "2") == S_OK ? 0 : 2;
    });
    EXPECT_EQ(child.wait(), 0) << loss.what;
    EXPECT_EQ(ReadBytes(place.file), "[s]\na = 2\nb = other's\n") << loss.what;
  }
}

TEST(vlIniMgrLock, NothingIsWrittenWhileAnotherProcessHasTheLock) {
  for (const Loss& loss : kLosses) {
    GuardedPlace place;
    Child child([&] {
      auto ini = Open(place.file);
      loss.lose(place);
      Signal held, end;  // after the descriptors were closed
      Child other([&] {
        auto theirs = Open(place.file);
        held.notify();
        end.await();
        return 0;
      });
      if (!held.await()) return 1;
      if (Set(*ini, "a", "2") != E_FAIL) return 2;
      // Also a save whose change was made while the lock was still believed to be held.
      ini->SetItem("s", "a", "3", false);
      if (ini->Write() != E_FAIL) return 3;
      end.notify();
      if (other.wait() != 0) return 4;
      return Set(*ini, "a", "4") == S_OK ? 0 : 5;
    });
    EXPECT_EQ(child.wait(), 0) << loss.what;
    EXPECT_EQ(ReadBytes(place.file), "[s]\na = 4\n") << loss.what;
  }
}

TEST(vlIniMgrLock, AForkedChildHoldsNothingUntilItsParentHasGone) {
  GuardedPlace place;
  Signal tried, gone;
  Child parent([&]() -> int {
    auto ini = Open(place.file);
    if (fork() != 0) {
      tried.await();
      _exit(0);
    }
    // The daemon: first beside its parent, then without.
    bool refused = Set(*ini, "a", "2") == E_FAIL;
    tried.notify();
    bool done = Eventually([&] { return Set(*ini, "a", "3") == S_OK; });
    bool held = !FileIsFree(place.lockFile());
    WriteBytes(place.dir / "result", refused && done && held ? "good" : "bad");
    gone.notify();
    _exit(0);
  });
  ASSERT_TRUE(gone.await());
  parent.wait();
  EXPECT_EQ(ReadBytes(place.dir / "result"), "good");
  EXPECT_EQ(ReadBytes(place.file), "[s]\na = 3\n");
}

TEST(vlIniMgrLock, AChildReadsWhatItsParentWroteAfterTheFork) {
  GuardedPlace place;
  Signal written;
  auto ini = Open(place.file);
  Child child([&] {
    if (!written.await()) return 1;
    return Set(*ini, "b", "child's") == S_OK ? 0 : 2;
  });
  ASSERT_EQ(Set(*ini, "a", "2"), S_OK);
  ini.reset();
  written.notify();
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ReadBytes(place.file), "[s]\na = 2\nb = child's\n");
}

TEST(vlIniMgrLock, AChangeThatWasNotWrittenIsDroppedWithTheLock) {
  GuardedPlace place;
  Child child([&] {
    auto ini = Open(place.file);
    ini->SetItem("s", "a", "mine", false);
    unlink(place.lockFile().c_str());
    Child other([&] { return Set(*Open(place.file), "b", "2") == S_OK ? 0 : 1; });
    if (other.wait() != 0) return 1;
    // The file is no longer what the change was made to.
    if (ini->Write() != E_FAIL) return 2;
    return Set(*ini, "c", "3") == S_OK ? 0 : 3;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ReadBytes(place.file), "[s]\na = 1\nb = 2\nc = 3\n");
}

}  // namespace
