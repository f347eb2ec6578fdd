#pragma once

#include <string>

#include "source/vlIniMgr.h"

// Short forms of opening and reading guarded files, for tests.
namespace vlt::test {

inline std::string Value(const CvlIniMgr& ini, const char* section, const char* item) {
  std::string value;
  return ini.GetItem(section, item, &value) == S_OK ? value : "(none)";
}

// 0 when the constructor goes through, else the integer that it throws.
inline int Open(const std::string& file, const std::string& digest = "") {
  try {
    auto* expected = reinterpret_cast<const unsigned char*>(digest.data());
    CvlIniMgr ini(file.c_str(), false, digest.empty() ? nullptr : expected, false, true);
    return 0;
  } catch (int thrown) {
    return thrown;
  }
}

}  // namespace vlt::test
