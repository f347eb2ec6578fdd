#include "zt/fnd/IntToString.h"

#include <limits>
#include <type_traits>

#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/ThreadID.h"

namespace zt::fnd {
namespace {

constexpr wchar_t kDigits[] = L"0123456789ABCDEFGHIJKLMNOPQRSTUVWXYZ";

// Prints from the last digit to the first, with "-" in front if asked for.
template <class Unsigned>
String Print(Unsigned value, unsigned int base, bool minus = false) {
  static_assert(std::is_unsigned_v<Unsigned>);
  // Here, where every form comes by: base 1 would never end, and beyond 36 there are no digits.
  if (base < 2 || base > 36) ZT_RAISE(exception::UnableToConvert());
  wchar_t buffer[std::numeric_limits<Unsigned>::digits + 1];  // base 2 has no minus
  wchar_t* const end = buffer + std::numeric_limits<Unsigned>::digits + 1;
  wchar_t* p = end;
  // A loop that tests at the end: 0 has one digit.
  do {
    *--p = kDigits[value % base];
    value = static_cast<Unsigned>(value / base);
  } while (value != 0);
  if (minus) *--p = L'-';
  return String(p, end);
}

template <class Signed>
String PrintSigned(Signed value, unsigned int base) {
  using Unsigned = std::make_unsigned_t<Signed>;
  // Of the type's own width: -1 as a signed char is "FF" in base 16, not "FFFFFFFF".
  const Unsigned bits = static_cast<Unsigned>(value);
  if (value >= 0 || base != 10) return Print(bits, base);
  return Print(static_cast<Unsigned>(0u - bits), base, true);  // unsigned: the least value has none
}

}  // namespace

String UIntToString(unsigned long value, unsigned int base) { return Print(value, base); }
String IntToString(long value, unsigned int base) { return PrintSigned(value, base); }
String Int64ToString(int64_t value, unsigned int base) { return PrintSigned(value, base); }
String Int8ToString(signed char value, unsigned int base) { return PrintSigned(value, base); }
String UInt8ToString(unsigned char value, unsigned int base) { return Print(value, base); }
String Int16ToString(short value, unsigned int base) { return PrintSigned(value, base); }
String UInt16ToString(unsigned short value, unsigned int base) { return Print(value, base); }
String Int32ToString(int value, unsigned int base) { return PrintSigned(value, base); }
String UInt32ToString(unsigned int value, unsigned int base) { return Print(value, base); }

namespace osdep {

// Defined above the thread primitives, which know no strings.
String ThreadID::getDisplayStringHex() const { return UIntToString(number(), 16); }

}  // namespace osdep
}  // namespace zt::fnd
