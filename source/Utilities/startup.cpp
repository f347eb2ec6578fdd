// What happens while the shared library is being loaded. This file belongs to the shared library
// alone: in an archive nothing would refer to it.
//
// Everything else that is static is constant or made on first use, so that any call works whatever
// the host's own initialisers do before this one has run.
#include <stdlib.h>

#include <memory>

#include "source/Common/Posix/vltlinuxos.h"
#include "source/Common/ZtUtils/General/vlTracer.h"
#include "source/Common/vltResultOf.h"
#include "source/Utilities/vltRegistrarEntry.h"
#include "zt/fnd/String.h"
#include "ztini/ztini.h"

namespace {

struct Dispose {
  void operator()(IniStructForwardReferenceTag* document) const { IniDispose(document); }
};

void StartTracer() {
  zt::fnd::AnsiString diagnosticsIni;
  zt::fnd::String directory = vlCreateLogDirIfNeeded(diagnosticsIni);
  std::unique_ptr<IniStructForwardReferenceTag, Dispose> options(IniNew(0));
  IniReadFromFile(options.get(), diagnosticsIni.c_str());  // A missing file leaves the defaults.
  unsigned severity, target, threshold;
  vlReadTracerOptions(options.get(), "vlt", severity, target, &threshold);
  vlTracer::Initialize(static_cast<vlTracer::SeverityLevel>(severity),
                       static_cast<vlTracer::TraceTarget>(target), directory.c_str(),
                       vlTracer::Threshold(threshold));
  if (vlTracer::gs_traceMask & vlTracer::kSeverityLoad) {
    vlt_vlTracer::TraceOutput(' ', "vltutils: Process attach", false);
  }
  atexit(vlTracer::Cleanup);
}

// Nothing that fails while loading may end the host, which has not called anything yet; what could
// not be made is made at the first call, and fails there, or is done without.
__attribute__((constructor)) void StartUp() {
  vlt::Attempt(StartTracer);
  vlt::Attempt(vlPrepareRegistrarEntry);
}

}  // namespace
