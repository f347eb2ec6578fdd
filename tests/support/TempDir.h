#pragma once

#include <sys/types.h>

#include <string>
#include <string_view>

namespace vlt::test {

// A fresh directory that goes with the object, contents included.
//
// Lies below $TMPDIR, which tests/support/main.cpp points into the directory of the running test.
class TempDir {
 public:
  TempDir();
  ~TempDir();
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;

  // Absolute, without a slash at the end.
  const std::string& path() const { return m_path; }

  // path() + "/" + name.
  std::string operator/(std::string_view name) const { return m_path + "/" + std::string(name); }

  // Makes the directory and the missing ones above it; returns its path.
  std::string makeDir(std::string_view name) const;

 private:
  std::string m_path;
};

// Bytes of a file; fails the test and returns an empty text if it cannot be read.
std::string ReadBytes(const std::string& path);

// Creates or replaces the file with exactly these bytes.
void WriteBytes(const std::string& path, std::string_view bytes);

// Permission bits (07777) of what the path names; a symbolic link is not followed. -1 if missing.
int ModeOf(const std::string& path);

// True if the path names anything, a dangling link included.
bool Exists(const std::string& path);

// Sets the process's umask for a scope.
class ScopedUmask {
 public:
  explicit ScopedUmask(mode_t mask);
  ~ScopedUmask();
  ScopedUmask(const ScopedUmask&) = delete;
  ScopedUmask& operator=(const ScopedUmask&) = delete;

 private:
  mode_t m_old;
};

// Number of open descriptors of this process.
int OpenDescriptors();

}  // namespace vlt::test
