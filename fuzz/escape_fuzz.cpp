// Decodes any text as an escaped value, and decodes again what was encoded from it.
#include "fuzz/Input.h"
#include "ztini/ztini.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes) {
  std::string value = fuzz::Text(data, sizeBytes).c_str();
  IniStructForwardReferenceTag* doc = IniNew(0);
  const char* decoded = nullptr;
  fuzz::Demand(IniPut(doc, "s", "raw", value.c_str(), 34) == 1);
  fuzz::Demand(IniGetPointerToString(doc, "s", "raw", &decoded) == 1);
  std::string first = decoded;
  fuzz::Demand(first.size() <= value.size());
  fuzz::Demand(IniPutStringWithOptions(doc, "s", "escaped", first.c_str(), 1, 1) == 1);
  fuzz::Demand(IniGetPointerToString(doc, "s", "escaped", &decoded) == 1);
  // But for the blanks at its ends, which a put drops before they could be escaped.
  size_t begin = first.find_first_not_of(" \t\n\v\f\r");
  size_t end = first.find_last_not_of(" \t\n\v\f\r");
  std::string inner = begin == std::string::npos ? "" : first.substr(begin, end - begin + 1);
  fuzz::Demand(std::string(decoded).find(inner) != std::string::npos);
  IniDispose(doc);
  return 0;
}
