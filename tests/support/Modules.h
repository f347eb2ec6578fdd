#pragma once

#include <string>

namespace vlt::test {

// Puts a real loadable module of this process's word size at the path; it exports "cos". (A copy of
// the system's mathematics library, which is loaded as a module of its own.)
void MakeModule(const std::string& path);

// True if this is what such a module exports: it answers like the function.
bool IsCosine(void* function);

// True if the file at the path is mapped into this process.
bool IsMapped(const std::string& path);

}  // namespace vlt::test
