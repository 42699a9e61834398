// Helpers shared by the mixer state tests: a byte writer that builds
// expected streams independently of the stream classes, random states, an
// entry-by-entry comparison, and a capture of fatal reports.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <functional>
#include <random>
#include <string>
#include <vector>

#include "host/HostHooks.h"
#include "tonebits/mixer/Aud__SimpleMixState.h"

namespace mixtest {

struct Bytes {
  std::vector<uint8_t> data;
  Bytes& u8(unsigned v) {
    data.push_back(static_cast<uint8_t>(v));
    return *this;
  }
  Bytes& u16(unsigned v) { return u8(v & 0xFF).u8((v >> 8) & 0xFF); }
  Bytes& u32(uint32_t v) { return u16(v & 0xFFFF).u16(v >> 16); }
  Bytes& f32(float v) {
    uint32_t bits;
    std::memcpy(&bits, &v, 4);
    return u32(bits);
  }
  // The record framing: a 32-bit count, then the bytes.
  Bytes& record(const std::string& s) {
    u32(static_cast<uint32_t>(s.size()));
    data.insert(data.end(), s.begin(), s.end());
    return *this;
  }
  Bytes& block(const std::vector<uint8_t>& b) {
    u32(static_cast<uint32_t>(b.size()));
    data.insert(data.end(), b.begin(), b.end());
    return *this;
  }
  Bytes& append(const Bytes& other) {
    data.insert(data.end(), other.data.begin(), other.data.end());
    return *this;
  }
  // A version-2 chunk header.
  Bytes& header(const std::string& name, unsigned major, unsigned minor, uint32_t own, uint32_t total) {
    return record(name).u8(major).u8(minor).u32(own).u32(total);
  }
  std::size_t size() const { return data.size(); }
};

// The root and Taggable chunks in front of a layer chunk of `nested` bytes.
inline Bytes baseChunks(std::size_t nested, const IdStamp& tag = IdStamp::invalidStamp()) {
  Bytes b;
  const uint32_t tagChunk = static_cast<uint32_t>(4 + 2 + 2 + 8 + 12 + nested);
  b.header("$", 2, 0, 0, tagChunk);
  b.header("TG", 1, 0, 12, static_cast<uint32_t>(12 + nested));
  for (int i = 0; i < 3; ++i) b.u32(tag.word(i));
  return b;
}

inline uint32_t bitsOf(float v) {
  uint32_t b;
  std::memcpy(&b, &v, 4);
  return b;
}

// Entry-by-entry equality through the accessors (floats bit for bit).
inline void expectSameEntries(Aud::SimpleMixState& a, Aud::SimpleMixState& b, int ni, int nm, int no,
                              bool muteSolo = true) {
  for (int i = 0; i < ni; ++i) {
    SCOPED_TRACE("input " + std::to_string(i));
    EXPECT_EQ(bitsOf(a.getInputLevel(i)), bitsOf(b.getInputLevel(i)));
    EXPECT_EQ(bitsOf(a.getInputPan(i)), bitsOf(b.getInputPan(i)));
    if (muteSolo) {
      EXPECT_EQ(a.getInputMuteState(i), b.getInputMuteState(i));
      EXPECT_EQ(a.getInputSoloState(i), b.getInputSoloState(i));
    }
    for (int m = -1; m < nm; ++m) EXPECT_EQ(a.getInputRoutedToMix(i, m), b.getInputRoutedToMix(i, m)) << m;
  }
  for (int m = -1; m < nm; ++m) {
    SCOPED_TRACE("mix " + std::to_string(m));
    EXPECT_EQ(bitsOf(a.getMixLevel(m)), bitsOf(b.getMixLevel(m)));
    if (muteSolo) {
      EXPECT_EQ(a.getMixMuteState(m), b.getMixMuteState(m));
      EXPECT_EQ(a.getMixSoloState(m), b.getMixSoloState(m));
    }
    for (int o = -2; o < no; ++o) {
      EXPECT_EQ(a.getMixRoutedToOutput(m, o, true), b.getMixRoutedToOutput(m, o, true)) << o;
      EXPECT_EQ(a.getMixRoutedToOutput(m, o, false), b.getMixRoutedToOutput(m, o, false)) << o;
    }
  }
}

// Fills a state (made with the user's counts) with random settings through
// its setters. Levels are drawn so that ten decimals give them back exactly.
inline void randomize(Aud::SimpleMixState& s, int ni, int nm, int no, std::mt19937& rng) {
  std::uniform_real_distribution<float> level(0.01f, 1.5f), pan(0.0f, 1.0f);
  std::bernoulli_distribution coin(0.5);
  for (int i = 0; i < ni; ++i) {
    s.setInputLevel(i, level(rng));
    s.setInputPan(i, pan(rng) + 0.01f);
    s.setInputMuteState(i, coin(rng));
    s.setInputSoloState(i, coin(rng));
    for (int m = -1; m < nm; ++m) s.setInputRoutedToMix(i, m, coin(rng));
  }
  for (int m = -1; m < nm; ++m) {
    s.setMixLevel(m, level(rng));
    s.setMixMuteState(m, coin(rng));
    s.setMixSoloState(m, coin(rng));
    for (int o = -2; o < no; ++o) {
      s.setMixRoutedToOutput(m, o, true, coin(rng));
      s.setMixRoutedToOutput(m, o, false, coin(rng));
    }
  }
}

// Captures vel_splat reports for its lifetime.
class FatalReports {
 public:
  FatalReports() {
    host::setFatalReportHandler([this](const char* m) { messages.emplace_back(m); });
  }
  ~FatalReports() { host::setFatalReportHandler({}); }
  std::vector<std::string> messages;
};

}  // namespace mixtest
