#pragma once

#include <string>

#include "zt/fnd/String.h"
#include "zt/fnd/osdep/OSException.h"

namespace vlt::test {

// The errno of the PosixError that the call throws; -1 if it throws none.
template <class Call>
int PosixErrorOf(Call call) {
  try {
    call();
  } catch (const zt::fnd::osdep::PosixError& e) {
    return static_cast<int>(e.whatcode());
  }
  return -1;
}

inline zt::fnd::String Wide(const std::string& text) { return zt::fnd::String(text.c_str()); }

}  // namespace vlt::test
