#include "source/Snapshot/DatabaseFile.h"

#include <errno.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <functional>

#include "source/GuardedIniFile.h"
#include "tests/support/Child.h"
#include "tests/support/Installation.h"
#include "tests/support/TempDir.h"

namespace vlt::snapshot {
namespace {

using vlt::test::Child;
using vlt::test::Md5Sum;
using vlt::test::TempDir;
using vlt::test::WriteBytes;

std::string Unhex(const std::string& hex) {
  std::string bytes;
  for (size_t i = 0; i < hex.size(); i += 2) {
    bytes += static_cast<char>(std::stoi(hex.substr(i, 2), nullptr, 16));
  }
  return bytes;
}

// Another process that acts at one call of the reader.
class Interrupted : public DatabaseAccess {
 public:
  std::function<void(int read)> beforeRead, afterRead;
  int reads = 0;
  unsigned waitedMs = 0;

  int read(const std::string& file, std::string* bytes) override {
    if (beforeRead) beforeRead(++reads);
    int error = DatabaseAccess::read(file, bytes);
    if (afterRead) afterRead(++reads);
    return error;
  }
  void wait(unsigned milliseconds) override { waitedMs += milliseconds; }
};

struct DatabaseFile : testing::Test {
  TempDir dir;
  std::string file = dir / "vlt.vlr", sidecar = dir / "vlt.vl5", copy = file + ".durable";
  Interrupted access;

  void seal() { WriteBytes(sidecar, Unhex(Md5Sum(file))); }
  DatabaseBytes read() { return ReadDatabase(file, access); }
  DatabaseState state() { return read().database.state; }
  void write(const std::string& bytes) { WriteBytes(file, bytes); }
};

TEST_F(DatabaseFile, WithoutAFileItIsMissing) {
  EXPECT_EQ(state(), DatabaseState::Missing);
  EXPECT_EQ(access.waitedMs, 0u);
}

TEST_F(DatabaseFile, WithItsDigestItIsSound) {
  write("[a]\nx=1\n");
  seal();
  DatabaseBytes found = read();
  EXPECT_EQ(found.database.state, DatabaseState::Sound);
  EXPECT_EQ(found.bytes, "[a]\nx=1\n");
  EXPECT_EQ(access.waitedMs, 0u);
}

TEST_F(DatabaseFile, WithAnotherDigestItIsTakenAsItIs) {
  write("[a]\n");
  seal();
  write("[b]\n");
  DatabaseBytes found = read();
  EXPECT_EQ(found.database.state, DatabaseState::DigestDiffers);
  EXPECT_EQ(found.bytes, "[b]\n");
  EXPECT_GE(access.waitedMs, kLongestWaitMs);
  EXPECT_LT(access.waitedMs, 2 * kLongestWaitMs);
}

TEST_F(DatabaseFile, TheStatesOfTheSidecar) {
  write("[a]\n");
  EXPECT_EQ(state(), DatabaseState::SidecarMissing);
  EXPECT_EQ(read().bytes, "[a]\n");
  WriteBytes(sidecar, "0123456789abcde");
  EXPECT_EQ(state(), DatabaseState::SidecarShort);
  EXPECT_EQ(read().bytes, "");
  unlink(sidecar.c_str());
  ASSERT_EQ(mkdir(sidecar.c_str(), 0777), 0);
  EXPECT_EQ(state(), DatabaseState::SidecarDirectory);
}

TEST_F(DatabaseFile, WhatIsNoFileIsUnreadable) {
  struct {
    std::function<void()> make;
    int error;
  } rows[] = {{[&] { mkdir(file.c_str(), 0777); }, EISDIR},
              {[&] { mkfifo(file.c_str(), 0666); }, ENXIO},
              {[&] { EXPECT_EQ(symlink("vlt.vlr", file.c_str()), 0); }, ELOOP}};
  for (const auto& row : rows) {
    row.make();
    DatabaseBytes found = read();
    EXPECT_EQ(found.database.state, DatabaseState::Unreadable);
    EXPECT_EQ(found.database.error, row.error);
    EXPECT_EQ(found.database.failedPath, file);
    remove(file.c_str());
  }
}

TEST_F(DatabaseFile, WithoutTheRightItIsUnreadable) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs root, to become a user without rights";
  write("[a]\n");
  ASSERT_EQ(chmod(file.c_str(), 0600), 0);
  Child child([&] {
    if (seteuid(65534) != 0) return 2;
    DatabaseBytes found = read();
    return found.database.state == DatabaseState::Unreadable && found.database.error == EACCES ? 0
                                                                                               : 1;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST_F(DatabaseFile, ASaveBetweenFileAndSidecarIsReadAgain) {
  write("[old]\n");
  seal();
  access.beforeRead = [&](int read) {
    if (read == 1) {
      WriteBytes(file + "TMP", "[new]\n");
      rename((file + "TMP").c_str(), file.c_str());
    }
    if (read == 3) seal();
  };
  DatabaseBytes found = read();
  EXPECT_EQ(found.database.state, DatabaseState::Sound);
  EXPECT_EQ(found.bytes, "[new]\n");
  EXPECT_EQ(access.reads, 3);
}

TEST_F(DatabaseFile, AFileThatIsReplacedAfterItWasReadIsReadAgain) {
  write("[old]\n");
  seal();
  access.afterRead = [&](int read) {
    if (read != 1) return;
    WriteBytes(file + "TMP", "[new]\n");
    rename((file + "TMP").c_str(), file.c_str());
    seal();
  };
  DatabaseBytes found = read();
  EXPECT_EQ(found.database.state, DatabaseState::Sound);
  EXPECT_EQ(found.bytes, "[new]\n");
}

// A whole file all the same.
TEST_F(DatabaseFile, AFileThatNeverStaysIsReadABoundedNumberOfTimes) {
  access.afterRead = [&](int read) {
    WriteBytes(file + "TMP", "[" + std::to_string(read) + "]\n");
    rename((file + "TMP").c_str(), file.c_str());
  };
  write("[0]\n");
  WriteBytes(sidecar, "0000000000000000");
  DatabaseBytes found = read();
  EXPECT_EQ(found.database.state, DatabaseState::DigestDiffers);
  EXPECT_EQ(found.bytes, "[" + std::to_string(access.reads - 1) + "]\n");
  EXPECT_LT(access.reads, 12);
}

// The next opening takes the second name where the first does not match.
TEST_F(DatabaseFile, TheSecondNameCountsWhereTheFirstDoesNotMatch) {
  write("[whole]\n");
  seal();
  WriteBytes(copy, "[durable]\n");
  EXPECT_EQ(read().bytes, "[whole]\n");
  write("[torn");
  DatabaseBytes found = read();
  EXPECT_EQ(found.bytes, "[durable]\n");
  EXPECT_TRUE(found.database.readFromDurableCopy);
  unlink(file.c_str());
  EXPECT_EQ(read().bytes, "[durable]\n");
  unlink(copy.c_str());
  ASSERT_EQ(symlink(sidecar.c_str(), copy.c_str()), 0);
  EXPECT_EQ(state(), DatabaseState::Missing);
}

// A process that saves as the registrar does, as fast as it can.
TEST_F(DatabaseFile, EverySnapshotBesideAWriterIsWhole) {
  constexpr GuardedIniKind kKind = {true,    E_FAIL,  nullptr, nullptr, nullptr,
                                    nullptr, nullptr, nullptr, nullptr};
  vlt::test::Signal ready;
  Child writer([&]() -> int {
    GuardedIniFile guarded(file, kKind);
    std::unique_ptr<CvlIniMgr> ini;
    if (guarded.open(&ini) < 0) return 1;
    ini->SetDurability(IniDurability::None);
    for (int n = 0;; ++n) {
      std::string number = std::to_string(n);
      for (const char* item : {"first", "last"}) {
        ini->SetItem("a", item, (number + std::string(5000, 'x')).c_str(), true);
      }
      if (guarded.save(*ini) < 0) return 1;
      if (n == 0) ready.notify();
    }
  });
  ASSERT_TRUE(ready.await());
  DatabaseAccess real;
  int sound = 0;
  for (int n = 0; n < 200; ++n) {
    DatabaseBytes found = ReadDatabase(file, real);
    IniDocument document(true);
    ASSERT_EQ(document.Parse(found.bytes), 0);
    std::string first, last;
    document.GetItem("a", "first", &first);
    document.GetItem("a", "last", &last);
    ASSERT_FALSE(first.empty());
    ASSERT_EQ(first, last);
    if (found.database.state == DatabaseState::Sound) ++sound;
  }
  EXPECT_TRUE(writer.running());
  EXPECT_GT(sound, 0);
}

}  // namespace
}  // namespace vlt::snapshot
