// Conversion of a double to an integer type that is defined for every
// input: values beyond the type's range give its nearest bound, NaN gives 0,
// and everything else is truncated toward zero as a plain cast would be.
//
// A plain cast of a NaN or out-of-range double is undefined behaviour; sample
// positions and counts are computed from caller-supplied times and factors,
// so every such conversion in the library goes through here.
#pragma once

#include <cmath>
#include <limits>
#include <type_traits>

namespace Aud {

template <class Int>
constexpr Int saturatingCast(double value) noexcept {
  static_assert(std::is_integral_v<Int>);
  using Limits = std::numeric_limits<Int>;
  if (value != value) return Int(0);
  // Both bounds are compared as exact powers of two (or zero): the maximum of
  // a 64-bit type is not a double, but max + 1 is.
  constexpr double kAboveMax = 2.0 * double(Int(Limits::max() / 2 + 1));
  constexpr double kMin = double(Limits::min());
  if (value >= kAboveMax) return Limits::max();
  if (value <= kMin) return Limits::min();
  return static_cast<Int>(value);
}

}  // namespace Aud
