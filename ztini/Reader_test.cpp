#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <string>

#include "tests/support/FailingAlloc.h"
#include "tests/support/TempDir.h"
#include "tests/support/TestDocument.h"

namespace {

using vlt::test::TempDir;
using vlt::test::WriteBytes;
using ztini::test::Document;
using ztini::test::FailFromAllocation;
using ztini::test::NewDocument;
using ztini::test::Parse;
using ztini::test::RawValue;
using ztini::test::Show;
using namespace std::string_literals;

void SetTime(const std::string& path, int64_t seconds) {
  timespec times[2] = {};
  times[0].tv_sec = times[1].tv_sec = static_cast<time_t>(seconds);
  times[1].tv_nsec = 999999999;
  ASSERT_EQ(utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
}

TEST(Reader, ByteOrderMarks) {
  const struct {
    std::string bytes;
    int32_t status;
    const char* expected;
  } rows[] = {
      {"", 0, ""},
      {"x", 0, ""},
      {"\xEF", 0, ""},
      {"\xFF", 0, ""},
      {"\xEF\xBB\xBF", 0, ""},
      {"\xEF\xBB\xBF[a]\nx=1\n", 0, "[a@1] x=1@2"},
      {"\xEF\xBB\xBF\n[a]\n", 0, "[a@1]"},
      {"\xEF\xBB[a]\n", 0, ""},
      {"\xFF\xFE", -3, ""},
      {"\xFE\xFF", -3, ""},
      {"\xFF\xFE[\0a\0]\0"s, -3, ""},
      {"\xFE\xFF\0[\0a\0]"s, -3, ""},
      {"\xFF\xFE\0\0"s, -3, ""},
      {"\0\0\xFE\xFF"s, -3, ""},
      {"\xFF\xFE\0"s, -3, ""},
      {"\0\0\xFE"s, 0, ""},
      {"\0\0[a]\nx=1\n"s, 0, "[a@3] x=1@4"},
      {"[a]\nx=1", 0, "[a@1] x=1@2"},
      {"[a]", 0, "[a@1]"},
      {"[a", 0, ""},
      {"\xFE[a]", 0, ""},
      {" \xEF\xBB\xBF=1\n", 0, ""},
  };
  TempDir dir;
  const std::string path = dir / "a.ini";
  for (const auto& row : rows) {
    WriteBytes(path, row.bytes);
    Document doc = NewDocument();
    EXPECT_EQ(IniReadFromFile(doc.get(), path.c_str()), row.status) << row.bytes;
    EXPECT_EQ(Show(doc), row.expected) << row.bytes;
    Document fromMemory = NewDocument();
    EXPECT_EQ(IniReadBytes(fromMemory.get(), row.bytes.data(), row.bytes.size()), row.status);
    EXPECT_EQ(Show(fromMemory), row.expected) << row.bytes;
  }
}

TEST(Reader, AOneByteFileIsParsedFromItsStart) {
  TempDir dir;
  WriteBytes(dir / "a.ini", "x");
  Document doc = NewDocument();
  EXPECT_EQ(IniReadFromFile(doc.get(), (dir / "a.ini").c_str()), 0);
  EXPECT_EQ(doc->firstBadLine, 1);  // the byte was seen as a line
}

TEST(Reader, SuccessRemembersPathAndTime) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  WriteBytes(path, "[a]\n");
  SetTime(path, 1234567);
  Document doc = NewDocument();
  EXPECT_EQ(IniIsFileNewer(doc.get()), kIniEmptyPath);
  EXPECT_EQ(IniReadFromFile(doc.get(), path.c_str()), 0);
  EXPECT_EQ(doc->fileName.get(), path);
  EXPECT_EQ(doc->fileTimestamp, 1234567);
  EXPECT_EQ(IniIsFileNewer(doc.get()), 0);
  SetTime(path, 1234568);
  EXPECT_EQ(IniIsFileNewer(doc.get()), 1);
  SetTime(path, 1234566);
  EXPECT_EQ(IniIsFileNewer(doc.get()), 1);  // older counts as well
  unlink(path.c_str());
  EXPECT_EQ(IniIsFileNewer(doc.get()), kIniBadPath);
}

TEST(Reader, AFailedReadKeepsThePathAndTheOldSections) {
  TempDir dir;
  const std::string good = dir / "good.ini", bad = dir / "bad.ini";
  WriteBytes(good, "[a]\nx=1\n");
  WriteBytes(bad, "\xFF\xFE");
  Document doc = NewDocument();
  ASSERT_EQ(IniReadFromFile(doc.get(), good.c_str()), 0);
  EXPECT_EQ(IniReadFromFile(doc.get(), bad.c_str()), kIniUnsupportedEncoding);
  EXPECT_EQ(IniReadFromFile(doc.get(), (dir / "none.ini").c_str()), kIniCannotOpen);
  EXPECT_EQ(IniReadFromFile(doc.get(), nullptr), kIniCannotOpen);
  EXPECT_EQ(IniReadFromFile(doc.get(), ""), kIniCannotOpen);
  EXPECT_EQ(doc->fileName.get(), good);
  EXPECT_EQ(Show(doc), "[a@1] x=1@2");
  EXPECT_EQ(IniReadFromFile(nullptr, good.c_str()), 0);
}

TEST(Reader, ADirectoryOpensAndFailsToRead) {
  TempDir dir;
  Document doc = NewDocument();
  EXPECT_EQ(IniReadFromFile(doc.get(), dir.path().c_str()), kIniReadFailed);
}

TEST(Reader, ANamedPipeIsRefusedWithoutWaiting) {
  TempDir dir;
  const std::string path = dir / "pipe";
  ASSERT_EQ(mkfifo(path.c_str(), 0666), 0);
  Document doc = NewDocument();
  EXPECT_EQ(IniReadFromFile(doc.get(), path.c_str()), kIniCannotOpen);
  EXPECT_EQ(IniReadFromFile(doc.get(), "/dev/zero"), kIniCannotOpen);
}

TEST(Reader, AnUnseekableStreamGivesItsNegativeResult) {
  int fds[2];
  ASSERT_EQ(pipe(fds), 0);
  FILE* file = fdopen(fds[0], "rb");
  Document doc = Parse("[a]\nx=1\n");
  EXPECT_LT(ztini_IniReadFromFileHelper(doc.get(), file), 0);
  EXPECT_EQ(Show(doc), "[a@1] x=1@2");
  fclose(file);
  close(fds[1]);
}

TEST(Reader, HelperReadsFromTheStartOfTheStream) {
  TempDir dir;
  WriteBytes(dir / "a.ini", "[a]\nx=1\n");
  FILE* file = fopen((dir / "a.ini").c_str(), "rb");
  fseek(file, 5, SEEK_SET);
  Document doc = NewDocument();
  EXPECT_EQ(ztini_IniReadFromFileHelper(doc.get(), file), 0);
  EXPECT_EQ(Show(doc), "[a@1] x=1@2");
  EXPECT_EQ(ztini_IniReadFromFileHelper(doc.get(), nullptr), 0);
  fclose(file);
}

TEST(Reader, AReadErrorLeavesWhatWasReadBefore) {
  struct Source {
    size_t at = 0;
    std::string text;
  } source;
  source.text = "[a]\nx=1\n" + std::string(kLineFileBufferSize, ';') + "\n";
  cookie_io_functions_t functions = {};
  functions.read = [](void* cookie, char* buffer, size_t size) -> ssize_t {
    Source& self = *static_cast<Source*>(cookie);
    if (self.at >= kLineFileBufferSize) return -1;
    const size_t bytes = std::min(size, kLineFileBufferSize - self.at);
    memcpy(buffer, self.text.data() + self.at, bytes);
    self.at += bytes;
    return static_cast<ssize_t>(bytes);
  };
  functions.seek = [](void* cookie, off64_t* to, int) -> int {
    static_cast<Source*>(cookie)->at = static_cast<size_t>(*to);
    return 0;
  };
  FILE* file = fopencookie(&source, "r", functions);
  setvbuf(file, nullptr, _IONBF, 0);
  Document doc = NewDocument();
  EXPECT_EQ(ztini_IniReadFromFileHelper(doc.get(), file), kIniReadFailed);
  EXPECT_EQ(Show(doc), "[a@1] x=1@2");
  fclose(file);
}

TEST(Reader, EveryFailedAllocationIsOutOfMemory) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  WriteBytes(path, "[a]\nx=1\nx=2\ny=3\n[b]\nx=1\nx=2\ny=3\n");
  const int descriptors = vlt::test::OpenDescriptors();
  for (int number = 1; number < 100; ++number) {
    Document doc = NewDocument();
    FailFromAllocation fail(number);
    const int32_t status = IniReadFromFile(doc.get(), path.c_str());
    EXPECT_EQ(vlt::test::OpenDescriptors(), descriptors);
    if (!fail.failed()) {
      EXPECT_EQ(status, 0);
      EXPECT_GT(number, 8);
      return;
    }
    EXPECT_EQ(status, kIniOutOfMemory) << number;
    EXPECT_EQ(doc->fileName, nullptr) << number;
  }
  FAIL() << "never succeeded";
}

TEST(Reader, Timestamps) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  WriteBytes(path, "");
  SetTime(path, 5000000000);
  int64_t seconds = 77;
  EXPECT_EQ(IniGetFileTimestamp("", &seconds), kIniEmptyPath);
  EXPECT_EQ(IniGetFileTimestamp(nullptr, &seconds), kIniEmptyPath);
  EXPECT_EQ(IniGetFileTimestamp((dir / "none").c_str(), &seconds), kIniBadPath);
  EXPECT_EQ(seconds, 77);
  EXPECT_EQ(IniGetFileTimestamp(path.c_str(), &seconds), 0);
  EXPECT_EQ(seconds, 5000000000);
  EXPECT_EQ(IniGetFileTimestamp(path.c_str(), nullptr), 0);
  EXPECT_EQ(IniIsFileNewer(nullptr), kIniEmptyPath);
}

TEST(Reader, PathsOfAnyLengthAreKept) {
  TempDir dir;
  std::string deep;
  for (int i = 0; i < 8; ++i) deep += std::string(i ? "/" : "") + std::string(60, 'd');
  const std::string path = dir.makeDir(deep) + "/a.ini";
  ASSERT_GT(path.size(), 480u);
  WriteBytes(path, "[a]\n");
  Document doc = NewDocument();
  EXPECT_EQ(IniReadFromFile(doc.get(), path.c_str()), 0);
  EXPECT_EQ(doc->fileName.get(), path);
}

}  // namespace
