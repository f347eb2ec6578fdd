// Words of eight characters, folded as they go in: a folded copy would take memory, which look-up
// must not need. Each is mixed into the hash by a multiplication with the secret key, whose product
// is folded so that its high bits, which depend on all of the word, reach the low ones.
#include "ztini/NameHash.h"

#include <pthread.h>

#include <bit>
#include <chrono>
#include <cstring>
#include <exception>
#include <random>

#include "ztini/NameCompare.h"

namespace ztini {
namespace {

struct Key {
  uint64_t low, high;
};

Key DrawKey() noexcept {
  Key key;
  try {
    std::random_device source;
    key.low = (static_cast<uint64_t>(source()) << 32) | source();
    key.high = (static_cast<uint64_t>(source()) << 32) | source();
  } catch (const std::exception&) {
    // No source of randomness: the clock and the address layout still differ from run to run.
    key.low = static_cast<uint64_t>(std::chrono::steady_clock::now().time_since_epoch().count());
    key.high = reinterpret_cast<uintptr_t>(&key);
  }
  key.high |= 1;  // a factor
  return key;
}

// The upper half of the product of two words and its lower half, one over the other.
#ifdef __SIZEOF_INT128__
uint64_t MultiplyFold(uint64_t a, uint64_t b) {
  __extension__ using Product = unsigned __int128;
  const Product product = static_cast<Product>(a) * b;
  return static_cast<uint64_t>(product >> 64) ^ static_cast<uint64_t>(product);
}
#else
uint64_t MultiplyFold(uint64_t a, uint64_t b) {
  const uint64_t aLow = a & UINT32_MAX, aHigh = a >> 32, bLow = b & UINT32_MAX, bHigh = b >> 32;
  const uint64_t low = aLow * bLow, middle = aHigh * bLow + (low >> 32);
  const uint64_t other = aLow * bHigh + (middle & UINT32_MAX);
  return (aHigh * bHigh + (middle >> 32) + (other >> 32)) ^ (other << 32 | (low & UINT32_MAX));
}
#endif

// Eight characters of which those from a to z become A to Z. Each byte is compared on its own:
// without its top bit, no sum carries into the next.
uint64_t UpperAscii(uint64_t word) {
  constexpr uint64_t kOnes = 0x0101010101010101u, kTops = 0x80 * kOnes;
  const uint64_t low = word & ~kTops;
  const uint64_t fromA = low + (0x80 - 'a') * kOnes, pastZ = low + (0x7f - 'z') * kOnes;
  return word ^ ((fromA & ~pastZ & ~word & kTops) >> 2);
}

// So many bytes, fewer than eight, the first one in the lowest byte. By two words, which may
// overlap: a copy of a size that the compiler does not know is a call.
uint64_t ShortWord(const char* text, size_t length) {
  if (length >= 4) {
    uint32_t first, last;
    memcpy(&first, text, sizeof first);
    memcpy(&last, text + length - sizeof last, sizeof last);
    return first | static_cast<uint64_t>(last) << 8 * (length - sizeof last);
  }
  uint64_t word = 0;
  for (size_t i = 0; i < length; ++i) {
    word |= static_cast<uint64_t>(static_cast<unsigned char>(text[i])) << 8 * i;
  }
  return word;
}

// Up to eight characters, folded, the first one in the lowest byte.
uint64_t FoldedWord(const NameFold& fold, const char* text, size_t length) {
  uint64_t word = 0;
  if (fold.foldsAsciiOnly() && std::endian::native == std::endian::little) {
    if (length < sizeof word) return UpperAscii(ShortWord(text, length));
    memcpy(&word, text, sizeof word);
    return UpperAscii(word);
  }
  for (size_t i = 0; i < length; ++i) word |= static_cast<uint64_t>(fold.upper(text[i])) << 8 * i;
  return word;
}

// One key for the process: an index may outlive the call that made it, and is asked by any later
// one. No static of a function: a child that is forked while another thread makes one waits for
// that thread, which it does not have. pthread_once makes the key again there.
const Key& ProcessKey() {
  static pthread_once_t once = PTHREAD_ONCE_INIT;
  static constinit Key key = {};
  pthread_once(&once, [] { key = DrawKey(); });
  return key;
}

}  // namespace

TrimmedName Trimmed(const NameFold& fold, const char* name) {
  name = SkipSpace(fold, name);
  size_t length = strlen(name);
  while (length > 0 && fold.isSpace(name[length - 1])) --length;
  return {name, length};
}

uint64_t HashName(const NameFold& fold, TrimmedName name) {
  const Key& key = ProcessKey();
  uint64_t hash = key.low ^ name.length;
  const char* at = name.begin;
  size_t left = name.length;
  for (; left > 8; left -= 8, at += 8)
    hash = MultiplyFold(hash ^ FoldedWord(fold, at, 8), key.high);
  hash = MultiplyFold(hash ^ FoldedWord(fold, at, left), key.high);
  // Once more: of words that differ in few bits, the products are as far apart as the words.
  return MultiplyFold(hash ^ key.low, key.high);
}

bool SameFoldedName(const NameFold& fold, const char* left, const char* right) {
  if (strcmp(left, right) == 0) return true;
  const TrimmedName l = Trimmed(fold, left), r = Trimmed(fold, right);
  if (l.length != r.length) return false;
  for (size_t i = 0; i < l.length; ++i) {
    if (fold.upper(l.begin[i]) != fold.upper(r.begin[i])) return false;
  }
  return true;
}

}  // namespace ztini
