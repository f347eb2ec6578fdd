// MD5 as RFC 1321 gives it, with its 64 steps unrolled by templates: the round, the word and the
// shift of a step are constants of the compiler, and the four words of the state change places by
// their order in the call instead of by copying.
#include "source/Cmd5vlt.h"

#include <string.h>

#include <algorithm>
#include <bit>
#include <utility>

#include "zt/fnd/ByteOrder.h"

namespace little_endian = zt::fnd::little_endian;

namespace {

constexpr unsigned kBlock = 64;
constexpr unsigned kLengthOffset = 56;

// floor(2^32 * abs(sin(i + 1))), RFC 1321 section 3.4.
constexpr uint32_t kSines[64] = {
    0xd76aa478, 0xe8c7b756, 0x242070db, 0xc1bdceee, 0xf57c0faf, 0x4787c62a, 0xa8304613, 0xfd469501,
    0x698098d8, 0x8b44f7af, 0xffff5bb1, 0x895cd7be, 0x6b901122, 0xfd987193, 0xa679438e, 0x49b40821,
    0xf61e2562, 0xc040b340, 0x265e5a51, 0xe9b6c7aa, 0xd62f105d, 0x02441453, 0xd8a1e681, 0xe7d3fbc8,
    0x21e1cde6, 0xc33707d6, 0xf4d50d87, 0x455a14ed, 0xa9e3e905, 0xfcefa3f8, 0x676f02d9, 0x8d2a4c8a,
    0xfffa3942, 0x8771f681, 0x6d9d6122, 0xfde5380c, 0xa4beea44, 0x4bdecfa9, 0xf6bb4b60, 0xbebfbc70,
    0x289b7ec6, 0xeaa127fa, 0xd4ef3085, 0x04881d05, 0xd9d4d039, 0xe6db99e5, 0x1fa27cf8, 0xc4ac5665,
    0xf4292244, 0x432aff97, 0xab9423a7, 0xfc93a039, 0x655b59c3, 0x8f0ccc92, 0xffeff47d, 0x85845dd1,
    0x6fa87e4f, 0xfe2ce6e0, 0xa3014314, 0x4e0811a1, 0xf7537e82, 0xbd3af235, 0x2ad7d2bb, 0xeb86d391};

constexpr int kShifts[4][4] = {{7, 12, 17, 22}, {5, 9, 14, 20}, {4, 11, 16, 23}, {6, 10, 15, 21}};

// Step and index of the word that round r takes at step i.
constexpr unsigned kWordStep[4] = {1, 5, 3, 7};
constexpr unsigned kWordStart[4] = {0, 1, 5, 0};

// Step i of the 64. Each step waits for the b of the one before, so what does not need b is added
// first: the auxiliary functions of RFC 1321 are written so that b comes in as late as possible.
// Inlined at all times: a call in the loop over the blocks would keep the state in memory.
template <unsigned i>
[[gnu::always_inline]] inline void Step(uint32_t& a, uint32_t b, uint32_t c, uint32_t d,
                                        const uint32_t* words) {
  constexpr unsigned round = i / 16;
  a += words[(kWordStart[round] + i * kWordStep[round]) % 16] + kSines[i];
  if constexpr (round == 0) {
    a += d ^ (b & (c ^ d));
  } else if constexpr (round == 1) {
    a += c & ~d;
    a += b & d;
  } else if constexpr (round == 2) {
    a += b ^ (c ^ d);
  } else {
    a += c ^ (b | ~d);
  }
  a = std::rotl(a, kShifts[round][i % 4]) + b;
}

// Four steps bring every word of the state back to its place.
template <unsigned i>
[[gnu::always_inline]] inline void FourSteps(uint32_t& a, uint32_t& b, uint32_t& c, uint32_t& d,
                                             const uint32_t* words) {
  Step<i>(a, b, c, d, words);
  Step<i + 1>(d, a, b, c, words);
  Step<i + 2>(c, d, a, b, words);
  Step<i + 3>(b, c, d, a, words);
}

template <unsigned... quarter>
[[gnu::always_inline]] inline void AllSteps(uint32_t& a, uint32_t& b, uint32_t& c, uint32_t& d,
                                            const uint32_t* words,
                                            std::integer_sequence<unsigned, quarter...>) {
  (FourSteps<4 * quarter>(a, b, c, d, words), ...);
}

}  // namespace

Cmd5vlt::Cmd5vlt() : m_state{0x67452301, 0xefcdab89, 0x98badcfe, 0x10325476} {}

void Cmd5vlt::addString(const unsigned char* data, unsigned int lengthBytes) {
  unsigned used = m_count[0] >> 3 & (kBlock - 1);
  uint32_t bits = lengthBytes << 3;
  m_count[0] += bits;
  // The length is one number of 64 bits in two words (RFC 1321 section 3.2); this is its carry.
  if (m_count[0] < bits) ++m_count[1];
  m_count[1] += lengthBytes >> 29;
  while (lengthBytes > 0) {
    unsigned taken;
    if (used == 0 && lengthBytes >= kBlock) {
      taken = lengthBytes / kBlock * kBlock;
      Transform(m_state, data, lengthBytes / kBlock);  // Whole blocks need no copy.
    } else {
      taken = std::min(lengthBytes, kBlock - used);
      memcpy(m_buffer + used, data, taken);
      used = (used + taken) % kBlock;
      if (used == 0) Transform(m_state, m_buffer, 1);
    }
    data += taken;
    lengthBytes -= taken;
  }
}

void Cmd5vlt::getDigest(unsigned char* digest16) {
  static constexpr unsigned char kPadding[kBlock] = {0x80};
  unsigned char length[8];
  // Before the padding, which counts as data.
  Encode(length, m_count, sizeof length);
  unsigned used = m_count[0] >> 3 & (kBlock - 1);
  addString(kPadding, used < kLengthOffset ? kLengthOffset - used : kBlock + kLengthOffset - used);
  addString(length, sizeof length);
  Encode(digest16, m_state, sizeof m_state);
  // As the code in RFC 1321 does: nothing of the message is left in memory.
  memset(static_cast<void*>(this), 0, sizeof *this);
}

void Cmd5vlt::Transform(unsigned int* state, const unsigned char* blocks, unsigned int count) {
  // The state stays in registers from block to block: the first step waits for it, and would wait
  // for a store and a load as well.
  uint32_t a = state[0], b = state[1], c = state[2], d = state[3];
  for (; count > 0; --count, blocks += kBlock) {
    uint32_t words[16];
    Decode(words, blocks, kBlock);
    const uint32_t oldA = a, oldB = b, oldC = c, oldD = d;
    AllSteps(a, b, c, d, words, std::make_integer_sequence<unsigned, 16>());
    a += oldA;
    b += oldB;
    c += oldC;
    d += oldD;
  }
  state[0] = a;
  state[1] = b;
  state[2] = c;
  state[3] = d;
}

void Cmd5vlt::Encode(unsigned char* out, const unsigned int* in, unsigned int lengthBytes) {
  for (unsigned i = 0; i < lengthBytes; i += 4) little_endian::Put(out + i, in[i / 4]);
}

void Cmd5vlt::Decode(unsigned int* out, const unsigned char* in, unsigned int lengthBytes) {
  for (unsigned i = 0; i < lengthBytes; i += 4) {
    out[i / 4] = little_endian::Get<uint32_t>(in + i);
  }
}
