// AVX2 block conversions. Each kernel handles whole vectors, then hands the
// remaining samples to the scalar rule. Loads and stores are unaligned and
// never touch a byte outside the count samples.
//
// Bit-exactness notes, shared with the SSE2 kernels:
// - minps/maxps return their second operand when either is NaN, so
//   clampKeepNaN(v) = max(lo, min(hi, v)) lets a NaN through exactly as the
//   reference's compare chain does (type 0).
// - The integer forms zero a NaN first, then clamp; the clamped, scaled value
//   is always in range, so cvttps2dq never yields its 0x80000000 overflow
//   marker, and the reference's 24-bit limit is already met. Type 2 lets the
//   NaN through instead: 0x80000000 has the silent low three bytes it keeps.
// - Type 4 adds 1.0 in float: a double sum of two floats rounded to float is
//   the float sum (double has more than 2 * 24 + 2 bits).
#if defined(__x86_64__) || defined(__i386__)

#include <immintrin.h>

#include "tonebits/foundation/Aud__SampleConversionKernels.h"

#define TONEBITS_AVX2 __attribute__((target("avx2")))

namespace Aud::detail {

namespace {

using SampleRules::kFloatMax;
using SampleRules::kInt16Max;
using SampleRules::kInt8Max;

TONEBITS_AVX2 inline __m256 load8(const float* p) noexcept { return _mm256_loadu_ps(p); }
TONEBITS_AVX2 inline void store8(float* p, __m256 v) noexcept { _mm256_storeu_ps(p, v); }
TONEBITS_AVX2 inline __m128i load16B(const unsigned char* p) noexcept {
  return _mm_loadu_si128(reinterpret_cast<const __m128i*>(p));
}
TONEBITS_AVX2 inline __m256i load32B(const unsigned char* p) noexcept {
  return _mm256_loadu_si256(reinterpret_cast<const __m256i*>(p));
}
TONEBITS_AVX2 inline void store16B(unsigned char* p, __m128i v) noexcept {
  _mm_storeu_si128(reinterpret_cast<__m128i*>(p), v);
}
TONEBITS_AVX2 inline void store32B(unsigned char* p, __m256i v) noexcept {
  _mm256_storeu_si256(reinterpret_cast<__m256i*>(p), v);
}

TONEBITS_AVX2 inline __m256 clampKeepNaN(__m256 v, float lo, float hi) noexcept {
  return _mm256_max_ps(_mm256_set1_ps(lo), _mm256_min_ps(_mm256_set1_ps(hi), v));
}
TONEBITS_AVX2 inline __m256 clampNaNToZero(__m256 v, float lo, float hi) noexcept {
  return clampKeepNaN(_mm256_and_ps(v, _mm256_cmp_ps(v, v, _CMP_ORD_Q)), lo, hi);
}
// Clamped, scaled and truncated: the integer sample of eight floats.
TONEBITS_AVX2 inline __m256i toInt(const float* p, float lo, float hi, float scale) noexcept {
  return _mm256_cvttps_epi32(_mm256_mul_ps(clampNaNToZero(load8(p), lo, hi), _mm256_set1_ps(scale)));
}
TONEBITS_AVX2 inline __m256 scaled(__m256i v, float scale) noexcept {
  return _mm256_mul_ps(_mm256_cvtepi32_ps(v), _mm256_set1_ps(scale));
}

// ---- to float ----

TONEBITS_AVX2 void int16ToFloat(const unsigned char* src, float* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 16 <= count; i += 16) {
    const __m128i a = load16B(src + 2 * i), b = load16B(src + 2 * i + 16);
    store8(dst + i, scaled(_mm256_cvtepi16_epi32(a), 0x1p-15f));
    store8(dst + i + 8, scaled(_mm256_cvtepi16_epi32(b), 0x1p-15f));
  }
  toFloatLoop<SampleRules::int16ToFloat, 2>(src + 2 * i, dst + i, count - i);
}

TONEBITS_AVX2 void int24ToFloat(const unsigned char* src, float* dst, std::size_t count) noexcept {
  // Lane 0 holds bytes 0..15 and lane 1 bytes 8..23 of eight samples; each
  // sample goes to the top three bytes of its word, then shifts down with
  // its sign.
  const __m256i spread = _mm256_setr_epi8(                   //
      -1, 0, 1, 2, -1, 3, 4, 5, -1, 6, 7, 8, -1, 9, 10, 11,  //
      -1, 4, 5, 6, -1, 7, 8, 9, -1, 10, 11, 12, -1, 13, 14, 15);
  std::size_t i = 0;
  for (; i + 8 <= count; i += 8) {
    const unsigned char* p = src + 3 * i;
    const __m256i bytes = _mm256_inserti128_si256(_mm256_castsi128_si256(load16B(p)), load16B(p + 8), 1);
    const __m256i words = _mm256_srai_epi32(_mm256_shuffle_epi8(bytes, spread), 8);
    store8(dst + i, scaled(words, 0x1p-23f));
  }
  toFloatLoop<SampleRules::int24ToFloat, 3>(src + 3 * i, dst + i, count - i);
}

// Types 3 and 4: type 4 less its offset of 128 is its byte with the top bit
// flipped, read as signed.
template <int Flip, float (*Rule)(const unsigned char*) noexcept>
TONEBITS_AVX2 void int8ToFloat(const unsigned char* src, float* dst, std::size_t count) noexcept {
  const __m128i flip = _mm_set1_epi8(static_cast<char>(Flip));
  std::size_t i = 0;
  for (; i + 16 <= count; i += 16) {
    const __m128i b = _mm_xor_si128(load16B(src + i), flip);
    store8(dst + i, scaled(_mm256_cvtepi8_epi32(b), 0x1p-7f));
    store8(dst + i + 8, scaled(_mm256_cvtepi8_epi32(_mm_srli_si128(b, 8)), 0x1p-7f));
  }
  toFloatLoop<Rule, 1>(src + i, dst + i, count - i);
}

TONEBITS_AVX2 void int24in32ToFloat(const unsigned char* src, float* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 8 <= count; i += 8) {
    const __m256i words = _mm256_srai_epi32(_mm256_slli_epi32(load32B(src + 4 * i), 8), 8);
    store8(dst + i, scaled(words, 0x1p-23f));
  }
  toFloatLoop<SampleRules::int24in32ToFloat, 4>(src + 4 * i, dst + i, count - i);
}

// See kInt32Reciprocal: the product rounds to the float of the quotient.
TONEBITS_AVX2 inline __m128 int32ToFloat4(__m128i v) noexcept {
  const __m256d q = _mm256_mul_pd(_mm256_add_pd(_mm256_cvtepi32_pd(v), _mm256_set1_pd(0.5)),
                                  _mm256_set1_pd(kInt32Reciprocal));
  return _mm256_cvtpd_ps(q);
}

TONEBITS_AVX2 void int32ToFloat(const unsigned char* src, float* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 8 <= count; i += 8) {
    const __m128 a = int32ToFloat4(load16B(src + 4 * i)), b = int32ToFloat4(load16B(src + 4 * i + 16));
    store8(dst + i, _mm256_set_m128(b, a));
  }
  toFloatLoop<SampleRules::int32ToFloat, 4>(src + 4 * i, dst + i, count - i);
}

TONEBITS_AVX2 void doubleToFloat(const unsigned char* src, float* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 8 <= count; i += 8) {
    const double* p = reinterpret_cast<const double*>(src + 8 * i);
    const __m128 a = _mm256_cvtpd_ps(_mm256_loadu_pd(p)), b = _mm256_cvtpd_ps(_mm256_loadu_pd(p + 4));
    store8(dst + i, _mm256_set_m128(b, a));
  }
  toFloatLoop<SampleRules::doubleToFloat, 8>(src + 8 * i, dst + i, count - i);
}

// ---- from float ----

TONEBITS_AVX2 void floatToFloat32(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 8 <= count; i += 8)
    _mm256_storeu_ps(reinterpret_cast<float*>(dst + 4 * i), clampKeepNaN(load8(src + i), -1.0f, kFloatMax));
  fromFloatLoop<SampleRules::floatToFloat32, 4>(src + i, dst + 4 * i, count - i);
}

TONEBITS_AVX2 void floatToInt16(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 16 <= count; i += 16) {
    const __m256i a = toInt(src + i, -1.0f, kInt16Max, 32768.0f);
    const __m256i b = toInt(src + i + 8, -1.0f, kInt16Max, 32768.0f);
    store32B(dst + 2 * i, _mm256_permute4x64_epi64(_mm256_packs_epi32(a, b), 0xD8));
  }
  fromFloatLoop<SampleRules::floatToInt16, 2>(src + i, dst + 2 * i, count - i);
}

TONEBITS_AVX2 inline __m256i int24Bytes(const float* p) noexcept {
  // Each lane packs its four samples into its low 12 bytes; the permute
  // joins the two lanes into 24 contiguous bytes.
  const __m256i pack = _mm256_setr_epi8(                       //
      0, 1, 2, 4, 5, 6, 8, 9, 10, 12, 13, 14, -1, -1, -1, -1,  //
      0, 1, 2, 4, 5, 6, 8, 9, 10, 12, 13, 14, -1, -1, -1, -1);
  const __m256i words = _mm256_cvttps_epi32(
      _mm256_mul_ps(clampKeepNaN(load8(p), -1.0f, kFloatMax), _mm256_set1_ps(8388608.0f)));
  return _mm256_permutevar8x32_epi32(_mm256_shuffle_epi8(words, pack),
                                     _mm256_setr_epi32(0, 1, 2, 4, 5, 6, 3, 7));
}

TONEBITS_AVX2 void floatToInt24(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  // One 32-byte store per eight samples: its last 8 bytes are overwritten by
  // the next store, so it runs while 32 bytes of destination remain.
  for (; i + 11 <= count; i += 8) store32B(dst + 3 * i, int24Bytes(src + i));
  for (; i + 8 <= count; i += 8) {
    const __m256i bytes = int24Bytes(src + i);
    store16B(dst + 3 * i, _mm256_castsi256_si128(bytes));
    _mm_storel_epi64(reinterpret_cast<__m128i*>(dst + 3 * i + 16), _mm256_extracti128_si256(bytes, 1));
  }
  fromFloatLoop<SampleRules::floatToInt24, 3>(src + i, dst + 3 * i, count - i);
}

// Types 3 and 4 pack 32 samples to bytes. The two in-lane packs leave the
// eight 4-byte groups in the order a0 b0 c0 d0 a1 b1 c1 d1; the permute puts
// them back in sample order.
TONEBITS_AVX2 inline __m256i packBytesInOrder(__m256i bytes) noexcept {
  return _mm256_permutevar8x32_epi32(bytes, _mm256_setr_epi32(0, 4, 1, 5, 2, 6, 3, 7));
}

TONEBITS_AVX2 void floatToInt8(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 32 <= count; i += 32) {
    const __m256i a = toInt(src + i, -1.0f, kInt8Max, 128.0f),
                  b = toInt(src + i + 8, -1.0f, kInt8Max, 128.0f);
    const __m256i c = toInt(src + i + 16, -1.0f, kInt8Max, 128.0f);
    const __m256i d = toInt(src + i + 24, -1.0f, kInt8Max, 128.0f);
    const __m256i bytes = _mm256_packs_epi16(_mm256_packs_epi32(a, b), _mm256_packs_epi32(c, d));
    store32B(dst + i, packBytesInOrder(bytes));
  }
  fromFloatLoop<SampleRules::floatToInt8, 1>(src + i, dst + i, count - i);
}

TONEBITS_AVX2 inline __m256i offsetByteValue(const float* p) noexcept {
  const __m256 v = load8(p);
  const __m256 shifted =
      _mm256_add_ps(_mm256_and_ps(v, _mm256_cmp_ps(v, v, _CMP_ORD_Q)), _mm256_set1_ps(1.0f));
  return _mm256_cvttps_epi32(_mm256_mul_ps(clampKeepNaN(shifted, 0.0f, 2.0f), _mm256_set1_ps(127.5f)));
}

TONEBITS_AVX2 void floatToUint8(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 32 <= count; i += 32) {
    const __m256i a = offsetByteValue(src + i), b = offsetByteValue(src + i + 8);
    const __m256i c = offsetByteValue(src + i + 16), d = offsetByteValue(src + i + 24);
    const __m256i bytes = _mm256_packus_epi16(_mm256_packs_epi32(a, b), _mm256_packs_epi32(c, d));
    store32B(dst + i, packBytesInOrder(bytes));
  }
  fromFloatLoop<SampleRules::floatToUint8, 1>(src + i, dst + i, count - i);
}

TONEBITS_AVX2 void floatToInt24in32(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 8 <= count; i += 8) store32B(dst + 4 * i, toInt(src + i, -1.0f, kFloatMax, 8388608.0f));
  fromFloatLoop<SampleRules::floatToInt24in32, 4>(src + i, dst + 4 * i, count - i);
}

// See kInt32Scale.
TONEBITS_AVX2 void floatToInt32(const float* src, unsigned char* dst, std::size_t count) noexcept {
  const __m256 sign = _mm256_set1_ps(-0.0f), scale = _mm256_set1_ps(kInt32Scale), one = _mm256_set1_ps(1.0f);
  std::size_t i = 0;
  for (; i + 8 <= count; i += 8) {
    const __m256 c = load8(src + i);
    // |F|, clamped; maxps returns its second operand, 0, for a NaN.
    const __m256 f = _mm256_min_ps(
        _mm256_max_ps(_mm256_mul_ps(_mm256_andnot_ps(sign, c), scale), _mm256_setzero_ps()), scale);
    const __m256 whole = _mm256_round_ps(f, _MM_FROUND_TO_ZERO | _MM_FROUND_NO_EXC);
    const __m256 up =
        _mm256_and_ps(_mm256_cmp_ps(_mm256_sub_ps(f, whole), _mm256_set1_ps(0.5f), _CMP_GT_OQ), one);
    const __m256 q = _mm256_or_ps(_mm256_add_ps(whole, up), _mm256_and_ps(c, sign));  // +-Q
    const __m256i less = _mm256_castps_si256(_mm256_cmp_ps(q, one, _CMP_GE_OQ));      // -1 where Q - 1 is due
    store32B(dst + 4 * i, _mm256_add_epi32(_mm256_cvttps_epi32(q), less));
  }
  fromFloatLoop<SampleRules::floatToInt32, 4>(src + i, dst + 4 * i, count - i);
}

TONEBITS_AVX2 void floatToDouble(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 8 <= count; i += 8) {
    double* p = reinterpret_cast<double*>(dst + 8 * i);
    _mm256_storeu_pd(p, _mm256_cvtps_pd(_mm_loadu_ps(src + i)));
    _mm256_storeu_pd(p + 4, _mm256_cvtps_pd(_mm_loadu_ps(src + i + 4)));
  }
  fromFloatLoop<SampleRules::floatToDouble, 8>(src + i, dst + 8 * i, count - i);
}

}  // namespace

constexpr ConversionKernels kAVX2Kernels = {
    {
        copyFloats,
        int16ToFloat,
        int24ToFloat,
        int8ToFloat<0, SampleRules::int8ToFloat>,
        int8ToFloat<0x80, SampleRules::uint8ToFloat>,
        int24in32ToFloat,
        int32ToFloat,
        copyFloats,
        doubleToFloat,
    },
    {
        floatToFloat32,
        floatToInt16,
        floatToInt24,
        floatToInt8,
        floatToUint8,
        floatToInt24in32,
        floatToInt32,
        copyFloats,
        floatToDouble,
    },
};

}  // namespace Aud::detail

#endif
