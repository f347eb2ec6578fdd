#include "zt/fnd/osdep/BinaryFile.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/mman.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstring>
#include <string>
#include <thread>

#include "tests/support/Child.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/TempDir.h"
#include "tests/support/ThreadState.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/OSException.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::ModeOf;
using vlt::test::PosixErrorOf;
using vlt::test::ReadBytes;
using vlt::test::TempDir;
using vlt::test::Wide;
using vlt::test::WriteBytes;
using Mode = BinaryFile::Mode;
using Origin = BinaryFile::Origin;
using Endianness = BinaryFile::Endianness;

std::string Text(const AutoBuffer& b) {
  return b.Len() == 0 ? std::string() : std::string(reinterpret_cast<char*>(b.Data()), b.Len());
}

// A file of these bytes, open for reading and writing.
struct Opened {
  TempDir dir;
  std::string path = dir / "file";
  BinaryFile file;
  explicit Opened(const std::string& bytes) {
    WriteBytes(path, bytes);
    file.open(Wide(path), Mode::ReadWrite);
  }
  int64_t position() const { return file.seek(0, Origin::Current); }
};

TEST(BinaryFile, ModeBitsHaveTheirValues) {
  EXPECT_EQ(1u, static_cast<unsigned>(Mode::Read));
  EXPECT_EQ(0x14u, static_cast<unsigned>(Mode::ReadWrite | Mode::Create));
  EXPECT_EQ(0x1Cu, static_cast<unsigned>(Mode::ReadWrite | Mode::Create | Mode::Truncate));
  EXPECT_EQ(2u, static_cast<unsigned>(Mode::Write));
}

TEST(BinaryFile, CreatedFileIsPrivateAndCloseOnExec) {
  TempDir dir;
  BinaryFile file(Wide(dir / "new"), static_cast<Mode>(20), false);
  EXPECT_EQ(ModeOf(dir / "new"), 0600);
  int fd = ::open("/dev/null", O_RDONLY | O_CLOEXEC);
  EXPECT_EQ(FD_CLOEXEC, fcntl(fd - 1, F_GETFD)) << "the file's descriptor is the one below";
  ::close(fd);
}

TEST(BinaryFile, CreateObeysTheUmask) {
  TempDir dir;
  vlt::test::Child child([&] {
    umask(0277);
    BinaryFile file;
    file.open(Wide(dir / "new"), static_cast<Mode>(20));
    return 0;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ModeOf(dir / "new"), 0400);
}

TEST(BinaryFile, ModesOpenAsToldBitByBit) {
  Opened o("0123456789");
  char c;
  auto tryMode = [&](unsigned mode, bool reads, bool writes) {
    BinaryFile file;
    ASSERT_EQ(file.openNoThrow(Wide(o.path), static_cast<Mode>(mode)), 0) << mode;
    EXPECT_EQ(reads ? 1 : -1, file.read(&c, 1)) << mode;
    EXPECT_EQ(writes ? 1 : -1, file.write("x", 1)) << mode;
  };
  tryMode(1, true, false);
  tryMode(2, false, true);
  tryMode(4, true, true);
  tryMode(1 | 2, false, true);   // reading is no bit of the system's
  tryMode(2 | 4, false, false);  // both access modes together are none
  EXPECT_EQ(ReadBytes(o.path).size(), 10u);
  tryMode(1 | 4, true, true);
  BinaryFile truncated(Wide(o.path), Mode::Read | Mode::Truncate, false);
  EXPECT_EQ(ReadBytes(o.path), "");
}

TEST(BinaryFile, OpenFailuresThrowOrReturn) {
  TempDir dir;
  BinaryFile file;
  EXPECT_EQ(PosixErrorOf([&] { file.open(Wide(dir / "no"), Mode::Read); }), ENOENT);
  errno = 0;
  EXPECT_EQ(file.openNoThrow(Wide(dir / "no"), Mode::Read), -1);
  EXPECT_EQ(errno, ENOENT);
  EXPECT_FALSE(file.isOpen());
  EXPECT_EQ(PosixErrorOf([&] { BinaryFile(Wide(dir.path()), Mode::Write, false); }), EISDIR);
  EXPECT_FALSE(BinaryFile(Wide(dir / "no"), Mode::Read, true).isOpen());
}

TEST(BinaryFile, OpeningAnOpenObjectIsRefusedAndLeavesIt) {
  Opened o("abc");
  char c;
  ASSERT_EQ(o.file.read(&c, 1), 1);
  errno = 0;
  EXPECT_EQ(o.file.openNoThrow(Wide(o.dir / "other"), static_cast<Mode>(20)), -1);
  EXPECT_EQ(errno, EINVAL);
  EXPECT_EQ(PosixErrorOf([&] { o.file.open(Wide(o.path), Mode::Read); }), EINVAL);
  EXPECT_FALSE(vlt::test::Exists(o.dir / "other"));
  ASSERT_EQ(o.file.read(&c, 1), 1);
  EXPECT_EQ(c, 'b');
}

TEST(BinaryFile, ClosedObjectReportsAndDoesNothing) {
  BinaryFile file;
  char c = 'x';
  AutoBuffer buffer;
  EXPECT_EQ(file.read(&c, 1), -1);
  EXPECT_EQ(file.write(&c, 1), -1);
  EXPECT_EQ(file.read(buffer, 3), -1);
  EXPECT_EQ(buffer.Len(), 0u);
  EXPECT_EQ(file.readExactSize(&c, 1), -1);
  EXPECT_EQ(file.writeExactSize(&c, 1), -1);
  EXPECT_EQ(file.readExactSize(buffer, 3), -1);
  EXPECT_EQ(file.readExactSize(&c, 0), 0);
  EXPECT_EQ(file.writeExactSize(&c, 0), 0);
  EXPECT_EQ(file.readByteVector(buffer, Endianness::Little), -1);
  EXPECT_EQ(file.writeByteVector(BufferWrapper("a", 1), Endianness::Little), -1);
  EXPECT_EQ(file.seek(0, Origin::Begin), -1);
  file.resize(5);
  file.sync();
  file.close();
  file.close();
}

TEST(BinaryFile, CloseAndDestructorGiveTheDescriptorBack) {
  TempDir dir;
  int before = vlt::test::OpenDescriptors();
  {
    BinaryFile file(Wide(dir / "f"), static_cast<Mode>(20), false);
    EXPECT_EQ(before + 1, vlt::test::OpenDescriptors());
    file.close();
    EXPECT_EQ(before, vlt::test::OpenDescriptors());
    file.open(Wide(dir / "f"), Mode::Read);
  }
  EXPECT_EQ(before, vlt::test::OpenDescriptors());
}

TEST(BinaryFile, ReadMayBeShortAndIsZeroAtTheEnd) {
  Opened o("abcdef");
  char bytes[10];
  EXPECT_EQ(o.file.read(bytes, 10), 6);
  EXPECT_EQ(o.file.read(bytes, 10), 0);
  EXPECT_EQ(o.file.seek(3, Origin::Begin), 3);
  AutoBuffer buffer(BufferWrapper("xy", 2));
  EXPECT_EQ(o.file.read(buffer, 10), 3);
  EXPECT_EQ(Text(buffer), "xydef");
  EXPECT_EQ(o.file.read(buffer, 10), 0);
  EXPECT_EQ(Text(buffer), "xydef");
}

TEST(BinaryFile, ExactReadIsAllOrNothing) {
  Opened o("abcdef");
  char bytes[10];
  EXPECT_EQ(o.file.readExactSize(bytes, 4), 4);
  EXPECT_EQ(memcmp(bytes, "abcd", 4), 0);
  EXPECT_EQ(o.file.readExactSize(bytes, 3), -1);
  EXPECT_EQ(o.position(), 4);
  AutoBuffer buffer(BufferWrapper("xy", 2));
  EXPECT_EQ(o.file.readExactSize(buffer, 3), -1);
  EXPECT_EQ(Text(buffer), "xy");
  EXPECT_EQ(o.position(), 4);
  EXPECT_EQ(o.file.readExactSize(buffer, 2), 2);
  EXPECT_EQ(Text(buffer), "xyef");
  EXPECT_EQ(o.file.readExactSize(bytes, 1), -1);
  EXPECT_EQ(o.position(), 6);
}

TEST(BinaryFile, HugeExactReadOfASmallFileTakesNoMemory) {
  Opened o("abc");
  AutoBuffer buffer;
  errno = EDOM;
  EXPECT_EQ(o.file.readExactSize(buffer, 0xFFFFFFF0u), -1);
  EXPECT_EQ(errno, 0);  // the end of the file
  EXPECT_EQ(buffer.Capacity(), 0u);
  EXPECT_EQ(o.position(), 0);
}

TEST(BinaryFile, ReadThatNoBufferCanHoldIsENOMEM) {
  BinaryFile zeros(L"/dev/zero", Mode::Read, false);
  AutoBuffer buffer(BufferWrapper(std::string(32, 'x').data(), 32));
  errno = EDOM;
  EXPECT_EQ(zeros.readExactSize(buffer, 0xFFFFFFF0u), -1);  // more than 32 bits together
  EXPECT_EQ(errno, ENOMEM);
  errno = EDOM;
  EXPECT_EQ(zeros.read(buffer, 0xFFFFFFF0u), -1);
  EXPECT_EQ(errno, ENOMEM);
  EXPECT_EQ(std::string(32, 'x'), Text(buffer));
}

TEST(BinaryFile, ExactTransferGoesOnAfterShortOnes) {
  int fds[2];
  ASSERT_EQ(pipe2(fds, O_CLOEXEC), 0);
  std::string sent(300000, 's'), got(300000, '\0');  // several times what a pipe holds
  std::thread writer([&] {
    EXPECT_EQ(BinaryFile::WriteExactSize(fds[1], sent.data(), sent.size()), 300000);
    ::close(fds[1]);
  });
  EXPECT_EQ(BinaryFile::ReadExactSize(fds[0], got.data(), got.size()), 300000);
  writer.join();
  EXPECT_EQ(sent, got);
  EXPECT_EQ(BinaryFile::ReadExactSize(fds[0], got.data(), 1), -1);
  ::close(fds[0]);
}

TEST(BinaryFile, ExactTransferSurvivesSignals) {
  struct sigaction action = {}, before = {};
  action.sa_handler = [](int) {};
  sigaction(SIGUSR1, &action, &before);  // without SA_RESTART
  int fds[2];
  ASSERT_EQ(pipe2(fds, O_CLOEXEC), 0);
  std::atomic<int> result{-2};
  char bytes[4];
  vlt::test::WatchedThread reader([&] { result = BinaryFile::ReadExactSize(fds[0], bytes, 4); });
  for (int i = 0; i < 20; ++i) {
    ASSERT_TRUE(reader.blocksIn(SYS_read));
    pthread_kill(reader.handle(), SIGUSR1);
  }
  EXPECT_EQ(result, -2);
  EXPECT_EQ(BinaryFile::WriteExactSize(fds[1], "abcd", 4), 4);
  reader.join();
  EXPECT_EQ(result, 4);
  sigaction(SIGUSR1, &before, nullptr);
  ::close(fds[0]);
  ::close(fds[1]);
}

TEST(BinaryFile, ExactWriteThatFailsLeavesWhatItWrote) {
  TempDir dir;
  vlt::test::Child child([&] {
    signal(SIGXFSZ, SIG_IGN);
    rlimit limit = {10, 10};
    setrlimit(RLIMIT_FSIZE, &limit);
    BinaryFile file(Wide(dir / "f"), static_cast<Mode>(20), false);
    if (file.writeExactSize("0123456789abcdef", 16) != -1) return 1;
    if (errno != EFBIG) return 2;
    return file.seek(0, Origin::Current) == 10 ? 0 : 3;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ReadBytes(dir / "f"), "0123456789");
}

TEST(BinaryFile, ExactCountBeyondThirtyOneBitsThrowsAfterTheTransfer) {
  if constexpr (sizeof(void*) > 4) {
    TempDir dir;
    int fd = ::open((dir / "sparse").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
    const unsigned long n = 0x80000000ul;
    ASSERT_EQ(ftruncate(fd, static_cast<off_t>(n)), 0);
    // Reads into pages that one small piece of memory backs would need as much; the zero
    // device takes them without.
    int null = ::open("/dev/null", O_WRONLY | O_CLOEXEC);
    void* zeros = mmap(nullptr, n, PROT_READ, MAP_PRIVATE, fd, 0);
    ASSERT_NE(MAP_FAILED, zeros);
    EXPECT_THROW(BinaryFile::WriteExactSize(null, zeros, n), exception::OutOfRange);
    EXPECT_EQ(BinaryFile::WriteExactSize(null, zeros, n - 1), 0x7FFFFFFF);
    munmap(zeros, n);
    ::close(null);
    ::close(fd);
  }
}

TEST(BinaryFile, ByteVectorsInBothOrders) {
  for (Endianness order : {Endianness::Little, Endianness::Big, static_cast<Endianness>(7)}) {
    Opened o("");
    EXPECT_EQ(o.file.writeByteVector(BufferWrapper("abc", 3), order), 7);
    EXPECT_EQ(o.file.writeByteVector(BufferWrapper(), order), 4);
    const bool little = order == Endianness::Little;
    EXPECT_EQ(
        little ? std::string("\3\0\0\0abc\0\0\0\0", 11) : std::string("\0\0\0\3abc\0\0\0\0", 11),
        ReadBytes(o.path));
    o.file.seek(0, Origin::Begin);
    AutoBuffer buffer(BufferWrapper("x", 1));
    EXPECT_EQ(o.file.readByteVector(buffer, order), 7);
    EXPECT_EQ(Text(buffer), "xabc");
    EXPECT_EQ(o.file.readByteVector(buffer, order), 4);
    EXPECT_EQ(o.file.readByteVector(buffer, order), -1);
    EXPECT_EQ(Text(buffer), "xabc");
    EXPECT_EQ(o.position(), 11);
  }
}

TEST(BinaryFile, ByteVectorTooLongWritesNothing) {
  Opened o("");
  EXPECT_EQ(o.file.writeByteVector(BufferWrapper("x", 0x80000000u), Endianness::Little), -1);
  EXPECT_EQ(o.file.writeByteVector(BufferWrapper("x", 0xFFFFFFFFu), Endianness::Big), -1);
  EXPECT_EQ(ReadBytes(o.path), "");
  EXPECT_EQ(o.position(), 0);
}

TEST(BinaryFile, BrokenByteVectorsLeavePositionAndBuffer) {
  const std::string rows[] = {std::string("z\5\0\0\0abc", 8), std::string("z\0\0\0\x80q", 6),
                              std::string("z\xff\xff\xff\x7f", 5), std::string("z\1\0\0", 4)};
  for (const std::string& bytes : rows) {
    Opened o(bytes);
    o.file.seek(1, Origin::Begin);
    AutoBuffer buffer(BufferWrapper("x", 1));
    EXPECT_EQ(o.file.readByteVector(buffer, Endianness::Little), -1);
    EXPECT_EQ(o.position(), 1);
    EXPECT_EQ(Text(buffer), "x");
  }
}

TEST(BinaryFile, SeekResizeSync) {
  Opened o("abcdef");
  EXPECT_EQ(o.file.seek(-2, Origin::End), 4);
  EXPECT_EQ(o.file.seek(-1, Origin::Current), 3);
  EXPECT_EQ(o.file.seek(-1, Origin::Begin), -1);
  o.file.resize(2);
  EXPECT_EQ(ReadBytes(o.path), "ab");
  o.file.resize(4);
  EXPECT_EQ(ReadBytes(o.path), std::string("ab\0\0", 4));
  EXPECT_EQ(PosixErrorOf([&] { o.file.resize(-1); }), EINVAL);
  o.file.sync();
  const int64_t large = 5000000000;
  o.file.resize(large);
  EXPECT_EQ(large, o.file.seek(0, Origin::End));
  int fds[2];
  ASSERT_EQ(pipe2(fds, O_CLOEXEC), 0);
  BinaryFile pipeEnd(Wide("/proc/self/fd/" + std::to_string(fds[1])), Mode::Write, false);
  EXPECT_EQ(PosixErrorOf([&] { pipeEnd.sync(); }), EINVAL);
  ::close(fds[0]);
  ::close(fds[1]);
}

}  // namespace
}  // namespace zt::fnd::osdep
