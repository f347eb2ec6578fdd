#pragma once

#include <cstdint>

#include "zt/fnd/AutoBuffer.h"
#include "zt/fnd/StringFwd.h"

namespace zt::fnd::osdep {

// Owner of one open file.
//
// Operations report by their results, with errno after a -1, which is 0 where a file ends before
// an exact read does, and ENOMEM where a buffer cannot grow; only those that say so throw. On a
// closed object reads, writes and seek() give -1, the others do nothing. Files are opened
// close-on-exec. Threads: one at a time.
class BinaryFile {
 public:
  // Bits of open(): exactly these flags of the system together, so that Read with Write is
  // write-only. A file made by Create has mode 0600 under the umask.
  enum class Mode : uint32_t { Read = 1, Write = 2, ReadWrite = 4, Truncate = 8, Create = 0x10 };
  friend constexpr Mode operator|(Mode a, Mode b) {
    return static_cast<Mode>(static_cast<uint32_t>(a) | static_cast<uint32_t>(b));
  }
  // Where seek() counts from, as lseek does.
  enum class Origin : int { Begin = 0, Current = 1, End = 2 };
  // Byte order of the length in front of a byte vector.
  enum class Endianness : int { Little = 0, Big = 1 };

  BinaryFile() noexcept : m_fd(-1) {}
  // Opens; without noThrow a failure throws PosixError.
  BinaryFile(const String& path, Mode mode, bool noThrow);
  ~BinaryFile() { close(); }
  BinaryFile(const BinaryFile&) = delete;
  BinaryFile& operator=(const BinaryFile&) = delete;

  bool isOpen() const noexcept { return m_fd >= 0; }
  int descriptor() const noexcept { return m_fd; }  // stays the object's; -1 for none

  // An object that is open stays as it is: EINVAL. open throws PosixError; openNoThrow returns 0 or
  // -1.
  void open(const String& path, Mode mode);
  int openNoThrow(const String& path, Mode mode);
  void close() noexcept;

  // One transfer, which may be short: the count, 0 at the end of the file, or -1.
  long read(void* bytes, unsigned long n) const;
  long write(const void* bytes, unsigned long n);
  // Appends what it reads to the buffer.
  long read(AutoBuffer& buffer, unsigned int n) const;

  // All n bytes or -1. A failed read, the end of the file included, leaves position and buffer as
  // they were; a failed write leaves what it wrote. n of 0 gives 0 without touching the file. Throw
  // OutOfRange, after the transfer, for an n of 0x80000000 or more.
  int readExactSize(void* bytes, unsigned long n) const { return ReadExactSize(m_fd, bytes, n); }
  int writeExactSize(const void* bytes, unsigned long n) { return WriteExactSize(m_fd, bytes, n); }
  int readExactSize(AutoBuffer& buffer, unsigned int n) const;
  static int ReadExactSize(int fd, void* bytes, unsigned long n);
  static int WriteExactSize(int fd, const void* bytes, unsigned long n);

  // A 32-bit length, then that many bytes: length plus 4, or -1. Lengths above 0x7FFFFFFF fail, in
  // writing with nothing written. A failed read leaves position and buffer as they were.
  int64_t readByteVector(AutoBuffer& buffer, Endianness order);
  int64_t writeByteVector(const BufferWrapper& bytes, Endianness order);

  // The new position, or -1.
  int64_t seek(int64_t offset, Origin origin) const;
  // Throw PosixError.
  void resize(int64_t size);
  void sync();

 private:
  int32_t m_fd;
};

}  // namespace zt::fnd::osdep
