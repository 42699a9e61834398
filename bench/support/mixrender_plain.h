// Plain loops of the mixing arithmetic, the baselines of bench_mixrender:
// the compiler's best at -O3 for this CPU, with no aliasing to fear.
#pragma once

#include <cstddef>

namespace plain {

float peak(const float* __restrict src, std::size_t n, float p);
void mul(const float* __restrict src, float* __restrict dst, std::size_t n, float g);
float mulPeak(const float* __restrict src, float* __restrict dst, std::size_t n, float g, float p);
void add(const float* __restrict src, float* __restrict dst, std::size_t n);
void mulAdd(const float* __restrict src, float* __restrict dst, std::size_t n, float g);
void mulAdd2(const float* __restrict src, float* __restrict a, float* __restrict b, std::size_t n, float ga,
             float gb);
float mulAddPeak(const float* __restrict src, float* __restrict dst, std::size_t n, float g, float p);
void ramp(const float* __restrict src, float* __restrict dst, std::size_t n, float g, float delta);
void rampAdd(const float* __restrict src, float* __restrict dst, std::size_t n, float g, float delta);
// The ramps' dependency limit: n serial float additions.
float serialAdds(std::size_t n, float g, float delta);

}  // namespace plain
