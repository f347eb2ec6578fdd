#pragma once

// Registration files as they are on disk: "Resources/Info.vlr" in a bundle.

#include <string>
#include <utility>

#include "zt/fnd/AbsTime.h"
#include "zt/fnd/String.h"
#include "zt/fnd/Vector.h"

namespace registrar {

// Full paths, each with the time of its last change in whole seconds.
using RegistrationFiles = zt::fnd::Vector<std::pair<zt::fnd::String, zt::fnd::AbsTime>>;

// Whether the text would be more than one line of an INI file.
bool HasLineEnd(const std::string& text);

// Appends the registration files of the bundles in `directory` whose names match `mask`, in the
// order of the directory listing. A bundle that is no directory, that this user may not enter, or
// that has no regular file in that place has none; so has one with a line end in its path. Throws
// zt::fnd::osdep::PosixError for what else keeps the system from answering.
void AppendRegistrationFiles(const zt::fnd::String& directory, const zt::fnd::String& mask,
                             RegistrationFiles& files);

// True if the path names a regular file, or may do so where this user may not look: what was
// registered from there stays. A relative path names no registration file, wherever it came from.
// Throws zt::fnd::osdep::PosixError for other failures.
bool FileIsThere(const std::string& file);

}  // namespace registrar
