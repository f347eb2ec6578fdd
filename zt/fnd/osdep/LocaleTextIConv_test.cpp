// The conversions by hand beside those of iconv, which they replace: the same for any input.
#include <gtest/gtest.h>
#include <iconv.h>

#include <clocale>
#include <random>
#include <string>
#include <vector>

#include "tests/support/ScopedLocale.h"
#include "zt/fnd/osdep/IConv.h"
#include "zt/fnd/osdep/LocaleText.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::ScopedLocale;

// What is beyond the end shows that nothing was written there.
template <class Out, class Converter>
std::basic_string<Out> Converted(size_t room, Converter convert) {
  std::basic_string<Out> out(room + 4, static_cast<Out>('#'));
  Out* end = out.data() + room;
  convert(out.data(), end);
  EXPECT_EQ(std::basic_string<Out>(4, static_cast<Out>('#')), out.substr(room));
  return out.substr(0, static_cast<size_t>(end - out.data()));
}

std::wstring WideByHand(const std::string& text, size_t room) {
  return Converted<wchar_t>(room, [&](wchar_t* dest, wchar_t*& end) {
    AnsiToWideNoAlloc(text.data(), text.data() + text.size(), "", dest, end);
  });
}

std::wstring WideByIConv(const std::string& text, size_t room) {
  return Converted<wchar_t>(room, [&](wchar_t* dest, wchar_t*& end) {
    IConv(text.data(), text.data() + text.size(), "", dest, end, kWideEncoding);
  });
}

std::string NarrowByHand(const std::wstring& text, size_t room) {
  return Converted<char>(room, [&](char* dest, char*& end) {
    WideToAnsiNoAlloc(text.data(), text.data() + text.size(), "", dest, end);
  });
}

std::string NarrowByIConv(const std::wstring& text, size_t room) {
  return Converted<char>(room, [&](char* dest, char*& end) {
    IConv(text.data(), text.data() + text.size(), kWideEncoding, dest, end, "");
  });
}

const std::vector<std::string>& HostileBytes() {
  static const std::vector<std::string> pieces = {
      "a",
      "\x7F",
      std::string(1, '\0'),
      "\x80",
      "\xBF",
      "\xC0\x80",  // overlong
      "\xC1\xBF",  // overlong
      "\xC2\x80",  // the first of two bytes
      "\xC3",      // incomplete
      "\xDF\xBF",
      "\xE0\x9F\xBF",  // overlong
      "\xE0\xA0\x80",  // the first of three bytes
      "\xE2\x82",      // incomplete
      "\xE2\x82\xAC",
      "\xED\x9F\xBF",  // the last before the surrogates
      "\xED\xA0\x80",  // a surrogate
      "\xED\xBF\xBF",  // a surrogate
      "\xEE\x80\x80",
      "\xEF\xBB\xBF",  // byte order mark
      "\xEF\xBF\xBE",
      "\xEF\xBF\xBF",
      "\xF0\x8F\xBF\xBF",  // overlong
      "\xF0\x90\x80\x80",  // the first of four bytes
      "\xF0\x9F\x98",      // incomplete
      "\xF3\xA0\x80\x81",  // a tag character
      "\xF4\x8F\xBF\xBF",  // the last character
      "\xF4\x90\x80\x80",  // beyond it
      "\xF5\x80\x80\x80",
      "\xF7\xBF\xBF\xBF",
      "\xF8\x88\x80\x80\x80",
      "\xFC\x84\x80\x80\x80\x80",
      "\xFE",
      "\xFF",
  };
  return pieces;
}

const std::vector<wchar_t>& HostileCharacters() {
  static const std::vector<wchar_t> characters = {0,
                                                  'a',
                                                  0x7F,
                                                  0x80,
                                                  0xE9,
                                                  0x7FF,
                                                  0x800,
                                                  0xD7FF,
                                                  0xD800,
                                                  0xDBFF,
                                                  0xDC00,
                                                  0xDFFF,
                                                  0xE000,
                                                  0xFEFF,
                                                  0xFFFE,
                                                  0xFFFF,
                                                  0x10000,
                                                  0xE0000,
                                                  0xE0001,
                                                  0xE007F,
                                                  0xE0080,
                                                  0x10FFFF,
                                                  0x110000,
                                                  0x1FFFFF,
                                                  0x200000,
                                                  0x3FFFFFF,
                                                  0x7FFFFFFF,
                                                  static_cast<wchar_t>(0x80000000),
                                                  static_cast<wchar_t>(0x80000041),
                                                  static_cast<wchar_t>(0xFFFFFFFF)};
  return characters;
}

// Whether the system's own iconv takes the present locale for UTF-8.
bool SystemReadsUtf8() {
  const iconv_t converter = iconv_open(kWideEncoding, "");
  char bytes[] = "\xC2\x80";
  wchar_t character = 0;
  char* in = bytes;
  char* out = reinterpret_cast<char*>(&character);
  size_t inLeft = 2, outLeft = sizeof character;
  iconv(converter, &in, &inLeft, &out, &outLeft);
  iconv_close(converter);
  return character == 0x80;
}

class LocaleTextIConv : public testing::TestWithParam<const char*> {
 protected:
  void SetUp() override {
    if (GetParam() == std::string("C") && SystemReadsUtf8()) {
      GTEST_SKIP() << "NOT TESTED: this iconv takes the \"C\" locale for UTF-8";
    }
  }

  size_t below(size_t n) { return std::uniform_int_distribution<size_t>(0, n - 1)(m_random); }

  std::string bytes(size_t pieces) {
    std::string text;
    for (; pieces > 0; --pieces) {
      if (below(4) == 0) {
        text += static_cast<char>(below(256));
      } else {
        text += HostileBytes()[below(HostileBytes().size())];
      }
    }
    return text;
  }

  std::wstring characters(size_t n) {
    std::wstring text;
    for (; n > 0; --n) {
      text += below(4) == 0 ? static_cast<wchar_t>(below(0x120000))
                            : HostileCharacters()[below(HostileCharacters().size())];
    }
    return text;
  }

  void compare(const std::string& text, size_t room) {
    ASSERT_EQ(WideByIConv(text, room), WideByHand(text, room))
        << testing::PrintToString(text) << ", room for " << room;
  }

  void compare(const std::wstring& text, size_t room) {
    ASSERT_EQ(NarrowByIConv(text, room), NarrowByHand(text, room))
        << testing::PrintToString(text) << ", room for " << room;
  }

  ScopedLocale m_locale{LC_CTYPE, GetParam()};
  std::mt19937 m_random{20261122};
};

TEST_P(LocaleTextIConv, EveryPairOfBytesAndEveryHostilePieceIsTheSame) {
  for (int first = 0; first < 256; ++first) {
    for (int second = 0; second < 256; second += 5) {
      compare(std::string{static_cast<char>(first), static_cast<char>(second), 'z'}, 8);
    }
  }
  for (const std::string& first : HostileBytes()) {
    for (const std::string& second : HostileBytes()) compare(first + second, 16);
  }
}

TEST_P(LocaleTextIConv, EveryPairOfHostileCharactersIsTheSameInAnyRoom) {
  for (wchar_t first : HostileCharacters()) {
    for (wchar_t second : HostileCharacters()) {
      for (size_t room = 0; room <= 9; room += 3) compare(std::wstring{first, second}, room);
    }
  }
}

TEST_P(LocaleTextIConv, RandomTextIsTheSameInAnyRoom) {
  for (int round = 0; round < 4000; ++round) {
    const std::string text = bytes(below(20));
    compare(text, below(text.size() + 2));
    const std::wstring wide = characters(below(20));
    compare(wide, below(4 * wide.size() + 2));
  }
}

// Longer than what iconv keeps between two steps of a conversion.
TEST_P(LocaleTextIConv, LongTextIsTheSame) {
  for (int round = 0; round < 30; ++round) {
    const std::string text = bytes(20000);
    compare(text, text.size() - below(5000));
    const std::wstring wide = characters(20000);
    compare(wide, 4 * wide.size() - below(60000));
  }
}

INSTANTIATE_TEST_SUITE_P(Locales, LocaleTextIConv, testing::Values("C", "C.UTF-8"),
                         [](const auto& info) {
                           return std::string(info.param == std::string("C") ? "C" : "Utf8");
                         });

}  // namespace
}  // namespace zt::fnd::osdep
