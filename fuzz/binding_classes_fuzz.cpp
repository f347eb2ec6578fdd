// Tables of binding classes from any text, entered and asked for.
#include <string.h>

#include "fuzz/Input.h"
#include "source/Common/vltBindingClasses.h"
#include "source/Common/vltcmn.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes) {
  std::string text = fuzz::Text(data, sizeBytes);
  CvltBindingClasses table{zt::fnd::String(text.c_str())};
  BindingClassesMap map;
  for (const GUID& component : table.GetComponentVector()) {
    _vltComponent2 record;
    memset(&record, 0, sizeof record);
    record.identifier = component;
    vltAddBindingClasses(&record, table, &map);
  }
  fuzz::Demand(map.size() <= text.size() + 1);
  for (const auto& [bindingClass, component] : map) {
    unsigned count = 0;
    GUID* found = nullptr;
    fuzz::Demand(vltGetComponentsForBindingClass(bindingClass, &count, &map, &found) == S_OK);
    fuzz::Demand(count > 0);
    vltTaskMemFree(found);
    break;  // one is as good as all, and all would be quadratic
  }
  return 0;
}
