#pragma once

#include <memory>

#include "zt/fnd/StringFwd.h"

namespace zt::fnd::osdep {

// A directory that holds a code module: "X.framework", "X.bundle" and the like.
//
// It is opened by loading the first of "libX.so", "X.so" and "X" inside it that loads. A name that
// is no directory is no bundle; a name without a directory part is never found, as the system has
// no standard places for bundles. Copies share the module; the last one unloads it.
// Threads: one at a time.
class Bundle {
 public:
  // Opens the bundle of the decorated name; a failure leaves it not opened. An empty name opens
  // nothing.
  explicit Bundle(const String& name);
  Bundle(const Bundle& other) = default;
  Bundle& operator=(const Bundle& other) = default;
  virtual ~Bundle();

  bool isOpened() const { return m_bundle != nullptr; }
  bool isLoaded() const { return isOpened(); }

  // Not opened: null with noThrow, else throws InvalidOperation. Not found: null with noThrow, else
  // throws PosixError with the loader's text.
  void* getFunctionPointer(const String& name, bool noThrow) const;

  // The module stays in the process when the copies have gone.
  void keepLoaded();

  // Appends ".bundle" to a name whose last component has no ".". Throws InvalidArgument for an
  // empty name.
  static String decorateName(const String& name);

 protected:
  // True on success.
  bool openFromPath(const String& path);

 private:
  struct Module;
  std::shared_ptr<Module> m_bundle;
};

}  // namespace zt::fnd::osdep
