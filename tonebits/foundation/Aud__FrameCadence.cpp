#include "tonebits/foundation/Aud__FrameCadence.h"

#include <cstdint>

#include "host/Log.h"
#include "tonebits/foundation/Aud__SaturatingCast.h"

namespace Aud::Util {

namespace {

// A derived walk that has not come back to a clean cycle start by this many
// entries is closed at the end of the cycle it is in.
constexpr std::size_t kLongestWalk = 108000;

// 30/1.001 at 48 kHz: 8008 samples over 5 frames.
SampleCounts ntsc48k() { return {1602, 1601, 1602, 1601, 1602}; }

// 30/1.001 at 44.1 kHz: 147147 samples over 100 frames.
SampleCounts ntsc44k1() {
  SampleCounts counts(100);
  for (unsigned k = 1; k <= 100; ++k) {
    const bool longFrame = (k % 2 == 1) && k != 23 && k != 47 && k != 71;
    counts[k - 1] = longFrame ? 1472 : 1471;
  }
  return counts;
}

// 30/1.001 at 32 kHz: 16016 samples over 15 frames.
SampleCounts ntsc32k() {
  SampleCounts counts(15);
  for (unsigned k = 1; k <= 15; ++k) {
    const bool longFrame = (k % 2 == 1) || k == 4 || k == 8 || k == 12;
    counts[k - 1] = longFrame ? 1068 : 1067;
  }
  return counts;
}

SampleCounts baseCadence(unsigned int hertz, Kv::FrameRate frameRate) {
  const bool is48k = hertz == 48000;
  switch (frameRate) {
    case Kv::fr24: return {hertz / 24};
    case Kv::fr23_976: return is48k ? SampleCounts{2002} : SampleCounts{};
    case Kv::fr25: return {hertz / 25};
    case Kv::fr30: return {hertz / 30};
    case Kv::fr47_952: return is48k ? SampleCounts{1001} : SampleCounts{};
    case Kv::fr50: return {hertz / 50};
    case Kv::fr60: return {hertz / 60};
    case Kv::fr59_94: return is48k ? SampleCounts{800, 801, 801, 801, 801} : SampleCounts{};
    default:  // the 30/1.001 family, and numbers no frame rate has
      if (hertz == 48000) return ntsc48k();
      if (hertz == 44100) return ntsc44k1();
      if (hertz == 32000) return ntsc32k();
      return {};
  }
}

// Scales a base cadence by multiplier, carrying what each entry loses to
// truncation into the next.
SampleCounts walk(const SampleCounts& base, double multiplier) {
  SampleCounts result;
  if (base.empty()) return result;
  int64_t inputTotal = 0, outputTotal = 0;
  double carry = 0.0;
  const bool unstableCarry = multiplier > 2.0;
  for (std::size_t i = 0;; i = (i + 1 == base.size()) ? 0 : i + 1) {
    if (i == 0 && carry == 0.0 && outputTotal != 0) break;
    const unsigned int n = base[i];
    // The carry is in output samples but is added to the input count, so it
    // is scaled by the multiplier once more: each step maps carry c to about
    // c * (1 - multiplier), which stays bounded up to a multiplier of 2 and
    // grows without bound beyond it (96 kHz x 1.001 would give nonsense
    // counts within a few thousand frames). Above 2 the carry is therefore
    // added after scaling, which keeps it within one sample.
    const double scaled = unstableCarry ? double(n) * multiplier + carry : (double(n) + carry) * multiplier;
    unsigned int out = saturatingCast<unsigned int>(scaled);
    inputTotal += n;
    outputTotal += out;
    carry = double(inputTotal) * multiplier - double(outputTotal);
    if (result.size() >= kLongestWalk && i + 1 == base.size()) {
      ++out;
      ++outputTotal;
      carry = 0.0;
    }
    result.push_back(out);
  }
  return result;
}

}  // namespace

SampleCounts getSMPTE_FrameSequence(SampleRate const& rate, Kv::FrameRate frameRate) {
  if (frameRate == Kv::fr29_97 && rate == SampleRate(sr48000, fx1_1001)) return {1600};

  SampleRate working = rate;
  double scale = 1.0;
  switch (rate.baseSampleRate()) {
    case sr11025:
      working.baseSampleRate(sr44100);
      scale = 0.25;
      break;
    case sr22050:
      working.baseSampleRate(sr44100);
      scale = 0.5;
      break;
    case sr96000:
      working.baseSampleRate(sr48000);
      scale = 2.0;
      break;
    default: break;
  }
  const eBaseSampleRate base = working.baseSampleRate();
  if (base != sr32000 && base != sr44100 && base != sr48000) {
    vel_splat("Not implemented for this rate!");
    return {};
  }
  const SampleCounts cadence = baseCadence(SampleRate::calcBaseSampleRate(base), frameRate);
  if (working.factor() == fNone && scale == 1.0) return cadence;
  return walk(cadence, working.calcFactor() * scale);
}

SampleCounts getSMPTE_FieldSequence(SampleRate const& rate, Kv::FrameRate frameRate) {
  const SampleCounts frames = getSMPTE_FrameSequence(rate, frameRate);
  SampleCounts fields;
  fields.reserve(frames.size() * 2);
  for (const unsigned int n : frames) {
    fields.push_back(n / 2);
    fields.push_back(n - n / 2);
  }
  return fields;
}

}  // namespace Aud::Util
