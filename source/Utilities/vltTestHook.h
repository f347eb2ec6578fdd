#pragma once

#include "source/Utilities/vltHookPoints.h"

// Nonzero if a fault is armed at the point of this name; the armed fault may also act on the spot.
extern "C" unsigned vltTestHook(const char* name);
