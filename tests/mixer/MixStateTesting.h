// Helpers shared by the mixer state tests: a byte writer that builds
// expected streams independently of the stream classes, random states and
// an entry-by-entry comparison.
#pragma once

#include <gtest/gtest.h>

#include <bit>
#include <cstdint>
#include <random>
#include <string>
#include <vector>

#include "tonebits/mixer/Aud__SimpleMixState.h"

namespace mixtest {

using Aud::SimpleMixState;

struct Bytes {
  std::vector<uint8_t> data;
  Bytes& u8(unsigned v) { return data.push_back(static_cast<uint8_t>(v)), *this; }
  Bytes& u16(unsigned v) { return u8(v & 0xFF).u8((v >> 8) & 0xFF); }
  Bytes& u32(uint32_t v) { return u16(v & 0xFFFF).u16(v >> 16); }
  Bytes& f32(float v) { return u32(std::bit_cast<uint32_t>(v)); }
  Bytes& append(const std::vector<uint8_t>& b) { return data.insert(data.end(), b.begin(), b.end()), *this; }
  Bytes& append(const Bytes& b) { return append(b.data); }
  // A 32-bit count, then the bytes.
  Bytes& record(const std::string& s) {
    return u32(static_cast<uint32_t>(s.size())).append(std::vector<uint8_t>(s.begin(), s.end()));
  }
  Bytes& block(const std::vector<uint8_t>& b) { return u32(static_cast<uint32_t>(b.size())).append(b); }
  // A version-2 chunk header.
  Bytes& header(const std::string& name, unsigned major, unsigned minor, uint32_t own, uint32_t total) {
    return record(name).u8(major).u8(minor).u32(own).u32(total);
  }
  std::size_t size() const { return data.size(); }
};

// The root and Taggable chunks in front of a layer chunk of `nested` bytes.
inline Bytes baseChunks(std::size_t nested, const IdStamp& tag = IdStamp::invalidStamp()) {
  Bytes b;
  b.header("$", 2, 0, 0, static_cast<uint32_t>(28 + nested));
  b.header("TG", 1, 0, 12, static_cast<uint32_t>(12 + nested));
  for (int i = 0; i < 3; ++i) b.u32(tag.word(i));
  return b;
}

struct Dims {
  int ni, nm, no;
};
constexpr Dims kEverywhere{1 << 20, 1 << 20, 1 << 20};

// Entry-by-entry equality of a (with user counts n) through the accessors,
// floats bit for bit: entries within `from` are compared with b, the others
// with `rest`; mutes and solos with `rest` too unless `muteSolo`.
inline void expectSameEntries(SimpleMixState& a, SimpleMixState& b, Dims n, bool muteSolo = true,
                              Dims from = kEverywhere, SimpleMixState* rest = nullptr) {
  auto ref = [&](bool inB) -> SimpleMixState& { return inB || !rest ? b : *rest; };
  for (int i = 0; i < n.ni; ++i) {
    SCOPED_TRACE("input " + std::to_string(i));
    SimpleMixState& r = ref(i < from.ni);
    SimpleMixState& flags = muteSolo ? r : *rest;
    EXPECT_EQ(std::bit_cast<uint32_t>(a.getInputLevel(i)), std::bit_cast<uint32_t>(r.getInputLevel(i)));
    EXPECT_EQ(std::bit_cast<uint32_t>(a.getInputPan(i)), std::bit_cast<uint32_t>(r.getInputPan(i)));
    EXPECT_EQ(a.getInputMuteState(i), flags.getInputMuteState(i));
    EXPECT_EQ(a.getInputSoloState(i), flags.getInputSoloState(i));
    for (int m = -1; m < n.nm; ++m)
      EXPECT_EQ(a.getInputRoutedToMix(i, m), ref(i < from.ni && m < from.nm).getInputRoutedToMix(i, m)) << m;
  }
  for (int m = -1; m < n.nm; ++m) {
    SCOPED_TRACE("mix " + std::to_string(m));
    SimpleMixState& r = ref(m < from.nm);
    SimpleMixState& flags = muteSolo ? r : *rest;
    EXPECT_EQ(std::bit_cast<uint32_t>(a.getMixLevel(m)), std::bit_cast<uint32_t>(r.getMixLevel(m)));
    EXPECT_EQ(a.getMixMuteState(m), flags.getMixMuteState(m));
    EXPECT_EQ(a.getMixSoloState(m), flags.getMixSoloState(m));
    for (int o = -2; o < n.no; ++o)
      for (bool left : {true, false})
        EXPECT_EQ(a.getMixRoutedToOutput(m, o, left),
                  ref(m < from.nm && o < from.no).getMixRoutedToOutput(m, o, left))
            << o << (left ? "L" : "R");
  }
}

// Fills a state (made with the user's counts) with random settings through
// its setters. Levels are drawn so that ten decimals give them back exactly.
inline void randomize(SimpleMixState& s, Dims n, std::mt19937& rng) {
  std::uniform_real_distribution<float> level(0.01f, 1.5f), pan(0.0f, 1.0f);
  std::bernoulli_distribution coin(0.5);
  for (int i = 0; i < n.ni; ++i) {
    s.setInputLevel(i, level(rng));
    s.setInputPan(i, pan(rng) + 0.01f);
    s.setInputMuteState(i, coin(rng));
    s.setInputSoloState(i, coin(rng));
    for (int m = -1; m < n.nm; ++m) s.setInputRoutedToMix(i, m, coin(rng));
  }
  for (int m = -1; m < n.nm; ++m) {
    s.setMixLevel(m, level(rng));
    s.setMixMuteState(m, coin(rng));
    s.setMixSoloState(m, coin(rng));
    for (int o = -2; o < n.no; ++o)
      for (bool left : {true, false}) s.setMixRoutedToOutput(m, o, left, coin(rng));
  }
}

}  // namespace mixtest
