#include "tonebits/foundation/Aud__SamplePosition.h"

#include <cmath>
#include <limits>

#include "tonebits/foundation/Aud__SaturatingCast.h"

namespace Aud {

namespace {

// Twice the units of a sample, less one unit, so that a rest just below one
// sample scales to just below 2 * kOne and halving rounds it to kOne at most.
constexpr double kTwiceOne = 2147483646.0;

int64_t saturatingAdd(int64_t a, int64_t b) noexcept {
  int64_t sum;
  if (__builtin_add_overflow(a, b, &sum))
    return b < 0 ? std::numeric_limits<int64_t>::min() : std::numeric_limits<int64_t>::max();
  return sum;
}

}  // namespace

SubSamplePos subSamplePosFromCount(double x) noexcept {
  int64_t whole;
  int64_t fraction;
  if (x < 0) {
    const double w = std::floor(-x);
    whole = saturatingCast<int64_t>(-w);
    // The rest is rounded by magnitude and then negated. Halving the negative
    // value instead (floor of half) would make every even magnitude, exact
    // whole samples included, one unit too large: -2.0 would read as
    // -3 + (kOne - 1) / kOne, a whole sample below floor(-2.0).
    const int64_t t = saturatingCast<int32_t>((w + x) * -kTwiceOne);
    fraction = -((1 + t) >> 1);
  } else {
    // NaN takes this branch: every conversion of it gives 0.
    const double w = std::floor(x);
    whole = saturatingCast<int64_t>(w);
    const int64_t t = saturatingCast<int32_t>((x - w) * -kTwiceOne);
    fraction = (1 - t) >> 1;
  }
  const int64_t q = fraction / SubSamplePos::kOne;
  int64_t r = fraction - q * SubSamplePos::kOne;
  whole = saturatingAdd(whole, q);
  if (r < 0) {
    whole = saturatingAdd(whole, -1);
    r += SubSamplePos::kOne;
  }
  return SubSamplePos{whole, static_cast<int32_t>(r)};
}

long long stripTimeToSamplePos(SampleRate rate, eFactor f1, eFactor f2, double editTime,
                               Kv::OutputGearing const& gearing) {
  const double clock = mPosn_Xlate_CelToClock(editTime, gearing);
  const double position =
      (SampleRate::calcFactor(f1) * SampleRate::calcFactor(f2)) * (clock * rate.calcCombinedSampleRate());
  return saturatingCast<long long>(position);
}

SubSamplePos stripTimeToSubSamplePos(SampleRate rate, eFactor f1, eFactor f2, double editTime,
                                     Kv::OutputGearing const& gearing) {
  const double clock = mPosn_Xlate_CelToClock(editTime, gearing);
  const double seconds = clock * (SampleRate::calcFactor(f1) * SampleRate::calcFactor(f2));
  return subSamplePosFromCount(rate.calcCombinedSampleRate() * seconds);
}

}  // namespace Aud
