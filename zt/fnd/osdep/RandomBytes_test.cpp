#include "zt/fnd/osdep/RandomBytes.h"

#include <gtest/gtest.h>

#include <array>
#include <set>

namespace zt::fnd::osdep {
namespace {

TEST(RandomBytes, FillsAllBytesAndNoMore) {
  for (size_t size : {1u, 16u, 256u}) {
    std::array<unsigned char, 257> bytes;
    std::array<bool, 256> changed = {};
    for (int round = 0; round < 8; ++round) {  // a byte stays 0 in all rounds once in 2^64 times
      bytes.fill(0);
      ASSERT_TRUE(RandomBytes(bytes.data(), size));
      for (size_t i = 0; i < size; ++i) changed[i] = changed[i] || bytes[i] != 0;
      EXPECT_EQ(bytes[size], 0);
    }
    for (size_t i = 0; i < size; ++i) EXPECT_TRUE(changed[i]) << i << " of " << size;
  }
}

TEST(RandomBytes, DiffersFromCallToCall) {
  std::set<std::array<unsigned char, 16>> all;
  for (int i = 0; i < 100; ++i) {
    std::array<unsigned char, 16> bytes;
    ASSERT_TRUE(RandomBytes(bytes.data(), bytes.size()));
    EXPECT_TRUE(all.insert(bytes).second);
  }
}

}  // namespace
}  // namespace zt::fnd::osdep
