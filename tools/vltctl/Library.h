#pragma once

#include <string>

#include "source/Snapshot/snapshot.hpp"

// Libraries of bundles, which are read here and never loaded.
namespace admin {

// The file that the library loads from a bundle; empty if there is none.
std::string LibraryIn(const std::string& bundle);

// The function that a component of the type must export; null for a dictionary.
const char* EntryPointOf(vlt::snapshot::Type type);

// Whether the name is in the file's table of texts: without that it is not exported. True for null.
bool MayExport(const std::string& library, const char* name);

// Whether the file begins as libraries do.
bool IsLibrary(const std::string& file);

// Whether the library was built for another machine than this program was.
bool IsForeign(const std::string& library);

}  // namespace admin
