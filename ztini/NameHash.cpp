// SipHash-1-3 over the folded and trimmed name: one round for each word of eight bytes, three at
// the end. The four constants are those of the algorithm. The characters are folded as they go in,
// a word at a time: a folded copy would take memory, which look-up must not need.
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
  return key;
}

struct Range {
  const char* begin;
  const char* end;
};

Range Trimmed(const NameFold& fold, const char* name) {
  name = SkipSpace(fold, name);
  const char* end = name + strlen(name);
  while (end > name && fold.isSpace(end[-1])) --end;
  return {name, end};
}

uint64_t Rotate(uint64_t word, int bits) { return (word << bits) | (word >> (64 - bits)); }

struct SipState {
  uint64_t v0, v1, v2, v3;

  explicit SipState(const Key& key)
      : v0(key.low ^ 0x736f6d6570736575u),
        v1(key.high ^ 0x646f72616e646f6du),
        v2(key.low ^ 0x6c7967656e657261u),
        v3(key.high ^ 0x7465646279746573u) {}

  void round() {
    v0 += v1, v1 = Rotate(v1, 13) ^ v0, v0 = Rotate(v0, 32);
    v2 += v3, v3 = Rotate(v3, 16) ^ v2;
    v0 += v3, v3 = Rotate(v3, 21) ^ v0;
    v2 += v1, v1 = Rotate(v1, 17) ^ v2, v2 = Rotate(v2, 32);
  }
  void take(uint64_t word) {
    v3 ^= word;
    round();
    v0 ^= word;
  }
  uint64_t finish() {
    v2 ^= 0xff;
    for (int i = 0; i < 3; ++i) round();
    return v0 ^ v1 ^ v2 ^ v3;
  }
};

// Eight characters of which those from a to z become A to Z. Each byte is compared on its own:
// without its top bit, no sum carries into the next.
uint64_t UpperAscii(uint64_t word) {
  constexpr uint64_t kOnes = 0x0101010101010101u, kTops = 0x80 * kOnes;
  const uint64_t low = word & ~kTops;
  const uint64_t fromA = low + (0x80 - 'a') * kOnes, pastZ = low + (0x7f - 'z') * kOnes;
  return word ^ ((fromA & ~pastZ & ~word & kTops) >> 2);
}

// Up to eight characters, folded, the first one in the lowest byte.
uint64_t FoldedWord(const NameFold& fold, const char* text, size_t length) {
  uint64_t word = 0;
  if (fold.foldsAsciiOnly() && std::endian::native == std::endian::little) {
    memcpy(&word, text, length);
    return UpperAscii(word);
  }
  for (size_t i = 0; i < length; ++i) word |= static_cast<uint64_t>(fold.upper(text[i])) << 8 * i;
  return word;
}

// One key for the process: an index may outlive the call that made it, and is asked by any later one.
// No static of a function: a child that is forked while another thread makes one waits for that thread,
// which it does not have. pthread_once makes the key again there.
const Key& ProcessKey() {
  static pthread_once_t once = PTHREAD_ONCE_INIT;
  static constinit Key key = {};
  pthread_once(&once, [] { key = DrawKey(); });
  return key;
}

}  // namespace

uint64_t HashName(const NameFold& fold, const char* name) {
  const Range range = Trimmed(fold, name);
  const size_t length = static_cast<size_t>(range.end - range.begin);
  SipState state(ProcessKey());
  const char* at = range.begin;
  for (size_t left = length / 8; left > 0; --left, at += 8) state.take(FoldedWord(fold, at, 8));
  // What is left of the name, at most seven bytes, with the length in the top one.
  state.take(FoldedWord(fold, at, length % 8) | static_cast<uint64_t>(length) << 56);
  return state.finish();
}

bool SameFoldedName(const NameFold& fold, const char* left, const char* right) {
  if (strcmp(left, right) == 0) return true;
  const Range l = Trimmed(fold, left), r = Trimmed(fold, right);
  if (l.end - l.begin != r.end - r.begin) return false;
  for (const char *p = l.begin, *q = r.begin; p < l.end; ++p, ++q) {
    if (fold.upper(*p) != fold.upper(*q)) return false;
  }
  return true;
}

}  // namespace ztini
