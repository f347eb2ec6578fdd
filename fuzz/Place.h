#pragma once

#include <stdlib.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

#include "fuzz/Input.h"

namespace fuzz {

// A directory of the run's own, which goes with the object.
struct Place {
  Place() {
    const char* tmp = getenv("TMPDIR");
    std::string pattern = std::string(tmp ? tmp : "/tmp") + "/vltfuzz.XXXXXX";
    Demand(mkdtemp(pattern.data()) != nullptr);
    base = pattern;
  }
  ~Place() { std::filesystem::remove_all(base); }
  Place(const Place&) = delete;
  Place& operator=(const Place&) = delete;

  std::string operator/(const std::string& name) const { return base + "/" + name; }

  std::string base;
};

inline void WriteFile(const std::string& file, const std::string& bytes) {
  std::ofstream(file, std::ios::binary | std::ios::trunc) << bytes;
}

inline std::string ReadFile(const std::string& file) {
  std::ifstream in(file, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(in), {});
}

}  // namespace fuzz
