#pragma once

#include "zt/fnd/String.h"

namespace zt::fnd::osdep {

// A code module found by a bare name or a path, in whatever form it is installed.
//
// For a name without a "." in its last component, load() tries "<name>.framework" and
// "<name>.bundle" as directories (Bundle.h), then "lib<base>.so" in the name's directory; without
// a directory the system's loader searches. A name with a "." is taken as it is in all three
// steps. Loading reports nothing: ask isLoaded().
//
// Objects hold a load each; the system counts them. Threads: one at a time.
class SharedLibrary {
 public:
  SharedLibrary();
  // Load at once. Without unloadOnDestroy the module stays in the process when the object goes. The
  // second flag is only stored.
  SharedLibrary(const String& name, bool unloadOnDestroy, bool secondFlag);
  SharedLibrary(const AnsiString& name, bool unloadOnDestroy, bool secondFlag);
  // Loads again what the source has loaded.
  SharedLibrary(const SharedLibrary& other);
  SharedLibrary& operator=(const SharedLibrary& other);
  virtual ~SharedLibrary();

  // Names and form stay as they are.
  virtual void unload();
  // Loads the requested name; nothing for an empty one. What was loaded before is replaced, or
  // stays if this fails.
  virtual void load();
  // Throws InvalidOperation if the object has ever loaded anything.
  void load(const String& name);

  void swap(SharedLibrary& other) noexcept;
  bool isLoaded() const;
  // The loader's handle, or the Bundle; null when not loaded.
  void* getHandle() const { return m_handle; }

  // Not loaded, or no such function: null with noThrow, else throws PosixError with the loader's
  // text.
  void* getFunctionPointer(const AnsiString& name, bool noThrow) const;
  void* getFunctionPointer(const String& name, bool noThrow) const;

  // The name itself.
  static String decorateName(const String& name) { return name; }

 private:
  bool loadAsBundle(String name);
  void adopt(void* handle, bool isBundle, String& name) noexcept;

  String m_loadedName;  // what really loaded, decoration included
  void* m_handle;       // of the loader, or an owned Bundle
  bool m_unloadOnDestroy;
  bool m_secondFlag;
  String m_requestedName;
  bool m_isBundle;  // what m_handle is
};

}  // namespace zt::fnd::osdep
