#include "source/Common/ZtUtils/General/vlTracer.h"

unsigned vlTracer::gs_traceMask = 0;

void vlt_vlTracer::TraceOutput(char, const char*, bool) {}
unsigned vlt_vlTracer::GetTraceMask() { return vlTracer::gs_traceMask; }
