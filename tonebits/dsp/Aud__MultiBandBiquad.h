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
// processBlockMultiChannel() and processBlockInterleaved() run one chain per
// channel, several channels at once in SIMD lanes, with the same bits.
//
// Errors: getBand() with an index of N or more and the response of a chain
// with an active unconfigured band throw Kv::Exception::RuntimeError. A chain
// belongs to one caller at a time.
#pragma once

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

  // filters[c] over channel c for every channel, with exactly the bits of
  // filters[c]->processBlock(in[c], out[c], count) for each c, several
  // channels per SIMD lane group. in[c] == out[c] is allowed; otherwise no
  // buffers may overlap. A filter listed twice runs channel after channel.
  // A null list, filter or buffer (with samples to process) is reported
  // through vel_splat and nothing is touched.
  static void processBlockMultiChannel(MultiBandBiquad* const* filters, const float* const* in,
                                       float* const* out, unsigned channels, unsigned count) noexcept;
  // The same over interleaved frames: channel c of frame n is at
  // [n * channels + c]. in == out is allowed.
  static void processBlockInterleaved(MultiBandBiquad* const* filters, const float* in, float* out,
                                      unsigned channels, unsigned frames) noexcept;

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
