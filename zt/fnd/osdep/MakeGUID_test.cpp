#include "zt/fnd/osdep/MakeGUID.h"

#include <gtest/gtest.h>

#include <cstring>
#include <set>
#include <string>

#include "zt/fnd/Exception.h"
#include "zt/fnd/Guid.h"
#include "zt/fnd/osdep/UuidSource.h"

using namespace zt::fnd;
using namespace zt::fnd::osdep;

namespace {

bool CountingSource(unsigned char (&bytes)[16]) {
  for (unsigned char i = 0; i < 16; ++i) bytes[i] = static_cast<unsigned char>(i * 0x11);
  return true;
}

bool NoSource(unsigned char (&)[16]) { return false; }

}  // namespace

TEST(MakeGUID, TextReadsAsTheUuid) {
  const _GUID guid = MakeGUID(CountingSource);
  EXPECT_EQ(guid.Data1, 0x00112233u);
  EXPECT_EQ(guid.Data2, 0x4455u);
  EXPECT_EQ(guid.Data3, 0x6677u);
  EXPECT_EQ(guid.Data4[0], 0x88);
  EXPECT_EQ(guid.Data4[7], 0xFF);
  String text;
  Guid(guid).toString(text);
  EXPECT_EQ(text.exactCompare(L"{00112233-4455-6677-8899-AABBCCDDEEFF}"), 0);
}

TEST(MakeGUID, WithoutASourceRaises) {
  EXPECT_THROW(MakeGUID(NoSource), exception::InitializationFailure);
}

TEST(MakeGUID, VersionFourAndNeverTheSame) {
  std::set<std::string> seen;
  for (int i = 0; i < 1000; ++i) {
    const _GUID guid = MakeGUID();
    EXPECT_EQ(guid.Data3 >> 12, 4);
    EXPECT_EQ(guid.Data4[0] & 0xC0, 0x80);
    EXPECT_TRUE(seen.insert(std::string(reinterpret_cast<const char*>(&guid), 16)).second);
  }
}

TEST(MakeGUID, SourceFillsAllBytes) {
  unsigned char ones[16] = {};
  for (int i = 0; i < 200; ++i) {
    unsigned char bytes[16] = {};
    ASSERT_TRUE(NewUuidBytes(bytes));
    for (int b = 0; b < 16; ++b) ones[b] |= bytes[b];
  }
  for (int b = 0; b < 16; ++b) EXPECT_NE(ones[b], 0) << b;
}
