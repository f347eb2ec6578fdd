#include "zt/fnd/WideToUtf8.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <iterator>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "zt/fnd/Exception.h"

using namespace zt::fnd;

namespace {

std::string Encode(const std::wstring& text) {
  const wchar_t* const end = text.data() + text.size();
  const uint32_t n = GetUtf8EncodingBytes(text.data(), end);
  std::vector<unsigned char> out(n + 1, '#');
  EXPECT_EQ(n, WideToUtf8(text.data(), end, out.data(), out.data() + n));
  EXPECT_EQ(out[n], '#') << "no terminator is written";
  return std::string(out.begin(), out.begin() + n);
}

}  // namespace

TEST(WideToUtf8, EncodesByTable) {
  const struct {
    unsigned value;
    const char* bytes;
  } table[] = {
      {0x41, "A"},
      {0x7F, "\x7F"},
      {0x80, "\xC2\x80"},
      {0x7FF, "\xDF\xBF"},
      {0x800, "\xE0\xA0\x80"},
      {0xD800, "\xED\xA0\x80"},
      {0xFFFF, "\xEF\xBF\xBF"},
      {0x10000, "\xF0\x90\x80\x80"},
      {0x10FFFF, "\xF4\x8F\xBF\xBF"},
      {0x1FFFFF, "\xF7\xBF\xBF\xBF"},
      {0x200000, "\xF8\x88\x80\x80\x80"},
      {0x3FFFFFF, "\xFB\xBF\xBF\xBF\xBF"},
      {0x4000000, "\xFC\x84\x80\x80\x80\x80"},
      {0x7FFFFFFF, "\xFD\xBF\xBF\xBF\xBF\xBF"},
      {0x80000000, "?"},
      {0xFFFFFFFF, "?"},
  };
  for (const auto& row : table) {
    EXPECT_EQ(row.bytes, Encode(std::wstring(1, static_cast<wchar_t>(row.value)))) << row.value;
  }
  EXPECT_EQ(Encode(std::wstring(L"a\0b", 3)), std::string("a\0b", 3));
}

TEST(WideToUtf8, CountsTerminatedAndRangedText) {
  EXPECT_EQ(0u, GetUtf8EncodingBytes(nullptr));
  EXPECT_EQ(0u, GetUtf8EncodingBytes(L""));
  EXPECT_EQ(6u, GetUtf8EncodingBytes(L"a\xE9\x20AC"));
  EXPECT_EQ(0u, GetUtf8EncodingBytes(nullptr, nullptr));
  const wchar_t bad[] = {static_cast<wchar_t>(0x80000000), L'a'};
  EXPECT_EQ(GetUtf8EncodingBytes(bad, bad + 2), 2u);
}

TEST(WideToUtf8, CountingStopsBeforeTheLimit) {
  const wchar_t text[] = L"a\xE9\x20ACz";
  const unsigned expected[] = {0, 1, 1, 3, 3, 3, 6, 7, 7};
  for (unsigned limit = 0; limit < 9; ++limit) {
    EXPECT_EQ(expected[limit], GetUtf8EncodingBytesWithBufferLimit(text, text + 4, limit)) << limit;
  }
  EXPECT_EQ(GetUtf8EncodingBytesWithBufferLimit(nullptr, nullptr, 9), 0u);
  EXPECT_EQ(GetUtf8EncodingBytesWithBufferLimit(text, text + 4, 0xFFFFFFFF), 7u);
}

TEST(WideToUtf8, BadDestinationsRaiseBeforeAnythingElse) {
  unsigned char out[4];
  EXPECT_THROW(WideToUtf8(nullptr, nullptr, nullptr, out), exception::InvalidArgument);
  EXPECT_THROW(WideToUtf8(nullptr, nullptr, out + 1, out), exception::InvalidArgument);
  const wchar_t* none = nullptr;
  EXPECT_THROW(WideToUtf8NoOverflow(none, nullptr, nullptr, out), exception::InvalidArgument);
  EXPECT_EQ(WideToUtf8(nullptr, nullptr, out, out + 4), 0u);
}

TEST(WideToUtf8, CharacterThatDoesNotFitStopsTheRun) {
  const wchar_t text[] = L"a\x20ACz";
  for (unsigned room = 1; room < 4; ++room) {
    unsigned char out[8] = "#######";
    const wchar_t* cursor = text;
    EXPECT_EQ(WideToUtf8NoOverflow(cursor, text + 3, out, out + room), 1u);
    EXPECT_EQ(text + 1, cursor);
    EXPECT_STREQ(reinterpret_cast<char*>(out), "a######") << "never a part of a sequence";
    EXPECT_THROW(WideToUtf8(text, text + 3, out, out + room), exception::BufferOverflow);
  }
  unsigned char out[8];
  const wchar_t* cursor = text;
  EXPECT_EQ(WideToUtf8NoOverflow(cursor, text + 3, out, out + 4), 4u);
  EXPECT_EQ(text + 2, cursor);
  EXPECT_EQ(WideToUtf8(text, text + 3, out, out + 5), 5u);
}

TEST(WideToUtf8, NewBlockIsTerminated) {
  const wchar_t text[] = L"a\xE9";
  const auto chars = [](const std::unique_ptr<unsigned char[]>& p) {
    return reinterpret_cast<const char*>(p.get());
  };
  const std::unique_ptr<unsigned char[]> all(WideToUtf8(text)), range(WideToUtf8(text, text + 1)),
      none(WideToUtf8(nullptr)), nullRange(WideToUtf8(nullptr, nullptr));
  EXPECT_STREQ(chars(all), "a\xC3\xA9");
  EXPECT_STREQ(chars(range), "a");
  EXPECT_STREQ(chars(none), "");
  EXPECT_STREQ(chars(nullRange), "");
}

// ---- beside an encoder without shortcuts

namespace {

std::string EncodePlainly(unsigned value) {
  if (value > 0x7FFFFFFF) return "?";
  if (value <= 0x7F) return std::string(1, static_cast<char>(value));
  std::string text;
  unsigned first = 0x3F;  // what the lead of this length can hold
  for (; value > first; value >>= 6, first >>= 1) {
    text.insert(text.begin(), static_cast<char>(0x80 | (value & 0x3F)));
  }
  return static_cast<char>(~(2 * first + 1) | value) + text;
}

// Mostly ASCII, or mostly not.
std::wstring RandomText(std::mt19937& random) {
  static const unsigned kMost[] = {0x80,      0x7FF,      0xFFFF,    0x1FFFFF,
                                   0x3FFFFFF, 0x7FFFFFFF, 0xFFFFFFFF};
  std::wstring text(random() % 120, L'\0');
  const unsigned ascii = random() % 20;
  for (wchar_t& c : text) {
    const unsigned most = random() % 20 < ascii ? 0x7F : kMost[random() % std::size(kMost)];
    c = static_cast<wchar_t>(most - random() % (most / 2 + 1));
  }
  return text;
}

}  // namespace

TEST(WideToUtf8, RandomTextsEncodeAsByTheRulesAlone) {
  std::mt19937 random(20261122);
  int cut = 0;
  for (int i = 0; i < 20000; ++i) {
    const std::wstring text = RandomText(random);
    std::string whole, fitting;
    const size_t space = random() % (text.size() * 3 + 20);
    size_t passed = 0;
    for (wchar_t c : text) {
      const std::string one = EncodePlainly(static_cast<unsigned>(c));
      const bool fits = fitting == whole && whole.size() + one.size() <= space;
      if (fits) {
        fitting += one;
        ++passed;
      }
      whole += one;
    }
    cut += passed < text.size();
    // Blocks of exactly the size.
    const std::unique_ptr<wchar_t[]> exact(new wchar_t[text.size()]);
    std::copy(text.begin(), text.end(), exact.get());
    const wchar_t* const end = exact.get() + text.size();
    const std::unique_ptr<unsigned char[]> dest(new unsigned char[space]);
    std::fill(dest.get(), dest.get() + space, '#');
    const wchar_t* cursor = exact.get();
    ASSERT_EQ(WideToUtf8NoOverflow(cursor, end, dest.get(), dest.get() + space), fitting.size());
    ASSERT_EQ(cursor - exact.get(), static_cast<ptrdiff_t>(passed));
    const std::string rest(space - fitting.size(), '#');
    ASSERT_EQ(std::string(dest.get(), dest.get() + space), fitting + rest) << "space " << space;
    ASSERT_EQ(GetUtf8EncodingBytes(exact.get(), end), whole.size());
  }
  EXPECT_GT(cut, 1000);
}
