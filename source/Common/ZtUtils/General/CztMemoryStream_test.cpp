#include "source/Common/ZtUtils/General/CztMemoryStream.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <random>

#include "tests/support/FailingHeap.h"
#include "tests/support/InChild.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/StreamBytes.h"

namespace vlt::test {
namespace {

std::string Fill(size_t n) { return std::string(n, 'x'); }

TEST(CztMemoryStream, StartsEmptyWithOneReference) {
  CztMemoryStream* stream = CztMemoryStream::CreateStream();
  ASSERT_NE(stream, nullptr);
  EXPECT_EQ(stream->GetBuffer(), nullptr);
  EXPECT_EQ(stream->size(), 0u);
  EXPECT_EQ(stream->Flush(), S_OK);
  EXPECT_EQ(Count(stream), 0u);
  EXPECT_EQ(stream->Release(), 0u);
}

TEST(CztMemoryStream, CreateWithoutMemoryGivesNull) {
  FailAllocation fail(1);
  EXPECT_EQ(CztMemoryStream::CreateStream(), nullptr);
}

TEST(CztMemoryStream, UnknownAndFirstInterfaceAreOnePointer) {
  MemoryPtr stream = NewMemory();
  void *unknown = nullptr, *first = nullptr;
  EXPECT_EQ(stream->QueryInterface(IID_IUnknown, &unknown), S_OK);
  EXPECT_EQ(stream->QueryInterface(IID_IztStream, &first), S_OK);
  EXPECT_EQ(unknown, first);
  EXPECT_EQ(stream->Release(), 2u);
  EXPECT_EQ(stream->Release(), 1u);
}

TEST(CztMemoryStream, BlockStartsWith64AndDoubles) {
  MemoryPtr stream = NewMemory();
  Put(stream.get(), Fill(1));
  EXPECT_EQ(stream->capacity(), 64u);
  Put(stream.get(), Fill(63));
  EXPECT_EQ(stream->capacity(), 64u);
  Put(stream.get(), Fill(2));
  EXPECT_EQ(stream->capacity(), 128u);
  Put(stream.get(), Fill(63));
  EXPECT_EQ(stream->capacity(), 256u);
  EXPECT_EQ(stream->size(), 129u);
}

TEST(CztMemoryStream, CapacityDoublesUntilTheDataFits) {
  struct Row {
    uint64_t setSize;
    size_t write;
    uint32_t capacity;
  };
  for (const Row& row : {Row{0, 100, 128}, Row{0, 64, 64}, Row{0, 65, 128}, Row{0, 1000, 1024},
                         Row{100, 101, 200}, Row{100, 201, 400}, Row{1, 5, 8}}) {
    MemoryPtr stream = NewMemory();
    EXPECT_EQ(stream->SetSize(row.setSize), S_OK);
    stream->Seek(0, ztSeekBegin, nullptr);
    Put(stream.get(), Fill(row.write));
    EXPECT_EQ(stream->capacity(), row.capacity) << row.setSize << " " << row.write;
  }
}

TEST(CztMemoryStream, ManySmallWritesTakeLinearTime) {
  MemoryPtr stream = NewMemory();
  for (int i = 0; i < 2000000; ++i) stream->Write("abc", 3, nullptr);
  EXPECT_EQ(stream->size(), 6000000u);
}

TEST(CztMemoryStream, WritesOverAndBeyondWhatIsThere) {
  MemoryPtr stream = MemoryOf("abcdef");
  stream->Seek(2, ztSeekBegin, nullptr);
  Put(stream.get(), "XY");
  EXPECT_EQ(Contents(stream.get()), "abXYef");
  Put(stream.get(), "12345");
  EXPECT_EQ(Contents(stream.get()), "abXY12345");
  EXPECT_EQ(Position(stream.get()), 9);
  EXPECT_EQ(stream->Write(nullptr, 0, nullptr), S_OK);
}

// Lengths on both sides of four, which has a way of its own, at any place of the data.
TEST(CztMemoryStream, RandomWritesLeaveWhatAPlainTextHas) {
  MemoryPtr stream = NewMemory();
  std::mt19937 random(20261122);
  std::string plain;
  for (int i = 0; i < 5000; ++i) {
    const size_t at = random() % 8 == 0 ? random() % (plain.size() + 1) : plain.size();
    stream->Seek(static_cast<int64_t>(at), ztSeekBegin, nullptr);
    std::string piece(random() % 2 == 0 ? 4 : random() % 10, '\0');
    for (char& c : piece) c = static_cast<char>(random());
    unsigned done = 99;
    ASSERT_EQ(stream->Write(piece.data(), static_cast<unsigned>(piece.size()), &done), S_OK);
    ASSERT_EQ(done, piece.size());
    plain.replace(at, std::min(piece.size(), plain.size() - at), piece);
    ASSERT_EQ(stream->size(), plain.size());
    ASSERT_EQ(Position(stream.get()), static_cast<int64_t>(at + piece.size()));
  }
  EXPECT_EQ(Contents(stream.get()), plain);
}

TEST(CztMemoryStream, FourBytesAreRefusedAsAnyOthers) {
  MemoryPtr stream = MemoryOf("abcdef");
  unsigned done = 99;
  EXPECT_EQ(stream->Write(nullptr, 4, &done), E_INVALIDARG);
  EXPECT_EQ(done, 0u);
  stream->Seek(-1, ztSeekBegin, nullptr);
  EXPECT_EQ(stream->Write("1234", 4, nullptr), E_INVALIDARG);
  unsigned char block[8] = {};
  ASSERT_EQ(stream->AttachBuffer(block, sizeof block, true), S_OK);
  EXPECT_EQ(stream->Write("1234", 4, nullptr), E_FAIL);
  EXPECT_EQ(block[0], 0);
}

TEST(CztMemoryStream, ReadGivesWhatThereIs) {
  MemoryPtr stream = MemoryOf("abcdef");
  char buffer[8] = {};
  unsigned done = 99;
  EXPECT_EQ(stream->Read(buffer, 4, &done), S_OK);
  EXPECT_EQ(done, 4u);
  EXPECT_EQ(stream->Read(buffer, 4, &done), ZT_E_END_OF_STREAM);
  EXPECT_EQ(done, 2u);
  EXPECT_EQ(std::string(buffer, 4), "efcd");
  EXPECT_EQ(stream->Read(buffer, 1, &done), ZT_E_END_OF_STREAM);
  EXPECT_EQ(done, 0u);
  EXPECT_EQ(stream->Read(buffer, 0, &done), S_OK);
  EXPECT_EQ(stream->Read(buffer, 1, nullptr), ZT_E_END_OF_STREAM);
}

TEST(CztMemoryStream, ReadWithoutABlockIsAnInvalidArgument) {
  MemoryPtr stream = NewMemory();
  char buffer[1];
  unsigned done = 99;
  EXPECT_EQ(stream->Read(buffer, 1, &done), E_INVALIDARG);
  EXPECT_EQ(done, 0u);
  EXPECT_EQ(stream->Read(buffer, 0, nullptr), E_INVALIDARG);
  EXPECT_EQ(MemoryOf("a")->Read(nullptr, 1, nullptr), E_INVALIDARG);
  EXPECT_EQ(MemoryOf("a")->Write(nullptr, 1, nullptr), E_INVALIDARG);
}

TEST(CztMemoryStream, SeekClampsAtTheEndOnly) {
  struct Row {
    int64_t offset;
    int32_t mode;
    int64_t expected;  // from the cursor 4 of 6 bytes
  };
  for (const Row& row :
       {Row{0, 0, 0}, Row{6, 0, 6}, Row{7, 0, 6}, Row{INT64_MAX, 0, 6}, Row{-1, 0, -1},
        Row{1, 1, 5}, Row{-4, 1, 0}, Row{-5, 1, -1}, Row{3, 1, 6}, Row{INT64_MAX, 1, 6},
        Row{0, 2, 6}, Row{-6, 2, 0}, Row{-7, 2, -1}, Row{1, 2, 6}, Row{INT64_MAX, 2, 6},
        Row{1, 3, 4}, Row{1, -1, 4}, Row{INT64_MIN, 0, INT64_MIN}}) {
    MemoryPtr stream = MemoryOf("abcdef");
    stream->Seek(4, ztSeekBegin, nullptr);
    int64_t position = 99;
    EXPECT_EQ(stream->Seek(row.offset, static_cast<ztSeekMode>(row.mode), &position), S_OK);
    EXPECT_EQ(position, row.expected) << row.offset << " " << row.mode;
  }
}

TEST(CztMemoryStream, PastTheEndThereIsNothingToRead) {
  MemoryPtr stream = MemoryOf("abc");
  stream->Seek(100, ztSeekBegin, nullptr);
  EXPECT_EQ(Position(stream.get()), 3);
  char buffer[1];
  unsigned done = 99;
  EXPECT_EQ(stream->Read(buffer, 1, &done), ZT_E_END_OF_STREAM);
  EXPECT_EQ(done, 0u);
}

TEST(CztMemoryStream, InFrontOfTheStartNothingIsReadOrWritten) {
  for (const MemoryPtr& stream : {MemoryOf("abc"), NewMemory()}) {
    int64_t position = 0;
    stream->Seek(-2, ztSeekBegin, &position);
    EXPECT_EQ(position, -2);
    char buffer[4];
    EXPECT_EQ(stream->Read(buffer, 1, nullptr), E_INVALIDARG);
    EXPECT_EQ(stream->Write("x", 1, nullptr), E_INVALIDARG);
    stream->Seek(2, ztSeekCurrent, &position);
    EXPECT_EQ(position, 0);
    stream->Seek(INT64_MIN, ztSeekBegin, nullptr);
    stream->Seek(INT64_MIN, ztSeekCurrent, &position);
    EXPECT_EQ(position, INT64_MIN);
  }
}

TEST(CztMemoryStream, SetSizeMakesTheBlockExact) {
  MemoryPtr stream = MemoryOf("abcdef");
  stream->Seek(5, ztSeekBegin, nullptr);
  EXPECT_EQ(stream->SetSize(3), S_OK);
  EXPECT_EQ(stream->capacity(), 3u);
  EXPECT_EQ(Contents(stream.get()), "abc");
  EXPECT_EQ(Position(stream.get()), 3);
  stream->Seek(1, ztSeekBegin, nullptr);
  EXPECT_EQ(stream->SetSize(5), S_OK);
  EXPECT_EQ(Position(stream.get()), 1);
  EXPECT_EQ(Contents(stream.get()), std::string("abc\0\0", 5));
}

TEST(CztMemoryStream, BytesThatSetSizeAddsAreZero) {
  MemoryPtr stream = MemoryOf(Fill(60));
  stream->SetSize(10);
  stream->Seek(0, ztSeekEnd, nullptr);
  Put(stream.get(), "y");  // capacity 20, with what the heap left behind
  EXPECT_EQ(stream->SetSize(20), S_OK);
  EXPECT_EQ(Contents(stream.get()), Fill(10) + "y" + std::string(9, '\0'));
}

TEST(CztMemoryStream, SetSizeZeroFreesTheBlock) {
  MemoryPtr stream = MemoryOf("abc");
  EXPECT_EQ(stream->SetSize(0), S_OK);
  EXPECT_EQ(stream->GetBuffer(), nullptr);
  EXPECT_EQ(Contents(stream.get()), "");
  char buffer[1];
  EXPECT_EQ(stream->Read(buffer, 1, nullptr), E_INVALIDARG);
  Put(stream.get(), "new");
  EXPECT_EQ(Contents(stream.get()), "new");
  EXPECT_EQ(stream->capacity(), 64u);
  EXPECT_EQ(NewMemory()->SetSize(0), S_OK);
}

TEST(CztMemoryStream, SizesBeyond32BitsAreInvalid) {
  MemoryPtr stream = MemoryOf("abc");
  EXPECT_EQ(stream->SetSize(0x100000000), E_INVALIDARG);
  EXPECT_EQ(stream->SetSize(UINT64_MAX), E_INVALIDARG);
  stream->Seek(0, ztSeekEnd, nullptr);
  unsigned done = 99;
  // The block would have to double past 32 bits. The bytes are not looked at.
  EXPECT_EQ(stream->Write("x", 0xFFFFFFFF, &done), E_INVALIDARG);
  EXPECT_EQ(done, 0u);
  EXPECT_EQ(Contents(stream.get()), "abc");
  EXPECT_EQ(Position(stream.get()), 3);
  if (sizeof(unsigned long) > 4) {
    unsigned char byte = 0;
    auto beyond = static_cast<unsigned long>(uint64_t{0x100000000});
    EXPECT_EQ(stream->AttachBuffer(&byte, beyond, true), E_INVALIDARG);
  }
  EXPECT_EQ(stream->AttachBuffer(nullptr, 1, true), E_INVALIDARG);
  EXPECT_EQ(Contents(stream.get()), "abc");
}

TEST_IN_CHILD(CztMemoryStream, WithoutMemoryNothingChanges) {
  if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer holds the address space";
  LimitMemoryTo(32 << 20);
  MemoryPtr stream = MemoryOf("abc");
  EXPECT_EQ(stream->SetSize(0x7FFFFFF0), E_FAIL);
  unsigned done = 99;
  EXPECT_EQ(stream->Write("x", 0x40000000, &done), E_FAIL);
  EXPECT_EQ(done, 0u);
  EXPECT_EQ(Contents(stream.get()), "abc");
  MemoryPtr fresh = NewMemory();
  EXPECT_EQ(fresh->Write("x", 0x40000000, &done), E_FAIL);
  EXPECT_EQ(fresh->GetBuffer(), nullptr);
}

// ---- Blocks that come and go

TEST(CztMemoryStream, AReadOnlyBlockRefusesChangesAndIsNotFreed) {
  std::string bytes = "abc";
  auto* block = reinterpret_cast<unsigned char*>(bytes.data());
  {
    MemoryPtr stream = NewMemory();
    EXPECT_EQ(stream->AttachBuffer(block, 3, true), S_OK);
    EXPECT_EQ(stream->GetBuffer(), block);
    EXPECT_EQ(Contents(stream.get()), "abc");
    EXPECT_EQ(stream->Write("x", 1, nullptr), E_FAIL);
    EXPECT_EQ(stream->Write("x", 0, nullptr), E_FAIL);
    EXPECT_EQ(stream->SetSize(2), E_FAIL);
    EXPECT_EQ(stream->SetSize(0), E_FAIL);
    EXPECT_EQ(stream->ClearStreams(), E_FAIL);
    EXPECT_EQ(stream->DeleteSubStream(L"x"), E_FAIL);
  }
  EXPECT_EQ(bytes, "abc");
}

TEST(CztMemoryStream, AReadOnlyBlocksSubStreamsStayReadable) {
  std::string bytes = WithArea("data", {{L"one", "first"}});
  MemoryPtr stream = NewMemory();
  stream->AttachBuffer(reinterpret_cast<unsigned char*>(bytes.data()), bytes.size(), true);
  EXPECT_EQ(Count(stream.get()), 1u);
  EXPECT_EQ(ContentsOf(stream.get(), L"one"), "first");
  EXPECT_EQ(Contents(stream.get()), bytes);  // the area stays
  Put(Opened(stream.get(), L"one").get(), "F");
  EXPECT_EQ(ContentsOf(stream.get(), L"one"), "First");
  EXPECT_EQ(stream->WriteSubStreamInfo(), S_OK);
  EXPECT_EQ(Contents(stream.get()), bytes);
}

TEST(CztMemoryStream, AnOwnedBlockCanChange) {
  MemoryPtr stream = Attached("abc");
  EXPECT_EQ(Position(stream.get()), 0);
  EXPECT_EQ(stream->capacity(), 3u);
  stream->Seek(0, ztSeekEnd, nullptr);
  Put(stream.get(), "d");
  EXPECT_EQ(stream->capacity(), 6u);
  EXPECT_EQ(Contents(stream.get()), "abcd");
}

TEST(CztMemoryStream, AttachFreesTheOwnedBlockBefore) {
  std::string second = "second";
  MemoryPtr stream = Attached("first");
  EXPECT_EQ(
      stream->AttachBuffer(reinterpret_cast<unsigned char*>(second.data()), second.size(), true),
      S_OK);
  EXPECT_EQ(Contents(stream.get()), "second");
  EXPECT_EQ(stream->AttachBuffer(MallocCopy("third"), 5, false), S_OK);
  EXPECT_EQ(Contents(stream.get()), "third");
  EXPECT_EQ(stream->AttachBuffer(stream->GetBuffer(), 2, false), S_OK);  // its own
  EXPECT_EQ(Contents(stream.get()), "th");
  EXPECT_EQ(stream->AttachBuffer(nullptr, 0, false), S_OK);
  EXPECT_EQ(stream->GetBuffer(), nullptr);
}

TEST(CztMemoryStream, AttachLoadsSubStreamsOnceInItsLife) {
  MemoryPtr stream = Attached(WithArea("data", {{L"one", "1"}}));
  EXPECT_EQ(Contents(stream.get()), "data");
  std::string second = WithArea("more", {{L"two", "2"}});
  stream->AttachBuffer(MallocCopy(second), second.size(), false);
  EXPECT_EQ(Contents(stream.get()), second);
  EXPECT_EQ(Count(stream.get()), 1u);
  EXPECT_EQ(ContentsOf(stream.get(), L"one"), "1");
}

TEST(CztMemoryStream, AnEmptyOwnedBlockIsABlock) {
  MemoryPtr stream = Attached("");
  char buffer[1];
  EXPECT_EQ(stream->Read(buffer, 1, nullptr), ZT_E_END_OF_STREAM);
  Put(stream.get(), "a");
  EXPECT_EQ(stream->capacity(), 64u);
}

TEST(CztMemoryStream, ABlockWithADamagedAreaBelongsToTheStreamAllTheSame) {
  std::string bytes = "data" + Trailer(1000);
  MemoryPtr stream = NewMemory();
  unsigned char* block = MallocCopy(bytes);
  EXPECT_EQ(WhatThrows([&] { stream->AttachBuffer(block, bytes.size(), false); }), Thrown::Stream);
  EXPECT_EQ(Contents(stream.get()), bytes);
  EXPECT_EQ(Count(stream.get()), 0u);
}

TEST(CztMemoryStream, DetachHandsOutTheBlock) {
  MemoryPtr stream = MemoryOf("abc");
  unsigned char* block = stream->DetachBuffer();
  EXPECT_EQ(memcmp(block, "abc", 3), 0);
  free(block);
  EXPECT_EQ(stream->GetBuffer(), nullptr);
  EXPECT_EQ(stream->size(), 0u);
  Put(stream.get(), "again");
  EXPECT_EQ(Contents(stream.get()), "again");
  EXPECT_EQ(NewMemory()->DetachBuffer(), nullptr);
}

TEST(CztMemoryStream, DetachWritesTheSubStreamsFirst) {
  MemoryPtr stream = MemoryOf("data");
  Made(stream.get(), L"one", "1");
  std::string expected = WithArea("data", {{L"one", "1"}}, Width::Writer);
  stream->WriteSubStreamInfo();
  ASSERT_EQ(stream->size(), expected.size());
  unsigned char* block = stream->DetachBuffer();
  EXPECT_EQ(std::string(reinterpret_cast<char*>(block), expected.size()), expected);
  free(block);

  MemoryPtr second = NewMemory();
  Made(second.get(), L"", "");
  block = second->DetachBuffer();
  expected = WithArea("", {{L"", ""}}, Width::Writer);
  EXPECT_EQ(std::string(reinterpret_cast<char*>(block), expected.size()), expected);
  free(block);
}

TEST(CztMemoryStream, AStreamThatIsNotDetachedWritesNothing) {
  MemoryPtr stream = MemoryOf("data");
  Made(stream.get(), L"one", "1");
  EXPECT_EQ(Contents(stream.get()), "data");
}

}  // namespace
}  // namespace vlt::test
