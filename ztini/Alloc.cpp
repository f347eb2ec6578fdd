#include "ztini/Alloc.h"

namespace ztini {

// Not atomic: it is changed by tests only, before they start threads.
ReallocFunction g_realloc = realloc;

}  // namespace ztini
