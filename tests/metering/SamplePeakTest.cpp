// The decode-and-peak kernel, and the clip rule on its peak.
#include <gtest/gtest.h>

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <random>
#include <vector>

#include "metering/MeteringTestSupport.h"
#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/foundation/Aud__Simd.h"
#include "tonebits/metering/Aud__SamplePeak.h"

namespace {

using Aud::Simd::eLevel;
using Bytes = std::vector<unsigned char>;
using metering_test::bytesOf;
constexpr float kNaN = std::numeric_limits<float>::quiet_NaN();
constexpr float kInf = std::numeric_limits<float>::infinity();

// Sets each level this CPU supports in turn; restores the suite's level.
struct EveryLevel {
  const eLevel saved = Aud::Simd::activeLevel();
  ~EveryLevel() { Aud::Simd::setActiveLevel(saved); }
  template <class F>
  void run(F body) {
    for (int l = Aud::Simd::eScalar; l <= Aud::Simd::supportedLevel(); ++l) {
      Aud::Simd::setActiveLevel(eLevel(l));
      body(eLevel(l));
    }
  }
};

// The rule, through the exported per-sample conversion.
float oracle(int type, const unsigned char* s, std::size_t n) {
  const unsigned bytes = Aud::bytesPerSampleOfType(type);
  float p = 0.0f;  // a NaN is never larger
  for (std::size_t i = 0; i < n; ++i) p = std::max(p, std::fabs(Aud::sampleToFloat(type, s + i * bytes)));
  return p;
}

// Stored forms on an edge of their type's decoding; the first two are the
// loudest of each sign.
std::vector<Bytes> specialsOf(int type) {
  using FL = std::numeric_limits<float>;
  using DL = std::numeric_limits<double>;
  std::vector<Bytes> out;
  switch (type) {
    case 0:
    case 7:
      for (float f :
           {-FL::infinity(), FL::max(), FL::quiet_NaN(), -FL::quiet_NaN(), FL::signaling_NaN(),
            FL::infinity(), -0.0f, 0.0f, FL::denorm_min(), -FL::denorm_min(), -FL::max(), 1.0f, -1.0f, 0.99f})
        out.push_back(bytesOf<float>({f}));
      return out;
    case 8:
      for (double d :
           {-DL::infinity(), 1e300, DL::quiet_NaN(), -DL::quiet_NaN(), DL::infinity(), -1e300, 1e-300,
            -DL::denorm_min(), -0.0, 0.99, 1.0 + 0x1p-24, -(1.0 - 0x1p-25), 3.4028235677973366e38})
        out.push_back(bytesOf<double>({d}));
      return out;
    case 1:
      return {bytesOf<int16_t>({-32768}), bytesOf<int16_t>({32767}), bytesOf<int16_t>({-1}),
              bytesOf<int16_t>({0})};
    case 2: return {{0x00, 0x00, 0x80}, {0xFF, 0xFF, 0x7F}, {0xFF, 0xFF, 0xFF}, {0x00, 0x00, 0x00}};
    case 3: return {{0x80}, {0x7F}, {0xFF}, {0x00}};
    case 4: return {{0x00}, {0xFF}, {0x80}, {0x7F}};
    case 5:
      return {{0x00, 0x00, 0x80, 0x7F}, {0xFF, 0xFF, 0x7F, 0x80}, {0xFF, 0xFF, 0xFF, 0x00}, {0, 0, 0, 0xFF}};
    case 6:
      return {bytesOf<int32_t>({INT32_MIN}), bytesOf<int32_t>({INT32_MAX}), bytesOf<int32_t>({-1}),
              bytesOf<int32_t>({0})};
    default: return out;
  }
}

// Ways to fill a block, so that each sign and each lane gets to hold the peak:
// random bytes (floats of every exponent, NaNs among them), quiet, positive,
// negative, quiet with one loudest, and salted with specials.
enum Fill { kRandomBytes, kQuiet, kPositive, kNegative, kOneLoud, kSalted, kFills };

Bytes makeBlock(int type, std::size_t n, int fill, std::mt19937& rng) {
  const unsigned bytes = Aud::bytesPerSampleOfType(type);
  const auto specials = specialsOf(type);
  const float lo[] = {0, -.01f, 0, -.9f, -.01f, -.9f}, hi[] = {0, .01f, .9f, 0, .01f, .9f};
  std::uniform_real_distribution<float> value(lo[fill], hi[fill]);
  Bytes block(n * bytes);
  for (unsigned char* at = block.data(); at != block.data() + block.size(); at += bytes) {
    if (fill == kRandomBytes) {
      for (unsigned b = 0; b < bytes; ++b) at[b] = static_cast<unsigned char>(rng());
    } else if (fill == kSalted && rng() % 8 == 0) {
      std::memcpy(at, specials[rng() % specials.size()].data(), bytes);
    } else {
      Aud::sampleFromFloat(type, value(rng), at);
    }
  }
  if (fill == kOneLoud && n > 0) std::memcpy(&block[(rng() % n) * bytes], specials[rng() % 2].data(), bytes);
  return block;
}

// Every SIMD level this CPU supports must give the bits of the per-sample
// rule, over every sample type, lengths around the vector widths, unaligned
// starts, and samples salted with NaN, infinities, denormals, -0.0 and the
// integer extremes. Unsupported types, and no memory, give +0.
TEST(SamplePeak, EveryLevelGivesTheBitsOfTheRule) {
  EveryLevel levels;
  const unsigned char loud[8] = {0x00, 0x00, 0x00, 0x80, 0xFF, 0xFF, 0xFF, 0xFF};
  levels.run([&](eLevel) {
    for (int type : {-1, 9, 1000})
      EXPECT_EQ(std::bit_cast<uint32_t>(Aud::Private::samplePeak(type, loud, 1)), 0u);
    for (int type = 0; type < Aud::kNumSampleTypes; ++type)
      EXPECT_EQ(std::bit_cast<uint32_t>(Aud::Private::samplePeak(type, nullptr, 16)), 0u);
  });
  std::mt19937 rng(20240611);
  std::vector<std::size_t> lengths;
  for (std::size_t n = 0; n <= 72; ++n) lengths.push_back(n);
  for (std::size_t n : {95, 96, 97, 127, 128, 129, 255, 256, 257, 1000, 4099}) lengths.push_back(n);
  for (int type = 0; type < Aud::kNumSampleTypes; ++type) {
    for (std::size_t n : lengths) {
      for (int fill = 0; fill < kFills; ++fill) {
        const Bytes block = makeBlock(type, n, fill, rng);
        const std::size_t offset = rng() % 8;  // any start address
        Bytes shifted(offset + block.size());  // no slack: a read past the end is caught
        if (!block.empty()) std::memcpy(shifted.data() + offset, block.data(), block.size());
        const unsigned char* s = shifted.data() + offset;
        const float expect = oracle(type, s, n);
        levels.run([&](eLevel level) {
          const float got = Aud::Private::samplePeak(type, s, n);
          EXPECT_EQ(std::bit_cast<uint32_t>(got), std::bit_cast<uint32_t>(expect))
              << "type " << type << " n " << n << " fill " << fill << " offset " << offset << " level "
              << Aud::Simd::levelName(level) << ": " << got << " vs " << expect;
        });
        if (HasFailure()) return;
      }
    }
  }
}

// Every sample type's decoding at its extremes: the kernel's peak, and what
// a meter of the input then reads (a clip first raises it to full scale).
TEST(SamplePeak, PeakAndClipOfEverySampleType) {
  metering_test::ManualClock clock;  // frozen: nothing expires
  struct Row {
    const char* what;
    int type;
    Bytes bytes;
    float peak;
    bool clip;
  };
  const float int32Zero = float(0.5 / 2147483647.5);
  const float below99 = std::nextafter(0.99f, 0.0f);
  const Row rows[] = {
      {"float nearest 0.99 clips", 0, bytesOf<float>({0.99f}), 0.99f, true},
      {"float just below 0.99", 0, bytesOf<float>({below99}), below99, false},
      {"float NaN passed over", 0, bytesOf<float>({kNaN, 0.25f, -kNaN}), 0.25f, false},
      {"float negative zero", 0, bytesOf<float>({-0.0f}), 0.0f, false},
      {"float infinity", 0, bytesOf<float>({0.5f, -kInf}), kInf, true},
      {"int16 most negative", 1, bytesOf<int16_t>({-32768}), 1.0f, true},
      {"int16 most positive", 1, bytesOf<int16_t>({32767}), 0.999969482421875f, true},
      {"int16 below the threshold", 1, bytesOf<int16_t>({-32440, 100}), 32440.0f / 32768, false},
      {"int16 above the threshold", 1, bytesOf<int16_t>({100, 32441}), 32441.0f / 32768, true},
      {"int24 most negative", 2, {0x00, 0x00, 0x80, 0x01, 0x00, 0x00}, 1.0f, true},
      {"int24 most positive", 2, {0xFF, 0xFF, 0x7F}, 0.99999988079071044921875f, true},
      {"int24 minus one", 2, {0xFF, 0xFF, 0xFF}, 0x1p-23f, false},
      {"int8 most negative", 3, {0x80}, 1.0f, true},
      {"int8 most positive", 3, {0x7F, 0x00}, 0.9921875f, true},
      {"uint8 zero is full scale", 4, {0x00}, 1.0f, true},
      {"uint8 offset is silence", 4, {0x80, 0x80}, 0.0f, false},
      {"uint8 top", 4, {0xFF}, 0.9921875f, true},
      {"uint8 near the offset", 4, {0x81, 0x7E}, 0.015625f, false},
      {"int24 in 32 ignores byte 3", 5, {0x01, 0x00, 0x00, 0xFF, 0xFF, 0xFF, 0xFF, 0x00}, 0x1p-23f, false},
      {"int24 in 32 most negative", 5, {0x00, 0x00, 0x80, 0x12}, 1.0f, true},
      {"int24 in 32 most positive", 5, {0xFF, 0xFF, 0x7F, 0x80}, 0.99999988079071044921875f, true},
      {"int32 zeros are not silence", 6, bytesOf<int32_t>({0, 0, 0}), int32Zero, false},
      {"int32 most negative", 6, bytesOf<int32_t>({INT32_MIN}), 1.0f, true},
      {"int32 most positive", 6, bytesOf<int32_t>({INT32_MAX, 0}), 1.0f, true},
      {"unclamped float", 7, bytesOf<float>({1.5f, -2.0f}), 2.0f, true},
      {"double NaN", 8, bytesOf<double>({std::nan(""), 0.125}), 0.125f, false},
      {"double beyond float range", 8, bytesOf<double>({-1e300}), kInf, true},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    const unsigned n = unsigned(row.bytes.size() / Aud::bytesPerSampleOfType(row.type));
    const float kernel = Aud::Private::samplePeak(row.type, row.bytes.data(), n);
    EXPECT_EQ(kernel, row.peak);
    EXPECT_FALSE(std::signbit(kernel));

    metering_test::TestMonitor monitor;
    monitor.registerMonitoringPoints(1);
    auto readers = metering_test::primedReaders(monitor);
    auto block = metering_test::listOf({metering_test::bufferOf(row.bytes, n, row.type)}, n, row.type);
    monitor.updateMonitoringPoints(block);
    EXPECT_EQ(readers[0].hasClipped(true), row.clip);
    EXPECT_EQ(readers[0].peakValue(true), row.clip ? std::max(1.0f, row.peak) : row.peak);
  }
}

}  // namespace
