#include "vlloader/source/StorageModule.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/Bundle.h"
#include "zt/fnd/osdep/SharedLibrary.h"
#include "zt/fnd/osdep/path.h"

namespace {

using zt::fnd::AnsiString;
using zt::fnd::String;

class BundleModule : public StorageModule {
 public:
  explicit BundleModule(const String& path) : m_bundle(path) {}
  bool isOpened() const { return m_bundle.isOpened(); }
  void* find(const char* name) const override {
    return m_bundle.getFunctionPointer(String(name), true);
  }

 private:
  zt::fnd::osdep::Bundle m_bundle;
};

class LibraryModule : public StorageModule {
 public:
  explicit LibraryModule(const String& path) : m_library(path, true, true) {}
  bool isOpened() const { return m_library.isLoaded(); }
  void* find(const char* name) const override {
    return m_library.getFunctionPointer(AnsiString(name), true);
  }

 private:
  zt::fnd::osdep::SharedLibrary m_library;
};

// Both kinds report a failed load by a question only, so that the choice of a kind and its success
// stay apart: a directory that does not load is not tried as a library.
template <class Module>
std::unique_ptr<StorageModule> IfOpened(std::unique_ptr<Module> module) {
  if (!module->isOpened()) return nullptr;
  return module;
}

}  // namespace

std::unique_ptr<StorageModule> StorageModule::Open(const std::string& directory,
                                                   const std::string& name) {
  std::string base = directory + (directory.ends_with('/') ? "" : "/");
  String bundle((base + name + ".framework").c_str());
  if (zt::fnd::osdep::path::IsDirectory(bundle.c_str())) {
    return IfOpened(std::make_unique<BundleModule>(bundle));
  }
  return IfOpened(std::make_unique<LibraryModule>(String((base + "lib" + name + ".so").c_str())));
}
