#include <gtest/gtest.h>

#include <bit>
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

float floatOfBits(uint32_t bits) { return std::bit_cast<float>(bits); }
uint32_t bitsOf(float f) { return std::bit_cast<uint32_t>(f); }
// The little-endian bytes of the low n bytes of each value, back to back.
Bytes pack(const std::vector<int64_t>& values, unsigned n) {
  Bytes b;
  for (int64_t v : values)
    for (unsigned i = 0; i < n; ++i) b.push_back(static_cast<unsigned char>(uint64_t(v) >> (8 * i)));
  return b;
}
Bytes le(uint64_t v, unsigned n) { return pack({int64_t(v)}, n); }
// n copies of a byte pattern.
Bytes repeat(const Bytes& one, std::size_t n) {
  Bytes b;
  for (std::size_t i = 0; i < n; ++i) b.insert(b.end(), one.begin(), one.end());
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

// NaNs of both signs and kinds, infinities, denormals, signed zeros, type 6's
// rounding edges, and each clamp bound with its neighbours.
std::vector<float> specialFloats() {
  // clang-format off
  std::vector<float> v = {kNaN, -kNaN, floatOfBits(0x7F800001), floatOfBits(0xFFFFFFFF), kInf, -kInf, kDenorm,
                          -kDenorm, std::numeric_limits<float>::min(), -0.0f, 0.5f, -0.5f, 1e30f, -1e30f,
                          std::numeric_limits<float>::max(), -2.0f};
  // clang-format on
  for (float edge : {0x1p-32f, 0x1p-31f, 0x1.8p-31f, 0x1.4p-30f}) v.insert(v.end(), {edge, -edge});
  for (float bound : {-1.0f, 1.0f, kFloatMax, kInt16Max, kInt8Max, 0.0f, 2.0f, 0x1p-8f, -0x1p-8f})
    v.insert(v.end(), {bound, std::nextafter(bound, 3.0f), std::nextafter(bound, -3.0f)});
  return v;
}

// Mostly signal-range floats, some arbitrary bit patterns, salted with the specials.
std::vector<float> randomFloats(std::size_t n, uint32_t seed) {
  std::mt19937 rng(seed);
  std::uniform_real_distribution<float> signal(-1.25f, 1.25f);
  const std::vector<float> specials = specialFloats();
  std::vector<float> v(n);
  for (float& f : v) {
    const uint32_t pick = rng() % 8;  // 1 in 8 arbitrary bits, 1 in 8 special
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
  const double picks[] = {1.0 + 0x1p-24, 1.0 - 0x1p-25, 1e39, -1e39, 1e-40, 1e-50, 0.0, -0.0, 1.5, -1.0};
  for (std::size_t i = 0; type == 8 && i < n; i += 3) std::memcpy(&b[8 * i], &picks[rng() % 10], 8);
  return b;
}

Bytes fromFloatRule(int type, float v) {
  Bytes b(bytesPerSampleOfType(type));
  EXPECT_TRUE(Aud::sampleFromFloat(type, v, b.data()));
  return b;
}

// A run of one value, through every level, must give `one` for each sample.
void expectRunFromFloat(const EachLevel& each, int type, float in, const Bytes& one) {
  const std::vector<float> run(kRun, in);
  for (eLevel level : each.levels) {
    Aud::Simd::setActiveLevel(level);
    Bytes got(kRun * one.size());
    ASSERT_TRUE(Aud::convertFromFloat(type, run.data(), got.data(), kRun));
    EXPECT_EQ(got, repeat(one, kRun)) << Aud::Simd::levelName(level);
  }
}

TEST(SampleConversion, WritingClampsAndTruncatesAndReadingScales) {
  const float above1 = std::nextafter(1.0f, 2.0f), below1 = std::nextafter(-1.0f, -2.0f);
  const float aboveF = std::nextafter(kFloatMax, 2.0f), above16 = std::nextafter(kInt16Max, 2.0f);
  // clang-format off
  struct Row { int type; float in; uint64_t out; };
  const Row rows[] = {
      {0, kInf, 0x3F7FFFFE}, {0, -1.0f, 0xBF800000}, {0, 0.5f, 0x3F000000}, {0, -0.0f, 0x80000000},
      {0, kDenorm, 0x00000001}, {0, aboveF, 0x3F7FFFFE}, {0, below1, 0xBF800000},
      {1, -1.0f, 0x8000}, {1, 1.0f, 0x7FFF}, {1, -kInf, 0x8000}, {1, -0x1p-16f, 0x0000}, {1, 0.5f, 0x4000},
      {1, -0x1p-15f, 0xFFFF}, {1, above16, 0x7FFF}, {1, below1, 0x8000}, {1, std::nextafter(kInt16Max, 0.0f), 0x7FFE},
      {2, -1.0f, 0x800000}, {2, 1e30f, 0x7FFFFF}, {2, -0x1p-23f, 0xFFFFFF}, {2, 0.5f, 0x400000},
      {2, aboveF, 0x7FFFFF}, {2, std::nextafter(kFloatMax, 0.0f), 0x7FFFFE},
      {3, -1.0f, 0x80}, {3, 1.0f, 0x7F}, {3, -0x1p-7f, 0xFF}, {3, 0.5f, 0x40}, {3, -kInf, 0x80},
      {3, std::nextafter(kInt8Max, 2.0f), 0x7F}, {3, below1, 0x80}, {4, 1.0f, 0xFF}, {4, -1.0f, 0x00},
      {4, 0.0f, 0x7F}, {4, -0.0f, 0x7F}, {4, 0.5f, 0xBF}, {4, kInf, 0xFF}, {4, -kInf, 0x00}, {4, kDenorm, 0x7F},
      {4, above1, 0xFF}, {4, below1, 0x00}, {5, -1.0f, 0xFF800000}, {5, 1.0f, 0x007FFFFF},
      {5, -0x1p-23f, 0xFFFFFFFF}, {5, 0.5f, 0x00400000}, {6, 1.0f, 0x7FFFFFFF}, {6, -1.0f, 0x80000000},
      {6, 0.5f, 0x3FFFFFFF}, {6, -kInf, 0x80000000}, {6, -0.0f, 0}, {6, above1, 0x7FFFFFFF}, {6, below1, 0x80000000},
      // Type 6 where c * 2^31 is a small multiple of 1/4 (the rounding edges
      // of c * 2147483647.5 - 0.5), and where it stops having a fraction.
      {6, 0x1p-32f, 0}, {6, 0x1p-31f, 0}, {6, 0x1.8p-31f, 0}, {6, 0x1.cp-31f, 1}, {6, 0x1p-30f, 1},
      {6, 0x1.4p-30f, 1}, {6, -0x1p-32f, 0}, {6, -0x1p-31f, 0xFFFFFFFF}, {6, -0x1.8p-31f, 0xFFFFFFFF},
      {6, -0x1.cp-31f, 0xFFFFFFFE}, {6, -0x1.4p-30f, 0xFFFFFFFE}, {6, 0x1p-8f, 0x007FFFFF},
      {6, -0x1p-8f, 0xFF800000}, {7, 1.5f, 0x3FC00000}, {7, -kInf, 0xFF800000}, {7, -0.0f, 0x80000000},
      {8, 1.0f, 0x3FF0000000000000}, {8, -0.0f, 0x8000000000000000}, {8, kInf, 0x7FF0000000000000},
      {8, kDenorm, 0x36A0000000000000},
  };
  // clang-format on
  EachLevel each;
  for (const Row& row : rows) {
    SCOPED_TRACE(testing::Message() << "type " << row.type << " in " << row.in);
    const Bytes expected = le(row.out, bytesPerSampleOfType(row.type));
    EXPECT_EQ(fromFloatRule(row.type, row.in), expected);
    expectRunFromFloat(each, row.type, row.in, expected);
  }

  // clang-format off
  struct ReadRow { int type; uint64_t in; float out; };
  const ReadRow reads[] = {
      {0, 0x3FC00000, 1.5f}, {7, 0x7F800000, kInf}, {1, 0x8000, -1.0f}, {1, 0x7FFF, kInt16Max},
      {1, 0x0001, 0x1p-15f}, {2, 0x800000, -1.0f}, {2, 0x7FFFFF, kFloatMax}, {2, 0xFFFFFF, -0x1p-23f},
      {3, 0x80, -1.0f}, {3, 0x7F, kInt8Max}, {4, 0x00, -1.0f}, {4, 0xFF, kInt8Max}, {4, 0x80, 0.0f},
      {4, 0x7F, -0x1p-7f}, {5, 0xAB800000, -1.0f}, {5, 0x127FFFFF, kFloatMax}, {5, 0xFF000001, 0x1p-23f},
      {6, 0x7FFFFFFF, 1.0f}, {6, 0x80000000, -1.0f}, {6, 0x00000000, 0x1p-32f}, {6, 0xFFFFFFFF, -0x1p-32f},
      {8, 0x3FF0000010000000, 1.0f}, {8, 0x3FF0000010000001, 1.0f + 0x1p-23f},
      {8, 0x7E37E43C8800759C, kInf},  // 1e300
  };
  // clang-format on
  for (const ReadRow& row : reads) {
    SCOPED_TRACE(testing::Message() << "type " << row.type << " in 0x" << std::hex << row.in);
    const Bytes in = le(row.in, bytesPerSampleOfType(row.type));
    EXPECT_EQ(bitsOf(Aud::sampleToFloat(row.type, in.data())), bitsOf(row.out));
    const Bytes run = repeat(in, kRun);
    for (eLevel level : each.levels) {
      Aud::Simd::setActiveLevel(level);
      std::vector<float> got(kRun);
      ASSERT_TRUE(Aud::convertToFloat(row.type, run.data(), got.data(), kRun));
      for (float f : got) ASSERT_EQ(bitsOf(f), bitsOf(row.out)) << Aud::Simd::levelName(level);
    }
  }
}

TEST(SampleConversion, NaNIsWrittenAsSilenceToEveryIntegerForm) {
  EachLevel each;
  for (int type = 1; type <= 6; ++type) {
    const Bytes silence = fromFloatRule(type, 0.0f);
    EXPECT_EQ(silence, le(type == 4 ? 0x7F : 0, bytesPerSampleOfType(type)));
    for (uint32_t nan : {0x7FC00000u, 0xFFC00000u, 0x7F800001u, 0xFFFFFFFFu, 0x7FBFFFFFu}) {
      EXPECT_EQ(fromFloatRule(type, floatOfBits(nan)), silence) << type << " " << std::hex << nan;
      expectRunFromFloat(each, type, floatOfBits(nan), silence);
    }
  }
  // The float forms keep a NaN: type 0's clamp lets it through, type 7 copies it.
  EXPECT_TRUE(std::isnan(Aud::sampleToFloat(0, fromFloatRule(0, kNaN).data())));
  EXPECT_EQ(fromFloatRule(7, floatOfBits(0x7F800001)), le(0x7F800001, 4));
}

// Every 8- and 16-bit value through both directions, as one block per level.
TEST(SampleConversion, EverySmallIntegerValueRoundTrips) {
  // clang-format off
  struct Form { int type, first, last, offset; float scale; };  // to float: (value - offset) * scale
  // clang-format on
  for (const Form& form :
       {Form{1, -32768, 32767, 0, 0x1p-15f}, {3, -128, 127, 0, 0x1p-7f}, {4, 0, 255, 128, 0x1p-7f}}) {
    const unsigned bytes = bytesPerSampleOfType(form.type);
    std::vector<int64_t> values;
    for (int v = form.first; v <= form.last; ++v) values.push_back(v);
    const std::size_t n = values.size();
    const Bytes stored = pack(values, bytes);
    EachLevel each;
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
        for (unsigned k = 0; k < bytes; ++k)
          ASSERT_EQ(back[i * bytes + k], uint8_t(expectedBack >> (8 * k))) << v;
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
    for (int type : {2, 5, 6}) {
      SCOPED_TRACE(testing::Message() << "type " << type << " " << Aud::Simd::levelName(level));
      const unsigned bytes = bytesPerSampleOfType(type);
      const Bytes stored = pack(values, bytes);
      std::vector<float> f(n);
      ASSERT_TRUE(Aud::convertToFloat(type, stored.data(), f.data(), n));
      Bytes back(stored.size());
      ASSERT_TRUE(Aud::convertFromFloat(type, f.data(), back.data(), n));
      for (std::size_t i = 0; i < n; ++i) {
        ASSERT_EQ(bitsOf(f[i]), bitsOf(Aud::sampleToFloat(type, &stored[i * bytes]))) << values[i];
        uint32_t raw = 0;
        std::memcpy(&raw, &back[i * bytes], bytes);
        const int32_t got = type == 2 ? int32_t(raw << 8) >> 8 : int32_t(raw);
        // Type 6 keeps 24 bits of precision and exact ends; the 24-bit forms keep
        // the low three bytes, and type 5's top byte repeats the sign.
        const int64_t want = type == 6 ? values[i] : int32_t(uint32_t(values[i]) << 8) >> 8;
        const bool exact = type != 6 || values[i] == INT32_MIN || values[i] == INT32_MAX || values[i] == 0;
        ASSERT_LE(std::abs(got - want), exact ? 0 : 128) << values[i];
        ASSERT_TRUE(type == 6 || f[i] == float(want) * 0x1p-23f) << values[i];
      }
    }
  }
}

// A block conversion against the per-sample rule at every length up to 67 and
// around the widest unrolled step (4 x 32 samples), at offsets 0..3 on both
// sides, with guards around the destination.
TEST(SampleConversion, BlocksMatchTheRulesAtEveryLengthAndOffset) {
  constexpr std::size_t kMax = 263, kGuard = 16;
  constexpr unsigned char kFill = 0xA5;
  std::vector<std::size_t> lengths;
  for (std::size_t len = 0; len <= 67; ++len) lengths.push_back(len);
  lengths.insert(lengths.end(), {127, 128, 129, 130, 131, 134, 161, 255, 256, 259, 263});
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
          std::vector<float> fdst(kGuard + kMax + kGuard, floatOfBits(0xA5A5A5A5)), fwant = fdst;
          ASSERT_TRUE(Aud::convertToFloat(type, stored.data() + off, fdst.data() + kGuard / 4 + off, len));
          for (std::size_t i = 0; i < len; ++i)
            fwant[kGuard / 4 + off + i] = Aud::sampleToFloat(type, stored.data() + off + i * bytes);
          ASSERT_EQ(0, std::memcmp(fdst.data(), fwant.data(), fdst.size() * 4));
          Bytes bdst(kGuard + kMax * bytes + kGuard, kFill), want(bdst.size(), kFill);
          ASSERT_TRUE(Aud::convertFromFloat(type, floats.data() + off, bdst.data() + kGuard + off, len));
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
    const Bytes stored = randomSamples(type, kLen, 22 + type);
    std::vector<float> refFloats(kLen);
    Bytes refBytes(bytesPerSampleOfType(type) * kLen);
    for (eLevel level : each.levels) {  // eScalar comes first and fills the reference
      Aud::Simd::setActiveLevel(level);
      std::vector<float> gotFloats(kLen);
      Bytes gotBytes(refBytes.size());
      ASSERT_TRUE(Aud::convertToFloat(type, stored.data() + 1, gotFloats.data(), kLen));
      ASSERT_TRUE(Aud::convertFromFloat(type, floats.data(), gotBytes.data(), kLen));
      if (level == Aud::Simd::eScalar) refFloats = gotFloats, refBytes = gotBytes;
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
    Bytes bdst(32, 0x5A);
    EXPECT_FALSE(Aud::sampleFromFloat(type, 0.5f, bdst.data()));
    for (eLevel level : each.levels) {
      Aud::Simd::setActiveLevel(level);
      std::vector<float> fdst(4, 7.0f);
      EXPECT_FALSE(Aud::convertToFloat(type, stored, fdst.data(), 4));
      EXPECT_FALSE(Aud::convertFromFloat(type, src, bdst.data(), 4));
      EXPECT_FALSE(Aud::convertToFloat(type, stored, fdst.data(), 0));
      EXPECT_EQ(fdst, std::vector<float>(4, 7.0f));
      EXPECT_EQ(bdst, Bytes(32, 0x5A));
    }
  }
  // Known types: an empty block succeeds without touching memory; a missing buffer is refused.
  EXPECT_TRUE(Aud::convertToFloat(1, nullptr, nullptr, 0));
  EXPECT_TRUE(Aud::convertFromFloat(1, nullptr, nullptr, 0));
  EXPECT_FALSE(Aud::convertToFloat(1, nullptr, nullptr, 3));
  EXPECT_FALSE(Aud::convertFromFloat(1, src, nullptr, 3));
  EXPECT_FALSE(Aud::sampleFromFloat(1, 0.5f, nullptr));
  EXPECT_EQ(Aud::sampleToFloat(1, nullptr), 0.0f);
}

}  // namespace
