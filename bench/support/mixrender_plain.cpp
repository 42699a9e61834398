// Compiled -O3 -march=native (see bench/CMakeLists.txt); contraction stays
// off, so these are the kernels' own roundings.
#include "mixrender_plain.h"

#include <cmath>

namespace plain {

float peak(const float* __restrict src, std::size_t n, float p) {
  for (std::size_t i = 0; i < n; ++i) {
    const float a = std::fabs(src[i]);
    if (a > p) p = a;
  }
  return p;
}

void mul(const float* __restrict src, float* __restrict dst, std::size_t n, float g) {
  for (std::size_t i = 0; i < n; ++i) dst[i] = g * src[i];
}

float mulPeak(const float* __restrict src, float* __restrict dst, std::size_t n, float g, float p) {
  for (std::size_t i = 0; i < n; ++i) {
    const float a = std::fabs(src[i]);
    if (a > p) p = a;
    dst[i] = g * src[i];
  }
  return p;
}

void add(const float* __restrict src, float* __restrict dst, std::size_t n) {
  for (std::size_t i = 0; i < n; ++i) dst[i] = src[i] + dst[i];
}

void mulAdd(const float* __restrict src, float* __restrict dst, std::size_t n, float g) {
  for (std::size_t i = 0; i < n; ++i) dst[i] = g * src[i] + dst[i];
}

void mulAdd2(const float* __restrict src, float* __restrict a, float* __restrict b, std::size_t n, float ga,
             float gb) {
  for (std::size_t i = 0; i < n; ++i) {
    a[i] = ga * src[i] + a[i];
    b[i] = gb * src[i] + b[i];
  }
}

float mulAddPeak(const float* __restrict src, float* __restrict dst, std::size_t n, float g, float p) {
  for (std::size_t i = 0; i < n; ++i) {
    const float a = std::fabs(src[i]);
    if (a > p) p = a;
    dst[i] = g * src[i] + dst[i];
  }
  return p;
}

void ramp(const float* __restrict src, float* __restrict dst, std::size_t n, float g, float delta) {
  for (std::size_t i = 0; i < n; ++i) {
    dst[i] = g * src[i];
    g = g + delta;
  }
}

void rampAdd(const float* __restrict src, float* __restrict dst, std::size_t n, float g, float delta) {
  for (std::size_t i = 0; i < n; ++i) {
    dst[i] = g * src[i] + dst[i];
    g = g + delta;
  }
}

float serialAdds(std::size_t n, float g, float delta) {
  for (std::size_t i = 0; i < n; ++i) g = g + delta;
  return g;
}

}  // namespace plain
