#include "zt/fnd/osdep/events/EventStateFile.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>

namespace zt::fnd::osdep {
namespace {

template <class Bytes>
std::string Hex(const Bytes& bytes) {
  std::string text;
  for (unsigned char byte : bytes) {
    text += "0123456789abcdef"[byte >> 4];
    text += "0123456789abcdef"[byte & 15];
  }
  return text;
}

TEST(EventStateFile, LockFileIsAZeroByteSetAndSlot) {
  EXPECT_EQ("000100000005000000", Hex(EventPlace{1, 5}.encode()));
  EXPECT_EQ("0000286bee7f000000", Hex(EventPlace{4000000000u, 127}.encode()));
  EventPlace place = EventPlace::Decode(EventPlace{4000000000u, 0xFFFFFFFFu}.encode());
  EXPECT_EQ(4000000000u, place.set);
  EXPECT_EQ(0xFFFFFFFFu, place.slot);
}

TEST(EventStateFile, ReservedByteOfALockFileIsNotRead) {
  EventPlace::Bytes bytes = EventPlace{2, 3}.encode();
  bytes[0] = 0xAA;
  EXPECT_EQ(2u, EventPlace::Decode(bytes).set);
  EXPECT_EQ(3u, EventPlace::Decode(bytes).slot);
}

TEST(EventStateFile, HeaderBytes) {
  SetHeader header;
  header.ready = true;
  header.count = 128;
  header.freeCount = 127;
  header.firstFree = 0xFFFFFFFFu;
  EXPECT_EQ(
      "315ee315000180000000"
      "7f000000"
      "ffffffff",
      Hex(header.encode()));
  SetHeader back;
  ASSERT_TRUE(back.decode(header.encode()));
  EXPECT_TRUE(back.ready);
  EXPECT_EQ(128u, back.count);
  EXPECT_EQ(127u, back.freeCount);
  EXPECT_EQ(0xFFFFFFFFu, back.firstFree);
}

TEST(EventStateFile, WrongMagicClearsAllFields) {
  SetHeader header;
  header.ready = true;
  header.count = header.freeCount = header.firstFree = 7;
  SetHeader::Bytes bytes = header.encode();
  bytes[3] ^= 1;
  EXPECT_FALSE(header.decode(bytes));
  EXPECT_FALSE(header.ready);
  EXPECT_EQ(0u, header.count + header.freeCount + header.firstFree);
}

TEST(EventStateFile, OnlyOneIsReady) {
  for (int flag : {0, 1, 2, 0x80, 0xFF}) {
    SetHeader header;
    SetHeader::Bytes bytes = header.encode();
    bytes[SetHeader::kReadyOffset] = static_cast<unsigned char>(flag);
    ASSERT_TRUE(header.decode(bytes));
    EXPECT_EQ(flag == 1, header.ready) << flag;
  }
}

TEST(EventStateFile, SlotRecordsWidenWithTheSign) {
  EXPECT_EQ(
      "0101"
      "4d3c020100000000",
      Hex(SlotRecord{true, true, 0x01023C4D}.encode()));
  EXPECT_EQ(
      "0100"
      "ffffffffffffffff",
      Hex(SlotRecord{true, false, -1}.encode()));
  EXPECT_EQ(
      "0000"
      "01000080ffffffff",
      Hex(SlotRecord{false, false, INT32_MIN + 1}.encode()));
}

TEST(EventStateFile, OnlyTheLowHalfOfALinkIsRead) {
  SlotRecord::Bytes bytes = SlotRecord{true, true, 0x01023C4D}.encode();
  memset(&bytes[6], 0xEE, 4);
  SlotRecord record = SlotRecord::Decode(bytes);
  EXPECT_TRUE(record.inUse);
  EXPECT_TRUE(record.manualReset);
  EXPECT_EQ(0x01023C4D, record.keyOrNext);
}

TEST(EventStateFile, EmptySetIsAListOfAllSlots) {
  StateFileBytes bytes = EncodeEmptySet();
  ASSERT_EQ(1298u, bytes.size());
  std::string hex = Hex(bytes);
  EXPECT_EQ(
      "315ee315"
      "00"
      "00"
      "80000000"
      "80000000"
      "00000000",
      hex.substr(0, 36));
  for (unsigned slot = 0; slot < kSlotsPerSet; ++slot) {
    SlotRecord::Bytes record;
    memcpy(record.data(), &bytes[SlotRecord::Offset(slot)], record.size());
    EXPECT_FALSE(SlotRecord::Decode(record).inUse);
    EXPECT_FALSE(SlotRecord::Decode(record).manualReset);
    EXPECT_EQ(slot == 127 ? -1 : static_cast<int>(slot + 1), SlotRecord::Decode(record).keyOrNext);
  }
  EXPECT_EQ(
      "0000"
      "0100000000000000",
      hex.substr(36, 20));
  EXPECT_EQ(
      "0000"
      "ffffffffffffffff",
      hex.substr(2 * 1288));
}

}  // namespace
}  // namespace zt::fnd::osdep
