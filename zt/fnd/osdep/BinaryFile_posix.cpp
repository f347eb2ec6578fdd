// Every operation that reports by its result keeps errno across its clean-up: closing, seeking back
// and freeing memory may set it, and the caller is to read that of the transfer. The paths come
// from callers who may name any file, so that files are opened as they are, links included; what
// lies in places of other users goes through zt/posix/Files.h instead.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>

#include "zt/fnd/ByteOrder.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/BinaryFile.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/posix/Files.h"
#include "zt/posix/Retry.h"
#include "zt/posix/Transfer.h"

using zt::posix::RetryEintr;
using zt::posix::ScopedFd;

namespace zt::fnd::osdep {
namespace {

constexpr uint32_t kTopBit = 0x80000000u;
// From this size on a length out of a damaged file is worth a call of fstat before memory is taken.
constexpr unsigned int kCheckedReadSize = 1u << 20;

static_assert(static_cast<int>(BinaryFile::Origin::Begin) == SEEK_SET);
static_assert(static_cast<int>(BinaryFile::Origin::Current) == SEEK_CUR);
static_assert(static_cast<int>(BinaryFile::Origin::End) == SEEK_END);

// The bits are combined as the system's flags are, without a check: O_RDONLY is 0, so that Read
// says nothing beside Write.
int OpenFlags(BinaryFile::Mode mode) {
  static constexpr struct {
    BinaryFile::Mode bit;
    int flag;
  } kFlags[] = {{BinaryFile::Mode::Read, O_RDONLY},
                {BinaryFile::Mode::Write, O_WRONLY},
                {BinaryFile::Mode::ReadWrite, O_RDWR},
                {BinaryFile::Mode::Truncate, O_TRUNC},
                {BinaryFile::Mode::Create, O_CREAT}};
  int flags = O_CLOEXEC;
  for (const auto& entry : kFlags) {
    if (static_cast<uint32_t>(mode) & static_cast<uint32_t>(entry.bit)) {
      flags |= entry.flag;
    }
  }
  return flags;
}

// The result of a transfer that is complete.
int FullCount(unsigned long n) {
  if (n >= kTopBit) ZT_RAISE(exception::OutOfRange());
  return static_cast<int>(n);
}

// True if a regular file surely ends before n more bytes: no memory need be taken for them then.
bool EndsBefore(int fd, unsigned int n) {
  struct stat info;
  off_t position = ::lseek(fd, 0, SEEK_CUR);
  return position >= 0 && ::fstat(fd, &info) == 0 && S_ISREG(info.st_mode) &&
         static_cast<int64_t>(info.st_size) - position < static_cast<int64_t>(n);
}

// Makes space after the buffer's bytes; null if that fails.
unsigned char* MakeRoom(AutoBuffer& buffer, unsigned int n) {
  unsigned int length = buffer.Len();
  try {
    buffer.Skip(n);
  } catch (const std::exception&) {  // Reads report by their result; the buffer is unchanged.
    errno = ENOMEM;
    return nullptr;
  }
  return buffer.Data() + length;
}

uint32_t InOrder(uint32_t value, BinaryFile::Endianness order) {
  return order == BinaryFile::Endianness::Little ? little_endian::ToLittleEndian(value)
                                                 : big_endian::ToBigEndian(value);
}

}  // namespace

BinaryFile::BinaryFile(const String& path, Mode mode, bool noThrow) : BinaryFile() {
  if (noThrow) {
    openNoThrow(path, mode);
  } else {
    open(path, mode);
  }
}

void BinaryFile::open(const String& path, Mode mode) {
  if (openNoThrow(path, mode) != 0) ZT_RAISE(PosixError());
}

int BinaryFile::openNoThrow(const String& path, Mode mode) {
  if (isOpen()) {
    errno = EINVAL;
    return -1;
  }
  int flags = OpenFlags(mode);
  mode_t permissions = (flags & O_CREAT) ? 0600 : 0;
  int failure;
  {
    AnsiString narrow(path);
    // The string's destructor frees memory, which may set errno: hence the block.
    m_fd = RetryEintr([&] { return ::open(narrow.c_str(), flags, permissions); });
    failure = errno;
  }
  errno = failure;
  return m_fd < 0 ? -1 : 0;
}

void BinaryFile::close() noexcept {
  ScopedFd closing(m_fd);
  m_fd = -1;
}

long BinaryFile::read(void* bytes, unsigned long n) const {
  return RetryEintr([&] { return ::read(m_fd, bytes, n); });
}

long BinaryFile::write(const void* bytes, unsigned long n) {
  return RetryEintr([&] { return ::write(m_fd, bytes, n); });
}

long BinaryFile::read(AutoBuffer& buffer, unsigned int n) const {
  unsigned char* room = MakeRoom(buffer, n);
  if (!room && n > 0) return -1;
  long got = read(room, n);
  int failure = errno;
  // Of the space that was made, what the transfer has not filled.
  buffer.UnAppend(got < 0 ? n : n - static_cast<unsigned int>(got));
  errno = failure;
  return got;
}

int BinaryFile::readExactSize(AutoBuffer& buffer, unsigned int n) const {
  if (n > kCheckedReadSize && EndsBefore(m_fd, n)) {
    errno = 0;  // as for a read that meets the end of the file
    return -1;
  }
  unsigned char* room = MakeRoom(buffer, n);
  if (!room && n > 0) return -1;
  int got = readExactSize(room, n);
  int failure = errno;
  if (got < 0) buffer.UnAppend(n);
  errno = failure;
  return got;
}

int BinaryFile::ReadExactSize(int fd, void* bytes, unsigned long n) {
  size_t got = zt::posix::MoveAll(n, [&](size_t done, size_t rest) {
    return ::read(fd, static_cast<char*>(bytes) + done, rest);
  });
  if (got == n) return FullCount(n);
  int failure = errno;
  // So that the caller may try another form at the same place. On a pipe this fails, and what was
  // read is lost; the failure is the read's.
  if (got > 0) ::lseek(fd, -static_cast<off_t>(got), SEEK_CUR);
  errno = failure;
  return -1;
}

int BinaryFile::WriteExactSize(int fd, const void* bytes, unsigned long n) {
  return zt::posix::WriteAll(fd, bytes, n) ? FullCount(n) : -1;
}

int64_t BinaryFile::readByteVector(AutoBuffer& buffer, Endianness order) {
  uint32_t length;
  if (readExactSize(&length, sizeof length) < 0) return -1;
  length = InOrder(length, order);
  if ((length & kTopBit) == 0 && readExactSize(buffer, length) >= 0) {
    return static_cast<int64_t>(length) + 4;
  }
  int failure = errno;
  seek(-static_cast<int64_t>(sizeof length), Origin::Current);
  errno = failure;
  return -1;
}

int64_t BinaryFile::writeByteVector(const BufferWrapper& bytes, Endianness order) {
  // A reader refuses such a length, so it is never written.
  if (bytes.Len() >= kTopBit) return -1;
  uint32_t length = InOrder(bytes.Len(), order);
  if (writeExactSize(&length, sizeof length) < 0) return -1;
  if (writeExactSize(bytes.Data(), bytes.Len()) < 0) return -1;
  return static_cast<int64_t>(bytes.Len()) + 4;
}

int64_t BinaryFile::seek(int64_t offset, Origin origin) const {
  return ::lseek(m_fd, offset, static_cast<int>(origin));
}

void BinaryFile::resize(int64_t size) {
  if (!isOpen()) return;
  if (RetryEintr([&] { return ::ftruncate(m_fd, size); }) != 0) ZT_RAISE(PosixError());
}

void BinaryFile::sync() {
  if (!isOpen()) return;
  if (RetryEintr([&] { return ::fsync(m_fd); }) != 0) ZT_RAISE(PosixError());
}

}  // namespace zt::fnd::osdep
