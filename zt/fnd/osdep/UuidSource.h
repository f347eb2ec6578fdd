#pragma once

namespace zt::fnd::osdep {

// Platform seam: the 16 bytes of a new version-4 UUID (RFC 4122), in network order. False if the
// system has none to give. Threads: any.
bool NewUuidBytes(unsigned char (&bytes)[16]);

}  // namespace zt::fnd::osdep
