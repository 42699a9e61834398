// Mixing kernels: gain, gain ramp, sum and peak scan over blocks of float
// samples, and a fast approximate sine and cosine of a 16-bit phase.
//
// Lengths are counts of quads (blocks of four samples): a kernel processes
// exactly N = 4 x numQuads samples, N formed in 32-bit unsigned arithmetic
// (keep numQuads below 2^30). The source is always the first argument. Each
// output sample depends only on the source and destination samples at its
// own index as they were before the call, so src == dst (in place) is
// allowed, and for MultiplyConstantAndAdd2 src may be either destination.
// Any other overlap of a source with a destination, and dstA == dstB, give
// unspecified samples (but stay within the buffers).
//
// Arithmetic is single precision with every product rounded before it is
// added (no fused multiply-add), so results are the same bits on every CPU
// and on every instruction-set level the kernels choose between (see
// Aud__Simd.h). One freedom remains with the CPU: when two different NaNs
// meet in one operation, which one's payload survives.
//
// Gain shortcuts, taken before any sample is touched (IEEE equality, so -0.0
// counts as 0.0 and a NaN gain takes the general path):
//
//   kernel                                 gain 1.0               gain 0.0
//   MultiplyConstant                       bit-exact copy         dst = +0.0, src unread
//   MultiplyConstantWithPrePeakScan        copy, then PeakScan    dst = +0.0, *peak untouched
//   MultiplyConstantAndAdd                 Add                    nothing
//   MultiplyConstantAndAdd2                Add, per destination   nothing, per destination
//   MultiplyConstantAndAddWithPrePeakScan  add with peak fold     none: multiplies by 0
//
// The peak fold reads *peak once, replaces it by each |src[i]| that is
// strictly greater, and writes it back once (also for N = 0). So a NaN
// sample never becomes the peak and a NaN peak is never replaced. It looks
// at the source before any gain ("pre" peak).
//
// The ramps use g(0) = startGain and g(i + 1) = g(i) + delta, rounded to
// float at every step exactly as a serial loop would; delta 0.0 (either
// sign) makes them the constant-gain kernels with startGain.
//
// A null buffer with N > 0, or a null peak that would be folded, is reported
// through the host's fatal report and the call returns having written
// nothing.
//
// No state, no allocation, no lock: any thread may call on its own buffers.
#pragma once

#include "tonebits/export.h"

namespace Aud::MixRender {

// Folds |src[i]| into *peak.
TONEBITS_API void PeakScan(float* src, unsigned int numQuads, float* peak) noexcept;

// dst[i] = gain x src[i].
TONEBITS_API void MultiplyConstant(float* src, float* dst, unsigned int numQuads, float gain) noexcept;
// As MultiplyConstant, folding |src[i]| into *peak.
TONEBITS_API void MultiplyConstantWithPrePeakScan(float* src, float* dst, unsigned int numQuads, float gain,
                                                  float* peak) noexcept;
// dst[i] = g(i) x src[i].
TONEBITS_API void MultiplyWithDelta(float* src, float* dst, unsigned int numQuads, float startGain,
                                    float delta) noexcept;

// dst[i] = src[i] + dst[i].
TONEBITS_API void Add(float* src, float* dst, unsigned int numQuads) noexcept;
// dst[i] = gain x src[i] + dst[i].
TONEBITS_API void MultiplyConstantAndAdd(float* src, float* dst, unsigned int numQuads, float gain) noexcept;
// dstA[i] = gainA x src[i] + dstA[i] and dstB[i] = gainB x src[i] + dstB[i],
// reading each source sample once.
TONEBITS_API void MultiplyConstantAndAdd2(float* src, float* dstA, float* dstB, unsigned int numQuads,
                                          float gainA, float gainB) noexcept;
// As MultiplyConstantAndAdd, folding |src[i]| into *peak.
TONEBITS_API void MultiplyConstantAndAddWithPrePeakScan(float* src, float* dst, unsigned int numQuads,
                                                        float gain, float* peak) noexcept;
// dst[i] = g(i) x src[i] + dst[i].
TONEBITS_API void MultiplyWithDeltaAndAdd(float* src, float* dst, unsigned int numQuads, float startGain,
                                          float delta) noexcept;

// An approximate sine and cosine of phase x 2 pi / 65536 (only the low 16
// bits of phase count): a parabola per quadrant, exact at every multiple of
// 45 degrees, within about 0.0236 of the true values.
TONEBITS_API void fastSineCosine(float& sine, float& cosine, unsigned int phase) noexcept;

}  // namespace Aud::MixRender
