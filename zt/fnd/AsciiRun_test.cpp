#include "zt/fnd/AsciiRun.h"

#include <gtest/gtest.h>

#include <algorithm>

namespace zt::fnd::ascii_run {
namespace {

TEST(AsciiRun, OneCharacterBeyondAsciiIsSeenWhereverItIs) {
  unsigned char bytes[kLength];
  wchar_t wide[kLength];
  for (ptrdiff_t i = 0; i < kLength; ++i) {
    std::fill_n(bytes, kLength, static_cast<unsigned char>(0x7F));
    std::fill_n(wide, kLength, wchar_t{0x7F});
    EXPECT_TRUE(IsAscii(bytes) && IsAscii(wide));
    for (unsigned beyond : {0x80u, 0xFFu}) {
      bytes[i] = static_cast<unsigned char>(beyond);
      EXPECT_FALSE(IsAscii(bytes)) << i;
      EXPECT_FALSE(IsAscii(reinterpret_cast<const char*>(bytes))) << i;
    }
    for (uint32_t beyond : {0x80u, 0x10041u, 0x7FFFFFFFu, 0x80000041u, 0xFFFFFFFFu}) {
      wide[i] = static_cast<wchar_t>(beyond);
      EXPECT_FALSE(IsAscii(wide)) << i;
    }
  }
}

TEST(AsciiRun, CopiesKeepEachCharacter) {
  for (int first = 0; first + kLength <= 0x80; ++first) {
    char bytes[kLength], back[kLength];
    wchar_t wide[kLength];
    for (int i = 0; i < kLength; ++i) bytes[i] = static_cast<char>(first + i);
    Copy(bytes, wide);
    for (int i = 0; i < kLength; ++i) EXPECT_EQ(wide[i], static_cast<wchar_t>(first + i));
    Copy(wide, back);
    EXPECT_TRUE(std::equal(bytes, bytes + kLength, back));
  }
}

}  // namespace
}  // namespace zt::fnd::ascii_run
