#include "ztini/EscapeCodec.h"

#include <cctype>
#include <cstdint>
#include <cstring>

#include "ztini/Alloc.h"

namespace ztini {
namespace {

constexpr size_t kLongestSequence = 4;

// The letter after the backslash, 0 for none, 'x' for a byte in digits.
char EscapeLetter(char c) {
  switch (c) {
    case '\t':
      return 't';
    case '\n':
      return 'n';
    case '"':
    case '\\':
      return c;
    default:
      // Control characters would end the line, or be white space at its ends. What else the file's
      // encoding has goes as it is.
      return iscntrl(static_cast<unsigned char>(c)) ? 'x' : 0;
  }
}

char* EncodeByte(char c, char* out) {
  static constexpr char kDigits[] = "0123456789abcdef";
  const char letter = EscapeLetter(c);
  if (!letter) {
    *out++ = c;
    return out;
  }
  *out++ = '\\';
  *out++ = letter;
  if (letter == 'x') {
    *out++ = kDigits[static_cast<unsigned char>(c) >> 4];
    *out++ = kDigits[static_cast<unsigned char>(c) & 15];
  }
  return out;
}

int DigitValue(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

// The byte that an escaped character other than "x" stands for.
char UnescapedByte(char letter) { return letter == 'n' ? '\n' : letter == 't' ? '\t' : letter; }

}  // namespace

char* EncodeEscapes(const char* text) {
  const size_t length = strlen(text);
  if (length > (SIZE_MAX - 1) / kLongestSequence) return nullptr;
  // The upper bound at once: values are short, and the block is given back when the put is over.
  char* encoded = static_cast<char*>(Allocate(length * kLongestSequence + 1));
  if (!encoded) return nullptr;
  char* out = encoded;
  for (; *text; ++text) out = EncodeByte(*text, out);
  *out = 0;
  return encoded;
}

size_t DecodeEscapes(const char* text, char* out) {
  // Most values have no escapes at all.
  size_t length = strcspn(text, "\\");
  if (out) memcpy(out, text, length);
  text += length;
  // One walk for counting and for writing, so that both agree on every malformed text.
  const auto emit = [&](char c) {
    if (out) out[length] = c;
    ++length;
  };
  while (*text) {
    if (*text != '\\') {
      emit(*text++);
      continue;
    }
    const char letter = *++text;
    if (!letter) break;
    if (letter != 'x') {
      emit(UnescapedByte(letter));
      ++text;
      continue;
    }
    // Before the digits are read: the second would lie beyond the text.
    if (!text[1] || !text[2]) break;
    emit(static_cast<char>(DigitValue(text[1]) * 16 + DigitValue(text[2])));
    text += 3;
  }
  return length;
}

}  // namespace ztini
