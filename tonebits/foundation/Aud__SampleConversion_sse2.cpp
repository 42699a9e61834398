// SSE2 block conversions, the baseline of every x86-64 CPU. Same structure
// and the same bit-exactness arguments as the AVX2 kernels: groups of
// samples run by a driver that loads four groups ahead of their stores, then
// the scalar rule for the rest; no byte outside the count samples is read or
// written. SSE2 has no byte shuffle, so the 24-bit forms are packed and
// unpacked with 64-bit shifts and masks.
#if defined(__x86_64__) || defined(__i386__)

#include <emmintrin.h>

#include "tonebits/foundation/Aud__SampleConversion_internal.h"

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
TONEBITS_SSE2 inline __m128i toInt(__m128 v, float lo, float hi, float scale) noexcept {
  return _mm_cvttps_epi32(_mm_mul_ps(clampKeepNaN(zeroNaN(v), lo, hi), _mm_set1_ps(scale)));
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

template <unsigned Bytes, float (*Rule)(const unsigned char*) noexcept>
using ToFloat = ToFloatKernelBase<Bytes, Rule>;
template <unsigned Bytes, void (*Rule)(float, unsigned char*) noexcept>
using FromFloat = FromFloatKernelBase<Bytes, Rule>;

// The driver of the AVX2 file, for SSE2.
template <class K>
TONEBITS_SSE2 inline void run(const typename K::In* src, typename K::Out* dst, std::size_t count) noexcept {
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

// ---- to float ----

struct Int16In : ToFloat<2, SampleRules::int16ToFloat> {
  static constexpr std::size_t kStep = 8;
  TONEBITS_SSE2 static __m128i load(const In* p) noexcept { return load16B(p); }
  TONEBITS_SSE2 static void store(Out* p, __m128i v) noexcept {
    storeScaled(p, widenLo16(v), 0x1p-15f);
    storeScaled(p + 4, widenHi16(v), 0x1p-15f);
  }
  TONEBITS_SSE2 static void storeWide(Out* p, __m128i v) noexcept { store(p, v); }
};

struct Int24In : ToFloat<3, SampleRules::int24ToFloat> {
  static constexpr std::size_t kStep = 4;
  // Samples 0,1 come from bytes 0..7 and samples 2,3 from bytes 6..11, one
  // pair per 64-bit half, at byte offsets 0 and 3.
  TONEBITS_SSE2 static __m128i load(const In* p) noexcept {
    return _mm_unpacklo_epi64(load8B(p), _mm_srli_epi64(load8B(p + 4), 16));
  }
  // The shifts lift each sample to the top three bytes of its word.
  TONEBITS_SSE2 static void store(Out* p, __m128i pairs) noexcept {
    const __m128i first = _mm_set1_epi64x(0x00000000FFFFFF00LL);
    const __m128i second = _mm_set1_epi64x(static_cast<long long>(0xFFFFFF0000000000ULL));
    const __m128i words = _mm_or_si128(_mm_and_si128(_mm_slli_epi64(pairs, 8), first),
                                       _mm_and_si128(_mm_slli_epi64(pairs, 16), second));
    storeScaled(p, _mm_srai_epi32(words, 8), 0x1p-23f);
  }
  TONEBITS_SSE2 static void storeWide(Out* p, __m128i v) noexcept { store(p, v); }
};

// Types 3 and 4: type 4 less its offset of 128 is its byte with the top bit
// flipped, read as signed.
template <int Flip, float (*Rule)(const unsigned char*) noexcept>
struct Int8In : ToFloat<1, Rule> {
  using typename ToFloat<1, Rule>::In;
  using typename ToFloat<1, Rule>::Out;
  static constexpr std::size_t kStep = 16;
  TONEBITS_SSE2 static __m128i load(const In* p) noexcept { return load16B(p); }
  TONEBITS_SSE2 static void store(Out* p, __m128i v) noexcept {
    const __m128i b = _mm_xor_si128(v, _mm_set1_epi8(static_cast<char>(Flip)));
    const __m128i lo = _mm_srai_epi16(_mm_unpacklo_epi8(b, b), 8),
                  hi = _mm_srai_epi16(_mm_unpackhi_epi8(b, b), 8);
    storeScaled(p, widenLo16(lo), 0x1p-7f);
    storeScaled(p + 4, widenHi16(lo), 0x1p-7f);
    storeScaled(p + 8, widenLo16(hi), 0x1p-7f);
    storeScaled(p + 12, widenHi16(hi), 0x1p-7f);
  }
  TONEBITS_SSE2 static void storeWide(Out* p, __m128i v) noexcept { store(p, v); }
};

struct Int24in32In : ToFloat<4, SampleRules::int24in32ToFloat> {
  static constexpr std::size_t kStep = 4;
  TONEBITS_SSE2 static __m128i load(const In* p) noexcept { return load16B(p); }
  TONEBITS_SSE2 static void store(Out* p, __m128i v) noexcept {
    storeScaled(p, _mm_srai_epi32(_mm_slli_epi32(v, 8), 8), 0x1p-23f);
  }
  TONEBITS_SSE2 static void storeWide(Out* p, __m128i v) noexcept { store(p, v); }
};

// See kInt32Reciprocal: the product rounds to the float of the quotient.
TONEBITS_SSE2 inline __m128 int32ToFloat2(__m128i v) noexcept {
  return _mm_cvtpd_ps(
      _mm_mul_pd(_mm_add_pd(_mm_cvtepi32_pd(v), _mm_set1_pd(0.5)), _mm_set1_pd(kInt32Reciprocal)));
}

struct Int32In : ToFloat<4, SampleRules::int32ToFloat> {
  static constexpr std::size_t kStep = 4;
  TONEBITS_SSE2 static __m128i load(const In* p) noexcept { return load16B(p); }
  TONEBITS_SSE2 static void store(Out* p, __m128i v) noexcept {
    _mm_storeu_ps(p, _mm_movelh_ps(int32ToFloat2(v), int32ToFloat2(_mm_shuffle_epi32(v, 0xEE))));
  }
  TONEBITS_SSE2 static void storeWide(Out* p, __m128i v) noexcept { store(p, v); }
};

struct Doubles4 {
  __m128d a, b;
};

struct DoubleIn : ToFloat<8, SampleRules::doubleToFloat> {
  static constexpr std::size_t kStep = 4;
  TONEBITS_SSE2 static Doubles4 load(const In* p) noexcept {
    const double* d = reinterpret_cast<const double*>(p);
    return {_mm_loadu_pd(d), _mm_loadu_pd(d + 2)};
  }
  TONEBITS_SSE2 static void store(Out* p, Doubles4 v) noexcept {
    _mm_storeu_ps(p, _mm_movelh_ps(_mm_cvtpd_ps(v.a), _mm_cvtpd_ps(v.b)));
  }
  TONEBITS_SSE2 static void storeWide(Out* p, Doubles4 v) noexcept { store(p, v); }
};

// ---- from float ----

struct Float32Out : FromFloat<4, SampleRules::floatToFloat32> {
  static constexpr std::size_t kStep = 4;
  TONEBITS_SSE2 static __m128 load(const In* p) noexcept { return _mm_loadu_ps(p); }
  TONEBITS_SSE2 static void store(Out* p, __m128 v) noexcept {
    _mm_storeu_ps(reinterpret_cast<float*>(p), clampKeepNaN(v, -1.0f, kFloatMax));
  }
  TONEBITS_SSE2 static void storeWide(Out* p, __m128 v) noexcept { store(p, v); }
};

struct Floats8 {
  __m128 a, b;
};

struct Int16Out : FromFloat<2, SampleRules::floatToInt16> {
  static constexpr std::size_t kStep = 8;
  TONEBITS_SSE2 static Floats8 load(const In* p) noexcept { return {_mm_loadu_ps(p), _mm_loadu_ps(p + 4)}; }
  TONEBITS_SSE2 static void store(Out* p, Floats8 v) noexcept {
    store16B(p,
             _mm_packs_epi32(toInt(v.a, -1.0f, kInt16Max, 32768.0f), toInt(v.b, -1.0f, kInt16Max, 32768.0f)));
  }
  TONEBITS_SSE2 static void storeWide(Out* p, Floats8 v) noexcept { store(p, v); }
};

struct Int24Out : FromFloat<3, SampleRules::floatToInt24> {
  static constexpr std::size_t kStep = 4;
  static constexpr std::size_t kSlack = 2;  // the wide store's 4 extra bytes
  TONEBITS_SSE2 static __m128 load(const In* p) noexcept { return _mm_loadu_ps(p); }
  // Each 64-bit half packs its two samples into its low 6 bytes; the upper
  // half then slides down to bytes 6..11. A NaN passes the clamp and
  // converts to 0x80000000, whose low three bytes are the silence it must
  // give.
  TONEBITS_SSE2 static __m128i bytes(__m128 v) noexcept {
    const __m128i first = _mm_set1_epi64x(0x0000000000FFFFFFLL);
    const __m128i second = _mm_set1_epi64x(0x0000FFFFFF000000LL);
    const __m128i words =
        _mm_cvttps_epi32(_mm_mul_ps(clampKeepNaN(v, -1.0f, kFloatMax), _mm_set1_ps(8388608.0f)));
    const __m128i pairs =
        _mm_or_si128(_mm_and_si128(words, first), _mm_and_si128(_mm_srli_epi64(words, 8), second));
    return _mm_or_si128(_mm_move_epi64(pairs), _mm_slli_si128(_mm_srli_si128(pairs, 8), 6));
  }
  TONEBITS_SSE2 static void store(Out* p, __m128 v) noexcept {
    const __m128i b = bytes(v);
    _mm_storel_epi64(reinterpret_cast<__m128i*>(p), b);
    const int last = _mm_cvtsi128_si32(_mm_srli_si128(b, 8));
    std::memcpy(p + 8, &last, 4);
  }
  TONEBITS_SSE2 static void storeWide(Out* p, __m128 v) noexcept { store16B(p, bytes(v)); }
};

struct Floats16 {
  __m128 a, b, c, d;
};

template <class Derived, void (*Rule)(float, unsigned char*) noexcept>
struct BytesOut : FromFloat<1, Rule> {
  using typename FromFloat<1, Rule>::In;
  using typename FromFloat<1, Rule>::Out;
  static constexpr std::size_t kStep = 16;
  TONEBITS_SSE2 static Floats16 load(const In* p) noexcept {
    return {_mm_loadu_ps(p), _mm_loadu_ps(p + 4), _mm_loadu_ps(p + 8), _mm_loadu_ps(p + 12)};
  }
  TONEBITS_SSE2 static void storeWide(Out* p, Floats16 v) noexcept { Derived::store(p, v); }
};

struct Int8Out : BytesOut<Int8Out, SampleRules::floatToInt8> {
  TONEBITS_SSE2 static void store(Out* p, Floats16 v) noexcept {
    const __m128i a = toInt(v.a, -1.0f, kInt8Max, 128.0f), b = toInt(v.b, -1.0f, kInt8Max, 128.0f);
    const __m128i c = toInt(v.c, -1.0f, kInt8Max, 128.0f), d = toInt(v.d, -1.0f, kInt8Max, 128.0f);
    store16B(p, _mm_packs_epi16(_mm_packs_epi32(a, b), _mm_packs_epi32(c, d)));
  }
};

TONEBITS_SSE2 inline __m128i offsetByteValue(__m128 v) noexcept {
  const __m128 shifted = _mm_add_ps(zeroNaN(v), _mm_set1_ps(1.0f));
  return _mm_cvttps_epi32(_mm_mul_ps(clampKeepNaN(shifted, 0.0f, 2.0f), _mm_set1_ps(127.5f)));
}

struct Uint8Out : BytesOut<Uint8Out, SampleRules::floatToUint8> {
  TONEBITS_SSE2 static void store(Out* p, Floats16 v) noexcept {
    const __m128i a = offsetByteValue(v.a), b = offsetByteValue(v.b);
    const __m128i c = offsetByteValue(v.c), d = offsetByteValue(v.d);
    store16B(p, _mm_packus_epi16(_mm_packs_epi32(a, b), _mm_packs_epi32(c, d)));
  }
};

struct Int24in32Out : FromFloat<4, SampleRules::floatToInt24in32> {
  static constexpr std::size_t kStep = 4;
  TONEBITS_SSE2 static __m128 load(const In* p) noexcept { return _mm_loadu_ps(p); }
  TONEBITS_SSE2 static void store(Out* p, __m128 v) noexcept {
    store16B(p, toInt(v, -1.0f, kFloatMax, 8388608.0f));
  }
  TONEBITS_SSE2 static void storeWide(Out* p, __m128 v) noexcept { store(p, v); }
};

// The reference's own double arithmetic: without a rounding instruction the
// float method of the AVX2 kernel (see kInt32Scale) costs more than this.
TONEBITS_SSE2 inline __m128i int32OfPair(__m128 v) noexcept {
  const __m128d d = _mm_mul_pd(_mm_cvtps_pd(v), _mm_set1_pd(2147483647.5));
  return _mm_cvttpd_epi32(_mm_sub_pd(d, _mm_set1_pd(0.5)));
}

struct Int32Out : FromFloat<4, SampleRules::floatToInt32> {
  static constexpr std::size_t kStep = 4;
  TONEBITS_SSE2 static __m128 load(const In* p) noexcept { return _mm_loadu_ps(p); }
  TONEBITS_SSE2 static void store(Out* p, __m128 v) noexcept {
    const __m128 c = clampKeepNaN(zeroNaN(v), -1.0f, 1.0f);
    store16B(p, _mm_unpacklo_epi64(int32OfPair(c), int32OfPair(_mm_movehl_ps(c, c))));
  }
  TONEBITS_SSE2 static void storeWide(Out* p, __m128 v) noexcept { store(p, v); }
};

struct DoubleOut : FromFloat<8, SampleRules::floatToDouble> {
  static constexpr std::size_t kStep = 4;
  TONEBITS_SSE2 static __m128 load(const In* p) noexcept { return _mm_loadu_ps(p); }
  TONEBITS_SSE2 static void store(Out* p, __m128 v) noexcept {
    double* d = reinterpret_cast<double*>(p);
    _mm_storeu_pd(d, _mm_cvtps_pd(v));
    _mm_storeu_pd(d + 2, _mm_cvtps_pd(_mm_movehl_ps(v, v)));
  }
  TONEBITS_SSE2 static void storeWide(Out* p, __m128 v) noexcept { store(p, v); }
};

template <class K>
TONEBITS_SSE2 void kernel(const typename K::In* src, typename K::Out* dst, std::size_t count) noexcept {
  run<K>(src, dst, count);
}

}  // namespace

constexpr ConversionKernels kSSE2Kernels = {
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
