// Any text is a GUID or reads as the null GUID; what is one prints to the same value.
#include <string.h>

#include "fuzz/Input.h"
#include "source/Common/vltcmn.h"
#include "source/vlrHelpers.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes) {
  std::wstring text = fuzz::Wide(data, sizeBytes);
  GUID guid = vltGuidFromString2(text.c_str());
  TaskMem<wchar_t> printed(vltGuidToString2(guid));
  GUID again = vltGuidFromString2(printed.get());
  fuzz::Demand(memcmp(&guid, &again, sizeof guid) == 0);
  vlrGuidFromString(zt::fnd::String(text.c_str()));
  return 0;
}
