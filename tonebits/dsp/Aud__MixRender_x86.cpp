// The x86 vector sets of the mixing loops: SSE2 (the x86-64 baseline), AVX2
// and AVX-512, each compiled for its level by function attributes so that
// nothing outside these functions depends on the CPU. Which set runs is
// chosen per call from Aud::Simd::activeLevel().
#include "tonebits/dsp/Aud__MixRenderLoops.h"

#if defined(__x86_64__) || defined(__i386__)

#include <immintrin.h>

namespace Aud::MixRender::detail {

namespace {

// Gains of the serial ramp chain held at once: 1 KiB of stack.
constexpr std::size_t kRampChunk = 256;

namespace sse2 {
#define MIX_TARGET
#define MIX_WIDE Quad
#include "tonebits/dsp/Aud__MixRender_x86.inc"
}  // namespace sse2

namespace avx2 {
#define MIX_TARGET __attribute__((target("avx2,fma")))
struct Lanes8 {
  using T = __m256;
  static constexpr std::size_t kLanes = 8;
  MIX_TARGET static T load(const float* p) noexcept { return _mm256_loadu_ps(p); }
  MIX_TARGET static void store(float* p, T v) noexcept { _mm256_storeu_ps(p, v); }
  MIX_TARGET static T set1(float v) noexcept { return _mm256_set1_ps(v); }
  MIX_TARGET static T mul(T a, T b) noexcept { return _mm256_mul_ps(a, b); }
  MIX_TARGET static T add(T a, T b) noexcept { return _mm256_add_ps(a, b); }
  MIX_TARGET static T fold(T x, T peak) noexcept {
    return _mm256_max_ps(_mm256_and_ps(x, _mm256_castsi256_ps(_mm256_set1_epi32(0x7FFFFFFF))), peak);
  }
  MIX_TARGET static T max(T a, T b) noexcept { return _mm256_max_ps(a, b); }
  MIX_TARGET static __m128 narrow(T v) noexcept {
    return _mm_max_ps(_mm256_castps256_ps128(v), _mm256_extractf128_ps(v, 1));
  }
};
#define MIX_WIDE Lanes8
#include "tonebits/dsp/Aud__MixRender_x86.inc"
}  // namespace avx2

namespace avx512 {
#define MIX_TARGET __attribute__((target("avx512f,avx512bw,avx512vl,avx512dq,avx2,fma")))
struct Lanes16 {
  using T = __m512;
  static constexpr std::size_t kLanes = 16;
  MIX_TARGET static T load(const float* p) noexcept { return _mm512_loadu_ps(p); }
  MIX_TARGET static void store(float* p, T v) noexcept { _mm512_storeu_ps(p, v); }
  MIX_TARGET static T set1(float v) noexcept { return _mm512_set1_ps(v); }
  MIX_TARGET static T mul(T a, T b) noexcept { return _mm512_mul_ps(a, b); }
  MIX_TARGET static T add(T a, T b) noexcept { return _mm512_add_ps(a, b); }
  MIX_TARGET static T fold(T x, T peak) noexcept {
    return max(_mm512_and_ps(x, _mm512_castsi512_ps(_mm512_set1_epi32(0x7FFFFFFF))), peak);
  }
  // The zero-masked forms with every lane selected: the same instructions,
  // without the compiler's false alarm over the unmasked forms' undefined
  // pass-through operand.
  MIX_TARGET static T max(T a, T b) noexcept { return _mm512_maskz_max_ps(0xFFFF, a, b); }
  MIX_TARGET static __m128 narrow(T v) noexcept {
    const __m128 low =
        _mm_max_ps(_mm512_maskz_extractf32x4_ps(0xF, v, 0), _mm512_maskz_extractf32x4_ps(0xF, v, 1));
    const __m128 high =
        _mm_max_ps(_mm512_maskz_extractf32x4_ps(0xF, v, 2), _mm512_maskz_extractf32x4_ps(0xF, v, 3));
    return _mm_max_ps(low, high);
  }
};
#define MIX_WIDE Lanes16
#include "tonebits/dsp/Aud__MixRender_x86.inc"
}  // namespace avx512

}  // namespace

const Loops* sse2Loops() noexcept { return &sse2::kLoops; }
const Loops* avx2Loops() noexcept { return &avx2::kLoops; }
const Loops* avx512Loops() noexcept { return &avx512::kLoops; }

}  // namespace Aud::MixRender::detail

#else

namespace Aud::MixRender::detail {

const Loops* sse2Loops() noexcept { return nullptr; }
const Loops* avx2Loops() noexcept { return nullptr; }
const Loops* avx512Loops() noexcept { return nullptr; }

}  // namespace Aud::MixRender::detail

#endif
