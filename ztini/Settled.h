#pragma once

#include <cstdint>

#include "ztini/Document.h"

namespace ztini {

// Whether an item put under these names and with this value is read back as it is, alone and next
// to anything else. The texts are those of IniPut; white space around them is dropped by both ways.
bool IniSurvivesFile(const char* section, const char* item, const char* value, int32_t quote);

}  // namespace ztini
