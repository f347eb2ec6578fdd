#include <dlfcn.h>
#include <sys/stat.h>

#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/ForkSafeMutex.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/LeakedInstance.h"
#include "zt/fnd/osdep/LoadModule.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/path.h"
#include "zt/posix/Retry.h"

using zt::posix::RetryEintr;

namespace zt::fnd::osdep {

namespace {

// The loader has a lock of its own, which a child may find held for good.
struct Loading {
  ForkSafeMutex lock{AtFork::Wait, 80};
};

ForkSafeMutex& LoadingLock() { return LeakedInstance<Loading>().lock; }

}  // namespace

void* LoadModule(const String& name) {
  AnsiString narrow(name);
  struct stat info;
  // Without a "/" the loader searches its own path.
  if (name.find(L'/') != String::npos &&
      RetryEintr([&] { return ::stat(narrow.c_str(), &info); }) == 0 && !S_ISREG(info.st_mode)) {
    return nullptr;
  }
  Hold hold(LoadingLock());
  // RTLD_NOW: a module with a missing symbol fails here, where it is reported, and not at its first
  // call. RTLD_GLOBAL: components use the symbols of those loaded before them.
  return ::dlopen(narrow.c_str(), RTLD_NOW | RTLD_GLOBAL);
}

void UnloadModule(void* module) {
  if (!module) return;
  Hold hold(LoadingLock());
  ::dlclose(module);
}

void* FindFunction(void* module, const AnsiString& name) {
  Hold hold(LoadingLock());
  return ::dlsym(module, name.c_str());
}

void RaiseLoaderError() {
  const char* text = ::dlerror();
  ZT_RAISE(PosixError(text ? text : "", -1));
}

bool NeedsDecoration(const String& name) { return path::BaseName(name).find(L'.') == String::npos; }

}  // namespace zt::fnd::osdep
