#pragma once

#include "zt/fnd/GuidType.h"

namespace zt::fnd::osdep {

// A new GUID: a random (version 4) UUID of RFC 4122, whose text form reads as the UUID's does.
// Throws InitializationFailure if the system gives none. Threads: any.
_GUID MakeGUID();

// What fills in the 16 bytes of a UUID in network order; false if there is none.
using UuidSource = bool (*)(unsigned char (&bytes)[16]);

// The same from another source.
_GUID MakeGUID(UuidSource source);

}  // namespace zt::fnd::osdep
