#include "zt/fnd/osdep/RandomBytes.h"

#include <fcntl.h>
#include <sys/random.h>
#include <unistd.h>

#include "zt/posix/Retry.h"
#include "zt/posix/ScopedFd.h"

using zt::posix::RetryEintr;
using zt::posix::ScopedFd;

namespace zt::fnd::osdep {
namespace {

// For a kernel or a sandbox without getrandom().
bool ReadRandomDevice(void* bytes, size_t sizeBytes) {
  const ScopedFd device(RetryEintr([] { return open("/dev/urandom", O_RDONLY | O_CLOEXEC); }));
  if (device.get() < 0) return false;
  ssize_t got = RetryEintr([&] { return read(device.get(), bytes, sizeBytes); });
  return got == static_cast<ssize_t>(sizeBytes);
}

}  // namespace

// Requests of up to 256 bytes come whole from both sources once the pool is ready.
bool RandomBytes(void* bytes, size_t sizeBytes) {
  // Flags 0: waits for the pool after the start of the machine, when two machines of one image
  // would otherwise make the same identifiers.
  ssize_t got = RetryEintr([&] { return getrandom(bytes, sizeBytes, 0); });
  return got == static_cast<ssize_t>(sizeBytes) || ReadRandomDevice(bytes, sizeBytes);
}

}  // namespace zt::fnd::osdep
