#include "zt/fnd/Utf8ToWide.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <iterator>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "zt/fnd/Exception.h"
#include "zt/fnd/WideToUtf8.h"

using namespace zt::fnd;

namespace {

using Bytes = std::vector<unsigned char>;

// In a block of exactly the size, so that a sanitizer sees every byte read beyond it.
std::wstring Decode(const Bytes& bytes) {
  const std::unique_ptr<unsigned char[]> exact(new unsigned char[bytes.size()]);
  std::copy(bytes.begin(), bytes.end(), exact.get());
  const unsigned char* const end = exact.get() + bytes.size();
  const uint32_t n = GetUtf8StringLength(exact.get(), end);
  std::vector<wchar_t> out(n + 1, L'#');
  EXPECT_EQ(n, Utf8ToWide(exact.get(), end, out.data(), out.data() + n));
  EXPECT_EQ(out[n], L'#') << "no terminator is written";
  return std::wstring(out.data(), n);
}

void ExpectInvalid(const Bytes& bytes) {
  const unsigned char* const begin = bytes.data();
  const unsigned char* const end = begin + bytes.size();
  wchar_t out[16];
  EXPECT_THROW(GetUtf8StringLength(begin, end), exception::InvalidSequence);
  EXPECT_THROW(Utf8ToWide(begin, end, out, out + 16), exception::InvalidSequence);
  EXPECT_THROW(Utf8ToWide(begin, static_cast<uint32_t>(bytes.size())), exception::InvalidSequence);
  const unsigned char* cursor = begin;
  EXPECT_THROW(Utf8ToWideNoOverflow(cursor, end, out, out + 16), exception::InvalidSequence);
  EXPECT_EQ(begin, cursor);
  wchar_t c = L'#';
  EXPECT_THROW(ConvertNextUtf8Character(begin, end, c), exception::InvalidSequence);
  EXPECT_EQ(c, L'\0') << "set before the attempt";
}

}  // namespace

TEST(Utf8ToWide, DecodesByTable) {
  const struct {
    Bytes bytes;
    unsigned value;
  } table[] = {
      {{0x00}, 0},
      {{0x41}, 0x41},
      {{0x7F}, 0x7F},
      {{0xC2, 0x80}, 0x80},
      {{0xDF, 0xBF}, 0x7FF},
      {{0xE0, 0xA0, 0x80}, 0x800},
      {{0xE1, 0x80, 0x80}, 0x1000},
      {{0xED, 0xA0, 0x80}, 0xD800},
      {{0xED, 0xBF, 0xBF}, 0xDFFF},
      {{0xEF, 0xBF, 0xBF}, 0xFFFF},
      {{0xF0, 0x90, 0x80, 0x80}, 0x10000},
      {{0xF1, 0x80, 0x80, 0x80}, 0x40000},
      {{0xF4, 0x8F, 0xBF, 0xBF}, 0x10FFFF},
      {{0xF4, 0x90, 0x80, 0x80}, 0x110000},
      {{0xF7, 0xBF, 0xBF, 0xBF}, 0x1FFFFF},
      {{0xF8, 0x84, 0x80, 0x80, 0x80, 0x80}, 0x04000000},
      {{0xF9, 0x84, 0x80, 0x80, 0x80, 0x80}, 0x44000000},
      {{0xFA, 0x84, 0x80, 0x80, 0x80, 0x80}, 0x04000000},
      {{0xFC, 0x84, 0x80, 0x80, 0x80, 0x80}, 0x04000000},
      {{0xFC, 0xBF, 0xBF, 0xBF, 0xBF, 0xBF}, 0x3FFFFFFF},
      {{0xFD, 0x80, 0x80, 0x80, 0x80, 0x80}, 0x40000000},
      {{0xFD, 0xBF, 0xBF, 0xBF, 0xBF, 0xBF}, 0x7FFFFFFF},
  };
  for (const auto& row : table) {
    EXPECT_EQ(std::wstring(1, static_cast<wchar_t>(row.value)), Decode(row.bytes)) << row.value;
  }
}

TEST(Utf8ToWide, RejectsMalformedSequences) {
  const Bytes table[] = {
      {0x80},
      {0xBF, 0x80},
      {0xC0, 0x80},
      {0xC1, 0xBF},
      {0xC2, 0x7F},
      {0xC2, 0xC0},
      {0xE0, 0x80, 0x80},
      {0xE0, 0x9F, 0xBF},
      {0xE1, 0x80, 0x41},
      {0xE1, 0x41, 0x80},
      {0xF0, 0x80, 0x80, 0x80},
      {0xF0, 0x8F, 0xBF, 0xBF},
      {0xF1, 0x80, 0x80, 0xC0},
      {0xF8, 0x83, 0x80, 0x80, 0x80, 0x80},
      {0xF8, 0x88, 0x80, 0x80, 0x80},  // the five-byte form
      {0xF8, 0x88, 0x80, 0x80, 0x80, 0x41},
      {0xFC, 0x83, 0x80, 0x80, 0x80, 0x80},
      {0xFD, 0x7F, 0x80, 0x80, 0x80, 0x80},
      {0xFE},
      {0xFF},
      {0xFE, 0x80, 0x80, 0x80, 0x80, 0x80, 0x80},
  };
  for (const Bytes& bytes : table) ExpectInvalid(bytes);
}

TEST(Utf8ToWide, SequencesThatPassTheEndAreInvalid) {
  const Bytes whole[] = {{0xC3, 0xA9},
                         {0xE2, 0x82, 0xAC},
                         {0xF0, 0x9F, 0x98, 0x80},
                         {0xFD, 0x80, 0x80, 0x80, 0x80, 0x80}};
  for (const Bytes& bytes : whole) {
    for (size_t n = 1; n < bytes.size(); ++n) {
      ExpectInvalid(Bytes(bytes.begin(), bytes.begin() + static_cast<ptrdiff_t>(n)));
    }
  }
}

TEST(Utf8ToWide, FiveBytesOfTheEncoderDoNotDecode) {
  const wchar_t text[] = L"\x200000";
  unsigned char out[8];
  ASSERT_EQ(WideToUtf8(text, text + 1, out, out + 8), 5u);
  ExpectInvalid(Bytes(out, out + 5));
}

TEST(Utf8ToWide, EmptyAndNullRanges) {
  const unsigned char text[] = {'a', 0};
  wchar_t out[4];
  EXPECT_EQ(GetUtf8StringLength(nullptr, nullptr), 0u);
  EXPECT_EQ(GetUtf8StringLength(nullptr, text), 0u);
  EXPECT_EQ(GetUtf8StringLength(text, text), 0u);
  EXPECT_EQ(Utf8ToWide(nullptr, nullptr, out, out + 4), 0u);
  EXPECT_EQ(Utf8ToWide(text, text, out, out), 0u);
  wchar_t c = L'#';
  EXPECT_EQ(ConvertNextUtf8Character(nullptr, text, c), nullptr);
  EXPECT_EQ(c, L'\0');
  c = L'#';
  EXPECT_EQ(text, ConvertNextUtf8Character(text, text, c));
  EXPECT_EQ(c, L'\0');
}

TEST(Utf8ToWide, BadDestinationsRaiseBeforeAnythingElse) {
  wchar_t out[4];
  EXPECT_THROW(Utf8ToWide(nullptr, nullptr, nullptr, out), exception::InvalidArgument);
  EXPECT_THROW(Utf8ToWide(nullptr, nullptr, out + 1, out), exception::InvalidArgument);
  const unsigned char* none = nullptr;
  EXPECT_THROW(Utf8ToWideNoOverflow(none, nullptr, nullptr, nullptr), exception::InvalidArgument);
  EXPECT_THROW(Utf8ToWideNoOverflow(none, nullptr, out + 1, out), exception::InvalidArgument);
}

TEST(Utf8ToWide, DestinationThatEndsFirstOverflows) {
  const unsigned char text[] = {'a', 0xC3, 0xA9, 'b'};
  wchar_t out[] = L"####";
  EXPECT_THROW(Utf8ToWide(text, text + 4, out, out + 2), exception::BufferOverflow);
  EXPECT_STREQ(out, L"a\xE9##") << "what fits is there";
  EXPECT_EQ(Utf8ToWide(text, text + 4, out, out + 3), 3u);
}

TEST(Utf8ToWide, NoOverflowDecodesWhatFits) {
  const unsigned char text[] = {'a', 0xC3, 0xA9, 'b'};
  const unsigned char* cursor = text;
  wchar_t out[] = L"####";
  EXPECT_EQ(Utf8ToWideNoOverflow(cursor, text + 4, out, out + 2), 2u);
  EXPECT_EQ(text + 3, cursor);
  EXPECT_EQ(Utf8ToWideNoOverflow(cursor, text + 4, out, out + 4), 1u);
  EXPECT_EQ(text + 4, cursor);
  EXPECT_EQ(out[0], L'b');
  cursor = text;
  EXPECT_EQ(Utf8ToWideNoOverflow(cursor, text + 4, out, out), 0u);
  EXPECT_EQ(text, cursor);
}

TEST(Utf8ToWide, NewBlockIsTerminated) {
  const unsigned char text[] = {'a', 0xC3, 0xA9, 'b'};
  const std::unique_ptr<wchar_t[]> all(Utf8ToWide(text, 4)), part(Utf8ToWide(text, 1)),
      none(Utf8ToWide(nullptr, 9)), zero(Utf8ToWide(text, 0));
  EXPECT_STREQ(all.get(),
               L"a\xE9"
               L"b");
  EXPECT_STREQ(part.get(), L"a");
  EXPECT_STREQ(none.get(), L"");
  EXPECT_STREQ(zero.get(), L"");
}

TEST(Utf8ToWide, OneCharacterAtATime) {
  const unsigned char text[] = {'a', 0, 0xE2, 0x82, 0xAC};
  const unsigned char* const end = text + sizeof text;
  wchar_t c;
  const unsigned char* s = ConvertNextUtf8Character(text, end, c);
  EXPECT_EQ(text + 1, s);
  EXPECT_EQ(c, L'a');
  s = ConvertNextUtf8Character(s, end, c);
  EXPECT_EQ(c, L'\0');
  s = ConvertNextUtf8Character(s, end, c);
  EXPECT_EQ(end, s);
  EXPECT_EQ(c, 0x20AC);
}

TEST(Utf8ToWide, EveryEncodableValueOutsideTheFiveByteFormComesBack) {
  for (std::uint32_t value = 0; value < 0x80000000u; value += value < 0x20000 ? 1 : value / 300) {
    if (value > 0x1FFFFF && value <= 0x3FFFFFF) continue;
    const wchar_t c = static_cast<wchar_t>(value);
    unsigned char bytes[6];
    const uint32_t n = WideToUtf8(&c, &c + 1, bytes, bytes + 6);
    wchar_t back;
    ASSERT_EQ(bytes + n, ConvertNextUtf8Character(bytes, bytes + n, back));
    ASSERT_EQ(c, back);
  }
}

// ---- beside a decoder without shortcuts

namespace {

// The rules of the header, byte by byte: the value of the sequence at the cursor, which moves past
// it. False, with the cursor where it was, for a malformed one.
bool DecodePlainly(const unsigned char*& s, const unsigned char* end, unsigned& value) {
  const unsigned lead = *s;
  if (lead < 0x80) {
    value = lead;
    ++s;
    return true;
  }
  if (lead < 0xC2 || lead > 0xFD) return false;
  const int length = lead < 0xE0 ? 2 : lead < 0xF0 ? 3 : lead < 0xF8 ? 4 : 6;
  if (end - s < length) return false;
  const unsigned least = lead == 0xE0                  ? 0xA0
                         : lead == 0xF0                ? 0x90
                         : length == 6 && lead != 0xFD ? 0x84
                                                       : 0x80;
  if (s[1] < least) return false;
  unsigned result = lead & (length == 2 ? 0x1F : length == 3 ? 0x0F : length == 4 ? 0x07 : 0x01);
  for (int i = 1; i < length; ++i) {
    if ((s[i] & 0xC0) != 0x80) return false;
    result = result << 6 | (s[i] & 0x3F);
  }
  value = result;
  s += length;
  return true;
}

struct Outcome {
  bool valid = true;
  ptrdiff_t bytes = 0;  // passed; 0 where the text is malformed, as the count
  size_t count = 0;
  std::wstring text;  // all of the destination

  bool operator==(const Outcome&) const = default;
};

Outcome Plainly(const Bytes& bytes, size_t space) {
  Outcome outcome;
  const unsigned char* s = bytes.data();
  const unsigned char* const end = s + bytes.size();
  unsigned value;
  while (outcome.valid && s != end && outcome.text.size() < space) {
    outcome.valid = DecodePlainly(s, end, value);
    if (outcome.valid) outcome.text += static_cast<wchar_t>(value);
  }
  if (outcome.valid) {
    outcome.bytes = s - bytes.data();
    outcome.count = outcome.text.size();
  }
  outcome.text.resize(space, L'#');
  return outcome;
}

Outcome ByTheLibrary(const Bytes& bytes, size_t space) {
  Outcome outcome;
  // Blocks of exactly the size.
  const std::unique_ptr<unsigned char[]> exact(new unsigned char[bytes.size()]);
  std::copy(bytes.begin(), bytes.end(), exact.get());
  const std::unique_ptr<wchar_t[]> dest(new wchar_t[space]);
  std::fill(dest.get(), dest.get() + space, L'#');
  const unsigned char* cursor = exact.get();
  try {
    outcome.count =
        Utf8ToWideNoOverflow(cursor, exact.get() + bytes.size(), dest.get(), dest.get() + space);
  } catch (const exception::InvalidSequence&) {
    outcome.valid = false;
  }
  outcome.bytes = cursor - exact.get();
  outcome.text.assign(dest.get(), space);
  return outcome;
}

// Mostly ASCII, or mostly not; whole sequences of each length, now and then one that is cut, or a
// byte that is changed.
Bytes RandomText(std::mt19937& random) {
  static const Bytes kSequences[] = {{0xC3, 0xA9},
                                     {0xDF, 0xBF},
                                     {0xE0, 0xA0, 0x80},
                                     {0xE2, 0x82, 0xAC},
                                     {0xED, 0xA0, 0x80},
                                     {0xF0, 0x90, 0x80, 0x80},
                                     {0xF0, 0x9F, 0x98, 0x80},
                                     {0xF7, 0xBF, 0xBF, 0xBF},
                                     {0xF8, 0x84, 0x80, 0x80, 0x80, 0x80},
                                     {0xFD, 0x80, 0x80, 0x80, 0x80, 0x80}};
  Bytes bytes;
  const size_t pieces = random() % 120;
  const unsigned ascii = random() % 20;
  for (size_t i = 0; i < pieces; ++i) {
    if (random() % 20 < ascii) {
      bytes.push_back(static_cast<unsigned char>(random() % 0x80));
    } else {
      const Bytes& one = kSequences[random() % std::size(kSequences)];
      bytes.insert(bytes.end(), one.begin(), one.end());
    }
  }
  if (!bytes.empty() && random() % 4 == 0) {
    bytes[random() % bytes.size()] = static_cast<unsigned char>(random());
  }
  if (random() % 4 == 0) bytes.resize(bytes.size() - random() % (bytes.size() + 1));
  return bytes;
}

}  // namespace

TEST(Utf8ToWide, RandomTextsDecodeAsByTheRulesAlone) {
  std::mt19937 random(20261122);
  int malformed = 0, cut = 0;
  for (int i = 0; i < 20000; ++i) {
    const Bytes bytes = RandomText(random);
    const size_t space = random() % (bytes.size() + 20);
    const Outcome plain = Plainly(bytes, space);
    ASSERT_EQ(plain, ByTheLibrary(bytes, space)) << testing::PrintToString(bytes) << space;
    const unsigned char* const end = bytes.data() + bytes.size();
    const Outcome whole = Plainly(bytes, bytes.size());
    if (whole.valid) {
      ASSERT_EQ(GetUtf8StringLength(bytes.data(), end), whole.count);
      cut += plain.bytes < whole.bytes;
    } else {
      ASSERT_THROW(GetUtf8StringLength(bytes.data(), end), exception::InvalidSequence);
      ++malformed;
    }
  }
  EXPECT_GT(malformed, 1000);
  EXPECT_GT(cut, 1000);
}
