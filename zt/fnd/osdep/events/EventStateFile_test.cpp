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
  EXPECT_EQ(Hex(EventPlace{1, 5}.encode()), "000100000005000000");
  EXPECT_EQ(Hex(EventPlace{4000000000u, 127}.encode()), "0000286bee7f000000");
  EventPlace place = EventPlace::Decode(EventPlace{4000000000u, 0xFFFFFFFFu}.encode());
  EXPECT_EQ(place.set, 4000000000u);
  EXPECT_EQ(place.slot, 0xFFFFFFFFu);
}

TEST(EventStateFile, ReservedByteOfALockFileIsNotRead) {
  EventPlace::Bytes bytes = EventPlace{2, 3}.encode();
  bytes[0] = 0xAA;
  EXPECT_EQ(EventPlace::Decode(bytes).set, 2u);
  EXPECT_EQ(EventPlace::Decode(bytes).slot, 3u);
}

TEST(EventStateFile, HeaderBytes) {
  SetHeader header;
  header.ready = true;
  header.count = 128;
  header.freeCount = 127;
  header.firstFree = 0xFFFFFFFFu;
  EXPECT_EQ(Hex(header.encode()),
            "315ee315000180000000"
            "7f000000"
            "ffffffff");
  SetHeader back;
  ASSERT_TRUE(back.decode(header.encode()));
  EXPECT_TRUE(back.ready);
  EXPECT_EQ(back.count, 128u);
  EXPECT_EQ(back.freeCount, 127u);
  EXPECT_EQ(back.firstFree, 0xFFFFFFFFu);
}

TEST(EventStateFile, WrongMagicClearsAllFields) {
  SetHeader header;
  header.ready = true;
  header.count = header.freeCount = header.firstFree = 7;
  SetHeader::Bytes bytes = header.encode();
  bytes[3] ^= 1;
  EXPECT_FALSE(header.decode(bytes));
  EXPECT_FALSE(header.ready);
  EXPECT_EQ(header.count + header.freeCount + header.firstFree, 0u);
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
  EXPECT_EQ(Hex(SlotRecord{true, true, 0x01023C4D}.encode()),
            "0101"
            "4d3c020100000000");
  EXPECT_EQ(Hex(SlotRecord{true, false, -1}.encode()),
            "0100"
            "ffffffffffffffff");
  EXPECT_EQ(Hex(SlotRecord{false, false, INT32_MIN + 1}.encode()),
            "0000"
            "01000080ffffffff");
}

TEST(EventStateFile, OnlyTheLowHalfOfALinkIsRead) {
  SlotRecord::Bytes bytes = SlotRecord{true, true, 0x01023C4D}.encode();
  memset(&bytes[6], 0xEE, 4);
  SlotRecord record = SlotRecord::Decode(bytes);
  EXPECT_TRUE(record.inUse);
  EXPECT_TRUE(record.manualReset);
  EXPECT_EQ(record.keyOrNext, 0x01023C4D);
}

TEST(EventStateFile, EmptySetIsAListOfAllSlots) {
  StateFileBytes bytes = EncodeEmptySet();
  ASSERT_EQ(bytes.size(), 1298u);
  std::string hex = Hex(bytes);
  EXPECT_EQ(hex.substr(0, 36),
            "315ee315"
            "00"
            "00"
            "80000000"
            "80000000"
            "00000000");
  for (unsigned slot = 0; slot < kSlotsPerSet; ++slot) {
    SlotRecord::Bytes record;
    memcpy(record.data(), &bytes[SlotRecord::Offset(slot)], record.size());
    EXPECT_FALSE(SlotRecord::Decode(record).inUse);
    EXPECT_FALSE(SlotRecord::Decode(record).manualReset);
    EXPECT_EQ(slot == 127 ? -1 : static_cast<int>(slot + 1), SlotRecord::Decode(record).keyOrNext);
  }
  EXPECT_EQ(hex.substr(36, 20),
            "0000"
            "0100000000000000");
  EXPECT_EQ(hex.substr(2 * 1288),
            "0000"
            "ffffffffffffffff");
}

}  // namespace
}  // namespace zt::fnd::osdep
