#pragma once

#include <array>
#include <cstdint>
#include <string>

#include "source/Common/vltTypes.h"

// The sidecar of a guarded INI file: 16 bytes, the MD5 of every byte of the file.
//
// Written in place, so that at no moment a shorter one can be found: a short sidecar means that the
// file beside it cannot be trusted, while an old one does no harm. The caller holds the file's
// lock. A sidecar is neither read nor written through a symbolic link in its own place.
namespace IniSidecar {

inline constexpr unsigned kSizeBytes = 16;
using Digest = std::array<uint8_t, kSizeBytes>;

// Sixteen "0" digits: a first save is under way. No digest is expected to be this.
inline constexpr Digest kInvalidMark = {'0', '0', '0', '0', '0', '0', '0', '0',
                                        '0', '0', '0', '0', '0', '0', '0', '0'};

enum class State {
  Present,     // the digest was read; a longer sidecar counts by its first 16 bytes
  Missing,     // not there, or may not be opened, or nothing that a save leaves (a link, a pipe)
  Short,       // fewer bytes, or a directory
  Unreadable,  // the system could not read it now; nothing is known of it
};

// Sets the digest for Present only. Never throws.
State Read(const std::string& sidecar, Digest* digest);

// Replaces the digest, or makes the sidecar; mode 0777. With `durable` it is on disk when the call
// returns. E_FAIL leaves the old sidecar, or none. Throws std::bad_alloc.
HRESULT Write(const std::string& sidecar, const Digest& digest, bool durable);

}  // namespace IniSidecar
