#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <limits>
#include <random>

#include "tonebits/foundation/Aud__SamplePosition.h"
#include "tonebits/foundation/Aud__SaturatingCast.h"

namespace {

using namespace Aud;

constexpr int64_t kMax = std::numeric_limits<int64_t>::max();
constexpr int64_t kMin = std::numeric_limits<int64_t>::min();
constexpr int32_t kOne = SubSamplePos::kOne;

TEST(SaturatingCast, BoundsNaNAndTruncation) {
  EXPECT_EQ(saturatingCast<int64_t>(NAN), 0);
  EXPECT_EQ(saturatingCast<int64_t>(INFINITY), kMax);
  EXPECT_EQ(saturatingCast<int64_t>(-INFINITY), kMin);
  EXPECT_EQ(saturatingCast<int64_t>(9223372036854775808.0), kMax);                 // 2^63
  EXPECT_EQ(saturatingCast<int64_t>(9223372036854774784.0), 9223372036854774784);  // largest double below
  EXPECT_EQ(saturatingCast<int64_t>(-9223372036854775808.0), kMin);
  EXPECT_EQ(saturatingCast<int64_t>(-2.9), -2);
  EXPECT_EQ(saturatingCast<int32_t>(2147483647.9), 2147483647);
  EXPECT_EQ(saturatingCast<int32_t>(2147483648.0), 2147483647);
  EXPECT_EQ(saturatingCast<int32_t>(-2147483649.0), -2147483647 - 1);
  EXPECT_EQ(saturatingCast<uint32_t>(-1.0), 0u);
  EXPECT_EQ(saturatingCast<uint32_t>(4294967295.5), 4294967295u);
  EXPECT_EQ(saturatingCast<uint32_t>(1e20), 4294967295u);
}

TEST(SubSamplePosition, NegativeZeroAndFractionalCounts) {
  const struct {
    double count;
    int64_t whole;
    int32_t fraction;
  } rows[] = {{0.0, 0, 0},
              {-0.0, 0, 0},
              {2.25, 2, 268435456},
              {-2.25, -3, 805306367},  // -3 + 0.75
              {0.5, 0, 536870912},
              {-0.5, -1, 536870911},
              {2.0, 2, 0},
              {-2.0, -2, 0},  // whole samples stay whole on both sides of zero
              {-1.0, -1, 0},
              {-1e-12, 0, 0},  // rounds to zero, not to a unit below it
              {1e-12, 0, 0},
              {2.9999999999, 3, 0},  // a rest that rounds to one sample carries
              {-2.9999999999, -3, 0},
              {-2.0000000001, -2, 0},
              {1.0 / 1073741823.0, 0, 1},
              {-1.0 / 1073741823.0, -1, kOne - 1},
              {4611686018427387904.0, 4611686018427387904, 0},  // 2^62
              {-4611686018427387904.0, -4611686018427387904, 0}};
  for (const auto& row : rows) {
    SCOPED_TRACE(row.count);
    EXPECT_EQ(subSamplePosFromCount(row.count), (SubSamplePos{row.whole, row.fraction}));
  }
}

TEST(SubSamplePosition, NaNAndHugeCountsSaturate) {
  EXPECT_EQ(subSamplePosFromCount(NAN), (SubSamplePos{0, 0}));
  EXPECT_EQ(subSamplePosFromCount(-NAN), (SubSamplePos{0, 0}));
  EXPECT_EQ(subSamplePosFromCount(INFINITY), (SubSamplePos{kMax, 0}));
  EXPECT_EQ(subSamplePosFromCount(-INFINITY), (SubSamplePos{kMin, 0}));
  EXPECT_EQ(subSamplePosFromCount(1e300), (SubSamplePos{kMax, 0}));
  EXPECT_EQ(subSamplePosFromCount(-1e300), (SubSamplePos{kMin, 0}));
  EXPECT_EQ(subSamplePosFromCount(9223372036854775808.0), (SubSamplePos{kMax, 0}));
}

TEST(SubSamplePosition, NearestUnitAndMirrorImageOverRandomCounts) {
  std::mt19937_64 random(11);
  std::uniform_real_distribution<double> scale(-6.0, 6.0);
  for (int i = 0; i < 20000; ++i) {
    const double x = std::ldexp(double(random() >> 11) / 9007199254740992.0, int(scale(random) * 3.0));
    const SubSamplePos p = subSamplePosFromCount(x);
    ASSERT_GE(p.fraction, 0);
    ASSERT_LT(p.fraction, kOne);
    const double value = double(p.wholeSamples) + double(p.fraction) / kOne;
    ASSERT_NEAR(value, x, 0.5000001 / kOne + 1e-15 * std::fabs(x)) << x;
    // -x is the mirror image: same magnitude, whole and rest re-split.
    const SubSamplePos m = subSamplePosFromCount(-x);
    const SubSamplePos expected = p.fraction == 0 ? SubSamplePos{-p.wholeSamples, 0}
                                                  : SubSamplePos{-p.wholeSamples - 1, kOne - p.fraction};
    ASSERT_EQ(m, expected) << x;
  }
}

TEST(StripTime, WholeSamplePositionsTruncateTowardZero) {
  const Kv::OutputGearing plain;
  const Kv::OutputGearing geared{2.0, 0.5};  // clock = 2 * edit + 0.5
  const SampleRate r48(sr48000, fNone);
  const struct {
    SampleRate rate;
    eFactor f1, f2;
    double time;
    const Kv::OutputGearing& gearing;
    long long position;
  } rows[] = {
      {r48, fNone, fNone, 1.5, plain, 72000},
      {r48, fNone, fNone, -1.5, plain, -72000},
      {r48, fNone, fNone, -0.00001, plain, 0},  // -0.48 samples
      {r48, fNone, fNone, 1.5, geared, 168000},
      {r48, fx1_1001, fNone, 1.5, plain, 71928},  // 71928.07
      {r48, fx1_1001, fx1001, 1.5, plain, 72000},
      {SampleRate(sr44100, fx24_25), fx2, fNone, 1.0, plain, 84672},
      {SampleRate(sr44100, fNone), fx25_24, fNone, -1.0, plain, -45937},  // -45937.5
      {r48, fNone, fNone, NAN, plain, 0},
      {r48, fNone, fNone, 1e300, plain, kMax},
      {r48, fNone, fNone, -1e300, plain, kMin},
      {r48, fNone, fNone, INFINITY, plain, kMax},
      {SampleRate(), fNone, fNone, INFINITY, plain, 0}  // 0 Hz x infinity is NaN
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.time);
    EXPECT_EQ(stripTimeToSamplePos(row.rate, row.f1, row.f2, row.time, row.gearing), row.position);
  }
}

TEST(StripTime, SubSamplePositions) {
  const Kv::OutputGearing plain;
  const SampleRate r48(sr48000, fNone);
  EXPECT_EQ(stripTimeToSubSamplePos(r48, fNone, fNone, 0.5, plain), (SubSamplePos{24000, 0}));
  EXPECT_EQ(stripTimeToSubSamplePos(r48, fNone, fNone, -0.5, plain), (SubSamplePos{-24000, 0}));
  EXPECT_EQ(stripTimeToSubSamplePos(r48, fx2, fx1_2, 0.5, plain), (SubSamplePos{24000, 0}));
  // 0.25 / 48000 s past sample 12 of a 48 kHz stream: 12.25 samples (within rounding of the time).
  const SubSamplePos p = stripTimeToSubSamplePos(r48, fNone, fNone, 12.25 / 48000.0, plain);
  EXPECT_EQ(p.wholeSamples, 12);
  EXPECT_NEAR(p.fraction, kOne / 4, 2);
  const SubSamplePos q = stripTimeToSubSamplePos(SampleRate(sr32000, fNone), fx1_1001, fNone, 1.0, plain);
  EXPECT_EQ(q.wholeSamples, 31968);  // 31968.03
  EXPECT_NEAR(double(q.fraction) / kOne, 32000.0 / 1.001 - 31968.0, 1e-6);
  EXPECT_EQ(stripTimeToSubSamplePos(r48, fNone, fNone, NAN, plain), (SubSamplePos{0, 0}));
  EXPECT_EQ(stripTimeToSubSamplePos(r48, fNone, fNone, -1e300, plain), (SubSamplePos{kMin, 0}));
}

}  // namespace
