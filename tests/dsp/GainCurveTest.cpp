#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <limits>

#include "tonebits/dsp/Aud__GainCurve.h"

namespace {

using namespace Aud::GainCurve;
namespace Log1 = MixerStyleLog1_Private;
namespace Power1 = ConstantPower1_Private;

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

struct TableCase {
  const char* name;
  const Log1::Node* rows;  // both node types share one layout
  unsigned count, expectedCount;
  double step;
  bool keyIsU;
  double (*law)(double);
};

static_assert(sizeof(Log1::Node) == 16 && sizeof(Power1::Node) == 16);
const Log1::Node* asLog1(const Power1::Node* rows) { return reinterpret_cast<const Log1::Node*>(rows); }

const TableCase kTables[] = {
    {"law 2 U to magnitude", Log1::UVal2Mag_CurveNodes, std::size(Log1::UVal2Mag_CurveNodes), 1502, 0.001,
     true, log1Magnitude},
    {"law 2 magnitude to U", Log1::Mag2UVal_CurveNodes, std::size(Log1::Mag2UVal_CurveNodes), 903, 0.005,
     false, log1UValue},
    {"law 3 U to magnitude", asLog1(Power1::UVal2Mag_CurveNodes), std::size(Power1::UVal2Mag_CurveNodes), 101,
     0.01, true, power1Magnitude},
    {"law 3 magnitude to U", asLog1(Power1::Mag2UVal_CurveNodes), std::size(Power1::Mag2UVal_CurveNodes), 101,
     0.01, false, power1UValue},
};

bool within(double stored, double exact, double relative) {
  return exact == 0 ? stored == 0 : std::fabs(stored - exact) <= relative * std::fabs(exact);
}

TEST(GainCurveTables, EveryRowAgreesWithItsLaw) {
  for (const TableCase& t : kTables) {
    SCOPED_TRACE(t.name);
    ASSERT_EQ(t.count, t.expectedCount);
    for (unsigned i = 0; i < t.count; ++i) {
      const Log1::Node& row = t.rows[i];
      const float key = t.keyIsU ? row.uValue : row.magnitude;
      const float value = t.keyIsU ? row.magnitude : row.uValue;
      const double exactKey = i * t.step;
      const double exactValue = t.law(exactKey);
      const double exactSlope = (t.law(exactKey + t.step) - exactValue) / t.step;
      ASSERT_EQ(key, static_cast<float>(exactKey)) << "row " << i;
      ASSERT_TRUE(within(value, exactValue, 1e-6)) << "row " << i << ": " << value << " vs " << exactValue;
      ASSERT_TRUE(within(row.slope, exactSlope, 1e-6))
          << "row " << i << ": " << row.slope << " vs " << exactSlope;
      ASSERT_EQ(row.reserved, 0.0f) << "row " << i;
    }
  }
}

TEST(GainCurveTables, TellingRows) {
  struct Row {
    const Log1::Node* table;
    unsigned row;
    float uValue, magnitude, slope;
  };
  const Log1::Node* p3u = asLog1(Power1::UVal2Mag_CurveNodes);
  const Log1::Node* p3m = asLog1(Power1::Mag2UVal_CurveNodes);
  const Row rows[] = {
      {Log1::UVal2Mag_CurveNodes, 0, 0.0f, 0.0f, 7.112135e-05f},
      {Log1::UVal2Mag_CurveNodes, 1, 0.001f, 7.112135e-08f, 1.882841e-05f},
      {Log1::UVal2Mag_CurveNodes, 500, 0.5f, 0.1126482f, 0.6458271f},
      {Log1::UVal2Mag_CurveNodes, 1000, 1.0f, 1.0f, 2.766923f},
      {Log1::UVal2Mag_CurveNodes, 1500, 1.5f, 4.50657f, 14.39075f},
      {Log1::UVal2Mag_CurveNodes, 1501, 1.501f, 4.520961f, 14.43671f},
      {Log1::Mag2UVal_CurveNodes, 0, 0.0f, 0.0f, 23.866f},
      {Log1::Mag2UVal_CurveNodes, 1, 0.11933f, 0.005f, 6.689555f},
      {Log1::Mag2UVal_CurveNodes, 100, 0.8021483f, 0.5f, 0.5281679f},
      {Log1::Mag2UVal_CurveNodes, 200, 1.0f, 1.0f, 0.3610103f},
      {Log1::Mag2UVal_CurveNodes, 902, 1.500239f, 4.51f, 0.06950851f},
      {p3u, 0, 0.0f, 0.0f, 1.570732f},
      {p3u, 50, 0.5f, 0.7071068f, 1.101952f},
      {p3u, 99, 0.99f, 0.9998766f, 0.01233675f},
      {p3u, 100, 1.0f, 1.0f, 0.0f},
      {p3m, 0, 0.0f, 0.0f, 0.6366304f},
      {p3m, 50, 0.3333333f, 0.5f, 0.7375886f},
      {p3m, 99, 0.9098932f, 0.99f, 9.010683f},
      {p3m, 100, 1.0f, 1.0f, 0.0f},
  };
  for (const Row& r : rows) {
    SCOPED_TRACE(r.row);
    EXPECT_EQ(r.table[r.row].uValue, r.uValue);
    EXPECT_EQ(r.table[r.row].magnitude, r.magnitude);
    EXPECT_EQ(r.table[r.row].slope, r.slope);
  }
}

TEST(GainCurve, TypesAndRanges) {
  struct Row {
    eCurveType type, expected;
    float minU, maxU, minM, maxM;
  };
  const Row rows[] = {
      {Curve<1>::getCurveType(), Linear, Curve<1>::minimumUValue(), Curve<1>::maximumUValue(),
       Curve<1>::minimumMagnitude(), Curve<1>::maximumMagnitude()},
      {Curve<2>::getCurveType(), MixerStyleLog1, Curve<2>::minimumUValue(), Curve<2>::maximumUValue(),
       Curve<2>::minimumMagnitude(), Curve<2>::maximumMagnitude()},
      {Curve<3>::getCurveType(), ConstantPower1, Curve<3>::minimumUValue(), Curve<3>::maximumUValue(),
       Curve<3>::minimumMagnitude(), Curve<3>::maximumMagnitude()},
  };
  const float expected[][4] = {{0, 1.5f, 0, 1.5f}, {0, 1.5f, 0, 4.5099f}, {0, 1.0f, 0, 1.0f}};
  for (int i = 0; i < 3; ++i) {
    EXPECT_EQ(rows[i].type, rows[i].expected);
    EXPECT_EQ(rows[i].minU, expected[i][0]);
    EXPECT_EQ(rows[i].maxU, expected[i][1]);
    EXPECT_EQ(rows[i].minM, expected[i][2]);
    EXPECT_EQ(rows[i].maxM, expected[i][3]);
  }
  static_assert(std::is_same_v<Curve<2>, Curve<MixerStyleLog1>>);
}

using MapFn = float (*)(float) noexcept;

TEST(GainCurve, ValuesAtTheEdges) {
  struct Row {
    const char* what;
    MapFn map;
    float in, out;
    bool exact;
  };
  const Row rows[] = {
      {"2 M->U 1.0", Curve<2>::mapMagnitudeToUValue, 1.0f, 1.0f, true},
      {"3 M->U 1.0", Curve<3>::mapMagnitudeToUValue, 1.0f, 1.0f, true},
      {"2 U->M 1.0 (row 999)", Curve<2>::mapUValueToMagnitude, 1.0f, 1.0f, true},
      {"3 U->M 1.0 (row 100)", Curve<3>::mapUValueToMagnitude, 1.0f, 1.0f, true},
      {"2 U->M 0", Curve<2>::mapUValueToMagnitude, 0.0f, 0.0f, true},
      {"2 U->M 0.0005", Curve<2>::mapUValueToMagnitude, 0.0005f, 3.556068e-08f, false},
      {"2 U->M 0.5", Curve<2>::mapUValueToMagnitude, 0.5f, 0.1126481f, false},
      {"2 M->U 0.5", Curve<2>::mapMagnitudeToUValue, 0.5f, 0.8021483f, false},
      {"2 M->U 2.0", Curve<2>::mapMagnitudeToUValue, 2.0f, 1.245188f, false},
      {"2 M->U max", Curve<2>::mapMagnitudeToUValue, 4.5099f, 1.500232f, false},
      {"3 U->M 0.5", Curve<3>::mapUValueToMagnitude, 0.5f, 0.7071068f, false},
      {"3 M->U 0.5", Curve<3>::mapMagnitudeToUValue, 0.5f, 0.3333333f, false},
      {"2 M->U 0", Curve<2>::mapMagnitudeToUValue, 0.0f, 0.0f, true},
      {"3 U->M 0", Curve<3>::mapUValueToMagnitude, 0.0f, 0.0f, true},
      {"3 M->U 0", Curve<3>::mapMagnitudeToUValue, 0.0f, 0.0f, true},
  };
  for (const Row& r : rows) {
    SCOPED_TRACE(r.what);
    const float got = r.map(r.in);
    if (r.exact) {
      EXPECT_EQ(got, r.out);
    } else {
      // The expected values are printed to seven digits.
      EXPECT_NEAR(got, r.out, 6e-7 * r.out);
    }
  }
  // 0.0005 is halfway between rows 0 and 1 in linear magnitude.
  EXPECT_FLOAT_EQ(Curve<2>::mapUValueToMagnitude(0.0005f), Log1::UVal2Mag_CurveNodes[1].magnitude / 2);
}

TEST(GainCurve, LinearIsTheIdentityEverywhere) {
  const float inputs[] = {0.0f,
                          -0.0f,
                          0.25f,
                          1.0f,
                          1.5f,
                          -3.0f,
                          7.0f,
                          std::numeric_limits<float>::infinity(),
                          std::numeric_limits<float>::denorm_min()};
  for (float x : inputs) {
    EXPECT_EQ(std::signbit(Curve<1>::mapUValueToMagnitude(x)), std::signbit(x));
    EXPECT_EQ(Curve<1>::mapUValueToMagnitude(x), x);
    EXPECT_EQ(Curve<1>::mapMagnitudeToUValue(x), x);
  }
  EXPECT_TRUE(std::isnan(Curve<1>::mapUValueToMagnitude(std::nanf(""))));
}

// Out-of-range inputs used to index outside the tables: they now read as the
// nearest end of the range, and a NaN comes back as it went in.
TEST(GainCurve, InputsOutsideTheRangeAreClamped) {
  const float inf = std::numeric_limits<float>::infinity();
  struct Row {
    const char* what;
    MapFn map;
    float lo, hi;
  };
  const Row rows[] = {
      {"2 U->M", Curve<2>::mapUValueToMagnitude, Curve<2>::minimumUValue(), Curve<2>::maximumUValue()},
      {"2 M->U", Curve<2>::mapMagnitudeToUValue, Curve<2>::minimumMagnitude(), Curve<2>::maximumMagnitude()},
      {"3 U->M", Curve<3>::mapUValueToMagnitude, Curve<3>::minimumUValue(), Curve<3>::maximumUValue()},
      {"3 M->U", Curve<3>::mapMagnitudeToUValue, Curve<3>::minimumMagnitude(), Curve<3>::maximumMagnitude()},
  };
  for (const Row& r : rows) {
    SCOPED_TRACE(r.what);
    const float atLo = r.map(r.lo), atHi = r.map(r.hi);
    for (float below : {-inf, -1e30f, -1.0f, -std::numeric_limits<float>::denorm_min(), -0.0f})
      EXPECT_EQ(r.map(below), atLo) << below;
    for (float above : {std::nextafter(r.hi, inf), r.hi + 0.25f, 10.0f, 1e30f, inf})
      EXPECT_EQ(r.map(above), atHi) << above;
    // Just below the top the lookup must still land inside the table.
    EXPECT_LE(r.map(std::nextafter(r.hi, 0.0f)), atHi);

    const float quiet = std::nanf("0x123");
    const float result = r.map(quiet);
    EXPECT_EQ(std::memcmp(&result, &quiet, sizeof quiet), 0);
    EXPECT_TRUE(std::isnan(r.map(-quiet)));
  }
}

// Sweeping each mapping over its whole range in small steps: never
// decreasing, and within interpolation error of the law.
TEST(GainCurve, MappingsFollowTheLaws) {
  struct Row {
    const char* what;
    MapFn map;
    double (*law)(double);
    float lo, hi;
    double floor;      // below this the check is skipped (dB laws near silence)
    double tolerance;  // absolute, in the result's unit
  };
  const Row rows[] = {
      {"2 U->M", Curve<2>::mapUValueToMagnitude, log1Magnitude, 0.0f, 1.5f, 0.0, 2e-3},
      {"2 M->U", Curve<2>::mapMagnitudeToUValue, log1UValue, 0.0f, 4.5099f, 0.01, 3e-3},
      {"3 U->M", Curve<3>::mapUValueToMagnitude, power1Magnitude, 0.0f, 1.0f, 0.0, 4e-5},
      {"3 M->U", Curve<3>::mapMagnitudeToUValue, power1UValue, 0.0f, 1.0f, 0.0, 2.5e-2},
  };
  for (const Row& r : rows) {
    SCOPED_TRACE(r.what);
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
}

TEST(GainCurve, RoundTripsHoldAboveTheQuietEnd) {
  // Law 2 in dB: above -30 dB (U 0.3) fader positions survive the trip to a
  // magnitude and back within half a step of the U table.
  double worstU = 0, worstM = 0;
  for (int j = 0; j <= 12000; ++j) {
    const float u = 0.3f + j * 1e-4f;
    worstU = std::max(
        worstU, double(std::fabs(Curve<2>::mapMagnitudeToUValue(Curve<2>::mapUValueToMagnitude(u)) - u)));
  }
  for (int j = 0; j <= 44000; ++j) {
    const float m = 0.1f + j * 1e-4f;
    worstM = std::max(
        worstM, double(std::fabs(Curve<2>::mapUValueToMagnitude(Curve<2>::mapMagnitudeToUValue(m)) - m) / m));
  }
  EXPECT_LE(worstU, 5e-4);
  EXPECT_LE(worstM, 1e-3);
  double worst3 = 0;
  for (int j = 0; j <= 9000; ++j) {
    const float u = j * 1e-4f;
    worst3 = std::max(
        worst3, double(std::fabs(Curve<3>::mapMagnitudeToUValue(Curve<3>::mapUValueToMagnitude(u)) - u)));
  }
  EXPECT_LE(worst3, 2e-3);
  // Every node key maps to its row's value.
  for (unsigned i = 1; i < 1500; i += 7) {
    const Log1::Node& row = Log1::UVal2Mag_CurveNodes[i];
    EXPECT_NEAR(Curve<2>::mapUValueToMagnitude(row.uValue), row.magnitude, 2e-6 * row.magnitude + 1e-12) << i;
  }
}

TEST(GainCurve, AssignmentAndCopyHoldNothing) {
  Curve<2> a, b;
  a = b;
  static_assert(std::is_empty_v<Curve<1>> && std::is_empty_v<Curve<2>> && std::is_empty_v<Curve<3>>);
  static_assert(std::is_nothrow_copy_assignable_v<Curve<3>>);
}

}  // namespace
