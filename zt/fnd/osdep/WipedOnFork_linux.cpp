#include <sys/mman.h>
#include <unistd.h>

#include "zt/fnd/osdep/WipedOnFork.h"

namespace zt::fnd::osdep {

void* AllocateWipedOnFork() noexcept {
#ifdef MADV_WIPEONFORK
  // The advice is given to whole pages, and to private mappings without a file only.
  const size_t page = static_cast<size_t>(sysconf(_SC_PAGESIZE));
  void* memory = mmap(nullptr, page, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (memory == MAP_FAILED) return nullptr;
  if (madvise(memory, page, MADV_WIPEONFORK) == 0) return memory;
  munmap(memory, page);
#endif
  return nullptr;
}

}  // namespace zt::fnd::osdep
