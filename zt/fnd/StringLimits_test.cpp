#include <gtest/gtest.h>

#include <cstdint>

#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"

using namespace zt::fnd;

namespace {

// A string that claims a length of up to 32 bits without having the memory. Good for operations
// that must fail, or answer, before they touch a character.
template <class S>
class Pretended {
 public:
  using T = typename S::value_type;

  explicit Pretended(uint32_t length) {
    T** const fields = reinterpret_cast<T**>(&m_string);
    for (int i = 0; i < 3; ++i) m_saved[i] = fields[i];
    fields[0] = reinterpret_cast<T*>(uintptr_t(0x10000));
    fields[1] = fields[2] = fields[0] + length;
  }
  ~Pretended() {
    T** const fields = reinterpret_cast<T**>(&m_string);
    for (int i = 0; i < 3; ++i) fields[i] = m_saved[i];
  }
  S& operator*() { return m_string; }

 private:
  S m_string;
  T* m_saved[3];
};

constexpr bool kWideEnough = sizeof(void*) == 8;

}  // namespace

TEST(StringLimits, ReplaceRefusesAResultOfAllOnes) {
  if (!kWideEnough) GTEST_SKIP() << "such lengths do not fit the address space";
  Pretended<AnsiString> s(0xFFFFFFFE);
  try {
    (*s).replace(0, 0, AnsiString("x"));
    FAIL();
  } catch (const exception::BoundExceeded2& e) {
    EXPECT_STREQ(e.what(),
                 "A request was made that would exceed the bounds: Resulting string too large");
    EXPECT_EQ(e.getErrorCode(), 0x8ABC7007u);
  }
  Pretended<AnsiString> half(0x80000000), other(0x7FFFFFFF);
  EXPECT_THROW((*half).replace(5, 0, *other), exception::BoundExceeded2);
}

TEST(StringLimits, SumsThatPass32BitsAreOutOfRange) {
  if (!kWideEnough) GTEST_SKIP() << "such lengths do not fit the address space";
  Pretended<AnsiString> s(0xFFFFFFFE), more(0x10);
  EXPECT_THROW((*s).append(2, 'x'), exception::OutOfRange);
  EXPECT_THROW((*s).append(1, 'x'), exception::OutOfRange) << "no room for the terminator";
  EXPECT_THROW((*s).append("xy"), exception::OutOfRange);
  EXPECT_THROW((*s).append(L"x"), exception::OutOfRange);
  EXPECT_THROW((*s) += 'x', exception::OutOfRange);
  EXPECT_THROW((*s).append(*more), exception::OutOfRange);
  EXPECT_THROW(AnsiString(*s, *more), exception::OutOfRange);
  EXPECT_THROW((*s).resize(0xFFFFFFFF, 'x'), exception::OutOfRange);
}

TEST(StringLimits, ConversionsOfTooMuchTextAreOutOfRange) {
  if (!kWideEnough) GTEST_SKIP() << "such lengths do not fit the address space";
  Pretended<String> s(0x40000000);  // four bytes a character
  EXPECT_THROW(AnsiString a(*s), exception::OutOfRange);
  EXPECT_THROW(AsciiString(nullptr, *s), exception::OutOfRange);
  Pretended<AnsiString> narrow(0x40000000);
  EXPECT_THROW(String w(*narrow), exception::OutOfRange);
}

TEST(StringLimits, WireSizesThatDoNotFitAreAllOnes) {
  if (!kWideEnough) GTEST_SKIP() << "such lengths do not fit the address space";
  EXPECT_EQ((*Pretended<AnsiString>(0xFFFFFFFA)).serializationSize(), 0xFFFFFFFFu) << "exactly";
  EXPECT_EQ((*Pretended<AnsiString>(0xFFFFFFFB)).serializationSize(), 0xFFFFFFFFu);
  EXPECT_EQ((*Pretended<AnsiString>(0xFFFFFFF9)).serializationSize(), 0xFFFFFFFEu);
  EXPECT_EQ((*Pretended<Utf8String>(0xFFFFFFFC)).serializationSize(), 0xFFFFFFFFu);
  EXPECT_EQ((*Pretended<Utf8String>(0xFFFFFFFA)).serializationSize(), 0xFFFFFFFEu);
  unsigned char byte;
  unsigned char* cursor = &byte;
  EXPECT_THROW((*Pretended<AsciiString>(0xFFFFFFFE)).serialize(cursor, &byte + 1),
               exception::BufferOverflow);
  EXPECT_EQ(&byte, cursor);
}
