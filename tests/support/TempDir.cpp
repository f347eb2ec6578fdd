#include "tests/support/TempDir.h"

#include <errno.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <system_error>

namespace vlt::test {

namespace fs = std::filesystem;

TempDir::TempDir() {
  std::string pattern = (fs::temp_directory_path() / "t.XXXXXX").string();
  if (!mkdtemp(pattern.data())) throw std::system_error(errno, std::generic_category(), pattern);
  m_path = pattern;
}

TempDir::~TempDir() {
  std::error_code
      ignored;  // A test may have taken rights away; the run's own directory goes later.
  fs::remove_all(m_path, ignored);
}

std::string TempDir::makeDir(std::string_view name) const {
  std::string path = *this / name;
  fs::create_directories(path);
  return path;
}

std::string ReadBytes(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  EXPECT_TRUE(in.is_open()) << path;
  return std::string(std::istreambuf_iterator<char>(in), {});
}

void WriteBytes(const std::string& path, std::string_view bytes) {
  std::ofstream out(path, std::ios::binary | std::ios::trunc);
  out.write(bytes.data(), static_cast<std::streamsize>(bytes.size()));
  out.close();
  ASSERT_TRUE(out) << path;
}

int ModeOf(const std::string& path) {
  struct stat info;
  return lstat(path.c_str(), &info) == 0 ? static_cast<int>(info.st_mode & 07777) : -1;
}

bool Exists(const std::string& path) { return ModeOf(path) >= 0; }

ScopedUmask::ScopedUmask(mode_t mask) : m_old(umask(mask)) {}
ScopedUmask::~ScopedUmask() { umask(m_old); }

int OpenDescriptors() {
  int count = 0;
  for ([[maybe_unused]] const auto& entry : fs::directory_iterator("/proc/self/fd")) ++count;
  return count - 1;  // The listing itself holds one.
}

}  // namespace vlt::test
