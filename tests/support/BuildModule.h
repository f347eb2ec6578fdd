#pragma once

#include <gtest/gtest.h>

#include <string>

#include "tests/support/Child.h"
#include "tests/support/TempDir.h"

namespace vlt::test {

// Compiles the C++ text to a shared object of this process's word size at the path, under that name.
inline void BuildModule(const std::string& path, const std::string& source) {
  TempDir dir;
  WriteBytes(dir / "module.cpp", source);
  std::string name = path.substr(path.rfind('/') + 1);
  ProgramResult result =
      RunProgram({"c++", "-shared", "-fPIC", sizeof(void*) == 4 ? "-m32" : "-m64",
                  "-Wl,-soname," + name, "-o", path, dir / "module.cpp"});
  ASSERT_EQ(result.exitCode, 0) << result.err;
}

}  // namespace vlt::test
