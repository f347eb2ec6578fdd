// The form of bundles on Linux: a directory, named as the module with a suffix, and the module's
// shared object inside it. The system knows no such thing, so that opening one is a search for a
// file that dlopen takes.
#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/Bundle.h"
#include "zt/fnd/osdep/LoadModule.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/path.h"

namespace zt::fnd::osdep {
namespace {

// "/a/X.framework" gives "X".
String Stem(const String& directory) {
  String base = path::BaseName(directory);
  String::size_type dot = base.rfind(L'.');
  return dot == String::npos ? base : base.substr(0, dot);
}

// Empty for a relative path where the working directory is gone: nothing can be found there.
String Absolute(const String& path) {
  try {
    return path::AbsPath(path);
  } catch (const PosixError&) {  // Opening reports nothing.
    return String();
  }
}

}  // namespace

struct Bundle::Module {
  void* handle;
  bool keep = false;

  explicit Module(void* loaded) : handle(loaded) {}
  ~Module() {
    if (!keep) UnloadModule(handle);
  }
  Module(const Module&) = delete;
  Module& operator=(const Module&) = delete;
};

Bundle::Bundle(const String& name) {
  if (name.empty()) return;
  String decorated = decorateName(name);
  // Without a directory part the working directory would be searched, from which a module must not
  // come.
  if (decorated.exactCompare(path::BaseName(decorated)) != 0) openFromPath(decorated);
}

Bundle::~Bundle() = default;

bool Bundle::openFromPath(const String& path) {
  String directory = Absolute(path);
  // A regular file of this name is not a failed bundle: SharedLibrary loads it as a library in its
  // next step.
  if (!path::IsDirectory(directory.c_str())) return false;
  String stem = Stem(directory);
  if (stem.empty()) return false;
  // From the usual name to the bare one, which is how bundles of other systems name their module.
  const String names[] = {String(L"lib") + stem + L".so", stem + L".so", stem};
  for (const String& name : names) {
    if (void* handle = LoadModule(path::Join(directory, name))) {
      m_bundle = std::make_shared<Module>(handle);
      return true;
    }
  }
  return false;
}

void* Bundle::getFunctionPointer(const String& name, bool noThrow) const {
  if (!isOpened()) {
    if (noThrow) return nullptr;
    ZT_RAISE(exception::InvalidOperation());
  }
  void* function = FindFunction(m_bundle->handle, AnsiString(name));
  if (!function && !noThrow) RaiseLoaderError();
  return function;
}

void Bundle::keepLoaded() {
  if (isOpened()) m_bundle->keep = true;
}

String Bundle::decorateName(const String& name) {
  if (name.empty()) ZT_RAISE(exception::InvalidArgument());
  return NeedsDecoration(name) ? name + L".bundle" : name;
}

}  // namespace zt::fnd::osdep
