#pragma once

#include <optional>
#include <string>

// Value of an application preference, as the platform keeps them; nothing if it is not set.
//
// On Linux: the item `key` of the section "Preferences" in <config>/<domain>.ini, where <config> is
// $XDG_CONFIG_HOME (default $HOME/.config), then each of $XDG_CONFIG_DIRS (default /etc/xdg); the
// first file that has the item wins. Relative directories are ignored, as the XDG base directory
// rules want it. A value may be empty. Nothing is created, changed or locked, and each call reads
// again. Throws std::bad_alloc, also where a file could not be read because memory or descriptors
// ran out, and zt::fnd::osdep::PosixError where the system could not read it for the moment (EIO,
// ESTALE).
// *where, if asked for, is the file that has the item, or the first one that could; empty without any.
std::optional<std::string> vlReadPreference(const std::string& domain, const std::string& key,
                                            std::string* where = nullptr);
