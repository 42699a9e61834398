#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <functional>
#include <random>
#include <vector>

#include "host/Exception.h"
#include "tests/dsp/BiquadSupport.h"
#include "tonebits/dsp/Aud__MultiBandBiquad.h"

namespace {

using namespace biquad_test;
using Aud::Filter::MultiBandBiquad;

// The cookbook designs as usually published (shelves through alpha, the
// slope through (A + 1/A)(1/S - 1) + 2), written apart from the library.
struct Design {
  double b0, b1, b2, a0, a1, a2;
};

Design cookbook(Biquad::eFilterType type, double f0, double fs, Shape shape, double dBgain) {
  const double pi = std::acos(-1.0);
  const double A = std::pow(10.0, dBgain / 40.0);
  const double w0 = 2.0 * pi * f0 / fs;
  const double s = std::sin(w0), c = std::cos(w0);
  const double v = shape.getValue();
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

// Within about one float rounding of the double value.
void expectFloatOf(float stored, double expected, const char* what) {
  EXPECT_NEAR(stored, expected, std::abs(expected) * 2.5e-7 + 1e-30) << what;
}

TEST(BiquadDesign, EveryTypeAndShapeMatchesTheCookbook) {
  const int types[] = {1, 2, 3, 4, 5, 6, 7, 8, 9};
  const float frequencies[] = {30.0f, 1000.0f, 15000.0f};
  const float rates[] = {44100.0f, 96000.0f};
  const double gains[] = {-12.0, 0.0, 6.5};
  for (int t : types) {
    const bool shelf = t >= 8;
    const Shape shapes[] = {shelf ? Shape(Shape::S, 0.5f) : Shape(Shape::Bandwidth, 0.7f),
                            shelf ? Shape(Shape::S, 1.0f) : Shape(Shape::Bandwidth, 2.0f),
                            Shape(Shape::Q, 0.7071f), Shape(Shape::Q, 4.0f)};
    for (float f : frequencies)
      for (float fs : rates)
        for (const Shape& shape : shapes)
          for (double g : gains) {
            SCOPED_TRACE(testing::Message() << "type " << t << " f " << f << " fs " << fs << " shape "
                                            << shape.getType() << "/" << shape.getValue() << " gain " << g);
            Biquad b;
            b.configure(typeAt(t), f, fs, shape, g);
            const Design d = cookbook(typeAt(t), f, fs, shape, g);
            const float* c = BiquadAccess::coefficients(b);
            expectFloatOf(c[0], d.b0 / d.a0, "b0");
            expectFloatOf(c[1], d.b1 / d.a0, "b1");
            expectFloatOf(c[2], d.b2 / d.a0, "b2");
            expectFloatOf(c[3], d.a1 / d.a0, "a1");
            expectFloatOf(c[4], d.a2 / d.a0, "a2");
            // The raw set keeps the unnormalised values, a's first.
            const double* raw = BiquadAccess::rawCoefficients(b);
            const double want[6] = {d.a0, d.a1, d.a2, d.b0, d.b1, d.b2};
            for (int i = 0; i < 6; ++i) EXPECT_NEAR(raw[i], want[i], 1e-12 * (1.0 + std::abs(want[i]))) << i;
            // The stored floats are the raw ratios rounded once.
            EXPECT_EQ(c[0], float(raw[3] / raw[0]));
            EXPECT_EQ(c[4], float(raw[2] / raw[0]));
            EXPECT_EQ(b.getFilterType(), typeAt(t));
            EXPECT_EQ(b.getFrequency(), f);
            EXPECT_EQ(b.getSamplingRate(), fs);
            EXPECT_EQ(b.getShapeDescriptor().getType(), shape.getType());
            EXPECT_EQ(b.getShapeDescriptor().getValue(), shape.getValue());
            EXPECT_EQ(b.getGain(), g);
          }
  }
}

TEST(BiquadDesign, PublishedLowPassExample) {
  Biquad b(Biquad::LowPass, 1000.0f, 48000.0f, Shape(Shape::Q, 0.7071f), 0.0, true);
  const float* c = BiquadAccess::coefficients(b);
  const float want[5] = {0.003916123f, 0.007832247f, 0.003916123f, -1.815340f, 0.8310041f};
  for (int i = 0; i < 5; ++i) EXPECT_NEAR(c[i], want[i], std::abs(want[i]) * 2e-6) << i;
  EXPECT_NEAR(b.getResponseMagnitudeAtFrequency(0.0f), 1.0f, 1e-6);
  EXPECT_NEAR(b.getResponseMagnitudeAtFrequency(1000.0f / 24000.0f), 0.7071f, 1e-4);
  EXPECT_NEAR(b.getResponseMagnitudeAtFrequency(1.0f), 0.0f, 1e-6);
}

// ---- Throws ----

struct ThrowCase {
  const char* name;
  std::function<void(Biquad&)> call;
  const char* message;
  int line;
};

TEST(BiquadThrows, MessageSourceLineAndNothingChanged) {
  const auto mismatch = "ShapeDescriptor/FilterType mismatch";
  const auto configureWith = [](int type, Shape shape) {
    return [=](Biquad& b) { b.configure(typeAt(type), 500.0f, 48000.0f, shape, 3.0); };
  };
  const ThrowCase cases[] = {
      {"low shelf with a bandwidth", configureWith(8, Shape(Shape::Bandwidth, 1.0f)), mismatch, 133},
      {"high shelf with no shape", configureWith(9, Shape()), mismatch, 133},
      {"low-pass with a slope", configureWith(1, Shape(Shape::S, 1.0f)), mismatch, 116},
      {"peaking with no shape", configureWith(7, Shape()), mismatch, 116},
      {"all-pass with a slope", configureWith(6, Shape(Shape::S, 0.5f)), mismatch, 116},
      // Outside the enumeration, the shelf's shape test comes first.
      {"type 10 with a bandwidth", configureWith(10, Shape(Shape::Bandwidth, 1.0f)), mismatch, 188},
      {"no filter with no shape", configureWith(0, Shape()), mismatch, 188},
      {"no filter with a Q", configureWith(0, Shape(Shape::Q, 1.0f)), "Unknown filter type", 267},
      {"type -1 with a slope", configureWith(-1, Shape(Shape::S, 1.0f)), "Unknown filter type", 267},
      {"type 10 with a Q", configureWith(10, Shape(Shape::Q, 1.0f)), "Unknown filter type", 267},
  };
  std::mt19937 rng(7);
  for (const ThrowCase& c : cases) {
    SCOPED_TRACE(c.name);
    for (bool configured : {false, true}) {
      Biquad b;
      if (configured) {
        configureRandomly(b, Biquad::PeakingEQ, rng);
        b.setActive(true);
        for (int i = 0; i < 5; ++i) b.processSample(float(i) - 2.0f);
      }
      const StateBits before = stateOf(b);
      try {
        c.call(b);
        ADD_FAILURE() << "no throw";
      } catch (const Kv::Exception::RuntimeError& e) {
        EXPECT_STREQ(e.getMessage(), c.message);
        EXPECT_STREQ(e.getFile(), "Aud__Biquad");
        EXPECT_EQ(e.getLine(), c.line);
        EXPECT_STREQ(e.getTypeName(), "RuntimeError");
      }
      EXPECT_TRUE(stateOf(b) == before);
    }
  }
}

TEST(BiquadThrows, SwitchingAndResponseOfAnUnconfiguredFilter) {
  Biquad b;
  b.setActive(false);  // always allowed
  EXPECT_FALSE(b.getActive());
  EXPECT_EQ(b.getResponseMagnitudeAtFrequency(0.3f), 1.0f);  // inactive: flat, configured or not
  try {
    b.setActive(true);
    ADD_FAILURE() << "no throw";
  } catch (const Kv::Exception::RuntimeError& e) {
    EXPECT_STREQ(e.getMessage(), "Filter is not configured!");
    EXPECT_STREQ(e.getFile(), "Aud__Biquad");
    EXPECT_EQ(e.getLine(), 315);
  }
  EXPECT_FALSE(b.getActive());
  // The six-argument constructor switches on through the same check.
  try {
    Biquad c(Biquad::NoFilter, 1000.0f, 48000.0f, Shape(Shape::Q, 1.0f), 0.0, true);
    ADD_FAILURE() << "no throw";
  } catch (const Kv::Exception::RuntimeError& e) {
    EXPECT_EQ(e.getLine(), 267);
  }
  Biquad configuredButOff(Biquad::Notch, 1000.0f, 48000.0f, Shape(Shape::Q, 1.0f), 0.0, false);
  EXPECT_FALSE(configuredButOff.getActive());
  EXPECT_EQ(configuredButOff.getResponseMagnitudeAtFrequency(1000.0f / 24000.0f), 1.0f);
}

TEST(BiquadThrows, BandIndexOutOfRange) {
  MultiBandBiquad<3> chain;
  const MultiBandBiquad<3>& readOnly = chain;
  EXPECT_EQ(&chain.getBand(2), &readOnly.getBand(2));
  const std::function<void()> calls[] = {[&] { chain.getBand(3); }, [&] { readOnly.getBand(3); },
                                         [&] { chain.getBand(0xFFFFFFFFu); }};
  const int lines[] = {206, 214, 206};
  for (int i = 0; i < 3; ++i) {
    try {
      calls[i]();
      ADD_FAILURE() << "no throw " << i;
    } catch (const Kv::Exception::RuntimeError& e) {
      EXPECT_STREQ(e.getMessage(), "BandNumber out of range!");
      EXPECT_STREQ(e.getFile(), "tonebits/Aud__Biquad");
      EXPECT_EQ(e.getLine(), lines[i]);
    }
  }
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
      x2 = x1, x1 = x, y2 = y1, y1 = y;
      ASSERT_EQ(bitsOf(b.getLastProcessSampleResult()), bitsOf(y));
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
  EXPECT_EQ(b.getLastProcessSampleResult(), 0.75f);
  const auto after = BiquadAccess::history(b);
  EXPECT_EQ(after.x1, before.x1);
  EXPECT_EQ(after.x2, before.x2);
  EXPECT_EQ(after.y2, before.y2);
  b.reset();
  const auto cleared = BiquadAccess::history(b);
  EXPECT_EQ(cleared.x1 + cleared.x2 + cleared.y1 + cleared.y2, 0.0f);
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
  struct Row {
    Biquad::eFilterType type;
    Shape shape;
    double dc, atCentre, nyquist;
  };
  const Row rows[] = {
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
  for (const Row& r : rows) {
    SCOPED_TRACE(r.type);
    Biquad b(r.type, f0, fs, r.shape, g, true);
    EXPECT_NEAR(b.getResponseMagnitudeAtFrequency(0.0f), r.dc, 1e-5 * (1 + r.dc));
    EXPECT_NEAR(b.getResponseMagnitudeAtFrequency(centre), r.atCentre, 2e-4 * (1 + r.atCentre));
    EXPECT_NEAR(b.getResponseMagnitudeAtFrequency(1.0f), r.nyquist, 1e-5 * (1 + r.nyquist));
  }
  Biquad peak(Biquad::PeakingEQ, 1000.0f, 48000.0f, Shape(Shape::Q, 1.0f), 6.0, true);
  EXPECT_NEAR(peak.getResponseMagnitudeAtFrequency(1000.0f / 24000.0f), 1.995262f, 2e-6);
}

// The response formula against what the filter does: the DFT of its impulse
// response, for every type with random settings.
TEST(BiquadResponse, MatchesTheSpectrumOfTheImpulseResponse) {
  std::mt19937 rng(5);
  const double pi = std::acos(-1.0);
  for (int t = 1; t <= 9; ++t)
    for (int trial = 0; trial < 2; ++trial) {
      Biquad b;
      configureRandomly(b, typeAt(t), rng);
      // Keep the poles away from the unit circle, where float coefficients
      // move the response measurably and 8k samples would not hold it all.
      b.configure(b.getFilterType(), std::max(b.getFrequency(), 1000.0f), b.getSamplingRate(),
                  b.getShapeDescriptor().getValue() > 3.0f ? Shape(b.getShapeDescriptor().getType(), 3.0f)
                                                           : b.getShapeDescriptor(),
                  b.getGain());
      b.setActive(true);
      std::vector<double> h(8192);
      for (size_t n = 0; n < h.size(); ++n) h[n] = b.processSample(n == 0 ? 1.0f : 0.0f);
      for (float f : {0.0f, 0.01f, 0.05f, 0.1f, 0.2f, 0.33f, 0.5f, 0.7f, 0.9f, 1.0f}) {
        std::complex<double> sum = 0, turn = 1;
        const std::complex<double> step = std::polar(1.0, -pi * f);
        for (size_t n = 0; n < h.size(); ++n, turn *= step) sum += h[n] * turn;
        const double want = std::abs(sum);
        EXPECT_NEAR(b.getResponseMagnitudeAtFrequency(f), want, 2e-4 * (1.0 + want))
            << "type " << t << " f " << f << " fc " << b.getFrequency();
      }
    }
}

TEST(MultiBandResponse, ProductOfTheActiveBands) {
  MultiBandBiquad<4> chain;
  for (float f : {0.0f, 0.25f, 1.0f}) EXPECT_EQ(chain.getResponseMagnitudeAtFrequency(f), 1.0f);
  for (float x : {0.5f, -1.0f, 3e38f}) EXPECT_EQ(chain.processSample(x), x);

  // Opposite peaks cancel at their centre.
  chain.getBand(1).configure(Biquad::PeakingEQ, 2000.0f, 48000.0f, Shape(Shape::Q, 2.0f), 6.0);
  chain.getBand(3).configure(Biquad::PeakingEQ, 2000.0f, 48000.0f, Shape(Shape::Q, 2.0f), -6.0);
  chain.getBand(1).setActive(true);
  chain.getBand(3).setActive(true);
  EXPECT_NEAR(chain.getResponseMagnitudeAtFrequency(2000.0f / 24000.0f), 1.0f, 1e-6);

  // Configured but inactive bands do not count.
  chain.getBand(0).configure(Biquad::LowPass, 500.0f, 48000.0f, Shape(Shape::Q, 0.7f), 0.0);
  chain.getBand(3).setActive(false);
  const float f = 0.3f;
  EXPECT_EQ(chain.getResponseMagnitudeAtFrequency(f),
            1.0f * chain.getBand(1).getResponseMagnitudeAtFrequency(f));
  chain.getBand(0).setActive(true);
  EXPECT_EQ(chain.getResponseMagnitudeAtFrequency(f),
            (1.0f * chain.getBand(0).getResponseMagnitudeAtFrequency(f)) *
                chain.getBand(1).getResponseMagnitudeAtFrequency(f));
}

TEST(MultiBandProcess, LastResultIsTheChainOutputEvenWithTheLastBandOff) {
  MultiBandBiquad<2> chain;
  chain.getBand(0).configure(Biquad::LowPass, 500.0f, 48000.0f, Shape(Shape::Q, 0.7f), 0.0);
  chain.getBand(0).setActive(true);
  for (float x : {1.0f, 0.0f, -0.5f}) {
    const float y = chain.processSample(x);
    EXPECT_EQ(chain.getLastProcessSampleResult(), y);
    EXPECT_EQ(chain.getBand(1).getLastProcessSampleResult(), y);
  }
  MultiBandBiquad<2> copy = chain;
  EXPECT_EQ(copy.processSample(0.25f), chain.processSample(0.25f));
  chain.reset();
  EXPECT_EQ(chain.getLastProcessSampleResult(), 0.0f);
  EXPECT_NE(copy.getLastProcessSampleResult(), 0.0f);
}

}  // namespace
