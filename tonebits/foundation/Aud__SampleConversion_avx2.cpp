// AVX2 block conversions. Each kernel is a group step (load, convert, store
// kStep samples) run by one driver, then the scalar rule for the samples
// after the last whole group. Loads and stores are unaligned and never touch
// a byte outside the count samples.
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

#include "tonebits/foundation/Aud__SampleConversion_internal.h"

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
// Zeroed if NaN, clamped, scaled and truncated: the integer samples.
TONEBITS_AVX2 inline __m256i toInt(__m256 v, float lo, float hi, float scale) noexcept {
  const __m256 c = clampKeepNaN(_mm256_and_ps(v, _mm256_cmp_ps(v, v, _CMP_ORD_Q)), lo, hi);
  return _mm256_cvttps_epi32(_mm256_mul_ps(c, _mm256_set1_ps(scale)));
}
TONEBITS_AVX2 inline __m256 scaled(__m256i v, float scale) noexcept {
  return _mm256_mul_ps(_mm256_cvtepi32_ps(v), _mm256_set1_ps(scale));
}

// Runs K (see ToFloatKernelBase) over count samples: four groups per
// iteration with every load issued before the stores (the compiler may not
// hoist a load above a store to memory it cannot prove distinct, and the
// streams stall on it; this alone takes some kernels from 1.4 to 1.0 times
// memcpy), then single groups, then the scalar rule.
template <class K>
TONEBITS_AVX2 inline void run(const typename K::In* src, typename K::Out* dst, std::size_t count) noexcept {
  constexpr std::size_t step = K::kStep, in = K::kInStride, out = K::kOutStride;
  std::size_t i = 0;
  for (; i + 4 * step + K::kSlack <= count; i += 4 * step) {
    const auto a = K::load(src + i * in), b = K::load(src + (i + step) * in);
    const auto c = K::load(src + (i + 2 * step) * in), d = K::load(src + (i + 3 * step) * in);
    K::storeWide(dst + i * out, a);
    K::storeWide(dst + (i + step) * out, b);
    K::storeWide(dst + (i + 2 * step) * out, c);
    K::storeWide(dst + (i + 3 * step) * out, d);
  }
  for (; i + step <= count; i += step) K::store(dst + i * out, K::load(src + i * in));
  K::tail(src + i * in, dst + i * out, count - i);
}

template <unsigned Bytes, float (*Rule)(const unsigned char*) noexcept>
using ToFloat = ToFloatKernelBase<Bytes, Rule>;
template <unsigned Bytes, void (*Rule)(float, unsigned char*) noexcept>
using FromFloat = FromFloatKernelBase<Bytes, Rule>;

// ---- to float ----

struct Int16In : ToFloat<2, SampleRules::int16ToFloat> {
  static constexpr std::size_t kStep = 8;
  TONEBITS_AVX2 static __m128i load(const In* p) noexcept { return load16B(p); }
  TONEBITS_AVX2 static void store(Out* p, __m128i v) noexcept {
    store8(p, scaled(_mm256_cvtepi16_epi32(v), 0x1p-15f));
  }
  TONEBITS_AVX2 static void storeWide(Out* p, __m128i v) noexcept { store(p, v); }
};

struct Int24In : ToFloat<3, SampleRules::int24ToFloat> {
  static constexpr std::size_t kStep = 8;
  // Lane 0 holds bytes 0..15 and lane 1 bytes 8..23 of eight samples.
  TONEBITS_AVX2 static __m256i load(const In* p) noexcept {
    return _mm256_inserti128_si256(_mm256_castsi128_si256(load16B(p)), load16B(p + 8), 1);
  }
  // Each sample goes to the top three bytes of its word, then shifts down
  // with its sign.
  TONEBITS_AVX2 static void store(Out* p, __m256i bytes) noexcept {
    const __m256i spread = _mm256_setr_epi8(                   //
        -1, 0, 1, 2, -1, 3, 4, 5, -1, 6, 7, 8, -1, 9, 10, 11,  //
        -1, 4, 5, 6, -1, 7, 8, 9, -1, 10, 11, 12, -1, 13, 14, 15);
    store8(p, scaled(_mm256_srai_epi32(_mm256_shuffle_epi8(bytes, spread), 8), 0x1p-23f));
  }
  TONEBITS_AVX2 static void storeWide(Out* p, __m256i v) noexcept { store(p, v); }
};

// Types 3 and 4: type 4 less its offset of 128 is its byte with the top bit
// flipped, read as signed.
template <int Flip, float (*Rule)(const unsigned char*) noexcept>
struct Int8In : ToFloat<1, Rule> {
  using typename ToFloat<1, Rule>::In;
  using typename ToFloat<1, Rule>::Out;
  static constexpr std::size_t kStep = 8;
  TONEBITS_AVX2 static __m128i load(const In* p) noexcept {
    return _mm_loadl_epi64(reinterpret_cast<const __m128i*>(p));
  }
  TONEBITS_AVX2 static void store(Out* p, __m128i v) noexcept {
    const __m128i flipped = _mm_xor_si128(v, _mm_set1_epi8(static_cast<char>(Flip)));
    store8(p, scaled(_mm256_cvtepi8_epi32(flipped), 0x1p-7f));
  }
  TONEBITS_AVX2 static void storeWide(Out* p, __m128i v) noexcept { store(p, v); }
};

struct Int24in32In : ToFloat<4, SampleRules::int24in32ToFloat> {
  static constexpr std::size_t kStep = 8;
  TONEBITS_AVX2 static __m256i load(const In* p) noexcept { return load32B(p); }
  TONEBITS_AVX2 static void store(Out* p, __m256i v) noexcept {
    store8(p, scaled(_mm256_srai_epi32(_mm256_slli_epi32(v, 8), 8), 0x1p-23f));
  }
  TONEBITS_AVX2 static void storeWide(Out* p, __m256i v) noexcept { store(p, v); }
};

// See kInt32Reciprocal: the product rounds to the float of the quotient.
TONEBITS_AVX2 inline __m128 int32ToFloat4(__m128i v) noexcept {
  const __m256d q = _mm256_mul_pd(_mm256_add_pd(_mm256_cvtepi32_pd(v), _mm256_set1_pd(0.5)),
                                  _mm256_set1_pd(kInt32Reciprocal));
  return _mm256_cvtpd_ps(q);
}

struct Int32In : ToFloat<4, SampleRules::int32ToFloat> {
  static constexpr std::size_t kStep = 8;
  TONEBITS_AVX2 static __m256i load(const In* p) noexcept { return load32B(p); }
  TONEBITS_AVX2 static void store(Out* p, __m256i v) noexcept {
    store8(p, _mm256_set_m128(int32ToFloat4(_mm256_extracti128_si256(v, 1)),
                              int32ToFloat4(_mm256_castsi256_si128(v))));
  }
  TONEBITS_AVX2 static void storeWide(Out* p, __m256i v) noexcept { store(p, v); }
};

struct DoubleIn : ToFloat<8, SampleRules::doubleToFloat> {
  static constexpr std::size_t kStep = 4;
  TONEBITS_AVX2 static __m256d load(const In* p) noexcept {
    return _mm256_loadu_pd(reinterpret_cast<const double*>(p));
  }
  TONEBITS_AVX2 static void store(Out* p, __m256d v) noexcept { _mm_storeu_ps(p, _mm256_cvtpd_ps(v)); }
  TONEBITS_AVX2 static void storeWide(Out* p, __m256d v) noexcept { store(p, v); }
};

// ---- from float ----

struct Float32Out : FromFloat<4, SampleRules::floatToFloat32> {
  static constexpr std::size_t kStep = 8;
  TONEBITS_AVX2 static __m256 load(const In* p) noexcept { return load8(p); }
  TONEBITS_AVX2 static void store(Out* p, __m256 v) noexcept {
    _mm256_storeu_ps(reinterpret_cast<float*>(p), clampKeepNaN(v, -1.0f, kFloatMax));
  }
  TONEBITS_AVX2 static void storeWide(Out* p, __m256 v) noexcept { store(p, v); }
};

struct Floats16 {
  __m256 a, b;
};

struct Int16Out : FromFloat<2, SampleRules::floatToInt16> {
  static constexpr std::size_t kStep = 16;
  TONEBITS_AVX2 static Floats16 load(const In* p) noexcept { return {load8(p), load8(p + 8)}; }
  TONEBITS_AVX2 static void store(Out* p, Floats16 v) noexcept {
    const __m256i a = toInt(v.a, -1.0f, kInt16Max, 32768.0f), b = toInt(v.b, -1.0f, kInt16Max, 32768.0f);
    store32B(p, _mm256_permute4x64_epi64(_mm256_packs_epi32(a, b), 0xD8));
  }
  TONEBITS_AVX2 static void storeWide(Out* p, Floats16 v) noexcept { store(p, v); }
};

struct Int24Out : FromFloat<3, SampleRules::floatToInt24> {
  static constexpr std::size_t kStep = 8;
  static constexpr std::size_t kSlack = 3;  // the wide store's 8 extra bytes
  TONEBITS_AVX2 static __m256 load(const In* p) noexcept { return load8(p); }
  // Each lane packs its four samples into its low 12 bytes; the permute
  // joins the two lanes into the low 24 bytes.
  TONEBITS_AVX2 static __m256i bytes(__m256 v) noexcept {
    const __m256i pack = _mm256_setr_epi8(                       //
        0, 1, 2, 4, 5, 6, 8, 9, 10, 12, 13, 14, -1, -1, -1, -1,  //
        0, 1, 2, 4, 5, 6, 8, 9, 10, 12, 13, 14, -1, -1, -1, -1);
    const __m256i words =
        _mm256_cvttps_epi32(_mm256_mul_ps(clampKeepNaN(v, -1.0f, kFloatMax), _mm256_set1_ps(8388608.0f)));
    return _mm256_permutevar8x32_epi32(_mm256_shuffle_epi8(words, pack),
                                       _mm256_setr_epi32(0, 1, 2, 4, 5, 6, 3, 7));
  }
  TONEBITS_AVX2 static void store(Out* p, __m256 v) noexcept {
    const __m256i b = bytes(v);
    store16B(p, _mm256_castsi256_si128(b));
    _mm_storel_epi64(reinterpret_cast<__m128i*>(p + 16), _mm256_extracti128_si256(b, 1));
  }
  TONEBITS_AVX2 static void storeWide(Out* p, __m256 v) noexcept { store32B(p, bytes(v)); }
};

struct Floats32 {
  __m256 a, b, c, d;
};

// Types 3 and 4 pack 32 samples to bytes. The two in-lane packs leave the
// eight 4-byte groups in the order a0 b0 c0 d0 a1 b1 c1 d1; the permute puts
// them back in sample order.
TONEBITS_AVX2 inline __m256i packBytesInOrder(__m256i bytes) noexcept {
  return _mm256_permutevar8x32_epi32(bytes, _mm256_setr_epi32(0, 4, 1, 5, 2, 6, 3, 7));
}

template <class Derived, void (*Rule)(float, unsigned char*) noexcept>
struct BytesOut : FromFloat<1, Rule> {
  using typename FromFloat<1, Rule>::In;
  using typename FromFloat<1, Rule>::Out;
  static constexpr std::size_t kStep = 32;
  TONEBITS_AVX2 static Floats32 load(const In* p) noexcept {
    return {load8(p), load8(p + 8), load8(p + 16), load8(p + 24)};
  }
  TONEBITS_AVX2 static void storeWide(Out* p, Floats32 v) noexcept { Derived::store(p, v); }
};

struct Int8Out : BytesOut<Int8Out, SampleRules::floatToInt8> {
  TONEBITS_AVX2 static void store(Out* p, Floats32 v) noexcept {
    const __m256i a = toInt(v.a, -1.0f, kInt8Max, 128.0f), b = toInt(v.b, -1.0f, kInt8Max, 128.0f);
    const __m256i c = toInt(v.c, -1.0f, kInt8Max, 128.0f), d = toInt(v.d, -1.0f, kInt8Max, 128.0f);
    store32B(p, packBytesInOrder(_mm256_packs_epi16(_mm256_packs_epi32(a, b), _mm256_packs_epi32(c, d))));
  }
};

TONEBITS_AVX2 inline __m256i offsetByteValue(__m256 v) noexcept {
  const __m256 shifted =
      _mm256_add_ps(_mm256_and_ps(v, _mm256_cmp_ps(v, v, _CMP_ORD_Q)), _mm256_set1_ps(1.0f));
  return _mm256_cvttps_epi32(_mm256_mul_ps(clampKeepNaN(shifted, 0.0f, 2.0f), _mm256_set1_ps(127.5f)));
}

struct Uint8Out : BytesOut<Uint8Out, SampleRules::floatToUint8> {
  TONEBITS_AVX2 static void store(Out* p, Floats32 v) noexcept {
    const __m256i a = offsetByteValue(v.a), b = offsetByteValue(v.b);
    const __m256i c = offsetByteValue(v.c), d = offsetByteValue(v.d);
    store32B(p, packBytesInOrder(_mm256_packus_epi16(_mm256_packs_epi32(a, b), _mm256_packs_epi32(c, d))));
  }
};

struct Int24in32Out : FromFloat<4, SampleRules::floatToInt24in32> {
  static constexpr std::size_t kStep = 8;
  TONEBITS_AVX2 static __m256 load(const In* p) noexcept { return load8(p); }
  TONEBITS_AVX2 static void store(Out* p, __m256 v) noexcept {
    store32B(p, toInt(v, -1.0f, kFloatMax, 8388608.0f));
  }
  TONEBITS_AVX2 static void storeWide(Out* p, __m256 v) noexcept { store(p, v); }
};

// See kInt32Scale.
struct Int32Out : FromFloat<4, SampleRules::floatToInt32> {
  static constexpr std::size_t kStep = 8;
  TONEBITS_AVX2 static __m256 load(const In* p) noexcept { return load8(p); }
  TONEBITS_AVX2 static void store(Out* p, __m256 c) noexcept {
    const __m256 sign = _mm256_set1_ps(-0.0f), scale = _mm256_set1_ps(kInt32Scale),
                 one = _mm256_set1_ps(1.0f);
    // |F|, clamped; maxps returns its second operand, 0, for a NaN.
    const __m256 f = _mm256_min_ps(
        _mm256_max_ps(_mm256_mul_ps(_mm256_andnot_ps(sign, c), scale), _mm256_setzero_ps()), scale);
    const __m256 whole = _mm256_round_ps(f, _MM_FROUND_TO_ZERO | _MM_FROUND_NO_EXC);
    const __m256 up =
        _mm256_and_ps(_mm256_cmp_ps(_mm256_sub_ps(f, whole), _mm256_set1_ps(0.5f), _CMP_GT_OQ), one);
    const __m256 q = _mm256_or_ps(_mm256_add_ps(whole, up), _mm256_and_ps(c, sign));  // +-Q
    const __m256i less = _mm256_castps_si256(_mm256_cmp_ps(q, one, _CMP_GE_OQ));      // -1 where Q - 1 is due
    store32B(p, _mm256_add_epi32(_mm256_cvttps_epi32(q), less));
  }
  TONEBITS_AVX2 static void storeWide(Out* p, __m256 v) noexcept { store(p, v); }
};

struct DoubleOut : FromFloat<8, SampleRules::floatToDouble> {
  static constexpr std::size_t kStep = 4;
  TONEBITS_AVX2 static __m128 load(const In* p) noexcept { return _mm_loadu_ps(p); }
  TONEBITS_AVX2 static void store(Out* p, __m128 v) noexcept {
    _mm256_storeu_pd(reinterpret_cast<double*>(p), _mm256_cvtps_pd(v));
  }
  TONEBITS_AVX2 static void storeWide(Out* p, __m128 v) noexcept { store(p, v); }
};

template <class K>
TONEBITS_AVX2 void kernel(const typename K::In* src, typename K::Out* dst, std::size_t count) noexcept {
  run<K>(src, dst, count);
}

}  // namespace

constexpr ConversionKernels kAVX2Kernels = {
    {
        copyFloats,
        kernel<Int16In>,
        kernel<Int24In>,
        kernel<Int8In<0, SampleRules::int8ToFloat>>,
        kernel<Int8In<0x80, SampleRules::uint8ToFloat>>,
        kernel<Int24in32In>,
        kernel<Int32In>,
        copyFloats,
        kernel<DoubleIn>,
    },
    {
        kernel<Float32Out>,
        kernel<Int16Out>,
        kernel<Int24Out>,
        kernel<Int8Out>,
        kernel<Uint8Out>,
        kernel<Int24in32Out>,
        kernel<Int32Out>,
        copyFloats,
        kernel<DoubleOut>,
    },
};

}  // namespace Aud::detail

#endif
