#include "zt/fnd/ByteOrder.h"

#include <gtest/gtest.h>

#include <cstdint>

namespace zt::fnd {
namespace {

TEST(ByteOrder, BigEndianCopiesReverse) {
  const unsigned char src[] = {1, 2, 3, 4, 5};
  unsigned char dest[5] = {};
  big_endian::CopyToBigEndian(5, dest, src);
  EXPECT_EQ(dest[0], 5);
  EXPECT_EQ(dest[2], 3);
  EXPECT_EQ(dest[4], 1);
  unsigned char back[5] = {};
  big_endian::CopyFromBigEndian(5, back, dest);
  EXPECT_EQ(memcmp(src, back, 5), 0);
  big_endian::CopyToBigEndian(0, dest, src);
  EXPECT_EQ(dest[0], 5);
}

TEST(ByteOrder, ValuesReverseOrStay) {
  EXPECT_EQ(0x04030201u, big_endian::ToBigEndian<std::uint32_t>(0x01020304));
  EXPECT_EQ(0x0201u, big_endian::FromBigEndian<std::uint16_t>(0x0102));
  EXPECT_EQ(0x01020304u, little_endian::ToLittleEndian<std::uint32_t>(0x01020304));
  EXPECT_EQ(0x01020304u, little_endian::FromLittleEndian<std::uint32_t>(0x01020304));
}

TEST(ByteOrder, SerializeRawWritesAndMoves) {
  unsigned char bytes[5] = {9, 9, 9, 9, 9};
  unsigned char* cursor = bytes + 1;  // unaligned on purpose
  little_endian::SerializeRaw<uint32_t>(0x04030201u, cursor, bytes + 5);
  EXPECT_EQ(bytes + 5, cursor);
  const unsigned char expected[] = {9, 1, 2, 3, 4};
  EXPECT_EQ(memcmp(expected, bytes, 5), 0);
}

TEST(ByteOrder, SerializeRawWithoutRoomThrowsAndLeavesAll) {
  unsigned char bytes[3] = {9, 9, 9};
  unsigned char* cursor = bytes;
  EXPECT_THROW(little_endian::SerializeRaw<uint32_t>(1, cursor, bytes + 3),
               exception::BufferOverflow);
  EXPECT_EQ(bytes, cursor);
  EXPECT_EQ(bytes[0], 9);
  cursor = bytes + 2;  // the limit lies before the cursor
  EXPECT_THROW(little_endian::SerializeRaw<uint16_t>(1, cursor, bytes + 1),
               exception::BufferOverflow);
}

TEST(ByteOrder, DeserializeRawReadsAndMovesOrThrows) {
  const unsigned char bytes[] = {0, 1, 2, 3, 4};
  const unsigned char* cursor = bytes + 1;
  uint32_t value = 0;
  little_endian::DeserializeRaw(value, cursor, bytes + 5);
  EXPECT_EQ(value, 0x04030201u);
  EXPECT_EQ(bytes + 5, cursor);
  EXPECT_THROW(little_endian::DeserializeRaw(value, cursor, bytes + 5),
               exception::DeserializationError);
  EXPECT_EQ(value, 0x04030201u);
  EXPECT_EQ(bytes + 5, cursor);
}

// The wire routines are the one place that throws without the place of the throw.
struct Place : exception::Exception {
  static const char* fileOf(const Exception& e) { return e.*&Place::file; }
};

TEST(ByteOrder, BoundsChecksThrowUnstamped) {
  unsigned char byte = 0;
  unsigned char* cursor = &byte;
  try {
    little_endian::SerializeRaw<uint32_t>(1, cursor, &byte + 1);
    FAIL();
  } catch (const exception::BufferOverflow& e) {
    EXPECT_EQ(Place::fileOf(e), nullptr);
  }
}

}  // namespace
}  // namespace zt::fnd
