#include "zt/fnd/osdep/UuidSource.h"
#include "zt/posix/Retry.h"
#include "zt/posix/ScopedFd.h"

#include <fcntl.h>
#include <sys/random.h>
#include <unistd.h>

using zt::posix::RetryEintr;
using zt::posix::ScopedFd;

namespace zt::fnd::osdep {
namespace {

constexpr ssize_t kSize = 16;

// For a kernel or a sandbox without getrandom().
bool ReadRandomDevice(unsigned char* bytes) {
  const ScopedFd device(RetryEintr([] { return open("/dev/urandom", O_RDONLY | O_CLOEXEC); }));
  if (device.get() < 0) return false;
  return RetryEintr([&] { return read(device.get(), bytes, kSize); }) == kSize;
}

}  // namespace

// Requests of up to 256 bytes come whole from both sources once the pool is ready.
bool NewUuidBytes(unsigned char (&bytes)[16]) {
  // Flags 0: waits for the pool after the start of the machine, when two machines of one image
  // would otherwise make the same identifiers.
  if (RetryEintr([&] { return getrandom(bytes, kSize, 0); }) != kSize && !ReadRandomDevice(bytes)) {
    return false;
  }
  bytes[6] = static_cast<unsigned char>((bytes[6] & 0x0F) | 0x40);  // version 4
  bytes[8] = static_cast<unsigned char>((bytes[8] & 0x3F) | 0x80);  // the RFC's variant
  return true;
}

}  // namespace zt::fnd::osdep
