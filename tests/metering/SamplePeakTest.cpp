// The decode-and-peak kernel: every SIMD level this CPU supports must give
// the bits of the per-sample rule, over every sample type, lengths around the
// vector widths, unaligned starts, and samples salted with NaN, infinities,
// denormals, -0.0 and the integer extremes.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <random>
#include <vector>

#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/foundation/Aud__Simd.h"
#include "tonebits/metering/Aud__SamplePeak.h"

namespace {

using Aud::Simd::eLevel;
using Bytes = std::vector<unsigned char>;

// Restores the level the suite runs at.
class LevelGuard {
 public:
  LevelGuard() : saved_(Aud::Simd::activeLevel()) {}
  ~LevelGuard() { Aud::Simd::setActiveLevel(saved_); }

 private:
  eLevel saved_;
};

std::vector<eLevel> everyLevel() {
  std::vector<eLevel> levels;
  for (int l = Aud::Simd::eScalar; l <= Aud::Simd::supportedLevel(); ++l) levels.push_back(eLevel(l));
  return levels;
}

// The rule, through the exported per-sample conversion.
float oracle(int type, const unsigned char* s, std::size_t n) {
  const unsigned bytes = Aud::bytesPerSampleOfType(type);
  float p = 0.0f;
  for (std::size_t i = 0; i < n; ++i) {
    const float a = std::fabs(Aud::sampleToFloat(type, s + i * bytes));
    if (a > p) p = a;
  }
  return p;
}

uint32_t bitsOf(float f) {
  uint32_t u;
  std::memcpy(&u, &f, 4);
  return u;
}

// Stored forms that sit on an edge of their type's decoding; the first two
// are the loudest of each sign.
std::vector<Bytes> specialsOf(int type) {
  auto asBytes = [](auto v) {
    Bytes b(sizeof v);
    std::memcpy(b.data(), &v, sizeof v);
    return b;
  };
  using FL = std::numeric_limits<float>;
  using DL = std::numeric_limits<double>;
  switch (type) {
    case 0:
    case 7: {
      std::vector<Bytes> out;
      for (float f :
           {-FL::infinity(), FL::max(), FL::quiet_NaN(), -FL::quiet_NaN(), FL::signaling_NaN(),
            FL::infinity(), -0.0f, 0.0f, FL::denorm_min(), -FL::denorm_min(), -FL::max(), 1.0f, -1.0f, 0.99f})
        out.push_back(asBytes(f));
      return out;
    }
    case 8: {
      std::vector<Bytes> out;
      for (double d :
           {-DL::infinity(), 1e300, DL::quiet_NaN(), -DL::quiet_NaN(), DL::infinity(), -1e300, 1e-300,
            -DL::denorm_min(), -0.0, 0.99, 1.0 + 0x1p-24, -(1.0 - 0x1p-25), 3.4028235677973366e38})
        out.push_back(asBytes(d));
      return out;
    }
    case 1:
      return {asBytes(int16_t(-32768)), asBytes(int16_t(32767)), asBytes(int16_t(-1)), asBytes(int16_t(0))};
    case 2: return {{0x00, 0x00, 0x80}, {0xFF, 0xFF, 0x7F}, {0xFF, 0xFF, 0xFF}, {0x00, 0x00, 0x00}};
    case 3: return {{0x80}, {0x7F}, {0xFF}, {0x00}};
    case 4: return {{0x00}, {0xFF}, {0x80}, {0x7F}};
    case 5:
      return {{0x00, 0x00, 0x80, 0x7F}, {0xFF, 0xFF, 0x7F, 0x80}, {0xFF, 0xFF, 0xFF, 0x00}, {0, 0, 0, 0xFF}};
    case 6: return {asBytes(INT32_MIN), asBytes(INT32_MAX), asBytes(int32_t(-1)), asBytes(int32_t(0))};
    default: return {};
  }
}

// Ways to fill a block, so that each sign and each lane gets to hold the peak.
enum Fill { kRandomBytes, kQuiet, kAllPositive, kAllNegative, kOneLoud, kSalted, kFills };

Bytes makeBlock(int type, std::size_t n, Fill fill, std::mt19937& rng) {
  const unsigned bytes = Aud::bytesPerSampleOfType(type);
  Bytes block(n * bytes);
  std::uniform_real_distribution<float> quiet(-0.01f, 0.01f), unit(0.0f, 0.9f);
  for (std::size_t i = 0; i < n; ++i) {
    unsigned char* at = block.data() + i * bytes;
    switch (fill) {
      case kRandomBytes:  // floats of every exponent, NaNs among them
        for (unsigned b = 0; b < bytes; ++b) at[b] = static_cast<unsigned char>(rng());
        break;
      case kSalted: Aud::sampleFromFloat(type, unit(rng) * 2 - 0.9f, at); break;
      case kQuiet:
      case kOneLoud: Aud::sampleFromFloat(type, quiet(rng), at); break;
      case kAllPositive: Aud::sampleFromFloat(type, unit(rng), at); break;
      case kAllNegative: Aud::sampleFromFloat(type, -unit(rng), at); break;
      case kFills: break;
    }
  }
  const auto specials = specialsOf(type);
  if (fill == kOneLoud && n > 0) {
    const Bytes& loud = specials[rng() % 2];
    std::memcpy(block.data() + (rng() % n) * bytes, loud.data(), bytes);
  }
  if (fill == kSalted) {
    for (std::size_t i = 0; i < n; ++i) {
      if (rng() % 8 == 0)
        std::memcpy(block.data() + i * bytes, specials[rng() % specials.size()].data(), bytes);
    }
  }
  return block;
}

TEST(SamplePeak, EveryLevelGivesTheBitsOfTheRule) {
  LevelGuard guard;
  std::mt19937 rng(20240611);
  std::vector<std::size_t> lengths;
  for (std::size_t n = 0; n <= 72; ++n) lengths.push_back(n);
  for (std::size_t n : {95, 96, 97, 127, 128, 129, 255, 256, 257, 1000, 4099}) lengths.push_back(n);

  for (int type = 0; type < Aud::kNumSampleTypes; ++type) {
    const unsigned bytes = Aud::bytesPerSampleOfType(type);
    for (std::size_t n : lengths) {
      for (int fill = 0; fill < kFills; ++fill) {
        const Bytes block = makeBlock(type, n, Fill(fill), rng);
        const std::size_t offset = rng() % 8;  // any start address
        Bytes shifted(offset + block.size());  // no slack: a read past the end is caught
        if (!block.empty()) std::memcpy(shifted.data() + offset, block.data(), block.size());
        const unsigned char* s = shifted.data() + offset;
        const float expect = oracle(type, s, n);
        for (eLevel level : everyLevel()) {
          Aud::Simd::setActiveLevel(level);
          const float got = Aud::Private::samplePeak(type, s, n);
          ASSERT_EQ(bitsOf(got), bitsOf(expect))
              << "type " << type << " n " << n << " fill " << fill << " offset " << offset << " level "
              << Aud::Simd::levelName(level) << ": " << got << " vs " << expect << " (" << bytes
              << " bytes each)";
        }
      }
    }
  }
}

TEST(SamplePeak, NothingToScanIsZero) {
  LevelGuard guard;
  const unsigned char loud[8] = {0x00, 0x00, 0x00, 0x80, 0xFF, 0xFF, 0xFF, 0xFF};
  for (eLevel level : everyLevel()) {
    Aud::Simd::setActiveLevel(level);
    for (int type : {-1, 9, 1000}) EXPECT_EQ(bitsOf(Aud::Private::samplePeak(type, loud, 1)), 0u);
    for (int type = 0; type < Aud::kNumSampleTypes; ++type) {
      EXPECT_EQ(bitsOf(Aud::Private::samplePeak(type, loud, 0)), 0u);
      EXPECT_EQ(bitsOf(Aud::Private::samplePeak(type, nullptr, 16)), 0u);
    }
  }
}

}  // namespace
