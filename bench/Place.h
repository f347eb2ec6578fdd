#pragma once

#include <stdlib.h>

#include <filesystem>
#include <string>
#include <system_error>

// A directory for the whole run, where the objects that processes share live.
class Place {
 public:
  Place() {
    m_path = (std::filesystem::temp_directory_path() / "vlt.bench.XXXXXX").string();
    if (!mkdtemp(m_path.data())) abort();
    setenv("ZTFNDTMPSHAREDFILEDIR", m_path.c_str(), 1);
  }
  ~Place() {
    std::error_code ignored;  // what cannot be removed lies in the temporary directory anyway
    std::filesystem::remove_all(m_path, ignored);
  }
  Place(const Place&) = delete;
  Place& operator=(const Place&) = delete;
  const std::string& path() const { return m_path; }

 private:
  std::string m_path;
};

inline const Place& ThePlace() {
  static Place place;
  return place;
}
