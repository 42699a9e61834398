#include "tonebits/dsp/Aud__MixRender.h"

#include <bit>
#include <cmath>
#include <cstdint>
#include <cstring>

#include "host/Log.h"
#include "tonebits/dsp/Aud__MixRenderLoops.h"
#include "tonebits/foundation/Aud__Simd.h"

namespace Aud::MixRender {

namespace detail {

namespace {

// The scalar reference: one sample at a time, in ascending order, each
// operation rounded to float as written.

float foldScalar(const float* src, std::size_t n, float peak) noexcept {
  for (std::size_t i = 0; i < n; ++i) {
    const float a = std::fabs(src[i]);
    if (a > peak) peak = a;
  }
  return peak;
}

void mulScalar(const float* src, float* dst, std::size_t n, float gain) noexcept {
  for (std::size_t i = 0; i < n; ++i) dst[i] = gain * src[i];
}

float mulFoldScalar(const float* src, float* dst, std::size_t n, float gain, float peak) noexcept {
  for (std::size_t i = 0; i < n; ++i) {
    const float x = src[i];
    const float a = std::fabs(x);
    if (a > peak) peak = a;
    dst[i] = gain * x;
  }
  return peak;
}

void addScalar(const float* src, float* dst, std::size_t n) noexcept {
  for (std::size_t i = 0; i < n; ++i) dst[i] = src[i] + dst[i];
}

float addFoldScalar(const float* src, float* dst, std::size_t n, float peak) noexcept {
  for (std::size_t i = 0; i < n; ++i) {
    const float x = src[i];
    const float a = std::fabs(x);
    if (a > peak) peak = a;
    dst[i] = x + dst[i];
  }
  return peak;
}

void mulAddScalar(const float* src, float* dst, std::size_t n, float gain) noexcept {
  for (std::size_t i = 0; i < n; ++i) {
    const float product = gain * src[i];
    dst[i] = product + dst[i];
  }
}

float mulAddFoldScalar(const float* src, float* dst, std::size_t n, float gain, float peak) noexcept {
  for (std::size_t i = 0; i < n; ++i) {
    const float x = src[i];
    const float a = std::fabs(x);
    if (a > peak) peak = a;
    const float product = gain * x;
    dst[i] = product + dst[i];
  }
  return peak;
}

void mulAdd2Scalar(const float* src, float* dstA, float* dstB, std::size_t n, float gainA,
                   float gainB) noexcept {
  for (std::size_t i = 0; i < n; ++i) {
    const float x = src[i];
    const float productA = gainA * x;
    dstA[i] = productA + dstA[i];
    const float productB = gainB * x;
    dstB[i] = productB + dstB[i];
  }
}

void rampScalar(const float* src, float* dst, std::size_t n, float gain, float delta) noexcept {
  for (std::size_t i = 0; i < n; ++i) {
    dst[i] = gain * src[i];
    gain = gain + delta;
  }
}

void rampAddScalar(const float* src, float* dst, std::size_t n, float gain, float delta) noexcept {
  for (std::size_t i = 0; i < n; ++i) {
    const float product = gain * src[i];
    dst[i] = product + dst[i];
    gain = gain + delta;
  }
}

constexpr Loops kScalar = {foldScalar,   mulScalar,        mulFoldScalar, addScalar,  addFoldScalar,
                           mulAddScalar, mulAddFoldScalar, mulAdd2Scalar, rampScalar, rampAddScalar};

}  // namespace

const Loops& scalarLoops() noexcept { return kScalar; }

}  // namespace detail

namespace {

const detail::Loops& loops() noexcept {
  const detail::Loops* chosen = nullptr;
  switch (Simd::activeLevel()) {
    case Simd::eAVX512: chosen = detail::avx512Loops(); break;
    case Simd::eAVX2: chosen = detail::avx2Loops(); break;
    case Simd::eSSE2: chosen = detail::sse2Loops(); break;
    case Simd::eScalar: break;
  }
  return chosen ? *chosen : detail::scalarLoops();
}

// 32-bit product, as the interface defines it.
std::size_t samplesOf(unsigned int numQuads) noexcept { return static_cast<std::size_t>(numQuads * 4u); }

bool buffersUsable(std::size_t n, const float* a, const float* b) noexcept {
  if (n == 0 || (a && b)) return true;
  vel_splat("Aud::MixRender: null sample buffer");
  return false;
}

bool peakUsable(const float* peak) noexcept {
  if (peak) return true;
  vel_splat("Aud::MixRender: null peak");
  return false;
}

void copySamples(const float* src, float* dst, std::size_t n) noexcept {
  if (n != 0 && src != dst) std::memmove(dst, src, n * sizeof(float));
}

void clearSamples(float* dst, std::size_t n) noexcept {
  if (n != 0) std::memset(dst, 0, n * sizeof(float));
}

}  // namespace

void PeakScan(float* src, unsigned int numQuads, float* peak) noexcept {
  const std::size_t n = samplesOf(numQuads);
  if (!peakUsable(peak) || !buffersUsable(n, src, src)) return;
  *peak = loops().fold(src, n, *peak);
}

void MultiplyConstant(float* src, float* dst, unsigned int numQuads, float gain) noexcept {
  const std::size_t n = samplesOf(numQuads);
  if (!buffersUsable(n, src, dst)) return;
  if (gain == 1.0f) return copySamples(src, dst, n);
  if (gain == 0.0f) return clearSamples(dst, n);
  loops().mul(src, dst, n, gain);
}

void MultiplyConstantWithPrePeakScan(float* src, float* dst, unsigned int numQuads, float gain,
                                     float* peak) noexcept {
  const std::size_t n = samplesOf(numQuads);
  if (!buffersUsable(n, src, dst)) return;
  if (gain == 0.0f) return clearSamples(dst, n);  // the peak is not looked at
  if (!peakUsable(peak)) return;
  const detail::Loops& l = loops();
  if (gain == 1.0f) {
    copySamples(src, dst, n);
    *peak = l.fold(src, n, *peak);
    return;
  }
  *peak = l.mulFold(src, dst, n, gain, *peak);
}

void MultiplyWithDelta(float* src, float* dst, unsigned int numQuads, float startGain, float delta) noexcept {
  if (delta == 0.0f) return MultiplyConstant(src, dst, numQuads, startGain);
  const std::size_t n = samplesOf(numQuads);
  if (!buffersUsable(n, src, dst)) return;
  loops().ramp(src, dst, n, startGain, delta);
}

void Add(float* src, float* dst, unsigned int numQuads) noexcept {
  const std::size_t n = samplesOf(numQuads);
  if (!buffersUsable(n, src, dst)) return;
  loops().add(src, dst, n);
}

void MultiplyConstantAndAdd(float* src, float* dst, unsigned int numQuads, float gain) noexcept {
  const std::size_t n = samplesOf(numQuads);
  if (!buffersUsable(n, src, dst)) return;
  if (gain == 0.0f) return;
  if (gain == 1.0f) return loops().add(src, dst, n);
  loops().mulAdd(src, dst, n, gain);
}

void MultiplyConstantAndAdd2(float* src, float* dstA, float* dstB, unsigned int numQuads, float gainA,
                             float gainB) noexcept {
  const std::size_t n = samplesOf(numQuads);
  if (!buffersUsable(n, src, dstA) || !buffersUsable(n, src, dstB)) return;
  const detail::Loops& l = loops();
  // A destination with a shortcut is finished before the other is touched.
  // When the source is also one of the destinations, that one must go last,
  // or the other would be mixed from samples already changed.
  const bool shortA = gainA == 1.0f || gainA == 0.0f;
  const bool shortB = gainB == 1.0f || gainB == 0.0f;
  auto finish = [&](float* dst, float gain) {
    if (gain == 1.0f) l.add(src, dst, n);
  };
  if (shortA && shortB) {
    if (src == dstA) {
      finish(dstB, gainB);
      finish(dstA, gainA);
    } else {
      finish(dstA, gainA);
      finish(dstB, gainB);
    }
  } else if (shortA) {
    if (src == dstA) {
      l.mulAdd(src, dstB, n, gainB);
      finish(dstA, gainA);
    } else {
      finish(dstA, gainA);
      l.mulAdd(src, dstB, n, gainB);
    }
  } else if (shortB) {
    if (src == dstB) {
      l.mulAdd(src, dstA, n, gainA);
      finish(dstB, gainB);
    } else {
      finish(dstB, gainB);
      l.mulAdd(src, dstA, n, gainA);
    }
  } else {
    l.mulAdd2(src, dstA, dstB, n, gainA, gainB);
  }
}

void MultiplyConstantAndAddWithPrePeakScan(float* src, float* dst, unsigned int numQuads, float gain,
                                           float* peak) noexcept {
  const std::size_t n = samplesOf(numQuads);
  if (!peakUsable(peak) || !buffersUsable(n, src, dst)) return;
  // No shortcut for gain 0: 0 x src[i] is still added, so an infinite or
  // NaN source sample still reaches the destination.
  if (gain == 1.0f) {
    *peak = loops().addFold(src, dst, n, *peak);
    return;
  }
  *peak = loops().mulAddFold(src, dst, n, gain, *peak);
}

void MultiplyWithDeltaAndAdd(float* src, float* dst, unsigned int numQuads, float startGain,
                             float delta) noexcept {
  if (delta == 0.0f) return MultiplyConstantAndAdd(src, dst, numQuads, startGain);
  const std::size_t n = samplesOf(numQuads);
  if (!buffersUsable(n, src, dst)) return;
  loops().rampAdd(src, dst, n, startGain, delta);
}

void fastSineCosine(float& sine, float& cosine, unsigned int phase) noexcept {
  constexpr float kHalf = 0.5f;
  constexpr float kRootHalf = std::bit_cast<float>(0x3F3504F3u);      // 0.70710677
  constexpr float kBend = std::bit_cast<float>(0x3F5413CCu);          // 0.82842708, near 2 sqrt(2) - 2
  constexpr float kQuadrantStep = std::bit_cast<float>(0x38800000u);  // 1 / 16384
  const unsigned int quadrant = phase & 0xC000u;
  const float x = static_cast<float>(phase & 0x3FFFu) * kQuadrantStep;
  switch (quadrant) {
    case 0x0000u: {
      const float t = x - kHalf;
      const float m = kRootHalf - (t * kBend) * t;
      sine = m + t;
      cosine = m - t;
      break;
    }
    case 0x4000u: {
      const float t = kHalf - x;
      const float m = kRootHalf - (t * kBend) * t;
      sine = m + t;
      cosine = t - m;
      break;
    }
    case 0x8000u: {
      const float t = x - kHalf;
      const float m = (t * kBend) * t - kRootHalf;
      sine = m - t;
      cosine = m + t;
      break;
    }
    default: {
      const float t = x - kHalf;
      const float m = kRootHalf - (t * kBend) * t;
      sine = t - m;
      cosine = m + t;
      break;
    }
  }
}

}  // namespace Aud::MixRender
