#include "source/Utilities/vltTestHook.h"

extern "C" unsigned vltTestHook(const char*) { return 0; }
