#include "tonebits/dsp/Aud__MultiBandBiquad.h"

#include "host/Exception.h"
#include "tonebits/dsp/Aud__BiquadCascade.h"

namespace Aud::Filter {

namespace {

// getBand reports against the class's header, the response against the
// filter's own source.
constexpr const char* kHeaderSource = "tonebits/Aud__Biquad";
constexpr int32_t kLineBand = 206;
constexpr int32_t kLineBandConst = 214;

}  // namespace

template <unsigned N>
Biquad& MultiBandBiquad<N>::getBand(unsigned int i) {
  if (i >= N) throw Kv::Exception::RuntimeError("BandNumber out of range!", kHeaderSource, kLineBand);
  return bands[i];
}

template <unsigned N>
const Biquad& MultiBandBiquad<N>::getBand(unsigned int i) const {
  if (i >= N) throw Kv::Exception::RuntimeError("BandNumber out of range!", kHeaderSource, kLineBandConst);
  return bands[i];
}

template <unsigned N>
float MultiBandBiquad<N>::processSample(float x) noexcept {
  for (Biquad& band : bands) x = band.processSample(x);
  return x;
}

template <unsigned N>
void MultiBandBiquad<N>::processBlock(const float* in, float* out, unsigned count) noexcept {
  if (count == 0) return;
  if (!in || !out) return vel_splat("Aud::Filter::MultiBandBiquad::processBlock: null buffer");
  Private::runChain(bands, N, in, 1, out, 1, count);
}

template <unsigned N>
void MultiBandBiquad<N>::processBlockMultiChannel(MultiBandBiquad* const* filters, const float* const* in,
                                                  float* const* out, unsigned channels,
                                                  unsigned count) noexcept {
  const auto chainOf = [](MultiBandBiquad* f) { return f->bands; };
  Private::ChannelForms<MultiBandBiquad, decltype(chainOf)>::strided(filters, chainOf, N, in, 1, out, 1,
                                                                     channels, count);
}

template <unsigned N>
void MultiBandBiquad<N>::processBlockStrided(MultiBandBiquad* const* filters, const float* const* in,
                                             std::ptrdiff_t inStride, float* const* out,
                                             std::ptrdiff_t outStride, unsigned channels,
                                             unsigned count) noexcept {
  const auto chainOf = [](MultiBandBiquad* f) { return f->bands; };
  Private::ChannelForms<MultiBandBiquad, decltype(chainOf)>::strided(filters, chainOf, N, in, inStride, out,
                                                                     outStride, channels, count);
}

template <unsigned N>
void MultiBandBiquad<N>::processBlockInterleaved(MultiBandBiquad* const* filters, const float* in, float* out,
                                                 unsigned channels, unsigned frames) noexcept {
  const auto chainOf = [](MultiBandBiquad* f) { return f->bands; };
  Private::ChannelForms<MultiBandBiquad, decltype(chainOf)>::interleaved(filters, chainOf, N, in, out,
                                                                         channels, frames);
}

template <unsigned N>
void MultiBandBiquad<N>::reset() noexcept {
  for (Biquad& band : bands) band.reset();
}

template <unsigned N>
float MultiBandBiquad<N>::getResponseMagnitudeAtFrequency(float f) const {
  float response = 1.0f;
  for (const Biquad& band : bands)
    response *= band.getActive() ? band.getResponseMagnitudeAtFrequency(f) : 1.0f;
  return response;
}

template class MultiBandBiquad<2>;
template class MultiBandBiquad<3>;
template class MultiBandBiquad<4>;
template class MultiBandBiquad<5>;

}  // namespace Aud::Filter
