#include "source/DurableCopy.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <string>

#include "source/Cmd5vlt.h"
#include "tests/support/Child.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/TempDir.h"

namespace {

using namespace vlt::test;

struct Place {
  TempDir dir;
  std::string file = dir / "x.vlr", copy = file + ".durable", sidecar = dir / "x.vl5";

  explicit Place(const std::string& bytes) { WriteBytes(file, bytes); }

  // As a save does: a new file takes the name.
  void replace(const std::string& bytes) const {
    WriteBytes(dir / "x.TMP", bytes);
    ASSERT_EQ(rename((dir / "x.TMP").c_str(), file.c_str()), 0);
  }
  // The digest of the bytes that the file holds now.
  void sign() const {
    std::string bytes = ReadBytes(file);
    unsigned char digest[16];
    Cmd5vlt md5;
    md5.addString(reinterpret_cast<const unsigned char*>(bytes.data()),
                  static_cast<unsigned>(bytes.size()));
    md5.getDigest(digest);
    WriteBytes(sidecar, std::string(reinterpret_cast<char*>(digest), sizeof digest));
  }
};

TEST(DurableCopy, KeepsTheOldFileUntilTheNewOneIsOnDisk) {
  Place place("old");
  DurableCopy copy(place.file);
  ASSERT_TRUE(copy.begin());
  EXPECT_TRUE(copy.pending());
  place.replace("new");
  EXPECT_EQ(ReadBytes(place.copy), "old");
  EXPECT_TRUE(copy.finish());
  EXPECT_FALSE(copy.pending());
  EXPECT_EQ(ReadBytes(place.file), "new");
  EXPECT_FALSE(Exists(place.copy));
}

TEST(DurableCopy, EndsWithTheObject) {
  Place place("old");
  {
    DurableCopy copy(place.file);
    ASSERT_TRUE(copy.begin());
    place.replace("new");
  }
  EXPECT_FALSE(Exists(place.copy));
}

TEST(DurableCopy, OneThatAKilledProcessLeftIsUsedAgain) {
  Place place("half way");
  WriteBytes(place.copy, "durable");
  DurableCopy copy(place.file);
  EXPECT_TRUE(copy.isLeft());
  ASSERT_TRUE(copy.begin());
  EXPECT_EQ(ReadBytes(place.copy), "durable");
  EXPECT_TRUE(copy.finish());
  EXPECT_FALSE(copy.isLeft());
}

TEST(DurableCopy, WithoutHardLinksThereIsNone) {
  Place place("old");
  Child child([&] {
    if (!FailSystemCall(SYS_linkat, EPERM)) return 1;
    DurableCopy copy(place.file);
    return copy.begin() || copy.pending() ? 2 : 0;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_FALSE(Exists(place.copy));
}

TEST(DurableCopy, AFailedSyncKeepsIt) {
  Place place("old");
  Child child([&] {
    DurableCopy copy(place.file);
    if (!copy.begin()) return 1;
    place.replace("new");
    if (!FailSystemCall(SYS_fsync, EIO)) return 2;
    return copy.finish() || !copy.pending() ? 3 : 0;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ReadBytes(place.copy), "old");
}

TEST(DurableCopy, TakeUpDecidesByTheSidecar) {
  const struct {
    const char* what;
    bool hasCopy, hasSidecar, matches;
    const char* expected;
    bool copyStays;
  } rows[] = {{"no second name", false, true, false, "new", false},
              {"all on disk", true, true, true, "new", true},
              {"not all on disk", true, true, false, "durable", false},
              {"no sidecar yet", true, false, false, "durable", false}};
  for (const auto& row : rows) {
    Place place("other");
    if (row.hasSidecar) place.sign();
    place.replace("new");
    if (row.matches) place.sign();
    if (row.hasCopy) WriteBytes(place.copy, "durable");
    EXPECT_TRUE(DurableCopy::takeUp(place.file)) << row.what;
    EXPECT_EQ(ReadBytes(place.file), row.expected) << row.what;
    EXPECT_EQ(Exists(place.copy), row.copyStays) << row.what;
  }
}

TEST(DurableCopy, TakeUpOfAFileThatWasNeverReplacedDropsTheSecondName) {
  Place place("old");
  ASSERT_EQ(link(place.file.c_str(), place.copy.c_str()), 0);
  EXPECT_TRUE(DurableCopy::takeUp(place.file));
  EXPECT_EQ(ReadBytes(place.file), "old");
  EXPECT_FALSE(Exists(place.copy));
}

TEST(DurableCopy, TakeUpRestoresAFileThatHasGone) {
  Place place("old");
  ASSERT_EQ(rename(place.file.c_str(), place.copy.c_str()), 0);
  EXPECT_TRUE(DurableCopy::takeUp(place.file));
  EXPECT_EQ(ReadBytes(place.file), "old");
}

// Nothing may be decided by a read that failed.
TEST(DurableCopy, TakeUpFailsWhereItCannotRead) {
  Place place("old");
  place.sign();
  WriteBytes(place.copy, "durable");
  Child child([&] {
    if (!FailSystemCall(SYS_read, EIO)) return 1;
    return DurableCopy::takeUp(place.file) ? 2 : 0;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ReadBytes(place.file), "old");
  EXPECT_EQ(ReadBytes(place.copy), "durable");
}

// Other users can write to the directory. What no save leaves must keep no process from its
// database.
TEST(DurableCopy, WhatIsNoFileOfItsOwnIsOutOfTheWay) {
  for (bool matches : {true, false}) {
    for (bool isDirectory : {true, false}) {
      Place place("old");
      if (matches) place.sign();
      if (isDirectory) {
        place.dir.makeDir("x.vlr.durable/inside");
      } else {
        WriteBytes(place.dir / "elsewhere", "planted");
        ASSERT_EQ(symlink((place.dir / "elsewhere").c_str(), place.copy.c_str()), 0);
      }
      EXPECT_TRUE(DurableCopy::takeUp(place.file));
      EXPECT_EQ(ReadBytes(place.file), "old");
      EXPECT_FALSE(Exists(place.copy));
      EXPECT_EQ(Exists(place.copy + ".bad"), isDirectory);
      DurableCopy copy(place.file);
      EXPECT_FALSE(copy.isLeft());
      EXPECT_TRUE(copy.begin());
      EXPECT_EQ(ReadBytes(place.copy), "old");
      EXPECT_TRUE(copy.finish());
    }
  }
}

TEST(DurableCopy, ADirectoryPlantedMeanwhileDoesNotKeepTheSavesFromTheirEnd) {
  Place place("old");
  DurableCopy copy(place.file);
  ASSERT_TRUE(copy.begin());
  ASSERT_EQ(unlink(place.copy.c_str()), 0);
  place.dir.makeDir("x.vlr.durable/inside");
  EXPECT_FALSE(copy.isLeft());
  EXPECT_TRUE(copy.finish());
  EXPECT_FALSE(copy.pending());
}

TEST(DurableCopy, AFileWhoseSecondNameWouldBeTooLongHasNone) {
  TempDir dir;
  std::string file = dir / (std::string(246, 'x') + ".vlr");
  WriteBytes(file, "old");
  EXPECT_TRUE(DurableCopy::takeUp(file));
  DurableCopy copy(file);
  EXPECT_FALSE(copy.isLeft());
  EXPECT_FALSE(copy.begin());
  EXPECT_TRUE(copy.finish());
}

// Any user can make the file as large as the file system allows.
TEST(DurableCopy, AFileThatIsTooLargeToBeReadIsReplacedWithoutReadingItToItsEnd) {
  Place place("old");
  place.sign();
  WriteBytes(place.copy, "durable");
  ASSERT_EQ(truncate(place.file.c_str(), off_t{1} << 40), 0);
  Child child([&] { return DurableCopy::takeUp(place.file) ? 0 : 1; });
  EXPECT_EQ(child.wait(), 0);
  struct stat info;
  ASSERT_EQ(stat(place.file.c_str(), &info), 0);
  EXPECT_EQ(info.st_size, 7);
}

// A second name that cannot be seen for the moment may be there all the same.
TEST(DurableCopy, OneThatCannotBeLookedAtCountsAsLeft) {
  Place place("new");
  WriteBytes(place.copy, "durable");
  Child child([&] {
    DurableCopy copy(place.file);
    for (long call : {SYS_openat, SYS_openat2}) {
      if (!FailSystemCall(call, EMFILE)) return 1;
    }
    return copy.isLeft() && !copy.begin() && copy.pending() ? 0 : 2;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ReadBytes(place.copy), "durable");
}

}  // namespace
