// Internal to the library: the block engine behind Biquad::processBlock,
// MultiBandBiquad::processBlock and their multichannel forms.
//
// A chain of biquads (one channel's bands, contiguous in memory) runs
// software-pipelined: at step t, stage k filters sample t - k, and its input
// is the output stage k - 1 produced at step t - 1. Within a step the stages'
// recursions are then independent, so the CPU overlaps them instead of
// waiting for each band's result before starting the next. Every stage still
// sees its samples in order and does the arithmetic of Biquad::processSample
// in the same order, so the bits are those of the sample-by-sample path.
//
// Several channels run at once with one channel per SIMD lane: a lane does
// the scalar operations in the scalar order, so each channel keeps its bits.
#pragma once

#include <cstddef>

#include "host/Log.h"
#include "tonebits/dsp/Aud__Biquad.h"

namespace Aud::Filter {

// The state the block engine keeps in registers while it runs (and the
// library's tests inspect).
struct BiquadAccess {
  using History = Biquad::History;
  static bool active(const Biquad& b) noexcept { return b.active; }
  static const float* coefficients(const Biquad& b) noexcept { return b.coefficients; }
  static const double* rawCoefficients(const Biquad& b) noexcept { return b.rawCoefficients; }
  static History& history(Biquad& b) noexcept { return b.history; }
};

namespace Private {

inline constexpr unsigned kMaxBands = 5;
inline constexpr unsigned kMaxLanes = 8;

// Lane l's sample n is in[l][n * inStride], and goes to out[l][n * outStride].
struct LaneBuffers {
  const float* in[kMaxLanes];
  float* out[kMaxLanes];
  std::ptrdiff_t inStride;
  std::ptrdiff_t outStride;
};

// One chain of nBands (1 to kMaxBands) biquads over count samples, exactly
// as count calls of processSample on each band in turn.
void runChain(Biquad* chain, unsigned nBands, const float* in, std::ptrdiff_t inStride, float* out,
              std::ptrdiff_t outStride, unsigned count) noexcept;

// chains[l] over lane l for 1 to kMaxLanes lanes, on the widest path the
// active SIMD level offers. A chain given twice runs lane after lane.
void runLanes(Biquad* const* chains, unsigned lanes, unsigned nBands, const LaneBuffers& io,
              unsigned count) noexcept;

// The public multichannel forms: check the arguments, then feed the channels
// to runLanes a group at a time, in channel order. chainOf(filter) is the
// filter's first band.
template <class Filter, class ChainOf>
void runChannels(Filter* const* filters, ChainOf chainOf, unsigned nBands, unsigned channels,
                 const float* const* in, float* const* out, unsigned count) noexcept {
  if (channels == 0 || count == 0) return;
  if (!filters || !in || !out) return vel_splat("Aud::Filter: null filter or buffer list");
  for (unsigned c = 0; c < channels; ++c)
    if (!filters[c] || !in[c] || !out[c]) return vel_splat("Aud::Filter: null filter or channel buffer");
  for (unsigned first = 0; first < channels; first += kMaxLanes) {
    const unsigned lanes = channels - first < kMaxLanes ? channels - first : kMaxLanes;
    Biquad* chains[kMaxLanes];
    LaneBuffers io{};
    io.inStride = io.outStride = 1;
    for (unsigned l = 0; l < lanes; ++l) {
      chains[l] = chainOf(filters[first + l]);
      io.in[l] = in[first + l];
      io.out[l] = out[first + l];
    }
    runLanes(chains, lanes, nBands, io, count);
  }
}

template <class Filter, class ChainOf>
void runInterleaved(Filter* const* filters, ChainOf chainOf, unsigned nBands, unsigned channels,
                    const float* in, float* out, unsigned frames) noexcept {
  if (channels == 0 || frames == 0) return;
  if (!filters || !in || !out) return vel_splat("Aud::Filter: null filter list or buffer");
  for (unsigned c = 0; c < channels; ++c)
    if (!filters[c]) return vel_splat("Aud::Filter: null filter");
  for (unsigned first = 0; first < channels; first += kMaxLanes) {
    const unsigned lanes = channels - first < kMaxLanes ? channels - first : kMaxLanes;
    Biquad* chains[kMaxLanes];
    LaneBuffers io{};
    io.inStride = io.outStride = std::ptrdiff_t(channels);
    for (unsigned l = 0; l < lanes; ++l) {
      chains[l] = chainOf(filters[first + l]);
      io.in[l] = in + first + l;
      io.out[l] = out + first + l;
    }
    runLanes(chains, lanes, nBands, io, frames);
  }
}

}  // namespace Private
}  // namespace Aud::Filter
