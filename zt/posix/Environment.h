#pragma once

namespace zt::posix {

// Platform seam: getenv(3) for a variable that names files. Null also in a program that runs with
// foreign rights, which does not let its caller choose them.
const char* TrustedEnvironment(const char* name);

}  // namespace zt::posix
