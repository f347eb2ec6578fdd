#pragma once

#include <cstdint>

#include "zt/fnd/String.h"

namespace zt::fnd {

// Integers to text: digits 0-9 and A-Z, without padding or prefix.
//
// The base is 2 to 36; any other throws UnableToConvert. A negative value prints "-" and its
// magnitude in base 10, and its two's-complement bits in any other base, as many as its type has.
String UIntToString(unsigned long value, unsigned int base);
String IntToString(long value, unsigned int base);
String Int64ToString(int64_t value, unsigned int base);
String Int8ToString(signed char value, unsigned int base);
String UInt8ToString(unsigned char value, unsigned int base);
String Int16ToString(short value, unsigned int base);
String UInt16ToString(unsigned short value, unsigned int base);
String Int32ToString(int value, unsigned int base);
String UInt32ToString(unsigned int value, unsigned int base);

}  // namespace zt::fnd
