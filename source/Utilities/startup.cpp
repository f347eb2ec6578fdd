// What happens while the shared library is being loaded. This file belongs to the shared library
// alone: in an archive nothing would refer to it.
//
// Everything else that is static is constant or made on first use, so that any call works whatever
// the host's own initialisers do before this one has run.
#include "source/Utilities/vltRegistrarEntry.h"

namespace {

__attribute__((constructor)) void StartUp() {
  try {
    vlPrepareRegistrarEntry();
  } catch (...) {
    // Nothing that fails here may end the host, which has not called anything yet. What could not be
    // made is made at the first call, and fails there.
  }
}

}  // namespace
