#include "source/Common/ZtUtils/General/ztSubStreamArea.h"

#include <gtest/gtest.h>

#include <chrono>

#include "tests/support/FailingHeap.h"
#include "tests/support/InChild.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/StreamBytes.h"

namespace vlt::test {
namespace {

constexpr bool kLongIs8 = sizeof(unsigned long) == 8;

// What attaching the bytes throws; the stream must be as if it had no sub-streams then.
Thrown Loading(const std::string& bytes) {
  MemoryPtr stream = NewMemory();
  Thrown thrown = WhatThrows([&] { stream->AttachBuffer(MallocCopy(bytes), bytes.size(), false); });
  if (thrown != Thrown::Nothing) {
    EXPECT_EQ(Contents(stream.get()), bytes);
    EXPECT_EQ(Count(stream.get()), 0u);
    EXPECT_EQ(Position(stream.get()), 0);
  }
  return thrown;
}

// ---- Writing

TEST(ztSubStreamArea, BytesOfOneSubStream) {
  MemoryPtr stream = MemoryOf("data");
  Made(stream.get(), L"a\u00E9", "xyz");
  EXPECT_EQ(stream->WriteSubStreamInfo(), S_OK);
  EXPECT_EQ(Hexed(Contents(stream.get())),
            "64 61 74 61 "
            "00 01 00 00 00 00 00 00 00 00 00 00 00 "
            "01 00 00 00 "
            "02 00 00 00 61 00 00 00 E9 00 00 00 03 00 00 00 78 79 7A "
            "A1 BB 00 D3 D6 C3 CF 47 B7 52 CB 9F FD 8A BC CC "
            "04 00 00 00 00 00 00 00 ");
  EXPECT_EQ(Count(stream.get()), 0u);  // forgotten
}

TEST(ztSubStreamArea, SubStreamsComeOutSortedByName) {
  MemoryPtr stream = NewMemory();
  for (const wchar_t* name : {L"z", L"B", L"a"}) Made(stream.get(), name, "1");
  stream->WriteSubStreamInfo();
  EXPECT_EQ(Contents(stream.get()),
            WithArea("", {{L"a", "1"}, {L"B", "1"}, {L"z", "1"}}, Width::Writer));
}

TEST(ztSubStreamArea, NestedAreasAreCompleteInTheParents) {
  MemoryPtr stream = MemoryOf("outer");
  CztComPtr<IztStream> one = Made(stream.get(), L"one", "inner");
  Made(Nested(one).get(), L"deep", "core");
  Made(Nested(one).get(), L"");
  stream->WriteSubStreamInfo();
  std::string inner = WithArea("inner", {{L"", ""}, {L"deep", "core"}}, Width::Writer);
  EXPECT_EQ(Contents(stream.get()), WithArea("outer", {{L"one", inner}}, Width::Writer));
  EXPECT_EQ(Contents(one.get()), inner);
}

// The same bytes on both word sizes.
TEST(ztSubStreamArea, BytesOfNestedAreas) {
  MemoryPtr stream = MemoryOf("o");
  Made(Nested(Made(stream.get(), L"s", "i")).get(), L"d", "c");
  EXPECT_EQ(stream->WriteSubStreamInfo(), S_OK);
  EXPECT_EQ(Hexed(Contents(stream.get())),
            "6F "
            "00 01 00 00 00 00 00 00 00 00 00 00 00 01 00 00 00 "
            "01 00 00 00 73 00 00 00 37 00 00 00 "
            "69 "
            "00 01 00 00 00 00 00 00 00 00 00 00 00 01 00 00 00 "
            "01 00 00 00 64 00 00 00 01 00 00 00 63 "
            "A1 BB 00 D3 D6 C3 CF 47 B7 52 CB 9F FD 8A BC CC 01 00 00 00 00 00 00 00 "
            "A1 BB 00 D3 D6 C3 CF 47 B7 52 CB 9F FD 8A BC CC 01 00 00 00 00 00 00 00 ");
}

TEST(ztSubStreamArea, TheAreaStandsAtTheEndWhereverTheCursorIs) {
  MemoryPtr stream = MemoryOf("data");
  Made(stream.get(), L"a", "1");
  stream->Seek(1, ztSeekBegin, nullptr);
  stream->WriteSubStreamInfo();
  EXPECT_EQ(Contents(stream.get()), WithArea("data", {{L"a", "1"}}, Width::Writer));
}

TEST(ztSubStreamArea, ASecondWriteDoesNothing) {
  MemoryPtr stream = MemoryOf("data");
  Made(stream.get(), L"a", "1");
  stream->WriteSubStreamInfo();
  std::string bytes = Contents(stream.get());
  Made(stream.get(), L"b", "2");
  EXPECT_EQ(stream->WriteSubStreamInfo(), S_OK);
  EXPECT_EQ(Contents(stream.get()), bytes);
  EXPECT_EQ(Count(stream.get()), 1u);
}

TEST(ztSubStreamArea, AWriteOfNoneCountsAsTheOne) {
  MemoryPtr stream = MemoryOf("data");
  EXPECT_EQ(stream->WriteSubStreamInfo(), S_OK);
  Made(stream.get(), L"a", "1");
  EXPECT_EQ(stream->WriteSubStreamInfo(), S_OK);
  EXPECT_EQ(Contents(stream.get()), "data");
}

TEST(ztSubStreamArea, ASubStreamBeyond31BitsIsRefusedAndNothingIsLeft) {
  if (!kLongIs8) GTEST_SKIP() << "no address space for such a block";
  MemoryPtr stream = MemoryOf("data");
  Made(stream.get(), L"a", "1");
  CztComPtr<IztStream> large = Made(stream.get(), L"b");
  // Never touched: the pages of a read-only block that no one reads.
  auto block = std::unique_ptr<unsigned char, CztFreeBlock>(
      static_cast<unsigned char*>(calloc(0x80000000u, 1)));
  ASSERT_TRUE(block);
  auto* memory = static_cast<CztMemoryStream*>(large.get());
  ASSERT_EQ(memory->AttachBuffer(block.get(), 0x80000000u, true), S_OK);
  EXPECT_EQ(stream->WriteSubStreamInfo(), E_INVALIDARG);
  EXPECT_EQ(Contents(stream.get()), "data");
}

// ---- Reading

TEST(ztSubStreamArea, AreasWithLongNameLengthsLoad) {
  for (Order order : {Order::Little, Order::Big}) {
    MemoryPtr stream = Attached(
        WithArea("data", {{L"a\u00E9", "xyz"}, {L"", ""}, {L"big", std::string(1000, 'b')}},
                 Width::Reader, order));
    EXPECT_EQ(Contents(stream.get()), "data");
    EXPECT_EQ(Count(stream.get()), 3u);
    EXPECT_EQ(ContentsOf(stream.get(), L"a\u00E9"), "xyz");
    EXPECT_EQ(ContentsOf(stream.get(), L""), "");
    EXPECT_EQ(ContentsOf(stream.get(), L"big"), std::string(1000, 'b'));
    EXPECT_EQ(Position(Opened(stream.get(), L"big").get()), 0);
  }
}

TEST(ztSubStreamArea, NestedAreasLoadAtOnce) {
  std::string core = WithArea("core", {{L"deepest", "!"}}, Width::Reader, Order::Big);
  std::string inner = WithArea("inner", {{L"deep", core}});
  MemoryPtr stream = Attached(WithArea("outer", {{L"one", inner}, {L"two", "2"}}));
  EXPECT_EQ(Contents(stream.get()), "outer");
  CztComPtr<IztStream> one = Opened(stream.get(), L"one");
  EXPECT_EQ(Contents(one.get()), "inner");
  CztComPtr<IztStream> deep = Opened(Nested(one).get(), L"deep");
  EXPECT_EQ(Contents(deep.get()), "core");
  EXPECT_EQ(ContentsOf(Nested(deep).get(), L"deepest"), "!");
}

TEST(ztSubStreamArea, OwnAreasReadBackWhereLongIsFourBytes) {
  MemoryPtr stream = MemoryOf("data");
  CztComPtr<IztStream> one = Made(stream.get(), L"one", "first");
  Made(Nested(one).get(), L"deep", "d");
  Made(stream.get(), L"two", "second");
  stream->WriteSubStreamInfo();
  std::string bytes = Contents(stream.get());
  if (kLongIs8) {
    EXPECT_EQ(Loading(bytes), Thrown::Stream);
    return;
  }
  MemoryPtr again = Attached(bytes);
  EXPECT_EQ(Contents(again.get()), "data");
  EXPECT_EQ(ContentsOf(again.get(), L"two"), "second");
  EXPECT_EQ(ContentsOf(Nested(Opened(again.get(), L"one")).get(), L"deep"), "d");
  EXPECT_EQ(again->WriteSubStreamInfo(), S_OK);
  EXPECT_EQ(Contents(again.get()), bytes);
}

TEST(ztSubStreamArea, OfEqualNamesTheLaterCounts) {
  MemoryPtr stream = Attached(WithArea("", {{L"Name", "1"}, {L"other", "x"}, {L"nAME", "2"}}));
  EXPECT_EQ(Count(stream.get()), 2u);
  EXPECT_EQ(ContentsOf(stream.get(), L"name"), "2");
}

TEST(ztSubStreamArea, TheCursorComesBack) {
  MemoryPtr stream = MemoryOf(WithArea("data", {{L"a", "1"}}));
  stream->Seek(2, ztSeekBegin, nullptr);
  EXPECT_EQ(stream->LoadSubStreamInfo(1), S_OK);
  EXPECT_EQ(Position(stream.get()), 2);
  EXPECT_EQ(stream->LoadSubStreamInfo(1), S_OK);  // a second time: done before
  EXPECT_EQ(Count(stream.get()), 1u);
}

TEST(ztSubStreamArea, NotWritableLeavesTheArea) {
  std::string bytes = WithArea("data", {{L"a", "1"}});
  MemoryPtr stream = MemoryOf(bytes);
  EXPECT_EQ(stream->LoadSubStreamInfo(0), S_OK);
  EXPECT_EQ(Contents(stream.get()), bytes);
  EXPECT_EQ(ContentsOf(stream.get(), L"a"), "1");
  EXPECT_EQ(stream->DeleteSubStream(L"a"), E_FAIL);
}

TEST(ztSubStreamArea, WithoutATrailerThereAreNone) {
  std::string trailer = Trailer(0);
  for (const std::string& bytes :
       {std::string(), std::string("a"), trailer, trailer.substr(1), std::string(25, 'x'),
        "data" + Trailer(-1), WithArea("data", {{L"a", "1"}}) + "x",
        std::string(100, '\0') + kMarkerBytes.substr(0, 15) + "x" + Number(0, 8)}) {
    MemoryPtr stream = MemoryOf(bytes);
    EXPECT_EQ(stream->LoadSubStreamInfo(1), S_FALSE);
    EXPECT_EQ(Contents(stream.get()), bytes);
    EXPECT_EQ(Count(stream.get()), 0u);
    EXPECT_EQ(Position(stream.get()), 0);
  }
}

TEST(ztSubStreamArea, AnAreaAtTheStartLeavesNoData) {
  MemoryPtr stream = Attached(WithArea("", {{L"a", "1"}}));
  EXPECT_EQ(stream->GetBuffer(), nullptr);
  EXPECT_EQ(ContentsOf(stream.get(), L"a"), "1");
}

TEST(ztSubStreamArea, ACountOfNoneIsAnEmptyArea) {
  MemoryPtr stream = Attached(WithArea("data", {}));
  EXPECT_EQ(Contents(stream.get()), "data");
  EXPECT_EQ(Count(stream.get()), 0u);
}

// ---- Damage

TEST(ztSubStreamArea, OffsetsThatCannotBe) {
  for (int64_t offset : {int64_t{-2}, INT64_MIN, INT64_MAX, int64_t{1000}, int64_t{92}}) {
    EXPECT_EQ(Loading(std::string(100, 'd') + Trailer(offset)), Thrown::Stream) << offset;
  }
  EXPECT_EQ(Loading("x" + Trailer(0)), Thrown::Stream);
  EXPECT_EQ(Loading(std::string(100, '\0') + Trailer(87)), Thrown::EndOfStream);  // no count
}

TEST(ztSubStreamArea, CountsAndLengthsThatCannotBe) {
  const std::string head = Header(1), end = Trailer(0);
  const std::string name = LongNumber(1) + std::string("a\0\0\0", 4);
  struct Row {
    const char* what;
    std::string area;
    Thrown thrown;
  };
  for (const Row& row :
       {Row{"negative count", head + Number(0xFFFFFFFF, 4), Thrown::Stream},
        Row{"count beyond the bytes", head + Number(2, 4) + name + Number(0, 4), Thrown::Stream},
        Row{"largest count", head + Number(0x7FFFFFFF, 4) + name + Number(0, 4), Thrown::Stream},
        Row{"name beyond the area", head + Number(1, 4) + LongNumber(4) + Number(0, 12),
            Thrown::Stream},
        Row{"largest name", head + Number(1, 4) + LongNumber(~0ull) + Number(0, 12),
            Thrown::Stream},
        Row{"name times four wraps", head + Number(1, 4) + LongNumber(0x40000001) + Number(0, 12),
            Thrown::Stream},
        Row{"data beyond the area", head + Number(1, 4) + name + Number(2, 4) + "x",
            Thrown::Stream},
        Row{"negative data length", head + Number(1, 4) + name + Number(0x80000000, 4),
            Thrown::Stream},
        Row{"no data length", head + Number(1, 4) + LongNumber(2) + Number(0, 8),
            Thrown::EndOfStream}}) {
    EXPECT_EQ(Loading(row.area + end), row.thrown) << row.what;
  }
}

TEST_IN_CHILD(ztSubStreamArea, HostileLengthsTakeNoMemory) {
  if (kCanLimitMemory) LimitMemoryTo(32 << 20);
  EXPECT_EQ(Loading(Header(1) + Number(1, 4) + LongNumber(0) + Number(0x7FFFFFFF, 4) + Trailer(0)),
            Thrown::Stream);
  EXPECT_EQ(Loading(Header(1) + Number(1, 4) + LongNumber(0x3FFFFFFF) + Number(0, 4) + Trailer(0)),
            Thrown::Stream);
}

// The area cut after each of its bytes, with an intact trailer after the cut.
TEST(ztSubStreamArea, EveryTruncationPointThrows) {
  std::string nested = WithArea("n", {{L"deep", "d"}});
  for (Order order : {Order::Little, Order::Big}) {
    std::string whole = WithArea("data", {{L"a", "xyz"}, {L"bc", nested}}, Width::Reader, order);
    size_t areaSize = whole.size() - 24;
    for (size_t size = 4; size < areaSize; ++size) {
      Thrown thrown = Loading(whole.substr(0, size) + Trailer(4));
      EXPECT_TRUE(thrown == Thrown::Stream || thrown == Thrown::EndOfStream) << size;
    }
    EXPECT_EQ(Loading(whole), Thrown::Nothing);
  }
}

// Which of the two exceptions, by the value that the cut goes through.
TEST(ztSubStreamArea, EveryTruncationPointGivesItsException) {
  const size_t lengthEnd = 17 + sizeof(unsigned long), nameEnd = lengthEnd + 4;
  for (Order order : {Order::Little, Order::Big}) {
    std::string area = Area({{L"a", "xyz"}}, 0, Width::Reader, order);
    area.resize(area.size() - 24);
    ASSERT_EQ(area.size(), nameEnd + 4 + 3);
    for (size_t size = 0; size < area.size(); ++size) {
      Thrown expected = Thrown::Stream;                     // no space for the header
      if (size >= 13) expected = Thrown::EndOfStream;       // in the count
      if (size >= 17) expected = Thrown::Stream;            // a count beyond the bytes
      if (size >= nameEnd) expected = Thrown::EndOfStream;  // in the length of the data
      if (size >= nameEnd + 4) expected = Thrown::Stream;   // in the data
      EXPECT_EQ(Loading("data" + area.substr(0, size) + Trailer(4)), expected) << size;
    }
  }
}

TEST(ztSubStreamArea, EveryTruncationOfTheWholeIsWithoutSubStreams) {
  std::string whole = WithArea("data", {{L"a", "xyz"}});
  for (size_t size = 0; size < whole.size(); ++size) {
    EXPECT_EQ(MemoryOf(whole.substr(0, size))->LoadSubStreamInfo(1), S_FALSE) << size;
  }
}

TEST(ztSubStreamArea, DamageInANestedAreaFailsTheWhole) {
  std::string damaged = "inner" + Trailer(1000);
  EXPECT_EQ(Loading(WithArea("outer", {{L"a", "1"}, {L"b", damaged}})), Thrown::Stream);
}

// Every byte of a valid area changed to each of a few values: an exception or a load, no more.
TEST(ztSubStreamArea, ChangedBytesNeverBreakTheReader) {
  std::string whole = WithArea("data", {{L"a", "xyz"}, {L"bc", WithArea("n", {{L"d", "e"}})}});
  int loaded = 0, refused = 0;
  for (size_t at = 0; at < whole.size(); ++at) {
    for (int value : {0x00, 0x01, 0x7F, 0x80, 0xFF}) {
      std::string changed = whole;
      changed[at] = static_cast<char>(value);
      (Loading(changed) == Thrown::Nothing ? loaded : refused) += 1;
    }
  }
  EXPECT_GT(loaded, 0);
  EXPECT_GT(refused, 0);
}

// ---- Depth

std::string NestedBytes(unsigned levels, const std::string& core) {
  std::string bytes = core;
  for (unsigned i = 0; i < levels; ++i) bytes = WithArea("", {{L"", bytes}});
  return bytes;
}

TEST(ztSubStreamArea, AreasNestUpToTheLimit) {
  EXPECT_EQ(Loading(NestedBytes(CztStreamBaseImp::kDeepestArea, "core")), Thrown::Nothing);
  EXPECT_EQ(Loading(NestedBytes(CztStreamBaseImp::kDeepestArea + 1, "core")), Thrown::Stream);
}

// Bytes that nest as deep as their size allows, built in one pass from the outside.
std::string DeepBytes(unsigned levels) {
  const size_t front = 13 + 4 + sizeof(unsigned long) + 4, level = front + 24;
  std::string bytes;
  for (unsigned i = levels; i > 0; --i) {
    bytes += Header(1) + Number(1, 4) + LongNumber(0) + Number((i - 1) * level, 4);
  }
  for (unsigned i = 0; i < levels; ++i) bytes += Trailer(0);
  return bytes;
}

TEST_IN_CHILD(ztSubStreamArea, DeepNestingNeitherOverflowsTheStackNorTheMemory) {
  EXPECT_EQ(Loading(DeepBytes(3)), Thrown::Nothing);
  if (kCanLimitMemory) LimitMemoryTo(64 << 20);
  EXPECT_EQ(Loading(DeepBytes(20000)), Thrown::Stream);
}

TEST(ztSubStreamArea, TooDeepIsNotWrittenEither) {
  MemoryPtr stream = MemoryOf("data");
  CztComPtr<IztStream> last = Made(stream.get(), L"", "");
  for (unsigned i = 1; i < CztStreamBaseImp::kDeepestArea; ++i) {
    last = Made(Nested(last).get(), L"", "");
  }
  MemoryPtr copy = NewMemory();
  EXPECT_EQ(stream->Clone(copy.get()), S_OK);
  EXPECT_EQ(stream->WriteSubStreamInfo(), S_OK);
  EXPECT_GT(stream->size(), 256u * 40);
  Made(Nested(last).get(), L"", "");
  EXPECT_EQ(copy->Clone(stream.get()), S_OK);
  MemoryPtr deeper = NewMemory();
  CztComPtr<IztStream> top = Made(deeper.get(), L"top");
  EXPECT_EQ(copy->Clone(top.get()), S_OK);
  EXPECT_EQ(deeper->WriteSubStreamInfo(), E_INVALIDARG);
  EXPECT_EQ(Contents(deeper.get()), "");
}

TEST(ztSubStreamArea, ManySubStreamsLoadInProportion) {
  std::string area = Header(1) + Number(100000, 4);
  for (uint32_t i = 0; i < 100000; ++i) {
    std::wstring name = std::to_wstring(i);
    area += AreaEntry({name, "d"});
  }
  MemoryPtr stream = Attached(area + Trailer(0));
  EXPECT_EQ(Count(stream.get()), 100000u);
}

// ---- Memory runs out

TEST(ztSubStreamArea, LoadingWithoutMemoryLeavesTheStream) {
  std::string bytes = WithArea("data", {{L"a", WithArea("1", {{L"deep", "d"}})}, {L"b", "2"}});
  int failures = 0;
  for (int nth = 1;; ++nth) {
    MemoryPtr stream = MemoryOf(bytes);
    Thrown thrown;
    {
      FailAllocation fail(nth);
      thrown = WhatThrows([&] { stream->LoadSubStreamInfo(1); });
      if (!fail.happened()) break;
    }
    ++failures;
    EXPECT_EQ(thrown, Thrown::BadAlloc) << nth;
    EXPECT_EQ(Contents(stream.get()), bytes);
    EXPECT_EQ(Count(stream.get()), 0u);
    EXPECT_EQ(stream->LoadSubStreamInfo(1), S_OK);  // counts as loaded
    EXPECT_EQ(stream->WriteSubStreamInfo(), S_OK);
    EXPECT_EQ(Count(stream.get()), 0u);
    EXPECT_EQ(Contents(stream.get()), bytes);
  }
  EXPECT_GE(failures, 6);
}

}  // namespace
}  // namespace vlt::test
