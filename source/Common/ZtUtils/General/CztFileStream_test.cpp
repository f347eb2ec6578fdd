#include "source/Common/ZtUtils/General/CztFileStream.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <csignal>
#include <filesystem>

#include "tests/support/FailingHeap.h"
#include "tests/support/InChild.h"
#include "tests/support/StreamBytes.h"
#include "tests/support/TempDir.h"

namespace vlt::test {
namespace {

using zt::fnd::String;
using FilePtr = CztComPtr<CztFileStream>;

constexpr bool kLongIs8 = sizeof(unsigned long) == 8;

enum class Access { None, Read, Write, Both };
enum class Truncate { No, Yes };

FilePtr Open(const std::string& path, Access access, Truncate truncate = Truncate::No) {
  return FilePtr::Attach(
      CztFileStream::CreateStream(String(path.c_str()), truncate == Truncate::Yes,
                                  access == Access::Read || access == Access::Both,
                                  access == Access::Write || access == Access::Both));
}

struct CztFileStreamTest : testing::Test {
  TempDir dir;
  std::string path = dir / "stream";
};

TEST_F(CztFileStreamTest, AccessAndTruncationDecideHowTheFileOpens) {
  struct Row {
    Access access;
    Truncate truncate;
    bool makesMissing;
    std::string contents;  // of a file that held "abc"
  };
  for (const Row& row :
       {Row{Access::Read, Truncate::No, false, "abc"},
        Row{Access::Write, Truncate::No, true, "abc"}, Row{Access::Both, Truncate::No, true, "abc"},
        Row{Access::Write, Truncate::Yes, true, ""}, Row{Access::Both, Truncate::Yes, true, ""},
        Row{Access::None, Truncate::No, false, "abc"}}) {
    unlink(path.c_str());
    EXPECT_EQ(static_cast<bool>(Open(path, row.access, row.truncate)), row.makesMissing);
    EXPECT_EQ(Exists(path), row.makesMissing);
    WriteBytes(path, "abc");
    EXPECT_TRUE(Open(path, row.access, row.truncate));
    EXPECT_EQ(ReadBytes(path), row.contents);
  }
}

TEST_F(CztFileStreamTest, WhatDoesNotOpenGivesNullAndNothingStaysOpen) {
  int before = OpenDescriptors();
  EXPECT_FALSE(Open(dir / "missing", Access::Read));
  EXPECT_FALSE(Open(dir / "no/such/place", Access::Both));
  EXPECT_FALSE(Open(dir.path(), Access::Write));
  EXPECT_EQ(OpenDescriptors(), before);
}

TEST_F(CztFileStreamTest, AFailedInitKeepsNameAndFlags) {
  auto stream = FilePtr::Attach(ZtATLNew<CztFileStream>());
  EXPECT_FALSE(stream->Init(String((dir / "no/file").c_str()), false, true, true));
  char byte = 0;
  EXPECT_EQ(stream->Read(&byte, 1, nullptr), E_INVALIDARG);
  EXPECT_EQ(stream->Write(&byte, 1, nullptr), E_INVALIDARG);
  EXPECT_EQ(stream->Seek(0, ztSeekBegin, nullptr), E_INVALIDARG);
  EXPECT_EQ(stream->SetSize(4), E_INVALIDARG);
  EXPECT_EQ(stream->Flush(), E_INVALIDARG);
  EXPECT_EQ(stream->SetSize(0), E_FAIL);
  dir.makeDir("no");
  EXPECT_EQ(stream->SetSize(0), S_OK);  // opens again by the name that was kept
  EXPECT_TRUE(Exists(dir / "no/file"));
}

TEST_F(CztFileStreamTest, PermissionIsTestedBeforeFileAndBuffer) {
  auto stream = FilePtr::Attach(ZtATLNew<CztFileStream>());
  unsigned done = 99;
  EXPECT_EQ(stream->Read(nullptr, 1, &done), ZT_E_ACCESS_DENIED);
  EXPECT_EQ(done, 0u);
  EXPECT_EQ(stream->Write(nullptr, 1, &done), ZT_E_ACCESS_DENIED);
  EXPECT_EQ(stream->SetSize(0), ZT_E_ACCESS_DENIED);
  EXPECT_EQ(stream->SetSize(1), ZT_E_ACCESS_DENIED);
  WriteBytes(path, "abc");
  EXPECT_EQ(Open(path, Access::Read)->Read(nullptr, 1, nullptr), E_INVALIDARG);
  EXPECT_EQ(Open(path, Access::Read)->Write("x", 1, nullptr), ZT_E_ACCESS_DENIED);
  EXPECT_EQ(Open(path, Access::Write)->Write(nullptr, 1, nullptr), E_INVALIDARG);
  char byte;
  EXPECT_EQ(Open(path, Access::Write)->Read(&byte, 1, nullptr), ZT_E_ACCESS_DENIED);
  EXPECT_EQ(ReadBytes(path), "abc");
}

TEST_F(CztFileStreamTest, WritesAndReadsBytes) {
  {
    FilePtr stream = Open(path, Access::Both);
    Put(stream.get(), "abcdef");
    EXPECT_EQ(Position(stream.get()), 6);
    stream->Seek(1, ztSeekBegin, nullptr);
    Put(stream.get(), "X");
    EXPECT_EQ(stream->Flush(), S_OK);
    EXPECT_EQ(Contents(stream.get()), "aXcdef");
  }
  EXPECT_EQ(ReadBytes(path), "aXcdef");
}

TEST_F(CztFileStreamTest, ReadGivesWhatThereIs) {
  WriteBytes(path, "abcdef");
  FilePtr stream = Open(path, Access::Read);
  char buffer[8] = {};
  unsigned done = 99;
  EXPECT_EQ(stream->Read(buffer, 4, &done), S_OK);
  EXPECT_EQ(done, 4u);
  EXPECT_EQ(stream->Read(buffer, 4, &done), ZT_E_END_OF_STREAM);
  EXPECT_EQ(done, 2u);
  EXPECT_EQ(std::string(buffer, 4), "efcd");
  EXPECT_EQ(stream->Read(buffer, 1, nullptr), ZT_E_END_OF_STREAM);
  EXPECT_EQ(stream->Read(buffer, 0, &done), S_OK);
}

TEST_F(CztFileStreamTest, SeekFollowsTheSystem) {
  WriteBytes(path, "abcdef");
  FilePtr stream = Open(path, Access::Both);
  int64_t position = 99;
  EXPECT_EQ(stream->Seek(100, ztSeekBegin, &position), S_OK);
  EXPECT_EQ(position, 100);  // beyond the end
  EXPECT_EQ(stream->Seek(-1, ztSeekEnd, &position), S_OK);
  EXPECT_EQ(position, 5);
  EXPECT_EQ(stream->Seek(-2, ztSeekCurrent, &position), S_OK);
  EXPECT_EQ(position, 3);
  EXPECT_EQ(stream->Seek(-4, ztSeekCurrent, &position), E_FAIL);
  EXPECT_EQ(stream->Seek(9, static_cast<ztSeekMode>(3), &position), S_OK);
  EXPECT_EQ(position, 0);  // reported, not done
  EXPECT_EQ(Position(stream.get()), 3);
}

TEST_F(CztFileStreamTest, SetSizeKeepsTheCursorInside) {
  WriteBytes(path, "abcdef");
  FilePtr stream = Open(path, Access::Both);
  stream->Seek(2, ztSeekBegin, nullptr);
  EXPECT_EQ(stream->SetSize(8), S_OK);
  EXPECT_EQ(Position(stream.get()), 2);
  EXPECT_EQ(ReadBytes(path), std::string("abcdef\0\0", 8));
  stream->Seek(7, ztSeekBegin, nullptr);
  EXPECT_EQ(stream->SetSize(3), S_OK);
  EXPECT_EQ(Position(stream.get()), 3);
  EXPECT_EQ(ReadBytes(path), "abc");
  EXPECT_EQ(stream->SetSize(uint64_t{INT64_MAX} + 1), E_INVALIDARG);
  // A limit of the process: some file systems take any size.
  ExpectInChild([&] {
    rlimit limit = {80, 80};
    signal(SIGXFSZ, SIG_IGN);
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
    EXPECT_EQ(stream->SetSize(81), E_FAIL);
    EXPECT_EQ(Position(stream.get()), 3);
  });
  EXPECT_EQ(ReadBytes(path), "abc");
}

TEST_F(CztFileStreamTest, SetSizeZeroEmptiesAReadWriteStream) {
  WriteBytes(path, "abcdef");
  FilePtr stream = Open(path, Access::Both);
  stream->Seek(3, ztSeekBegin, nullptr);
  EXPECT_EQ(stream->SetSize(0), S_OK);
  EXPECT_EQ(ReadBytes(path), "");
  Put(stream.get(), "new");
  EXPECT_EQ(Contents(stream.get()), "new");
}

TEST_F(CztFileStreamTest, SetSizeZeroOfAWriteOnlyStreamKeepsContentsAndAllowsReading) {
  WriteBytes(path, "abcdef");
  FilePtr stream = Open(path, Access::Write);
  char buffer[6];
  EXPECT_EQ(stream->Read(buffer, 6, nullptr), ZT_E_ACCESS_DENIED);
  EXPECT_EQ(stream->SetSize(0), S_OK);
  EXPECT_EQ(ReadBytes(path), "abcdef");
  EXPECT_EQ(stream->Read(buffer, 6, nullptr), S_OK);
  EXPECT_EQ(std::string(buffer, 6), "abcdef");
  Put(stream.get(), "g");
  EXPECT_EQ(ReadBytes(path), "abcdefg");
}

TEST_F(CztFileStreamTest, SetSizeZeroOfAWriteOnlyStreamLoadsItsSubStreams) {
  WriteBytes(path, WithArea("data", {{L"one", "1"}}));
  FilePtr stream = Open(path, Access::Write);
  EXPECT_EQ(Count(stream.get()), 0u);
  EXPECT_EQ(stream->SetSize(0), S_OK);
  EXPECT_EQ(ContentsOf(stream.get(), L"one"), "1");
}

TEST_F(CztFileStreamTest, SetSizeZeroOfAWriteOnlyStreamTellsDamagedSubStreams) {
  WriteBytes(path, "data" + Trailer(1000));
  FilePtr stream = Open(path, Access::Write);
  EXPECT_EQ(stream->SetSize(0), E_FAIL);  // damaged ones: the stream itself is open
  char buffer[4];
  EXPECT_EQ(stream->Read(buffer, 4, nullptr), S_OK);
}

TEST_F(CztFileStreamTest, AFullDiskIsTold) {
  ExpectInChild([this] {
    FilePtr stream = Open(path, Access::Both);
    rlimit limit = {6, 6};
    signal(SIGXFSZ, SIG_IGN);
    setrlimit(RLIMIT_FSIZE, &limit);
    unsigned done = 99;
    EXPECT_EQ(stream->Write("abcdefgh", 8, &done), E_FAIL);
    EXPECT_EQ(done, 6u);
    EXPECT_EQ(stream->SetSize(100), E_FAIL);
    EXPECT_EQ(Position(stream.get()), 6);
    EXPECT_EQ(Contents(stream.get()), "abcdef");
  });
}

// ---- Sub-streams in files

TEST_F(CztFileStreamTest, ClosingWritesTheSubStreams) {
  {
    FilePtr stream = Open(path, Access::Both);
    Put(stream.get(), "data");
    Made(stream.get(), L"two", "2");
    Made(stream.get(), L"one", "1");
    EXPECT_EQ(ReadBytes(path), "data");
  }
  EXPECT_EQ(ReadBytes(path), WithArea("data", {{L"one", "1"}, {L"two", "2"}}, Width::Writer));
}

TEST_F(CztFileStreamTest, AWriteOnlyStreamWritesThemToo) {
  { Made(Open(path, Access::Write).get(), L"one", "1"); }
  EXPECT_EQ(ReadBytes(path), WithArea("", {{L"one", "1"}}, Width::Writer));
}

TEST_F(CztFileStreamTest, OpeningForWritingTakesTheAreaIntoMemory) {
  WriteBytes(path, WithArea("data", {{L"one", "1"}, {L"two", "2"}}));
  {
    FilePtr stream = Open(path, Access::Both);
    EXPECT_EQ(Position(stream.get()), 0);
    EXPECT_EQ(ReadBytes(path), "data");
    EXPECT_EQ(ContentsOf(stream.get(), L"two"), "2");
    EXPECT_EQ(stream->DeleteSubStream(L"one"), S_OK);
    stream->Seek(0, ztSeekEnd, nullptr);
    Put(stream.get(), "more");
  }
  EXPECT_EQ(ReadBytes(path), WithArea("datamore", {{L"two", "2"}}, Width::Writer));
}

TEST_F(CztFileStreamTest, OpeningForReadingLeavesTheArea) {
  std::string bytes = WithArea("data", {{L"one", "1"}});
  WriteBytes(path, bytes);
  {
    FilePtr stream = Open(path, Access::Read);
    EXPECT_EQ(ContentsOf(stream.get(), L"one"), "1");
    EXPECT_EQ(Contents(stream.get()), bytes);
    EXPECT_EQ(Made(stream.get(), L"two").get() != nullptr, true);
    EXPECT_EQ(stream->DeleteSubStream(L"one"), E_FAIL);
    EXPECT_EQ(stream->ClearStreams(), E_FAIL);
  }
  EXPECT_EQ(ReadBytes(path), bytes);
}

TEST_F(CztFileStreamTest, TruncatingLoadsNothing) {
  WriteBytes(path, WithArea("data", {{L"one", "1"}}));
  { EXPECT_EQ(Count(Open(path, Access::Both, Truncate::Yes).get()), 0u); }
  EXPECT_EQ(ReadBytes(path), "");
}

TEST_F(CztFileStreamTest, AnAreaAtTheStartEmptiesTheFile) {
  WriteBytes(path, WithArea("", {{L"one", "1"}}));
  FilePtr stream = Open(path, Access::Both);
  EXPECT_EQ(ReadBytes(path), "");
  EXPECT_EQ(ContentsOf(stream.get(), L"one"), "1");
  Put(stream.get(), "data");
  stream = FilePtr();
  EXPECT_EQ(ReadBytes(path), WithArea("data", {{L"one", "1"}}, Width::Writer));
}

TEST_F(CztFileStreamTest, WrittenSubStreamsReadBackWhereLongIsFourBytes) {
  { Made(Open(path, Access::Both).get(), L"one", "1"); }
  std::string bytes = ReadBytes(path);
  if (kLongIs8) {
    EXPECT_EQ(WhatThrows([&] { Open(path, Access::Both); }), Thrown::Stream);
    EXPECT_EQ(WhatThrows([&] { Open(path, Access::Read); }), Thrown::Stream);
    EXPECT_EQ(ReadBytes(path), bytes);
  } else {
    EXPECT_EQ(ContentsOf(Open(path, Access::Both).get(), L"one"), "1");
    EXPECT_EQ(ReadBytes(path), bytes);  // written again at closing
  }
}

TEST_F(CztFileStreamTest, ADamagedAreaThrowsAndLeavesTheFile) {
  std::string bytes = "data" + Trailer(5000);
  WriteBytes(path, bytes);
  int before = OpenDescriptors();
  EXPECT_EQ(WhatThrows([&] { Open(path, Access::Both); }), Thrown::Stream);
  EXPECT_EQ(OpenDescriptors(), before);
  EXPECT_EQ(ReadBytes(path), bytes);
}

TEST_F(CztFileStreamTest, ADirectoryEndsInItsFirstRead) {
  EXPECT_EQ(WhatThrows([&] { Open(dir.path(), Access::Read); }), Thrown::EndOfStream);
}

TEST_F(CztFileStreamTest, ClearStreamsStartsOver) {
  WriteBytes(path, WithArea("data", {{L"one", "1"}}));
  FilePtr stream = Open(path, Access::Both);
  EXPECT_EQ(stream->ClearStreams(), S_OK);
  EXPECT_EQ(Count(stream.get()), 0u);
  EXPECT_EQ(ReadBytes(path), "");
  Made(stream.get(), L"two", "2");
  EXPECT_EQ(stream->WriteSubStreamInfo(), S_OK);
  EXPECT_EQ(ReadBytes(path), WithArea("", {{L"two", "2"}}, Width::Writer));
}

TEST_F(CztFileStreamTest, AnAreaThatDoesNotFitIsTakenBack) {
  for (Access access : {Access::Both, Access::Write}) {
    for (std::string data : {"data", ""}) {
      std::filesystem::remove(path);
      ExpectInChild([&] {
        {
          FilePtr stream = Open(path, access);
          Put(stream.get(), data);
          Made(stream.get(), L"one", std::string(100, 'x'));
          rlimit limit = {80, 80};
          signal(SIGXFSZ, SIG_IGN);
          setrlimit(RLIMIT_FSIZE, &limit);
          EXPECT_EQ(stream->WriteSubStreamInfo(), E_FAIL);
          EXPECT_EQ(Count(stream.get()), 1u);
        }
        EXPECT_EQ(ReadBytes(path), data);
      });
    }
  }
}

TEST_F(CztFileStreamTest, WithoutMemoryTheFileStaysAndNothingLeaks) {
  std::string bytes = WithArea("data", {{L"one", WithArea("1", {{L"deep", "d"}})}});
  WriteBytes(path, bytes);
  int failures = 0;
  for (int nth = 1;; ++nth) {
    FailAllocation fail(nth);
    Thrown thrown = Thrown::Nothing;
    try {
      thrown = WhatThrows([&] { Open(path, Access::Read); });
    } catch (int result) {
      EXPECT_EQ(result, E_OUTOFMEMORY);
      EXPECT_EQ(nth, 1);
      thrown = Thrown::BadAlloc;
    }
    if (!fail.happened()) break;
    EXPECT_EQ(thrown, Thrown::BadAlloc) << nth;
    ++failures;
  }
  EXPECT_GE(failures, 6);
  EXPECT_EQ(ReadBytes(path), bytes);
}

}  // namespace
}  // namespace vlt::test
