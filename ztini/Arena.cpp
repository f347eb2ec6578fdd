#include "ztini/Arena.h"

#include <cstdint>
#include <cstring>

#include "ztini/Alloc.h"

namespace ztini {
namespace {

// What malloc adds to a block, generously: with it a block still fits into its power of two.
constexpr size_t kMallocBytes = 16;

}  // namespace

void* Arena::recordElsewhere(size_t sizeBytes) {
  if (sizeBytes > SIZE_MAX - alignof(void*)) return nullptr;
  // Records only: texts come down from the back and need no alignment, so that none is lost between
  // them.
  const size_t bytes = (sizeBytes + alignof(void*) - 1) & ~(alignof(void*) - 1);
  if (roomLeft() < bytes) {
    if (needsOwnBlock(bytes)) return addBlock(bytes);
    if (!makeRoom(bytes)) return nullptr;
  }
  char* place = m_front;
  m_front += bytes;
  return place;
}

char* Arena::text(const char* begin, size_t length) {
  const size_t bytes = length + 1;
  char* copy = nullptr;
  if (roomLeft() >= bytes || (!needsOwnBlock(bytes) && makeRoom(bytes))) {
    copy = m_back -= bytes;
  } else if (needsOwnBlock(bytes)) {
    copy = addBlock(bytes);
  }
  if (!copy) return nullptr;
  memcpy(copy, begin, length);
  copy[length] = 0;
  return copy;
}

// The space after the header of a new block; null without memory.
char* Arena::addBlock(size_t sizeBytes) {
  // No object is larger; allocators that check their callers end the process for such a request.
  if (sizeBytes > PTRDIFF_MAX - sizeof(Block)) return nullptr;
  auto* block = static_cast<Block*>(Allocate(sizeof(Block) + sizeBytes));
  if (!block) return nullptr;
  // The list is for clear() only. A block of its own joins it too, while the present block stays
  // the present one.
  block->next = m_blocks;
  m_blocks = block;
  return reinterpret_cast<char*>(block + 1);
}

bool Arena::addPresentBlock(size_t sizeBytes) {
  char* front = addBlock(sizeBytes);
  if (!front) return false;
  m_front = front;
  m_back = front + sizeBytes;
  return true;
}

bool Arena::makeRoom(size_t sizeBytes) {
  // Less than a quarter of the block is asked for, so one block suffices.
  const size_t room = m_nextBlockBytes - sizeof(Block) - kMallocBytes;
  if (!addPresentBlock(room)) return false;
  if (m_nextBlockBytes < kLargestBlockBytes) m_nextBlockBytes *= 2;
  return sizeBytes <= room;
}

void Arena::clear() {
  while (m_blocks) {
    Block* block = m_blocks;
    m_blocks = block->next;
    free(block);
  }
  m_front = m_back = nullptr;
  m_nextBlockBytes = kFirstBlockBytes;
}

}  // namespace ztini
