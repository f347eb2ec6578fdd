#include "zt/posix/Environment.h"

#include <cstdlib>

namespace zt::posix {

// The kernel says whether the rights are foreign, also those of file capabilities and of security
// modules.
const char* TrustedEnvironment(const char* name) { return secure_getenv(name); }

}  // namespace zt::posix
