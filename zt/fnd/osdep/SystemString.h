#pragma once

namespace zt::fnd::osdep {

// Texts that carry their length: a terminated wide text with its count of characters (not bytes) in
// the 32-bit word in front of it. The block comes from the module allocator but starts at that
// word, so only SystemFreeString may free one.

// A copy; null for null. Null as well, without an exception, when memory or 32 bits do not suffice.
wchar_t* SystemAllocString(const wchar_t* s);

// The same of n characters, embedded zeros included. A null s leaves the n characters for the
// caller to fill in.
wchar_t* SystemAllocStringLen(const wchar_t* s, unsigned int n);

// Null does nothing.
void SystemFreeString(wchar_t* s);

}  // namespace zt::fnd::osdep
