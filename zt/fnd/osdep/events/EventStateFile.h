#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

// The bytes of the two kinds of file in "namedEvent/" of the shared directory.
//
// All numbers are little-endian, field after field, without padding, and the same on every host.
// docs/event-files.md shows them in worked examples.
namespace zt::fnd::osdep {

constexpr uint32_t kSlotsPerSet = 128;
constexpr uint32_t kNoSlot = 0xFFFFFFFFu;  // after the last free slot

// Contents of an event's lock file: where the event's semaphore is.
//
//   0  1  reserved, 0        1  4  set number        5  4  slot index
struct EventPlace {
  static constexpr size_t kSize = 9;
  using Bytes = std::array<unsigned char, kSize>;

  uint32_t set = 0;
  uint32_t slot = 0;

  Bytes encode() const;
  static EventPlace Decode(const Bytes& bytes);
};

// Head of a set's state file.
//
//   0  4  magic              5  1  ready: 1 while the semaphore set exists
//   4  1  reserved, 0        6  4  slots      10  4  free slots      14  4  first free slot
struct SetHeader {
  static constexpr size_t kSize = 18;
  static constexpr uint32_t kMagic = 0x15E35E31u;
  static constexpr size_t kReadyOffset = 5;
  static constexpr size_t kFreeOffset = 10;  // free count, then first free, to the end
  using Bytes = std::array<unsigned char, kSize>;

  bool ready = false;
  uint32_t count = 0;
  uint32_t freeCount = 0;
  uint32_t firstFree = 0;

  Bytes encode() const;

  // False, with all fields 0, if the magic is another one.
  bool decode(const Bytes& bytes);
};

// Record of one slot, after the head by index.
//
//   0  1  in use             1  1  manual reset
//   2  8  in use: the key of the event's lock file; free: the next free slot, all ones at the end.
//         Written with its sign; only the low 32 bits are read back.
struct SlotRecord {
  static constexpr size_t kSize = 10;
  using Bytes = std::array<unsigned char, kSize>;

  bool inUse = false;
  bool manualReset = false;
  int32_t keyOrNext = 0;

  Bytes encode() const;
  static SlotRecord Decode(const Bytes& bytes);

  static constexpr uint64_t Offset(uint32_t slot) {
    return SetHeader::kSize + static_cast<uint64_t>(slot) * kSize;
  }
};

constexpr size_t kStateFileSize = SetHeader::kSize + kSlotsPerSet * SlotRecord::kSize;
using StateFileBytes = std::array<unsigned char, kStateFileSize>;

// A state file with all slots free and the ready flag clear.
StateFileBytes EncodeEmptySet();

}  // namespace zt::fnd::osdep
