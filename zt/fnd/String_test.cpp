#include "zt/fnd/String.h"

#include <gtest/gtest.h>

#include <cwchar>
#include <map>
#include <new>
#include <string>
#include <utility>

#include "tests/support/Child.h"
#include "tests/support/MemoryLimit.h"
#include "zt/fnd/DLLAlloc.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/StringBase.inl"

using namespace zt::fnd;

namespace {

// Text, terminator and capacity in one look.
template <class S>
testing::AssertionResult Is(const S& s, const typename S::value_type* text, unsigned capacity) {
  const std::basic_string<typename S::value_type> expected(text);
  if (s.length() != expected.size() || s.exactCompare(text) != 0 || *s.end() != 0) {
    return testing::AssertionFailure() << "text differs, length " << s.length();
  }
  if (s.capacity() != capacity) return testing::AssertionFailure() << "capacity " << s.capacity();
  return testing::AssertionSuccess();
}

String WithCapacity(const wchar_t* text, unsigned capacity) {
  String s(text);
  s.reserve(capacity);
  return s;
}

std::wstring Std(const String& s) { return std::wstring(s.begin(), s.end()); }

}  // namespace

TEST(String, DefaultIsEmptyButOwnsATerminator) {
  const String s;
  EXPECT_EQ(s.length(), 0u);
  EXPECT_EQ(s.size(), 0u);
  EXPECT_EQ(s.capacity(), 0u);
  EXPECT_TRUE(s.empty());
  ASSERT_NE(s.c_str(), nullptr);
  EXPECT_EQ(*s.c_str(), L'\0');
  EXPECT_EQ(s.begin(), s.c_str());
  EXPECT_EQ(s.begin(), s.end());
  s.checkInvariants();
}

TEST(String, ConstructionFromCharacters) {
  EXPECT_TRUE(Is(String(L"abc"), L"abc", 3));
  EXPECT_TRUE(Is(String(L"abcdef", 3u), L"abc", 3));
  const wchar_t text[] = L"abcdef";
  EXPECT_TRUE(Is(String(text + 1, text + 4), L"bcd", 3));
  EXPECT_TRUE(Is(String(4, L'x'), L"xxxx", 4));
  EXPECT_TRUE(Is(String(0, L'x'), L"", 0));
  EXPECT_TRUE(Is(String(5, 65), L"AAAAA", 5));
  EXPECT_TRUE(Is(AnsiString("abc"), "abc", 3));
  EXPECT_TRUE(Is(AsciiString(3, 'z'), "zzz", 3));
}

TEST(String, NullPointersCountAsEmpty) {
  const wchar_t* const null = nullptr;
  const char* const narrowNull = nullptr;
  EXPECT_TRUE(Is(String(null), L"", 0));
  EXPECT_TRUE(Is(String(null, 7u), L"", 0));
  EXPECT_TRUE(Is(String(null, null), L"", 0));
  EXPECT_TRUE(Is(String(narrowNull), L"", 0));
  EXPECT_TRUE(Is(String(narrowNull, 7u), L"", 0));
  String s(L"text");
  s = null;
  EXPECT_TRUE(Is(s, L"", 0));
  s.append(null).append(null, 3u).append(narrowNull).append(narrowNull, 3u);
  EXPECT_TRUE(Is(s, L"", 0));
  EXPECT_TRUE(s == null);
}

TEST(String, EmbeddedZerosAreKeptByLength) {
  const String s(L"a\0b", 3u);
  EXPECT_EQ(s.length(), 3u);
  EXPECT_TRUE(s.hasEmbeddedNull());
  EXPECT_FALSE(String(L"ab").hasEmbeddedNull());
  EXPECT_FALSE(String().hasEmbeddedNull());
  String copy(s);
  copy += s;
  EXPECT_EQ(Std(copy), std::wstring(L"a\0ba\0b", 6));
  EXPECT_EQ(s.find(L'\0'), 1u);
  String assigned;
  assigned.assign(s.c_str(), s.length());
  EXPECT_EQ(assigned.length(), 3u);
  EXPECT_TRUE(s == L"a") << "comparison stops at the first zero";
}

TEST(String, CopyHasTheCapacityOfItsLength) {
  const String source = WithCapacity(L"abc", 50);
  EXPECT_TRUE(Is(source, L"abc", 50));
  const String copy(source);
  EXPECT_TRUE(Is(copy, L"abc", 3));
  EXPECT_NE(source.begin(), copy.begin());
}

TEST(String, MovedFromStringIsEmptyAndUsable) {
  String source(L"abc");
  const wchar_t* const block = source.begin();
  String moved(std::move(source));
  EXPECT_EQ(block, moved.begin());
  EXPECT_TRUE(Is(source, L"", 0));
  String target(L"other");
  target = std::move(moved);
  EXPECT_EQ(block, target.begin());
  EXPECT_TRUE(Is(moved, L"other", 5)) << "move assignment swaps";
}

TEST(String, SubstringConstructorChecksThePositionAndCutsTheCount) {
  const String s(L"abcdef");
  EXPECT_TRUE(Is(String(s, 2, 3), L"cde", 3));
  EXPECT_TRUE(Is(String(s, 2, 99), L"cdef", 4));
  EXPECT_TRUE(Is(String(s, 6, 1), L"", 0));
  EXPECT_THROW(String(s, 7, 0), exception::OutOfRange2);
}

TEST(String, ConcatenatingConstructorAllocatesOnce) {
  const String a = WithCapacity(L"ab", 20), b(L"cd");
  EXPECT_TRUE(Is(String(a, b), L"abcd", 4));
  EXPECT_TRUE(Is(String(String(), String()), L"", 0));
}

TEST(String, LengthsBeyondAllBlocksAreOutOfRangeNotMemory) {
  EXPECT_THROW(String(0x3FFFFFFF, L'x'), exception::OutOfRange);
  EXPECT_THROW(String(0xFFFFFFFF, L'x'), exception::OutOfRange);
  EXPECT_THROW(AnsiString(0xFFFFFFFF, 'x'), exception::OutOfRange);
  const wchar_t text[] = L"ab";
  EXPECT_THROW(String(text + 2, text), exception::OutOfRange) << "a reversed range";
  String s(L"ab");
  EXPECT_THROW(s.reserve(0x3FFFFFFF), exception::OutOfRange);
  EXPECT_THROW(s.append(0x3FFFFFFE, L'x'), exception::OutOfRange);
  EXPECT_THROW(s.append(0xFFFFFFFF, L'x'), exception::OutOfRange);
  EXPECT_TRUE(Is(s, L"ab", 2));
}

TEST(String, AssignKeepsABlockOfUpToTwiceTheLength) {
  String s = WithCapacity(L"", 12);
  const wchar_t* const block = s.begin();
  s.assign(L"0123456789", 10);
  EXPECT_TRUE(Is(s, L"0123456789", 12));
  EXPECT_EQ(block, s.begin());
  s = WithCapacity(L"", 30);
  s.assign(L"0123456789", 10);
  EXPECT_TRUE(Is(s, L"0123456789", 10));
}

TEST(String, AssignBufferRuleAtItsEdges) {
  const struct {
    unsigned capacity, length, result;
  } table[] = {{10, 10, 10}, {11, 10, 11}, {20, 10, 20}, {21, 10, 10}, {9, 10, 10},
               {1, 0, 0},    {0, 0, 0},    {2, 1, 2},    {3, 1, 1}};
  for (const auto& row : table) {
    String s = WithCapacity(L"", row.capacity);
    const std::wstring text(row.length, L'x');
    s.assign(text.c_str(), row.length);
    EXPECT_TRUE(Is(s, text.c_str(), row.result)) << row.capacity << " " << row.length;
  }
}

TEST(String, AssignOfItsOwnBeginningDoesNothing) {
  String s(L"abcdef");
  s.assign(s.c_str(), 2);
  EXPECT_TRUE(Is(s, L"abcdef", 6));
  s = *&s;
  EXPECT_TRUE(Is(s, L"abcdef", 6));
}

TEST(String, AssignFromInsideItself) {
  String s(L"abcdefghij");
  s.assign(s.c_str() + 7, 3);
  EXPECT_TRUE(Is(s, L"hij", 3));
  s = s.c_str() + 1;
  EXPECT_TRUE(Is(s, L"ij", 3));
}

TEST(String, AssignmentReplacesTheText) {
  String s(L"long enough");
  s = L"abc";
  EXPECT_TRUE(Is(s, L"abc", 3));
  s = String(L"xyz12");
  EXPECT_TRUE(Is(s, L"xyz12", 5));
  const String other(L"1234");
  s = other;
  EXPECT_TRUE(Is(s, L"1234", 5));
  s = "narrow";
  EXPECT_TRUE(Is(s, L"narrow", 6));
  s.assign("narrow", 2);
  EXPECT_TRUE(Is(s, L"na", 2));
}

TEST(String, GrowthDoublesTheNewLength) {
  String s(L"abcd");
  ASSERT_EQ(s.capacity(), 4u);
  s += L'e';
  EXPECT_TRUE(Is(s, L"abcde", 10));
  for (int i = 0; i < 5; ++i) s.append(1, L'x');
  EXPECT_EQ(s.capacity(), 10u);
  s += L"x";
  EXPECT_EQ(s.capacity(), 22u);
}

TEST(String, OneCharacterAtATimeFollowsTheDoubling) {
  String s;
  const unsigned expected[] = {2, 2, 6, 6, 6, 6, 14, 14, 14, 14, 14, 14, 14, 14, 30};
  for (const unsigned capacity : expected) {
    s += L'x';
    EXPECT_EQ(capacity, s.capacity()) << s.length();
  }
  EXPECT_EQ(std::wstring(15, L'x'), Std(s));
}

TEST(String, AppendForms) {
  String s;
  s.append(L"ab").append(L"cdef", 1u).append(2, L'x').append(String(L"yz"));
  EXPECT_EQ(Std(s), L"abcxxyz");
  s.append(L'x', 3);
  EXPECT_EQ(std::wstring(L"abcxxyz") + std::wstring(120, wchar_t(3)), Std(s));
  s.append(0, L'x').append(L"", 0u).append(String());
  EXPECT_EQ(s.length(), 127u);
}

TEST(String, AppendOfAPartIgnoresThePositionInItsCount) {
  const String part(L"abcdef");
  String s;
  s.append(part, 0, 4);
  EXPECT_EQ(Std(s), L"abcd");
  s.append(part, 2, 3);
  EXPECT_EQ(Std(s), L"abcdcde");
  s = L"";
  s.append(part, 4, 99);
  EXPECT_EQ(Std(s), std::wstring(L"ef\0\0\0\0", 6)) << "zeros beyond the end";
  s = L"";
  s.append(part, 1000, 2);
  EXPECT_EQ(std::wstring(2, L'\0'), Std(s));
  s = L"";
  s.append(part, String::npos, String::npos);
  EXPECT_EQ(std::wstring(6, L'\0'), Std(s));
}

TEST(String, AppendOfItselfDoublesTheTextAlsoWhenTheBlockMoves) {
  String s(L"0123456789");
  for (int i = 0; i < 12; ++i) {
    const std::wstring before = Std(s);
    s.append(s);
    ASSERT_EQ(before + before, Std(s));
  }
  String t(L"abcd");
  t.append(t.c_str() + 2);
  EXPECT_EQ(Std(t), L"abcdcd");
  String u(L"abcd");
  u.append(u, 1, 3);
  EXPECT_EQ(Std(u), L"abcdbcd");
  String v(L"abcd");
  v.append(v, 2, 99);
  EXPECT_EQ(Std(v), std::wstring(L"abcdcd\0\0", 8));
}

TEST(String, PlusOperators) {
  const String s(L"ab");
  EXPECT_EQ(Std(s + L'c'), L"abc");
  EXPECT_EQ(Std(s + L"cd"), L"abcd");
  EXPECT_EQ(Std(s + s), L"abab");
  EXPECT_EQ(Std(s + "cd"), L"abcd");
  EXPECT_EQ(Std(s + AnsiString("cd")), L"abcd");
  EXPECT_EQ(Std(L"cd" + s), L"cdab");
  EXPECT_EQ(Std("cd" + s), L"cdab");
  EXPECT_EQ((AnsiString("ab") + s + L"c" + 'd' + "e").exactCompare("ababcde"), 0);
  String t(s);
  t += L'c';
  t += L"d";
  t += s;
  t += "e";
  t += AnsiString("f");
  EXPECT_EQ(Std(t), L"abcdabef");
  EXPECT_EQ((s + s).capacity(), 4u) << "one allocation";
}

TEST(String, ReserveIsExactAndNeverShrinks) {
  String s(L"abc");
  s.reserve(10);
  EXPECT_TRUE(Is(s, L"abc", 10));
  s.reserve(5);
  EXPECT_TRUE(Is(s, L"abc", 10));
  s.reserve(0);
  EXPECT_TRUE(Is(s, L"abc", 10));
}

TEST(String, ComparisonFoldsCaseAndExactCompareDoesNot) {
  const String s(L"ABC");
  EXPECT_EQ(s.compare(L"abc"), 0);
  EXPECT_EQ(s.compare(String(L"aBc")), 0);
  EXPECT_TRUE(s == L"abc");
  EXPECT_NE(s.exactCompare(L"abc"), 0);
  EXPECT_NE(s.exactCompare(String(L"abc")), 0);
  EXPECT_EQ(s.exactCompare(L"ABC"), 0);
  EXPECT_LT(String(L"abc").compare(L"ABD"), 0);
  EXPECT_GT(String(L"abcd").compare(L"ABC"), 0);
  EXPECT_LT(String().compare(L"a"), 0);
  EXPECT_GT(String(L"_").compare(L"z"), 0) << "folding is upward";
}

TEST(String, ComparisonOperatorsTakeEveryPairing) {
  const String s(L"AB");
  const AnsiString a("ab");
  const AsciiString c("ab");
  const Utf8String u(L"ab");
  EXPECT_TRUE(s == s && s == L"ab" && s == "ab" && s == a && a == s && L"ab" == s && "ab" == s);
  EXPECT_TRUE(a == "AB" && a == L"AB" && a == a && c == "AB" && c == L"AB" && c == c && u == u);
  EXPECT_TRUE(u == L"AB" && u == reinterpret_cast<const unsigned char*>("AB"));
  EXPECT_FALSE(s != s || s != L"ab" || s != "ab" || s != a || a != s || a != "AB" || c != "AB");
  EXPECT_TRUE(s != L"x" && s != "x" && a != L"x" && L"x" != s && u != L"x");
  EXPECT_TRUE(s < L"ac" && s < "ac" && s < AnsiString("ac") && a < String(L"ac") && L"aa" < s);
  EXPECT_FALSE(s < s || s < L"ab" || a < s || u < u || c < c);
  EXPECT_TRUE(u > reinterpret_cast<const unsigned char*>("aa"));
  EXPECT_FALSE(u > reinterpret_cast<const unsigned char*>("ab"));
}

TEST(String, CompareOfPartsFoldsCase) {
  const String s(L"xxABCyy");
  EXPECT_EQ(s.compare(2, 3, L"abc", String::npos), 0);
  EXPECT_EQ(s.compare(2, 3, L"abcdef", 3), 0);
  EXPECT_LT(s.compare(2, 3, L"abd"), 0);
  EXPECT_EQ(s.compare(2, String::npos, L"abcYY"), 0);
  EXPECT_EQ(s.compare(99, 3, L""), 0) << "the position is not checked";
}

TEST(String, MapsFoldTheirKeys) {
  std::map<String, int> map;
  map[L"Name"] = 1;
  map["NAME"] = 2;
  map[AnsiString("other")] = 3;
  EXPECT_EQ(map.size(), 2u);
  EXPECT_EQ(map[L"name"], 2);
}

TEST(String, SwapExchangesTheBlocks) {
  String a(L"aa"), b(L"bbb");
  const wchar_t* const blockA = a.begin();
  a.swap(b);
  EXPECT_TRUE(Is(a, L"bbb", 3));
  EXPECT_TRUE(Is(b, L"aa", 2));
  EXPECT_EQ(blockA, b.begin());
  swap(a, b);
  EXPECT_EQ(blockA, a.begin());
}

TEST(String, BlocksGoBackToTheModuleAllocator) {
  // A block made by hand takes the place of the string's own.
  String s;
  static_assert(sizeof(String) == 3 * sizeof(wchar_t*));
  wchar_t** const fields = reinterpret_cast<wchar_t**>(&s);
  DLLFree(fields[0]);
  wchar_t* const block = static_cast<wchar_t*>(DLLMalloc(4 * sizeof(wchar_t)));
  wmemcpy(block, L"abc", 4);
  fields[0] = block;
  fields[1] = fields[2] = block + 3;
  EXPECT_TRUE(Is(s, L"abc", 3)) << "begin, end, capacityEnd, in that order";
}

TEST(String, GrowChecksItsArithmetic) {
  wchar_t* begin = static_cast<wchar_t*>(DLLMalloc(sizeof(wchar_t)));
  wchar_t* end = begin;
  wchar_t* capacityEnd = begin;
  const wchar_t* const before = begin;
  for (const uint32_t required : {0x3FFFFFFFu, 0x80000000u, 0xFFFFFFFEu, 0xFFFFFFFFu}) {
    EXPECT_THROW(string_detail::Grow(required, begin, end, capacityEnd), exception::OutOfRange);
  }
  EXPECT_EQ(before, begin);
  string_detail::Grow(5u, begin, end, capacityEnd);
  EXPECT_EQ(capacityEnd - begin, 10);
  EXPECT_EQ(begin, end);
  DLLFree(begin);
}

namespace {

constexpr unsigned kBig = 16u << 20;  // characters: 64 MB

// Each step ends the child with its own number where it went wrong.
int AppendWithLittleMemory() {
  String s(kBig, L'x');
  vlt::test::LimitMemoryTo(32u << 20);
  s += L'y';
  if (s.capacity() != kBig + 1) return 1;  // doubling failed, the exact size was had
  if (s.length() != kBig + 1 || s[kBig] != L'y' || *s.end() != 0) return 2;
  return 0;
}

template <class Operation>
bool FailsAndChangesNothing(String& s, Operation operation) {
  const wchar_t* const block = s.begin();
  try {
    operation();
    return false;
  } catch (const std::bad_alloc&) {
    return s.begin() == block && s.exactCompare(L"abc") == 0 && s.capacity() == 3;
  }
}

int OperationsWithoutMemory() {
  const String big(kBig, L'x');
  const std::string narrow(kBig, 'x');
  String s(L"abc");
  vlt::test::LimitMemoryTo(8u << 20);
  // Earlier tests of the process may have left space in the heap, beyond what the limit is about.
  while (DLLMallocNoThrow(4u << 20)) {
  }
  int step = 0;
  const auto fails = [&](auto operation) {
    ++step;
    return FailsAndChangesNothing(s, operation);
  };
  if (!fails([&] { String copy(big); })) return step;
  if (!fails([&] { s = big; })) return step;
  if (!fails([&] { s.assign(big.c_str() + 1, kBig - 1); })) return step;
  if (!fails([&] { s = narrow.c_str(); })) return step;
  if (!fails([&] { s.append(big); })) return step;
  if (!fails([&] { s.append(narrow.c_str()); })) return step;
  if (!fails([&] { s.append(kBig, L'x'); })) return step;
  if (!fails([&] { s.reserve(kBig); })) return step;
  if (!fails([&] { s.resize(kBig, L'x'); })) return step;
  if (!fails([&] { s.replace(1, 1, big); })) return step;
  if (!fails([&] { s = s + big; })) return step;
  if (!fails([&] { String both(big, big); })) return step;
  if (!fails([&] { Utf8String converted(nullptr, big); })) return step;
  return 0;
}

}  // namespace

TEST(String, GrowthFallsBackToTheExactSizeWhenMemoryIsShort) {
  if (!vlt::test::kCanLimitMemory) GTEST_SKIP() << "the sanitizer owns the address space";
  vlt::test::Child child(AppendWithLittleMemory);
  EXPECT_EQ(child.wait(), 0);
}

TEST(String, WithoutMemoryEveryOperationFailsAndChangesNothing) {
  if (!vlt::test::kCanLimitMemory) GTEST_SKIP() << "the sanitizer owns the address space";
  vlt::test::Child child(OperationsWithoutMemory);
  EXPECT_EQ(child.wait(), 0);
}
