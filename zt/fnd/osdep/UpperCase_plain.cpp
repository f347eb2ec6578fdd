#include "zt/fnd/osdep/UpperCase.h"

namespace zt::fnd::osdep {

const int32_t* UpperCaseTable() { return nullptr; }

}  // namespace zt::fnd::osdep
