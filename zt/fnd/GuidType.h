#pragma once

#include <cstdint>
#include <type_traits>

// 128-bit identifier in the host's byte order (RFC 4122 names the fields time_low, time_mid,
// time_hi_and_version, clock_seq and node). A plain structure, so that it is passed by value in
// registers where the platform does that; zt::fnd::Guid is the class over it.
extern "C++" {
struct _GUID {
  uint32_t Data1;
  uint16_t Data2, Data3;
  unsigned char Data4[8];
};
}
using GUID = _GUID;

static_assert(sizeof(GUID) == 16 && std::is_trivially_copyable_v<GUID>);
