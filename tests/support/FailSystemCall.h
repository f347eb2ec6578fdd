#pragma once

namespace vlt::test {

// From here on every call of this number fails in this process with the error, without reaching
// the kernel. It cannot be undone: for children only. False if the kernel does not allow it.
bool FailSystemCall(long systemCallNumber, int error);

// The same, with the signal SIGSYS in place of the error: its handler sets the result.
bool TrapSystemCall(long systemCallNumber);

}  // namespace vlt::test
