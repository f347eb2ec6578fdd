// Guarded files whose lock an object has lost, or has never had in this process: by fork(), by a
// host that closes descriptors, by a cleaner of the lock directory.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/file.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <filesystem>
#include <thread>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/Sanitizer.h"
#include "tests/support/TempDir.h"
#include "tests/support/TestIni.h"
#include "zt/posix/Files.h"

namespace {

using namespace vlt::test;

class vlIniMgrFork : public testing::Test {
 protected:
  vlIniMgrFork() : file(dir / "x.ini") { ini = opened(); }

  std::unique_ptr<CvlIniMgr> opened() const {
    return std::unique_ptr<CvlIniMgr>(new CvlIniMgr(CvlIniMgr::OpenForUpdate(file)));
  }

  // As an object that lives long makes a change.
  static HRESULT Save(CvlIniMgr& ini, const char* item, const char* value) {
    HRESULT result = ini.MakeSureOfLock();
    if (result >= 0) result = ini.SetItem("s", item, value, true);
    return result < 0 ? result : ini.Write();
  }

  // In another process, which has the file as it is on the disk.
  void expectOnDisk(const char* item, const char* value) const {
    ExpectInChild([&] {
      auto fresh = opened();
      EXPECT_EQ(Value(*fresh, "s", item), value) << item;
    });
  }

  std::string lockFile() const {
    return std::string(getenv("ZTFNDTMPSHAREDFILEDIR")) + "/mutex/" +
           zt::fnd::AnsiString(IniFileLock::NameForFile(file.c_str())).c_str();
  }

  TempDir dir;
  std::string file;
  std::unique_ptr<CvlIniMgr> ini;
};

TEST_F(vlIniMgrFork, AChildOfALivingHolderIsRefusedAndReads) {
  ASSERT_EQ(Save(*ini, "parent", "1"), S_OK);
  std::string before = ReadBytes(file);
  ExpectInChild([&] {
    EXPECT_EQ(Save(*ini, "child", "1"), E_FAIL);
    unsigned char* digest = nullptr;
    ini->SetItem("s", "child", "2", true);
    EXPECT_EQ(ini->WriteAndGetChecksum(&digest), E_FAIL);
    EXPECT_EQ(digest, nullptr);
    EXPECT_EQ(Value(*ini, "s", "parent"), "1");
  });
  EXPECT_EQ(ReadBytes(file), before);
  EXPECT_EQ(Save(*ini, "parent", "2"), S_OK);
  ini.reset();
  expectOnDisk("parent", "2");
  expectOnDisk("child", "(none)");
}

TEST_F(vlIniMgrFork, AChildThatOutlivesTheHolderKeepsWhatTheHolderSavedLast) {
  ASSERT_EQ(Save(*ini, "parent", "1"), S_OK);
  Signal gone, saved, end;
  Child child([&] {
    if (!gone.await()) return 1;
    if (Save(*ini, "child", "1") != S_OK) return 2;
    saved.notify();
    return end.await() ? 0 : 3;
  });
  EXPECT_EQ(Save(*ini, "parent", "2"), S_OK);
  ini.reset();
  gone.notify();
  ASSERT_TRUE(saved.await());
  // The lock is the child's from its save on.
  zt::posix::ScopedFd fd(open(lockFile().c_str(), O_RDWR | O_CLOEXEC));
  EXPECT_NE(zt::posix::Flock(fd.get(), LOCK_EX | LOCK_NB), 0);
  fd.reset();
  end.notify();
  EXPECT_EQ(child.wait(), 0);
  expectOnDisk("parent", "2");
  expectOnDisk("child", "1");
}

TEST_F(vlIniMgrFork, WhatAnotherProcessSavedWhileTheLockWasLostStays) {
  ASSERT_EQ(Save(*ini, "first", "1"), S_OK);
  std::filesystem::remove(lockFile());
  Signal saved, end;
  Child other([&] {
    auto mine = opened();
    if (Save(*mine, "other", "1") != S_OK) return 1;
    saved.notify();
    return end.await() ? 0 : 2;
  });
  ASSERT_TRUE(saved.await());
  std::string before = ReadBytes(file);
  EXPECT_EQ(Save(*ini, "refused", "1"), E_FAIL);
  EXPECT_EQ(ReadBytes(file), before);
  EXPECT_EQ(Value(*ini, "s", "first"), "1");
  end.notify();
  EXPECT_EQ(other.wait(), 0);
  EXPECT_EQ(Save(*ini, "second", "1"), S_OK);
  ini.reset();
  for (const char* item : {"first", "other", "second"}) expectOnDisk(item, "1");
  expectOnDisk("refused", "(none)");
}

// A thread may have any number of objects of one file, in a child as in its parent.
TEST_F(vlIniMgrFork, TheObjectsOfAThreadShareTheLockThatAChildTakes) {
  auto second = opened();
  Signal gone;
  Child child([&] {
    if (!gone.await()) return 1;
    if (Save(*ini, "first", "1") != S_OK) return 2;
    if (Save(*second, "second", "1") != S_OK) return 3;
    ini.reset();
    return Save(*second, "third", "1") == S_OK ? 0 : 4;
  });
  second.reset();
  ini.reset();
  gone.notify();
  EXPECT_EQ(child.wait(), 0);
  for (const char* item : {"first", "second", "third"}) expectOnDisk(item, "1");
}

// An object without a document must not pass for one that holds what the file holds.
TEST_F(vlIniMgrFork, AnAbandonedDocumentIsReadAsSoonAsItsFileCanBe) {
  ASSERT_EQ(Save(*ini, "a", "1"), S_OK);
  std::string hidden = dir / "hidden";
  std::filesystem::rename(file, hidden);
  ini->AbandonDocument();
  EXPECT_EQ(ini->MakeSureOfLock(), E_FAIL);
  std::filesystem::rename(hidden, file);
  EXPECT_EQ(ini->MakeSureOfLock(), S_OK);
  EXPECT_EQ(Value(*ini, "s", "a"), "1");
  EXPECT_EQ(Save(*ini, "b", "2"), S_OK);
  ini.reset();
  expectOnDisk("a", "1");
}

// Forks while a thread takes the digest of its save: what it had digested so far is not the
// beginning of what a child writes.
TEST_F(vlIniMgrFork, ADigestThatAForkInterruptedDoesNotGoOnInTheChild) {
  if (!kCanForkWhileThreadsAllocate) GTEST_SKIP() << "the sanitizer's allocator is not fork-safe";
  ini.reset();
  std::string bytes;
  for (int n = 0; n < 8; ++n) {
    bytes += "[s" + std::to_string(n) + "]\na = " + std::string(1u << 19, 'v') + "\n";
  }
  WriteBytes(file, bytes);
  IniSidecar::Digest digest;
  ASSERT_EQ(opened()->WriteAndGetDigest(&digest), S_OK);
  ini.reset(new CvlIniMgr(file.c_str(), false, digest.data(), false, true));
  ini->SetDurability(IniDurability::None);
  ini->SetItem("z", "a", "1", false);

  Signal freed;
  std::atomic<bool> isSaved = false;
  std::vector<Child> children;
  std::thread save([&] {
    EXPECT_EQ(ini->WriteAndGetDigest(&digest), S_OK);
    isSaved = true;
  });
  while (!isSaved && children.size() < 8) {
    children.emplace_back([&] {
      if (!freed.await()) return 1;
      ini->AbandonDocument();
      if (!Eventually([&] { return ini->MakeSureOfLock() == S_OK; })) return 2;
      const std::string value = std::to_string(getpid());
      IniSidecar::Digest own;
      ini->SetItem("z", "child", value.c_str(), false);
      if (ini->WriteAndGetDigest(&own) != S_OK) return 3;
      EXPECT_EQ(Hex(std::string(own.begin(), own.end())), Md5Sum(file));
      ini.reset();
      return 0;
    });
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }
  save.join();
  ini.reset();
  for (size_t n = 0; n < children.size(); ++n) freed.notify();
  for (Child& child : children) EXPECT_EQ(child.wait(), 0);
}

}  // namespace
