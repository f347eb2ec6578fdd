#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"

using namespace zt::fnd;

namespace {

using Bytes = std::vector<unsigned char>;

template <class S>
Bytes Wire(const S& s) {
  Bytes bytes(s.serializationSize());
  unsigned char* cursor = bytes.data();
  s.serialize(cursor, bytes.data() + bytes.size());
  EXPECT_EQ(bytes.data() + bytes.size(), cursor);
  return bytes;
}

// Reads; where that raises, cursor and string must be as before.
template <class S>
void Read(S& s, const Bytes& bytes) {
  const S before(s);
  const unsigned char* cursor = bytes.data();
  try {
    s.deserialize(cursor, bytes.data() + bytes.size());
  } catch (...) {
    EXPECT_EQ(bytes.data(), cursor);
    EXPECT_EQ(s.exactCompare(before), 0);
    throw;
  }
}

}  // namespace

TEST(StringWire, StringIsUtf8WithoutTerminator) {
  const String s(L"a\xE9");
  EXPECT_EQ((Bytes{3, 0, 0, 0, 'a', 0xC3, 0xA9}), Wire(s));
  EXPECT_EQ(String(L"\xE9").serializationSize(), 6u);
  EXPECT_EQ(String().serializationSize(), 4u);
  EXPECT_EQ((Bytes{0, 0, 0, 0}), Wire(String()));
}

TEST(StringWire, Utf8StringIsItsBytes) {
  EXPECT_EQ((Bytes{2, 0, 0, 0, 0xC3, 0xA9}), Wire(Utf8String(L"\xE9")));
  Utf8String s;
  Read(s, Bytes{2, 0, 0, 0, 0xC3, 0xA9});
  EXPECT_EQ(s.length(), 2u);
  Read(s, Bytes{0, 0, 0, 0});
  EXPECT_TRUE(s.empty());
}

TEST(StringWire, NarrowFormsCountTheirTerminator) {
  EXPECT_EQ((Bytes{3, 0, 0, 0, 'a', 'b', 0}), Wire(AnsiString("ab")));
  EXPECT_EQ((Bytes{1, 0, 0, 0, 0}), Wire(AsciiString()));
  EXPECT_EQ(AnsiString("ab").serializationSize(), 7u);
  AnsiString s("old");
  Read(s, Bytes{3, 0, 0, 0, 'a', 'b', 0});
  EXPECT_EQ(s.exactCompare("ab"), 0);
  Read(s, Bytes{1, 0, 0, 0, 0});
  EXPECT_TRUE(s.empty());
}

TEST(StringWire, EverythingComesBack) {
  const String s(L"a\0\x10FFFF\xD800 text", 9u);
  String back(L"old");
  Read(back, Wire(s));
  ASSERT_EQ(s.length(), back.length());
  EXPECT_EQ(std::wstring(s.begin(), s.end()), std::wstring(back.begin(), back.end()));
}

TEST(StringWire, CursorMovesBehindTheForm) {
  const Bytes bytes{1, 0, 0, 0, 'a', 2, 0, 0, 0, 'b', 'c', 'x'};
  const unsigned char* cursor = bytes.data();
  String s;
  s.deserialize(cursor, bytes.data() + bytes.size());
  EXPECT_TRUE(s == L"a");
  s.deserialize(cursor, bytes.data() + bytes.size());
  EXPECT_EQ(s.exactCompare(L"bc"), 0);
  EXPECT_EQ(*cursor, 'x');
}

TEST(StringWire, ReadingAppliesTheBufferRule) {
  String s(L"x");
  s.reserve(30);
  Read(s, Bytes{2, 0, 0, 0, 'a', 'b'});
  EXPECT_EQ(s.capacity(), 2u);
  s.reserve(4);
  Read(s, Bytes{2, 0, 0, 0, 'c', 'd'});
  EXPECT_EQ(s.capacity(), 4u);
  Read(s, Bytes{0, 0, 0, 0});
  EXPECT_EQ(s.capacity(), 0u);
}

TEST(StringWire, UnterminatedNarrowFormRaises) {
  AnsiString s("old");
  EXPECT_THROW(Read(s, Bytes{2, 0, 0, 0, 'a', 'b'}), exception::DeserializationError);
  EXPECT_THROW(Read(s, Bytes{0, 0, 0, 0}), exception::DeserializationError);
  AsciiString a("old");
  EXPECT_THROW(Read(a, Bytes{1, 0, 0, 0, 'a'}), exception::DeserializationError);
}

TEST(StringWire, TruncatedFormsRaise) {
  String s(L"old");
  AnsiString a("old");
  Utf8String u(L"old");
  for (const Bytes& bytes : {Bytes{}, Bytes{1, 0, 0}, Bytes{2, 0, 0, 0, 'a'},
                             Bytes{0xFF, 0xFF, 0xFF, 0xFF, 'a', 0}, Bytes{0, 0, 0, 0x80, 'a', 0}}) {
    EXPECT_THROW(Read(s, bytes), exception::DeserializationError);
    EXPECT_THROW(Read(a, bytes), exception::DeserializationError);
    EXPECT_THROW(Read(u, bytes), exception::DeserializationError);
  }
  const unsigned char bytes[4] = {};
  const unsigned char* cursor = bytes + 4;
  EXPECT_THROW(s.deserialize(cursor, bytes), exception::DeserializationError) << "reversed";
}

TEST(StringWire, MalformedUtf8Raises) {
  String s(L"old");
  EXPECT_THROW(Read(s, Bytes{2, 0, 0, 0, 0xC3, 'a'}), exception::InvalidSequence);
  EXPECT_THROW(Read(s, Bytes{1, 0, 0, 0, 0xC3}), exception::InvalidSequence);
}

TEST(StringWire, WithoutRoomNothingIsWritten) {
  const String s(L"ab");
  for (unsigned room = 0; room < s.serializationSize(); ++room) {
    Bytes bytes(8, 0xEE);
    unsigned char* cursor = bytes.data();
    EXPECT_THROW(s.serialize(cursor, bytes.data() + room), exception::BufferOverflow);
    EXPECT_EQ(bytes.data(), cursor);
    EXPECT_EQ(Bytes(8, 0xEE), bytes);
    EXPECT_THROW(AnsiString("abc").serialize(cursor, bytes.data() + room),
                 exception::BufferOverflow);
    EXPECT_THROW(Utf8String(L"ab").serialize(cursor, bytes.data() + room),
                 exception::BufferOverflow);
    EXPECT_EQ(Bytes(8, 0xEE), bytes);
  }
}
