#include "zt/fnd/osdep/MakeGUID.h"

#include <cstring>

#include "zt/fnd/ByteOrder.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/UuidSource.h"

namespace zt::fnd::osdep {
namespace {

template <class T>
T BigEndianField(const unsigned char* bytes) {
  T field;
  memcpy(&field, bytes, sizeof field);
  return big_endian::FromBigEndian(field);
}

}  // namespace

_GUID MakeGUID() { return MakeGUID(NewUuidBytes); }

_GUID MakeGUID(UuidSource source) {
  unsigned char bytes[16];
  if (!source(bytes)) ZT_RAISE(exception::InitializationFailure());
  // The bytes of a UUID are big-endian (RFC 4122), the fields of the record in the host's order.
  _GUID guid;
  guid.Data1 = BigEndianField<uint32_t>(bytes);
  guid.Data2 = BigEndianField<uint16_t>(bytes + 4);
  guid.Data3 = BigEndianField<uint16_t>(bytes + 6);
  memcpy(guid.Data4, bytes + 8, sizeof guid.Data4);
  return guid;
}

}  // namespace zt::fnd::osdep
