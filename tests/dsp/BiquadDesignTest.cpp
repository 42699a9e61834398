#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <functional>
#include <random>

#include "host/Exception.h"
#include "tests/dsp/DspSupport.h"
#include "tonebits/dsp/Aud__MultiBandBiquad.h"

namespace {

using namespace dsp_test;
using Aud::Filter::MultiBandBiquad;

// The cookbook designs as usually published (shelves through alpha, the
// slope through (A + 1/A)(1/S - 1) + 2), written apart from the library:
// b0, b1, b2, a0, a1, a2.
std::array<double, 6> cookbook(Biquad::eFilterType type, double f0, double fs, Shape shape, double dBgain) {
  const double A = std::pow(10.0, dBgain / 40.0), w0 = 2.0 * M_PI * f0 / fs;
  const double s = std::sin(w0), c = std::cos(w0), v = shape.getValue();
  double alpha = 0.0;
  switch (shape.getType()) {
    case Shape::Q: alpha = s / (2.0 * v); break;
    case Shape::Bandwidth: alpha = s * std::sinh(std::log(2.0) / 2.0 * v * w0 / s); break;
    case Shape::S: alpha = s / 2.0 * std::sqrt((A + 1.0 / A) * (1.0 / v - 1.0) + 2.0); break;
    default: break;
  }
  const double r = 2.0 * std::sqrt(A) * alpha;
  switch (type) {
    case Biquad::LowPass: return {(1 - c) / 2, 1 - c, (1 - c) / 2, 1 + alpha, -2 * c, 1 - alpha};
    case Biquad::HighPass: return {(1 + c) / 2, -(1 + c), (1 + c) / 2, 1 + alpha, -2 * c, 1 - alpha};
    case Biquad::BandPassSkirt: return {s / 2, 0, -s / 2, 1 + alpha, -2 * c, 1 - alpha};
    case Biquad::BandPassPeak: return {alpha, 0, -alpha, 1 + alpha, -2 * c, 1 - alpha};
    case Biquad::Notch: return {1, -2 * c, 1, 1 + alpha, -2 * c, 1 - alpha};
    case Biquad::AllPass: return {1 - alpha, -2 * c, 1 + alpha, 1 + alpha, -2 * c, 1 - alpha};
    case Biquad::PeakingEQ:
      return {1 + alpha * A, -2 * c, 1 - alpha * A, 1 + alpha / A, -2 * c, 1 - alpha / A};
    case Biquad::LowShelf:
      return {A * ((A + 1) - (A - 1) * c + r), 2 * A * ((A - 1) - (A + 1) * c),
              A * ((A + 1) - (A - 1) * c - r), (A + 1) + (A - 1) * c + r,
              -2 * ((A - 1) + (A + 1) * c),    (A + 1) + (A - 1) * c - r};
    case Biquad::HighShelf:
      return {A * ((A + 1) + (A - 1) * c + r), -2 * A * ((A - 1) + (A + 1) * c),
              A * ((A + 1) + (A - 1) * c - r), (A + 1) - (A - 1) * c + r,
              2 * ((A - 1) - (A + 1) * c),     (A + 1) - (A - 1) * c - r};
    default: return {};
  }
}

TEST(BiquadDesign, EveryTypeAndShapeMatchesTheCookbook) {
  for (int t = 1; t <= 9; ++t) {
    const bool shelf = t >= 8;
    const Shape shapes[] = {shelf ? Shape(Shape::S, 0.5f) : Shape(Shape::Bandwidth, 0.7f),
                            shelf ? Shape(Shape::S, 1.0f) : Shape(Shape::Bandwidth, 2.0f),
                            Shape(Shape::Q, 0.7071f), Shape(Shape::Q, 4.0f)};
    for (float f : {30.0f, 1000.0f, 15000.0f})
      for (float fs : {44100.0f, 96000.0f})
        for (const Shape& shape : shapes)
          for (double g : {-12.0, 0.0, 6.5}) {
            SCOPED_TRACE(testing::Message() << "type " << t << " f " << f << " fs " << fs << " shape "
                                            << shape.getType() << "/" << shape.getValue() << " gain " << g);
            Biquad b;
            b.configure(typeAt(t), f, fs, shape, g);
            const auto d = cookbook(typeAt(t), f, fs, shape, g);
            // The raw set keeps the unnormalised values, a's first; the
            // stored floats are b0 b1 b2 a1 a2 over a0, each rounded once.
            const double* raw = BiquadAccess::rawCoefficients(b);
            const float* c = BiquadAccess::coefficients(b);
            const double want[6] = {d[3], d[4], d[5], d[0], d[1], d[2]};
            const int ratio[5] = {3, 4, 5, 1, 2};
            for (int i = 0; i < 6; ++i) EXPECT_NEAR(raw[i], want[i], 1e-12 * (1.0 + std::abs(want[i]))) << i;
            for (int i = 0; i < 5; ++i) {
              const double exact = want[ratio[i]] / want[0];
              EXPECT_EQ(c[i], float(raw[ratio[i]] / raw[0])) << i;
              EXPECT_NEAR(c[i], exact, std::abs(exact) * 2.5e-7 + 1e-30) << i;
            }
          }
  }
  // The published low-pass example.
  Biquad b(Biquad::LowPass, 1000.0f, 48000.0f, Shape(Shape::Q, 0.7071f), 0.0, true);
  const float want[5] = {0.003916123f, 0.007832247f, 0.003916123f, -1.815340f, 0.8310041f};
  for (int i = 0; i < 5; ++i)
    EXPECT_NEAR(BiquadAccess::coefficients(b)[i], want[i], std::abs(want[i]) * 2e-6);
}

// ---- Throws: message, source, line, and nothing changed ----

void expectRuntimeError(const std::function<void()>& call, const char* message, const char* file, int line) {
  try {
    call();
    ADD_FAILURE() << "no throw";
  } catch (const Kv::Exception::RuntimeError& e) {
    EXPECT_STREQ(e.getMessage(), message);
    EXPECT_STREQ(e.getFile(), file);
    EXPECT_EQ(e.getLine(), line);
    EXPECT_STREQ(e.getTypeName(), "RuntimeError");
  }
}

TEST(BiquadThrows, ConfigureWithAMismatchedShapeOrAnUnknownType) {
  const char *mismatch = "ShapeDescriptor/FilterType mismatch", *unknown = "Unknown filter type";
  const struct {
    int type;
    Shape shape;
    const char* message;
    int line;
  } cases[] = {
      {8, Shape(Shape::Bandwidth, 1.0f), mismatch, 133},  // low shelf with a bandwidth
      {1, Shape(Shape::S, 1.0f), mismatch, 116},          // low-pass with a slope
      {6, Shape(Shape::S, 0.5f), mismatch, 116},
      // Outside the enumeration, the shelf's shape test comes first.
      {10, Shape(Shape::Bandwidth, 1.0f), mismatch, 188},
      {0, Shape(), mismatch, 188},
      {0, Shape(Shape::Q, 1.0f), unknown, 267},
      {10, Shape(Shape::Q, 1.0f), unknown, 267},
  };
  std::mt19937 rng(7);
  for (const auto& c : cases)
    for (bool configured : {false, true}) {
      SCOPED_TRACE(testing::Message()
                   << "type " << c.type << " shape " << c.shape.getType() << " " << configured);
      Biquad b;
      if (configured) {
        configureRandomly(b, Biquad::PeakingEQ, rng);
        b.setActive(true);
        for (int i = 0; i < 5; ++i) b.processSample(float(i) - 2.0f);
      }
      const StateBits before = stateOf(b);
      expectRuntimeError([&] { b.configure(typeAt(c.type), 500.0f, 48000.0f, c.shape, 3.0); }, c.message,
                         "Aud__Biquad", c.line);
      EXPECT_TRUE(stateOf(b) == before);
    }
}

TEST(BiquadThrows, SwitchingOnUnconfiguredAndBandOutOfRange) {
  Biquad b;
  b.setActive(false);                                        // always allowed
  EXPECT_EQ(b.getResponseMagnitudeAtFrequency(0.3f), 1.0f);  // inactive: flat, configured or not
  expectRuntimeError([&] { b.setActive(true); }, "Filter is not configured!", "Aud__Biquad", 315);
  EXPECT_FALSE(b.getActive());
  // The six-argument constructor switches on through the same check.
  expectRuntimeError([] { Biquad(Biquad::NoFilter, 1000.0f, 48000.0f, Shape(Shape::Q, 1.0f), 0.0, true); },
                     "Unknown filter type", "Aud__Biquad", 267);

  MultiBandBiquad<3> chain;
  const MultiBandBiquad<3>& readOnly = chain;
  const char* band = "BandNumber out of range!";
  expectRuntimeError([&] { chain.getBand(3); }, band, "tonebits/Aud__Biquad", 206);
  expectRuntimeError([&] { readOnly.getBand(3); }, band, "tonebits/Aud__Biquad", 214);
  expectRuntimeError([&] { chain.getBand(0xFFFFFFFFu); }, band, "tonebits/Aud__Biquad", 206);
}

// ---- Sample by sample ----

TEST(BiquadProcess, DirectFormOneInSinglePrecision) {
  std::mt19937 rng(11);
  for (int t = 1; t <= 9; ++t) {
    Biquad b;
    configureRandomly(b, typeAt(t), rng);
    b.setActive(true);
    const float* c = BiquadAccess::coefficients(b);
    float x1 = 0, x2 = 0, y1 = 0, y2 = 0;
    for (float x : signal(64, Salt::kClean, rng)) {
      const float y = (((c[0] * x + c[1] * x1) + c[2] * x2) - c[3] * y1) - c[4] * y2;
      ASSERT_EQ(bitsOf(b.processSample(x)), bitsOf(y)) << t;
      ASSERT_EQ(bitsOf(b.getLastProcessSampleResult()), bitsOf(y));
      x2 = x1, x1 = x, y2 = y1, y1 = y;
    }
  }
}

TEST(BiquadProcess, InactivePassesAndRecordsOnlyTheLastInput) {
  Biquad b(Biquad::HighPass, 200.0f, 48000.0f, Shape(Shape::Q, 0.7f), 0.0, true);
  b.processSample(0.5f);
  b.processSample(-0.25f);
  const auto before = BiquadAccess::history(b);
  b.setActive(false);
  EXPECT_EQ(bitsOf(b.processSample(-0.0f)), bitsOf(-0.0f));
  EXPECT_EQ(b.processSample(0.75f), 0.75f);
  const auto after = BiquadAccess::history(b);
  EXPECT_EQ(after.y1, 0.75f);
  EXPECT_TRUE(after.x1 == before.x1 && after.x2 == before.x2 && after.y2 == before.y2);
  b.reset();
  const auto c = BiquadAccess::history(b);
  EXPECT_TRUE(c.x1 == 0 && c.x2 == 0 && c.y1 == 0 && c.y2 == 0);
  // Reconfiguring keeps the history and the switch.
  b.processSample(0.5f);
  b.setActive(true);
  b.configure(Biquad::LowPass, 300.0f, 48000.0f, Shape(Shape::Q, 0.7f), 0.0);
  EXPECT_TRUE(b.getActive());
  EXPECT_EQ(b.getLastProcessSampleResult(), 0.5f);
}

// ---- Response ----

TEST(BiquadResponse, KnownValuesAtDcCentreAndNyquist) {
  const float fs = 48000.0f, f0 = 3000.0f, centre = f0 / (fs / 2);
  const double g = 9.0, linear = std::pow(10.0, g / 20.0);
  const struct {
    Biquad::eFilterType type;
    Shape shape;
    double dc, atCentre, nyquist;
  } rows[] = {
      {Biquad::LowPass, Shape(Shape::Q, 0.7071f), 1.0, 0.7071, 0.0},
      {Biquad::HighPass, Shape(Shape::Q, 0.7071f), 0.0, 0.7071, 1.0},
      {Biquad::BandPassSkirt, Shape(Shape::Q, 3.0f), 0.0, 3.0, 0.0},
      {Biquad::BandPassPeak, Shape(Shape::Q, 3.0f), 0.0, 1.0, 0.0},
      {Biquad::Notch, Shape(Shape::Bandwidth, 1.0f), 1.0, 0.0, 1.0},
      {Biquad::AllPass, Shape(Shape::Q, 2.0f), 1.0, 1.0, 1.0},
      {Biquad::PeakingEQ, Shape(Shape::Q, 1.0f), 1.0, linear, 1.0},
      {Biquad::LowShelf, Shape(Shape::S, 1.0f), linear, std::sqrt(linear), 1.0},
      {Biquad::HighShelf, Shape(Shape::S, 1.0f), 1.0, std::sqrt(linear), linear},
  };
  for (const auto& r : rows) {
    SCOPED_TRACE(r.type);
    Biquad b(r.type, f0, fs, r.shape, g, true);
    EXPECT_NEAR(b.getResponseMagnitudeAtFrequency(0.0f), r.dc, 1e-5 * (1 + r.dc));
    EXPECT_NEAR(b.getResponseMagnitudeAtFrequency(centre), r.atCentre, 2e-4 * (1 + r.atCentre));
    EXPECT_NEAR(b.getResponseMagnitudeAtFrequency(1.0f), r.nyquist, 1e-5 * (1 + r.nyquist));
  }
  Biquad peak(Biquad::PeakingEQ, 1000.0f, 48000.0f, Shape(Shape::Q, 1.0f), 6.0, true);
  EXPECT_NEAR(peak.getResponseMagnitudeAtFrequency(1000.0f / 24000.0f), 1.995262f, 2e-6);
}

TEST(MultiBand, ResponseIsTheProductOfTheActiveBands) {
  MultiBandBiquad<4> chain;
  for (float f : {0.0f, 0.25f, 1.0f}) EXPECT_EQ(chain.getResponseMagnitudeAtFrequency(f), 1.0f);
  EXPECT_EQ(chain.processSample(3e38f), 3e38f);
  // Opposite peaks cancel at their centre.
  for (unsigned k : {1u, 3u}) {
    chain.getBand(k).configure(Biquad::PeakingEQ, 2000.0f, 48000.0f, Shape(Shape::Q, 2.0f),
                               k == 1 ? 6.0 : -6.0);
    chain.getBand(k).setActive(true);
  }
  EXPECT_NEAR(chain.getResponseMagnitudeAtFrequency(2000.0f / 24000.0f), 1.0f, 1e-6);
  // Configured but inactive bands do not count.
  chain.getBand(0).configure(Biquad::LowPass, 500.0f, 48000.0f, Shape(Shape::Q, 0.7f), 0.0);
  chain.getBand(3).setActive(false);
  const float f = 0.3f, r1 = chain.getBand(1).getResponseMagnitudeAtFrequency(f);
  EXPECT_EQ(chain.getResponseMagnitudeAtFrequency(f), 1.0f * r1);
  chain.getBand(0).setActive(true);
  EXPECT_EQ(chain.getResponseMagnitudeAtFrequency(f),
            (1.0f * chain.getBand(0).getResponseMagnitudeAtFrequency(f)) * r1);
}

TEST(MultiBand, LastResultIsTheChainOutputEvenWithTheLastBandOff) {
  MultiBandBiquad<2> chain;
  chain.getBand(0).configure(Biquad::LowPass, 500.0f, 48000.0f, Shape(Shape::Q, 0.7f), 0.0);
  chain.getBand(0).setActive(true);
  for (float x : {1.0f, -0.5f}) {
    const float y = chain.processSample(x);
    EXPECT_TRUE(chain.getLastProcessSampleResult() == y &&
                chain.getBand(1).getLastProcessSampleResult() == y);
  }
  chain.reset();
  EXPECT_EQ(chain.getLastProcessSampleResult(), 0.0f);
}

}  // namespace
