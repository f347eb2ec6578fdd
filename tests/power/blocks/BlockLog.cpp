#define FUSE_USE_VERSION 31
#include "tests/power/blocks/BlockLog.h"

#include <fcntl.h>
#include <fuse.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <fstream>
#include <stdexcept>

#include "tests/support/TempDir.h"

namespace vlt::test::power {
namespace {

constexpr char kDisk[] = "/disk", kMark[] = "/mark";

struct Header {
  BlockStep::Kind kind;
  uint32_t length;
  uint64_t offset;
};

// The server's own: the functions that it is made of have no object.
char* g_bytes = nullptr;
uint64_t g_size = 0;
int g_log = -1;

int Log(BlockStep::Kind kind, uint64_t offset, const char* bytes, size_t length) {
  Header header = {kind, static_cast<uint32_t>(length), offset};
  if (write(g_log, &header, sizeof header) != sizeof header) return -EIO;
  if (write(g_log, bytes, length) != static_cast<ssize_t>(length)) return -EIO;
  return 0;
}

bool IsDisk(const char* path) { return strcmp(path, kDisk) == 0; }
bool IsMark(const char* path) { return strcmp(path, kMark) == 0; }

int GetAttributes(const char* path, struct stat* info, fuse_file_info*) {
  *info = {};
  info->st_nlink = 1;
  info->st_mode = S_IFREG | 0600;
  if (IsDisk(path)) {
    info->st_size = static_cast<off_t>(g_size);
  } else if (strcmp(path, "/") == 0) {
    info->st_mode = S_IFDIR | 0755;
  } else if (!IsMark(path)) {
    return -ENOENT;
  }
  return 0;
}

int Open(const char* path, fuse_file_info* file) {
  // No mark is kept back or merged with another.
  file->direct_io = IsMark(path);
  return 0;
}

int Read(const char* path, char* out, size_t length, off_t offset, fuse_file_info*) {
  auto begin = static_cast<uint64_t>(offset);
  if (!IsDisk(path) || begin >= g_size) return 0;
  length = std::min<uint64_t>(length, g_size - begin);
  memcpy(out, g_bytes + begin, length);
  return static_cast<int>(length);
}

int Write(const char* path, const char* bytes, size_t length, off_t offset, fuse_file_info*) {
  int failed = 0;
  if (IsMark(path)) {
    failed = Log(BlockStep::Kind::Mark, strtoull(std::string(bytes, length).c_str(), nullptr, 10),
                 "", 0);
  } else {
    auto begin = static_cast<uint64_t>(offset);
    if (begin + length > g_size) return -ENOSPC;
    memcpy(g_bytes + begin, bytes, length);
    failed = Log(BlockStep::Kind::Write, begin, bytes, length);
  }
  return failed ? failed : static_cast<int>(length);
}

int Sync(const char* path, int, fuse_file_info*) {
  return IsDisk(path) ? Log(BlockStep::Kind::Flush, 0, "", 0) : 0;
}

int Truncate(const char*, off_t, fuse_file_info*) { return 0; }

int Serve(const std::string& directory, uint64_t sizeBytes, const std::string& logFile) {
  g_size = sizeBytes;
  void* bytes = mmap(nullptr, sizeBytes, PROT_READ | PROT_WRITE,
                     MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
  g_log = open(logFile.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600);
  if (bytes == MAP_FAILED || g_log < 0) return 1;
  g_bytes = static_cast<char*>(bytes);
  fuse_operations operations = {};
  operations.getattr = GetAttributes;
  operations.open = Open;
  operations.read = Read;
  operations.write = Write;
  operations.fsync = Sync;
  operations.truncate = Truncate;
  std::string program = "recorded-disk", foreground = "-f", single = "-s", place = directory;
  char* arguments[] = {program.data(), foreground.data(), single.data(), place.data(), nullptr};
  return fuse_main(4, arguments, &operations, nullptr);
}

}  // namespace

RecordedDisk::RecordedDisk(const std::string& directory, uint64_t sizeBytes,
                           const std::string& logFile)
    : m_directory(directory), m_server([=] { return Serve(directory, sizeBytes, logFile); }) {
  if (!Eventually([&] { return Exists(disk()) || !m_server.running(); }) || !Exists(disk())) {
    throw std::runtime_error("the recorded disk does not come up");
  }
}

RecordedDisk::~RecordedDisk() {
  umount2(m_directory.c_str(), MNT_DETACH);
  m_server.wait();
}

std::vector<BlockStep> ReadBlockLog(const std::string& file) {
  std::ifstream in(file, std::ios::binary);
  std::vector<BlockStep> steps;
  Header header;
  while (in.read(reinterpret_cast<char*>(&header), sizeof header)) {
    BlockStep step = {header.kind, header.offset, std::string(header.length, '\0')};
    if (!in.read(step.bytes.data(), header.length)) throw std::runtime_error("a torn record");
    steps.push_back(std::move(step));
  }
  return steps;
}

}  // namespace vlt::test::power
