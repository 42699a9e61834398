// Block kernels behind Aud::convertToFloat and Aud::convertFromFloat, one
// table per instruction-set level. Internal to the library.
//
// Every kernel writes exactly count samples, reads exactly count samples,
// accepts any alignment and produces the bits of the scalar reference, which
// is the per-sample rule applied in order.
#pragma once

#include <cstddef>
#include <cstring>

#include "tonebits/foundation/Aud__SampleConversion.h"

namespace Aud::detail {

using ToFloatKernel = void (*)(const unsigned char* src, float* dst, std::size_t count) noexcept;
using FromFloatKernel = void (*)(const float* src, unsigned char* dst, std::size_t count) noexcept;

struct ConversionKernels {
  ToFloatKernel toFloat[kNumSampleTypes];
  FromFloatKernel fromFloat[kNumSampleTypes];
};

extern const ConversionKernels kScalarKernels;
#if defined(__x86_64__) || defined(__i386__)
extern const ConversionKernels kSSE2Kernels;
extern const ConversionKernels kAVX2Kernels;
#endif

// The scalar reference loops, also used by the fast paths for the samples
// after the last whole vector.
template <float (*Rule)(const unsigned char*) noexcept, unsigned Bytes>
inline void toFloatLoop(const unsigned char* src, float* dst, std::size_t count) noexcept {
  for (std::size_t i = 0; i < count; ++i) dst[i] = Rule(src + i * Bytes);
}
template <void (*Rule)(float, unsigned char*) noexcept, unsigned Bytes>
inline void fromFloatLoop(const float* src, unsigned char* dst, std::size_t count) noexcept {
  for (std::size_t i = 0; i < count; ++i) Rule(src[i], dst + i * Bytes);
}

// The shape of a vector kernel K, which each instruction-set file runs with
// its own driver: K::load reads one group of K::kStep samples, K::store
// converts and writes it, K::storeWide may also write up to K::kSlack samples'
// worth of bytes past the group (the next group rewrites them), and K::tail
// takes the samples after the last group. Strides are in elements of In and
// Out.
template <unsigned Bytes, float (*Rule)(const unsigned char*) noexcept>
struct ToFloatKernelBase {
  using In = unsigned char;
  using Out = float;
  static constexpr std::size_t kInStride = Bytes, kOutStride = 1, kSlack = 0;
  static void tail(const In* src, Out* dst, std::size_t n) noexcept { toFloatLoop<Rule, Bytes>(src, dst, n); }
};
template <unsigned Bytes, void (*Rule)(float, unsigned char*) noexcept>
struct FromFloatKernelBase {
  using In = float;
  using Out = unsigned char;
  static constexpr std::size_t kInStride = 1, kOutStride = Bytes, kSlack = 0;
  static void tail(const In* src, Out* dst, std::size_t n) noexcept {
    fromFloatLoop<Rule, Bytes>(src, dst, n);
  }
};

// Types 0 and 7 read as a plain copy, and so does type 7 written.
inline void copyFloats(const unsigned char* src, float* dst, std::size_t count) noexcept {
  std::memcpy(dst, src, count * 4);
}
inline void copyFloats(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::memcpy(dst, src, count * 4);
}

// Type 6 read on a vector path. The reference divides in double and rounds
// the quotient to float: float(RN((i + 0.5) / 2147483647.5)). The vector
// paths multiply by the reciprocal instead, RN(1 / 2147483647.5) =
// 2^-31 (1 + 2^-32), a product within one double ulp of the quotient. The
// two could round to different floats only where that ulp straddles a float
// midpoint; over all 2^32 inputs the float results are identical (the
// closest cases, 72 samples of the form +-(2147483583 - 128k), give the same
// double too), so the division, four times slower, is not needed.
inline constexpr double kInt32Reciprocal = 0x1.00000001p-31;

// Type 6 written on the AVX2 path, in float. With F = c * 2^31 for the
// clamped sample c (exact in float), the reference truncates the double
// rounding of F - 0.5 - F * 2^-32. Both roundings are monotonic and every
// half-integer near F is on the double grid, so the tiny last term only
// decides on which side of an integer the result falls. With Q = |F| rounded
// half down (ceil(|F| - 0.5)), the sample is -Q for c < 0 and max(Q - 1, 0)
// otherwise. For c = 1, Q = 2^31 converts to 0x80000000 and the - 1 wraps it
// to 0x7FFFFFFF. Checked against the reference for all 2^32 inputs; it saves
// the double conversions, which cost twice the rest of the loop.
inline constexpr float kInt32Scale = 0x1p31f;

}  // namespace Aud::detail
