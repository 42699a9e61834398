// SSE2 block conversions, the baseline of every x86-64 CPU. Same structure
// and the same bit-exactness arguments as the AVX2 kernels: whole vectors,
// then the scalar rule for the rest; no byte outside the count samples is
// read or written. SSE2 has no byte shuffle, so the 24-bit forms are packed
// and unpacked with 64-bit shifts and masks.
#if defined(__x86_64__) || defined(__i386__)

#include <emmintrin.h>

#include "tonebits/foundation/Aud__SampleConversionKernels.h"

#define TONEBITS_SSE2 __attribute__((target("sse2")))

namespace Aud::detail {

namespace {

using SampleRules::kFloatMax;
using SampleRules::kInt16Max;
using SampleRules::kInt8Max;

TONEBITS_SSE2 inline __m128i load16B(const unsigned char* p) noexcept {
  return _mm_loadu_si128(reinterpret_cast<const __m128i*>(p));
}
TONEBITS_SSE2 inline __m128i load8B(const unsigned char* p) noexcept {
  return _mm_loadl_epi64(reinterpret_cast<const __m128i*>(p));
}
TONEBITS_SSE2 inline void store16B(unsigned char* p, __m128i v) noexcept {
  _mm_storeu_si128(reinterpret_cast<__m128i*>(p), v);
}

TONEBITS_SSE2 inline __m128 clampKeepNaN(__m128 v, float lo, float hi) noexcept {
  return _mm_max_ps(_mm_set1_ps(lo), _mm_min_ps(_mm_set1_ps(hi), v));
}
TONEBITS_SSE2 inline __m128 zeroNaN(__m128 v) noexcept { return _mm_and_ps(v, _mm_cmpord_ps(v, v)); }
TONEBITS_SSE2 inline __m128i toInt(const float* p, float lo, float hi, float scale) noexcept {
  const __m128 v = clampKeepNaN(zeroNaN(_mm_loadu_ps(p)), lo, hi);
  return _mm_cvttps_epi32(_mm_mul_ps(v, _mm_set1_ps(scale)));
}
TONEBITS_SSE2 inline void storeScaled(float* p, __m128i v, float scale) noexcept {
  _mm_storeu_ps(p, _mm_mul_ps(_mm_cvtepi32_ps(v), _mm_set1_ps(scale)));
}
// Sign-extends the low or high four 16-bit values to 32 bits.
TONEBITS_SSE2 inline __m128i widenLo16(__m128i v) noexcept {
  return _mm_srai_epi32(_mm_unpacklo_epi16(v, v), 16);
}
TONEBITS_SSE2 inline __m128i widenHi16(__m128i v) noexcept {
  return _mm_srai_epi32(_mm_unpackhi_epi16(v, v), 16);
}

// ---- to float ----

TONEBITS_SSE2 void int16ToFloat(const unsigned char* src, float* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 8 <= count; i += 8) {
    const __m128i v = load16B(src + 2 * i);
    storeScaled(dst + i, widenLo16(v), 0x1p-15f);
    storeScaled(dst + i + 4, widenHi16(v), 0x1p-15f);
  }
  toFloatLoop<SampleRules::int16ToFloat, 2>(src + 2 * i, dst + i, count - i);
}

TONEBITS_SSE2 void int24ToFloat(const unsigned char* src, float* dst, std::size_t count) noexcept {
  // Samples 0,1 come from bytes 0..7 and samples 2,3 from bytes 6..11, one
  // pair per 64-bit half, at byte offsets 0 and 3; the shifts lift each
  // sample to the top three bytes of its word.
  const __m128i first = _mm_set1_epi64x(0x00000000FFFFFF00LL);
  const __m128i second = _mm_set1_epi64x(static_cast<long long>(0xFFFFFF0000000000ULL));
  std::size_t i = 0;
  for (; i + 4 <= count; i += 4) {
    const unsigned char* p = src + 3 * i;
    const __m128i pairs = _mm_unpacklo_epi64(load8B(p), _mm_srli_epi64(load8B(p + 4), 16));
    const __m128i words = _mm_or_si128(_mm_and_si128(_mm_slli_epi64(pairs, 8), first),
                                       _mm_and_si128(_mm_slli_epi64(pairs, 16), second));
    storeScaled(dst + i, _mm_srai_epi32(words, 8), 0x1p-23f);
  }
  toFloatLoop<SampleRules::int24ToFloat, 3>(src + 3 * i, dst + i, count - i);
}

// Types 3 and 4: type 4 less its offset of 128 is its byte with the top bit
// flipped, read as signed.
template <int Flip, float (*Rule)(const unsigned char*) noexcept>
TONEBITS_SSE2 void int8ToFloat(const unsigned char* src, float* dst, std::size_t count) noexcept {
  const __m128i flip = _mm_set1_epi8(static_cast<char>(Flip));
  std::size_t i = 0;
  for (; i + 16 <= count; i += 16) {
    const __m128i b = _mm_xor_si128(load16B(src + i), flip);
    const __m128i lo = _mm_srai_epi16(_mm_unpacklo_epi8(b, b), 8),
                  hi = _mm_srai_epi16(_mm_unpackhi_epi8(b, b), 8);
    storeScaled(dst + i, widenLo16(lo), 0x1p-7f);
    storeScaled(dst + i + 4, widenHi16(lo), 0x1p-7f);
    storeScaled(dst + i + 8, widenLo16(hi), 0x1p-7f);
    storeScaled(dst + i + 12, widenHi16(hi), 0x1p-7f);
  }
  toFloatLoop<Rule, 1>(src + i, dst + i, count - i);
}

TONEBITS_SSE2 void int24in32ToFloat(const unsigned char* src, float* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 4 <= count; i += 4)
    storeScaled(dst + i, _mm_srai_epi32(_mm_slli_epi32(load16B(src + 4 * i), 8), 8), 0x1p-23f);
  toFloatLoop<SampleRules::int24in32ToFloat, 4>(src + 4 * i, dst + i, count - i);
}

// See kInt32Reciprocal: the product rounds to the float of the quotient.
TONEBITS_SSE2 inline __m128 int32ToFloat2(__m128i v) noexcept {
  return _mm_cvtpd_ps(
      _mm_mul_pd(_mm_add_pd(_mm_cvtepi32_pd(v), _mm_set1_pd(0.5)), _mm_set1_pd(kInt32Reciprocal)));
}

TONEBITS_SSE2 void int32ToFloat(const unsigned char* src, float* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 4 <= count; i += 4) {
    const __m128i v = load16B(src + 4 * i);
    _mm_storeu_ps(dst + i, _mm_movelh_ps(int32ToFloat2(v), int32ToFloat2(_mm_shuffle_epi32(v, 0xEE))));
  }
  toFloatLoop<SampleRules::int32ToFloat, 4>(src + 4 * i, dst + i, count - i);
}

TONEBITS_SSE2 void doubleToFloat(const unsigned char* src, float* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 4 <= count; i += 4) {
    const double* p = reinterpret_cast<const double*>(src + 8 * i);
    _mm_storeu_ps(dst + i, _mm_movelh_ps(_mm_cvtpd_ps(_mm_loadu_pd(p)), _mm_cvtpd_ps(_mm_loadu_pd(p + 2))));
  }
  toFloatLoop<SampleRules::doubleToFloat, 8>(src + 8 * i, dst + i, count - i);
}

// ---- from float ----

TONEBITS_SSE2 void floatToFloat32(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 4 <= count; i += 4)
    _mm_storeu_ps(reinterpret_cast<float*>(dst + 4 * i),
                  clampKeepNaN(_mm_loadu_ps(src + i), -1.0f, kFloatMax));
  fromFloatLoop<SampleRules::floatToFloat32, 4>(src + i, dst + 4 * i, count - i);
}

TONEBITS_SSE2 void floatToInt16(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 8 <= count; i += 8) {
    const __m128i a = toInt(src + i, -1.0f, kInt16Max, 32768.0f);
    const __m128i b = toInt(src + i + 4, -1.0f, kInt16Max, 32768.0f);
    store16B(dst + 2 * i, _mm_packs_epi32(a, b));
  }
  fromFloatLoop<SampleRules::floatToInt16, 2>(src + i, dst + 2 * i, count - i);
}

TONEBITS_SSE2 void floatToInt24(const float* src, unsigned char* dst, std::size_t count) noexcept {
  // Each 64-bit half packs its two samples into its low 6 bytes; the upper
  // half then slides down to bytes 6..11.
  const __m128i first = _mm_set1_epi64x(0x0000000000FFFFFFLL);
  const __m128i second = _mm_set1_epi64x(0x0000FFFFFF000000LL);
  std::size_t i = 0;
  for (; i + 4 <= count; i += 4) {
    // A NaN passes the clamp and converts to 0x80000000, whose low three
    // bytes are the silence it must give.
    const __m128 v = clampKeepNaN(_mm_loadu_ps(src + i), -1.0f, kFloatMax);
    const __m128i words = _mm_cvttps_epi32(_mm_mul_ps(v, _mm_set1_ps(8388608.0f)));
    const __m128i pairs =
        _mm_or_si128(_mm_and_si128(words, first), _mm_and_si128(_mm_srli_epi64(words, 8), second));
    const __m128i bytes = _mm_or_si128(_mm_move_epi64(pairs), _mm_slli_si128(_mm_srli_si128(pairs, 8), 6));
    unsigned char* p = dst + 3 * i;
    _mm_storel_epi64(reinterpret_cast<__m128i*>(p), bytes);
    const int last = _mm_cvtsi128_si32(_mm_srli_si128(bytes, 8));
    std::memcpy(p + 8, &last, 4);
  }
  fromFloatLoop<SampleRules::floatToInt24, 3>(src + i, dst + 3 * i, count - i);
}

TONEBITS_SSE2 void floatToInt8(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 16 <= count; i += 16) {
    const __m128i a = toInt(src + i, -1.0f, kInt8Max, 128.0f),
                  b = toInt(src + i + 4, -1.0f, kInt8Max, 128.0f);
    const __m128i c = toInt(src + i + 8, -1.0f, kInt8Max, 128.0f);
    const __m128i d = toInt(src + i + 12, -1.0f, kInt8Max, 128.0f);
    store16B(dst + i, _mm_packs_epi16(_mm_packs_epi32(a, b), _mm_packs_epi32(c, d)));
  }
  fromFloatLoop<SampleRules::floatToInt8, 1>(src + i, dst + i, count - i);
}

TONEBITS_SSE2 inline __m128i offsetByteValue(const float* p) noexcept {
  const __m128 shifted = _mm_add_ps(zeroNaN(_mm_loadu_ps(p)), _mm_set1_ps(1.0f));
  return _mm_cvttps_epi32(_mm_mul_ps(clampKeepNaN(shifted, 0.0f, 2.0f), _mm_set1_ps(127.5f)));
}

TONEBITS_SSE2 void floatToUint8(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 16 <= count; i += 16) {
    const __m128i a = offsetByteValue(src + i), b = offsetByteValue(src + i + 4);
    const __m128i c = offsetByteValue(src + i + 8), d = offsetByteValue(src + i + 12);
    store16B(dst + i, _mm_packus_epi16(_mm_packs_epi32(a, b), _mm_packs_epi32(c, d)));
  }
  fromFloatLoop<SampleRules::floatToUint8, 1>(src + i, dst + i, count - i);
}

TONEBITS_SSE2 void floatToInt24in32(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 4 <= count; i += 4) store16B(dst + 4 * i, toInt(src + i, -1.0f, kFloatMax, 8388608.0f));
  fromFloatLoop<SampleRules::floatToInt24in32, 4>(src + i, dst + 4 * i, count - i);
}

// The reference's own double arithmetic: without a rounding instruction the
// float method of the AVX2 kernel (see kInt32Scale) costs more than this.
TONEBITS_SSE2 inline __m128i int32OfPair(__m128 v) noexcept {
  const __m128d d = _mm_mul_pd(_mm_cvtps_pd(v), _mm_set1_pd(2147483647.5));
  return _mm_cvttpd_epi32(_mm_sub_pd(d, _mm_set1_pd(0.5)));
}

TONEBITS_SSE2 void floatToInt32(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 4 <= count; i += 4) {
    const __m128 v = clampKeepNaN(zeroNaN(_mm_loadu_ps(src + i)), -1.0f, 1.0f);
    store16B(dst + 4 * i, _mm_unpacklo_epi64(int32OfPair(v), int32OfPair(_mm_movehl_ps(v, v))));
  }
  fromFloatLoop<SampleRules::floatToInt32, 4>(src + i, dst + 4 * i, count - i);
}

TONEBITS_SSE2 void floatToDouble(const float* src, unsigned char* dst, std::size_t count) noexcept {
  std::size_t i = 0;
  for (; i + 4 <= count; i += 4) {
    const __m128 v = _mm_loadu_ps(src + i);
    double* p = reinterpret_cast<double*>(dst + 8 * i);
    _mm_storeu_pd(p, _mm_cvtps_pd(v));
    _mm_storeu_pd(p + 2, _mm_cvtps_pd(_mm_movehl_ps(v, v)));
  }
  fromFloatLoop<SampleRules::floatToDouble, 8>(src + i, dst + 8 * i, count - i);
}

}  // namespace

constexpr ConversionKernels kSSE2Kernels = {
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
