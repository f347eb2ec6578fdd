#include "source/Cmd5vlt.h"

#include <string.h>

#include <bit>

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

uint32_t Mix(int round, uint32_t x, uint32_t y, uint32_t z) {
  switch (round) {
    case 0:
      return (x & y) | (~x & z);
    case 1:
      return (x & z) | (y & ~z);
    case 2:
      return x ^ y ^ z;
    default:
      return y ^ (x | ~z);
  }
}

}  // namespace

Cmd5vlt::Cmd5vlt()
    : m_state{0x67452301, 0xefcdab89, 0x98badcfe, 0x10325476}, m_count{}, m_buffer{} {}

void Cmd5vlt::addString(const unsigned char* data, unsigned int lengthBytes) {
  unsigned used = m_count[0] >> 3 & (kBlock - 1);
  uint32_t bits = lengthBytes << 3;
  m_count[0] += bits;
  if (m_count[0] < bits) ++m_count[1];
  m_count[1] += lengthBytes >> 29;
  while (lengthBytes > 0) {
    unsigned taken = lengthBytes < kBlock - used ? lengthBytes : kBlock - used;
    if (taken == kBlock) {
      Transform(m_state, data);  // A whole block needs no copy.
    } else {
      memcpy(m_buffer + used, data, taken);
      if (used + taken == kBlock) Transform(m_state, m_buffer);
    }
    used = (used + taken) % kBlock;
    data += taken;
    lengthBytes -= taken;
  }
}

void Cmd5vlt::getDigest(unsigned char* digest16) {
  static constexpr unsigned char kPadding[kBlock] = {0x80};
  unsigned char length[8];
  Encode(length, m_count, sizeof length);
  unsigned used = m_count[0] >> 3 & (kBlock - 1);
  addString(kPadding, used < kLengthOffset ? kLengthOffset - used : kBlock + kLengthOffset - used);
  addString(length, sizeof length);
  Encode(digest16, m_state, sizeof m_state);
  memset(static_cast<void*>(this), 0, sizeof *this);
}

void Cmd5vlt::Transform(unsigned int* state, const unsigned char* block) {
  uint32_t words[16];
  Decode(words, block, kBlock);
  uint32_t a = state[0], b = state[1], c = state[2], d = state[3];
  for (unsigned i = 0; i < 64; ++i) {
    unsigned round = i / 16;
    uint32_t word = words[(kWordStart[round] + i * kWordStep[round]) % 16];
    uint32_t sum = a + Mix(static_cast<int>(round), b, c, d) + word + kSines[i];
    a = d;
    d = c;
    c = b;
    b += std::rotl(sum, kShifts[round][i % 4]);
  }
  state[0] += a;
  state[1] += b;
  state[2] += c;
  state[3] += d;
}

void Cmd5vlt::Encode(unsigned char* out, const unsigned int* in, unsigned int lengthBytes) {
  for (unsigned i = 0; i < lengthBytes; ++i) {
    out[i] = static_cast<unsigned char>(in[i / 4] >> 8 * (i % 4));
  }
}

void Cmd5vlt::Decode(unsigned int* out, const unsigned char* in, unsigned int lengthBytes) {
  for (unsigned i = 0; i < lengthBytes; i += 4) {
    out[i / 4] = in[i] | static_cast<uint32_t>(in[i + 1]) << 8 |
                 static_cast<uint32_t>(in[i + 2]) << 16 | static_cast<uint32_t>(in[i + 3]) << 24;
  }
}
