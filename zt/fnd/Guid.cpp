#include "zt/fnd/Guid.h"

#include <cstring>

#include "zt/fnd/ByteOrder.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/MakeGUID.h"

// The order of the registrar's map, and so of every walk over components.
bool operator<(const _GUID& a, const _GUID& b) noexcept {
  if (a.Data1 != b.Data1) return a.Data1 < b.Data1;
  if (a.Data2 != b.Data2) return a.Data2 < b.Data2;
  if (a.Data3 != b.Data3) return a.Data3 < b.Data3;
  return memcmp(a.Data4, b.Data4, sizeof a.Data4) < 0;
}

bool operator==(const _GUID& a, const _GUID& b) noexcept { return memcmp(&a, &b, sizeof a) == 0; }

namespace zt::fnd {
namespace {

constexpr unsigned kTextLength = 38;

// Which of its bytes each pair of digits shows; -1 is a hyphen.
// The first three fields are numbers, shown from their most significant digit (RFC 4122, section
// 3); they are little-endian, so their bytes go in reverse.
constexpr int kByteOrder[] = {3, 2, 1, 0, -1, 5, 4, -1, 7, 6, -1, 8, 9, -1, 10, 11, 12, 13, 14, 15};

}  // namespace

GuidByteArray GuidBytes(const _GUID& guid) noexcept {
  GuidByteArray bytes;
  little_endian::Put(&bytes[0], guid.Data1);
  little_endian::Put(&bytes[4], guid.Data2);
  little_endian::Put(&bytes[6], guid.Data3);
  memcpy(&bytes[8], guid.Data4, sizeof guid.Data4);
  return bytes;
}

_GUID GuidOf(const unsigned char* bytes) noexcept {
  _GUID guid;
  guid.Data1 = little_endian::Get<uint32_t>(bytes);
  guid.Data2 = little_endian::Get<uint16_t>(bytes + 4);
  guid.Data3 = little_endian::Get<uint16_t>(bytes + 6);
  memcpy(guid.Data4, bytes + 8, sizeof guid.Data4);
  return guid;
}

Guid Guid::make() { return Guid(osdep::MakeGUID()); }

void Guid::toString(String& out) const {
  static constexpr wchar_t kDigits[] = L"0123456789ABCDEF";
  const GuidByteArray bytes = GuidBytes(m_guid);
  wchar_t text[kTextLength];
  wchar_t* p = text;
  *p++ = L'{';
  for (const int index : kByteOrder) {
    if (index < 0) {
      *p++ = L'-';
    } else {
      const unsigned char byte = bytes[static_cast<size_t>(index)];
      *p++ = kDigits[byte >> 4];
      *p++ = kDigits[byte & 0x0F];
    }
  }
  *p = L'}';
  out.assign(text, kTextLength);
}

void Guid::fromString(const wchar_t* cursor, const wchar_t* end) {
  // Before the parse, which would accept text after the closing brace.
  if (end - cursor != kTextLength) ZT_RAISE(exception::BadGuidString());
  // Parsed aside: a text that turns out bad at its end leaves the value as it was.
  GuidByteArray bytes = {};
  unsigned char* out = bytes.data();
  bool ok = true;
  SkipCharacter(cursor, end, L'{', ok);
  ParseHex<uint32_t>(cursor, end, out, ok);
  for (int i = 0; i < 2; ++i) {
    SkipCharacter(cursor, end, L'-', ok);
    ParseHex<uint16_t>(cursor, end, out, ok);
  }
  SkipCharacter(cursor, end, L'-', ok);
  for (int i = 0; i < 2; ++i) ParseHex<uint8_t>(cursor, end, out, ok);
  SkipCharacter(cursor, end, L'-', ok);
  for (int i = 0; i < 6; ++i) ParseHex<uint8_t>(cursor, end, out, ok);
  SkipCharacter(cursor, end, L'}', ok);
  // Only here: the steps do nothing once one has failed, which keeps the reader a straight line.
  if (!ok) ZT_RAISE(exception::BadGuidString());
  m_guid = GuidOf(bytes.data());
}

void Guid::deserialize(const unsigned char*& cursor, const unsigned char* limit) {
  if (limit - cursor < static_cast<ptrdiff_t>(sizeof m_guid))
    throw exception::DeserializationError();
  m_guid = GuidOf(cursor);
  cursor += sizeof m_guid;
}

unsigned char ParseHexNibble(const wchar_t*& cursor, const wchar_t* end, bool& ok) {
  if (!ok) return 0;
  // The end counts as a character that is no digit.
  const wchar_t c = cursor == end ? L'\0' : *cursor;
  int value;
  if (c >= L'0' && c <= L'9') {
    value = c - L'0';
  } else if (c >= L'a' && c <= L'f') {
    value = c - L'a' + 10;
  } else if (c >= L'A' && c <= L'F') {
    value = c - L'A' + 10;
  } else {
    ok = false;
    return 0;
  }
  ++cursor;
  return static_cast<unsigned char>(value);
}

void SkipCharacter(const wchar_t*& cursor, const wchar_t* end, wchar_t expected, bool& ok) {
  if (!ok) return;
  ok = cursor != end && *cursor == expected;
  if (ok) ++cursor;
}

template <class T>
void ParseHex(const wchar_t*& cursor, const wchar_t* end, unsigned char*& out, bool& ok) {
  uint32_t value = 0;
  for (unsigned i = 0; i < 2 * sizeof(T); ++i) {
    value = value << 4 | ParseHexNibble(cursor, end, ok);
  }
  if (!ok) return;
  little_endian::Put(out, static_cast<T>(value));
  out += sizeof(T);
}

template void ParseHex<uint8_t>(const wchar_t*&, const wchar_t*, unsigned char*&, bool&);
template void ParseHex<uint16_t>(const wchar_t*&, const wchar_t*, unsigned char*&, bool&);
template void ParseHex<uint32_t>(const wchar_t*&, const wchar_t*, unsigned char*&, bool&);

}  // namespace zt::fnd
