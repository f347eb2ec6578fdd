#include "zt/fnd/osdep/IConv.h"

#include <dlfcn.h>
#include <gtest/gtest.h>
#include <iconv.h>
#include <string.h>

#include <cerrno>
#include <string>
#include <vector>

#include "tests/support/TempDir.h"
#include "zt/fnd/Exception.h"

using namespace zt::fnd;
using namespace zt::fnd::osdep;

namespace {

// While an object lives, iconv writes "*" for a character that the target lacks, and counts it, as
// POSIX allows and musl does.
class IConvThatSubstitutes {
 public:
  IConvThatSubstitutes() { s_substitutes = true; }
  ~IConvThatSubstitutes() { s_substitutes = false; }
  IConvThatSubstitutes(const IConvThatSubstitutes&) = delete;
  IConvThatSubstitutes& operator=(const IConvThatSubstitutes&) = delete;

  inline static thread_local bool s_substitutes = false;
};

using IConvFunction = size_t (*)(iconv_t, char**, size_t*, char**, size_t*);

// From the wide side only. What is no character at all stops this iconv too.
size_t Substituting(IConvFunction real, iconv_t cd, char** in, size_t* inLeft, char** out,
                    size_t* outLeft) {
  size_t substituted = 0;
  for (;;) {
    const size_t result = real(cd, in, inLeft, out, outLeft);
    if (result != static_cast<size_t>(-1) || errno != EILSEQ || *outLeft == 0) {
      return result == 0 ? substituted : result;
    }
    char32_t lacking;
    memcpy(&lacking, *in, sizeof lacking);
    if (lacking > 0x10FFFF || (lacking >= 0xD800 && lacking < 0xE000)) return result;
    *(*out)++ = '*';
    --*outLeft;
    *in += sizeof lacking;
    *inLeft -= sizeof lacking;
    ++substituted;
  }
}

}  // namespace

// Comes before the C library's in this program.
extern "C" size_t iconv(iconv_t cd, char** in, size_t* inLeft, char** out, size_t* outLeft) {
  static const IConvFunction real = reinterpret_cast<IConvFunction>(dlsym(RTLD_NEXT, "iconv"));
  return IConvThatSubstitutes::s_substitutes && in
             ? Substituting(real, cd, in, inLeft, out, outLeft)
             : real(cd, in, inLeft, out, outLeft);
}

namespace {

std::wstring ToWide(const std::string& text, const char* from, size_t room = 64) {
  std::vector<wchar_t> out(room + 1, L'#');
  wchar_t* end = out.data() + room;
  IConv(text.data(), text.data() + text.size(), from, out.data(), end, kWideEncoding);
  EXPECT_EQ(out[room], L'#') << "written beyond the room";
  return std::wstring(out.data(), end);
}

std::string ToNarrow(const std::wstring& text, const char* to, size_t room = 64) {
  std::vector<char> out(room + 1, '#');
  char* end = out.data() + room;
  IConv(text.data(), text.data() + text.size(), kWideEncoding, out.data(), end, to);
  EXPECT_EQ(out[room], '#') << "written beyond the room";
  return std::string(out.data(), end);
}

}  // namespace

TEST(IConv, ConvertsBothWays) {
  EXPECT_EQ(L"a\xE9\x20AC", ToWide("a\xC3\xA9\xE2\x82\xAC", "UTF-8"));
  EXPECT_EQ("a\xC3\xA9\xE2\x82\xAC", ToNarrow(L"a\xE9\x20AC", "UTF-8"));
  EXPECT_EQ(L"a\xE9", ToWide("a\xE9", "ISO-8859-1"));
  EXPECT_EQ("a\xE9", ToNarrow(L"a\xE9", "ISO-8859-1"));
  EXPECT_EQ(std::wstring(L"a\0b", 3), ToWide(std::string("a\0b", 3), "UTF-8"));
}

TEST(IConv, EachBadUnitBecomesOneQuestionMark) {
  EXPECT_EQ(L"a??b", ToWide("a\xFF\xFE"
                            "b",
                            "UTF-8"));
  EXPECT_EQ(L"??", ToWide("\xE2\x82", "UTF-8")) << "cut at the end: one for each byte";
  EXPECT_EQ(L"?(", ToWide("\xC3(", "UTF-8"));
  EXPECT_EQ("a?b", ToNarrow(L"a\x20AC"
                            L"b",
                            "ISO-8859-1"));
  EXPECT_EQ("??", ToNarrow(L"\xD800\x110000", "UTF-8"));
}

TEST(IConv, TheQuestionMarkIsOursWhereIConvWritesAnother) {
  IConvThatSubstitutes substitutes;
  EXPECT_EQ("a?b?", ToNarrow(L"a\x20AC"
                             L"b\x20AC",
                             "ISO-8859-1"));
  EXPECT_EQ("a??b\xE9", ToNarrow(L"a\x20AC\xD800"
                                 L"b\xE9",
                                 "ISO-8859-1"));
  EXPECT_EQ("a?", ToNarrow(L"a\x20AC"
                           L"b",
                           "ISO-8859-1", 2));
  EXPECT_EQ("a\xE2\x82\xAC?", ToNarrow(L"a\x20AC\xD800", "UTF-8"));
}

TEST(IConv, TransliterationIsNoSubstitution) {
  const iconv_t known = iconv_open("US-ASCII//TRANSLIT", kWideEncoding);
  if (known == reinterpret_cast<iconv_t>(-1)) {
    GTEST_SKIP() << "NOT TESTED: this iconv knows no transliteration";
  }
  iconv_close(known);
  EXPECT_EQ("aEURb", ToNarrow(L"a\x20AC"
                              L"b",
                              "US-ASCII//TRANSLIT"));
}

TEST(IConv, ShortageOfRoomTruncates) {
  EXPECT_EQ(L"ab", ToWide("abcd", "UTF-8", 2));
  EXPECT_EQ(L"", ToWide("abcd", "UTF-8", 0));
  EXPECT_EQ("ab", ToNarrow(L"abcd", "UTF-8", 2));
  EXPECT_EQ("a?", ToNarrow(L"a\x20AC", "UTF-8", 2)) << "some room, but not enough, is bad text";
}

TEST(IConv, UnknownEncodingRaisesAlsoForNothing) {
  EXPECT_THROW(ToWide("a", "no-such-code"), exception::InvalidLocale);
  EXPECT_THROW(ToWide("", "no-such-code"), exception::InvalidLocale);
  EXPECT_THROW(ToNarrow(L"a", "en_US.UTF-8"), exception::InvalidLocale) << "a locale, no encoding";
}

TEST(IConv, LeavesNoDescriptorOpen) {
  const int before = vlt::test::OpenDescriptors();
  for (int i = 0; i < 50; ++i) ToWide("a\xFF", "UTF-8");
  EXPECT_EQ(before, vlt::test::OpenDescriptors());
}
