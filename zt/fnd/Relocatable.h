#pragma once

#include <type_traits>
#include <utility>

namespace zt::fnd {

// Whether an object may be moved as bytes, its old place being forgotten. To be specialised for a
// class that owns a block and has no pointer into itself: an array of such grows without a copy of
// each.
template <class T>
inline constexpr bool kIsRelocatable = std::is_trivially_copyable_v<T>;
template <class A, class B>
inline constexpr bool kIsRelocatable<std::pair<A, B>> = kIsRelocatable<A>&& kIsRelocatable<B>;

}  // namespace zt::fnd
