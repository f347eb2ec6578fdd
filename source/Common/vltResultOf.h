#pragma once

// The border between exceptions and results.

#include <utility>

#include "source/Common/vltTypes.h"

namespace vlt {

// Result of `step`; `failure` where it throws anything.
template <class Step>
HRESULT ResultOf(HRESULT failure, Step&& step) {
  try {
    return std::forward<Step>(step)();
  } catch (...) {
    return failure;
  }
}

// The same for exceptions of one class. Others pass.
template <class Caught, class Step>
HRESULT ResultOf(HRESULT failure, Step&& step) {
  try {
    return std::forward<Step>(step)();
  } catch (const Caught&) {
    return failure;
  }
}

}  // namespace vlt
