// Internal to the interleaver: the loops that split interleaved sample
// groups into per-channel blocks and join them back.
//
// A layout is C channels in S-byte slots of which B bytes are kept (B <= S),
// optionally byte-reversed (the kept bytes are read from the last to the
// first). Splitting writes groups x B bytes to each dst[c]; joining reads
// groups x B bytes from each src[c] and writes groups x C x B bytes. Source
// and destinations must not overlap.
//
// The reference loops take any layout and are the scalar path. The fast
// kernels (a word-at-a-time loop for any x86-64, shuffles where AVX2 is
// present) exist for the common layouts and give identical bytes; the find
// functions return null for a layout that has none at that level.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

#include "tonebits/foundation/Aud__Simd.h"

namespace Aud::Interleave {

using SplitFn = void (*)(const unsigned char* src, unsigned char* const* dst, std::size_t groups) noexcept;
using JoinFn = void (*)(const unsigned char* const* src, unsigned char* dst, std::size_t groups) noexcept;
// A split and a join for a channel count given at run time.
using SplitAnyFn = void (*)(const unsigned char* src, unsigned char* const* dst, std::size_t groups,
                            unsigned channels) noexcept;
using JoinAnyFn = void (*)(const unsigned char* const* src, unsigned char* dst, std::size_t groups,
                           unsigned channels) noexcept;

// One number per split layout, for switching on it.
constexpr unsigned layoutKey(unsigned stride, unsigned bytes, bool swap) noexcept {
  return stride << 8 | bytes << 1 | unsigned(swap);
}

// ---- references ----

void splitReference(const unsigned char* src, unsigned char* const* dst, std::size_t groups,
                    unsigned channels, unsigned stride, unsigned bytes, bool swap) noexcept;
// AES words: the little-endian 32-bit word at the start of each slot becomes
// the 16-bit sample word >> 11.
void splitAESReference(const unsigned char* src, unsigned char* const* dst, std::size_t groups,
                       unsigned channels, unsigned stride) noexcept;
void joinReference(const unsigned char* const* src, unsigned char* dst, std::size_t groups, unsigned channels,
                   unsigned bytes) noexcept;

// ---- fast kernels ----

SplitFn findSplit(Simd::eLevel level, unsigned channels, unsigned stride, unsigned bytes, bool swap) noexcept;
JoinFn findJoin(Simd::eLevel level, unsigned channels, unsigned bytes) noexcept;
// For channel counts without a kernel of their own (above 8).
SplitAnyFn findSplitAnyChannels(Simd::eLevel level, unsigned stride, unsigned bytes, bool swap) noexcept;
JoinAnyFn findJoinAnyChannels(Simd::eLevel level, unsigned bytes) noexcept;

// Per instruction set; null when there is none for the layout.
SplitFn findSplitAVX2(unsigned channels, unsigned stride, unsigned bytes, bool swap) noexcept;
JoinFn findJoinAVX2(unsigned channels, unsigned bytes) noexcept;

// ---- word-at-a-time loops, shared by every fast kernel for its tail ----

namespace detail {

// The B kept bytes of the slot at p, reversed when Swap, in the low bytes of
// the result. For B == 3 four bytes are read, so the caller makes sure the
// byte after the sample is readable.
template <unsigned B, bool Swap>
inline uint64_t readWide(const unsigned char* p) noexcept {
  if constexpr (B == 1) {
    return p[0];
  } else if constexpr (B == 2) {
    uint16_t v;
    std::memcpy(&v, p, 2);
    return Swap ? __builtin_bswap16(v) : v;
  } else if constexpr (B == 3 || B == 4) {
    uint32_t v;
    std::memcpy(&v, p, 4);
    return Swap ? (B == 3 ? __builtin_bswap32(v) >> 8 : __builtin_bswap32(v)) : v;
  } else {
    static_assert(B == 8);
    uint64_t v;
    std::memcpy(&v, p, 8);
    return Swap ? __builtin_bswap64(v) : v;
  }
}

// Writes the low B bytes of v at p. For B == 3 four bytes are written: the
// caller writes the next sample over the fourth.
template <unsigned B>
inline void writeWide(unsigned char* p, uint64_t v) noexcept {
  std::memcpy(p, &v, B == 3 ? 4 : B);
}

// Exact forms for the last group, which must not touch a byte beyond it.
template <unsigned B, bool Swap>
inline void copyExact(const unsigned char* slot, unsigned char* out) noexcept {
  for (unsigned b = 0; b < B; ++b) out[b] = slot[Swap ? B - 1 - b : b];
}

template <unsigned C, unsigned S, unsigned B, bool Swap>
void splitWords(const unsigned char* src, unsigned char* const* dst, std::size_t groups) noexcept {
  static_assert(B <= S);
  if (groups == 0) return;
  unsigned char* out[C];
  for (unsigned c = 0; c < C; ++c) out[c] = dst[c];
  const unsigned char* __restrict in = src;
  for (std::size_t g = 0; g + 1 < groups; ++g, in += C * S) {
#pragma GCC unroll 8
    for (unsigned c = 0; c < C; ++c) writeWide<B>(out[c] + g * B, readWide<B, Swap>(in + c * S));
  }
  for (unsigned c = 0; c < C; ++c) copyExact<B, Swap>(in + c * S, out[c] + (groups - 1) * B);
}

// The same for a channel count known only at run time (above 8).
template <unsigned S, unsigned B, bool Swap>
void splitWordsAnyChannels(const unsigned char* src, unsigned char* const* dst, std::size_t groups,
                           unsigned channels) noexcept {
  if (groups == 0) return;
  const std::size_t groupBytes = std::size_t(channels) * S;
  const unsigned char* in = src;
  for (std::size_t g = 0; g + 1 < groups; ++g, in += groupBytes)
    for (unsigned c = 0; c < channels; ++c) writeWide<B>(dst[c] + g * B, readWide<B, Swap>(in + c * S));
  for (unsigned c = 0; c < channels; ++c) copyExact<B, Swap>(in + c * S, dst[c] + (groups - 1) * B);
}

template <unsigned C, unsigned B>
void joinWords(const unsigned char* const* src, unsigned char* dst, std::size_t groups) noexcept {
  if (groups == 0) return;
  const unsigned char* in[C];
  for (unsigned c = 0; c < C; ++c) in[c] = src[c];
  unsigned char* __restrict out = dst;
  for (std::size_t g = 0; g + 1 < groups; ++g, out += C * B) {
#pragma GCC unroll 8
    for (unsigned c = 0; c < C; ++c) writeWide<B>(out + c * B, readWide<B, false>(in[c] + g * B));
  }
  for (unsigned c = 0; c < C; ++c) copyExact<B, false>(in[c] + (groups - 1) * B, out + c * B);
}

template <unsigned B>
void joinWordsAnyChannels(const unsigned char* const* src, unsigned char* dst, std::size_t groups,
                          unsigned channels) noexcept {
  if (groups == 0) return;
  unsigned char* out = dst;
  for (std::size_t g = 0; g + 1 < groups; ++g, out += std::size_t(channels) * B)
    for (unsigned c = 0; c < channels; ++c) writeWide<B>(out + c * B, readWide<B, false>(src[c] + g * B));
  for (unsigned c = 0; c < channels; ++c) copyExact<B, false>(src[c] + (groups - 1) * B, out + c * B);
}

}  // namespace detail

}  // namespace Aud::Interleave
