#include "zt/fnd/osdep/UpperCase.h"

#include <ctype.h>

namespace zt::fnd::osdep {

// Part of the binary interface of the C library on Linux, where toupper() is a look-up in it.
const int32_t* UpperCaseTable() { return *__ctype_toupper_loc(); }

}  // namespace zt::fnd::osdep
