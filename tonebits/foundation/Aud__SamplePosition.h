// Edit time to audio sample positions.
//
// An edit time is turned into clock seconds by the host for an output
// gearing, scaled by two speed-change factors and by the rate's frequency in
// hertz, and then either truncated to a whole sample index or split into a
// whole sample and a fraction of one.
//
// Conversions to integers are total: a position beyond the 64-bit range gives
// the nearest bound and a NaN time (or rate) gives position 0, since a plain
// conversion of such a double would be undefined.
#pragma once

#include <cstdint>

#include "host/ProjectTime.h"
#include "tonebits/export.h"
#include "tonebits/foundation/Aud__SampleRate.h"

namespace Aud {

// A sample position with sub-sample precision: wholeSamples + fraction / kOne.
struct TONEBITS_API SubSamplePos {
  static constexpr int32_t kOne = 0x3FFFFFFF;  // 1073741823 units make one sample

  int64_t wholeSamples = 0;  // rounded toward minus infinity
  int32_t fraction = 0;      // 0 to kOne - 1

  friend constexpr bool operator==(const SubSamplePos&, const SubSamplePos&) noexcept = default;
};

// The sub-sample position of a sample count: whole = floor(count), and the
// rest rounded to the nearest 1/kOne of a sample (halves away from zero, by
// magnitude); a rest that rounds up to a whole sample carries into whole.
TONEBITS_API SubSamplePos subSamplePosFromCount(double sampleCount) noexcept;

// (calcFactor(f1) * calcFactor(f2)) * (clock * rate.calcCombinedSampleRate()),
// truncated toward zero. Throws as the rate does for srProject.
TONEBITS_API long long stripTimeToSamplePos(SampleRate rate, eFactor f1, eFactor f2, double editTime,
                                            Kv::OutputGearing const& gearing);

// subSamplePosFromCount(rate.calcCombinedSampleRate() * (clock * (calcFactor(f1) *
// calcFactor(f2)))). Throws as the rate does for srProject.
TONEBITS_API SubSamplePos stripTimeToSubSamplePos(SampleRate rate, eFactor f1, eFactor f2, double editTime,
                                                  Kv::OutputGearing const& gearing);

}  // namespace Aud
