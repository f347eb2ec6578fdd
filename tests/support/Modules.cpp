#include "tests/support/Modules.h"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cmath>
#include <filesystem>
#include <fstream>

namespace vlt::test {

void MakeModule(const std::string& path) {
  void* system = dlopen("libm.so.6", RTLD_NOW | RTLD_NOLOAD);
  Dl_info info = {};
  if (!system || !dladdr(dlsym(system, "cos"), &info)) {
    ADD_FAILURE() << "the mathematics library cannot be found";
    return;
  }
  std::filesystem::copy_file(info.dli_fname, path,
                             std::filesystem::copy_options::overwrite_existing);
  dlclose(system);
}

bool IsCosine(void* function) {
  return function != nullptr && reinterpret_cast<double (*)(double)>(function)(0.0) == 1.0;
}

bool IsMapped(const std::string& path) {
  std::ifstream maps("/proc/self/maps");
  for (std::string line; std::getline(maps, line);) {
    auto slash = line.find('/');
    if (slash != std::string::npos && line.substr(slash) == path) return true;
  }
  return false;
}

}  // namespace vlt::test
