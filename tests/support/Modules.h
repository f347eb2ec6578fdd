#pragma once

#include <string>

#include "tests/support/PlainPosix.h"

namespace vlt::test {

// Puts a real loadable module of this process's word size at the path; it exports "cos".
void MakeModule(const std::string& path);

// True if this is what such a module exports: it answers like the function.
bool IsCosine(void* function);

// True if the file at the path is mapped into this process.
bool IsMapped(const std::string& path);

// Loads the module at the path; its bare name then means it for the whole process.
bool LoadForItsName(const std::string& path);

// Whether the C library unloads a module that no one has loaded any more. musl's never does.
inline constexpr bool kUnloadsModules = kGlibc;
inline constexpr const char* kNothingUnloaded = "NOT TESTED: this C library unloads no module";

}  // namespace vlt::test
