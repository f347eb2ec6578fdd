#pragma once

#include <string>

#include "source/Utilities/vltTypes.h"

// The sidecar of a guarded INI file: 16 bytes, the MD5 of every byte of the file.
//
// Written in place, so that at no moment a shorter one can be found: a sidecar that is short says
// that the file beside it cannot be trusted, while one that is merely old does no harm. The caller
// holds the file's lock.
namespace IniSidecar {

inline constexpr unsigned kSizeBytes = 16;

// Sixteen "0" digits: a first save is under way. No digest is expected to be this.
inline constexpr unsigned char kInvalidMark[kSizeBytes + 1] = "0000000000000000";

// 0 and a new[] digest; 1 and null if it cannot be opened; E_FAIL and null if it is short or cannot
// be read. Longer ones count by their first 16 bytes.
HRESULT Read(const std::string& sidecar, unsigned char** digest);

// Replaces the digest, or makes the sidecar; mode 0777. Never writes through a symbolic link. With
// `durable` it is on the medium when the call returns. E_FAIL leaves the old sidecar, or none.
HRESULT Write(const std::string& sidecar, const unsigned char* digest, bool durable);

}  // namespace IniSidecar
