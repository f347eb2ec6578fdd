#include "ztini/NameHash.h"

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

}  // namespace

uint64_t HashName(const NameFold& fold, const char* name) {
  static const Key key = DrawKey();
  const Range range = Trimmed(fold, name);
  SipState state(key);
  uint64_t word = 0;
  int shift = 0;
  for (const char* p = range.begin; p < range.end; ++p) {
    word |= static_cast<uint64_t>(fold.upper(*p)) << shift;
    shift += 8;
    if (shift == 64) {
      state.take(word);
      word = 0;
      shift = 0;
    }
  }
  state.take(word | static_cast<uint64_t>(range.end - range.begin) << 56);
  return state.finish();
}

bool SameFoldedName(const NameFold& fold, const char* left, const char* right) {
  const Range l = Trimmed(fold, left), r = Trimmed(fold, right);
  if (l.end - l.begin != r.end - r.begin) return false;
  for (const char *p = l.begin, *q = r.begin; p < l.end; ++p, ++q) {
    if (fold.upper(*p) != fold.upper(*q)) return false;
  }
  return true;
}

}  // namespace ztini
