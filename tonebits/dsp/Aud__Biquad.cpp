#include "tonebits/dsp/Aud__Biquad.h"

#include <cmath>

#include "host/Exception.h"
#include "tonebits/dsp/Aud__BiquadCascade.h"

namespace Aud::Filter {

namespace {

// The throws carry this source name and a fixed line per check, which the
// host's crash reports and support tools key on.
constexpr const char* kSource = "Aud__Biquad";
constexpr const char* kMismatch = "ShapeDescriptor/FilterType mismatch";
constexpr int32_t kLineShapeOfPassType = 116;
constexpr int32_t kLineShapeOfShelf = 133;
constexpr int32_t kLineAlphaShape = 173;
constexpr int32_t kLineBetaShape = 188;
constexpr int32_t kLineUnknownType = 267;
constexpr int32_t kLineActivateUnconfigured = 315;
constexpr int32_t kLineResponseUnconfigured = 385;

[[noreturn]] void fail(const char* message, int32_t line) {
  throw Kv::Exception::RuntimeError(message, kSource, line);
}

// The recurrence, shared with the block paths so that every path rounds and
// propagates NaNs alike.
#define TB_INLINE __attribute__((always_inline)) inline
#if defined(__AVX__)
#define TB_VEX 1
#else
#define TB_VEX 0
#endif
#include "tonebits/dsp/Aud__BiquadArithmetic.inl"
#undef TB_VEX

using Shape = Biquad::ShapeDescriptor;

bool isPassType(Biquad::eFilterType type) noexcept {
  return type >= Biquad::LowPass && type <= Biquad::PeakingEQ;
}
bool isShelf(Biquad::eFilterType type) noexcept {
  return type == Biquad::LowShelf || type == Biquad::HighShelf;
}

constexpr double kPi = 3.14159265358979323846;
constexpr double kHalfLn2 = 0.34657359027997264;

// a0, a1, a2, b0, b1, b2, the order rawCoefficients keeps them in.
struct Raw {
  double a0, a1, a2, b0, b1, b2;
};

// The cookbook designs. The shape checks and the order of the throws are
// part of the contract: a type outside the enumeration takes the shelf's
// shape computation before the type itself is rejected.
Raw design(Biquad::eFilterType type, float frequency, float samplingRate, const Shape& shape, double gain) {
  const Shape::eType kind = shape.getType();
  if (isShelf(type)) {
    if (kind != Shape::Q && kind != Shape::S) fail(kMismatch, kLineShapeOfShelf);
  } else if (isPassType(type)) {
    if (kind != Shape::Bandwidth && kind != Shape::Q) fail(kMismatch, kLineShapeOfPassType);
  }

  const double A = std::pow(10.0, gain / 40.0);
  const double w0 = 2.0 * kPi * double(frequency) / double(samplingRate);
  const double sn = std::sin(w0);
  const double cs = std::cos(w0);
  const double v = shape.getValue();

  double alpha = 0.0;  // the pass types' bandwidth term
  double beta = 0.0;   // the shelves' 2 * sqrt(A) * alpha
  if (isPassType(type)) {
    if (kind == Shape::Bandwidth)
      alpha = sn * std::sinh(kHalfLn2 * v * w0 / sn);
    else if (kind == Shape::Q)
      alpha = sn / (2.0 * v);
    else
      fail(kMismatch, kLineAlphaShape);
  } else {
    if (kind == Shape::Q)
      beta = sn * std::sqrt(A) / v;
    else if (kind == Shape::S)
      beta = sn * std::sqrt((A * A + 1.0) / v - (A - 1.0) * (A - 1.0));
    else
      fail(kMismatch, kLineBetaShape);
  }

  switch (type) {
    case Biquad::LowPass:
      return {1.0 + alpha, -2.0 * cs, 1.0 - alpha, (1.0 - cs) / 2.0, 1.0 - cs, (1.0 - cs) / 2.0};
    case Biquad::HighPass:
      return {1.0 + alpha, -2.0 * cs, 1.0 - alpha, (1.0 + cs) / 2.0, -(1.0 + cs), (1.0 + cs) / 2.0};
    case Biquad::BandPassSkirt: return {1.0 + alpha, -2.0 * cs, 1.0 - alpha, sn / 2.0, 0.0, -sn / 2.0};
    case Biquad::BandPassPeak: return {1.0 + alpha, -2.0 * cs, 1.0 - alpha, alpha, 0.0, -alpha};
    case Biquad::Notch: return {1.0 + alpha, -2.0 * cs, 1.0 - alpha, 1.0, -2.0 * cs, 1.0};
    case Biquad::AllPass: return {1.0 + alpha, -2.0 * cs, 1.0 - alpha, 1.0 - alpha, -2.0 * cs, 1.0 + alpha};
    case Biquad::PeakingEQ:
      return {1.0 + alpha / A, -2.0 * cs, 1.0 - alpha / A, 1.0 + alpha * A, -2.0 * cs, 1.0 - alpha * A};
    case Biquad::LowShelf:
      return {(A + 1.0) + (A - 1.0) * cs + beta,      -2.0 * ((A - 1.0) + (A + 1.0) * cs),
              (A + 1.0) + (A - 1.0) * cs - beta,      A * ((A + 1.0) - (A - 1.0) * cs + beta),
              2.0 * A * ((A - 1.0) - (A + 1.0) * cs), A * ((A + 1.0) - (A - 1.0) * cs - beta)};
    case Biquad::HighShelf:
      return {(A + 1.0) - (A - 1.0) * cs + beta,       2.0 * ((A - 1.0) - (A + 1.0) * cs),
              (A + 1.0) - (A - 1.0) * cs - beta,       A * ((A + 1.0) + (A - 1.0) * cs + beta),
              -2.0 * A * ((A - 1.0) + (A + 1.0) * cs), A * ((A + 1.0) + (A - 1.0) * cs - beta)};
    default: fail("Unknown filter type", kLineUnknownType);
  }
}

}  // namespace

Biquad::Biquad(eFilterType type, float hz, float rateHz, const ShapeDescriptor& shapeOf, double dB, bool on) {
  configure(type, hz, rateHz, shapeOf, dB);
  setActive(on);
}

void Biquad::configure(eFilterType type, float hz, float rateHz, const ShapeDescriptor& shapeOf, double dB) {
  const Raw raw = design(type, hz, rateHz, shapeOf, dB);  // may throw: nothing has changed yet
  filterType = type;
  frequency = hz;
  samplingRate = rateHz;
  shape = shapeOf;
  gain = dB;
  const double stored[6] = {raw.a0, raw.a1, raw.a2, raw.b0, raw.b1, raw.b2};
  for (int i = 0; i < 6; ++i) rawCoefficients[i] = stored[i];
  coefficients[0] = float(raw.b0 / raw.a0);
  coefficients[1] = float(raw.b1 / raw.a0);
  coefficients[2] = float(raw.b2 / raw.a0);
  coefficients[3] = float(raw.a1 / raw.a0);
  coefficients[4] = float(raw.a2 / raw.a0);
}

void Biquad::setActive(bool on) {
  if (on && filterType == NoFilter) fail("Filter is not configured!", kLineActivateUnconfigured);
  active = on;
}

float Biquad::processSample(float x) noexcept {
  if (!active) {
    history.y1 = x;
    return x;
  }
  const float* c = coefficients;
  float y;
  directFormOne(y, c[0], c[1], c[2], c[3], c[4], x, history.x1, history.x2, history.y1, history.y2);
  history.x2 = history.x1;
  history.x1 = x;
  history.y2 = history.y1;
  history.y1 = y;
  return y;
}

void Biquad::processBlock(const float* in, float* out, unsigned count) noexcept {
  if (count == 0) return;
  if (!in || !out) return vel_splat("Aud::Filter::Biquad::processBlock: null buffer");
  Private::runChain(this, 1, in, 1, out, 1, count);
}

void Biquad::processBlockMultiChannel(Biquad* const* filters, const float* const* in, float* const* out,
                                      unsigned channels, unsigned count) noexcept {
  const auto chainOf = [](Biquad* f) { return f; };
  Private::ChannelForms<Biquad, decltype(chainOf)>::strided(filters, chainOf, 1, in, 1, out, 1, channels,
                                                            count);
}

void Biquad::processBlockStrided(Biquad* const* filters, const float* const* in, std::ptrdiff_t inStride,
                                 float* const* out, std::ptrdiff_t outStride, unsigned channels,
                                 unsigned count) noexcept {
  const auto chainOf = [](Biquad* f) { return f; };
  Private::ChannelForms<Biquad, decltype(chainOf)>::strided(filters, chainOf, 1, in, inStride, out, outStride,
                                                            channels, count);
}

void Biquad::processBlockInterleaved(Biquad* const* filters, const float* in, float* out, unsigned channels,
                                     unsigned frames) noexcept {
  const auto chainOf = [](Biquad* f) { return f; };
  Private::ChannelForms<Biquad, decltype(chainOf)>::interleaved(filters, chainOf, 1, in, out, channels,
                                                                frames);
}

float Biquad::getResponseMagnitudeAtFrequency(float f) const {
  if (!active) return 1.0f;
  if (filterType == NoFilter) fail("Biquad is not configured!", kLineResponseUnconfigured);
  const double* r = rawCoefficients;
  const double a0 = r[0], a1 = r[1], a2 = r[2], b0 = r[3], b1 = r[4], b2 = r[5];
  const double w = kPi * double(f);
  const double c1 = std::cos(w), s1 = std::sin(w);
  const double c2 = std::cos(2.0 * w), s2 = std::sin(2.0 * w);
  const double numRe = (b0 + b1 * c1) + b2 * c2;
  const double numIm = b1 * s1 + b2 * s2;
  const double denRe = (a0 + a1 * c1) + a2 * c2;
  const double denIm = a1 * s1 + a2 * s2;
  return float(std::sqrt(numRe * numRe + numIm * numIm) / std::sqrt(denRe * denRe + denIm * denIm));
}

}  // namespace Aud::Filter
