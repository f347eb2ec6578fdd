#include "source/GuardedIniFile.h"

#include <gtest/gtest.h>
#include <sys/syscall.h>

#include "source/Common/vltFileSecurity.h"
#include "source/Common/vltTestHook.h"
#include "tests/support/ArmedHook.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/FailingHeap.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/String.h"

namespace {

using namespace vlt::test;

constexpr GuardedIniKind kBare = {true,    E_FAIL,  nullptr, nullptr, nullptr,
                                  nullptr, nullptr, nullptr, nullptr};
constexpr GuardedIniKind kPointed = {true,   E_UNEXPECTED, nullptr,   nullptr, "HRESULT Open()",
                                     "open", "retry",      "written", "sealed"};

struct Place {
  TempDir dir;
  std::string file = dir / "x.ini", sidecar = dir / "x.vl5";
  std::unique_ptr<CvlIniMgr> ini;

  HRESULT open(const GuardedIniKind& kind) { return GuardedIniFile(file, kind).open(&ini); }
  HRESULT save(const GuardedIniKind& kind) { return GuardedIniFile(file, kind).save(*ini); }
  std::string badName() const {
    return file + zt::fnd::AnsiString(vlrGetCurrentLocalTime()).c_str() + ".bad";
  }
};

TEST(GuardedIniFile, FileAndSidecarAreSavedTogether) {
  for (const GuardedIniKind& kind : {kBare, kPointed}) {
    Place place;
    ASSERT_EQ(place.open(kind), S_OK);
    EXPECT_FALSE(Exists(place.sidecar));
    ASSERT_EQ(place.ini->SetItem("s", "a", "1", false), S_OK);
    ASSERT_EQ(place.save(kind), S_OK);
    EXPECT_EQ(Hex(ReadBytes(place.sidecar)), Md5Sum(place.file));
    EXPECT_EQ(place.open(kind), S_OK);
    EXPECT_EQ(place.ini->ItemExists("s", "a"), S_OK);
  }
}

TEST(GuardedIniFile, AShortSidecarCostsTheFile) {
  for (const GuardedIniKind& kind : {kBare, kPointed}) {
    Place place;
    WriteBytes(place.file, "[s]\na=1\n");
    WriteBytes(place.sidecar, std::string(15, 'x'));
    EXPECT_EQ(place.open(kind), E_FAIL);
    ASSERT_TRUE(place.ini);
    EXPECT_EQ(place.ini->GetNumberOfSections(), 0);
    EXPECT_EQ(ReadBytes(place.badName()), "[s]\na=1\n");
    EXPECT_FALSE(Exists(place.sidecar));
  }
}

TEST(GuardedIniFile, ADigestThatDiffersCostsNothing) {
  Place place;
  WriteBytes(place.file, "[s]\na=1\n");
  WriteBytes(place.sidecar, std::string(16, 'x'));
  EXPECT_EQ(place.open(kBare), S_OK);
  EXPECT_EQ(place.ini->ItemExists("s", "a"), S_OK);
  EXPECT_EQ(ReadBytes(place.sidecar), std::string(16, 'x'));
}

TEST(GuardedIniFile, ASidecarThatCannotBeReadLeavesTheFile) {
  Place place;
  WriteBytes(place.file, "[s]\na=1\n");
  WriteBytes(place.sidecar, std::string(16, 'x'));
  EXPECT_EQ(InChild([&] {
              place.ini.reset(new CvlIniMgr(CvlIniMgr::LockOnly(place.file)));
              ASSERT_TRUE(FailSystemCall(SYS_read, EIO));
              EXPECT_EQ(place.open(kBare), E_FAIL);
              EXPECT_FALSE(place.ini);
            }),
            0);
  EXPECT_EQ(ReadBytes(place.file), "[s]\na=1\n");
  EXPECT_FALSE(Exists(place.badName()));
}

TEST(GuardedIniFile, AFailedSecondOpeningIsThrownAndLeavesNull) {
  Place place;
  place.dir.makeDir("x.ini");
  EXPECT_THROW(place.open(kBare), int);
  EXPECT_FALSE(place.ini);
}

TEST(GuardedIniFile, OutOfMemoryIsAResultWithASignatureAndThrownWithout) {
  ExpectInArmedChild("open", kFailedAllocation, [] {
    Place place;
    EXPECT_EQ(place.open(kPointed), E_OUTOFMEMORY);
    EXPECT_FALSE(place.ini);
    EXPECT_EQ(place.open(kBare), S_OK);  // passes no point
  });
}

TEST(GuardedIniFile, TheSecondOpeningHasAPointOfItsOwn) {
  ExpectInArmedChild("retry", kFailedAllocation, [] {
    Place place;
    WriteBytes(place.file, "[s]\na=1\n");
    EXPECT_EQ(place.open(kPointed), S_OK);
    WriteBytes(place.sidecar, std::string(16, 'x'));
    EXPECT_EQ(place.open(kPointed), E_OUTOFMEMORY);
    EXPECT_FALSE(place.ini);
  });
}

// Each point ends the process: what is on the disk then is what a crash leaves.
TEST(GuardedIniFile, ASaveMarksWritesAndSealsInThisOrder) {
  struct {
    const char* point;
    bool sealed;
  } rows[] = {{"written", false}, {"sealed", true}};
  for (const auto& row : rows) {
    Place place;
    Child child([&] {
      vlt::hook::Faults faults;
      faults.crash = true;
      if (place.open(kPointed) < 0 || place.ini->SetItem("s", "a", "1", false) < 0) return 2;
      vlt::hook::Arm(row.point, faults);
      place.save(kPointed);
      return 3;  // the point was not passed
    });
    ASSERT_EQ(child.wait(), 0) << row.point;
    EXPECT_NE(ReadBytes(place.file), "") << row.point;
    std::string sidecar = ReadBytes(place.sidecar);
    EXPECT_EQ(sidecar == std::string(16, '0'), !row.sealed) << row.point;
    EXPECT_EQ(Hex(sidecar) == Md5Sum(place.file), row.sealed) << row.point;
  }
}

// The mark is written only where there is no sidecar: an old digest says the same.
TEST(GuardedIniFile, AFailedSaveLeavesTheOldDigest) {
  Place place;
  WriteBytes(place.sidecar, std::string(16, 'x'));
  ASSERT_EQ(place.open(kBare), S_OK);
  ASSERT_EQ(place.ini->SetItem("s", "a", "1", false), S_OK);
  EXPECT_EQ(InChild([&] {
              ASSERT_TRUE(FailSystemCall(SYS_fsync, EIO));
              EXPECT_EQ(place.save(kBare), E_FAIL);
            }),
            0);
  EXPECT_EQ(ReadBytes(place.sidecar), std::string(16, 'x'));
}

TEST(GuardedIniFile, SettingAsideReportsARefusalAndOtherFailuresApart) {
  TempDir dir;
  WriteBytes(dir / "plain", "");
  EXPECT_EQ(GuardedIniFile(dir / "plain/x.ini", kPointed).setAside(), E_FAIL);  // ENOTDIR
  EXPECT_EQ(GuardedIniFile("relative.ini", kPointed).setAside(), E_UNEXPECTED);
  EXPECT_EQ(GuardedIniFile("relative.ini", kBare).setAside(), E_FAIL);
}

TEST(GuardedIniFile, WithoutMemoryTheSidecarIsNotWrittenAndThatIsAResult) {
  TempDir dir;
  // Longer than what a string holds in place, so that the name beside it is an allocation.
  GuardedIniFile file(dir / "x.ini", kPointed);
  bool failed = false;
  {
    FailAllocation failure(1);
    EXPECT_EQ(file.writeSidecar(IniSidecar::kInvalidMark, IniDurability::Synced), E_UNEXPECTED);
    failed = failure.happened();
  }
  EXPECT_TRUE(failed);
  EXPECT_FALSE(Exists(file.sidecar()));
  EXPECT_EQ(file.writeSidecar(IniSidecar::kInvalidMark, IniDurability::Synced), S_OK);
  EXPECT_TRUE(file.hasSidecar());
}

}  // namespace
