#include "source/Cmd5vlt.h"

#include <gtest/gtest.h>
#include <stdio.h>

#include <string>

namespace {

std::string Hex(const unsigned char* digest) {
  std::string text;
  char pair[3];
  for (int i = 0; i < 16; ++i) {
    snprintf(pair, sizeof pair, "%02x", digest[i]);
    text += pair;
  }
  return text;
}

void Add(Cmd5vlt& md5, const std::string& text) {
  md5.addString(reinterpret_cast<const unsigned char*>(text.data()),
                static_cast<unsigned>(text.size()));
}

std::string Digest(const std::string& text) {
  Cmd5vlt md5;
  Add(md5, text);
  unsigned char digest[16];
  md5.getDigest(digest);
  return Hex(digest);
}

TEST(Cmd5vlt, TestSuiteOfTheRfc) {
  EXPECT_EQ(Digest(""), "d41d8cd98f00b204e9800998ecf8427e");
  EXPECT_EQ(Digest("a"), "0cc175b9c0f1b6a831c399e269772661");
  EXPECT_EQ(Digest("abc"), "900150983cd24fb0d6963f7d28e17f72");
  EXPECT_EQ(Digest("message digest"), "f96b697d7cb7938d525a2f31aaf161d0");
  EXPECT_EQ(Digest("abcdefghijklmnopqrstuvwxyz"), "c3fcd3d76192e4007dfb496cca67e13b");
  EXPECT_EQ(Digest("ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789"),
            "d174ab98d277d9f5a5611c2c9f419d9f");
  EXPECT_EQ(Digest("1234567890123456789012345678901234567890123456789012345678901234567890123456"
                   "7890"),
            "57edf4a22be3c955ac49da2e2107b67a");
}

TEST(Cmd5vlt, AnySplitGivesTheDigestOfTheWhole) {
  std::string text;
  for (int i = 0; i < 300; ++i) text += static_cast<char>(i * 7);
  std::string whole = Digest(text);
  for (size_t cut = 0; cut <= text.size(); ++cut) {
    Cmd5vlt md5;
    Add(md5, text.substr(0, cut));
    Add(md5, text.substr(cut));
    unsigned char digest[16];
    md5.getDigest(digest);
    ASSERT_EQ(Hex(digest), whole) << cut;
  }
}

TEST(Cmd5vlt, PaddingAtEveryLengthAroundABlock) {
  // By the system's md5sum: printf '%*s' N '' | md5sum.
  EXPECT_EQ(Digest(std::string(55, ' ')), "1c1cca16031c531b8a74731f086e2e8e");
  EXPECT_EQ(Digest(std::string(56, ' ')), "a33142537854fee2afd6cff4c5a1dd39");
  EXPECT_EQ(Digest(std::string(64, ' ')), "4763107ec64e92a517d228fb2743cb96");
}

TEST(Cmd5vlt, ManyBlocksAtOnceGiveTheDigestOfSingleBytes) {
  // By the system's md5sum, as above.
  const char* expected = "7707d6ae4e027c70eea2a935c2296f21";
  std::string text(1000000, 'a');
  EXPECT_EQ(Digest(text), expected);
  Cmd5vlt md5;
  for (char c : text) Add(md5, std::string(1, c));
  unsigned char digest[16];
  md5.getDigest(digest);
  EXPECT_EQ(Hex(digest), expected);
}

TEST(Cmd5vlt, AfterTheDigestTheObjectIsZeroed) {
  Cmd5vlt md5;
  unsigned char digest[16];
  md5.getDigest(digest);
  Add(md5, "abc");
  md5.getDigest(digest);
  EXPECT_NE(Hex(digest), Digest("abc"));
}

}  // namespace
