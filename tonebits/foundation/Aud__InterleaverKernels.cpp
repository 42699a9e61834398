#include "tonebits/foundation/Aud__InterleaverKernels.h"

#include <utility>

namespace Aud::Interleave {

// ---- references: one byte at a time, as the layout is defined ----

void splitReference(const unsigned char* src, unsigned char* const* dst, std::size_t groups,
                    unsigned channels, unsigned stride, unsigned bytes, bool swap) noexcept {
  const std::size_t groupBytes = std::size_t(channels) * stride;
  for (std::size_t g = 0; g < groups; ++g) {
    for (unsigned c = 0; c < channels; ++c) {
      const unsigned char* slot = src + g * groupBytes + std::size_t(c) * stride;
      unsigned char* out = dst[c] + g * bytes;
      if (swap) {
        for (unsigned b = 0; b < bytes; ++b) out[b] = slot[bytes - 1 - b];
      } else {
        for (unsigned b = 0; b < bytes; ++b) out[b] = slot[b];
      }
    }
  }
}

void splitAESReference(const unsigned char* src, unsigned char* const* dst, std::size_t groups,
                       unsigned channels, unsigned stride) noexcept {
  const std::size_t groupBytes = std::size_t(channels) * stride;
  for (std::size_t g = 0; g < groups; ++g) {
    for (unsigned c = 0; c < channels; ++c) {
      const unsigned char* slot = src + g * groupBytes + std::size_t(c) * stride;
      const uint32_t word =
          uint32_t(slot[0]) | uint32_t(slot[1]) << 8 | uint32_t(slot[2]) << 16 | uint32_t(slot[3]) << 24;
      const uint16_t sample = uint16_t(word >> 11);
      unsigned char* out = dst[c] + g * 2;
      out[0] = uint8_t(sample);
      out[1] = uint8_t(sample >> 8);
    }
  }
}

void joinReference(const unsigned char* const* src, unsigned char* dst, std::size_t groups, unsigned channels,
                   unsigned bytes) noexcept {
  for (std::size_t g = 0; g < groups; ++g)
    for (unsigned c = 0; c < channels; ++c)
      for (unsigned b = 0; b < bytes; ++b) dst[(g * channels + c) * bytes + b] = src[c][g * bytes + b];
}

// ---- the word-at-a-time kernels, for any x86-64 ----

namespace {

// Layouts with a fast kernel: (stride, bytes, reversed).
template <unsigned S, unsigned B, bool Swap>
SplitFn splitWordsFor(unsigned channels) noexcept {
  switch (channels) {
    case 2: return detail::splitWords<2, S, B, Swap>;
    case 3: return detail::splitWords<3, S, B, Swap>;
    case 4: return detail::splitWords<4, S, B, Swap>;
    case 5: return detail::splitWords<5, S, B, Swap>;
    case 6: return detail::splitWords<6, S, B, Swap>;
    case 7: return detail::splitWords<7, S, B, Swap>;
    case 8: return detail::splitWords<8, S, B, Swap>;
    default: return nullptr;
  }
}

template <unsigned B>
JoinFn joinWordsFor(unsigned channels) noexcept {
  switch (channels) {
    case 2: return detail::joinWords<2, B>;
    case 3: return detail::joinWords<3, B>;
    case 4: return detail::joinWords<4, B>;
    case 5: return detail::joinWords<5, B>;
    case 6: return detail::joinWords<6, B>;
    case 7: return detail::joinWords<7, B>;
    case 8: return detail::joinWords<8, B>;
    default: return nullptr;
  }
}

SplitFn findSplitWords(unsigned channels, unsigned stride, unsigned bytes, bool swap) noexcept {
  switch (layoutKey(stride, bytes, swap)) {
    case layoutKey(1, 1, false): return splitWordsFor<1, 1, false>(channels);
    case layoutKey(2, 2, false): return splitWordsFor<2, 2, false>(channels);
    case layoutKey(2, 2, true): return splitWordsFor<2, 2, true>(channels);
    case layoutKey(3, 3, false): return splitWordsFor<3, 3, false>(channels);
    case layoutKey(3, 3, true): return splitWordsFor<3, 3, true>(channels);
    case layoutKey(4, 3, false): return splitWordsFor<4, 3, false>(channels);
    case layoutKey(4, 3, true): return splitWordsFor<4, 3, true>(channels);
    case layoutKey(4, 4, false): return splitWordsFor<4, 4, false>(channels);
    case layoutKey(4, 4, true): return splitWordsFor<4, 4, true>(channels);
    default: return nullptr;
  }
}

JoinFn findJoinWords(unsigned channels, unsigned bytes) noexcept {
  switch (bytes) {
    case 1: return joinWordsFor<1>(channels);
    case 2: return joinWordsFor<2>(channels);
    case 3: return joinWordsFor<3>(channels);
    case 4: return joinWordsFor<4>(channels);
    case 8: return joinWordsFor<8>(channels);
    default: return nullptr;
  }
}

SplitAnyFn findSplitWordsAnyChannels(unsigned stride, unsigned bytes, bool swap) noexcept {
  switch (layoutKey(stride, bytes, swap)) {
    case layoutKey(1, 1, false): return detail::splitWordsAnyChannels<1, 1, false>;
    case layoutKey(2, 2, false): return detail::splitWordsAnyChannels<2, 2, false>;
    case layoutKey(2, 2, true): return detail::splitWordsAnyChannels<2, 2, true>;
    case layoutKey(3, 3, false): return detail::splitWordsAnyChannels<3, 3, false>;
    case layoutKey(3, 3, true): return detail::splitWordsAnyChannels<3, 3, true>;
    case layoutKey(4, 3, false): return detail::splitWordsAnyChannels<4, 3, false>;
    case layoutKey(4, 3, true): return detail::splitWordsAnyChannels<4, 3, true>;
    case layoutKey(4, 4, false): return detail::splitWordsAnyChannels<4, 4, false>;
    case layoutKey(4, 4, true): return detail::splitWordsAnyChannels<4, 4, true>;
    default: return nullptr;
  }
}

JoinAnyFn findJoinWordsAnyChannels(unsigned bytes) noexcept {
  switch (bytes) {
    case 1: return detail::joinWordsAnyChannels<1>;
    case 2: return detail::joinWordsAnyChannels<2>;
    case 3: return detail::joinWordsAnyChannels<3>;
    case 4: return detail::joinWordsAnyChannels<4>;
    case 8: return detail::joinWordsAnyChannels<8>;
    default: return nullptr;
  }
}

}  // namespace

JoinAnyFn findJoinAnyChannels(Simd::eLevel level, unsigned bytes) noexcept {
  return level >= Simd::eSSE2 ? findJoinWordsAnyChannels(bytes) : nullptr;
}

SplitAnyFn findSplitAnyChannels(Simd::eLevel level, unsigned stride, unsigned bytes, bool swap) noexcept {
  return level >= Simd::eSSE2 ? findSplitWordsAnyChannels(stride, bytes, swap) : nullptr;
}

SplitFn findSplit(Simd::eLevel level, unsigned channels, unsigned stride, unsigned bytes,
                  bool swap) noexcept {
  if (level >= Simd::eAVX2)
    if (SplitFn fn = findSplitAVX2(channels, stride, bytes, swap)) return fn;
  if (level >= Simd::eSSE2) return findSplitWords(channels, stride, bytes, swap);
  return nullptr;
}

JoinFn findJoin(Simd::eLevel level, unsigned channels, unsigned bytes) noexcept {
  if (level >= Simd::eAVX2)
    if (JoinFn fn = findJoinAVX2(channels, bytes)) return fn;
  if (level >= Simd::eSSE2) return findJoinWords(channels, bytes);
  return nullptr;
}

}  // namespace Aud::Interleave
