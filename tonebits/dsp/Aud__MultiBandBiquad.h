// An N-band equaliser for one channel: N biquads in series, band 0 first,
// provided for N = 2, 3, 4 and 5.
//
// Each band is configured and switched through getBand(); an inactive band
// passes its input on unchanged (recording it as its last result), so
// switching a band off removes it from the chain without disturbing the
// others. The chain's response is the product of the active bands'
// responses.
//
// processBlock() gives exactly the bits of calling processSample() once per
// sample. It overlaps the bands' recursions (band k works on sample n while
// band k + 1 works on sample n - 1), which the arithmetic order allows.
// The multichannel forms run one chain per channel, several channels at once
// in SIMD lanes, with the same bits.
//
// Errors: getBand() with an index of N or more and the response of a chain
// with an active unconfigured band throw Kv::Exception::RuntimeError. A chain
// belongs to one caller at a time.
#pragma once

#include <cstddef>

#include "tonebits/dsp/Aud__Biquad.h"
#include "tonebits/export.h"

namespace Aud::Filter {

template <unsigned N>
class TONEBITS_API MultiBandBiquad {
  static_assert(N >= 2 && N <= 5, "MultiBandBiquad is provided for 2 to 5 bands");

 public:
  // N inactive, unconfigured bands: samples pass unchanged.
  MultiBandBiquad() noexcept = default;

  // Band i; throws "BandNumber out of range!" for i >= N.
  Biquad& getBand(unsigned int i);
  const Biquad& getBand(unsigned int i) const;

  // x through band 0, its result through band 1, and so on.
  float processSample(float x) noexcept;
  // count samples, exactly as count calls of processSample(). in == out is
  // allowed; otherwise the buffers must not overlap.
  void processBlock(const float* in, float* out, unsigned count) noexcept;

  // Several channels at once, each through its own chain, as for
  // Biquad::processBlockMultiChannel and its siblings: exactly the bits of
  // filters[c]->processBlock on each channel; channels whose bands are
  // switched on alike share SIMD lanes. A stereo equaliser on interleaved
  // frames runs in place in the lanes.
  static void processBlockMultiChannel(MultiBandBiquad* const* filters, const float* const* in,
                                       float* const* out, unsigned channels, unsigned count) noexcept;
  static void processBlockInterleaved(MultiBandBiquad* const* filters, const float* in, float* out,
                                      unsigned channels, unsigned frames) noexcept;
  static void processBlockStrided(MultiBandBiquad* const* filters, const float* const* in,
                                  std::ptrdiff_t inStride, float* const* out, std::ptrdiff_t outStride,
                                  unsigned channels, unsigned count) noexcept;

  // Zeroes every band's history.
  void reset() noexcept;
  // The product of the active bands' responses at f, a fraction of the
  // Nyquist frequency.
  float getResponseMagnitudeAtFrequency(float f) const;
  // The chain's last output: the last band's last result.
  float getLastProcessSampleResult() const noexcept { return bands[N - 1].getLastProcessSampleResult(); }

 private:
  Biquad bands[N];
};

extern template class MultiBandBiquad<2>;
extern template class MultiBandBiquad<3>;
extern template class MultiBandBiquad<4>;
extern template class MultiBandBiquad<5>;

}  // namespace Aud::Filter
