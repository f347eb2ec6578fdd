// Names of types, numbers and truth values from any text.
#include "fuzz/Input.h"
#include "source/Common/vltcmn.h"
#include "source/Utilities/vltutils.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes) {
  std::wstring text = fuzz::Wide(data, sizeBytes);
  const wchar_t* s = text.c_str();
  fuzz::Demand(vltAttributeTypeFromString2(s) >= 0 && vltAttributeTypeFromString2(s) <= 14);
  vltAttributeStorageFromString2(s);
  vltClientFromString2(s);
  vltU32FromString2(s);
  vltI32FromString2(s);
  TaskMem<wchar_t> real(vltF64ToString2(vltF64FromString2(s)));
  fuzz::Demand(static_cast<bool>(real));
  vltBoolFromString2(s);
  vltIsDefaultStorage(s);
  unsigned offline;
  wchar_t* storage = nullptr;
  vltIsOfflineStorage(s, &offline, &storage);
  vltFree(storage);
  std::wstring upper = text;
  vltWcsuprImpl(upper.data());
  std::string narrow = fuzz::Text(data, sizeBytes);
  vltStruprImpl(narrow.data());
  return 0;
}
