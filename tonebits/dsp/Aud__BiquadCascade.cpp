#include "tonebits/dsp/Aud__BiquadCascade.h"

#include <cstdint>
#include <cstring>
#include <utility>

#include "tonebits/foundation/Aud__Simd.h"

namespace Aud::Filter::Private {

namespace {

// Lanes of floats, one channel each. A vector is only ever operated on by the
// kernel fragments, compiled for an instruction set that holds it.
typedef float Float4 __attribute__((vector_size(16)));
typedef float Float8 __attribute__((vector_size(32)));
typedef int32_t Mask4 __attribute__((vector_size(16)));
typedef int32_t Mask8 __attribute__((vector_size(32)));

template <class V>
struct Lanes;
template <>
struct Lanes<float> {
  static constexpr unsigned kCount = 1;
  using Mask = int32_t;  // one lane is never part on, part off
};
template <>
struct Lanes<Float4> {
  static constexpr unsigned kCount = 4;
  using Mask = Mask4;
};
template <>
struct Lanes<Float8> {
  static constexpr unsigned kCount = 8;
  using Mask = Mask8;
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

// Puts the run's end state back into the bands. A band active in a lane takes
// its whole history; an inactive one only records the last sample it passed
// on, as processSample does.
template <unsigned W>
void storeHistory(const HistoryLanes<W>* h, Biquad* const* chains, unsigned lanes, unsigned nBands,
                  const Plan& plan, const float* lastIn) noexcept {
  for (unsigned l = 0; l < lanes; ++l) {
    float passed = lastIn[l];  // the last sample that reached the current band
    unsigned i = 0;
    for (unsigned k = 0; k < nBands; ++k) {
      Biquad& band = chains[l][k];
      auto& history = BiquadAccess::history(band);
      if (i < plan.stages && plan.kept[i] == k) {
        if (BiquadAccess::active(band))
          history = {h[i][0][l], h[i][1][l], h[i][2][l], h[i][3][l]};
        else
          history.y1 = h[i][2][l];
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
#if defined(__AVX__)
#define TB_VEX_OR(vex, legacy) vex
#else
#define TB_VEX_OR(vex, legacy) legacy
#endif
namespace baseline {
#include "tonebits/dsp/Aud__BiquadArithmetic.inl"
#include "tonebits/dsp/Aud__BiquadKernel.inl"
}  // namespace baseline
#undef TB_VEX_OR

void runGroupScalar(Biquad* const* chains, unsigned nBands, const LaneBuffers& io, unsigned count) noexcept {
  baseline::runGroup<float>(chains, 1, nBands, io, count);
}
void runGroup4(Biquad* const* chains, unsigned lanes, unsigned nBands, const LaneBuffers& io,
               unsigned count) noexcept {
  baseline::runGroup<Float4>(chains, lanes, nBands, io, count);
}

// Eight channels in AVX lanes: the fragments again, every function in them
// compiled for AVX2.
#if defined(__x86_64__) || defined(__i386__)
#define TB_HAS_AVX2_PATH 1
#if defined(__clang__)
#pragma clang attribute push(__attribute__((target("avx2"))), apply_to = function)
#else
#pragma GCC push_options
#pragma GCC target("avx2")
#endif
namespace avx2 {
#define TB_VEX_OR(vex, legacy) vex
#include "tonebits/dsp/Aud__BiquadArithmetic.inl"
#include "tonebits/dsp/Aud__BiquadKernel.inl"
#undef TB_VEX_OR

void runGroup8(Biquad* const* chains, unsigned lanes, unsigned nBands, const LaneBuffers& io,
               unsigned count) noexcept {
  runGroup<Float8>(chains, lanes, nBands, io, count);
}
}  // namespace avx2
#if defined(__clang__)
#pragma clang attribute pop
#else
#pragma GCC pop_options
#endif
#endif

// Lane l alone.
LaneBuffers laneOf(const LaneBuffers& io, unsigned l) noexcept {
  LaneBuffers one{};
  one.in[0] = io.in[l];
  one.out[0] = io.out[l];
  one.inStride = io.inStride;
  one.outStride = io.outStride;
  return one;
}

// The lanes from first on.
LaneBuffers lanesFrom(const LaneBuffers& io, unsigned first) noexcept {
  LaneBuffers rest = io;
  for (unsigned l = first; l < kMaxLanes; ++l) {
    rest.in[l - first] = io.in[l];
    rest.out[l - first] = io.out[l];
  }
  return rest;
}

// Up to four lanes on the baseline vectors.
void runGroupUpTo4(Biquad* const* chains, unsigned lanes, unsigned nBands, const LaneBuffers& io,
                   unsigned count) noexcept {
  if (lanes == 1)
    runGroupScalar(chains, nBands, io, count);
  else
    runGroup4(chains, lanes, nBands, io, count);
}

}  // namespace

void runChain(Biquad* chain, unsigned nBands, const float* in, std::ptrdiff_t inStride, float* out,
              std::ptrdiff_t outStride, unsigned count) noexcept {
  LaneBuffers io{};
  io.in[0] = in;
  io.out[0] = out;
  io.inStride = inStride;
  io.outStride = outStride;
  runGroupScalar(&chain, nBands, io, count);
}

void runLanes(Biquad* const* chains, unsigned lanes, unsigned nBands, const LaneBuffers& io,
              unsigned count) noexcept {
  if (count == 0 || lanes == 0) return;
  bool repeated = false;
  for (unsigned l = 1; l < lanes; ++l)
    for (unsigned m = 0; m < l; ++m) repeated = repeated || chains[l] == chains[m];
  const Simd::eLevel level = Simd::activeLevel();
  if (repeated || level == Simd::eScalar) {
    // One lane after another: a chain that serves two lanes must see the
    // second lane's samples after the first's.
    for (unsigned l = 0; l < lanes; ++l) runGroupScalar(&chains[l], nBands, laneOf(io, l), count);
    return;
  }
#if TB_HAS_AVX2_PATH
  if (lanes > 4 && level >= Simd::eAVX2) return avx2::runGroup8(chains, lanes, nBands, io, count);
#endif
  if (lanes <= 4) return runGroupUpTo4(chains, lanes, nBands, io, count);
  runGroup4(chains, 4, nBands, io, count);
  runGroupUpTo4(chains + 4, lanes - 4, nBands, lanesFrom(io, 4), count);
}

}  // namespace Aud::Filter::Private
