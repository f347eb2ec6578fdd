#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <csignal>
#include <string>

#include "tests/support/Child.h"
#include "tests/support/FailingAlloc.h"
#include "tests/support/TempDir.h"
#include "tests/support/TestDocument.h"

namespace {

using vlt::test::Exists;
using vlt::test::ModeOf;
using vlt::test::OpenDescriptors;
using vlt::test::ReadBytes;
using vlt::test::TempDir;
using vlt::test::WriteBytes;
using ztini::test::Document;
using ztini::test::NewDocument;
using ztini::test::Parse;
using ztini::test::RawValue;

Document Sample(int32_t options) {
  Document doc = NewDocument();
  IniPut(doc.get(), "a", "x", "1", 0);
  IniSetWriteOptions(doc.get(), -1, 32, options);
  return doc;
}

constexpr char kSampleText[] = "[a]\nx = 1\n\n";

bool IsOnlyFile(const TempDir& dir, const std::string& path) {
  return unlink(path.c_str()) == 0 && rmdir(dir.path().c_str()) == 0;
}

TEST(FileWriter, NewFilesAndTheirModes) {
  const struct {
    int32_t options;
    int mode;
  } rows[] = {{8, 0640}, {10, 0640}, {14, 0644}, {26, 0640}};
  for (const auto& row : rows) {
    TempDir dir;
    const std::string path = dir / "a.ini";
    const mode_t mask = umask(026);
    EXPECT_EQ(IniWriteToFile(Sample(row.options).get(), path.c_str()), 0);
    umask(mask);
    EXPECT_EQ(ReadBytes(path), kSampleText);
    EXPECT_EQ(ModeOf(path), row.mode) << row.options;
    EXPECT_TRUE(IsOnlyFile(dir, path)) << row.options;
  }
}

TEST(FileWriter, ExistingFilesKeepTheirMode) {
  for (int32_t options : {8, 10, 14, 26}) {
    TempDir dir;
    const std::string path = dir / "a.ini";
    WriteBytes(path, "much longer than the new contents of the file\n");
    chmod(path.c_str(), 0777);
    EXPECT_EQ(IniWriteToFile(Sample(options).get(), path.c_str()), 0);
    EXPECT_EQ(ReadBytes(path), kSampleText);
    EXPECT_EQ(ModeOf(path), 0777) << options;
    EXPECT_TRUE(IsOnlyFile(dir, path)) << options;
  }
}

TEST(FileWriter, SuccessRemembersPathAndTime) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  Document doc = Sample(14);
  EXPECT_EQ(IniWriteToFile(doc.get(), path.c_str()), 0);
  EXPECT_EQ(doc->fileName.get(), path);
  int64_t seconds = 0;
  EXPECT_EQ(IniGetFileTimestamp(path.c_str(), &seconds), 0);
  EXPECT_EQ(doc->fileTimestamp, seconds);
  EXPECT_EQ(IniIsFileNewer(doc.get()), 0);
}

TEST(FileWriter, BadPaths) {
  Document doc = Sample(14);
  EXPECT_EQ(IniWriteToFile(doc.get(), ""), kIniBadPath);
  EXPECT_EQ(IniWriteToFile(doc.get(), nullptr), kIniBadPath);
  EXPECT_EQ(IniWriteToFile(nullptr, "a.ini"), kIniBadPath);
  EXPECT_EQ(doc->fileName, nullptr);
}

TEST(FileWriter, ADirectoryThatIsMissingOrATargetThatIsADirectory) {
  TempDir dir;
  const std::string missing = dir / "none/a.ini";
  for (int32_t options : {10, 14}) {
    EXPECT_EQ(IniWriteToFile(Sample(options).get(), missing.c_str()), kIniNotReplaceable);
    EXPECT_EQ(IniWriteToFile(Sample(options).get(), dir.path().c_str()), kIniNotReplaceable);
  }
  EXPECT_EQ(IniWriteToFile(Sample(8).get(), missing.c_str()), kIniCannotCreate);
  EXPECT_EQ(IniWriteToFile(Sample(8).get(), dir.path().c_str()), kIniCannotCreate);
  EXPECT_EQ(rmdir(dir.path().c_str()), 0);
}

// As a user whom permissions bind.
int WriteWithoutPrivilege(const std::string& path, int32_t options) {
  if (geteuid() == 0 && (setgid(65534) != 0 || setuid(65534) != 0)) return 98;
  return -IniWriteToFile(Sample(options).get(), path.c_str());
}

TEST(FileWriter, ATargetThatCannotBeWrittenFailsTheProbeUntouched) {
  TempDir dir;
  chmod(dir.path().c_str(), 0777);
  const std::string path = dir / "a.ini";
  WriteBytes(path, "old");
  chmod(path.c_str(), 0444);
  for (int32_t options : {10, 14}) {
    vlt::test::Child child([&] { return WriteWithoutPrivilege(path, options); });
    EXPECT_EQ(child.wait(), 13) << options;
  }
  EXPECT_EQ(ReadBytes(path), "old");
  EXPECT_EQ(ModeOf(path), 0444);
  EXPECT_TRUE(IsOnlyFile(dir, path));
}

TEST(FileWriter, NoRoomForATemporaryLeavesTheTarget) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  WriteBytes(path, "old");
  chmod(path.c_str(), 0666);
  chmod(dir.path().c_str(), 0555);
  vlt::test::Child unique([&] { return WriteWithoutPrivilege(path, 14) == 5003 ? 1 : 2; });
  EXPECT_EQ(unique.wait(), 1);
  vlt::test::Child sibling([&] { return WriteWithoutPrivilege(path, 10) == 5004 ? 1 : 2; });
  EXPECT_EQ(sibling.wait(), 1);
  chmod(dir.path().c_str(), 0755);
  EXPECT_EQ(ReadBytes(path), "old");
  EXPECT_TRUE(IsOnlyFile(dir, path));
}

TEST(FileWriter, ANameWithoutRoomRemovesTheTemporary) {
  for (int32_t options : {10, 14}) {
    TempDir dir;
    const std::string path = dir / "a.ini";
    WriteBytes(path, "old");
    Document doc = NewDocument();
    IniPut(doc.get(), "s", std::string(70, 'n').c_str(), "value value", 0);
    IniSetWriteOptions(doc.get(), 80, 0, options);
    EXPECT_EQ(IniWriteToFile(doc.get(), path.c_str()), kIniNoRoom);
    EXPECT_EQ(doc->fileName, nullptr);
    EXPECT_EQ(ReadBytes(path), "old");
    EXPECT_TRUE(IsOnlyFile(dir, path)) << options;
  }
}

TEST(FileWriter, AFailedDirectWriteDeletesTheTarget) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  WriteBytes(path, "old");
  Document doc = NewDocument();
  IniPut(doc.get(), "s", std::string(70, 'n').c_str(), "value value", 0);
  IniSetWriteOptions(doc.get(), 80, 0, 8);
  EXPECT_EQ(IniWriteToFile(doc.get(), path.c_str()), kIniNoRoom);
  EXPECT_FALSE(Exists(path));
}

// The limit on file sizes stands in for a full disk.
int WriteBeyondTheLimit(const std::string& path, int32_t options) {
  signal(SIGXFSZ, SIG_IGN);
  const rlimit limit = {1000, 1000};
  setrlimit(RLIMIT_FSIZE, &limit);
  Document doc = Sample(options);
  IniPut(doc.get(), "a", "y", std::string(100000, 'v').c_str(), 0);
  return -IniWriteToFile(doc.get(), path.c_str());
}

TEST(FileWriter, AFullDiskLeavesTheTargetAndNoTemporary) {
  for (int32_t options : {10, 14, 26}) {
    TempDir dir;
    const std::string path = dir / "a.ini";
    WriteBytes(path, "old");
    vlt::test::Child child([&] { return WriteBeyondTheLimit(path, options); });
    EXPECT_EQ(child.wait(), 28) << options;
    EXPECT_EQ(ReadBytes(path), "old");
    EXPECT_TRUE(IsOnlyFile(dir, path)) << options;
  }
}

TEST(FileWriter, NamedPipesAndDevicesAreRefusedWithoutWaiting) {
  TempDir dir;
  const std::string pipe = dir / "a.ini";
  ASSERT_EQ(mkfifo(pipe.c_str(), 0666), 0);
  EXPECT_EQ(IniWriteToFile(Sample(26).get(), pipe.c_str()), kIniNotReplaceable);
  EXPECT_EQ(IniWriteToFile(Sample(14).get(), pipe.c_str()), kIniNotReplaceable);
  EXPECT_EQ(IniWriteToFile(Sample(8).get(), pipe.c_str()), kIniCannotCreate);
  const int reader = open(pipe.c_str(), O_RDONLY | O_NONBLOCK);
  EXPECT_EQ(IniWriteToFile(Sample(8).get(), pipe.c_str()), kIniCannotCreate);
  close(reader);
  EXPECT_TRUE(IsOnlyFile(dir, pipe));
}

TEST(FileWriter, LinksAreReplacedByTheFile) {
  TempDir dir;
  const std::string path = dir / "a.ini", real = dir / "real.ini";
  WriteBytes(real, "old");
  chmod(real.c_str(), 0604);
  ASSERT_EQ(symlink(real.c_str(), path.c_str()), 0);
  EXPECT_EQ(IniWriteToFile(Sample(26).get(), path.c_str()), 0);
  EXPECT_EQ(ReadBytes(path), kSampleText);
  EXPECT_EQ(ModeOf(path), 0604);  // not a link any more
  EXPECT_EQ(ReadBytes(real), "old");
}

TEST(FileWriter, ADanglingLinkCountsAsAbsent) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  ASSERT_EQ(symlink((dir / "nowhere").c_str(), path.c_str()), 0);
  EXPECT_EQ(IniWriteToFile(Sample(26).get(), path.c_str()), 0);
  EXPECT_EQ(ReadBytes(path), kSampleText);
  EXPECT_EQ(ModeOf(path) & 0700, 0600);
}

TEST(FileWriter, RelativePathsUseTheWorkingDirectory) {
  TempDir dir;
  ASSERT_EQ(chdir(dir.path().c_str()), 0);
  for (int32_t options : {8, 10, 14}) {
    Document doc = Sample(options);
    IniSetDurability(doc.get(), IniDurability::Synced);
    EXPECT_EQ(IniWriteToFile(doc.get(), "a.ini"), 0) << options;
    EXPECT_EQ(ReadBytes(dir / "a.ini"), kSampleText);
  }
  EXPECT_EQ(ztini_SyncFile("a.ini"), 0);
  ASSERT_EQ(chdir("/"), 0);
  EXPECT_TRUE(IsOnlyFile(dir, dir / "a.ini"));
}

TEST(FileWriter, LongPathsWork) {
  TempDir dir;
  std::string deep;
  for (int i = 0; i < 8; ++i) deep += std::string(i ? "/" : "") + std::string(60, 'd');
  const std::string path = dir.makeDir(deep) + "/a.ini";
  for (int32_t options : {10, 14}) {
    EXPECT_EQ(IniWriteToFile(Sample(options).get(), path.c_str()), 0);
    EXPECT_EQ(ReadBytes(path), kSampleText);
  }
}

// Items without a section come first. What begins one of their names must not be taken for a mark of
// the whole file, which then would be refused, or lose these bytes.
TEST(FileWriter, ANameLikeAByteOrderMarkDoesNotBeginTheFile) {
  for (const std::string name : {"\xFE\xFFname", "\xFF\xFEname", "\xEF\xBB\xBFname"}) {
    TempDir dir;
    WriteBytes(dir / "x.ini", "\n" + name + " = 1\n[s]\na = 2\n");
    Document doc = NewDocument();
    IniSetReadOptions(doc.get(), kIniReadColons);
    ASSERT_EQ(IniReadFromFile(doc.get(), (dir / "x.ini").c_str()), 0);
    IniSetWriteOptions(doc.get(), -1, 32, kIniWriteSpaces | kIniWriteTight);
    for (int round = 0; round < 2; ++round) {
      ASSERT_EQ(IniWriteToFile(doc.get(), (dir / "x.ini").c_str()), 0);
      EXPECT_EQ(ReadBytes(dir / "x.ini"), "\n" + name + " = 1\n[s]\na = 2\n");
      doc = NewDocument();
      IniSetReadOptions(doc.get(), kIniReadColons);
      IniSetWriteOptions(doc.get(), -1, 32, kIniWriteSpaces | kIniWriteTight);
      ASSERT_EQ(IniReadFromFile(doc.get(), (dir / "x.ini").c_str()), 0);
      EXPECT_EQ(RawValue(doc, "(null)", name.c_str()), "1");
    }
    // Behind a mark of the file's own there is nothing to be taken for one.
    IniSetWriteOptions(doc.get(), -1, 32, kIniWriteMark | kIniWriteSpaces | kIniWriteTight);
    ASSERT_EQ(IniWriteToFile(doc.get(), (dir / "x.ini").c_str()), 0);
    EXPECT_EQ(ReadBytes(dir / "x.ini"), "\xEF\xBB\xBF" + name + " = 1\n[s]\na = 2\n");
  }
}

TEST(FileWriter, TheMarkOfAReadFileIsWrittenBackOnlyWhenAskedFor) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  WriteBytes(path, "\xEF\xBB\xBF[a]\nx=1\n");
  Document doc = NewDocument();
  ASSERT_EQ(IniReadFromFile(doc.get(), path.c_str()), 0);
  IniSetWriteOptions(doc.get(), -1, 32, 26);
  EXPECT_EQ(IniWriteToFile(doc.get(), path.c_str()), 0);
  EXPECT_EQ(ReadBytes(path), "[a]\nx = 1\n");
  IniSetWriteOptions(doc.get(), -1, 32, 27);
  EXPECT_EQ(IniWriteToFile(doc.get(), path.c_str()), 0);
  EXPECT_EQ(ReadBytes(path), "\xEF\xBB\xBF[a]\nx = 1\n");
}

TEST(FileWriter, WhatIsWrittenReadsBackThroughAnotherDocument) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  Document doc = NewDocument();
  IniPutStringWithOptions(doc.get(), "s", "text", "a\n\"b\"\t\\", 1, 1);
  IniPutRawString(doc.get(), "s", "long", std::string(65536, 'v').c_str());
  IniPutDouble(doc.get(), "t", "number", 2.5);
  EXPECT_EQ(IniWriteToFile(doc.get(), path.c_str()), 0);
  Document back = NewDocument();
  EXPECT_EQ(IniReadFromFile(back.get(), path.c_str()), 0);
  const char* text = nullptr;
  EXPECT_EQ(IniGetPointerToString(back.get(), "s", "text", &text), 1);
  EXPECT_STREQ(text, "a\n\"b\"\t\\");
  EXPECT_EQ(RawValue(back, "s", "long"), std::string(65536, 'v'));
  double number = 0;
  EXPECT_EQ(IniGetDouble(back.get(), "t", "number", &number), 1);
  EXPECT_EQ(number, 2.5);
}

TEST(FileWriter, EveryFailedAllocationLeavesTheTarget) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  const int descriptors = OpenDescriptors();
  for (int32_t options : {10, 14}) {
    WriteBytes(path, "old");
    for (int number = 1; number < 50; ++number) {
      Document doc = Sample(options);
      ztini::test::FailFromAllocation fail(number);
      const int32_t status = IniWriteToFile(doc.get(), path.c_str());
      EXPECT_EQ(OpenDescriptors(), descriptors);
      if (!fail.failed()) {
        EXPECT_EQ(status, 0);
        EXPECT_GT(number, 3);
        break;
      }
      EXPECT_EQ(status, kIniOutOfMemory) << number;
      EXPECT_EQ(ReadBytes(path), "old") << number;
    }
    EXPECT_EQ(ReadBytes(path), kSampleText);
  }
  EXPECT_TRUE(IsOnlyFile(dir, path));
}

// Saves two states in turn until it is killed.
int SaveForEver(const std::string& path, const vlt::test::Signal& started, int32_t options) {
  Document doc = Sample(options);
  const std::string value[] = {std::string(30000, 'p'), std::string(30000, 'q')};
  for (int round = 0;; ++round) {
    IniPut(doc.get(), "a", "y", value[round % 2].c_str(), 34);
    if (IniWriteToFile(doc.get(), path.c_str()) != 0) return 1;
    if (round == 0) started.notify();
  }
}

TEST(FileWriter, AWriterKilledAtAnyMomentLeavesTheOldOrTheNewFile) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  for (int round = 0; round < 40; ++round) {
    vlt::test::Signal started;
    const int32_t options = round % 2 ? 26 : 14;
    vlt::test::Child child([&] { return SaveForEver(path, started, options); });
    ASSERT_TRUE(started.await());
    for (volatile int spin = 0; spin < round * 20000;) spin = spin + 1;
    child.kill(SIGKILL);
    EXPECT_EQ(child.wait(), 128 + SIGKILL);
    Document doc = NewDocument();
    ASSERT_EQ(IniReadFromFile(doc.get(), path.c_str()), 0);
    const std::string value = RawValue(doc, "a", "y");
    ASSERT_TRUE(value == std::string(30000, 'p') || value == std::string(30000, 'q')) << round;
    ASSERT_EQ(ModeOf(path), 0644) << round;  // as the first save made it
  }
}

TEST(FileWriter, SyncTellsOfFilesThatAreNotThere) {
  TempDir dir;
  EXPECT_EQ(ztini_SyncFile((dir / "none").c_str()), kIniBadPath);
  EXPECT_EQ(ztini_SyncFile(nullptr), kIniBadPath);
  WriteBytes(dir / "a.ini", "x");
  EXPECT_EQ(ztini_SyncFile((dir / "a.ini").c_str()), 0);
}

TEST(FileWriter, RemoveFileIfExists) {
  TempDir dir;
  WriteBytes(dir / "a", "x");
  ztini_RemoveFileIfExists((dir / "a").c_str());
  EXPECT_FALSE(Exists(dir / "a"));
  ztini_RemoveFileIfExists((dir / "a").c_str());
  ztini_RemoveFileIfExists(nullptr);
}

}  // namespace
