#pragma once

#include <cstdint>

// MD5 message digest, exactly RFC 1321. Lengths are 32-bit, the message may be longer in pieces.
//
// It guards against torn and foreign writes, not against an attacker.
class Cmd5vlt {
 public:
  Cmd5vlt();
  void addString(const unsigned char* data, unsigned int lengthBytes);
  // Ends the message and wipes the object, so it works once: what comes after is no MD5 of
  // anything.
  void getDigest(unsigned char* digest16);

 private:
  // Adds `count` blocks of 64 bytes to the state.
  static void Transform(unsigned int* state, const unsigned char* blocks, unsigned int count);
  static void Encode(unsigned char* out, const unsigned int* in, unsigned int lengthBytes);
  static void Decode(unsigned int* out, const unsigned char* in, unsigned int lengthBytes);

  uint32_t m_state[4];
  uint32_t m_count[2] = {};  // message length in bits, low word first
  unsigned char m_buffer[64] = {};
};
