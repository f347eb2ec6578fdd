// The database and its sidecar, as a registrar makes, keeps and repairs them.
#include <dirent.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <string.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <filesystem>

#include "source/Common/vltFileSecurity.h"
#include "source/Pharlap/registrarText.h"
#include "tests/support/FileSizeLimit.h"
#include "tests/support/SaveCounter.h"
#include "tests/support/TestRegistrar.h"
#include "vlloader/source/vlloader.h"
#include "zt/fnd/Exception.h"

namespace vlt::test {
namespace {

std::string BadName(const Installation& i) {
  return i.database() + std::string(zt::fnd::AnsiString(vlrGetCurrentLocalTime()).c_str()) + ".bad";
}

TEST(vltPharlapDatabase, AShortSidecarSetsTheDatabaseAsideAndTheNextStartWorks) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "d");
  ASSERT_EQ(StartOnce(i), 0);
  std::string contents = ReadBytes(i.database());
  WriteBytes(i.sidecar(), std::string(15, 'x'));
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_TRUE(r->isOpen());
    EXPECT_EQ(Find(*r, kVltdd), E_INVALIDARG);
    EXPECT_TRUE(Names(*r, vltComponentDataDictionary).empty());
    EXPECT_EQ(ReadBytes(i.database()), "");
    EXPECT_FALSE(Exists(i.sidecar()));
    unsigned version = 7;
    EXPECT_EQ(r->GetSchemaVersion(&version), S_OK);
    EXPECT_EQ(version, 0u);
  });
  EXPECT_EQ(ReadBytes(BadName(i)), contents);
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_EQ(Find(*r, kVltdd), S_OK);
    EXPECT_EQ(Find(*r, G(1)), S_OK);
  });
  EXPECT_EQ(Hex(ReadBytes(i.sidecar())), Md5Sum(i.database()));
}

TEST(vltPharlapDatabase, ACopySetAsideEarlierThatDayStays) {
  Installation i;
  ASSERT_EQ(StartOnce(i), 0);
  std::string contents = ReadBytes(i.database());
  WriteBytes(BadName(i), "stale");
  WriteBytes(i.sidecar(), "");
  ASSERT_EQ(StartOnce(i), 0);
  EXPECT_EQ(ReadBytes(BadName(i)), "stale");
  std::string next = BadName(i);
  EXPECT_EQ(ReadBytes(next.insert(next.size() - 4, ".1")), contents);
}

TEST(vltPharlapDatabase, WithoutASidecarTheFileIsTakenAsItIs) {
  Installation i;
  ASSERT_EQ(StartOnce(i), 0);
  WriteBytes(i.database(), ReadBytes(i.database()) + "[Mine]\nx = 1\n");
  unlink(i.sidecar().c_str());
  ASSERT_EQ(StartOnce(i), 0);
  EXPECT_EQ(DatabaseText(i.database()).raw("Mine", "x"), "1");
  EXPECT_EQ(Hex(ReadBytes(i.sidecar())), Md5Sum(i.database()));
  EXPECT_FALSE(Exists(BadName(i)));
}

// What stops the save between the mark and the digest shows the mark.
TEST_IN_CHILD(vltPharlapDatabase, TheFirstSaveWritesTheMarkBeforeTheFile) {
  Installation i;
  ASSERT_EQ(StartOnce(i), 0);
  LinuxStart r(i);
  unlink(i.sidecar().c_str());
  {
    FileSizeLimit markOnly(16);
    EXPECT_LT(r->SetStorageServerCacheSize(5), 0);
  }
  EXPECT_EQ(ReadBytes(i.sidecar()), "0000000000000000");
  EXPECT_EQ(r->SaveChanges(), S_OK);
  EXPECT_EQ(Hex(ReadBytes(i.sidecar())), Md5Sum(i.database()));
}

TEST(vltPharlapDatabase, TheMarkMatchesNothingAndCostsNothing) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "d");
  ASSERT_EQ(StartOnce(i), 0);
  WriteBytes(i.sidecar(), "0000000000000000");
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_EQ(Find(*r, G(1)), S_OK);
  });
  EXPECT_FALSE(Exists(BadName(i)));
  EXPECT_EQ(Hex(ReadBytes(i.sidecar())), Md5Sum(i.database()));
}

TEST_IN_CHILD(vltPharlapDatabase, AFailedSaveKeepsTheChangeInMemoryAndTheSidecarOld) {
  Installation i;
  ASSERT_EQ(StartOnce(i), 0);
  LinuxStart r(i);
  std::string file = ReadBytes(i.database()), digest = ReadBytes(i.sidecar());
  {
    FileSizeLimit full(16);
    EXPECT_LT(r->SetStorageServerCacheSize(5), 0);
  }
  unsigned size = 0;
  EXPECT_EQ(r->GetStorageServerCacheSize(&size), S_OK);
  EXPECT_EQ(size, 5u);
  EXPECT_EQ(ReadBytes(i.database()), file);
  EXPECT_EQ(ReadBytes(i.sidecar()), digest);
  EXPECT_EQ(r->SaveChanges(), S_OK);
  EXPECT_EQ(DatabaseText(i.database()).raw("KOR", "CacheSize"), "5");
}

TEST(vltPharlapDatabase, ADifferingDigestKeepsTheContents) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "d");
  ASSERT_EQ(StartOnce(i), 0);
  WriteBytes(i.database(), ReadBytes(i.database()) + "[Mine]\nx = 1\n");
  SaveCounter saves(i.root(), "vlt.vlr");
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_EQ(Find(*r, G(1)), S_OK);
  });
  EXPECT_EQ(saves.count(), 1);  // that of the built-in dictionary: nothing is merged again
  EXPECT_FALSE(Exists(BadName(i)));
  EXPECT_EQ(DatabaseText(i.database()).raw("Mine", "x"), "1");
  EXPECT_EQ(Hex(ReadBytes(i.sidecar())), Md5Sum(i.database()));
}

constexpr char kUtf16[] = "\xFF\xFE[\0K\0]\0";

TEST(vltPharlapDatabase, WhatCannotBeParsedIsSetAsideAndEverythingRegisteredAnew) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "d");
  ASSERT_EQ(StartOnce(i), 0);
  std::string damaged(kUtf16, sizeof kUtf16 - 1);
  WriteBytes(i.database(), damaged);
  unlink(i.sidecar().c_str());
  ExpectInChild([&] {
    LinuxStart r(i);
    EXPECT_EQ(Find(*r, kVltdd), S_OK);
    EXPECT_EQ(Find(*r, G(1)), S_OK);
  });
  EXPECT_EQ(ReadBytes(BadName(i)), damaged);
  EXPECT_EQ(Hex(ReadBytes(i.sidecar())), Md5Sum(i.database()));
}

// The digest speaks first; the file is only found to be unreadable by the second opening, whose
// failure is the caller's.
TEST_IN_CHILD(vltPharlapDatabase, DamageWithAStaleDigestIsRaisedOnceAndThenHealed) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "d");
  ASSERT_EQ(StartOnce(i), 0);
  std::string damaged(kUtf16, sizeof kUtf16 - 1);
  WriteBytes(i.database(), damaged);
  EXPECT_THROW(LinuxStart r(i), int);
  EXPECT_EQ(ReadBytes(BadName(i)), damaged);
  EXPECT_FALSE(Exists(i.sidecar()));
  LinuxStart again(i);
  EXPECT_EQ(Find(*again, G(1)), S_OK);
}

TEST(vltPharlapDatabase, IsOpenUntilTheRegistrarGoesAndFreeThen) {
  Installation i;
  ASSERT_EQ(StartOnce(i), 0);
  Signal open, close, closed, end;
  Child first([&] {
    {
      LinuxStart r(i);
      open.notify();
      if (!close.await()) return 1;
    }
    closed.notify();
    return end.await() ? 0 : 2;
  });
  ASSERT_TRUE(open.await());
  Signal secondOpen;
  Child second([&] {
    LinuxStart r(i);
    secondOpen.notify();
    return 0;
  });
  EXPECT_TRUE(Eventually([&] { return BlockedIn(second.pid(), SYS_flock); }));
  EXPECT_FALSE(secondOpen.await(0));
  close.notify();
  ASSERT_TRUE(closed.await());
  EXPECT_TRUE(secondOpen.await());
  EXPECT_EQ(second.wait(), 0);
  end.notify();
  EXPECT_EQ(first.wait(), 0);
}

TEST_IN_CHILD(vltPharlapDatabase, LeavesNoDescriptorOpen) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "d");
  i.addObjectExpert("E", "Exp", GText(2), "{" + GText(2) + "}:1:{" + GText(3) + "}");
  int before = OpenDescriptors();
  { LinuxStart r(i); }
  EXPECT_EQ(OpenDescriptors(), before);
}

TEST_IN_CHILD(vltPharlapDatabase, TheParentRunsInitWhenTold) {
  Installation i;
  i.addObjectExpert("E", "Exp", GText(2), "{" + GText(2) + "}:1:{" + GText(3) + "}");
  PharlapStart r(i);
  EXPECT_EQ(Find(*r, G(2)), S_OK);
  // Only the subclass fills the maps of binding classes.
  Bound(*r, vltComponentObjectExpert, G(3), VLT_E_NO_COMPONENT);
  Started<AccessiblePharlapRegistrar> idle(S(i.root() + "/other.vlr"), S(i.root()), false);
  EXPECT_EQ(Find(*idle, kVltdd), E_INVALIDARG);
  EXPECT_EQ(idle->SaveChanges(), S_OK);
  EXPECT_FALSE(Exists(i.root() + "/other.vlr"));
}

}  // namespace
// Left by a killed scan, it would otherwise be taken up over what clients save later.
TEST_IN_CHILD(vltPharlapDatabase, ASecondNameThatAKilledScanLeftGoesWithTheNextStart) {
  Installation i;
  ASSERT_EQ(StartOnce(i), 0);
  WriteBytes(i.database() + ".durable", ReadBytes(i.database()));
  LinuxStart r(i);
  EXPECT_FALSE(Exists(i.database() + ".durable"));
}

TEST(vltPharlapDatabase, AScanLeavesNoSecondName) {
  Installation i;
  for (int n = 1; n < 5; ++n) {
    i.addDictionary(("D" + std::to_string(n)).c_str(), ("Dict" + std::to_string(n)).c_str(),
                    GText(n), 3, "d");
  }
  ASSERT_EQ(StartOnce(i), 0);
  EXPECT_FALSE(Exists(i.database() + ".durable"));
}

}  // namespace vlt::test
