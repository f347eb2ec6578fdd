#include "zt/fnd/osdep/RandomBytes.h"

#include <unistd.h>

namespace zt::fnd::osdep {

bool RandomBytes(void* bytes, size_t sizeBytes) { return getentropy(bytes, sizeBytes) == 0; }

}  // namespace zt::fnd::osdep
