#pragma once

#include <stdlib.h>

#include <cstddef>
#include <cstdint>
#include <string>

// What the fuzz targets share.

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes);

namespace fuzz {

inline std::string Text(const uint8_t* data, size_t sizeBytes) {
  return std::string(reinterpret_cast<const char*>(data), sizeBytes);
}

// One wide character a byte, or, of inputs whose size divides by four, one each four bytes.
inline std::wstring Wide(const uint8_t* data, size_t sizeBytes) {
  std::wstring text;
  if (sizeBytes % 4 == 0) {
    for (size_t i = 0; i < sizeBytes; i += 4) {
      uint32_t c =
          data[i] | data[i + 1] << 8 | data[i + 2] << 16 | static_cast<uint32_t>(data[i + 3]) << 24;
      text += static_cast<wchar_t>(c);
    }
    return text;
  }
  for (size_t i = 0; i < sizeBytes; ++i) text += static_cast<wchar_t>(data[i]);
  return text;
}

// Ends the run: what was expected of the library does not hold.
inline void Demand(bool holds) {
  if (!holds) abort();
}

}  // namespace fuzz
