#include "tests/support/Modules.h"

#include <dlfcn.h>

#include <filesystem>
#include <fstream>
#include <system_error>

namespace vlt::test {
namespace {

bool IsLoaded(const std::string& name) { return dlopen(name.c_str(), RTLD_NOW | RTLD_NOLOAD); }

}  // namespace

void MakeModule(const std::string& path) {
  std::filesystem::copy_file(VLT_TEST_MODULE, path,
                             std::filesystem::copy_options::overwrite_existing);
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

bool LoadForItsName(const std::string& path) {
  if (!dlopen(path.c_str(), RTLD_NOW)) return false;
  const std::filesystem::path module = path;
  if (IsLoaded(module.filename())) return true;
  // musl knows a module by its bare name once it has found it by that name. Its row's programs search
  // the directory "named" of the working directory.
  const std::filesystem::path before = std::filesystem::current_path();
  std::filesystem::current_path(module.parent_path());
  std::error_code alreadyThere;
  std::filesystem::create_directory_symlink(".", "named", alreadyThere);
  const bool found = IsLoaded(module.filename());
  std::filesystem::current_path(before);
  return found;
}

}  // namespace vlt::test
