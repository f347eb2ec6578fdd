#include "ztini/NameHash.h"

#include <gtest/gtest.h>

#include <cctype>
#include <set>
#include <string>

namespace {

using ztini::HashName;
using ztini::NameFold;
using ztini::SameFoldedName;
using ztini::Trimmed;

TEST(NameHash, EqualNamesHashEqually) {
  NameFold fold;
  const struct {
    const char *left, *right;
  } rows[] = {{"a", " A\t"},
              {"", "  "},
              {"Section 12", "SECTION 12"},
              {"exactly8", " EXACTLY8 "},
              {"longer than one word", "LONGER THAN ONE WORD"},
              {"\xc3\xa4", "\xc3\xa4 "}};
  for (const auto& row : rows) {
    EXPECT_EQ(HashName(fold, Trimmed(fold, row.left)), HashName(fold, Trimmed(fold, row.right)))
        << row.left;
    EXPECT_TRUE(SameFoldedName(fold, row.left, row.right)) << row.left;
  }
}

// Eight characters are folded at a time.
TEST(NameHash, EveryCharacterAtEveryPlaceHashesAsItFolds) {
  NameFold fold;
  for (int place = 0; place < 17; ++place) {
    for (int c = 1; c < 256; ++c) {
      if (isspace(c) || isspace(c ^ 0x20) || c == 0x20)
        continue;  // not a part of the name at its ends
      std::string name(17, '\x80'), upper = name;
      name[static_cast<size_t>(place)] = static_cast<char>(c);
      upper[static_cast<size_t>(place)] = static_cast<char>(fold.upper(static_cast<char>(c)));
      EXPECT_EQ(HashName(fold, Trimmed(fold, name.c_str())),
                HashName(fold, Trimmed(fold, upper.c_str())))
          << c;
      std::string other = upper;
      other[static_cast<size_t>(place)] ^= 0x20;
      bool same = fold.upper(other[static_cast<size_t>(place)]) ==
                  static_cast<unsigned char>(upper[static_cast<size_t>(place)]);
      EXPECT_EQ(HashName(fold, Trimmed(fold, other.c_str())) ==
                    HashName(fold, Trimmed(fold, upper.c_str())),
                same)
          << c;
    }
  }
}

TEST(NameHash, DifferentNamesAreToldApart) {
  NameFold fold;
  EXPECT_FALSE(SameFoldedName(fold, "a", "b"));
  EXPECT_FALSE(SameFoldedName(fold, "a b", "ab"));
  EXPECT_FALSE(SameFoldedName(fold, "a", "a b"));
  EXPECT_FALSE(SameFoldedName(fold, "\xc3\xa4", "\xc3\xb6"));
}

TEST(NameHash, ManyNamesSpread) {
  NameFold fold;
  std::set<uint32_t> low;
  for (int i = 0; i < 10000; ++i) {
    const std::string name = "\xe3\x81" + std::to_string(i);
    low.insert(static_cast<uint32_t>(HashName(fold, Trimmed(fold, name.c_str()))));
  }
  EXPECT_GT(low.size(), 9990u);
}

// By their lowest bits, which choose the place in a table: names that differ in one place only, in
// lengths around those of the words, in the first character and in the last.
TEST(NameHash, NamesThatDifferInOnePlaceSpread) {
  NameFold fold;
  constexpr uint32_t kSlots = 1024;
  for (size_t length = 2; length <= 26; ++length) {
    for (size_t place = 0; place + 1 < length; ++place) {
      std::set<uint32_t> slots;
      for (unsigned n = 0; n < 512; ++n) {
        std::string name(length, 'x');
        name[place] = static_cast<char>('0' + n % 32);
        name[length - 1] = static_cast<char>('0' + n / 32);
        slots.insert(static_cast<uint32_t>(HashName(fold, Trimmed(fold, name.c_str()))) % kSlots);
      }
      // Names at random fill 403 of the slots, with a deviation of 9.
      EXPECT_GT(slots.size(), 340u) << length << " at " << place;
    }
  }
}

}  // namespace
