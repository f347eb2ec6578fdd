#pragma once

#include "zt/fnd/StringFwd.h"

namespace zt::fnd::osdep {

// The system's loader, for SharedLibrary and Bundle.

// Loads a module with all its symbols, for all modules to use. Null on failure, and for a path that
// names something other than a regular file: the loader would wait for a pipe.
void* LoadModule(const String& name);
void UnloadModule(void* module);                           // null does nothing
void* FindFunction(void* module, const AnsiString& name);  // null if there is none

// Throws PosixError (number -1) with the loader's text for its last failure, which may be empty.
[[noreturn]] void RaiseLoaderError();

// True if the last component holds no ".": such a name gets a suffix.
bool NeedsDecoration(const String& name);

}  // namespace zt::fnd::osdep
