#include "ztini/Alloc.h"

namespace ztini {

ReallocFunction g_realloc = realloc;

}  // namespace ztini
