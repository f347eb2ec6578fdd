
#include <cstdlib>

#include "source/Common/vltcmn.h"

void* vltTaskMemAlloc(size_t sizeBytes) {
  // The limit belongs to the 32-bit days of the interface and holds on every word size.
  return sizeBytes >= 0x80000000u ? nullptr : malloc(sizeBytes);
}

void vltTaskMemFree(void* p) { free(p); }

namespace {

template <class Record>
void FreeTexts(Record& record) {
  vltTaskMemFree(record.name);
  vltTaskMemFree(record.fileName);
  if (record.type == vltComponentDataDictionary) {
    // By type only: of other types these fields overlay numbers.
    vltTaskMemFree(record.dictionary.prefix);
    vltTaskMemFree(record.dictionary.auxString1);
    vltTaskMemFree(record.dictionary.auxString2);
  } else if (record.type == vltComponentResourceExpert) {
    vltTaskMemFree(record.resource.pnp);
  }
}

}  // namespace

void vltFreeComponent2(_vltComponent2& record) { FreeTexts(record); }
void vltFreeComponent(_vltComponent& record) { FreeTexts(record); }
