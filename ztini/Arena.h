#pragma once

#include <cstddef>

namespace ztini {

// Memory for the records and texts of one document that is read: given piece by piece, freed as
// one.
//
// Blocks grow from about 512 bytes to 1 MiB, so that a small document takes little and a large one
// few blocks. In a block, records go up from the front, aligned, and texts come down from the back,
// with no byte between them; a piece that would fill a quarter of a new block gets a block of its
// own.
class Arena {
 public:
  Arena() = default;
  ~Arena() { clear(); }
  Arena(const Arena&) = delete;
  Arena& operator=(const Arena&) = delete;

  // Uninitialised bytes, aligned for a pointer; null without memory.
  void* record(size_t sizeBytes) {
    if (sizeBytes > roomLeft() || sizeBytes % alignof(void*) != 0)
      return recordElsewhere(sizeBytes);
    char* place = m_front;
    m_front += sizeBytes;
    return place;
  }

  // A terminated copy of the bytes; null without memory.
  char* text(const char* begin, size_t length);

  // Makes one block of so many bytes, the guess of all that will be asked for. Without memory for
  // it, and once it is full, blocks grow as they do without a guess.
  void expect(size_t sizeBytes) { (void)(sizeBytes <= roomLeft() || addPresentBlock(sizeBytes)); }

  // Makes sure that the next records, of so many bytes in all and less than a quarter of a block,
  // need no memory. False without memory.
  bool reserve(size_t sizeBytes) { return sizeBytes <= roomLeft() || makeRoom(sizeBytes); }

  // Frees everything at once.
  void clear();

 private:
  struct Block {
    Block* next;
  };

  void* recordElsewhere(size_t sizeBytes);
  char* addBlock(size_t sizeBytes);
  bool makeRoom(size_t sizeBytes);
  bool addPresentBlock(size_t sizeBytes);
  bool needsOwnBlock(size_t sizeBytes) const { return sizeBytes > m_nextBlockBytes / 4; }
  size_t roomLeft() const { return static_cast<size_t>(m_back - m_front); }

  static constexpr size_t kFirstBlockBytes = 512;
  static constexpr size_t kLargestBlockBytes = size_t(1) << 20;

  Block* m_blocks = nullptr;
  char* m_front = nullptr;  // both ends of the free part of the present block
  char* m_back = nullptr;
  size_t m_nextBlockBytes = kFirstBlockBytes;
};

}  // namespace ztini
