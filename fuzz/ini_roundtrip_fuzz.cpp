// Puts any value, escaped and quoted, writes the document, reads it back, and finds the same value.
#include <stdio.h>
#include <string.h>

#include "fuzz/Input.h"
#include "ztini/ztini.h"

namespace {

// White space around a value does not survive a put, whatever encloses it.
std::string Trimmed(const std::string& text) {
  const char* white = " \t\n\v\f\r";
  size_t begin = text.find_first_not_of(white);
  if (begin == std::string::npos) return "";
  return text.substr(begin, text.find_last_not_of(white) - begin + 1);
}

std::string Get(IniStructForwardReferenceTag* doc, const char* item) {
  const char* value = nullptr;
  return IniGetPointerToString(doc, "section", item, &value) == 1 ? value : "(none)";
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes) {
  std::string value = fuzz::Text(data, sizeBytes).c_str();  // up to the first NUL
  IniStructForwardReferenceTag* doc = IniNew(0);
  IniSetReadOptions(doc, 6);
  IniSetWriteOptions(doc, -1, ' ', 26);
  fuzz::Demand(IniPutStringWithOptions(doc, "section", "item", value.c_str(), 1, 1) == 1);
  std::string kept = Get(doc, "item");
  char* text = nullptr;
  size_t length = 0;
  FILE* out = open_memstream(&text, &length);
  fuzz::Demand(ztini_IniWriteToFileHelper(doc, out) == 0);
  fclose(out);
  FILE* in = fmemopen(text, length, "rb");
  fuzz::Demand(ztini_IniReadFromFileHelper(doc, in) == 0);
  fclose(in);
  free(text);
  fuzz::Demand(IniNumberOfSections(doc) == 1 && IniNumberOfItems(doc, "section") == 1);
  fuzz::Demand(Trimmed(Get(doc, "item")) == Trimmed(kept));
  IniDispose(doc);
  return 0;
}
