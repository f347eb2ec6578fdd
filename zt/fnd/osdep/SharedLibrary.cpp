// A bare name stands for a module in whatever form the installation has it; load() tries the forms
// in a fixed order and keeps the first that loads. m_handle is the loader's handle for a library
// and an owned Bundle for a bundle; m_isBundle says which. Nothing here reports why a form did not
// load: a failure is only that of all three, and the loader's text, asked for by
// getFunctionPointer, is of the last one.
#include "zt/fnd/osdep/SharedLibrary.h"

#include <memory>
#include <utility>

#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/Bundle.h"
#include "zt/fnd/osdep/LoadModule.h"
#include "zt/fnd/osdep/path.h"

namespace zt::fnd::osdep {
namespace {

// Of the library file; the system's own suffix.
constexpr const wchar_t* kPrefix = L"lib";
constexpr const wchar_t* kSuffix = L".so";

String Decorated(const String& name, const wchar_t* suffix) {
  return NeedsDecoration(name) ? name + suffix : name;
}

String LibraryName(const String& name) {
  if (!NeedsDecoration(name)) return name;
  return path::Join(path::DirName(name), String(kPrefix) + path::BaseName(name) + kSuffix);
}

}  // namespace

SharedLibrary::SharedLibrary()
    : m_handle(nullptr), m_unloadOnDestroy(true), m_secondFlag(false), m_isBundle(false) {}

SharedLibrary::SharedLibrary(const String& name, bool unloadOnDestroy, bool secondFlag)
    : SharedLibrary() {
  m_unloadOnDestroy = unloadOnDestroy;
  m_secondFlag = secondFlag;
  m_requestedName = name;
  SharedLibrary::load();
}

SharedLibrary::SharedLibrary(const AnsiString& name, bool unloadOnDestroy, bool secondFlag)
    : SharedLibrary(String(name), unloadOnDestroy, secondFlag) {}

SharedLibrary::SharedLibrary(const SharedLibrary& other)
    : m_loadedName(other.m_loadedName),
      m_handle(nullptr),
      m_unloadOnDestroy(other.m_unloadOnDestroy),
      m_secondFlag(other.m_secondFlag),
      m_requestedName(other.m_requestedName),
      m_isBundle(other.m_isBundle) {
  // By name again, which raises the system's count: each object then unloads for itself. Qualified,
  // since in a constructor a virtual call means this class all the same.
  if (other.isLoaded()) SharedLibrary::load();
}

SharedLibrary& SharedLibrary::operator=(const SharedLibrary& other) {
  SharedLibrary copy(other);
  swap(copy);
  return *this;
}

SharedLibrary::~SharedLibrary() {
  if (!m_unloadOnDestroy && m_isBundle && m_handle) {
    // A Bundle unloads with its last copy, and this may be it.
    static_cast<Bundle*>(m_handle)->keepLoaded();
    m_unloadOnDestroy = true;  // of the Bundle only its own memory is left to free
  }
  if (m_unloadOnDestroy) SharedLibrary::unload();
}

void SharedLibrary::unload() {
  void* handle = std::exchange(m_handle, nullptr);
  if (m_isBundle) {
    delete static_cast<Bundle*>(handle);
  } else {
    UnloadModule(handle);
  }
}

void SharedLibrary::load() {
  if (m_requestedName.empty()) return;
  if (loadAsBundle(Decorated(m_requestedName, L".framework"))) return;
  if (loadAsBundle(Decorated(m_requestedName, L".bundle"))) return;
  String library = LibraryName(m_requestedName);
  if (void* handle = LoadModule(library)) adopt(handle, false, library);
}

void SharedLibrary::load(const String& name) {
  // Also after unload(), which keeps the name.
  if (!m_loadedName.empty()) ZT_RAISE(exception::InvalidOperation());
  m_requestedName = name;
  load();
}

bool SharedLibrary::loadAsBundle(String name) {
  auto bundle = std::make_unique<Bundle>(name);
  if (!bundle->isOpened()) return false;
  adopt(bundle.release(), true, name);
  return true;
}

// Takes the name's text along, as nothing may fail once the module is loaded.
void SharedLibrary::adopt(void* handle, bool isBundle, String& name) noexcept {
  unload();
  m_handle = handle;
  m_isBundle = isBundle;
  m_loadedName.swap(name);
}

void SharedLibrary::swap(SharedLibrary& other) noexcept {
  m_loadedName.swap(other.m_loadedName);
  std::swap(m_handle, other.m_handle);
  std::swap(m_unloadOnDestroy, other.m_unloadOnDestroy);
  std::swap(m_secondFlag, other.m_secondFlag);
  m_requestedName.swap(other.m_requestedName);
  std::swap(m_isBundle, other.m_isBundle);
}

bool SharedLibrary::isLoaded() const {
  if (!m_handle) return false;
  return !m_isBundle || static_cast<const Bundle*>(m_handle)->isOpened();
}

void* SharedLibrary::getFunctionPointer(const AnsiString& name, bool noThrow) const {
  void* function = nullptr;
  if (isLoaded()) {
    if (m_isBundle) {
      return static_cast<const Bundle*>(m_handle)->getFunctionPointer(String(name), noThrow);
    }
    function = FindFunction(m_handle, name);
  }
  if (!function && !noThrow) RaiseLoaderError();
  return function;
}

void* SharedLibrary::getFunctionPointer(const String& name, bool noThrow) const {
  return getFunctionPointer(AnsiString(name), noThrow);
}

}  // namespace zt::fnd::osdep
