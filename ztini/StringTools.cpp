#include "ztini/StringTools.h"

#include <cstring>

#include "ztini/Alloc.h"
#include "ztini/NameCompare.h"

namespace {

using ztini::LocaleFold;

char* Copy(const char* begin, size_t length) {
  char* copy = static_cast<char*>(ztini::Allocate(length + 1));
  if (!copy) return nullptr;
  memcpy(copy, begin, length);
  copy[length] = 0;
  return copy;
}

bool IsDigit(char c) { return c >= '0' && c <= '9'; }

}  // namespace

char* ztini_StrDup(const char* text) { return text ? Copy(text, strlen(text)) : nullptr; }

char* ztini_StrDupWithoutSurrWhiteSpace(const char* text) {
  if (!text) return nullptr;
  const char* begin = ztini_SkipWhiteSpace(text);
  size_t length = strlen(begin);
  while (length && LocaleFold::isSpace(begin[length - 1])) --length;
  return Copy(begin, length);
}

const char* ztini_SkipWhiteSpace(const char* text) {
  return text ? ztini::SkipSpace(LocaleFold(), text) : nullptr;
}

int32_t ztini_HasNonWhiteSpace(const char* text) {
  return text && *ztini_SkipWhiteSpace(text) ? 1 : 0;
}

int32_t ztini_StrICmpWithoutSurrWhiteSpace(const char* left, const char* right) {
  return ztini::CompareNames(LocaleFold(), left ? left : "", right ? right : "");
}

void ztini_StringCopyMax(char* destination, const char* source, size_t size) {
  if (!destination || !size) return;
  const size_t length = source ? strnlen(source, size - 1) : 0;
  // The source may be a part of the destination.
  if (length) memmove(destination, source, length);
  destination[length] = 0;
}

int32_t ztini_StrToUInt(const char* text, uint32_t* value) {
  if (!text || !value) return 0;
  text = ztini_SkipWhiteSpace(text);
  if (*text == '+') ++text;
  if (!IsDigit(*text)) return 0;
  uint64_t number = 0;
  // Not strtoul, which takes a minus, and saturates where a number is too large.
  for (; IsDigit(*text); ++text) {
    number = number * 10 + static_cast<uint64_t>(*text - '0');
    if (number > UINT32_MAX) return 0;
  }
  if (*ztini_SkipWhiteSpace(text)) return 0;
  *value = static_cast<uint32_t>(number);
  return 1;
}
