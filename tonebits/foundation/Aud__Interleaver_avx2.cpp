// AVX2 kernels for splitting and joining interleaved samples.
//
// A pass covers two chunks at once, one per 128-bit lane. A chunk is the
// smallest run of groups whose per-channel bytes fill whole 16-byte
// vectors, so every output vector of a lane is the OR of byte shuffles of
// that lane's input vectors. The shuffle masks are worked out at compile
// time from the layout; the tail that does not fill a pass goes to the
// word-at-a-time loop.
#include <immintrin.h>

#include <array>
#include <cstddef>
#include <numeric>
#include <utility>

#include "tonebits/foundation/Aud__InterleaverKernels.h"

namespace Aud::Interleave {

namespace {

constexpr uint8_t kZeroByte = 0x80;  // a shuffle index that yields 0

struct Term {
  uint8_t out;  // accumulator
  uint8_t in;   // input vector
};

// A shuffle network over one lane: nOut output vectors of 16 bytes, each
// byte taken from one byte of nIn input vectors; Source(o, k) is the input
// byte (vector x 16 + byte) of byte k of output o.
template <unsigned NIn, unsigned NOut, class Source>
struct Network {
  static constexpr unsigned countTerms() {
    unsigned n = 0;
    for (unsigned o = 0; o < NOut; ++o)
      for (unsigned i = 0; i < NIn; ++i)
        for (unsigned k = 0; k < 16; ++k)
          if (Source::of(o, k) / 16 == i) {
            ++n;
            break;
          }
    return n;
  }
  static constexpr unsigned kNumTerms = countTerms();

  struct Tables {
    std::array<Term, kNumTerms> terms{};
    // Each mask twice, one per lane.
    alignas(32) std::array<std::array<uint8_t, 32>, kNumTerms> masks{};
  };
  static constexpr Tables build() {
    Tables t{};
    unsigned n = 0;
    for (unsigned o = 0; o < NOut; ++o) {
      for (unsigned i = 0; i < NIn; ++i) {
        bool used = false;
        std::array<uint8_t, 32> mask{};
        for (unsigned k = 0; k < 16; ++k) {
          const unsigned from = Source::of(o, k);
          const bool here = from / 16 == i;
          used = used || here;
          mask[k] = mask[k + 16] = here ? uint8_t(from % 16) : kZeroByte;
        }
        if (!used) continue;
        t.terms[n] = Term{uint8_t(o), uint8_t(i)};
        t.masks[n] = mask;
        ++n;
      }
    }
    return t;
  }
  alignas(32) static constexpr Tables kTables = build();

  template <std::size_t... T>
  __attribute__((target("avx2"), always_inline)) static inline void apply(
      const __m256i* in, __m256i* acc, std::index_sequence<T...>) noexcept {
    ((acc[kTables.terms[T].out] = _mm256_or_si256(
          acc[kTables.terms[T].out],
          _mm256_shuffle_epi8(in[kTables.terms[T].in],
                              _mm256_load_si256(reinterpret_cast<const __m256i*>(kTables.masks[T].data()))))),
     ...);
  }
  __attribute__((target("avx2"), always_inline)) static inline void run(const __m256i* in,
                                                                        __m256i* acc) noexcept {
    for (unsigned o = 0; o < NOut; ++o) acc[o] = _mm256_setzero_si256();
    apply(in, acc, std::make_index_sequence<kNumTerms>{});
  }
};

// Two 16-byte vectors in one register: lo in lane 0, hi in lane 1.
__attribute__((target("avx2"), always_inline)) inline __m256i loadLanes(const unsigned char* lo,
                                                                        const unsigned char* hi) noexcept {
  const __m128i a = _mm_loadu_si128(reinterpret_cast<const __m128i*>(lo));
  const __m128i b = _mm_loadu_si128(reinterpret_cast<const __m128i*>(hi));
  return _mm256_inserti128_si256(_mm256_castsi128_si256(a), b, 1);
}

// Stores N registers whose lane 0 holds bytes [0, 16N) and lane 1 bytes
// [16N, 32N) of out, in 32-byte pieces.
template <unsigned N, std::size_t... M>
__attribute__((target("avx2"), always_inline)) inline void storeLanes(unsigned char* out, const __m256i* v,
                                                                      std::index_sequence<M...>) noexcept {
  auto one = [](unsigned char* o, const __m256i* r, auto m) __attribute__((target("avx2"), always_inline)) {
    constexpr unsigned a = 2 * decltype(m)::value, b = a + 1;  // pieces
    constexpr unsigned aVec = a % N, aLane = a / N, bVec = b % N, bLane = b / N;
    __m256i x;
    if constexpr (aVec == bVec && aLane == 0 && bLane == 1) {
      x = r[aVec];
    } else {
      x = _mm256_permute2x128_si256(r[aVec], r[bVec], int(aLane | (2 + bLane) << 4));
    }
    _mm256_storeu_si256(reinterpret_cast<__m256i*>(o + 32 * decltype(m)::value), x);
  };
  (one(out, v, std::integral_constant<std::size_t, M>{}), ...);
}

// ---- splitting ----

template <unsigned C, unsigned S, unsigned B, bool Swap>
struct SplitLayout {
  static constexpr unsigned kGroups = 16 / std::gcd(16u, B);  // per chunk
  static constexpr unsigned kInBytes = kGroups * C * S;       // per chunk
  static constexpr unsigned kOutVectors = kGroups * B / 16;   // per channel and chunk
  static constexpr unsigned kInVectors = kInBytes / 16;
  static_assert(kInBytes % 16 == 0);

  struct Source {
    // Output vector o is vector o % kOutVectors of channel o / kOutVectors.
    static constexpr unsigned of(unsigned o, unsigned k) {
      const unsigned c = o / kOutVectors, byte = (o % kOutVectors) * 16 + k;
      const unsigned s = byte / B, b = byte % B;
      return s * C * S + c * S + (Swap ? B - 1 - b : b);
    }
  };
  using Net = Network<kInVectors, C * kOutVectors, Source>;
};

template <unsigned C, unsigned S, unsigned B, bool Swap>
__attribute__((target("avx2"))) void splitShuffle(const unsigned char* src, unsigned char* const* dst,
                                                  std::size_t groups) noexcept {
  using L = SplitLayout<C, S, B, Swap>;
  constexpr std::size_t kPassGroups = 2 * L::kGroups;
  const std::size_t passes = groups / kPassGroups;
  unsigned char* out[C];
  for (unsigned c = 0; c < C; ++c) out[c] = dst[c];
  for (std::size_t p = 0; p < passes; ++p) {
    const unsigned char* in = src + p * 2 * L::kInBytes;
    __m256i v[L::kInVectors];
    for (unsigned i = 0; i < L::kInVectors; ++i) v[i] = loadLanes(in + 16 * i, in + L::kInBytes + 16 * i);
    __m256i acc[C * L::kOutVectors];
    L::Net::run(v, acc);
    for (unsigned c = 0; c < C; ++c)
      storeLanes<L::kOutVectors>(out[c] + p * 2 * 16 * L::kOutVectors, acc + c * L::kOutVectors,
                                 std::make_index_sequence<L::kOutVectors>{});
  }
  const std::size_t done = passes * kPassGroups;
  unsigned char* rest[C];
  for (unsigned c = 0; c < C; ++c) rest[c] = out[c] + done * B;
  detail::splitWords<C, S, B, Swap>(src + done * C * S, rest, groups - done);
}

// ---- joining ----

template <unsigned C, unsigned B>
struct JoinLayout {
  static constexpr unsigned kGroups = 16 / std::gcd(16u, B);
  static constexpr unsigned kInVectors = kGroups * B / 16;  // per channel and chunk
  static constexpr unsigned kOutBytes = kGroups * C * B;    // per chunk
  static constexpr unsigned kOutVectors = kOutBytes / 16;

  struct Source {
    // Input vector c x kInVectors + j is vector j of channel c.
    static constexpr unsigned of(unsigned o, unsigned k) {
      const unsigned byte = o * 16 + k;
      const unsigned g = byte / (C * B), c = byte % (C * B) / B, b = byte % B;
      return c * kInVectors * 16 + g * B + b;
    }
  };
  using Net = Network<C * kInVectors, kOutVectors, Source>;
};

template <unsigned C, unsigned B>
__attribute__((target("avx2"))) void joinShuffle(const unsigned char* const* src, unsigned char* dst,
                                                 std::size_t groups) noexcept {
  using L = JoinLayout<C, B>;
  constexpr std::size_t kPassGroups = 2 * L::kGroups;
  constexpr unsigned kChunkBytes = 16 * L::kInVectors;  // per channel
  const std::size_t passes = groups / kPassGroups;
  const unsigned char* planes[C];
  for (unsigned c = 0; c < C; ++c) planes[c] = src[c];
  for (std::size_t p = 0; p < passes; ++p) {
    __m256i v[C * L::kInVectors];
    for (unsigned c = 0; c < C; ++c) {
      const unsigned char* in = planes[c] + p * 2 * kChunkBytes;
      for (unsigned j = 0; j < L::kInVectors; ++j) {
        v[c * L::kInVectors + j] = L::kInVectors == 1
                                       ? _mm256_loadu_si256(reinterpret_cast<const __m256i*>(in))
                                       : loadLanes(in + 16 * j, in + kChunkBytes + 16 * j);
      }
    }
    __m256i acc[L::kOutVectors];
    L::Net::run(v, acc);
    storeLanes<L::kOutVectors>(dst + p * 2 * L::kOutBytes, acc, std::make_index_sequence<L::kOutVectors>{});
  }
  const std::size_t done = passes * kPassGroups;
  const unsigned char* rest[C];
  for (unsigned c = 0; c < C; ++c) rest[c] = planes[c] + done * B;
  detail::joinWords<C, B>(rest, dst + done * C * B, groups - done);
}

// ---- tables (shuffle networks) ----

template <unsigned S, unsigned B, bool Swap>
SplitFn splitFor(unsigned channels) noexcept {
  switch (channels) {
    case 2: return splitShuffle<2, S, B, Swap>;
    case 3: return splitShuffle<3, S, B, Swap>;
    case 4: return splitShuffle<4, S, B, Swap>;
    case 5: return splitShuffle<5, S, B, Swap>;
    case 6: return splitShuffle<6, S, B, Swap>;
    case 7: return splitShuffle<7, S, B, Swap>;
    case 8: return splitShuffle<8, S, B, Swap>;
    default: return nullptr;
  }
}

template <unsigned B>
JoinFn joinFor(unsigned channels) noexcept {
  switch (channels) {
    case 2: return joinShuffle<2, B>;
    case 3: return joinShuffle<3, B>;
    case 4: return joinShuffle<4, B>;
    case 5: return joinShuffle<5, B>;
    case 6: return joinShuffle<6, B>;
    case 7: return joinShuffle<7, B>;
    case 8: return joinShuffle<8, B>;
    default: return nullptr;
  }
}

// ---- 4-byte slots, 4 or 8 channels: dword transposes ----

// Splits eight groups a pass. Each register takes four channels of group g
// in lane 0 and of group g + 4 in lane 1, so a 4 x 4 transpose within the
// lanes leaves one channel's eight samples in order in one register; its
// kept bytes are then gathered to the front.
template <unsigned C, unsigned B, bool Swap>
__attribute__((target("avx2"))) void splitSlots4(const unsigned char* src, unsigned char* const* dst,
                                                 std::size_t groups) noexcept {
  static_assert(C % 4 == 0 && (B == 3 || B == 4));
  constexpr unsigned kGroupBytes = C * 4;
  // Within each lane: the kept bytes of four samples, reversed when Swap.
  alignas(32) static constexpr auto kKeep = [] {
    std::array<uint8_t, 32> m{};
    for (unsigned lane = 0; lane < 2; ++lane)
      for (unsigned k = 0; k < 16; ++k) {
        const unsigned s = k / B, b = k % B;
        m[lane * 16 + k] = s < 4 ? uint8_t(s * 4 + (Swap ? B - 1 - b : b)) : kZeroByte;
      }
    return m;
  }();
  const __m256i keep = _mm256_load_si256(reinterpret_cast<const __m256i*>(kKeep.data()));
  const __m256i join = _mm256_setr_epi32(0, 1, 2, 4, 5, 6, 3, 7);  // 12 + 12 bytes together
  unsigned char* out[C];
  for (unsigned c = 0; c < C; ++c) out[c] = dst[c];
  const std::size_t passes = groups / 8;
  for (std::size_t p = 0; p < passes; ++p) {
    const unsigned char* in = src + p * 8 * kGroupBytes;
    for (unsigned q = 0; q < C / 4; ++q) {
      __m256i r[4];
      for (unsigned g = 0; g < 4; ++g)
        r[g] = loadLanes(in + g * kGroupBytes + 16 * q, in + (g + 4) * kGroupBytes + 16 * q);
      const __m256i t0 = _mm256_unpacklo_epi32(r[0], r[1]), t1 = _mm256_unpackhi_epi32(r[0], r[1]);
      const __m256i t2 = _mm256_unpacklo_epi32(r[2], r[3]), t3 = _mm256_unpackhi_epi32(r[2], r[3]);
      const __m256i ch[4] = {_mm256_unpacklo_epi64(t0, t2), _mm256_unpackhi_epi64(t0, t2),
                             _mm256_unpacklo_epi64(t1, t3), _mm256_unpackhi_epi64(t1, t3)};
      for (unsigned k = 0; k < 4; ++k) {
        unsigned char* o = out[4 * q + k] + p * 8 * B;
        if constexpr (B == 4) {
          _mm256_storeu_si256(reinterpret_cast<__m256i*>(o), Swap ? _mm256_shuffle_epi8(ch[k], keep) : ch[k]);
        } else {
          const __m256i packed = _mm256_permutevar8x32_epi32(_mm256_shuffle_epi8(ch[k], keep), join);
          _mm_storeu_si128(reinterpret_cast<__m128i*>(o), _mm256_castsi256_si128(packed));
          _mm_storel_epi64(reinterpret_cast<__m128i*>(o + 16), _mm256_extracti128_si256(packed, 1));
        }
      }
    }
  }
  const std::size_t done = passes * 8;
  unsigned char* rest[C];
  for (unsigned c = 0; c < C; ++c) rest[c] = out[c] + done * B;
  detail::splitWords<C, 4, B, Swap>(src + done * kGroupBytes, rest, groups - done);
}

// ---- tables ----

template <unsigned B, bool Swap>
SplitFn splitSlots4For(unsigned channels) noexcept {
  if (channels == 4) return splitSlots4<4, B, Swap>;
  if (channels == 8) return splitSlots4<8, B, Swap>;
  return splitFor<4, B, Swap>(channels);
}

}  // namespace

SplitFn findSplitAVX2(unsigned channels, unsigned stride, unsigned bytes, bool swap) noexcept {
  switch (layoutKey(stride, bytes, swap)) {
    case layoutKey(1, 1, false): return splitFor<1, 1, false>(channels);
    case layoutKey(2, 2, false): return splitFor<2, 2, false>(channels);
    case layoutKey(2, 2, true): return splitFor<2, 2, true>(channels);
    case layoutKey(3, 3, false): return splitFor<3, 3, false>(channels);
    case layoutKey(3, 3, true): return splitFor<3, 3, true>(channels);
    case layoutKey(4, 3, false): return splitSlots4For<3, false>(channels);
    case layoutKey(4, 3, true): return splitSlots4For<3, true>(channels);
    case layoutKey(4, 4, false): return splitSlots4For<4, false>(channels);
    case layoutKey(4, 4, true): return splitSlots4For<4, true>(channels);
    default: return nullptr;
  }
}

JoinFn findJoinAVX2(unsigned channels, unsigned bytes) noexcept {
  switch (bytes) {
    case 1: return joinFor<1>(channels);
    case 2: return joinFor<2>(channels);
    case 3: return joinFor<3>(channels);
    case 4: return joinFor<4>(channels);
    case 8: return joinFor<8>(channels);
    default: return nullptr;
  }
}

}  // namespace Aud::Interleave
