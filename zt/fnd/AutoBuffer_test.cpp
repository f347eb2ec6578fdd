#include "zt/fnd/AutoBuffer.h"

#include <gtest/gtest.h>
#include <sys/resource.h>

#include <atomic>
#include <cstring>
#include <new>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/MemoryLimit.h"
#include "zt/fnd/Exception.h"

namespace zt::fnd {
namespace {

AutoBuffer Of(const std::string& text) {
  return AutoBuffer(BufferWrapper(text.data(), static_cast<unsigned int>(text.size())));
}

std::string Text(const AutoBuffer& buffer) {
  return buffer.Len() == 0
             ? std::string()
             : std::string(reinterpret_cast<const char*>(buffer.Data()), buffer.Len());
}

TEST(AutoBuffer, DefaultHasNoBlock) {
  AutoBuffer b;
  EXPECT_EQ(b.Len(), 0u);
  EXPECT_EQ(b.Data(), nullptr);
  EXPECT_EQ(b.Capacity(), 0u);
  b.Free();
  b.Erase();
  b.UnAppend(5);
  b.Append("x", 0);
  EXPECT_EQ(b.Data(), nullptr);
}

TEST(AutoBuffer, ConstructionReserves) {
  AutoBuffer b(50u);
  EXPECT_EQ(b.Len(), 0u);
  EXPECT_EQ(b.Capacity(), 50u);
  EXPECT_NE(b.Data(), nullptr);
}

TEST(AutoBuffer, AppendGrowsByATenthAndAtLeast128) {
  const std::string bytes(2000, 'x');
  AutoBuffer small, large;
  small.Append(bytes.data(), 1000);
  EXPECT_EQ(small.Capacity(), 1128u);
  large.Append(bytes.data(), 2000);
  EXPECT_EQ(large.Capacity(), 2200u);
  small.Append(bytes.data(), 128);  // fits exactly
  EXPECT_EQ(small.Capacity(), 1128u);
  small.Append(bytes.data(), 1);
  EXPECT_EQ(1129u + 128u, small.Capacity());
  EXPECT_EQ(small.Len(), 1129u);
}

TEST(AutoBuffer, AppendedBytesStandInOrderAndReversed) {
  AutoBuffer b = Of("ab");
  b.Append("cd", 2);
  b.appendReverseByteOrder("123", 3);
  b.appendReverseByteOrder("", 0);
  EXPECT_EQ(Text(b), "abcd321");
}

TEST(AutoBuffer, AppendFromInsideItself) {
  AutoBuffer b = Of("abc");
  for (int i = 0; i < 10; ++i) b.Append(b.Data(), b.Len());
  std::string expected = "abc";
  for (int i = 0; i < 10; ++i) expected += expected;
  EXPECT_EQ(expected, Text(b));
  AutoBuffer shared = Of("xyz"), other(shared);
  shared.appendReverseByteOrder(shared.Data() + 1, 2);
  EXPECT_EQ(Text(shared), "xyzzy");
  EXPECT_EQ(Text(other), "xyz");
}

TEST(AutoBuffer, CopiesShareUntilOneIsWritten) {
  AutoBuffer a = Of("abc"), b(a), c;
  c = b;
  EXPECT_EQ(a.Data(), b.Data());
  EXPECT_EQ(a.Data(), c.Data());
  b.Append("d", 1);
  EXPECT_EQ(Text(a), "abc");
  EXPECT_EQ(Text(b), "abcd");
  EXPECT_EQ(Text(c), "abc");
  EXPECT_EQ(a.Data(), c.Data());
}

TEST(AutoBuffer, EveryWriterMakesItsOwnFirst) {
  const std::string before = "abcdef";
  void (*const writers[])(AutoBuffer&) = {
      [](AutoBuffer& b) { b.Append("x", 1); },
      [](AutoBuffer& b) { b.appendReverseByteOrder("x", 1); },
      [](AutoBuffer& b) { b.Skip(1); },
      [](AutoBuffer& b) { b.UnAppend(1); },
      [](AutoBuffer& b) { b.Modify(0, "x", 1); },
      [](AutoBuffer& b) { b.Reserve(1); },
      [](AutoBuffer& b) { b.Erase(); },
      [](AutoBuffer& b) { b.Free(); },
      [](AutoBuffer& b) { b = BufferWrapper("x", 1); },
      [](AutoBuffer& b) {
        const unsigned char form[] = {1, 0, 0, 0, 'x'};
        const unsigned char* cursor = form;
        b.deserialize(cursor, form + 5);
      },
      [](AutoBuffer& b) {
        const unsigned char form[] = {1, 0, 0, 0, 'x'};
        const unsigned char* cursor = form;
        b.circularDeserialize(form, form + 5, cursor);
      },
  };
  int index = 0;
  for (auto writer : writers) {
    AutoBuffer kept = Of(before), written(kept);
    const unsigned char* block = kept.Data();
    writer(written);
    EXPECT_EQ(before, Text(kept)) << index;
    EXPECT_EQ(block, kept.Data()) << index;
    EXPECT_NE(block, written.Data()) << index;
    ++index;
  }
}

TEST(AutoBuffer, AssignmentOfItselfOrOfTheSameBlockChangesNothing) {
  AutoBuffer a = Of("abc"), b(a);
  AutoBuffer& self = a;
  a = self;
  a = b;
  EXPECT_EQ(Text(a), "abc");
  EXPECT_EQ(a.Data(), b.Data());
  a = AutoBuffer();
  EXPECT_EQ(a.Data(), nullptr);
  EXPECT_EQ(Text(b), "abc");
}

TEST(AutoBuffer, AssignmentFromAViewOfItself) {
  AutoBuffer a = Of("abcdef");
  a = BufferWrapper(a.Data() + 2, 3);
  EXPECT_EQ(Text(a), "cde");
}

TEST(AutoBuffer, EraseKeepsAnUnsharedBlockAndDropsASharedOne) {
  AutoBuffer a = Of("abc");
  const unsigned char* block = a.Data();
  a.Erase();
  EXPECT_EQ(a.Len(), 0u);
  EXPECT_EQ(block, a.Data());
  AutoBuffer b = Of("abc"), c(b);
  b.Erase();
  EXPECT_EQ(b.Data(), nullptr);
  EXPECT_EQ(Text(c), "abc");
}

TEST(AutoBuffer, ReserveAndSkipAreExact) {
  AutoBuffer b;
  b.Reserve(10);
  EXPECT_EQ(b.Capacity(), 10u);
  b.Reserve(5);
  EXPECT_EQ(b.Capacity(), 10u);
  b.Append("0123456789", 10);
  b.Skip(3);
  EXPECT_EQ(b.Len(), 13u);
  EXPECT_EQ(b.Capacity(), 13u);
  memcpy(b.Data() + 10, "abc", 3);
  EXPECT_EQ(Text(b), "0123456789abc");
}

TEST(AutoBuffer, UnAppendShortensAndStopsAtEmpty) {
  AutoBuffer b = Of("abcdef");
  b.UnAppend(2);
  EXPECT_EQ(Text(b), "abcd");
  b.UnAppend(100);
  EXPECT_EQ(b.Len(), 0u);
  b.Append("z", 1);
  EXPECT_EQ(Text(b), "z");
}

TEST(AutoBuffer, ModifyOverwritesWithoutMovingTheEnd) {
  AutoBuffer b = Of("abcdef");
  b.Modify(2, "XY", 2);
  EXPECT_EQ(Text(b), "abXYef");
  b.Modify(4, "12345678", 8);  // beyond the end: room for 12, the length stays
  EXPECT_EQ(Text(b), "abXY12");
  EXPECT_EQ(12u + 128u, b.Capacity());
  b.Skip(6);
  EXPECT_EQ(Text(b), "abXY12345678");
}

TEST(AutoBuffer, CloneHasAllTheRoomItClaims) {
  AutoBuffer a(4096u);
  a.Append("abc", 3);
  AutoBuffer b(a);
  b.Append("d", 1);
  EXPECT_EQ(b.Capacity(), 4096u);
  const std::string filler(4092, 'x');
  b.Append(filler.data(), 4092);  // into the claimed space; a checker of memory would see it pass
  EXPECT_EQ(b.Capacity(), 4096u);
  EXPECT_EQ("abcd" + filler, Text(b));
  EXPECT_EQ(Text(a), "abc");
}

TEST(AutoBuffer, LengthsBeyondThirtyTwoBitsAreOutOfRange) {
  AutoBuffer b = Of("abc");
  EXPECT_THROW(b.Append("x", 0xFFFFFFFFu), exception::OutOfRange);
  EXPECT_THROW(b.appendReverseByteOrder("x", 0xFFFFFFFDu), exception::OutOfRange);
  EXPECT_THROW(b.Skip(0xFFFFFFFDu), exception::OutOfRange);
  EXPECT_THROW(b.Modify(0xFFFFFFFFu, "x", 1), exception::OutOfRange);
  EXPECT_EQ(Text(b), "abc");
}

TEST(AutoBuffer, FailedAllocationLeavesTheBytes) {
  if (!vlt::test::kCanLimitMemory) GTEST_SKIP() << "the sanitizer needs its address space";
  // In a child, whose address space can be made too small without harm to this process.
  vlt::test::Child child([] {
    AutoBuffer b = Of("abc"), shared(b);
    rlimit limit = {256u << 20, 256u << 20};
    setrlimit(RLIMIT_AS, &limit);
    for (int i = 0; i < 3; ++i) {
      try {
        if (i == 0) b.Reserve(0xFFFFFFF0u);
        if (i == 1) b.Skip(0xFFFFFF00u);
        if (i == 2) b.Modify(0xFFFFFF00u, "x", 1);
        return 1;
      } catch (const std::bad_alloc&) {
      }
      if (Text(b) != "abc" || Text(shared) != "abc") return 2;
    }
    b.Append("d", 1);
    return Text(b) == "abcd" ? 0 : 3;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(AutoBuffer, CompareIsByByteThenByLength) {
  auto compare = [](const std::string& a, const std::string& b) {
    return CompareBuffers(Of(a), Of(b));
  };
  EXPECT_EQ(compare("ab", "abc"), -1);
  EXPECT_EQ(compare("ab", "ab"), 0);
  EXPECT_EQ(compare("b", "abc"), 1);
  EXPECT_EQ(compare("\xff", "\x01zzz"), 1);
  EXPECT_EQ(CompareBuffers(AutoBuffer(), BufferWrapper()), 0);
  EXPECT_EQ(CompareBuffers(AutoBuffer(), Of("a")), -1);
  EXPECT_TRUE(Of("ab") < Of("b"));
  EXPECT_FALSE(Of("b") < Of("b"));
}

TEST(AutoBuffer, WireFormIsLengthAndBytes) {
  AutoBuffer b = Of("abc");
  EXPECT_EQ(b.serializationSize(), 7u);
  EXPECT_EQ(AutoBuffer().serializationSize(), 4u);
  unsigned char form[8] = {};
  unsigned char* cursor = form;
  b.serialize(cursor, form + 7);
  EXPECT_EQ(form + 7, cursor);
  const unsigned char expected[] = {3, 0, 0, 0, 'a', 'b', 'c'};
  EXPECT_EQ(memcmp(expected, form, 7), 0);
  AutoBuffer back = Of("something longer");
  const unsigned char* block = back.Data();
  const unsigned char* in = form;
  back.deserialize(in, form + 8);
  EXPECT_EQ(form + 7, in);
  EXPECT_EQ(Text(back), "abc");
  EXPECT_EQ(block, back.Data());  // reused
}

TEST(AutoBuffer, WireFormThatDoesNotFitThrowsAndChangesNothing) {
  AutoBuffer b = Of("abc");
  unsigned char form[7] = {};
  for (int room = 0; room < 7; ++room) {
    unsigned char* cursor = form;
    EXPECT_THROW(b.serialize(cursor, form + room), exception::BufferOverflow) << room;
    EXPECT_EQ(form, cursor);
    EXPECT_EQ(form[0], 0);
  }
  unsigned char* out = form;
  b.serialize(out, form + 7);
  AutoBuffer back = Of("old");
  for (int room = 0; room < 7; ++room) {
    const unsigned char* in = form;
    EXPECT_THROW(back.deserialize(in, form + room), exception::DeserializationError) << room;
    EXPECT_EQ(form, in);
    EXPECT_EQ(Text(back), "old");
  }
  const unsigned char hostile[] = {0xFF, 0xFF, 0xFF, 0xFF, 1};
  const unsigned char* in = hostile;
  EXPECT_THROW(back.deserialize(in, hostile + 5), exception::DeserializationError);
}

TEST(AutoBufferRing, FormWrapsAtEveryPosition) {
  for (unsigned int start = 0; start <= 11; ++start) {
    unsigned char ring[11] = {};
    AutoBuffer b = Of("abcdefg");  // 7 + 4 bytes fill the ring
    unsigned char* out = ring + start;
    b.circularSerialize(ring, ring + 11, out);
    EXPECT_EQ(ring + start % 11, out) << "once around";
    EXPECT_EQ(ring[start % 11], 7);
    EXPECT_EQ(ring[(start + 4) % 11], 'a');
    EXPECT_EQ(ring[(start + 10) % 11], 'g');
    const unsigned char* in = ring + start;
    EXPECT_EQ(AutoBuffer::GetCircularDeserializationSize(ring, ring + 11, in), 11u);
    EXPECT_EQ(ring + start, in);
    AutoBuffer back;
    back.circularDeserialize(ring, ring + 11, in);
    EXPECT_EQ(Text(back), "abcdefg") << start;
    EXPECT_EQ(ring + start % 11, in);
  }
}

TEST(AutoBufferRing, CursorThatLandsOnTheEndGoesToTheBegin) {
  unsigned char ring[10] = {};
  unsigned char* out = ring + 4;
  Of("ab").circularSerialize(ring, ring + 10, out);
  EXPECT_EQ(ring, out);
  out = ring + 6;
  AutoBuffer().circularSerialize(ring, ring + 10, out);
  EXPECT_EQ(ring, out);
  const unsigned char* in = ring + 6;
  AutoBuffer back = Of("old");
  back.circularDeserialize(ring, ring + 10, in);
  EXPECT_EQ(ring, in);
  EXPECT_EQ(back.Len(), 0u);
}

TEST(AutoBufferRing, FormLargerThanTheRingThrows) {
  unsigned char ring[10] = {};
  unsigned char* out = ring;
  EXPECT_THROW(Of("abcdefg").circularSerialize(ring, ring + 10, out), exception::BufferOverflow);
  EXPECT_THROW(AutoBuffer().circularSerialize(ring, ring + 3, out), exception::BufferOverflow);
  EXPECT_EQ(ring, out);
  EXPECT_EQ(ring[0], 0);
  out = ring + 10;
  EXPECT_THROW(Of("a").circularSerialize(ring, ring + 9, out), exception::BufferOverflow);
}

TEST(AutoBufferRing, HostileLengthsThrow) {
  AutoBuffer back = Of("old");
  for (unsigned char low : {7, 255}) {
    unsigned char ring[10] = {low, 0, 0, 0};
    const unsigned char* in = ring;
    EXPECT_THROW(back.circularDeserialize(ring, ring + 10, in), exception::DeserializationError);
    EXPECT_EQ(ring, in);
  }
  unsigned char all[10];
  memset(all, 0xFF, sizeof all);
  const unsigned char* in = all;
  EXPECT_THROW(back.circularDeserialize(all, all + 10, in), exception::DeserializationError);
  EXPECT_THROW(back.circularDeserialize(all, all + 3, in), exception::DeserializationError);
  EXPECT_THROW(AutoBuffer::GetCircularDeserializationSize(all, all + 10, in),
               exception::DeserializationError);
  EXPECT_EQ(Text(back), "old");
}

TEST(AutoBufferRing, LengthAloneAndIncrement) {
  unsigned char ring[5] = {};
  unsigned char* cursor = ring + 3;
  AutoBuffer::circularSerializeLength(0x04030201u, ring, ring + 5, cursor);
  EXPECT_EQ(ring + 2, cursor);
  const unsigned char expected[] = {3, 4, 0, 1, 2};
  EXPECT_EQ(memcmp(expected, ring, 5), 0);
  AutoBuffer::circularIncrement(ring, ring + 5, cursor);
  EXPECT_EQ(ring + 3, cursor);
  cursor = ring + 4;
  AutoBuffer::circularIncrement(ring, ring + 5, cursor);
  EXPECT_EQ(ring, cursor);
}

TEST(AutoBuffer, CopiesMayLiveInDifferentThreads) {
  AutoBuffer source = Of(std::string(1000, 's'));
  std::atomic<int> wrong{0};
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([copy = source, &wrong] {
      for (int i = 0; i < 500; ++i) {
        AutoBuffer own(copy);
        if (own.Len() != 1000 || own.Data()[999] != 's') ++wrong;
        own.Append("x", 1);
        if (own.Len() != 1001) ++wrong;
      }
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(wrong, 0);
  EXPECT_EQ(source.Len(), 1000u);
}

}  // namespace
}  // namespace zt::fnd
