// Helpers shared by the dsp tests: bit views, SIMD levels, filter state and
// random filter settings.
#pragma once

#include <array>
#include <bit>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <random>
#include <vector>

#include <gtest/gtest.h>

#include "tonebits/dsp/Aud__Biquad.h"
#include "tonebits/dsp/Aud__BiquadCascade.h"
#include "tonebits/foundation/Aud__Simd.h"

namespace dsp_test {

using Aud::Filter::Biquad;
using Aud::Filter::BiquadAccess;
using Shape = Biquad::ShapeDescriptor;

inline uint32_t bitsOf(float v) { return std::bit_cast<uint32_t>(v); }
inline float floatOf(uint32_t u) { return std::bit_cast<float>(u); }

// Every level this CPU runs, scalar first.
inline std::vector<Aud::Simd::eLevel> levels() {
  std::vector<Aud::Simd::eLevel> v;
  for (int l = Aud::Simd::eScalar; l <= Aud::Simd::supportedLevel(); ++l) v.push_back(Aud::Simd::eLevel(l));
  return v;
}

struct LevelGuard {
  Aud::Simd::eLevel saved = Aud::Simd::activeLevel();
  ~LevelGuard() { Aud::Simd::setActiveLevel(saved); }
};

// Everything a filter holds, as bits, so that two filters compare equal only
// when they would behave identically from here on.
struct StateBits {
  bool active;
  uint32_t coefficients[5], history[4], frequency, samplingRate, shapeValue;
  uint64_t raw[6], gain;
  int32_t type, shapeType;
  bool operator==(const StateBits&) const = default;
};

inline StateBits stateOf(Biquad& b) {
  static_assert(sizeof(BiquadAccess::History) == 16);
  StateBits s{};
  s.active = b.getActive();
  std::memcpy(s.coefficients, BiquadAccess::coefficients(b), sizeof(s.coefficients));
  std::memcpy(s.raw, BiquadAccess::rawCoefficients(b), sizeof(s.raw));
  std::memcpy(s.history, &BiquadAccess::history(b), sizeof(s.history));
  s.type = b.getFilterType();
  s.frequency = bitsOf(b.getFrequency());
  s.samplingRate = bitsOf(b.getSamplingRate());
  s.shapeType = b.getShapeDescriptor().getType();
  s.shapeValue = bitsOf(b.getShapeDescriptor().getValue());
  s.gain = std::bit_cast<uint64_t>(b.getGain());
  return s;
}

inline Biquad::eFilterType typeAt(int i) { return static_cast<Biquad::eFilterType>(i); }

// A valid, stable design of the given type with random parameters.
inline void configureRandomly(Biquad& b, Biquad::eFilterType type, std::mt19937& rng) {
  std::uniform_real_distribution<float> logFreq(3.0f, 9.9f);  // 20 Hz .. 20 kHz
  std::uniform_real_distribution<float> unit(0.0f, 1.0f);
  const float rate = std::array{44100.0f, 48000.0f, 96000.0f}[rng() % 3], frequency = std::exp(logFreq(rng));
  const double gain = double(unit(rng)) * 30.0 - 15.0;
  Shape shape;
  if (type == Biquad::LowShelf || type == Biquad::HighShelf)
    rng() % 2 ? shape.setAsQ(0.3f + 2.0f * unit(rng)) : shape.setAsS(0.2f + 0.8f * unit(rng));
  else
    rng() % 2 ? shape.setAsQ(0.3f + 6.0f * unit(rng)) : shape.setAsBandwidth(0.1f + 2.5f * unit(rng));
  b.configure(type, frequency, rate, shape, gain);
}

// Input salted with the values that break careless kernels.
enum class Salt { kClean, kDenormal, kNaN, kInfinity, kNegativeZero, kLoud };
inline constexpr Salt kSalts[] = {Salt::kClean,    Salt::kDenormal,     Salt::kNaN,
                                  Salt::kInfinity, Salt::kNegativeZero, Salt::kLoud};

inline std::vector<float> signal(unsigned count, Salt salt, std::mt19937& rng) {
  std::uniform_real_distribution<float> d(-1.0f, 1.0f);
  std::vector<float> v(count);
  for (float& x : v) x = d(rng);
  if (count == 0) return v;
  const unsigned at = unsigned(rng() % count);
  // NaNs: quiet ones of both signs with payloads and a signalling one; where
  // two meet, the result's bits depend on the operand order.
  if (salt == Salt::kNaN) {
    v[at] = floatOf(0x7FC01234u);
    if (count > 3) v[(at + count / 2) % count] = floatOf(0xFFC00000u);
    if (count > 5) v[(at + count / 3) % count] = floatOf(0x7F800001u);
  }
  if (salt == Salt::kInfinity) v[at] = (rng() % 2) ? INFINITY : -INFINITY;
  for (unsigned i = 0; salt == Salt::kNegativeZero && i < count; i += 2) v[i] = -0.0f;
  // Every sample denormal (results too), or loud enough to overflow inside.
  if (salt == Salt::kDenormal || salt == Salt::kLoud)
    for (float& x : v) x *= salt == Salt::kDenormal ? 1e-39f : 3e38f;
  return v;
}

// memcmp of the two blocks; on a difference, where and the two bit patterns.
inline testing::AssertionResult sameBits(const std::vector<float>& got, const std::vector<float>& want) {
  if (got.size() != want.size()) return testing::AssertionFailure() << "sizes differ";
  size_t i = 0;
  while (i < got.size() && bitsOf(got[i]) == bitsOf(want[i])) ++i;
  if (i == got.size()) return testing::AssertionSuccess();
  return testing::AssertionFailure() << "sample " << i << " of " << got.size() << ": got " << std::hex
                                     << bitsOf(got[i]) << ", want " << bitsOf(want[i]);
}

}  // namespace dsp_test
