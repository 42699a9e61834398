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
constexpr double kInf = std::numeric_limits<double>::infinity();

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
  // Negative counts are whole + rest (-2.25 is -3 + 0.75); whole samples stay
  // whole on both sides of zero; tiny rests round to zero, not to a unit
  // below it; a rest that rounds to one sample carries. NaN and counts beyond
  // the range saturate.
  const double unit = 1.0 / 1073741823.0, p62 = 0x1p62;
  const struct {
    double count, whole, fraction;
  } rows[] = {{2.25, 2, 268435456},  {-2.25, -3, 805306367}, {0.5, 0, 536870912},
              {-0.5, -1, 536870911}, {unit, 0, 1},           {-unit, -1, kOne - 1}};
  for (const auto& row : rows)
    EXPECT_EQ(subSamplePosFromCount(row.count), (SubSamplePos{int64_t(row.whole), int32_t(row.fraction)}))
        << row.count;
  // Each whole count also read negated.
  const std::pair<double, int64_t> whole[] = {
      {0.0, 0}, {2.0, 2}, {1.0, 1}, {1e-12, 0}, {2.9999999999, 3}, {2.0000000001, 2}, {p62, int64_t(p62)}};
  for (const auto& [count, samples] : whole) {
    EXPECT_EQ(subSamplePosFromCount(count), (SubSamplePos{samples, 0})) << count;
    EXPECT_EQ(subSamplePosFromCount(-count), (SubSamplePos{-samples, 0})) << -count;
  }
  for (double count : {NAN, -NAN}) EXPECT_EQ(subSamplePosFromCount(count), (SubSamplePos{0, 0}));
  for (double count : {kInf, 1e300, 0x1p63}) EXPECT_EQ(subSamplePosFromCount(count), (SubSamplePos{kMax, 0}));
  for (double count : {-kInf, -1e300}) EXPECT_EQ(subSamplePosFromCount(count), (SubSamplePos{kMin, 0}));
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

TEST(StripTime, PositionsTruncateTowardZeroAndSaturate) {
  const Kv::OutputGearing plain, geared{2.0, 0.5};  // geared: clock = 2 * edit + 0.5
  const SampleRate r48(sr48000, fNone);
  const std::pair<double, long long> times[] = {{1.5, 72000},  {-1.5, -72000}, {-0.00001, 0},   {NAN, 0},
                                                {1e300, kMax}, {-1e300, kMin}, {INFINITY, kMax}};
  for (const auto& [time, position] : times)
    EXPECT_EQ(stripTimeToSamplePos(r48, fNone, fNone, time, plain), position) << time;
  EXPECT_EQ(stripTimeToSamplePos(r48, fNone, fNone, 1.5, geared), 168000);
  EXPECT_EQ(stripTimeToSamplePos(r48, fx1_1001, fNone, 1.5, plain), 71928);  // 71928.07
  EXPECT_EQ(stripTimeToSamplePos(r48, fx1_1001, fx1001, 1.5, plain), 72000);
  EXPECT_EQ(stripTimeToSamplePos(SampleRate(sr44100, fx24_25), fx2, fNone, 1.0, plain), 84672);
  EXPECT_EQ(stripTimeToSamplePos(SampleRate(sr44100, fNone), fx25_24, fNone, -1.0, plain),
            -45937);                                                                // -45937.5
  EXPECT_EQ(stripTimeToSamplePos(SampleRate(), fNone, fNone, INFINITY, plain), 0);  // 0 Hz x infinity is NaN

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
