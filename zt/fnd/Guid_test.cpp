#include "zt/fnd/Guid.h"

#include <gtest/gtest.h>

#include <cstring>
#include <map>
#include <string>

#include "zt/fnd/Exception.h"

using namespace zt::fnd;

namespace {

constexpr wchar_t kText[] = L"{00112233-4455-6677-8899-AABBCCDDEEFF}";
constexpr _GUID kGuid = {
    0x00112233, 0x4455, 0x6677, {0x88, 0x99, 0xAA, 0xBB, 0xCC, 0xDD, 0xEE, 0xFF}};

std::wstring Text(const Guid& guid) {
  String text(L"old");
  guid.toString(text);
  return std::wstring(text.begin(), text.end());
}

}  // namespace

TEST(Guid, IsSixteenBytesThatCopyAsTheyAre) {
  static_assert(sizeof(Guid) == 16 && std::is_trivially_copyable_v<Guid>);
  const Guid guid(kGuid);
  const Guid copy(guid);
  EXPECT_EQ(memcmp(&copy, &kGuid, 16), 0);
}

TEST(Guid, ZerosRoundTrip) {
  const wchar_t zeros[] = L"{00000000-0000-0000-0000-000000000000}";
  EXPECT_EQ(zeros, Text(Guid(zeros)));
  EXPECT_EQ(zeros, Text(Guid()));
}

TEST(Guid, ParsesItsFields) {
  const Guid guid(kText);
  EXPECT_EQ(guid.get().Data1, 0x00112233u);
  EXPECT_EQ(guid.get().Data2, 0x4455u);
  EXPECT_EQ(guid.get().Data3, 0x6677u);
  EXPECT_EQ(memcmp(guid.get().Data4, kGuid.Data4, 8), 0);
  EXPECT_EQ(Text(guid), kText);
}

TEST(Guid, LowerCaseParsesAndPrintsInCapitals) {
  EXPECT_EQ(Text(Guid(L"{00112233-4455-6677-8899-aabbccddeeff}")), kText);
  EXPECT_EQ(Text(Guid(L"{00112233-4455-6677-8899-AaBbCcDdEeFf}")), kText);
}

TEST(Guid, WrongLengthsRaise) {
  const std::wstring text(kText);
  for (const std::wstring& bad :
       {std::wstring(), text.substr(1, 36), text.substr(0, 37), text + L" ", text + text}) {
    EXPECT_THROW(Guid(String(bad.c_str())), exception::BadGuidString);
  }
}

TEST(Guid, EveryWrongCharacterRaisesAndChangesNothing) {
  Guid guid(kText);
  for (unsigned i = 0; i < 38; ++i) {
    for (const wchar_t wrong : {L'g', L'G', L'/', L':', L'@', L'`', L' ', L'\0', L'\xFF11'}) {
      String bad(L"{FFFFFFFF-FFFF-FFFF-FFFF-FFFFFFFFFFFF}");
      bad[i] = wrong;
      EXPECT_THROW(guid.fromString(bad), exception::BadGuidString) << i;
      EXPECT_EQ(Text(guid), kText);
    }
  }
  String bad(kText);
  bad[37] = L')';
  EXPECT_THROW(guid.fromString(bad), exception::BadGuidString) << "38 characters, wrong end";
  bad = L"{0011223344-55-6677-8899-AABBCCDDEEFF}";
  EXPECT_THROW(guid.fromString(bad), exception::BadGuidString) << "hyphens have their places";
}

TEST(Guid, OrdersByFields) {
  const _GUID small = {0x00000100, 0, 0, {}}, large = {0x00000200, 0, 0, {}};
  EXPECT_TRUE(small < large);
  const _GUID first = {0x000001FF, 9, 9, {9}}, second = {0x00000200, 0, 0, {}};
  EXPECT_TRUE(first < second) << "memory begins with FF and 00";
  EXPECT_FALSE(second < first);
}

TEST(Guid, OrdersByTheFirstDifference) {
  const _GUID table[] = {{1, 1, 1, {1}},      {1, 1, 1, {1, 0, 0, 0, 0, 0, 0, 1}},
                         {1, 1, 1, {0x80}},   {1, 1, 0x100, {0}},
                         {1, 0x0200, 0, {0}}, {0x80000000, 0, 0, {0}}};
  for (const _GUID& a : table) {
    for (const _GUID& b : table) {
      EXPECT_EQ(&a < &b, a < b);
      EXPECT_EQ(&a == &b, a == b);
      EXPECT_EQ(&a < &b, Guid(a) < Guid(b));
      EXPECT_EQ(&a == &b, Guid(a) == Guid(b));
    }
  }
  std::map<_GUID, int> map;
  map[table[0]] = 1;
  EXPECT_EQ(map.count(table[0]), 1u);
}

TEST(Guid, DeserializesTheMemoryForm) {
  const unsigned char bytes[17] = {0x33, 0x22, 0x11, 0x00, 0x55, 0x44, 0x77, 0x66, 0x88,
                                   0x99, 0xAA, 0xBB, 0xCC, 0xDD, 0xEE, 0xFF, 1};
  Guid guid;
  const unsigned char* cursor = bytes;
  guid.deserialize(cursor, bytes + 17);
  EXPECT_EQ(Text(guid), kText);
  EXPECT_EQ(bytes + 16, cursor);
  EXPECT_EQ(guid.serializationSize(), 16u);
}

TEST(Guid, DeserializingFewerThanSixteenBytesRaises) {
  const unsigned char bytes[16] = {};
  Guid guid(kText);
  for (int n = 0; n < 16; ++n) {
    const unsigned char* cursor = bytes;
    EXPECT_THROW(guid.deserialize(cursor, bytes + n), exception::DeserializationError);
    EXPECT_EQ(bytes, cursor);
  }
  EXPECT_EQ(Text(guid), kText);
}

TEST(Guid, MakeGivesFreshVersionFourUuids) {
  const Guid a = Guid::make(), b = Guid::make();
  EXPECT_FALSE(a == b);
  EXPECT_EQ(Text(a)[15], L'4');
  EXPECT_NE(std::wstring::npos, std::wstring(L"89AB").find(Text(a)[20]));
}

TEST(Guid, ParsingHelpersStopForGood) {
  const wchar_t text[] = L"fFx";
  const wchar_t* cursor = text;
  bool ok = true;
  EXPECT_EQ(ParseHexNibble(cursor, text + 3, ok), 15);
  EXPECT_EQ(ParseHexNibble(cursor, text + 3, ok), 15);
  EXPECT_EQ(ParseHexNibble(cursor, text + 3, ok), 0);
  EXPECT_FALSE(ok);
  EXPECT_EQ(text + 2, cursor);
  SkipCharacter(cursor, text + 3, L'x', ok);
  EXPECT_EQ(text + 2, cursor) << "nothing happens once it has failed";
  ok = true;
  SkipCharacter(cursor, text + 3, L'x', ok);
  EXPECT_TRUE(ok);
  SkipCharacter(cursor, text + 3, L'x', ok);
  EXPECT_FALSE(ok) << "at the end";
}

TEST(Guid, ParsedFieldsAreStoredOnlyWhileAllIsWell) {
  const wchar_t text[] = L"12345678";
  const wchar_t* cursor = text;
  unsigned char bytes[4] = {};
  unsigned char* out = bytes;
  bool ok = true;
  ParseHex<uint32_t>(cursor, text + 8, out, ok);
  EXPECT_TRUE(ok);
  EXPECT_EQ(bytes + 4, out);
  EXPECT_EQ(bytes[0], 0x78) << "the host's byte order";
  cursor = text;
  out = bytes;
  ParseHex<uint16_t>(cursor, text + 3, out, ok);
  EXPECT_FALSE(ok);
  EXPECT_EQ(bytes, out);
  EXPECT_EQ(bytes[0], 0x78);
}
