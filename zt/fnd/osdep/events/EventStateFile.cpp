// Fields are copied one by one, and no structure is laid over the bytes: the records have no
// padding, so that most fields are unaligned, and compilers of 32 and 64 bits would lay out structures
// differently.
#include "zt/fnd/osdep/events/EventStateFile.h"

#include <algorithm>

#include "zt/fnd/ByteOrder.h"

namespace zt::fnd::osdep {

using little_endian::Get;
using little_endian::Put;
EventPlace::Bytes EventPlace::encode() const {
  Bytes bytes = {};
  Put(&bytes[1], set);
  Put(&bytes[5], slot);
  return bytes;
}

EventPlace EventPlace::Decode(const Bytes& bytes) {
  EventPlace place;
  place.set = Get<uint32_t>(&bytes[1]);
  place.slot = Get<uint32_t>(&bytes[5]);
  return place;
}

SetHeader::Bytes SetHeader::encode() const {
  Bytes bytes = {};
  Put(&bytes[0], kMagic);
  bytes[kReadyOffset] = ready ? 1 : 0;
  Put(&bytes[6], count);
  Put(&bytes[kFreeOffset], freeCount);
  Put(&bytes[14], firstFree);
  return bytes;
}

bool SetHeader::decode(const Bytes& bytes) {
  *this = SetHeader();
  if (Get<uint32_t>(&bytes[0]) != kMagic) return false;
  // Any other value is none that this code writes, and is not trusted.
  ready = bytes[kReadyOffset] == 1;
  count = Get<uint32_t>(&bytes[6]);
  freeCount = Get<uint32_t>(&bytes[kFreeOffset]);
  firstFree = Get<uint32_t>(&bytes[14]);
  return true;
}

SlotRecord::Bytes SlotRecord::encode() const {
  Bytes bytes = {};
  bytes[0] = inUse ? 1 : 0;
  bytes[1] = manualReset ? 1 : 0;
  // Widened with the sign, which makes the end of the list all ones.
  Put(&bytes[2], static_cast<int64_t>(keyOrNext));
  return bytes;
}

SlotRecord SlotRecord::Decode(const Bytes& bytes) {
  SlotRecord record;
  record.inUse = bytes[0] != 0;
  record.manualReset = bytes[1] != 0;
  record.keyOrNext = static_cast<int32_t>(Get<int64_t>(&bytes[2]));
  return record;
}

StateFileBytes EncodeEmptySet() {
  StateFileBytes bytes;
  SetHeader header;
  // All slots in one chain, each naming the next: taking one, and giving it back, changes its
  // record and the head only.
  header.count = header.freeCount = kSlotsPerSet;
  const SetHeader::Bytes head = header.encode();
  auto end = std::copy(head.begin(), head.end(), bytes.begin());
  for (uint32_t slot = 0; slot < kSlotsPerSet; ++slot) {
    SlotRecord record;
    record.keyOrNext = slot + 1 < kSlotsPerSet ? static_cast<int32_t>(slot + 1) : -1;
    const SlotRecord::Bytes encoded = record.encode();
    end = std::copy(encoded.begin(), encoded.end(), end);
  }
  return bytes;
}

}  // namespace zt::fnd::osdep
