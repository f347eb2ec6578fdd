#pragma once

// Fault injection at named points, in the release build: a process arms itself from "VLTHooks.ini" in
// the install directory, and the code at the point then waits, ends, or pretends to be out of memory.
//
// A flag that was set stays set; only the name is replaced by the next refresh. An unarmed process
// pays one comparison with an empty name a point. Threads: any may pass a point; a refresh while
// others do is safe, and seen by them at once or a little later.

#include "source/Utilities/vltHookPoints.h"

extern "C" {

// 0 unless the armed name is exactly this one. Then, in order of precedence: waits and answers 1; ends
// the process by exit(0); answers 1; throws std::bad_alloc; takes all memory and answers 1.
unsigned vltTestHook(const char* name);

// Reads the hook file, if there is one. Any failure is dropped; what was set until then stays.
void vltRefreshHook();
}

// Takes memory until the heap refuses, and keeps it. Goes on where the last call stopped.
void exhaustMemory();
