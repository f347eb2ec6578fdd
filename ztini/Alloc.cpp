#include "ztini/Alloc.h"

namespace ztini {

ReallocFunction g_realloc = std::realloc;

}  // namespace ztini
