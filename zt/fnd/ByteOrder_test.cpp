#include "zt/fnd/ByteOrder.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <string>

namespace zt::fnd {
namespace {

TEST(ByteOrder, BigEndianCopiesBeginWithTheHighestByte) {
  const uint32_t number = 0x01020304;
  unsigned char src[4], dest[4] = {}, back[4] = {};
  memcpy(src, &number, sizeof src);
  big_endian::CopyToBigEndian(4, dest, src);
  const unsigned char expected[] = {1, 2, 3, 4};
  EXPECT_EQ(memcmp(dest, expected, 4), 0);
  big_endian::CopyFromBigEndian(4, back, dest);
  EXPECT_EQ(memcmp(src, back, 4), 0);
  big_endian::CopyToBigEndian(0, dest, src);
  EXPECT_EQ(dest[0], 1);
}

template <class T>
std::string BytesOf(T value) {
  return std::string(reinterpret_cast<const char*>(&value), sizeof value);
}

TEST(ByteOrder, ValuesHaveTheirBytesInTheOrderOfTheName) {
  const uint32_t value = 0x01020304;
  EXPECT_EQ(BytesOf(big_endian::ToBigEndian(value)), "\1\2\3\4");
  EXPECT_EQ(BytesOf(little_endian::ToLittleEndian(value)), "\4\3\2\1");
  EXPECT_EQ(big_endian::FromBigEndian(big_endian::ToBigEndian(value)), value);
  EXPECT_EQ(little_endian::FromLittleEndian(little_endian::ToLittleEndian(value)), value);
  EXPECT_EQ(BytesOf(big_endian::FromBigEndian<uint16_t>(0x0102)),
            BytesOf(big_endian::ToBigEndian<uint16_t>(0x0102)));
}

TEST(ByteOrder, PutAndGetAreLittleEndianAtAnyPlace) {
  unsigned char bytes[10] = {};
  little_endian::Put<int64_t>(bytes + 1, -2);
  const unsigned char expected[] = {0, 0xFE, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0};
  EXPECT_EQ(memcmp(bytes, expected, sizeof bytes), 0);
  EXPECT_EQ(little_endian::Get<int64_t>(bytes + 1), -2);
  EXPECT_EQ(little_endian::Get<uint16_t>(bytes), 0xFE00);
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
