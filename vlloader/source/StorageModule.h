#pragma once

#include <memory>
#include <string>

// One loaded module of the installation; unloaded with the object.
class StorageModule {
 public:
  // Loads the bundle <directory>/<name>.framework; where there is no such directory, the shared
  // library <directory>/lib<name>.so. Null if neither loads.
  static std::unique_ptr<StorageModule> Open(const std::string& directory, const std::string& name);

  virtual ~StorageModule() = default;
  // Address of the entry, or null.
  virtual void* find(const char* name) const = 0;
};
