#pragma once

namespace vlt::test {

// True if another processor's instructions are emulated by a program (qemu-user): system calls are
// then those of the emulator.
bool IsEmulated();

// The number that /proc shows for a thread that waits in the system call: under an emulator that of
// the machine's kernel, taken to be x86-64; -1 for a call that no test waits in.
long NumberInProc(long systemCallNumber);

// Why such an emulator cannot run the test, named "Suite.Name"; null if it can. docs/platform.md has
// the counts.
const char* BeyondEmulators(const char* test);

// Under an emulator takes these tests out of the run, and says so for each. For main(), after
// InitGoogleTest.
void LeaveOutBeyondEmulators();

}  // namespace vlt::test
