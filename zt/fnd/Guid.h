#pragma once

#include <array>
#include <cstdint>

#include "zt/fnd/GuidType.h"
#include "zt/fnd/String.h"

// Ordered by fields, not by memory: the numbers first, then the bytes of Data4, the first
// difference deciding.
bool operator<(const _GUID& a, const _GUID& b) noexcept;
bool operator==(const _GUID& a, const _GUID& b) noexcept;

namespace zt::fnd {

// The 16 bytes of an identifier in files and streams: the three numbers little-endian, then Data4.
using GuidByteArray = std::array<unsigned char, 16>;
GuidByteArray GuidBytes(const _GUID& guid) noexcept;
_GUID GuidOf(const unsigned char* bytes) noexcept;

// A 128-bit identifier and its text form, "{00112233-4455-6677-8899-AABBCCDDEEFF}".
//
// The text has 38 characters, braces included; it is written in capitals and read in either case.
// Threads: a plain value of 16 bytes.
class Guid {
 public:
  Guid() noexcept : m_guid() {}  // all zero
  Guid(const _GUID& guid) noexcept : m_guid(guid) {}
  // As fromString.
  explicit Guid(const String& text) : m_guid() { fromString(text); }

  // A new one. Throws InitializationFailure if the system gives no random bytes.
  static Guid make();

  const _GUID& get() const noexcept { return m_guid; }

  // Replaces the text of `out`.
  void toString(String& out) const;

  // Throws BadGuidString for anything but the text form; the value is then unchanged.
  void fromString(const String& text) { fromString(text.begin(), text.end()); }
  void fromString(const wchar_t* begin, const wchar_t* end);

  // Wire form: the 16 bytes of GuidBytes. Throws DeserializationError if fewer remain
  // below `limit`; value and cursor are then unchanged.
  unsigned int serializationSize() const noexcept { return sizeof m_guid; }
  void deserialize(const unsigned char*& cursor, const unsigned char* limit);

  friend bool operator==(const Guid& a, const Guid& b) noexcept { return a.m_guid == b.m_guid; }
  friend bool operator<(const Guid& a, const Guid& b) noexcept { return a.m_guid < b.m_guid; }

 private:
  _GUID m_guid;
};

// Steps of the reader. Each does nothing once `ok` is false, and clears it on a mismatch or at the
// end of the text; only then does the cursor stay.

// One digit of either case; 0 where there is none.
unsigned char ParseHexNibble(const wchar_t*& cursor, const wchar_t* end, bool& ok);
void SkipCharacter(const wchar_t*& cursor, const wchar_t* end, wchar_t expected, bool& ok);
// All digits of a T of 1, 2 or 4 bytes; stores it in little-endian order and moves `out` past it.
template <class T>
void ParseHex(const wchar_t*& cursor, const wchar_t* end, unsigned char*& out, bool& ok);

extern template void ParseHex<uint8_t>(const wchar_t*&, const wchar_t*, unsigned char*&, bool&);
extern template void ParseHex<uint16_t>(const wchar_t*&, const wchar_t*, unsigned char*&, bool&);
extern template void ParseHex<uint32_t>(const wchar_t*&, const wchar_t*, unsigned char*&, bool&);

}  // namespace zt::fnd
