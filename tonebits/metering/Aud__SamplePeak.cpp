#include "tonebits/metering/Aud__SamplePeak.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>

#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/foundation/Aud__Simd.h"

#if defined(__x86_64__)
#include <immintrin.h>
#define TONEBITS_PEAK_X86 1
#define TONEBITS_AVX2 __attribute__((target("avx2")))
#endif

namespace Aud::Private {

namespace {

using ToFloatFn = float (*)(const unsigned char*) noexcept;

// ---- the reference: the rule, sample by sample ----

template <ToFloatFn Rule, unsigned Bytes>
float peakLoop(const unsigned char* s, std::size_t n, float peak = 0.0f) noexcept {
  for (std::size_t i = 0; i < n; ++i) {
    const float a = std::fabs(Rule(s + i * Bytes));
    if (a > peak) peak = a;
  }
  return peak;
}

float peakReference(int type, const unsigned char* s, std::size_t n) noexcept {
  using namespace SampleRules;
  switch (type) {
    case 0:
    case 7: return peakLoop<float32ToFloat, 4>(s, n);
    case 1: return peakLoop<int16ToFloat, 2>(s, n);
    case 2: return peakLoop<int24ToFloat, 3>(s, n);
    case 3: return peakLoop<int8ToFloat, 1>(s, n);
    case 4: return peakLoop<uint8ToFloat, 1>(s, n);
    case 5: return peakLoop<int24in32ToFloat, 4>(s, n);
    case 6: return peakLoop<int32ToFloat, 4>(s, n);
    case 8: return peakLoop<doubleToFloat, 8>(s, n);
    default: return 0.0f;
  }
}

#if defined(TONEBITS_PEAK_X86)

// ---- shared by the fast paths ----

// The smallest and largest integer sample values seen (for type 4, the
// value less the offset 128).
struct Range {
  int32_t lo = std::numeric_limits<int32_t>::max();
  int32_t hi = std::numeric_limits<int32_t>::min();
  void add(int32_t v) noexcept {
    lo = v < lo ? v : lo;
    hi = v > hi ? v : hi;
  }
};

// The peak of a non-empty range. Each integer rule is odd-symmetric and
// non-decreasing in the magnitude (type 6 in |v + 0.5|), so the largest
// decoded magnitude is that of the extreme farther from zero.
float magnitudeOf(int type, Range r) noexcept {
  switch (type) {
    case 1: return float(std::max(r.hi, -r.lo)) * 0x1p-15f;
    case 2:
    case 5: return float(std::max(r.hi, -r.lo)) * 0x1p-23f;
    case 3:
    case 4: return float(std::max(r.hi, -r.lo)) * 0x1p-7f;
    case 6: {
      const int64_t twice = std::max(2 * int64_t(r.hi) + 1, -(2 * int64_t(r.lo) + 1));  // 2|v + 0.5|
      return float(double(twice) * 0.5 / 2147483647.5);
    }
    default: return 0.0f;
  }
}

// The samples a vector loop left over, into the range: one loop per type.
template <int32_t (*Load)(const unsigned char*) noexcept, unsigned Bytes>
Range rangeLoop(const unsigned char* s, std::size_t n, Range r) noexcept {
  for (std::size_t i = 0; i < n; ++i) r.add(Load(s + i * Bytes));
  return r;
}
inline int32_t loadInt8(const unsigned char* p) noexcept { return int8_t(p[0]); }
inline int32_t loadOffset8(const unsigned char* p) noexcept { return int32_t(p[0]) - 128; }

Range rangeTail(int type, const unsigned char* s, std::size_t n, Range r) noexcept {
  using namespace SampleRules;
  switch (type) {
    case 1: return rangeLoop<loadLE16, 2>(s, n, r);
    case 2: return rangeLoop<loadLE24, 3>(s, n, r);
    case 3: return rangeLoop<loadInt8, 1>(s, n, r);
    case 4: return rangeLoop<loadOffset8, 1>(s, n, r);
    case 5: return rangeLoop<loadLE24, 4>(s, n, r);
    case 6: return rangeLoop<loadLE32, 4>(s, n, r);
    default: return r;
  }
}

// The float forms' leftovers, continuing from the vector lanes' peak.
float floatTail(int type, const unsigned char* s, std::size_t n, float peak) noexcept {
  using namespace SampleRules;
  return type == 8 ? peakLoop<doubleToFloat, 8>(s, n, peak) : peakLoop<float32ToFloat, 4>(s, n, peak);
}

// Lane values are magnitudes, never NaN, so their largest is exact.
float largestLane(const float* lanes, int count) noexcept {
  float peak = 0.0f;
  for (int k = 0; k < count; ++k) peak = lanes[k] > peak ? lanes[k] : peak;
  return peak;
}

template <class T>
Range rangeOfLanes(const T* lo, const T* hi, int count, int32_t offset, Range r) noexcept {
  for (int k = 0; k < count; ++k) {
    r.lo = std::min(r.lo, int32_t(lo[k]) - offset);
    r.hi = std::max(r.hi, int32_t(hi[k]) - offset);
  }
  return r;
}

// ---- SSE2 ----

// maxps returns its second operand when the first is NaN: NaNs never
// enter the accumulator, as in the rule.
inline __m128 absMaxInto(__m128 acc, __m128 v) noexcept {
  const __m128 magnitude = _mm_and_ps(v, _mm_castsi128_ps(_mm_set1_epi32(0x7FFFFFFF)));
  return _mm_max_ps(magnitude, acc);
}

inline __m128i min32(__m128i a, __m128i b) noexcept {
  const __m128i aGreater = _mm_cmpgt_epi32(a, b);
  return _mm_or_si128(_mm_and_si128(aGreater, b), _mm_andnot_si128(aGreater, a));
}
inline __m128i max32(__m128i a, __m128i b) noexcept {
  const __m128i aGreater = _mm_cmpgt_epi32(a, b);
  return _mm_or_si128(_mm_and_si128(aGreater, a), _mm_andnot_si128(aGreater, b));
}

float peakSse2(int type, const unsigned char* s, std::size_t n) noexcept {
  std::size_t i = 0;
  if (type == 0 || type == 7 || type == 8) {
    __m128 acc = _mm_setzero_ps();
    if (type == 8) {
      for (; i + 4 <= n; i += 4) {
        const __m128 lo = _mm_cvtpd_ps(_mm_loadu_pd(reinterpret_cast<const double*>(s + 8 * i)));
        const __m128 hi = _mm_cvtpd_ps(_mm_loadu_pd(reinterpret_cast<const double*>(s + 8 * i + 16)));
        acc = absMaxInto(acc, _mm_movelh_ps(lo, hi));
      }
    } else {
      for (; i + 4 <= n; i += 4)
        acc = absMaxInto(acc, _mm_loadu_ps(reinterpret_cast<const float*>(s + 4 * i)));
    }
    alignas(16) float lanes[4];
    _mm_store_ps(lanes, acc);
    return floatTail(type, s + i * bytesPerSampleOfType(type), n - i, largestLane(lanes, 4));
  }

  Range r;
  if (type == 1) {
    __m128i lo = _mm_set1_epi16(INT16_MAX), hi = _mm_set1_epi16(INT16_MIN);
    for (; i + 8 <= n; i += 8) {
      const __m128i v = _mm_loadu_si128(reinterpret_cast<const __m128i*>(s + 2 * i));
      lo = _mm_min_epi16(lo, v);
      hi = _mm_max_epi16(hi, v);
    }
    alignas(16) int16_t l[8], h[8];
    _mm_store_si128(reinterpret_cast<__m128i*>(l), lo);
    _mm_store_si128(reinterpret_cast<__m128i*>(h), hi);
    r = rangeOfLanes(l, h, 8, 0, r);
  } else if (type == 3 || type == 4) {
    // A signed byte with its top bit flipped is the value plus 128, as the
    // offset form stores it; both then compare unsigned.
    const __m128i flip = _mm_set1_epi8(type == 3 ? char(0x80) : 0);
    __m128i lo = _mm_set1_epi8(char(0xFF)), hi = _mm_setzero_si128();
    for (; i + 16 <= n; i += 16) {
      const __m128i v = _mm_xor_si128(_mm_loadu_si128(reinterpret_cast<const __m128i*>(s + i)), flip);
      lo = _mm_min_epu8(lo, v);
      hi = _mm_max_epu8(hi, v);
    }
    alignas(16) uint8_t l[16], h[16];
    _mm_store_si128(reinterpret_cast<__m128i*>(l), lo);
    _mm_store_si128(reinterpret_cast<__m128i*>(h), hi);
    r = rangeOfLanes(l, h, 16, 128, r);
  } else if (type == 5 || type == 6) {
    __m128i lo = _mm_set1_epi32(INT32_MAX), hi = _mm_set1_epi32(INT32_MIN);
    for (; i + 4 <= n; i += 4) {
      __m128i v = _mm_loadu_si128(reinterpret_cast<const __m128i*>(s + 4 * i));
      if (type == 5) v = _mm_srai_epi32(_mm_slli_epi32(v, 8), 8);  // byte 3 ignored, sign from byte 2
      lo = min32(lo, v);
      hi = max32(hi, v);
    }
    alignas(16) int32_t l[4], h[4];
    _mm_store_si128(reinterpret_cast<__m128i*>(l), lo);
    _mm_store_si128(reinterpret_cast<__m128i*>(h), hi);
    r = rangeOfLanes(l, h, 4, 0, r);
  }
  // Packed 24-bit samples need a byte shuffle SSE2 lacks: they take the
  // scalar range loop, still one compare pair per sample.
  r = rangeTail(type, s + i * bytesPerSampleOfType(type), n - i, r);
  return magnitudeOf(type, r);
}

// ---- AVX2 (AVX-512 machines run this too: the scan is bound by memory) ----

TONEBITS_AVX2 inline __m256 absMaxInto(__m256 acc, __m256 v) noexcept {
  const __m256 magnitude = _mm256_and_ps(v, _mm256_castsi256_ps(_mm256_set1_epi32(0x7FFFFFFF)));
  return _mm256_max_ps(magnitude, acc);
}

TONEBITS_AVX2 inline __m256i load256(const unsigned char* p) noexcept {
  return _mm256_loadu_si256(reinterpret_cast<const __m256i*>(p));
}

TONEBITS_AVX2 inline __m256 doublesToFloats(const unsigned char* p) noexcept {
  const __m128 lo = _mm256_cvtpd_ps(_mm256_loadu_pd(reinterpret_cast<const double*>(p)));
  const __m128 hi = _mm256_cvtpd_ps(_mm256_loadu_pd(reinterpret_cast<const double*>(p + 32)));
  return _mm256_insertf128_ps(_mm256_castps128_ps256(lo), hi, 1);
}

TONEBITS_AVX2 float floatPeakAvx2(int type, const unsigned char* s, std::size_t n) noexcept {
  __m256 acc0 = _mm256_setzero_ps(), acc1 = _mm256_setzero_ps();
  std::size_t i = 0;
  if (type == 8) {
    for (; i + 16 <= n; i += 16) {
      acc0 = absMaxInto(acc0, doublesToFloats(s + 8 * i));
      acc1 = absMaxInto(acc1, doublesToFloats(s + 8 * i + 64));
    }
    for (; i + 8 <= n; i += 8) acc0 = absMaxInto(acc0, doublesToFloats(s + 8 * i));
  } else {
    const float* f = reinterpret_cast<const float*>(s);
    for (; i + 16 <= n; i += 16) {
      acc0 = absMaxInto(acc0, _mm256_loadu_ps(f + i));
      acc1 = absMaxInto(acc1, _mm256_loadu_ps(f + i + 8));
    }
    for (; i + 8 <= n; i += 8) acc0 = absMaxInto(acc0, _mm256_loadu_ps(f + i));
  }
  alignas(32) float lanes[8];
  _mm256_store_ps(lanes, _mm256_max_ps(acc0, acc1));
  return floatTail(type, s + i * bytesPerSampleOfType(type), n - i, largestLane(lanes, 8));
}

TONEBITS_AVX2 Range int16RangeAvx2(const unsigned char* s, std::size_t n, std::size_t& i) noexcept {
  __m256i lo0 = _mm256_set1_epi16(INT16_MAX), hi0 = _mm256_set1_epi16(INT16_MIN);
  __m256i lo1 = lo0, hi1 = hi0;
  for (; i + 32 <= n; i += 32) {
    const __m256i a = load256(s + 2 * i), b = load256(s + 2 * i + 32);
    lo0 = _mm256_min_epi16(lo0, a);
    hi0 = _mm256_max_epi16(hi0, a);
    lo1 = _mm256_min_epi16(lo1, b);
    hi1 = _mm256_max_epi16(hi1, b);
  }
  alignas(32) int16_t l[16], h[16];
  _mm256_store_si256(reinterpret_cast<__m256i*>(l), _mm256_min_epi16(lo0, lo1));
  _mm256_store_si256(reinterpret_cast<__m256i*>(h), _mm256_max_epi16(hi0, hi1));
  return rangeOfLanes(l, h, 16, 0, Range());
}

TONEBITS_AVX2 Range int8RangeAvx2(int type, const unsigned char* s, std::size_t n, std::size_t& i) noexcept {
  const __m256i flip = _mm256_set1_epi8(type == 3 ? char(0x80) : 0);  // signed to offset form
  __m256i lo0 = _mm256_set1_epi8(char(0xFF)), hi0 = _mm256_setzero_si256();
  __m256i lo1 = lo0, hi1 = hi0;
  for (; i + 64 <= n; i += 64) {
    const __m256i a = _mm256_xor_si256(load256(s + i), flip), b = _mm256_xor_si256(load256(s + i + 32), flip);
    lo0 = _mm256_min_epu8(lo0, a);
    hi0 = _mm256_max_epu8(hi0, a);
    lo1 = _mm256_min_epu8(lo1, b);
    hi1 = _mm256_max_epu8(hi1, b);
  }
  alignas(32) uint8_t l[32], h[32];
  _mm256_store_si256(reinterpret_cast<__m256i*>(l), _mm256_min_epu8(lo0, lo1));
  _mm256_store_si256(reinterpret_cast<__m256i*>(h), _mm256_max_epu8(hi0, hi1));
  return rangeOfLanes(l, h, 32, 128, Range());
}

// Eight packed 24-bit samples are 24 bytes: the low half takes bytes 0-11
// and the high half bytes 12-23; each sample's three bytes go to the top of
// a 32-bit lane and an arithmetic shift brings the sign down.
TONEBITS_AVX2 inline __m256i unpack24(const unsigned char* p) noexcept {
  const __m256i halves = _mm256_permutevar8x32_epi32(load256(p), _mm256_setr_epi32(0, 1, 2, 3, 3, 4, 5, 6));
  const __m256i toTop = _mm256_setr_epi8(-1, 0, 1, 2, -1, 3, 4, 5, -1, 6, 7, 8, -1, 9, 10, 11,  //
                                         -1, 0, 1, 2, -1, 3, 4, 5, -1, 6, 7, 8, -1, 9, 10, 11);
  return _mm256_srai_epi32(_mm256_shuffle_epi8(halves, toTop), 8);
}

TONEBITS_AVX2 Range int32RangeAvx2(int type, const unsigned char* s, std::size_t n, std::size_t& i) noexcept {
  __m256i lo0 = _mm256_set1_epi32(INT32_MAX), hi0 = _mm256_set1_epi32(INT32_MIN);
  __m256i lo1 = lo0, hi1 = hi0;
  if (type == 2) {
    // The 32-byte load reaches 8 bytes past the 24 it uses: stop while it
    // stays inside the block.
    for (; (i + 16) * 3 + 8 <= n * 3; i += 16) {
      const __m256i a = unpack24(s + 3 * i), b = unpack24(s + 3 * i + 24);
      lo0 = _mm256_min_epi32(lo0, a);
      hi0 = _mm256_max_epi32(hi0, a);
      lo1 = _mm256_min_epi32(lo1, b);
      hi1 = _mm256_max_epi32(hi1, b);
    }
    for (; (i + 8) * 3 + 8 <= n * 3; i += 8) {
      const __m256i v = unpack24(s + 3 * i);
      lo0 = _mm256_min_epi32(lo0, v);
      hi0 = _mm256_max_epi32(hi0, v);
    }
  } else {
    for (; i + 16 <= n; i += 16) {
      __m256i a = load256(s + 4 * i), b = load256(s + 4 * i + 32);
      if (type == 5) {  // byte 3 ignored, sign from byte 2
        a = _mm256_srai_epi32(_mm256_slli_epi32(a, 8), 8);
        b = _mm256_srai_epi32(_mm256_slli_epi32(b, 8), 8);
      }
      lo0 = _mm256_min_epi32(lo0, a);
      hi0 = _mm256_max_epi32(hi0, a);
      lo1 = _mm256_min_epi32(lo1, b);
      hi1 = _mm256_max_epi32(hi1, b);
    }
  }
  alignas(32) int32_t l[8], h[8];
  _mm256_store_si256(reinterpret_cast<__m256i*>(l), _mm256_min_epi32(lo0, lo1));
  _mm256_store_si256(reinterpret_cast<__m256i*>(h), _mm256_max_epi32(hi0, hi1));
  return rangeOfLanes(l, h, 8, 0, Range());
}

TONEBITS_AVX2 float peakAvx2(int type, const unsigned char* s, std::size_t n) noexcept {
  if (type == 0 || type == 7 || type == 8) return floatPeakAvx2(type, s, n);
  std::size_t i = 0;
  Range r;
  switch (type) {
    case 1: r = int16RangeAvx2(s, n, i); break;
    case 3:
    case 4: r = int8RangeAvx2(type, s, n, i); break;
    default: r = int32RangeAvx2(type, s, n, i); break;
  }
  r = rangeTail(type, s + i * bytesPerSampleOfType(type), n - i, r);
  return magnitudeOf(type, r);
}

#endif  // TONEBITS_PEAK_X86

}  // namespace

float samplePeak(int sampleType, const unsigned char* samples, std::size_t count) noexcept {
  if (bytesPerSampleOfType(sampleType) == 0 || count == 0 || !samples) return 0.0f;
#if defined(TONEBITS_PEAK_X86)
  switch (Simd::activeLevel()) {
    case Simd::eScalar: break;
    case Simd::eSSE2: return peakSse2(sampleType, samples, count);
    case Simd::eAVX2:
    case Simd::eAVX512: return peakAvx2(sampleType, samples, count);
  }
#endif
  return peakReference(sampleType, samples, count);
}

}  // namespace Aud::Private
