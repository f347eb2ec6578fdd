#pragma once

#include <cstddef>

namespace ztini {

// Escape sequences inside values: \t, \n, \", \\ and \x with two hexadecimal digits.

// A malloc block with the text encoded; null without memory. Control characters are those of the
// locale in force.
char* EncodeEscapes(const char* text);

// Writes the decoded bytes to `out`, which may be null, without a terminator, and returns how many
// there are; never more than strlen(text). A bare quote stands for itself, a backslash before any
// other letter is dropped. Digits of \x that are none count as -1 each; a \x that the end of the
// text cuts short gives nothing.
size_t DecodeEscapes(const char* text, char* out);

}  // namespace ztini
