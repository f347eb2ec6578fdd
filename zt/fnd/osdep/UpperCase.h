#pragma once

#include <cstdint>

namespace zt::fnd::osdep {

// Platform seam: toupper(3) of the bytes 0 to 255 as a table, that of the calling thread's locale at
// this moment. Null where the system has no such table. Good until the locale changes.
const int32_t* UpperCaseTable();

}  // namespace zt::fnd::osdep
