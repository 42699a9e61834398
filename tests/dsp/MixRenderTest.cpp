#include <gtest/gtest.h>

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <limits>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "host/HostHooks.h"
#include "tonebits/dsp/Aud__MixRender.h"
#include "tonebits/foundation/Aud__Simd.h"

namespace {

namespace MR = Aud::MixRender;
using Aud::Simd::eLevel;

float fromBits(uint32_t b) { return std::bit_cast<float>(b); }
uint32_t bitsOf(float f) { return std::bit_cast<uint32_t>(f); }

const float kInf = std::numeric_limits<float>::infinity();
const float kNaN = fromBits(0x7FC00000);

// Restores the level the suite started with, whatever a test sets.
class LevelGuard {
 public:
  LevelGuard() : saved_(Aud::Simd::activeLevel()) {}
  ~LevelGuard() { Aud::Simd::setActiveLevel(saved_); }

 private:
  eLevel saved_;
};

// The vector levels this CPU can run; the scalar reference is compared
// against each.
std::vector<eLevel> vectorLevels() {
  std::vector<eLevel> levels;
  for (eLevel l : {Aud::Simd::eSSE2, Aud::Simd::eAVX2, Aud::Simd::eAVX512})
    if (l <= Aud::Simd::supportedLevel()) levels.push_back(l);
  return levels;
}

// ---------------------------------------------------------------------------
// The rules, one sample at a time, on values as they stood before the call.
// Independent of the library's own reference, so that the reference is
// checked too.

enum class K { Peak, Mul, MulPeak, Ramp, Add, MulAdd, MulAdd2, MulAddPeak, RampAdd };

struct Call {
  K kernel;
  float gainA = 0, gainB = 0;  // gain, or startGain and delta for the ramps
  unsigned numQuads = 0;
  int srcOffset = 0, dstOffset = 0, dstBOffset = 0;  // in floats: 0 ... 3
  enum Alias { kSeparate, kSrcIsDst, kSrcIsDstB } alias = kSeparate;
  float peak = 0;
};

float foldModel(const float* x, std::size_t n, float p) {
  for (std::size_t i = 0; i < n; ++i)
    if (std::fabs(x[i]) > p) p = std::fabs(x[i]);
  return p;
}

// One destination sample of a constant-gain multiply-add, shortcuts
// included.
float mulAddModel(float gain, float x, float d) {
  if (gain == 1.0f) return x + d;
  if (gain == 0.0f) return d;
  const float product = gain * x;
  return product + d;
}

void runModel(const Call& c, const float* src0, const float* a0, const float* b0, float* a, float* b,
              float& peak) {
  const std::size_t n = std::size_t(c.numQuads) * 4;
  const float g = c.gainA;
  switch (c.kernel) {
    case K::Peak: peak = foldModel(src0, n, peak); break;
    case K::Mul:
    case K::MulPeak:
      if (c.kernel == K::MulPeak && g != 0.0f) peak = foldModel(src0, n, peak);
      for (std::size_t i = 0; i < n; ++i) a[i] = g == 1.0f ? src0[i] : g == 0.0f ? 0.0f : g * src0[i];
      break;
    case K::Ramp:
    case K::RampAdd: {
      float gain = c.gainA;
      const bool constant = c.gainB == 0.0f;
      for (std::size_t i = 0; i < n; ++i) {
        if (c.kernel == K::Ramp) {
          a[i] = constant ? (gain == 1.0f ? src0[i] : gain == 0.0f ? 0.0f : gain * src0[i]) : gain * src0[i];
        } else {
          a[i] = constant ? mulAddModel(gain, src0[i], a0[i]) : gain * src0[i] + a0[i];
        }
        if (!constant) gain = gain + c.gainB;
      }
      break;
    }
    case K::Add:
      for (std::size_t i = 0; i < n; ++i) a[i] = src0[i] + a0[i];
      break;
    case K::MulAdd:
      for (std::size_t i = 0; i < n; ++i) a[i] = mulAddModel(g, src0[i], a0[i]);
      break;
    case K::MulAdd2:
      for (std::size_t i = 0; i < n; ++i) {
        a[i] = mulAddModel(c.gainA, src0[i], a0[i]);
        b[i] = mulAddModel(c.gainB, src0[i], b0[i]);
      }
      break;
    case K::MulAddPeak:
      peak = foldModel(src0, n, peak);
      for (std::size_t i = 0; i < n; ++i) {
        const float product = g * src0[i];
        a[i] = g == 1.0f ? src0[i] + a0[i] : product + a0[i];
      }
      break;
  }
}

void runLibrary(const Call& c, float* src, float* a, float* b, float* peak) {
  const unsigned q = c.numQuads;
  switch (c.kernel) {
    case K::Peak: MR::PeakScan(src, q, peak); break;
    case K::Mul: MR::MultiplyConstant(src, a, q, c.gainA); break;
    case K::MulPeak: MR::MultiplyConstantWithPrePeakScan(src, a, q, c.gainA, peak); break;
    case K::Ramp: MR::MultiplyWithDelta(src, a, q, c.gainA, c.gainB); break;
    case K::Add: MR::Add(src, a, q); break;
    case K::MulAdd: MR::MultiplyConstantAndAdd(src, a, q, c.gainA); break;
    case K::MulAdd2: MR::MultiplyConstantAndAdd2(src, a, b, q, c.gainA, c.gainB); break;
    case K::MulAddPeak: MR::MultiplyConstantAndAddWithPrePeakScan(src, a, q, c.gainA, peak); break;
    case K::RampAdd: MR::MultiplyWithDeltaAndAdd(src, a, q, c.gainA, c.gainB); break;
  }
}

// ---------------------------------------------------------------------------
// Test data: three 64-byte aligned regions (source, destination A and B),
// each with the call's samples at its offset and guard words around them.
//
// Two different NaNs meeting in one operation may leave either payload (the
// CPU keeps its first operand's, and compilers order the operands of a
// commutative operation freely), so the data never lets that happen: a
// destination holds special values only where the source holds an ordinary
// one, and when a gain is NaN every NaN in the data is that same NaN.

constexpr uint32_t kGuard = 0x5EA1F00Du;
constexpr int kGuardWords = 16;

const uint32_t kSpecials[] = {
    0x00000000, 0x80000000,              // +-0
    0x7F800000, 0xFF800000,              // +-inf
    0x00000001, 0x80000001,              // smallest denormals
    0x007FFFFF, 0x807FFFFF, 0x00400000,  // largest and middle denormals
    0x00800000, 0x7F7FFFFF, 0xFF7FFFFF,  // smallest normal, +-largest
    0x3F800000, 0xBF800000,              // +-1
};
const uint32_t kNaNs[] = {0x7FC00000, 0xFFC00000, 0x7F800001, 0xFFBADBAD, 0x7FC12345};

struct Arena {
  std::size_t stride = 0;  // floats per region
  std::unique_ptr<float[]> storage;
  float* base = nullptr;

  explicit Arena(std::size_t maxSamples) {
    storage.reset(new float[3 * strideFor(maxSamples) + 16]);
    base = reinterpret_cast<float*>((reinterpret_cast<uintptr_t>(storage.get()) + 63) & ~uintptr_t(63));
  }
  static std::size_t strideFor(std::size_t samples) { return (4 + samples + kGuardWords + 15) / 16 * 16; }
  void layOut(std::size_t samples) { stride = strideFor(samples); }
  float* region(int r) { return base + r * stride; }
  std::size_t bytes() const { return 3 * stride * sizeof(float); }
};

class Data {
 public:
  Data(unsigned maxSamples, uint32_t seed) : rng_(seed) {
    for (auto* v : {&src_, &dstA_, &dstB_}) v->resize(maxSamples);
    for (unsigned i = 0; i < maxSamples; ++i) {
      const bool srcSpecial = rng_() % 5 == 0;
      src_[i] = srcSpecial ? special() : ordinary();
      // Never special where the source is.
      dstA_[i] = !srcSpecial && rng_() % 4 == 0 ? special() : ordinary();
      dstB_[i] = !srcSpecial && rng_() % 4 == 0 ? special() : ordinary();
    }
  }

  // Lays the call's samples out in the arena, guard words everywhere else.
  void fill(Arena& arena, const Call& c) const {
    const bool oneNaN = std::isnan(c.gainA) || std::isnan(c.gainB);
    arena.layOut(std::size_t(c.numQuads) * 4);
    for (std::size_t w = 0; w < 3 * arena.stride; ++w) arena.base[w] = fromBits(kGuard + uint32_t(w));
    const std::size_t n = std::size_t(c.numQuads) * 4;
    // An in-place destination starts out as source data.
    const std::vector<float>* sources[] = {&src_, c.alias == Call::kSrcIsDst ? &src_ : &dstA_,
                                           c.alias == Call::kSrcIsDstB ? &src_ : &dstB_};
    const int offsets[] = {c.srcOffset, c.dstOffset, c.dstBOffset};
    for (int r = 0; r < 3; ++r) {
      float* p = arena.region(r) + offsets[r];
      for (std::size_t i = 0; i < n; ++i) {
        const float v = (*sources[r])[i];
        p[i] = oneNaN && std::isnan(v) ? kNaN : v;
      }
    }
  }

 private:
  float ordinary() {
    // Non-zero, mixed signs and magnitudes around full scale.
    const int32_t r = int32_t(rng_());
    return float(r | 1) * 0x1p-30f * (rng_() % 8 == 0 ? 100.0f : 1.0f);
  }
  float special() {
    const uint32_t pick = rng_() % (std::size(kSpecials) + std::size(kNaNs));
    return fromBits(pick < std::size(kSpecials) ? kSpecials[pick] : kNaNs[pick - std::size(kSpecials)]);
  }

  std::mt19937 rng_;
  std::vector<float> src_, dstA_, dstB_;
};

struct Pointers {
  float *src, *a, *b;
};
Pointers pointersFor(Arena& arena, const Call& c) {
  Pointers p{arena.region(0) + c.srcOffset, arena.region(1) + c.dstOffset, arena.region(2) + c.dstBOffset};
  if (c.alias == Call::kSrcIsDst) p.src = p.a;
  if (c.alias == Call::kSrcIsDstB) p.src = p.b;
  return p;
}

// The arena after the call under the rules.
void expectedArena(Arena& arena, const Data& data, const Call& c, float& peak) {
  data.fill(arena, c);
  const std::size_t n = std::size_t(c.numQuads) * 4;
  const Pointers p = pointersFor(arena, c);
  const std::vector<float> src0(p.src, p.src + n), a0(p.a, p.a + n), b0(p.b, p.b + n);
  std::vector<float> a(a0), b(b0);
  runModel(c, src0.data(), a0.data(), b0.data(), a.data(), b.data(), peak);
  // A kernel leaves untouched what it does not write.
  const bool writesA = c.kernel != K::Peak;
  if (writesA) std::copy(a.begin(), a.end(), p.a);
  if (c.kernel == K::MulAdd2) std::copy(b.begin(), b.end(), p.b);
}

std::string describe(const Call& c, eLevel level) {
  char text[200];
  std::snprintf(text, sizeof text,
                "kernel %d gains %08x %08x quads %u offsets %d %d %d alias %d peak %08x level %s",
                int(c.kernel), bitsOf(c.gainA), bitsOf(c.gainB), c.numQuads, c.srcOffset, c.dstOffset,
                c.dstBOffset, int(c.alias), bitsOf(c.peak), Aud::Simd::levelName(level));
  return text;
}

// Runs one call at the scalar level and at every vector level, and checks
// each against the rules: the whole arena, guards included, and the peak,
// all with memcmp.
void checkCall(const Data& data, const Call& c, Arena& got, Arena& want, Arena& reference) {
  float wantPeak = c.peak;
  expectedArena(want, data, c, wantPeak);

  Aud::Simd::setActiveLevel(Aud::Simd::eScalar);
  float refPeak = c.peak;
  data.fill(reference, c);
  {
    const Pointers p = pointersFor(reference, c);
    runLibrary(c, p.src, p.a, p.b, &refPeak);
  }
  ASSERT_EQ(std::memcmp(reference.base, want.base, want.bytes()), 0) << describe(c, Aud::Simd::eScalar);
  ASSERT_EQ(bitsOf(refPeak), bitsOf(wantPeak)) << describe(c, Aud::Simd::eScalar);

  for (eLevel level : vectorLevels()) {
    Aud::Simd::setActiveLevel(level);
    float peak = c.peak;
    data.fill(got, c);
    const Pointers p = pointersFor(got, c);
    runLibrary(c, p.src, p.a, p.b, &peak);
    ASSERT_EQ(std::memcmp(got.base, reference.base, reference.bytes()), 0) << describe(c, level);
    ASSERT_EQ(bitsOf(peak), bitsOf(refPeak)) << describe(c, level);
  }
}

const unsigned kQuadCounts[] = {0, 1, 2, 3, 7, 64, 1001};
const float kGains[] = {1.0f, 0.0f, -0.0f, kNaN, 0.70710677f, -2.5f, 1e30f, kInf};
const float kPeaks[] = {0.0f, 0.5f, -1.0f, kNaN, -0.0f, 1e30f, fromBits(0x00000003)};

// Every source offset, each with the destination at the same offset and at
// the next one (the second destination sits one offset below the first).
template <class F>
void forEachLayout(F&& f) {
  for (unsigned quads : kQuadCounts)
    for (int so = 0; so < 4; ++so)
      for (int doff : {so, (so + 1) % 4}) f(quads, so, doff);
}

class MixRenderLevels : public ::testing::Test {
 protected:
  MixRenderLevels()
      : data_(kMaxSamples, 20240611u), got_(kMaxSamples), want_(kMaxSamples), reference_(kMaxSamples) {}

  void check(Call c) {
    c.dstBOffset = (c.dstOffset + 3) % 4;
    c.peak = kPeaks[(counter_++) % std::size(kPeaks)];
    checkCall(data_, c, got_, want_, reference_);
  }

  static constexpr unsigned kMaxSamples = 1001 * 4;
  LevelGuard guard_;
  Data data_;
  Arena got_, want_, reference_;
  unsigned counter_ = 0;
};

TEST_F(MixRenderLevels, ConstantGainKernels) {
  for (K kernel : {K::Peak, K::Mul, K::MulPeak, K::Add, K::MulAdd, K::MulAddPeak}) {
    forEachLayout([&](unsigned quads, int so, int doff) {
      for (float gain : kGains) {
        for (auto alias : {Call::kSeparate, Call::kSrcIsDst}) {
          if (alias == Call::kSrcIsDst && so != doff) continue;
          check(Call{kernel, gain, 0, quads, so, doff, 0, alias});
          if (HasFatalFailure()) return;
        }
        if (kernel == K::Peak || kernel == K::Add) break;  // no gain
      }
    });
  }
}

TEST_F(MixRenderLevels, Ramps) {
  const float starts[] = {1.0f, 0.0f, -0.0f, kNaN, -1.3f, 3e38f};
  const float deltas[] = {0.0f, -0.0f, -3.1e-3f, 3e37f};  // the last overflows the gain
  for (K kernel : {K::Ramp, K::RampAdd}) {
    forEachLayout([&](unsigned quads, int so, int doff) {
      for (float start : starts)
        for (float delta : deltas)
          for (auto alias : {Call::kSeparate, Call::kSrcIsDst}) {
            if (alias == Call::kSrcIsDst && so != doff) continue;
            check(Call{kernel, start, delta, quads, so, doff, 0, alias});
            if (HasFatalFailure()) return;
          }
    });
  }
}

TEST_F(MixRenderLevels, TwoDestinations) {
  const float gains[] = {1.0f, -0.0f, kNaN, 0.5f, -3.25f};
  forEachLayout([&](unsigned quads, int so, int doff) {
    for (float gainA : gains)
      for (float gainB : gains)
        for (auto alias : {Call::kSeparate, Call::kSrcIsDst, Call::kSrcIsDstB}) {
          if (alias == Call::kSrcIsDst && so != doff) continue;
          if (alias == Call::kSrcIsDstB && so != (doff + 3) % 4) continue;
          check(Call{K::MulAdd2, gainA, gainB, quads, so, doff, 0, alias});
          if (HasFatalFailure()) return;
        }
  });
}

// ---------------------------------------------------------------------------
// The edge cases, on every level.

class MixRenderEdges : public ::testing::TestWithParam<eLevel> {
 protected:
  void SetUp() override {
    if (GetParam() > Aud::Simd::supportedLevel()) GTEST_SKIP() << "level not supported here";
    Aud::Simd::setActiveLevel(GetParam());
  }
  LevelGuard guard_;
};

std::vector<uint32_t> bitsOfAll(const std::vector<float>& v) {
  std::vector<uint32_t> b;
  for (float f : v) b.push_back(bitsOf(f));
  return b;
}

TEST_P(MixRenderEdges, ZeroQuadsTouchNothingButWriteThePeakBack) {
  float src[4] = {5, 5, 5, 5}, dst[4] = {7, 7, 7, 7};
  float peak = 0.25f;
  MR::MultiplyConstant(src, dst, 0, 3.0f);
  MR::MultiplyWithDelta(src, dst, 0, 3.0f, 1.0f);
  MR::Add(src, dst, 0);
  MR::MultiplyConstantAndAdd(src, dst, 0, 3.0f);
  MR::MultiplyConstantAndAdd2(src, dst, dst, 0, 3.0f, 2.0f);
  MR::MultiplyWithDeltaAndAdd(src, dst, 0, 3.0f, 1.0f);
  MR::MultiplyConstantWithPrePeakScan(src, dst, 0, 3.0f, &peak);
  MR::MultiplyConstantAndAddWithPrePeakScan(src, dst, 0, 3.0f, &peak);
  MR::PeakScan(src, 0, &peak);
  EXPECT_EQ(peak, 0.25f);
  for (float v : dst) EXPECT_EQ(v, 7.0f);
  // Nothing is read or written, so null buffers are fine at length zero.
  float nan = kNaN;
  MR::PeakScan(nullptr, 0, &nan);
  EXPECT_TRUE(std::isnan(nan));
}

TEST_P(MixRenderEdges, UnityAndZeroGainShortcuts) {
  const std::vector<float> src = {fromBits(0x7F800001), fromBits(0x00000001), kInf, -kInf, kNaN, -0.0f, 1.5f,
                                  fromBits(0xFFBADBAD)};
  std::vector<float> dst(8, 9.0f);
  MR::MultiplyConstant(const_cast<float*>(src.data()), dst.data(), 2, 1.0f);
  EXPECT_EQ(bitsOfAll(dst), bitsOfAll(src)) << "gain 1 copies signalling NaNs and denormals bit for bit";

  for (float zero : {0.0f, -0.0f}) {
    std::vector<float> cleared(8, 9.0f);
    MR::MultiplyConstant(const_cast<float*>(src.data()), cleared.data(), 2, zero);
    EXPECT_EQ(bitsOfAll(cleared), std::vector<uint32_t>(8, 0u)) << "gain " << zero << " writes +0.0";

    std::vector<float> d(8, 9.0f);
    float peak = -7.0f;
    MR::MultiplyConstantWithPrePeakScan(const_cast<float*>(src.data()), d.data(), 2, zero, &peak);
    EXPECT_EQ(bitsOfAll(d), std::vector<uint32_t>(8, 0u));
    EXPECT_EQ(peak, -7.0f) << "the peak is neither read nor written";
    MR::MultiplyConstantWithPrePeakScan(const_cast<float*>(src.data()), d.data(), 2, zero, nullptr);

    std::vector<float> sum = src;
    std::reverse(sum.begin(), sum.end());
    const std::vector<float> before = sum;
    MR::MultiplyConstantAndAdd(const_cast<float*>(src.data()), sum.data(), 2, zero);
    EXPECT_EQ(bitsOfAll(sum), bitsOfAll(before)) << "gain 0 leaves the destination bit-exact";
  }

  // The pre-peak add has no zero shortcut: it folds and adds 0 x src.
  std::vector<float> d(8, 1.0f);
  float peak = 0.0f;
  MR::MultiplyConstantAndAddWithPrePeakScan(const_cast<float*>(src.data()), d.data(), 2, 0.0f, &peak);
  EXPECT_EQ(peak, kInf);
  EXPECT_TRUE(std::isnan(d[0]) && std::isnan(d[2]) && std::isnan(d[3]) && std::isnan(d[4]));
  EXPECT_EQ(d[1], 1.0f);
  EXPECT_EQ(d[6], 1.0f);
}

TEST_P(MixRenderEdges, PeakFold) {
  struct Row {
    float entry;
    float samples[4];
    uint32_t expected;
  };
  const Row rows[] = {
      {0.5f, {-0.75f, 0.25f, kNaN, 0.5f}, bitsOf(0.75f)},
      {kNaN, {-0.75f, 0.25f, 3.0f, kInf}, bitsOf(kNaN)},
      {-1.0f, {kNaN, kNaN, kNaN, kNaN}, bitsOf(-1.0f)},
      {-1.0f, {-0.0f, kNaN, -0.0f, kNaN}, bitsOf(0.0f)},
      {-0.0f, {0.0f, -0.0f, 0.0f, 0.0f}, bitsOf(-0.0f)},  // +0 is not greater than -0
      {1.0f, {-kInf, 0.5f, 0.5f, 0.5f}, bitsOf(kInf)},
      {0.0f, {fromBits(0x80000001), 0.0f, 0.0f, 0.0f}, 0x00000001},
  };
  for (const Row& r : rows) {
    // The same four samples at every position of a block long enough for
    // every vector width and both tails.
    for (unsigned quads : {1u, 3u, 5u, 9u, 17u}) {
      for (unsigned at = 0; at < quads; ++at) {
        std::vector<float> block(quads * 4, 0.0f);
        // Filler that never wins: the entry itself, or nothing above it.
        for (float& v : block) v = std::isnan(r.entry) || r.entry < 0 ? kNaN : r.entry;
        std::copy(r.samples, r.samples + 4, block.begin() + at * 4);
        float peak = r.entry;
        MR::PeakScan(block.data(), quads, &peak);
        EXPECT_EQ(bitsOf(peak), r.expected) << r.entry << " quads " << quads << " at " << at;
      }
    }
  }
}

TEST_P(MixRenderEdges, RampSteps) {
  float src[4] = {1, 1, 1, 1}, dst[4];
  MR::MultiplyWithDelta(src, dst, 1, 0.0f, 0.25f);
  EXPECT_EQ(std::vector<float>(dst, dst + 4), (std::vector<float>{0.0f, 0.25f, 0.5f, 0.75f}));

  // The gain accumulates by repeated float additions: a step below half a
  // unit in the last place of the gain never moves it, where
  // startGain + i x delta would.
  std::vector<float> ones(2048, 1.0f), out(2048), sum(2048, 0.5f);
  MR::MultiplyWithDelta(ones.data(), out.data(), 512, 1.0f, 2.9e-8f);
  for (float v : out) ASSERT_EQ(v, 1.0f);
  MR::MultiplyWithDeltaAndAdd(ones.data(), sum.data(), 512, 1.0f, 2.9e-8f);
  for (float v : sum) ASSERT_EQ(v, 1.5f);

  // Across chunk boundaries the chain carries on unbroken.
  MR::MultiplyWithDelta(ones.data(), out.data(), 512, 0.1f, 0.001f);
  float g = 0.1f;
  for (std::size_t i = 0; i < out.size(); ++i) {
    ASSERT_EQ(out[i], g) << i;
    g = g + 0.001f;
  }
}

TEST_P(MixRenderEdges, ZeroDeltaIsTheConstantKernelAppliedOnce) {
  for (float delta : {0.0f, -0.0f}) {
    for (float gain : {1.0f, 0.0f, -0.0f, 0.3f, kNaN}) {
      std::vector<float> a = {1, -2, kInf, kNaN, -0.0f, 3, 4, 5};
      std::vector<float> b = a, c(8, 2.0f), d(8, 2.0f);
      MR::MultiplyWithDelta(a.data(), a.data(), 2, gain, delta);  // in place
      MR::MultiplyConstant(b.data(), b.data(), 2, gain);
      EXPECT_EQ(bitsOfAll(a), bitsOfAll(b)) << gain;
      MR::MultiplyWithDeltaAndAdd(b.data(), c.data(), 2, gain, delta);
      MR::MultiplyConstantAndAdd(b.data(), d.data(), 2, gain);
      EXPECT_EQ(bitsOfAll(c), bitsOfAll(d)) << gain;
    }
  }
}

INSTANTIATE_TEST_SUITE_P(AllLevels, MixRenderEdges,
                         ::testing::Values(Aud::Simd::eScalar, Aud::Simd::eSSE2, Aud::Simd::eAVX2,
                                           Aud::Simd::eAVX512),
                         [](const ::testing::TestParamInfo<eLevel>& p) {
                           return std::string(Aud::Simd::levelName(p.param));
                         });

// A null buffer used to be dereferenced: it is reported and nothing is
// written.
TEST(MixRender, NullBuffersAreReportedNotTouched) {
  std::vector<std::string> reports;
  host::setFatalReportHandler([&](const char* m) { reports.emplace_back(m); });
  float buf[4] = {1, 2, 3, 4};
  float peak = 0.5f;
  MR::PeakScan(nullptr, 1, &peak);
  MR::PeakScan(buf, 1, nullptr);
  MR::MultiplyConstant(nullptr, buf, 1, 2.0f);
  MR::MultiplyConstantAndAdd2(buf, buf, nullptr, 1, 2.0f, 3.0f);
  MR::MultiplyConstantAndAddWithPrePeakScan(buf, buf, 1, 2.0f, nullptr);
  MR::MultiplyWithDeltaAndAdd(buf, nullptr, 1, 2.0f, 1.0f);
  host::setFatalReportHandler({});
  EXPECT_EQ(reports.size(), 6u);
  EXPECT_EQ(peak, 0.5f);
  EXPECT_EQ(std::vector<float>(buf, buf + 4), (std::vector<float>{1, 2, 3, 4}));
}

TEST(MixRender, FastSineCosine) {
  struct Row {
    unsigned phase;
    float sine, cosine;
  };
  const float r = fromBits(0x3F3504F3);
  const Row exact[] = {{0, 0, 1},      {8192, r, r},        {16384, 1, 0},      {24576, r, -r},
                       {32768, 0, -1}, {40960, -r, -r},     {49152, -1, 0},     {57344, -r, r},
                       {65536, 0, 1},  {0xFFFF0000u, 0, 1}, {0x12344000u, 1, 0}};
  for (const Row& row : exact) {
    float s, c;
    MR::fastSineCosine(s, c, row.phase);
    EXPECT_EQ(s, row.sine) << row.phase;
    EXPECT_EQ(c, row.cosine) << row.phase;
  }
  float s, c;
  MR::fastSineCosine(s, c, 4096);
  EXPECT_NEAR(s, 0.40533f, 1e-5f);
  EXPECT_NEAR(c, 0.90533f, 1e-5f);

  double worst = 0, worstLength = 0;
  for (unsigned p = 0; p < 65536; ++p) {
    float s0, c0, s1, c1;
    MR::fastSineCosine(s0, c0, p);
    MR::fastSineCosine(s1, c1, p + 65536u * (p % 7 + 1));
    ASSERT_EQ(bitsOf(s0), bitsOf(s1)) << p;
    ASSERT_EQ(bitsOf(c0), bitsOf(c1)) << p;
    const double angle = p * 2 * M_PI / 65536;
    worst = std::max({worst, std::fabs(s0 - std::sin(angle)), std::fabs(c0 - std::cos(angle))});
    worstLength = std::max(worstLength, std::fabs(std::hypot(double(s0), double(c0)) - 1));
  }
  EXPECT_LT(worst, 0.0237);
  EXPECT_GT(worst, 0.023);  // the documented approximation, not a better one
  EXPECT_LT(worstLength, 0.011);
}

}  // namespace
