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

// The public multichannel forms. Channel c's sample n is read from
// inOf(c)[n * inStride] and written to outOf(c)[n * outStride];
// chainOf(filter) is a filter's first band. The arguments are checked (a bad
// one is reported and nothing is touched), then the channels go to runLanes
// a group at a time, in channel order.
template <class Filter, class ChainOf, class InOf, class OutOf>
void runChannels(Filter* const* filters, ChainOf chainOf, unsigned nBands, unsigned channels, InOf inOf,
                 std::ptrdiff_t inStride, OutOf outOf, std::ptrdiff_t outStride, unsigned count) noexcept {
  if (channels == 0 || count == 0) return;
  if (!filters) return vel_splat("Aud::Filter: null filter list");
  if (inStride < 1 || outStride < 1) return vel_splat("Aud::Filter: sample stride below 1");
  for (unsigned c = 0; c < channels; ++c)
    if (!filters[c] || !inOf(c) || !outOf(c)) return vel_splat("Aud::Filter: null filter or channel buffer");
  for (unsigned first = 0; first < channels; first += kMaxLanes) {
    const unsigned lanes = channels - first < kMaxLanes ? channels - first : kMaxLanes;
    Biquad* chains[kMaxLanes];
    LaneBuffers io{};
    io.inStride = inStride;
    io.outStride = outStride;
    for (unsigned l = 0; l < lanes; ++l) {
      chains[l] = chainOf(filters[first + l]);
      io.in[l] = inOf(first + l);
      io.out[l] = outOf(first + l);
    }
    runLanes(chains, lanes, nBands, io, count);
  }
}

// The three public forms over one kind of filter.
template <class Filter, class ChainOf>
struct ChannelForms {
  static void strided(Filter* const* filters, ChainOf chainOf, unsigned nBands, const float* const* in,
                      std::ptrdiff_t inStride, float* const* out, std::ptrdiff_t outStride, unsigned channels,
                      unsigned count) noexcept {
    if (channels && count && (!in || !out)) return vel_splat("Aud::Filter: null buffer list");
    runChannels(
        filters, chainOf, nBands, channels, [&](unsigned c) { return in[c]; }, inStride,
        [&](unsigned c) { return out[c]; }, outStride, count);
  }
  static void interleaved(Filter* const* filters, ChainOf chainOf, unsigned nBands, const float* in,
                          float* out, unsigned channels, unsigned frames) noexcept {
    if (channels && frames && (!in || !out)) return vel_splat("Aud::Filter: null buffer");
    runChannels(
        filters, chainOf, nBands, channels, [&](unsigned c) { return in + c; }, std::ptrdiff_t(channels),
        [&](unsigned c) { return out + c; }, std::ptrdiff_t(channels), frames);
  }
};

}  // namespace Private
}  // namespace Aud::Filter
