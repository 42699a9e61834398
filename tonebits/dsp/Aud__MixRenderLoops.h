// The inner loops of the mixing kernels, one set per instruction-set level.
// Internal to the library: Aud__MixRender.cpp takes the gain shortcuts and
// checks the pointers, then hands the general case to the loops of the
// active level.
//
// n is a count of samples, always a multiple of four; pointers are valid for
// n samples. The folding loops take the peak held so far and return the new
// one. Every set must give the bits of the scalar set.
#pragma once

#include <cstddef>

namespace Aud::MixRender::detail {

struct Loops {
  float (*fold)(const float* src, std::size_t n, float peak) noexcept;
  void (*mul)(const float* src, float* dst, std::size_t n, float gain) noexcept;
  float (*mulFold)(const float* src, float* dst, std::size_t n, float gain, float peak) noexcept;
  void (*add)(const float* src, float* dst, std::size_t n) noexcept;
  float (*addFold)(const float* src, float* dst, std::size_t n, float peak) noexcept;
  void (*mulAdd)(const float* src, float* dst, std::size_t n, float gain) noexcept;
  float (*mulAddFold)(const float* src, float* dst, std::size_t n, float gain, float peak) noexcept;
  void (*mulAdd2)(const float* src, float* dstA, float* dstB, std::size_t n, float gainA,
                  float gainB) noexcept;
  void (*ramp)(const float* src, float* dst, std::size_t n, float startGain, float delta) noexcept;
  void (*rampAdd)(const float* src, float* dst, std::size_t n, float startGain, float delta) noexcept;
};

// The scalar reference, written straight from the rules.
const Loops& scalarLoops() noexcept;
// The vector sets; null where the build has no such level.
const Loops* sse2Loops() noexcept;
const Loops* avx2Loops() noexcept;
const Loops* avx512Loops() noexcept;

}  // namespace Aud::MixRender::detail
