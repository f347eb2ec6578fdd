#include "zt/fnd/osdep/UuidSource.h"

#include "zt/fnd/osdep/RandomBytes.h"

namespace zt::fnd::osdep {

bool NewUuidBytes(unsigned char (&bytes)[16]) {
  if (!RandomBytes(bytes, sizeof bytes)) return false;
  bytes[6] = static_cast<unsigned char>((bytes[6] & 0x0F) | 0x40);  // version 4
  bytes[8] = static_cast<unsigned char>((bytes[8] & 0x3F) | 0x80);  // the RFC's variant
  return true;
}

}  // namespace zt::fnd::osdep
