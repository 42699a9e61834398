// Applying level automation and an equaliser to a buffer.
//
// The level store holds gain nodes over time; an applying iterator walks it
// at the stream's sample rate and multiplies samples in place, gliding when
// the store is edited while it plays. A multi-band biquad is a chain of
// cookbook filters run sample by sample, or a block at a time with the
// same bits.
#include <cmath>
#include <cstdio>
#include <numbers>
#include <vector>

#include "tonebits/tonebits.h"

int main() {
  const double rate = 48000;
  std::vector<float> samples(48000);
  for (std::size_t i = 0; i < samples.size(); ++i)
    samples[i] = 0.5f * float(std::sin(i * 2 * std::numbers::pi * 440 / rate));

  // Bass cut, presence dip, air lift.
  using Aud::Filter::Biquad;
  Aud::Filter::MultiBandBiquad<3> eq;
  eq.getBand(0).configure(Biquad::HighPass, 80.0f, float(rate),
                          Biquad::ShapeDescriptor(Biquad::ShapeDescriptor::Q, 0.707f), 0.0);
  eq.getBand(1).configure(Biquad::PeakingEQ, 3000.0f, float(rate),
                          Biquad::ShapeDescriptor(Biquad::ShapeDescriptor::Q, 1.0f), -3.0);
  eq.getBand(2).configure(Biquad::HighShelf, 10000.0f, float(rate),
                          Biquad::ShapeDescriptor(Biquad::ShapeDescriptor::S, 1.0f), 2.0);
  for (unsigned b = 0; b < 3; ++b) eq.getBand(b).setActive(true);
  eq.processBlock(samples.data(), samples.data(), static_cast<unsigned>(samples.size()));

  // A fade in over the first quarter second, then a dip to -6 dB.
  using Node = Aud::DynamicLevelControl::Store::Node;
  Aud::DynamicLevelControl::Store store;
  store.insert(Node(0.0, 0.0f));
  store.insert(Node(0.25, 1.0f));
  store.insert(Node(0.6, 1.0f));
  store.insert(Node(0.8, 0.5f));
  Aud::DynamicLevelControl::DynamicLevelApplyingIterator levels;
  levels.configureForwards(&store, rate, 0.0);
  levels.apply(samples.data(), samples.size());

  for (double t : {0.1, 0.25, 0.7, 0.9}) {
    float peak = 0;
    for (std::size_t i = std::size_t(t * rate); i < std::size_t(t * rate) + 480; ++i)
      peak = std::fmax(peak, std::fabs(samples[i]));
    std::printf("t = %.2f s: gain %.3f, peak %.3f\n", t, store.getLevelAtTime(t), peak);
  }
  return 0;
}
