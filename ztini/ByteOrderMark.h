#pragma once

#include <cstddef>
#include <cstring>

namespace ztini {

// The Unicode byte order marks (the Unicode Standard, chapter 23.8). One of UTF-8 is skipped, the
// others announce an encoding that the engine does not read. The longer mark is tested first: that
// of UTF-32 begins with that of UTF-16.
enum class ByteOrderMark { None, Utf8, Wide };  // Wide: UTF-16 or UTF-32, which are refused

inline constexpr char kUtf8Mark[] = "\xEF\xBB\xBF";
inline constexpr size_t kUtf8MarkSize = sizeof kUtf8Mark - 1;

// What the first bytes of a file, at most four of them, announce.
inline ByteOrderMark MarkIn(const char* bytes, size_t count) {
  auto begins = [&](const char* mark, size_t size) {
    return count >= size && memcmp(bytes, mark, size) == 0;
  };
  if (begins("\xFF\xFE\0\0", 4) || begins("\0\0\xFE\xFF", 4)) return ByteOrderMark::Wide;
  if (begins(kUtf8Mark, kUtf8MarkSize)) return ByteOrderMark::Utf8;
  if (begins("\xFF\xFE", 2) || begins("\xFE\xFF", 2)) return ByteOrderMark::Wide;
  return ByteOrderMark::None;
}

}  // namespace ztini
