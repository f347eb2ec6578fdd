#pragma once

#include <utility>

#include "zt/fnd/Exception.h"

namespace zt::fnd {

// Conversion between integer types that keeps the value. Throws OutOfRange where `To` cannot hold
// it, a negative number for an unsigned type included.
template <class To, class From>
struct _NumericCast {
  static To convert(From value) {
    if (!std::in_range<To>(value)) ZT_RAISE(exception::OutOfRange());
    return static_cast<To>(value);
  }
};

template <class To, class From>
To NumericCast(From value) {
  return _NumericCast<To, From>::convert(value);
}

}  // namespace zt::fnd
