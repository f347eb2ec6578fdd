#include "source/vlIniMgr.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <filesystem>
#include <iterator>
#include <optional>
#include <random>
#include <thread>

#include "source/Common/vltFileSecurity.h"
#include "source/IniSidecar.h"
#include "tests/support/Child.h"
#include "tests/support/FileSizeLimit.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/TempDir.h"
#include "tests/support/TestIni.h"
#include "zt/fnd/Exception.h"

namespace {

using namespace vlt::test;

std::string BadName(const std::string& file) {
  return file + zt::fnd::AnsiString(vlrGetCurrentLocalTime()).c_str() + ".bad";
}

std::string Unhex(const std::string& hex) {
  std::string bytes;
  for (size_t i = 0; i < hex.size(); i += 2) {
    bytes += static_cast<char>(std::stoi(hex.substr(i, 2), nullptr, 16));
  }
  return bytes;
}

TEST(vlIniMgr, NewFileIsMadeWithItsDirectoryAndModes) {
  TempDir dir;
  std::string file = dir / "a/b/x.ini";
  ScopedUmask strict(077);
  {
    CvlIniMgr ini = CvlIniMgr::OpenForUpdate(file);
    EXPECT_EQ(ReadBytes(file), "");
    EXPECT_EQ(ModeOf(file), 0777);
    EXPECT_EQ(ModeOf(dir / "a/b"), 0777);
    EXPECT_EQ(ini.Write(), S_OK);  // dirty, and empty
  }
  EXPECT_EQ(ReadBytes(file), "");
  EXPECT_EQ(ModeOf(file), 0777);
}

TEST(vlIniMgr, AnEmptyFileIsCleanAndNotWritten) {
  TempDir dir;
  std::string file = dir / "x.ini";
  WriteBytes(file, "");
  struct stat before, after;
  {
    CvlIniMgr ini = CvlIniMgr::OpenForUpdate(file);
    ASSERT_EQ(stat(file.c_str(), &before), 0);
    EXPECT_EQ(ini.Write(), S_OK);
    ASSERT_EQ(stat(file.c_str(), &after), 0);
    EXPECT_EQ(before.st_ino, after.st_ino);  // A write would have renamed another file over it.
  }
  EXPECT_EQ(ModeOf(file), 0777);
}

TEST(vlIniMgr, AnEmptyFileMatchesTheDigestOfNothing) {
  TempDir dir;
  WriteBytes(dir / "x.ini", "");
  EXPECT_EQ(Open(dir / "x.ini", Unhex("d41d8cd98f00b204e9800998ecf8427e")), 0);
}

TEST(vlIniMgr, ADifferingDigestThrowsAndSetsNothingAside) {
  TempDir dir;
  std::string file = dir / "x.ini";
  WriteBytes(file, "[a]\nb = 1\n");
  WriteBytes(dir / "x.vl5", std::string(16, 'q'));
  EXPECT_EQ(Open(file, std::string(16, 'q')), 1);
  EXPECT_EQ(ReadBytes(file), "[a]\nb = 1\n");
  EXPECT_TRUE(Exists(dir / "x.vl5"));
  EXPECT_FALSE(Exists(BadName(file)));
  EXPECT_EQ(Open(file), 0);  // The lock is free again.
}

TEST(vlIniMgr, AnUnparsableFileIsSetAsideWithItsSidecar) {
  TempDir dir;
  std::string file = dir / "x.ini";
  WriteBytes(file, std::string("\xFF\xFE[\0a\0]\0", 8));
  WriteBytes(dir / "x.vl5", std::string(16, 'q'));
  WriteBytes(BadName(file), "an earlier one of the day");
  EXPECT_EQ(Open(file), 1);
  EXPECT_FALSE(Exists(file));
  EXPECT_FALSE(Exists(dir / "x.vl5"));
  EXPECT_EQ(ReadBytes(BadName(file)), "an earlier one of the day");
  std::string next = BadName(file);
  EXPECT_EQ(ReadBytes(next.insert(next.size() - 4, ".1")).substr(0, 2), "\xFF\xFE");
  EXPECT_EQ(Open(file), 0);
}

TEST(vlIniMgr, APipeOrADeviceInTheFilesPlaceIsLeftAlone) {
  TempDir dir;
  std::string file = dir / "x.ini";
  ASSERT_EQ(mkfifo(file.c_str(), 0640), 0);
  EXPECT_EQ(Open(file), 1);
  EXPECT_EQ(ModeOf(file), 0640);
}

TEST(vlIniMgr, ADirectoryInTheFilesPlaceThrows) {
  TempDir dir;
  dir.makeDir("x.ini");
  EXPECT_EQ(Open(dir / "x.ini"), 1);
  EXPECT_TRUE(Exists(dir / "x.ini"));
}

TEST(vlIniMgr, AFileThatCannotBeOpenedStays) {
  if (geteuid() == 0) {
    // The superuser opens everything; a path through a file fails for everybody.
    TempDir dir;
    WriteBytes(dir / "file", "x");
    EXPECT_EQ(Open(dir / "file/x.ini"), 1);
    EXPECT_EQ(ReadBytes(dir / "file"), "x");
    return;
  }
  TempDir dir;
  std::string file = dir / "x.ini";
  WriteBytes(file, "[a]\nb = 1\n");
  ASSERT_EQ(chmod(file.c_str(), 0), 0);
  EXPECT_EQ(Open(file), 1);
  EXPECT_FALSE(Exists(BadName(file)));
}

TEST(vlIniMgr, RunningOutOfDescriptorsLosesNothing) {
  TempDir dir;
  std::string file = dir / "x.ini";
  WriteBytes(file, "[a]\nb = 1\n");
  Child child([&] {
    // The lock file takes the last one.
    std::vector<int> fds;
    for (int fd; (fd = open("/dev/null", O_RDONLY)) >= 0;) fds.push_back(fd);
    close(fds.back());
    try {
      CvlIniMgr ini = CvlIniMgr::OpenForUpdate(file);
      return 10;
    } catch (int thrown) {
      return thrown;
    } catch (const std::exception&) {
      return 2;
    }
  });
  int result = child.wait();
  EXPECT_TRUE(result == 1 || result == 2) << result;
  EXPECT_EQ(ReadBytes(file), "[a]\nb = 1\n");
  EXPECT_FALSE(Exists(BadName(file)));
}

TEST(vlIniMgr, SymbolicLinksAreReadButNotOpenedUp) {
  TempDir dir;
  WriteBytes(dir / "secret", "[a]\nb = 1\n");
  ASSERT_EQ(chmod((dir / "secret").c_str(), 0600), 0);
  ASSERT_EQ(symlink((dir / "secret").c_str(), (dir / "x.ini").c_str()), 0);
  {
    CvlIniMgr ini = CvlIniMgr::OpenForUpdate(dir / "x.ini");
    EXPECT_EQ(Value(ini, "a", "b"), "1");
  }
  EXPECT_EQ(ModeOf(dir / "secret"), 0600);
}

TEST(vlIniMgr, LockOnlyTouchesNothing) {
  TempDir dir;
  std::string file = dir / "d/x.ini";
  { CvlIniMgr ini(file.c_str(), true, nullptr, true, false); }
  EXPECT_FALSE(Exists(dir / "d"));
}

TEST(vlIniMgr, LockOnlyLeavesWhatIsThere) {
  TempDir dir;
  std::string file = dir / "x.ini", bytes = "\xFF\xFE[";  // which does not parse
  WriteBytes(file, bytes);
  WriteBytes(dir / "x.vl5", std::string(15, 'x'));
  ASSERT_EQ(chmod(file.c_str(), 0600), 0);
  struct stat before, after;
  ASSERT_EQ(stat(file.c_str(), &before), 0);
  {
    unsigned char digest[16] = {};
    CvlIniMgr ini(file.c_str(), true, digest, true, false);
  }
  ASSERT_EQ(stat(file.c_str(), &after), 0);
  EXPECT_EQ(after.st_ino, before.st_ino);
  EXPECT_EQ(after.st_mode, before.st_mode);
  EXPECT_EQ(ReadBytes(file), bytes);
  EXPECT_EQ(ReadBytes(dir / "x.vl5"), std::string(15, 'x'));
  std::filesystem::directory_iterator entries(dir.path()), end;
  EXPECT_EQ(std::distance(entries, end), 2);
}

TEST(vlIniMgr, WritesTheDialectAndReadsItBack) {
  TempDir dir;
  std::string file = dir / "x.ini";
  {
    CvlIniMgr ini = CvlIniMgr::OpenAndSaveAtEnd(file);
    EXPECT_EQ(ini.SetItem("s", "quoted", "a b", true), S_OK);
    EXPECT_EQ(ini.SetItem("s", "plain", "7", false), S_OK);
    EXPECT_EQ(ini.SetItem("s", "escaped", "a\nb", true), S_OK);
  }
  // A new section is set apart in the save that brings it.
  EXPECT_EQ(ReadBytes(file), "[s]\nquoted = \"a b\"\nplain = 7\nescaped = \"a\\nb\"\n\n");
  CvlIniMgr ini = CvlIniMgr::OpenForUpdate(file);
  EXPECT_EQ(Value(ini, "S", "QUOTED"), "a b");
  EXPECT_EQ(Value(ini, "s", "escaped"), "a\nb");
}

TEST(vlIniMgr, WithoutEscapesALineFeedBreaksTheLine) {
  TempDir dir;
  std::string file = dir / "x.ini";
  {
    CvlIniMgr ini(file.c_str(), false, nullptr, true, false);
    EXPECT_EQ(ini.SetItem("s", "i", "a\nb=c", false), S_OK);
  }
  CvlIniMgr ini = CvlIniMgr::OpenRaw(file);
  EXPECT_EQ(Value(ini, "s", "i"), "a");
  EXPECT_EQ(Value(ini, "s", "b"), "c");
}

TEST(vlIniMgr, ItemOperationsAnswerByTheirCodes) {
  TempDir dir;
  std::string file = dir / "x.ini";
  WriteBytes(file, "[s]\na = 1\nb = 2\n[t]\nc = 3\n");
  CvlIniMgr ini = CvlIniMgr::OpenForUpdate(file);
  EXPECT_EQ(ini.GetNumberOfSections(), 2);
  EXPECT_EQ(ini.GetNumberOfItems("s"), 2);
  EXPECT_EQ(ini.GetNumberOfItems("none"), 0);
  EXPECT_EQ(ini.GetNumberOfItems(nullptr), 0);
  EXPECT_EQ(ini.ItemExists("s", "a"), S_OK);
  EXPECT_EQ(ini.ItemExists("s", "c"), E_FAIL);
  EXPECT_EQ(ini.ItemExists(nullptr, "c"), E_FAIL);
  EXPECT_EQ(ini.SectionExists("t"), S_OK);
  EXPECT_EQ(ini.SectionExists("u"), E_FAIL);
  EXPECT_EQ(ini.SectionExists(nullptr), E_POINTER);
  char buffer[16] = "unchanged";
  char* out = buffer;
  char* null = nullptr;
  EXPECT_EQ(ini.GetItem("s", "b", &out), S_OK);
  EXPECT_STREQ(buffer, "2");
  EXPECT_EQ(ini.GetItem("s", "c", &out), E_FAIL);
  EXPECT_EQ(ini.GetItem("s", "b", &null), E_POINTER);
  EXPECT_EQ(ini.GetItem("s", "b", static_cast<char**>(nullptr)), E_POINTER);
  EXPECT_EQ(ini.GetItem(nullptr, "b", &out), E_POINTER);
  EXPECT_EQ(ini.GetItem("s", nullptr, &out), E_POINTER);
  EXPECT_EQ(ini.GetNthSectionName(2, &out), S_OK);
  EXPECT_STREQ(buffer, "t");
  EXPECT_EQ(ini.GetNthSectionName(3, &out), E_FAIL);
  EXPECT_EQ(ini.GetNthSectionName(1, &null), E_POINTER);
  EXPECT_EQ(ini.GetNthItemName("s", 2, &out), S_OK);
  EXPECT_STREQ(buffer, "b");
  EXPECT_EQ(ini.GetNthItemName("s", 0, &out), S_OK);  // the last
  EXPECT_EQ(ini.GetNthItemName("s", 3, &out), E_FAIL);
  EXPECT_EQ(ini.GetNthItemName(nullptr, 1, &out), E_POINTER);
  EXPECT_EQ(ini.SetItem(nullptr, "a", "1", false), E_POINTER);
  EXPECT_EQ(ini.SetItem("s", nullptr, "1", false), E_POINTER);
  EXPECT_EQ(ini.SetItem("s", "a", nullptr, false), E_POINTER);
  EXPECT_EQ(ini.SetItem("s", "  ", "1", false), E_FAIL);
  EXPECT_EQ(ini.EraseItem(nullptr, "a"), E_POINTER);
  EXPECT_EQ(ini.EraseSection(nullptr), E_POINTER);
}

TEST(vlIniMgr, ErasingWhatIsAbsentLeavesTheObjectClean) {
  TempDir dir;
  std::string file = dir / "x.ini";
  WriteBytes(file, "[s]\na=1\n");
  CvlIniMgr ini = CvlIniMgr::OpenForUpdate(file);
  EXPECT_EQ(ini.EraseItem("s", "b"), E_FAIL);
  EXPECT_EQ(ini.EraseSection("t"), E_FAIL);
  EXPECT_EQ(ini.Write(), S_OK);
  EXPECT_EQ(ReadBytes(file), "[s]\na=1\n");  // Not rewritten in the writer's form.
  EXPECT_EQ(ini.EraseItem("s", "a"), S_OK);
  EXPECT_EQ(ini.EraseSection("s"), S_OK);
  EXPECT_EQ(ini.Write(), S_OK);
  EXPECT_EQ(ReadBytes(file), "");
}

TEST(vlIniMgr, ChecksumIsThatOfTheFile) {
  TempDir dir;
  std::string file = dir / "x.ini";
  WriteBytes(file, "[s]\na=1\n");
  CvlIniMgr ini = CvlIniMgr::OpenForUpdate(file);
  unsigned char* digest = nullptr;
  ASSERT_EQ(ini.WriteAndGetChecksum(&digest), S_OK);  // clean: the file as it is
  EXPECT_EQ(Hex(std::string(reinterpret_cast<char*>(digest), 16)), Md5Sum(file));
  EXPECT_EQ(ReadBytes(file), "[s]\na=1\n");
  delete[] digest;
  ini.SetItem("new", "b", "2", true);
  ASSERT_EQ(ini.WriteAndGetChecksum(&digest), S_OK);
  EXPECT_EQ(Hex(std::string(reinterpret_cast<char*>(digest), 16)), Md5Sum(file));
  delete[] digest;
  EXPECT_EQ(Value(ini, "new", "b"), "2");
  EXPECT_EQ(ini.WriteAndGetChecksum(nullptr), E_POINTER);
}

// Opened with its digest, then saved three times: as it was, with other bytes of the same size, and as
// it was at first.
TEST(vlIniMgr, TheDigestIsThatOfWhatIsWritten) {
  TempDir dir;
  std::string file = dir / "x.ini";
  WriteBytes(file, "[s]\na = 1\n");
  const std::string expected = Unhex(Md5Sum(file));
  CvlIniMgr ini(file.c_str(), false, reinterpret_cast<const unsigned char*>(expected.data()), false,
                true);
  for (const char* value : {"1", "2", "1"}) {
    ini.SetItem("s", "a", value, false);
    IniSidecar::Digest digest = {};
    ASSERT_EQ(ini.WriteAndGetDigest(&digest), S_OK);
    EXPECT_EQ(ReadBytes(file), std::string("[s]\na = ") + value + "\n");
    EXPECT_EQ(Hex(std::string(digest.begin(), digest.end())), Md5Sum(file));
  }
}

// Saves that ask for no digest, of as many bytes as were read: the digest that the opening checked is
// not that of the next save.
TEST(vlIniMgr, ASaveWithoutADigestForgetsTheOneThatWasChecked) {
  TempDir dir;
  std::string file = dir / "x.ini";
  const std::string begin = "[s]\na = ";
  for (size_t sizeBytes : {255u, 256u, 257u, 1024u}) {
    const size_t length = sizeBytes - begin.size() - 1;
    WriteBytes(file, begin + std::string(length, '1') + "\n");
    const std::string expected = Unhex(Md5Sum(file));
    CvlIniMgr ini(file.c_str(), false, reinterpret_cast<const unsigned char*>(expected.data()),
                  false, true);
    ini.SetItem("s", "a", std::string(length, '2').c_str(), false);
    EXPECT_EQ(ini.Write(), S_OK);
    EXPECT_EQ(ini.Write(), S_OK);
    IniSidecar::Digest digest = {};
    ASSERT_EQ(ini.WriteAndGetDigest(&digest), S_OK);
    EXPECT_EQ(Hex(std::string(digest.begin(), digest.end())), Md5Sum(file)) << sizeBytes;
  }
}

// The digest goes on from where the text before was the same: edits of its beginning, its middle and
// its end, longer, shorter and of the same size, with saves between them that ask for no digest, fail,
// or find another file, and of files that were opened with their digest.
TEST(vlIniMgr, TheDigestIsThatOfTheFileAfterAnyEdits) {
  TempDir dir;
  const std::string file = dir / "x.ini";
  std::optional<CvlIniMgr> ini;
  ini.emplace(file.c_str(), false, nullptr, false, true);
  IniSidecar::Digest digest = {};
  std::mt19937 random(1);
  auto below = [&](unsigned end) { return static_cast<unsigned>(random() % end); };
  for (int round = 0; round < 200; ++round) {
    if (round > 0 && below(4) == 0) {
      ini.reset();
      ini.emplace(file.c_str(), false, digest.data(), false, true);
    }
    ini->SetDurability(IniDurability::None);
    const std::string section = "s" + std::to_string(below(20));
    if (below(8) == 0) {
      ini->EraseSection(section.c_str());
    } else {
      const std::string item = "item" + std::to_string(below(5));
      const std::string value(below(4) * 20 << below(8), static_cast<char>('a' + below(3)));
      ini->SetItem(section.c_str(), item.c_str(), value.c_str(), true);
    }
    switch (below(12)) {
      case 0:
        // The second one keeps its text.
        EXPECT_EQ(ini->Write(), S_OK);
        EXPECT_EQ(ini->Write(), S_OK);
        break;
      case 1: {
        // No file can take the place of a directory with entries.
        std::filesystem::rename(file, dir / "kept");
        std::filesystem::create_directories(file + "/in");
        IniSidecar::Digest none;
        EXPECT_LT(ini->WriteAndGetDigest(&none), 0);
        std::filesystem::remove_all(file);
        std::filesystem::rename(dir / "kept", file);
        break;
      }
      default:
        break;
    }
    ASSERT_EQ(ini->WriteAndGetDigest(&digest), S_OK) << round;
    ASSERT_EQ(Hex(std::string(digest.begin(), digest.end())), Md5Sum(file)) << round;
  }
}

TEST(vlIniMgr, AVanishedFileFailsTheDigestAndIsSavedAgain) {
  TempDir dir;
  std::string file = dir / "x.ini";
  WriteBytes(file, "[s]\na=1\n");
  CvlIniMgr ini = CvlIniMgr::OpenAndSaveAtEnd(file);
  std::filesystem::remove(file);
  unsigned char* digest = reinterpret_cast<unsigned char*>(&file);
  EXPECT_EQ(ini.WriteAndGetChecksum(&digest), E_FAIL);
  EXPECT_EQ(digest, nullptr);
  EXPECT_EQ(Value(ini, "s", "a"), "1");
  EXPECT_EQ(ini.SetItem("s", "b", "2", false), S_OK);
  ASSERT_EQ(ini.WriteAndGetChecksum(&digest), S_OK);
  delete[] digest;
  EXPECT_EQ(ReadBytes(file), "[s]\na = 1\nb = 2\n");
}

TEST(vlIniMgr, AFileThatSpoiledMeanwhileLeavesTheObjectAsItWas) {
  TempDir dir;
  std::string file = dir / "x.ini";
  WriteBytes(file, "[s]\na=1\n");
  CvlIniMgr ini = CvlIniMgr::OpenForUpdate(file);
  WriteBytes(file, "\xFF\xFE[");
  unsigned char* digest = nullptr;
  EXPECT_EQ(ini.WriteAndGetChecksum(&digest), E_FAIL);
  EXPECT_EQ(Value(ini, "s", "a"), "1");
}

TEST(vlIniMgr, AFailedWriteLeavesFileAndDocument) {
  TempDir dir;
  std::string file = dir / "x.ini";
  WriteBytes(file, "[s]\na=1\n");
  CvlIniMgr ini = CvlIniMgr::OpenForUpdate(file);
  ini.SetItem("s", "a", "2", false);
  FileSizeLimit full(4);
  unsigned char* digest = nullptr;
  EXPECT_EQ(ini.WriteAndGetChecksum(&digest), E_FAIL);
  EXPECT_EQ(ReadBytes(file), "[s]\na=1\n");
  EXPECT_EQ(Value(ini, "s", "a"), "2");
}

TEST(vlIniMgr, SidecarNameCutsAtTheLastPointOfTheWholePath) {
  EXPECT_EQ(CvlIniMgr::SidecarName("/d/vltjar.ini"), "/d/vltjar.vl5");
  EXPECT_EQ(CvlIniMgr::SidecarName("/d.x/file"), "/d.vl5");
  EXPECT_EQ(CvlIniMgr::SidecarName("/d/file"), "/d/file.vl5");
}

// Any user can make the file as large as the file system allows.
TEST_IN_CHILD(vlIniMgr, AFileThatIsTooLargeIsNotReadForItsDigest) {
  TempDir dir;
  std::string file = dir / "x.ini";
  WriteBytes(file, "");
  ASSERT_EQ(truncate(file.c_str(), off_t{1} << 30), 0);
  unsigned char digest[16] = {};
  rusage before = {}, after = {};
  getrusage(RUSAGE_SELF, &before);
  EXPECT_THROW(CvlIniMgr(file.c_str(), false, digest, false, true), int);
  getrusage(RUSAGE_SELF, &after);
  EXPECT_LT(after.ru_maxrss - before.ru_maxrss, 100L << 10);  // in KiB
}

}  // namespace
