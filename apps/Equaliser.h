// Equaliser bands given on the command line, run per channel through the
// library's multi-band biquad chains.
//
// A band is TYPE:FREQ[:WIDTH][:GAIN], for example peak:1000:1q:-6 or
// lowshelf:100:1s:+3. TYPE is lowpass, highpass, bandpass, bandpass-peak,
// notch, allpass, peak, lowshelf or highshelf; WIDTH is a number with q (Q),
// o (bandwidth in octaves) or s (shelf slope); GAIN is in dB.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "tonebits/dsp/Aud__Biquad.h"

namespace cli {

struct BandSpec {
  Aud::Filter::Biquad::eFilterType type;
  float frequency;
  Aud::Filter::Biquad::ShapeDescriptor shape;
  double gainDb;
  std::string text;
};

BandSpec parseBand(const std::string& text);

class Equaliser {
 public:
  // At most five bands; throws UsageError for a design the filters refuse.
  Equaliser(const std::vector<BandSpec>& bands, float sampleRate, unsigned channels);
  ~Equaliser();
  Equaliser(Equaliser&&) noexcept;
  Equaliser& operator=(Equaliser&&) noexcept;
  bool empty() const { return bands_ == 0; }
  // Filters count samples of every channel in place.
  void process(float* const* channels, unsigned count);
  // The chain's magnitude response at f hertz (one channel's).
  double responseAt(double hertz) const;

 private:
  struct Impl;
  unsigned bands_;
  double nyquist_;
  std::unique_ptr<Impl> impl_;
};

}  // namespace cli
