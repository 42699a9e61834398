#include <gtest/gtest.h>

#include <bit>
#include <cmath>
#include <cstdint>
#include <limits>
#include <type_traits>

#include "tonebits/dsp/Aud__GainCurve.h"

namespace {

using namespace Aud::GainCurve;
namespace Log1 = MixerStyleLog1_Private;
namespace Power1 = ConstantPower1_Private;
uint32_t bitsOf(float f) { return std::bit_cast<uint32_t>(f); }

// The laws in double precision, written from their definitions and not from
// the tables, so a wrong row cannot check itself.
struct Breakpoint {
  double u72, dB;
};
constexpr Breakpoint kLog1[] = {{0, -145}, {3, -60}, {11, -40}, {20, -30}, {49, -10},
                                {60, -5},  {72, 0},  {87, 5},   {100, 10}};
constexpr int kNumLog1 = sizeof(kLog1) / sizeof(kLog1[0]);

double log1Magnitude(double u) {
  if (u <= 0) return 0;
  const double k = u * 72;
  int j = 0;
  while (j < kNumLog1 - 2 && k > kLog1[j + 1].u72) ++j;  // past the last breakpoint the last segment goes on
  const Breakpoint a = kLog1[j], b = kLog1[j + 1];
  const double dB = a.dB + (k - a.u72) * (b.dB - a.dB) / (b.u72 - a.u72);
  return std::pow(10.0, dB / 20);
}
double log1UValue(double m) {
  if (m <= 0) return 0;
  const double dB = 20 * std::log10(m);
  int j = 0;
  while (j < kNumLog1 - 2 && dB > kLog1[j + 1].dB) ++j;
  const Breakpoint a = kLog1[j], b = kLog1[j + 1];
  return (a.u72 + (dB - a.dB) * (b.u72 - a.u72) / (b.dB - a.dB)) / 72;
}
// Law 3 is defined over 0 ... 1 and flat beyond, which gives its last rows a
// gradient of 0.
double power1Magnitude(double u) { return std::sin(std::min(u, 1.0) * M_PI / 2); }
double power1UValue(double m) { return 2 / M_PI * std::asin(std::min(m, 1.0)); }

bool within(double stored, double exact, double relative) {
  return exact == 0 ? stored == 0 : std::fabs(stored - exact) <= relative * std::fabs(exact);
}

// Row i holds the law at key i x step, its forward gradient over one step,
// and a zero reserved word.
template <class Node, size_t Count>
void checkTable(const Node (&rows)[Count], size_t expectedCount, double step, bool keyIsU,
                double (*law)(double)) {
  ASSERT_EQ(Count, expectedCount);
  for (unsigned i = 0; i < Count; ++i) {
    const Node& row = rows[i];
    const double exactKey = i * step, exactValue = law(exactKey);
    const double exactSlope = (law(exactKey + step) - exactValue) / step;
    const float value = keyIsU ? row.magnitude : row.uValue;
    ASSERT_EQ(keyIsU ? row.uValue : row.magnitude, static_cast<float>(exactKey)) << "row " << i;
    ASSERT_TRUE(within(value, exactValue, 1e-6) && within(row.slope, exactSlope, 1e-6) &&
                row.reserved == 0.0f)
        << "row " << i << ": " << value << " vs " << exactValue << ", " << row.slope << " vs " << exactSlope;
  }
}

TEST(GainCurveTables, EveryRowAgreesWithItsLaw) {
  checkTable(Log1::UVal2Mag_CurveNodes, 1502, 0.001, true, log1Magnitude);
  checkTable(Log1::Mag2UVal_CurveNodes, 903, 0.005, false, log1UValue);
  checkTable(Power1::UVal2Mag_CurveNodes, 101, 0.01, true, power1Magnitude);
  checkTable(Power1::Mag2UVal_CurveNodes, 101, 0.01, false, power1UValue);
}

TEST(GainCurveTables, TellingRows) {
  const auto expectRow = [](const auto& node, float u, float m, float slope) {
    EXPECT_TRUE(node.uValue == u && node.magnitude == m && node.slope == slope) << u << " " << m;
  };
  expectRow(Log1::UVal2Mag_CurveNodes[1], 0.001f, 7.112135e-08f, 1.882841e-05f);
  expectRow(Log1::UVal2Mag_CurveNodes[1501], 1.501f, 4.520961f, 14.43671f);
  expectRow(Log1::Mag2UVal_CurveNodes[0], 0.0f, 0.0f, 23.866f);
  expectRow(Log1::Mag2UVal_CurveNodes[902], 1.500239f, 4.51f, 0.06950851f);
  expectRow(Power1::UVal2Mag_CurveNodes[100], 1.0f, 1.0f, 0.0f);
  expectRow(Power1::Mag2UVal_CurveNodes[99], 0.9098932f, 0.99f, 9.010683f);
  expectRow(Power1::Mag2UVal_CurveNodes[100], 1.0f, 1.0f, 0.0f);
}

TEST(GainCurve, TypesRangesAndTheLinearIdentity) {
  EXPECT_EQ(Curve<1>::getCurveType(), Linear);
  EXPECT_EQ(Curve<2>::getCurveType(), MixerStyleLog1);
  EXPECT_EQ(Curve<3>::getCurveType(), ConstantPower1);
  static_assert(std::is_same_v<Curve<2>, Curve<MixerStyleLog1>>);
  EXPECT_EQ(Curve<2>::minimumUValue() + Curve<3>::minimumMagnitude(), 0.0f);
  EXPECT_EQ(Curve<1>::maximumUValue() + Curve<1>::maximumMagnitude(), 3.0f);
  EXPECT_EQ(Curve<2>::maximumUValue(), 1.5f);
  EXPECT_EQ(Curve<2>::maximumMagnitude(), 4.5099f);
  EXPECT_EQ(Curve<3>::maximumUValue() + Curve<3>::maximumMagnitude(), 2.0f);
  const float inf = std::numeric_limits<float>::infinity(), tiny = std::numeric_limits<float>::denorm_min();
  for (float x : {0.0f, -0.0f, 0.25f, 1.5f, -3.0f, 7.0f, inf, tiny, std::nanf("0x42")}) {
    EXPECT_EQ(bitsOf(Curve<1>::mapUValueToMagnitude(x)), bitsOf(x));
    EXPECT_EQ(bitsOf(Curve<1>::mapMagnitudeToUValue(x)), bitsOf(x));
  }
}

using MapFn = float (*)(float) noexcept;
struct Mapping {
  const char* what;
  MapFn map;
  double (*law)(double);
  float lo, hi;
  double floor;      // below this the law is not checked (dB laws near silence)
  double tolerance;  // absolute, in the result's unit
};
const Mapping kMappings[] = {
    {"2 U->M", Curve<2>::mapUValueToMagnitude, log1Magnitude, 0.0f, 1.5f, 0.0, 2e-3},
    {"2 M->U", Curve<2>::mapMagnitudeToUValue, log1UValue, 0.0f, 4.5099f, 0.01, 3e-3},
    {"3 U->M", Curve<3>::mapUValueToMagnitude, power1Magnitude, 0.0f, 1.0f, 0.0, 4e-5},
    {"3 M->U", Curve<3>::mapMagnitudeToUValue, power1UValue, 0.0f, 1.0f, 0.0, 2.5e-2},
};

// Sweeping each mapping over its whole range in small steps: never
// decreasing, within interpolation error of the law, exact at 0 and 1.
TEST(GainCurve, MappingsFollowTheLaws) {
  for (const Mapping& r : kMappings) {
    SCOPED_TRACE(r.what);
    EXPECT_EQ(r.map(0.0f), 0.0f);
    EXPECT_EQ(r.map(1.0f), 1.0f);
    float previous = r.map(r.lo);
    double worst = 0;
    const int steps = 100000;
    for (int j = 0; j <= steps; ++j) {
      const float x = static_cast<float>(r.lo + (double(r.hi) - r.lo) * j / steps);
      const float y = r.map(x);
      ASSERT_GE(y, previous) << x;
      previous = y;
      if (x >= r.floor) worst = std::max(worst, std::fabs(y - r.law(x)));
    }
    EXPECT_LE(worst, r.tolerance);
  }
  // Between nodes and in the last interval; printed to seven digits.
  const struct {
    MapFn map;
    float in, out;
  } rows[] = {
      {Curve<2>::mapUValueToMagnitude, 0.0005f, 3.556068e-08f},
      {Curve<2>::mapMagnitudeToUValue, 2.0f, 1.245188f},
      {Curve<2>::mapMagnitudeToUValue, 4.5099f, 1.500232f},
      {Curve<3>::mapUValueToMagnitude, 0.5f, 0.7071068f},
      {Curve<3>::mapMagnitudeToUValue, 0.5f, 0.3333333f},
  };
  for (const auto& r : rows) EXPECT_NEAR(r.map(r.in), r.out, 6e-7 * r.out) << r.in;
}

// Out-of-range inputs used to index outside the tables: they now read as the
// nearest end of the range, and a NaN comes back as it went in.
TEST(GainCurve, InputsOutsideTheRangeAreClamped) {
  const float inf = std::numeric_limits<float>::infinity();
  for (const Mapping& r : kMappings) {
    SCOPED_TRACE(r.what);
    const float atLo = r.map(r.lo), atHi = r.map(r.hi);
    for (float below : {-inf, -1e30f, -1.0f, -std::numeric_limits<float>::denorm_min(), -0.0f})
      EXPECT_EQ(r.map(below), atLo) << below;
    for (float above : {std::nextafter(r.hi, inf), r.hi + 0.25f, 10.0f, 1e30f, inf})
      EXPECT_EQ(r.map(above), atHi) << above;
    // Just below the top the lookup must still land inside the table.
    EXPECT_LE(r.map(std::nextafter(r.hi, 0.0f)), atHi);
    const float quiet = std::nanf("0x123");
    EXPECT_EQ(bitsOf(r.map(quiet)), bitsOf(quiet));
    EXPECT_TRUE(std::isnan(r.map(-quiet)));
  }
}

}  // namespace
