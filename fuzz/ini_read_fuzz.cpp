// Reads any bytes as an INI file, under any read options, and asks for everything that came out.
#include <stdio.h>

#include "fuzz/Input.h"
#include "ztini/ztini.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes) {
  if (sizeBytes < 2) return 0;
  IniStructForwardReferenceTag* doc = IniNew(0);
  IniSetReadOptions(doc, data[0] & 15);
  IniSetDuplicateChecking(doc, data[0] >> 4 & 1);
  FILE* file = fmemopen(const_cast<uint8_t*>(data + 1), sizeBytes - 1, "rb");
  ztini_IniReadFromFileHelper(doc, file);
  fclose(file);
  int32_t sections = IniNumberOfSections(doc);
  for (int32_t s = 1; s <= sections; ++s) {
    const char* section = nullptr;
    fuzz::Demand(IniNthSectionName(doc, s, &section) == 1 && section);
    std::string name = section;
    int32_t items = IniNumberOfItems(doc, name.c_str());
    for (int32_t i = 1; i <= items; ++i) {
      const char *item = nullptr, *value = nullptr;
      fuzz::Demand(IniNthItemName(doc, name.c_str(), i, &item) == 1 && item);
      std::string key = item;
      fuzz::Demand(IniItemExists(doc, name.c_str(), key.c_str()) == 1);
      fuzz::Demand(IniGetPointerToString(doc, name.c_str(), key.c_str(), &value) == 1 && value);
      char buffer[7];
      fuzz::Demand(IniGetStringIntoBuffer(doc, name.c_str(), key.c_str(), buffer, sizeof buffer) ==
                   1);
      uint32_t number;
      double real;
      int32_t boolean;
      IniGetUInt(doc, name.c_str(), key.c_str(), &number);
      IniGetDouble(doc, name.c_str(), key.c_str(), &real);
      IniGetBoolean(doc, name.c_str(), key.c_str(), &boolean);
    }
  }
  IniDispose(doc);
  return 0;
}
