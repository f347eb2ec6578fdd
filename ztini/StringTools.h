#pragma once

#include <cstddef>
#include <cstdint>

// Byte strings as the engine treats them. White space is the C library's isspace, upper case its
// toupper, both in the locale in force.

// A copy to be freed with free(); null for null and when memory runs out.
char* ztini_StrDup(const char* text);

// As ztini_StrDup, without white space at either end; nothing but white space gives "".
char* ztini_StrDupWithoutSurrWhiteSpace(const char* text);

// The first character that is not white space, or the terminator; null for null.
const char* ztini_SkipWhiteSpace(const char* text);

// 1 if any character is not white space; 0 for null.
int32_t ztini_HasNonWhiteSpace(const char* text);

// Order of two names: leading white space is skipped, characters compare after upper-casing, and
// when one side ends the other must hold only white space to be equal. -1, 0 or 1. Null counts as
// the empty text.
int32_t ztini_StrICmpWithoutSurrWhiteSpace(const char* left, const char* right);

// Copies at most `size` bytes, terminator included, and always terminates; size 0 writes nothing.
// Null counts as the empty text.
void ztini_StringCopyMax(char* destination, const char* source, size_t size);

// Decimal number up to 4294967295: white space, an optional "+", digits, white space, nothing
// else. Returns 1, or 0 with `value` unchanged.
int32_t ztini_StrToUInt(const char* text, uint32_t* value);
