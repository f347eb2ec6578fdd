#pragma once

// The border between exceptions and results.
//
//   ResultOf(failure, step)          anything that `step` throws becomes the result `failure`
//   ResultOf<Caught>(failure, step)  only what is a Caught; others pass
//   Attempt(step), Attempt<Caught>   the same for what succeeds or does not
//
// The caller says beside the call why the exception ends there.

#include <type_traits>
#include <utility>

#include "source/Common/vltTypes.h"

namespace vlt {

template <class Step>
HRESULT ResultOf(HRESULT failure, Step&& step) {
  try {
    return std::forward<Step>(step)();
  } catch (...) {
    return failure;
  }
}

template <class Caught, class Step>
HRESULT ResultOf(HRESULT failure, Step&& step) {
  try {
    return std::forward<Step>(step)();
  } catch (const Caught&) {
    return failure;
  }
}

namespace detail {

template <class Step>
HRESULT Run(Step& step) {
  if constexpr (std::is_same_v<decltype(step()), bool>) {
    return step() ? S_OK : S_FALSE;
  } else {
    step();
    return S_OK;
  }
}

}  // namespace detail

// False where `step` throws, or returns false.
template <class Step>
bool Attempt(Step&& step) {
  return ResultOf(E_FAIL, [&] { return detail::Run(step); }) == S_OK;
}

template <class Caught, class Step>
bool Attempt(Step&& step) {
  return ResultOf<Caught>(E_FAIL, [&] { return detail::Run(step); }) == S_OK;
}

}  // namespace vlt
