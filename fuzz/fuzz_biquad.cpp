// Filters configured from arbitrary bytes (NaN and infinite parameters
// included) and fed arbitrary samples: configure either works or throws the
// host's exception, and every block and multichannel path gives the bits of
// processSample, at every SIMD level the CPU has.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "host/Exception.h"
#include "tonebits/dsp/Aud__MultiBandBiquad.h"
#include "tonebits/foundation/Aud__Simd.h"

namespace {

using Aud::Filter::Biquad;
using Chain = Aud::Filter::MultiBandBiquad<3>;

struct Bytes {
  const uint8_t* p;
  size_t n;
  template <class T>
  T take() {
    T v{};
    const size_t k = n < sizeof(T) ? n : sizeof(T);
    std::memcpy(&v, p, k);
    p += k;
    n -= k;
    return v;
  }
};

void configure(Biquad& b, Bytes& in) {
  const auto type = static_cast<Biquad::eFilterType>(in.take<uint8_t>() % 11);
  const float frequency = in.take<float>(), rate = in.take<float>();
  const Biquad::ShapeDescriptor shape(static_cast<Biquad::ShapeDescriptor::eType>(in.take<uint8_t>() % 4),
                                      in.take<float>());
  const double gain = in.take<int8_t>() * 0.25;
  try {
    b.configure(type, frequency, rate, shape, gain);
    b.setActive(in.take<uint8_t>() % 4 != 0);
  } catch (const Kv::Exception::RuntimeError&) {
  }
}

bool same(const std::vector<float>& a, const std::vector<float>& b) {
  return a.empty() || std::memcmp(a.data(), b.data(), a.size() * sizeof(float)) == 0;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  Bytes in{data, size};
  const unsigned channels = 1 + in.take<uint8_t>() % 8;
  const bool interleaved = in.take<uint8_t>() % 2;
  const bool sameBands = in.take<uint8_t>() % 2;
  std::vector<Chain> chains(channels);
  for (unsigned c = 0; c < channels; ++c) {
    if (sameBands && c > 0) {
      chains[c] = chains[0];
      continue;
    }
    for (unsigned k = 0; k < 3; ++k) configure(chains[c].getBand(k), in);
  }
  const unsigned frames = unsigned(in.n / (4 * channels));
  std::vector<float> samples(size_t(frames) * channels);
  for (float& s : samples) s = in.take<float>();

  // The reference: each channel sample by sample.
  std::vector<Chain> reference = chains;
  std::vector<float> want(samples.size());
  for (unsigned c = 0; c < channels; ++c)
    for (unsigned f = 0; f < frames; ++f)
      want[size_t(f) * channels + c] = reference[c].processSample(samples[size_t(f) * channels + c]);

  const Aud::Simd::eLevel best = Aud::Simd::supportedLevel();
  for (int level = Aud::Simd::eScalar; level <= best; ++level) {
    Aud::Simd::setActiveLevel(Aud::Simd::eLevel(level));
    std::vector<Chain> run = chains;
    std::vector<Chain*> list;
    for (Chain& chain : run) list.push_back(&chain);
    std::vector<float> got(samples.size());
    if (interleaved) {
      Chain::processBlockInterleaved(list.data(), samples.data(), got.data(), channels, frames);
    } else {
      std::vector<std::vector<float>> planes(channels, std::vector<float>(frames));
      std::vector<const float*> ins;
      std::vector<float*> outs;
      for (unsigned c = 0; c < channels; ++c) {
        for (unsigned f = 0; f < frames; ++f) planes[c][f] = samples[size_t(f) * channels + c];
        ins.push_back(planes[c].data());
        outs.push_back(planes[c].data());
      }
      Chain::processBlockMultiChannel(list.data(), ins.data(), outs.data(), channels, frames);
      for (unsigned c = 0; c < channels; ++c)
        for (unsigned f = 0; f < frames; ++f) got[size_t(f) * channels + c] = planes[c][f];
    }
    if (!same(got, want)) std::abort();
    for (unsigned c = 0; c < channels; ++c) {
      const float a = run[c].getLastProcessSampleResult(), b = reference[c].getLastProcessSampleResult();
      if (std::memcmp(&a, &b, sizeof a) != 0) std::abort();
    }
  }
  Aud::Simd::setActiveLevel(best);
  return 0;
}
