#include <cerrno>
#include <cstdlib>
#include <limits>

#include "ztini/Document.h"
#include "ztini/EscapeCodec.h"
#include "ztini/StringTools.h"

// Reading values. IniGet finds the stored text; what is converted goes to the caller's variable,
// and text without its escapes into the document's scratch block, where it lasts until the next
// one.
namespace {

using Doc = IniStructForwardReferenceTag;
using Getter = int32_t (*)(Doc*, const char*, const char*, const char**);

constexpr size_t kLeastScratch = 256;
constexpr size_t kScratchSlack = 1024;

// Sizes the scratch block for `needed` bytes; a block that is far too large shrinks back.
// Its pointers are given to callers, so that the block never moves but in a call that decodes.
bool SizeScratch(Doc* doc, size_t needed) {
  const size_t size = ztini_PI_GetHandleSize(doc->scratch);
  // One huge value must not hold its memory for the document's life.
  if (needed <= size && size - needed <= kScratchSlack) return true;
  return ztini_PI_SetHandleSize(doc->scratch, needed > kLeastScratch ? needed : kLeastScratch) != 0;
}

int32_t IntoBuffer(Getter get, Doc* doc, const char* section, const char* item, char* buffer,
                   uint32_t size) {
  if (buffer && size) *buffer = 0;
  const char* value = nullptr;
  const int32_t status = get(doc, section, item, &value);
  if (status == 1) ztini_StringCopyMax(buffer, value, size);
  return status;
}

int32_t Copy(Getter get, Doc* doc, const char* section, const char* item, char** copy) {
  if (copy) *copy = nullptr;
  const char* value = nullptr;
  const int32_t status = get(doc, section, item, &value);
  if (status != 1 || !copy) return status;
  *copy = ztini_StrDup(value);
  return *copy ? 1 : kIniOutOfMemory;
}

// The stored value, or null when absent or blank.
const char* TextOfValue(Doc* doc, const char* section, const char* item) {
  const char* value = nullptr;
  IniGet(doc, section, item, &value);
  return ztini_HasNonWhiteSpace(value) ? value : nullptr;
}

bool IsWord(const char* value, const char* word) {
  return ztini_StrICmpWithoutSurrWhiteSpace(value, word) == 0;
}

bool ParseDouble(const char* text, double* number) {
  const int before = errno;
  // strtod reports a number that is too large or too small by errno alone.
  errno = 0;
  char* end;
  *number = strtod(text, &end);
  // The whole value, or it is no number; white space around it is gone already.
  const bool good = errno == 0 && end != text && *end == 0;
  errno = before;
  return good;
}

}  // namespace

int32_t IniGetPointerToRawString(Doc* doc, const char* section, const char* item,
                                 const char** value) {
  return IniGet(doc, section, item, value);
}

int32_t IniGetPointerToString(Doc* doc, const char* section, const char* item, const char** value) {
  if (value) *value = nullptr;
  const char* raw = nullptr;
  if (IniGet(doc, section, item, &raw) != 1) return 0;
  // Once to count and once to write: the decoded text may be much shorter than the stored one.
  const size_t length = ztini::DecodeEscapes(raw, nullptr);
  if (!SizeScratch(doc, length + 1)) return kIniOutOfMemory;
  char* text = static_cast<char*>(doc->scratch->data);
  ztini::DecodeEscapes(raw, text);
  text[length] = 0;
  if (value) *value = text;
  return 1;
}

int32_t IniGetRawStringIntoBuffer(Doc* doc, const char* section, const char* item, char* buffer,
                                  uint32_t size) {
  return IntoBuffer(IniGetPointerToRawString, doc, section, item, buffer, size);
}

int32_t IniGetStringIntoBuffer(Doc* doc, const char* section, const char* item, char* buffer,
                               uint32_t size) {
  return IntoBuffer(IniGetPointerToString, doc, section, item, buffer, size);
}

int32_t IniGetRawStringCopy(Doc* doc, const char* section, const char* item, char** copy) {
  return Copy(IniGetPointerToRawString, doc, section, item, copy);
}

int32_t IniGetStringCopy(Doc* doc, const char* section, const char* item, char** copy) {
  return Copy(IniGetPointerToString, doc, section, item, copy);
}

int32_t IniGetBoolean(Doc* doc, const char* section, const char* item, int32_t* value) {
  const char* text = TextOfValue(doc, section, item);
  if (!text) return 0;
  const bool isTrue = IsWord(text, "True");
  if (!isTrue && !IsWord(text, "False")) return kIniNotBoolean;
  if (value) *value = isTrue;
  return 1;
}

int32_t IniGetUInt(Doc* doc, const char* section, const char* item, uint32_t* value) {
  const char* text = TextOfValue(doc, section, item);
  if (!text) return 0;
  uint32_t number = 0;
  if (!ztini_StrToUInt(text, &number)) return kIniNotUnsigned;
  if (value) *value = number;
  return 1;
}

int32_t IniGetDouble(Doc* doc, const char* section, const char* item, double* value) {
  const char* text = TextOfValue(doc, section, item);
  if (!text) return 0;
  double number = 0;
  if (IsWord(text, "+Inf") || IsWord(text, "Inf")) {
    number = std::numeric_limits<double>::infinity();
  } else if (IsWord(text, "-Inf")) {
    number = -std::numeric_limits<double>::infinity();
  } else if (!ParseDouble(text, &number)) {
    return kIniNotDouble;
  }
  if (value) *value = number;
  return 1;
}
