#include "ztini/LineBuffer.h"

#include <climits>
#include <cstring>

namespace ztini {
namespace {

constexpr size_t kFirstCapacity = 256;
// A line function that stores nothing and ends nothing would double the buffer indefinitely.
constexpr int kMostIdleCalls = 2;

}  // namespace

bool LineBuffer::open() {
  m_text.reset(static_cast<char*>(Allocate(kFirstCapacity)));
  m_capacity = kFirstCapacity;
  return m_text != nullptr;
}

bool LineBuffer::grow() {
  // The function is asked with a 32-bit number.
  if (m_capacity > INT32_MAX / 2) return false;
  void* text = Reallocate(m_text.get(), m_capacity * 2);
  if (!text) return false;
  (void)m_text.release();
  m_text.reset(static_cast<char*>(text));
  m_capacity *= 2;
  return true;
}

int32_t LineBuffer::next(IniLineInputFunction input, void* context) {
  size_t length = 0;
  size_t room = m_capacity - 1;
  int idleCalls = 0;
  for (;;) {
    char* end = m_text.get() + length;
    m_endOfFile = m_endOfLine = 0;
    *end = 0;
    const int32_t status =
        input(context, end, static_cast<int32_t>(room), &m_endOfFile, &m_endOfLine, &m_lineNumber);
    if (status < 0) return status;
    if (m_endOfLine || m_endOfFile) return 0;
    // The function does not say how much it has stored; the buffer was empty there.
    const size_t stored = strnlen(end, room);
    idleCalls = stored ? 0 : idleCalls + 1;
    if (idleCalls == kMostIdleCalls) return kIniOutOfMemory;
    length += stored;
    room = m_capacity;  // the new half
    if (!grow()) return kIniOutOfMemory;
  }
}

}  // namespace ztini
