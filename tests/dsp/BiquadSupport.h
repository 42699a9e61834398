// Helpers shared by the filter tests: bit views of filter state and random
// filter settings.
#pragma once

#include <cmath>
#include <cstdint>
#include <cstring>
#include <random>
#include <vector>

#include <gtest/gtest.h>

#include "tonebits/dsp/Aud__Biquad.h"
#include "tonebits/dsp/Aud__BiquadCascade.h"

namespace biquad_test {

using Aud::Filter::Biquad;
using Aud::Filter::BiquadAccess;
using Shape = Biquad::ShapeDescriptor;

inline uint32_t bitsOf(float v) {
  uint32_t u;
  std::memcpy(&u, &v, 4);
  return u;
}
inline float floatOf(uint32_t u) {
  float v;
  std::memcpy(&v, &u, 4);
  return v;
}

// Everything a filter holds, as bits, so that two filters compare equal only
// when they would behave identically from here on.
struct StateBits {
  bool active;
  uint32_t coefficients[5];
  uint64_t raw[6];
  uint32_t history[4];
  int32_t type;
  uint32_t frequency, samplingRate;
  int32_t shapeType;
  uint32_t shapeValue;
  uint64_t gain;
  bool operator==(const StateBits&) const = default;
};

inline StateBits stateOf(Biquad& b) {
  StateBits s{};
  s.active = b.getActive();
  std::memcpy(s.coefficients, BiquadAccess::coefficients(b), sizeof(s.coefficients));
  std::memcpy(s.raw, BiquadAccess::rawCoefficients(b), sizeof(s.raw));
  const auto& h = BiquadAccess::history(b);
  s.history[0] = bitsOf(h.x1);
  s.history[1] = bitsOf(h.x2);
  s.history[2] = bitsOf(h.y1);
  s.history[3] = bitsOf(h.y2);
  s.type = b.getFilterType();
  s.frequency = bitsOf(b.getFrequency());
  s.samplingRate = bitsOf(b.getSamplingRate());
  s.shapeType = b.getShapeDescriptor().getType();
  s.shapeValue = bitsOf(b.getShapeDescriptor().getValue());
  const double g = b.getGain();
  std::memcpy(&s.gain, &g, 8);
  return s;
}

// A valid, stable design of the given type with random parameters.
inline void configureRandomly(Biquad& b, Biquad::eFilterType type, std::mt19937& rng) {
  std::uniform_real_distribution<float> logFreq(3.0f, 9.9f);  // e^3 = 20 Hz .. e^9.9 = 20 kHz
  std::uniform_real_distribution<float> unit(0.0f, 1.0f);
  const float rates[] = {44100.0f, 48000.0f, 96000.0f};
  const float rate = rates[rng() % 3];
  const float frequency = std::exp(logFreq(rng));
  const double gain = double(unit(rng)) * 30.0 - 15.0;
  Shape shape;
  if (type == Biquad::LowShelf || type == Biquad::HighShelf) {
    if (rng() % 2)
      shape.setAsQ(0.3f + 2.0f * unit(rng));
    else
      shape.setAsS(0.2f + 0.8f * unit(rng));
  } else {
    if (rng() % 2)
      shape.setAsQ(0.3f + 6.0f * unit(rng));
    else
      shape.setAsBandwidth(0.1f + 2.5f * unit(rng));
  }
  b.configure(type, frequency, rate, shape, gain);
}

inline Biquad::eFilterType typeAt(int i) { return static_cast<Biquad::eFilterType>(i); }

// Input salted with the values that break careless kernels.
enum class Salt { kClean, kDenormal, kNaN, kInfinity, kNegativeZero, kLoud };

inline std::vector<float> signal(unsigned count, Salt salt, std::mt19937& rng) {
  std::uniform_real_distribution<float> d(-1.0f, 1.0f);
  std::vector<float> v(count);
  for (float& x : v) x = d(rng);
  if (count == 0) return v;
  const unsigned at = unsigned(rng() % count);
  switch (salt) {
    case Salt::kClean: break;
    case Salt::kDenormal:
      for (float& x : v) x *= 1e-39f;  // every sample denormal, results too
      break;
    case Salt::kNaN:
      // Quiet NaNs of both signs with payloads, and a signalling one: where
      // two meet, the result's bits depend on the operand order.
      v[at] = floatOf(0x7FC01234u);
      if (count > 3) v[(at + count / 2) % count] = floatOf(0xFFC00000u);
      if (count > 5) v[(at + count / 3) % count] = floatOf(0x7F800001u);
      break;
    case Salt::kInfinity: v[at] = (rng() % 2) ? INFINITY : -INFINITY; break;
    case Salt::kNegativeZero:
      for (unsigned i = 0; i < count; i += 2) v[i] = -0.0f;
      break;
    case Salt::kLoud:
      for (float& x : v) x *= 3e38f;  // overflows to infinity inside the filter
      break;
  }
  return v;
}

inline constexpr Salt kSalts[] = {Salt::kClean,    Salt::kDenormal,     Salt::kNaN,
                                  Salt::kInfinity, Salt::kNegativeZero, Salt::kLoud};

// memcmp of the two blocks; on a difference, where it is and the two bit
// patterns, for the failure message.
inline testing::AssertionResult sameBits(const std::vector<float>& got, const std::vector<float>& want) {
  if (got.size() == want.size() &&
      (got.empty() || std::memcmp(got.data(), want.data(), got.size() * sizeof(float)) == 0))
    return testing::AssertionSuccess();
  if (got.size() != want.size())
    return testing::AssertionFailure() << "sizes " << got.size() << " " << want.size();
  size_t i = 0;
  while (bitsOf(got[i]) == bitsOf(want[i])) ++i;
  return testing::AssertionFailure() << "sample " << i << " of " << got.size() << ": got " << std::hex
                                     << bitsOf(got[i]) << " (" << got[i] << "), want " << bitsOf(want[i])
                                     << " (" << want[i] << ")";
}

}  // namespace biquad_test
