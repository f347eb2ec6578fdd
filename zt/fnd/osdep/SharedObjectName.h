#pragma once

#include "zt/fnd/StringFwd.h"

// Names of mutexes and events.
//
// One name has one file and one entry in each process, whatever the locales of the processes:
// nothing here asks the locale, which differs between processes and which a host may change at any
// time.
namespace zt::fnd::osdep {

// The name as the bytes of a file's name: UTF-8. A value that is no character becomes "?".
AnsiString SharedObjectFileName(const String& name);

// BuildSharedUnixFilePath for the file of that name. Throws what that throws.
AnsiString SharedObjectPath(const String& dirName, const String& name);

// Order of names in a process: a-z count as A-Z, all else is as it is, and a zero ends the name.
struct SharedObjectNameLess {
  bool operator()(const String& a, const String& b) const noexcept;
};

}  // namespace zt::fnd::osdep
