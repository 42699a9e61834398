#include "tonebits/dsp/Aud__BiquadCascade.h"

#include <cstdint>
#include <cstring>
#include <utility>

#include "tonebits/foundation/Aud__Simd.h"

#if defined(__SSE2__)
#include <emmintrin.h>
#endif

namespace Aud::Filter::Private {

namespace {

// Lanes of floats, one channel each. A vector is only ever operated on by the
// kernel fragments, compiled for an instruction set that holds it.
typedef float Float4 __attribute__((vector_size(16)));
typedef float Float8 __attribute__((vector_size(32)));

template <class V>
struct Lanes {
  static constexpr unsigned kCount = sizeof(V) / sizeof(float);
};

// The bands a run keeps: those active in at least one lane. A band inactive
// in every lane only passes samples on, so it leaves the pipeline.
struct Plan {
  unsigned kept[kMaxBands];
  unsigned stages;
  bool mixed;  // some kept band is inactive in some lanes
};

Plan makePlan(Biquad* const* chains, unsigned lanes, unsigned nBands) noexcept {
  Plan plan{};
  for (unsigned k = 0; k < nBands; ++k) {
    unsigned activeLanes = 0;
    for (unsigned l = 0; l < lanes; ++l) activeLanes += BiquadAccess::active(chains[l][k]) ? 1 : 0;
    if (activeLanes == 0) continue;
    plan.kept[plan.stages++] = k;
    if (activeLanes != lanes) plan.mixed = true;
  }
  return plan;
}

// The lanes of each kept stage's history at the end of a run: x1, x2, y1, y2.
template <unsigned W>
using HistoryLanes = float[4][W];

// Puts the run's end state back into the bands. A kept band takes its whole
// history; a band left out only records the last sample it passed on, as
// processSample does while inactive.
template <unsigned W>
void storeHistory(const HistoryLanes<W>* h, Biquad* const* chains, unsigned lanes, unsigned nBands,
                  const Plan& plan, const float* lastIn) noexcept {
  for (unsigned l = 0; l < lanes; ++l) {
    float passed = lastIn[l];  // the last sample that reached the current band
    unsigned i = 0;
    for (unsigned k = 0; k < nBands; ++k) {
      auto& history = BiquadAccess::history(chains[l][k]);
      if (i < plan.stages && plan.kept[i] == k) {
        history = {h[i][0][l], h[i][1][l], h[i][2][l], h[i][3][l]};
        passed = h[i][2][l];
        ++i;
      } else {
        history.y1 = passed;
      }
    }
  }
}

// Frames per gather/scatter chunk of the lane paths.
constexpr std::ptrdiff_t kChunkFrames = 256;

#define TB_INLINE __attribute__((always_inline)) inline

// The baseline instruction set: one channel, or up to four in SSE lanes.
namespace baseline {
#if defined(__AVX__)
#define TB_VEX 1
#else
#define TB_VEX 0
#endif
#include "tonebits/dsp/Aud__BiquadArithmetic.inl"
#include "tonebits/dsp/Aud__BiquadKernel.inl"
#undef TB_VEX
}  // namespace baseline

// The same for AVX2 machines, where the three-operand forms save a copy per
// operation, and eight channels fit the lanes: the fragments again, every
// function in them compiled for AVX2.
#if defined(__x86_64__) || defined(__i386__)
#define TB_HAS_AVX2_PATH 1
#if defined(__clang__)
#pragma clang attribute push(__attribute__((target("avx2"))), apply_to = function)
#else
#pragma GCC push_options
#pragma GCC target("avx2")
#endif
namespace avx2 {
#define TB_VEX 1
#include "tonebits/dsp/Aud__BiquadArithmetic.inl"
#include "tonebits/dsp/Aud__BiquadKernel.inl"
#undef TB_VEX

void runGroup1(Biquad* const* chains, unsigned nBands, const Plan& plan, const LaneBuffers& io,
               std::ptrdiff_t count) noexcept {
  runGroup<float>(chains, 1, nBands, plan, io, count);
}
void runGroup4(Biquad* const* chains, unsigned lanes, unsigned nBands, const Plan& plan,
               const LaneBuffers& io, std::ptrdiff_t count) noexcept {
  runGroup<Float4>(chains, lanes, nBands, plan, io, count);
}
void runGroup8(Biquad* const* chains, unsigned lanes, unsigned nBands, const Plan& plan,
               const LaneBuffers& io, std::ptrdiff_t count) noexcept {
  runGroup<Float8>(chains, lanes, nBands, plan, io, count);
}
}  // namespace avx2
#if defined(__clang__)
#pragma clang attribute pop
#else
#pragma GCC pop_options
#endif
#else
#define TB_HAS_AVX2_PATH 0
#endif

// The lanes from first on.
LaneBuffers lanesFrom(const LaneBuffers& io, unsigned first) noexcept {
  LaneBuffers rest = io;
  for (unsigned l = first; l < kMaxLanes; ++l) {
    rest.in[l - first] = io.in[l];
    rest.out[l - first] = io.out[l];
  }
  return rest;
}

void runOne(Biquad* chain, unsigned nBands, const LaneBuffers& io, std::ptrdiff_t count, bool avx) noexcept {
  const Plan plan = makePlan(&chain, 1, nBands);
#if TB_HAS_AVX2_PATH
  if (avx) return avx2::runGroup1(&chain, nBands, plan, io, count);
#endif
  (void)avx;
  baseline::runGroup<float>(&chain, 1, nBands, plan, io, count);
}

void runUpTo4(Biquad* const* chains, unsigned lanes, unsigned nBands, const Plan& plan, const LaneBuffers& io,
              std::ptrdiff_t count, bool avx) noexcept {
  if (lanes == 1) return runOne(chains[0], nBands, io, count, avx);
#if TB_HAS_AVX2_PATH
  if (avx) return avx2::runGroup4(chains, lanes, nBands, plan, io, count);
#endif
  baseline::runGroup<Float4>(chains, lanes, nBands, plan, io, count);
}

}  // namespace

void runChain(Biquad* chain, unsigned nBands, const float* in, std::ptrdiff_t inStride, float* out,
              std::ptrdiff_t outStride, unsigned count) noexcept {
  LaneBuffers io{};
  io.in[0] = in;
  io.out[0] = out;
  io.inStride = inStride;
  io.outStride = outStride;
  runLanes(&chain, 1, nBands, io, count);
}

void runLanes(Biquad* const* chains, unsigned lanes, unsigned nBands, const LaneBuffers& io,
              unsigned count) noexcept {
  if (count == 0 || lanes == 0) return;
  const Simd::eLevel level = Simd::activeLevel();
  const bool avx = level >= Simd::eAVX2;
  const Plan plan = makePlan(chains, lanes, nBands);
  bool repeated = false;
  for (unsigned l = 1; l < lanes; ++l)
    for (unsigned m = 0; m < l; ++m) repeated = repeated || chains[l] == chains[m];
  if (lanes == 1 || repeated || plan.mixed || level == Simd::eScalar) {
    // One lane after another. A chain that serves two lanes must see the
    // second lane's samples after the first's; and lanes whose bands differ
    // in which are on do not share a pipeline.
    for (unsigned l = 0; l < lanes; ++l) {
      LaneBuffers one{};
      one.in[0] = io.in[l];
      one.out[0] = io.out[l];
      one.inStride = io.inStride;
      one.outStride = io.outStride;
      runOne(chains[l], nBands, one, count, avx);
    }
    return;
  }
#if TB_HAS_AVX2_PATH
  if (lanes > 4 && avx) return avx2::runGroup8(chains, lanes, nBands, plan, io, count);
#endif
  if (lanes <= 4) return runUpTo4(chains, lanes, nBands, plan, io, count, avx);
  runUpTo4(chains, 4, nBands, plan, io, count, avx);
  runUpTo4(chains + 4, lanes - 4, nBands, plan, lanesFrom(io, 4), count, avx);
}

}  // namespace Aud::Filter::Private
