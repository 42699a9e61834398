#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <random>
#include <vector>

#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/foundation/Aud__Simd.h"

namespace {

using Aud::bytesPerSampleOfType;
using Aud::Simd::eLevel;
using Bytes = std::vector<unsigned char>;

float floatOfBits(uint32_t bits) {
  float f;
  std::memcpy(&f, &bits, 4);
  return f;
}
uint32_t bitsOf(float f) {
  uint32_t bits;
  std::memcpy(&bits, &f, 4);
  return bits;
}
// The little-endian bytes of the low n bytes of v.
Bytes le(uint64_t v, unsigned n) {
  Bytes b(n);
  for (unsigned i = 0; i < n; ++i) b[i] = static_cast<unsigned char>(v >> (8 * i));
  return b;
}

constexpr std::size_t kRun = 37;  // longer than any vector loop step, not a multiple of one
const float kNaN = std::numeric_limits<float>::quiet_NaN();
const float kInf = std::numeric_limits<float>::infinity();
const float kDenorm = std::numeric_limits<float>::denorm_min();
constexpr float kFloatMax = Aud::SampleRules::kFloatMax;
constexpr float kInt16Max = Aud::SampleRules::kInt16Max;
constexpr float kInt8Max = Aud::SampleRules::kInt8Max;

// Every level this CPU runs; the active level is restored on destruction.
struct EachLevel {
  eLevel saved = Aud::Simd::activeLevel();
  std::vector<eLevel> levels;
  EachLevel() {
    for (int l = Aud::Simd::eScalar; l <= Aud::Simd::supportedLevel(); ++l) levels.push_back(eLevel(l));
  }
  ~EachLevel() { Aud::Simd::setActiveLevel(saved); }
};

// Floats that probe every branch of the rules: NaNs of both signs and both
// kinds, infinities, denormals, signed zeros, and each clamp bound with its
// neighbours.
std::vector<float> specialFloats() {
  std::vector<float> v = {kNaN,
                          -kNaN,
                          floatOfBits(0x7F800001),
                          floatOfBits(0xFFFFFFFF),
                          kInf,
                          -kInf,
                          kDenorm,
                          -kDenorm,
                          std::numeric_limits<float>::min(),
                          0.0f,
                          -0.0f,
                          0.5f,
                          -0.5f,
                          1e30f,
                          -1e30f,
                          std::numeric_limits<float>::max(),
                          2.0f,
                          -2.0f};
  // Type 6's rounding edges: c * 2^31 near small half-integers, and where
  // it stops having a fraction.
  for (float edge : {0x1p-32f, 0x1p-31f, 0x1.8p-31f, 0x1.4p-30f, 0x1p-8f}) v.insert(v.end(), {edge, -edge});
  for (float bound : {-1.0f, 1.0f, kFloatMax, kInt16Max, kInt8Max, 0.0f, 2.0f, 0x1p-8f}) {
    v.push_back(bound);
    v.push_back(std::nextafter(bound, 3.0f));
    v.push_back(std::nextafter(bound, -3.0f));
  }
  return v;
}

// Random floats: mostly in the signal range, some arbitrary bit patterns,
// salted with the specials.
std::vector<float> randomFloats(std::size_t n, uint32_t seed) {
  std::mt19937 rng(seed);
  std::uniform_real_distribution<float> signal(-1.25f, 1.25f);
  const std::vector<float> specials = specialFloats();
  std::vector<float> v(n);
  for (float& f : v) {
    const uint32_t pick = rng() % 8;
    f = pick == 0 ? floatOfBits(rng()) : pick == 1 ? specials[rng() % specials.size()] : signal(rng);
  }
  return v;
}

// Random stored samples; doubles are biased towards values that round
// interestingly to float (halfway cases, overflow, underflow).
Bytes randomSamples(int type, std::size_t n, uint32_t seed) {
  std::mt19937 rng(seed);
  Bytes b(n * bytesPerSampleOfType(type) + 8);
  for (auto& x : b) x = static_cast<unsigned char>(rng());
  if (type == 8) {
    const double picks[] = {1.0 + 0x1p-24, 1.0 - 0x1p-25, 1e39, -1e39, 1e-40, 1e-50, 0.0, -0.0, 1.5, -1.0};
    for (std::size_t i = 0; i < n; i += 3) std::memcpy(&b[8 * i], &picks[rng() % 10], 8);
  }
  return b;
}

Bytes fromFloatRule(int type, float v) {
  Bytes b(bytesPerSampleOfType(type));
  EXPECT_TRUE(Aud::sampleFromFloat(type, v, b.data()));
  return b;
}

TEST(SampleConversion, WritingFollowsTheClampAndTruncateRules) {
  struct Row {
    int type;
    float in;
    uint64_t out;
  };
  // clang-format off
  const Row rows[] = {
      {0, 1.0f, 0x3F7FFFFE}, {0, kInf, 0x3F7FFFFE}, {0, -2.0f, 0xBF800000}, {0, -1.0f, 0xBF800000},
      {0, 0.5f, 0x3F000000}, {0, -0.0f, 0x80000000}, {0, kDenorm, 0x00000001}, {0, kFloatMax, 0x3F7FFFFE},
      {1, -1.0f, 0x8000}, {1, 1.0f, 0x7FFF}, {1, kInt16Max, 0x7FFF}, {1, -kInf, 0x8000},
      {1, -0x1p-16f, 0x0000}, {1, 0.5f, 0x4000}, {1, -0x1p-15f, 0xFFFF},
      {2, -1.0f, 0x800000}, {2, 1.0f, 0x7FFFFF}, {2, kFloatMax, 0x7FFFFF}, {2, -0x1p-23f, 0xFFFFFF},
      {2, 0.5f, 0x400000}, {2, 1e30f, 0x7FFFFF},
      {3, -1.0f, 0x80}, {3, 1.0f, 0x7F}, {3, kInt8Max, 0x7F}, {3, -0x1p-7f, 0xFF}, {3, 0.5f, 0x40},
      {3, -kInf, 0x80},
      {4, 1.0f, 0xFF}, {4, -1.0f, 0x00}, {4, 0.0f, 0x7F}, {4, -0.0f, 0x7F}, {4, 0.5f, 0xBF},
      {4, kInf, 0xFF}, {4, -kInf, 0x00}, {4, kDenorm, 0x7F},
      {5, -1.0f, 0xFF800000}, {5, 1.0f, 0x007FFFFF}, {5, -0x1p-23f, 0xFFFFFFFF}, {5, 0.5f, 0x00400000},
      {6, 1.0f, 0x7FFFFFFF}, {6, -1.0f, 0x80000000}, {6, 0.0f, 0}, {6, 2.0f, 0x7FFFFFFF},
      {6, 0.5f, 0x3FFFFFFF}, {6, -kInf, 0x80000000}, {6, -0.0f, 0},
      {7, 1.5f, 0x3FC00000}, {7, -kInf, 0xFF800000}, {7, -0.0f, 0x80000000},
      {8, 1.0f, 0x3FF0000000000000}, {8, -0.0f, 0x8000000000000000}, {8, kInf, 0x7FF0000000000000},
      {8, kDenorm, 0x36A0000000000000},
      // Just beyond each bound, and just inside.
      {0, std::nextafter(kFloatMax, 2.0f), 0x3F7FFFFE}, {0, std::nextafter(-1.0f, -2.0f), 0xBF800000},
      {1, std::nextafter(kInt16Max, 2.0f), 0x7FFF}, {1, std::nextafter(-1.0f, -2.0f), 0x8000},
      {1, std::nextafter(kInt16Max, 0.0f), 0x7FFE}, {2, std::nextafter(kFloatMax, 2.0f), 0x7FFFFF},
      {2, std::nextafter(kFloatMax, 0.0f), 0x7FFFFE}, {3, std::nextafter(kInt8Max, 2.0f), 0x7F},
      {3, std::nextafter(-1.0f, -2.0f), 0x80}, {4, std::nextafter(1.0f, 2.0f), 0xFF},
      {4, std::nextafter(-1.0f, -2.0f), 0x00}, {6, std::nextafter(1.0f, 2.0f), 0x7FFFFFFF},
      {6, std::nextafter(-1.0f, -2.0f), 0x80000000},
      // Type 6 where c * 2^31 is a small multiple of 1/4 (the rounding edges
      // of c * 2147483647.5 - 0.5), and where it stops having a fraction.
      {6, 0x1p-32f, 0}, {6, 0x1p-31f, 0}, {6, 0x1.8p-31f, 0}, {6, 0x1.cp-31f, 1}, {6, 0x1p-30f, 1},
      {6, 0x1.4p-30f, 1}, {6, -0x1p-32f, 0}, {6, -0x1p-31f, 0xFFFFFFFF}, {6, -0x1.8p-31f, 0xFFFFFFFF},
      {6, -0x1.cp-31f, 0xFFFFFFFE}, {6, -0x1.4p-30f, 0xFFFFFFFE}, {6, 0x1p-8f, 0x007FFFFF},
      {6, -0x1p-8f, 0xFF800000},
  };
  // clang-format on
  EachLevel each;
  for (const Row& row : rows) {
    SCOPED_TRACE(testing::Message() << "type " << row.type << " in " << row.in);
    const Bytes expected = le(row.out, bytesPerSampleOfType(row.type));
    EXPECT_EQ(fromFloatRule(row.type, row.in), expected);
    // A run of the value covers whole vectors and the scalar tail.
    const std::vector<float> run(kRun, row.in);
    Bytes want;
    for (std::size_t i = 0; i < kRun; ++i) want.insert(want.end(), expected.begin(), expected.end());
    for (eLevel level : each.levels) {
      Aud::Simd::setActiveLevel(level);
      Bytes got(want.size());
      ASSERT_TRUE(Aud::convertFromFloat(row.type, run.data(), got.data(), kRun));
      EXPECT_EQ(got, want) << Aud::Simd::levelName(level);
    }
  }
}

TEST(SampleConversion, ReadingScalesEachStoredForm) {
  struct Row {
    int type;
    uint64_t in;
    float out;
  };
  // clang-format off
  const Row rows[] = {
      {0, 0x3FC00000, 1.5f}, {7, 0x7F800000, kInf}, {1, 0x8000, -1.0f}, {1, 0x7FFF, kInt16Max},
      {1, 0x0001, 0x1p-15f}, {2, 0x800000, -1.0f}, {2, 0x7FFFFF, kFloatMax}, {2, 0xFFFFFF, -0x1p-23f},
      {3, 0x80, -1.0f}, {3, 0x7F, kInt8Max}, {4, 0x00, -1.0f}, {4, 0xFF, kInt8Max}, {4, 0x80, 0.0f},
      {4, 0x7F, -0x1p-7f}, {5, 0xAB800000, -1.0f}, {5, 0x127FFFFF, kFloatMax}, {5, 0xFF000001, 0x1p-23f},
      {6, 0x7FFFFFFF, 1.0f}, {6, 0x80000000, -1.0f}, {6, 0x00000000, 0x1p-32f}, {6, 0xFFFFFFFF, -0x1p-32f},
      {8, 0x3FF0000010000000, 1.0f}, {8, 0x3FF0000010000001, 1.0f + 0x1p-23f},
      {8, 0x7E37E43C8800759C, kInf},  // 1e300
  };
  // clang-format on
  EachLevel each;
  for (const Row& row : rows) {
    SCOPED_TRACE(testing::Message() << "type " << row.type << " in 0x" << std::hex << row.in);
    const Bytes in = le(row.in, bytesPerSampleOfType(row.type));
    EXPECT_EQ(bitsOf(Aud::sampleToFloat(row.type, in.data())), bitsOf(row.out));
    Bytes run;
    for (std::size_t i = 0; i < kRun; ++i) run.insert(run.end(), in.begin(), in.end());
    for (eLevel level : each.levels) {
      Aud::Simd::setActiveLevel(level);
      std::vector<float> got(kRun);
      ASSERT_TRUE(Aud::convertToFloat(row.type, run.data(), got.data(), kRun));
      for (float f : got) ASSERT_EQ(bitsOf(f), bitsOf(row.out)) << Aud::Simd::levelName(level);
    }
  }
}

TEST(SampleConversion, NaNIsWrittenAsSilenceToEveryIntegerForm) {
  const float nans[] = {kNaN, -kNaN, floatOfBits(0x7F800001), floatOfBits(0xFFFFFFFF),
                        floatOfBits(0x7FBFFFFF)};
  EachLevel each;
  for (int type = 1; type <= 6; ++type) {
    const Bytes silence = fromFloatRule(type, 0.0f);
    EXPECT_EQ(silence, le(type == 4 ? 0x7F : 0, bytesPerSampleOfType(type)));
    for (float nan : nans) EXPECT_EQ(fromFloatRule(type, nan), silence) << type;
    // A block of NaN, longer than any vector, through every level.
    const std::vector<float> block(37, kNaN);
    for (eLevel level : each.levels) {
      Aud::Simd::setActiveLevel(level);
      Bytes got(block.size() * silence.size());
      ASSERT_TRUE(Aud::convertFromFloat(type, block.data(), got.data(), block.size()));
      for (std::size_t i = 0; i < block.size(); ++i)
        EXPECT_TRUE(std::equal(silence.begin(), silence.end(), got.begin() + i * silence.size()))
            << "type " << type << " " << Aud::Simd::levelName(level) << " sample " << i;
    }
  }
  // The float forms keep a NaN: type 0's clamp lets it through, type 7 copies it.
  EXPECT_TRUE(std::isnan(Aud::sampleToFloat(0, fromFloatRule(0, kNaN).data())));
  EXPECT_EQ(fromFloatRule(7, floatOfBits(0x7F800001)), le(0x7F800001, 4));
}

// Every 8- and 16-bit value through both directions, as one block per level.
TEST(SampleConversion, EverySmallIntegerValueRoundTrips) {
  struct Form {
    int type;
    int first, last;  // stored values, as integers
    float scale;      // to float: (value - offset) * scale
    int offset;
  };
  const Form forms[] = {
      {1, -32768, 32767, 0x1p-15f, 0}, {3, -128, 127, 0x1p-7f, 0}, {4, 0, 255, 0x1p-7f, 128}};
  EachLevel each;
  for (const Form& form : forms) {
    const unsigned bytes = bytesPerSampleOfType(form.type);
    const std::size_t n = std::size_t(form.last - form.first + 1);
    Bytes stored;
    for (int v = form.first; v <= form.last; ++v) {
      const Bytes b = le(uint64_t(int64_t(v)), bytes);
      stored.insert(stored.end(), b.begin(), b.end());
    }
    for (eLevel level : each.levels) {
      Aud::Simd::setActiveLevel(level);
      SCOPED_TRACE(testing::Message() << "type " << form.type << " " << Aud::Simd::levelName(level));
      std::vector<float> f(n);
      ASSERT_TRUE(Aud::convertToFloat(form.type, stored.data(), f.data(), n));
      Bytes back(stored.size());
      ASSERT_TRUE(Aud::convertFromFloat(form.type, f.data(), back.data(), n));
      for (std::size_t i = 0; i < n; ++i) {
        const int v = form.first + int(i);
        ASSERT_EQ(f[i], float(v - form.offset) * form.scale) << v;
        ASSERT_EQ(f[i], Aud::sampleToFloat(form.type, &stored[i * bytes])) << v;
        // Type 4 scales by 127.5, not 128: every byte but 0 comes back one lower.
        const int expectedBack = form.type == 4 ? v * 255 / 256 : v;
        ASSERT_EQ(back[i * bytes], uint8_t(expectedBack)) << v;
        if (bytes == 2) {
          ASSERT_EQ(back[i * bytes + 1], uint8_t(expectedBack >> 8)) << v;
        }
      }
      if (form.type == 4) {
        EXPECT_EQ(back[255], 254);
        EXPECT_EQ(back[128], 127);
      }
    }
  }
}

TEST(SampleConversion, WideIntegerFormsAtTheirBoundsAndAtRandom) {
  std::vector<int64_t> values = {INT32_MIN, INT32_MIN + 1, -8388609, -8388608, -8388607,      -1,       0,
                                 1,         8388606,       8388607,  8388608,  INT32_MAX - 1, INT32_MAX};
  // The type 6 samples whose quotient lies closest to a float midpoint.
  for (int64_t k = 0; k < 36; ++k) values.insert(values.end(), {2147483583 - 128 * k, -2147483584 + 128 * k});
  std::mt19937 rng(7);
  for (int i = 0; i < 2000; ++i) values.push_back(int32_t(rng()));
  const std::size_t n = values.size();

  EachLevel each;
  for (eLevel level : each.levels) {
    Aud::Simd::setActiveLevel(level);
    SCOPED_TRACE(Aud::Simd::levelName(level));
    for (int type : {2, 5, 6}) {
      const unsigned bytes = bytesPerSampleOfType(type);
      Bytes stored;
      for (int64_t v : values) {
        const Bytes b = le(uint64_t(v), bytes);
        stored.insert(stored.end(), b.begin(), b.end());
      }
      std::vector<float> f(n);
      ASSERT_TRUE(Aud::convertToFloat(type, stored.data(), f.data(), n));
      Bytes back(stored.size());
      ASSERT_TRUE(Aud::convertFromFloat(type, f.data(), back.data(), n));
      for (std::size_t i = 0; i < n; ++i) {
        ASSERT_EQ(bitsOf(f[i]), bitsOf(Aud::sampleToFloat(type, &stored[i * bytes])))
            << type << " " << values[i];
        int32_t got;
        if (type == 2) {
          got = int32_t(uint32_t(back[3 * i] | back[3 * i + 1] << 8 | back[3 * i + 2] << 16) << 8) >> 8;
        } else {
          std::memcpy(&got, &back[4 * i], 4);
        }
        if (type == 6) {
          // 24 bits of precision survive; the ends are exact.
          ASSERT_LE(std::abs(int64_t(got) - values[i]), 128) << values[i];
          if (values[i] == INT32_MIN || values[i] == INT32_MAX || values[i] == 0) {
            ASSERT_EQ(got, values[i]) << values[i];
          }
        } else {
          // 24-bit: the low three bytes come back; type 5's top byte repeats the sign.
          const int32_t v24 = int32_t(uint32_t(values[i]) << 8) >> 8;
          ASSERT_EQ(f[i], float(v24) * 0x1p-23f) << type << " " << values[i];
          ASSERT_EQ(got, v24) << type << " " << values[i];
        }
      }
    }
  }
  // Type 6 loses the low bits a float cannot hold.
  const Bytes in = le(0x12345679, 4);
  Bytes out(4);
  Aud::sampleFromFloat(6, Aud::sampleToFloat(6, in.data()), out.data());
  EXPECT_NE(out, in);
}

// Compares a block conversion with the per-sample rule at every length up to
// 67 and a few around the widest unrolled step (4 x 32 samples), at byte
// offsets 0..3 on the stored side and float offsets 0..3 on the float side,
// with guard bytes around the destination.
TEST(SampleConversion, BlocksMatchTheRulesAtEveryLengthAndOffset) {
  constexpr std::size_t kMax = 263, kGuard = 16;
  std::vector<std::size_t> lengths;
  for (std::size_t len = 0; len <= 67; ++len) lengths.push_back(len);
  lengths.insert(lengths.end(), {127, 128, 129, 130, 131, 134, 161, 255, 256, 259, 263});
  constexpr unsigned char kFill = 0xA5;
  const std::vector<float> floats = randomFloats(kMax + 4, 11);
  EachLevel each;
  for (int type = 0; type < Aud::kNumSampleTypes; ++type) {
    const unsigned bytes = bytesPerSampleOfType(type);
    const Bytes stored = randomSamples(type, kMax + 4, 12 + type);
    for (eLevel level : each.levels) {
      Aud::Simd::setActiveLevel(level);
      for (std::size_t len : lengths) {
        for (std::size_t off = 0; off < 4; ++off) {
          SCOPED_TRACE(testing::Message() << "type " << type << " " << Aud::Simd::levelName(level) << " len "
                                          << len << " offset " << off);
          // To float: stored side at byte offset off, floats at offset off.
          std::vector<float> fdst(kGuard + kMax + kGuard, floatOfBits(0xA5A5A5A5));
          ASSERT_TRUE(Aud::convertToFloat(type, stored.data() + off, fdst.data() + kGuard / 4 + off, len));
          for (std::size_t i = 0; i < fdst.size(); ++i) {
            const std::size_t at = i - (kGuard / 4 + off);
            const uint32_t want =
                at < len ? bitsOf(Aud::sampleToFloat(type, stored.data() + off + at * bytes)) : 0xA5A5A5A5u;
            ASSERT_EQ(bitsOf(fdst[i]), want) << "float " << i;
          }
          // From float: floats at offset off, stored side at byte offset off.
          Bytes bdst(kGuard + kMax * bytes + kGuard, kFill);
          ASSERT_TRUE(Aud::convertFromFloat(type, floats.data() + off, bdst.data() + kGuard + off, len));
          Bytes want(bdst.size(), kFill);
          for (std::size_t i = 0; i < len; ++i)
            Aud::sampleFromFloat(type, floats[off + i], &want[kGuard + off + i * bytes]);
          ASSERT_EQ(bdst, want);
        }
      }
    }
  }
}

TEST(SampleConversion, FastPathsMatchTheScalarReferenceOnLongRuns) {
  constexpr std::size_t kLen = 4099;
  const std::vector<float> floats = randomFloats(kLen, 21);
  EachLevel each;
  for (int type = 0; type < Aud::kNumSampleTypes; ++type) {
    const std::size_t bytes = bytesPerSampleOfType(type) * kLen;
    const Bytes stored = randomSamples(type, kLen, 22 + type);
    Aud::Simd::setActiveLevel(Aud::Simd::eScalar);
    std::vector<float> refFloats(kLen);
    Bytes refBytes(bytes);
    ASSERT_TRUE(Aud::convertToFloat(type, stored.data() + 1, refFloats.data(), kLen));
    ASSERT_TRUE(Aud::convertFromFloat(type, floats.data(), refBytes.data(), kLen));
    for (eLevel level : each.levels) {
      Aud::Simd::setActiveLevel(level);
      std::vector<float> gotFloats(kLen);
      Bytes gotBytes(bytes);
      ASSERT_TRUE(Aud::convertToFloat(type, stored.data() + 1, gotFloats.data(), kLen));
      ASSERT_TRUE(Aud::convertFromFloat(type, floats.data(), gotBytes.data(), kLen));
      EXPECT_EQ(0, std::memcmp(gotFloats.data(), refFloats.data(), kLen * 4))
          << "to float, type " << type << " " << Aud::Simd::levelName(level);
      EXPECT_EQ(gotBytes, refBytes) << "from float, type " << type << " " << Aud::Simd::levelName(level);
    }
  }
}

TEST(SampleConversion, UnknownTypesAreRefusedAndWriteNothing) {
  EachLevel each;
  const float src[4] = {0.25f, -0.5f, 1.0f, 0.0f};
  const unsigned char stored[32] = {1, 2, 3, 4, 5, 6, 7, 8};
  for (int type : {-1, 9, 10, 1000, INT_MIN, INT_MAX}) {
    SCOPED_TRACE(type);
    EXPECT_EQ(bytesPerSampleOfType(type), 0u);
    EXPECT_EQ(Aud::sampleToFloat(type, stored), 0.0f);
    unsigned char one[8] = {0x5A, 0x5A, 0x5A, 0x5A, 0x5A, 0x5A, 0x5A, 0x5A};
    EXPECT_FALSE(Aud::sampleFromFloat(type, 0.5f, one));
    EXPECT_EQ(one[0], 0x5A);
    for (eLevel level : each.levels) {
      Aud::Simd::setActiveLevel(level);
      float fdst[4] = {7.0f, 7.0f, 7.0f, 7.0f};
      unsigned char bdst[32];
      std::memset(bdst, 0x5A, sizeof bdst);
      EXPECT_FALSE(Aud::convertToFloat(type, stored, fdst, 4));
      EXPECT_FALSE(Aud::convertFromFloat(type, src, bdst, 4));
      EXPECT_FALSE(Aud::convertToFloat(type, stored, fdst, 0));
      for (float f : fdst) EXPECT_EQ(f, 7.0f);
      for (unsigned char b : bdst) EXPECT_EQ(b, 0x5A);
    }
  }
  // Known types: an empty block succeeds without touching memory; a missing
  // buffer is refused.
  EXPECT_TRUE(Aud::convertToFloat(1, nullptr, nullptr, 0));
  EXPECT_TRUE(Aud::convertFromFloat(1, nullptr, nullptr, 0));
  EXPECT_FALSE(Aud::convertToFloat(1, nullptr, nullptr, 3));
  EXPECT_FALSE(Aud::convertFromFloat(1, src, nullptr, 3));
  EXPECT_FALSE(Aud::sampleFromFloat(1, 0.5f, nullptr));
  EXPECT_EQ(Aud::sampleToFloat(1, nullptr), 0.0f);
}

}  // namespace
