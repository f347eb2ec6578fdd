#include "source/Common/ZtUtils/General/ztTypedStream.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <functional>

#include "tests/support/InChild.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/StreamBytes.h"

namespace vlt::test {
namespace {

using zt::fnd::AnsiString;
using zt::fnd::String;

constexpr bool kLongIs8 = sizeof(unsigned long) == 8;
constexpr GUID kGuid = {
    0x00112233, 0x4455, 0x6677, {0x88, 0x99, 0xAA, 0xBB, 0xCC, 0xDD, 0xEE, 0xFF}};

TEST(ztTypedStream, HeaderOverAnEmptyStreamIsThirteenZeros) {
  MemoryPtr stream = NewMemory();
  CztOutStream out(stream.get());
  EXPECT_EQ(Contents(stream.get()), std::string(13, '\0'));
  EXPECT_EQ(out.GetByteOrder(), 0);
}

TEST(ztTypedStream, HeaderHasTheGivenVersion) {
  MemoryPtr stream = NewMemory();
  CztOutStream out(stream.get(), 1, 0x01020304, -2);
  EXPECT_EQ(Hexed(Contents(stream.get())), "00 01 00 00 00 04 03 02 01 FE FF FF FF ");
  EXPECT_EQ(out.GetMajorVersion(), 1);
  EXPECT_EQ(out.GetMinorVersion(), 0x01020304);
  EXPECT_EQ(out.GetSequenceNumber(), -2);
}

struct ModuleVersion {
  ModuleVersion(int major, int minor, int sequence) {
    CztStreamBase::SetModuleStreamVersion(major, minor, sequence);
  }
  ~ModuleVersion() { CztStreamBase::SetModuleStreamVersion(0, 0, 0); }
};

TEST(ztTypedStream, ModuleVersionStandsInTheHeader) {
  ModuleVersion version(3, 4, 5);
  MemoryPtr stream = NewMemory();
  CztOutStream out(stream.get());
  EXPECT_EQ(Contents(stream.get()), Header(3, 4, 5));
}

TEST(ztTypedStream, CopyWritesOneMoreHeader) {
  ModuleVersion version(3, 4, 5);
  MemoryPtr stream = NewMemory();
  CztOutStream out(stream.get(), 1, 1, 1);
  CztOutStream inner(out);
  CztOutStream versioned(out, 7, 8, 9);
  EXPECT_EQ(Contents(stream.get()), Header(1, 1, 1) + Header(3, 4, 5) + Header(7, 8, 9));
  EXPECT_EQ(out.GetMajorVersion(), 1);
  EXPECT_EQ(versioned.GetMajorVersion(), 7);
}

TEST(ztTypedStream, ReaderTakesTheWritersVersionAndOrder) {
  ModuleVersion version(3, 4, 5);
  MemoryPtr stream = MemoryOf(Header(1, 2, 0xFFFFFFFF) + Header(7, 8, 9, Order::Big));
  CztInStream in(stream.get());
  EXPECT_EQ(in.GetMajorVersion(), 1);
  EXPECT_EQ(in.GetMinorVersion(), 2);
  EXPECT_EQ(in.GetSequenceNumber(), -1);
  EXPECT_EQ(in.GetByteOrder(), 0);
  CztInStream inner(in);
  EXPECT_EQ(inner.GetMajorVersion(), 7);
  EXPECT_EQ(inner.GetSequenceNumber(), 9);
  EXPECT_EQ(inner.GetByteOrder(), 1);
  EXPECT_EQ(in.GetByteOrder(), 0);
  EXPECT_EQ(Position(stream.get()), 26);
}

TEST(ztTypedStream, StreamIsNotCounted) {
  ForeignStream stream;
  stream.input = Header();
  {
    CztOutStream out(&stream);
    CztInStream in(&stream);
    EXPECT_EQ(stream.references, 1);
  }
  EXPECT_EQ(stream.references, 1);
}

TEST(ztTypedStream, ValuesAreOneWriteEach) {
  ForeignStream stream;
  CztOutStream out(&stream);
  out << int32_t{-2} << 0x89ABCDEFu << int16_t{-2} << uint16_t{0x1234}
      << static_cast<unsigned char>(7) << int64_t{-2} << uint64_t{0x0102030405060708}
      << AnsiString("ab") << AnsiString();
  ztWriteStreamValue<int>(out, 5);
  std::vector<std::string> hexed;
  for (const std::string& piece : stream.pieces) hexed.push_back(Hexed(piece));
  EXPECT_EQ(hexed,
            (std::vector<std::string>{"00 ", "00 00 00 00 ", "00 00 00 00 ", "00 00 00 00 ",
                                      "FE FF FF FF ", "EF CD AB 89 ", "FE FF ", "34 12 ", "07 ",
                                      "FE FF FF FF FF FF FF FF ", "08 07 06 05 04 03 02 01 ",
                                      "02 00 00 00 ", "61 62 ", "00 00 00 00 ", "05 00 00 00 "}));
}

TEST(ztTypedStream, GuidFieldsAndBytesAreWrittenOneByOne) {
  ForeignStream stream;
  CztOutStream out(&stream);
  out << kGuid;
  std::string all;
  for (const std::string& piece : stream.pieces) all += piece;
  EXPECT_EQ(Hexed(all.substr(13)), "33 22 11 00 55 44 77 66 88 99 AA BB CC DD EE FF ");
  EXPECT_EQ(stream.pieces.size(), 4u + 3u + 8u);
}

std::string Values(Order order) {
  return Header(0, 0, 0, order) + Number(0xFFFFFFFE, 4, order) + Number(0x89ABCDEF, 4, order) +
         Number(0xFFFE, 2, order) + Number(0x1234, 2, order) + Number(7, 1) +
         Number(~uint64_t{1}, 8, order) + Number(0x0102030405060708, 8, order);
}

void ExpectValues(const std::string& bytes) {
  MemoryPtr stream = MemoryOf(bytes);
  CztInStream in(stream.get());
  int32_t i32 = 0;
  uint32_t u32 = 0;
  int16_t i16 = 0;
  uint16_t u16 = 0;
  unsigned char byte = 0;
  int64_t i64 = 0;
  uint64_t u64 = 0;
  in >> i32 >> u32 >> i16 >> u16 >> byte >> i64 >> u64;
  EXPECT_EQ(i32, -2);
  EXPECT_EQ(u32, 0x89ABCDEFu);
  EXPECT_EQ(i16, -2);
  EXPECT_EQ(u16, 0x1234);
  EXPECT_EQ(byte, 7);
  EXPECT_EQ(i64, -2);
  EXPECT_EQ(u64, 0x0102030405060708u);
}

TEST(ztTypedStream, ValuesOfBothByteOrdersReadBack) {
  ExpectValues(Values(Order::Little));
  std::string big = Values(Order::Big);
  ExpectValues(big);
  big[0] = static_cast<char>(0xFF);  // Any order but this machine's is the other one.
  ExpectValues(big);
}

TEST(ztTypedStream, TextIsReadBehindALengthOfLongWidth) {
  for (Order order : {Order::Little, Order::Big}) {
    MemoryPtr stream = MemoryOf(Header(0, 0, 0, order) + LongNumber(3, order) +
                                std::string("a\0b", 3) + LongNumber(0, order) + "tail");
    CztInStream in(stream.get());
    AnsiString text("old"), empty("old");
    in >> text >> empty;
    EXPECT_EQ(text.length(), 3u);
    EXPECT_EQ(std::string(text.begin(), text.end()), std::string("a\0b", 3));
    EXPECT_TRUE(empty.empty());
    EXPECT_EQ(Contents(stream.get()).substr(static_cast<size_t>(Position(stream.get()))), "tail");
  }
}

TEST(ztTypedStream, WrittenTextReadsBackWhereLongIsFourBytes) {
  MemoryPtr stream = NewMemory();
  CztOutStream out(stream.get());
  out << AnsiString("text") << AnsiString() << AnsiString("more");
  stream->Seek(0, ztSeekBegin, nullptr);
  CztInStream in(stream.get());
  AnsiString text;
  if (kLongIs8) {  // The length takes the first four characters with it.
    EXPECT_EQ(WhatThrows([&] { in >> text; }), Thrown::Stream);
  } else {
    AnsiString empty("x"), more;
    in >> text >> empty >> more;
    EXPECT_TRUE(text == "text" && empty.empty() && more == "more");
  }
}

TEST(ztTypedStream, LongTextsReadWhole) {
  std::string bytes;
  for (int i = 0; i < 200000; ++i) bytes += static_cast<char>(i * 7);
  MemoryPtr stream = MemoryOf(Header() + LongNumber(bytes.size()) + bytes);
  CztInStream in(stream.get());
  AnsiString text;
  in >> text;
  EXPECT_TRUE(std::string(text.begin(), text.end()) == bytes);
}

TEST(ztTypedStream, AnUntrueTextLengthTakesNoMemoryAndLeavesTheTarget) {
  ExpectInChild([] {
    if (kCanLimitMemory) LimitMemoryTo(64 << 20);
    for (uint64_t length : {uint64_t{4}, uint64_t{0x7FFFFFFF}, uint64_t{0xFFFFFFFF}}) {
      MemoryPtr stream = MemoryOf(Header() + LongNumber(length) + "abc");
      CztInStream in(stream.get());
      AnsiString text("old");
      EXPECT_EQ(WhatThrows([&] { in >> text; }), Thrown::EndOfStream);
      EXPECT_TRUE(text == "old");
    }
  });
  MemoryPtr stream = MemoryOf(Header() + Number(0x100000000, 8) + "abc");
  CztInStream in(stream.get());
  AnsiString text("old");
  Thrown thrown = WhatThrows([&] { in >> text; });
  EXPECT_EQ(thrown, kLongIs8 ? Thrown::Stream : Thrown::Nothing);
  EXPECT_TRUE(text == (kLongIs8 ? "old" : ""));
}

TEST(ztTypedStream, GuidReadsDataOneInLongWidthAndKeepsItsLowHalf) {
  for (Order order : {Order::Little, Order::Big}) {
    uint64_t data1 = 0x00112233 | (kLongIs8 ? 0xABCDEF0100000000u : 0);
    MemoryPtr stream =
        MemoryOf(Header(0, 0, 0, order) + LongNumber(data1, order) + Number(0x4455, 2, order) +
                 Number(0x6677, 2, order) + FromHex("8899AABBCCDDEEFF"));
    CztInStream in(stream.get());
    GUID guid = {};
    in >> guid;
    EXPECT_EQ(memcmp(&guid, &kGuid, sizeof guid), 0);
  }
}

// ---- Failures

TEST(ztTypedStream, EveryWriteThatFailsThrows) {
  auto write = [](IztStream* stream) {
    CztOutStream out(stream, 1, 2, 3);
    out << 1 << uint16_t{2} << static_cast<unsigned char>(3) << uint64_t{4} << AnsiString("text")
        << kGuid;
    CztOutStream inner(out);
  };
  ForeignStream whole;
  write(&whole);
  for (int nth = 1; nth <= whole.calls(); ++nth) {
    ForeignStream stream;
    stream.failAt = nth;
    stream.failure = ZT_E_END_OF_STREAM;  // On writing it means nothing of its own.
    EXPECT_EQ(WhatThrows([&] { write(&stream); }), Thrown::Stream) << nth;
    EXPECT_EQ(stream.pieces.size(), static_cast<size_t>(nth - 1));
  }
}

std::string Everything() {
  return Values(Order::Little) + LongNumber(4) + "text" + LongNumber(1) + Number(2, 4) +
         std::string(8, 'g') + Header();
}

void ReadEverything(IztStream* stream) {
  CztInStream in(stream);
  int32_t i32;
  uint32_t u32;
  int16_t i16;
  uint16_t u16;
  unsigned char byte;
  int64_t i64;
  uint64_t u64;
  AnsiString text;
  GUID guid;
  in >> i32 >> u32 >> i16 >> u16 >> byte >> i64 >> u64 >> text >> guid;
  CztInStream inner(in);
}

TEST(ztTypedStream, EveryReadThatFailsThrowsByItsResult) {
  ForeignStream whole;
  whole.input = Everything();
  ReadEverything(&whole);
  for (int nth = 1; nth <= whole.calls(); ++nth) {
    for (HRESULT failure : {ZT_E_END_OF_STREAM, E_FAIL, E_INVALIDARG, ZT_E_ACCESS_DENIED}) {
      ForeignStream stream;
      stream.input = Everything();
      stream.failAt = nth;
      stream.failure = failure;
      EXPECT_EQ(WhatThrows([&] { ReadEverything(&stream); }),
                failure == ZT_E_END_OF_STREAM ? Thrown::EndOfStream : Thrown::Stream)
          << nth;
    }
  }
}

TEST(ztTypedStream, EveryTruncationIsTheEndOfTheStream) {
  std::string bytes = Everything();
  for (size_t size = 1; size < bytes.size(); ++size) {
    MemoryPtr stream = MemoryOf(bytes.substr(0, size));
    EXPECT_EQ(WhatThrows([&] { ReadEverything(stream.get()); }), Thrown::EndOfStream) << size;
  }
  MemoryPtr stream = MemoryOf(bytes);
  EXPECT_EQ(WhatThrows([&] { ReadEverything(stream.get()); }), Thrown::Nothing);
}

TEST(ztTypedStream, AStreamWithoutABlockIsNotAtItsEnd) {
  MemoryPtr stream = NewMemory();
  EXPECT_EQ(WhatThrows([&] { CztInStream in(stream.get()); }), Thrown::Stream);
}

TEST(ztTypedStream, AValueThatFailsLeavesItsTarget) {
  MemoryPtr stream = MemoryOf(Header() + "ab");
  CztInStream in(stream.get());
  uint32_t value = 77;
  EXPECT_EQ(WhatThrows([&] { in >> value; }), Thrown::EndOfStream);
  EXPECT_EQ(value, 77u);
}

TEST(ztTypedStreamException, HoldsItsMessage) {
  EXPECT_TRUE(CztStreamException().what().empty());
  EXPECT_TRUE(CztEndOfStreamException(String(L"why")).what() == L"why");
  EXPECT_THROW(throw CztEndOfStreamException(), CztStreamException);
  EXPECT_THROW(throw CztStreamVersionException(), CztStreamException);
}

// ---- Sub-streams

TEST(ztTypedStream, SubStreamsAreThoseOfTheByteStream) {
  MemoryPtr stream = NewMemory();
  CztOutStream out(stream.get());
  auto made = CztComPtr<IztStream>::Attach(out.CreateSubStream(L"one"));
  ASSERT_TRUE(made);
  Put(made.get(), "data");
  EXPECT_EQ(made->AddRef(), 3u);  // mine, the map's and this one
  made->Release();
  EXPECT_EQ(stream->AddRef(), 2u);
  stream->Release();
  stream->Seek(0, ztSeekBegin, nullptr);
  CztInStream in(stream.get());
  auto found = CztComPtr<IztStream>::Attach(in.OpenSubStream(L"ONE"));
  EXPECT_EQ(found.get(), made.get());
  EXPECT_EQ(in.OpenSubStream(L"two"), nullptr);
  EXPECT_EQ(stream->AddRef(), 2u);
  stream->Release();
}

TEST(ztTypedStream, WithoutSubStreamsThereAreNone) {
  ForeignStream stream;
  stream.input = Header();
  CztOutStream out(&stream);
  CztInStream in(&stream);
  EXPECT_EQ(out.CreateSubStream(L"one"), nullptr);
  EXPECT_EQ(in.OpenSubStream(L"one"), nullptr);
  EXPECT_EQ(stream.references, 1);
}

}  // namespace
}  // namespace vlt::test
