#pragma once

// Arms the points of vltTestHook.h from "VLTHooks.ini" in the install directory: vltRefreshHook of
// vltutils.h, and what it needs.

// Takes memory until the heap refuses, and keeps it. Goes on where the last call stopped.
void exhaustMemory();
