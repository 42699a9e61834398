#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <random>
#include <string>
#include <vector>

#include "host/HostHooks.h"
#include "tests/dsp/DspSupport.h"
#include "tonebits/dsp/Aud__MixRender.h"

namespace {

namespace MR = Aud::MixRender;
using namespace dsp_test;
using Aud::Simd::eLevel;

const float kInf = std::numeric_limits<float>::infinity();
const float kNaN = floatOf(0x7FC00000);

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

// One destination sample: gain 1 copies or adds the source as it is, gain 0
// (where the kernel has that shortcut) writes +0 or leaves the destination;
// otherwise the product is rounded before it is added.
enum Shortcuts { kNone, kUnity, kUnityAndZero };
float applyGain(float g, float x, float d, bool add, Shortcuts shortcuts) {
  if (shortcuts != kNone && g == 1.0f) return add ? x + d : x;
  if (shortcuts == kUnityAndZero && g == 0.0f) return add ? d : 0.0f;
  const float product = g * x;
  return add ? product + d : product;
}

// The pre-peak kernels fold before any gain; a ramp with delta 0 is the
// constant kernel; a real ramp adds delta serially and takes no shortcut.
void runModel(const Call& c, const float* src0, const float* a0, const float* b0, float* a, float* b,
              float& peak) {
  const std::size_t n = std::size_t(c.numQuads) * 4;
  const K k = c.kernel;
  if (k == K::Peak || k == K::MulAddPeak || (k == K::MulPeak && c.gainA != 0.0f))
    for (std::size_t i = 0; i < n; ++i)
      if (std::fabs(src0[i]) > peak) peak = std::fabs(src0[i]);
  if (k == K::Peak) return;
  const bool add = k == K::Add || k == K::MulAdd || k == K::MulAdd2 || k == K::MulAddPeak || k == K::RampAdd;
  const bool ramp = (k == K::Ramp || k == K::RampAdd) && c.gainB != 0.0f;
  const Shortcuts shortcuts = ramp ? kNone : k == K::MulAddPeak ? kUnity : kUnityAndZero;
  float g = k == K::Add ? 1.0f : c.gainA;
  for (std::size_t i = 0; i < n; ++i) {
    a[i] = applyGain(g, src0[i], a0[i], add, shortcuts);
    if (k == K::MulAdd2) b[i] = applyGain(c.gainB, src0[i], b0[i], true, kUnityAndZero);
    if (ramp) g = g + c.gainB;
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

// Three 64-byte aligned regions (source, destinations A and B), each with the
// call's samples at its offset and guard words around them. Two different
// NaNs meeting in one operation may leave either payload, so the data never
// lets that happen: a destination is special only where the source is not,
// and with a NaN gain every NaN in the data is that same NaN.
constexpr uint32_t kGuard = 0x5EA1F00Du;
const uint32_t kSpecials[] = {0x00000000, 0x80000000, 0x7F800000, 0xFF800000, 0x00000001,
                              0x80000001, 0x007FFFFF, 0x807FFFFF, 0x00400000, 0x00800000,
                              0x7F7FFFFF, 0xFF7FFFFF, 0x3F800000, 0xBF800000, 0x7FC00000,
                              0xFFC00000, 0x7F800001, 0xFFBADBAD, 0x7FC12345};

struct Arena {
  std::vector<float> storage;
  float* base;
  std::size_t stride = 0;  // floats per region
  explicit Arena(std::size_t maxSamples) : storage(3 * strideFor(maxSamples) + 16) {
    base = reinterpret_cast<float*>((reinterpret_cast<uintptr_t>(storage.data()) + 63) & ~uintptr_t(63));
  }
  static std::size_t strideFor(std::size_t samples) { return (4 + samples + 16 + 15) / 16 * 16; }
  std::size_t bytes() const { return 3 * stride * sizeof(float); }
};

struct Pointers {
  float *src, *a, *b;
};

class Data {
 public:
  Data(unsigned maxSamples, uint32_t seed) : rng_(seed) {
    for (unsigned i = 0; i < maxSamples; ++i) {
      const bool srcSpecial = rng_() % 5 == 0;
      v_[0].push_back(srcSpecial ? special() : ordinary());
      for (int r : {1, 2}) v_[r].push_back(!srcSpecial && rng_() % 4 == 0 ? special() : ordinary());
    }
  }

  // Lays the call out in the arena, guard words everywhere else; an
  // in-place destination starts out as source data.
  Pointers fill(Arena& arena, const Call& c) const {
    const bool oneNaN = std::isnan(c.gainA) || std::isnan(c.gainB);
    const std::size_t n = std::size_t(c.numQuads) * 4;
    arena.stride = Arena::strideFor(n);
    for (std::size_t w = 0; w < 3 * arena.stride; ++w) arena.base[w] = floatOf(kGuard + uint32_t(w));
    const int from[] = {0, c.alias == Call::kSrcIsDst ? 0 : 1, c.alias == Call::kSrcIsDstB ? 0 : 2};
    const int offsets[] = {c.srcOffset, c.dstOffset, c.dstBOffset};
    float* p[3];
    for (int r = 0; r < 3; ++r) {
      p[r] = arena.base + r * arena.stride + offsets[r];
      for (std::size_t i = 0; i < n; ++i)
        p[r][i] = oneNaN && std::isnan(v_[from[r]][i]) ? kNaN : v_[from[r]][i];
    }
    return {c.alias == Call::kSrcIsDst ? p[1] : c.alias == Call::kSrcIsDstB ? p[2] : p[0], p[1], p[2]};
  }

 private:
  float ordinary() { return float(int32_t(rng_()) | 1) * 0x1p-30f * (rng_() % 8 == 0 ? 100.0f : 1.0f); }
  float special() { return floatOf(kSpecials[rng_() % std::size(kSpecials)]); }
  std::mt19937 rng_;
  std::vector<float> v_[3];
};

// Runs one call at every level against the rules: the whole arena, guards
// included, and the peak, all with memcmp.
void checkCall(const Data& data, const Call& c, Arena& got, Arena& want) {
  float wantPeak = c.peak;
  const std::size_t n = std::size_t(c.numQuads) * 4;
  const Pointers w = data.fill(want, c);
  const std::vector<float> src0(w.src, w.src + n), a0(w.a, w.a + n), b0(w.b, w.b + n);
  runModel(c, src0.data(), a0.data(), b0.data(), w.a, w.b, wantPeak);
  for (eLevel level : levels()) {
    SCOPED_TRACE(testing::Message() << "kernel " << int(c.kernel) << std::hex << " gains " << bitsOf(c.gainA)
                                    << " " << bitsOf(c.gainB) << " peak " << bitsOf(c.peak) << std::dec
                                    << " quads " << c.numQuads << " offsets " << c.srcOffset << c.dstOffset
                                    << c.dstBOffset << " alias " << int(c.alias) << " "
                                    << Aud::Simd::levelName(level));
    Aud::Simd::setActiveLevel(level);
    float peak = c.peak;
    const Pointers p = data.fill(got, c);
    runLibrary(c, p.src, p.a, p.b, &peak);
    ASSERT_EQ(std::memcmp(got.base, want.base, want.bytes()), 0);
    ASSERT_EQ(bitsOf(peak), bitsOf(wantPeak));
  }
}

const unsigned kQuadCounts[] = {0, 1, 2, 3, 7, 64, 1001};
const float kPeaks[] = {0.0f, 0.5f, -1.0f, kNaN, -0.0f, 1e30f, floatOf(0x00000003)};

class MixRenderLevels : public ::testing::Test {
 protected:
  // Every source offset, each with the destination at the same offset and
  // at the next one (the second destination sits one offset below the
  // first); aliases only where the offsets agree.
  void checkEverywhere(K kernel, float gainA, float gainB, Call::Alias alias) {
    for (unsigned quads : kQuadCounts)
      for (int so = 0; so < 4; ++so)
        for (int doff : {so, (so + 1) % 4}) {
          const int dbo = (doff + 3) % 4;
          if ((alias == Call::kSrcIsDst && so != doff) || (alias == Call::kSrcIsDstB && so != dbo)) continue;
          const float peak = kPeaks[(counter_++) % std::size(kPeaks)];
          checkCall(data_, Call{kernel, gainA, gainB, quads, so, doff, dbo, alias, peak}, got_, want_);
          if (HasFatalFailure()) return;
        }
  }

  static constexpr unsigned kMaxSamples = 1001 * 4;
  LevelGuard guard_;
  Data data_{kMaxSamples, 20240611u};
  Arena got_{kMaxSamples}, want_{kMaxSamples};
  unsigned counter_ = 0;
};

TEST_F(MixRenderLevels, OneDestinationKernels) {
  std::vector<std::pair<float, float>> none = {{0.0f, 0.0f}}, constant, ramps;
  for (float g : {1.0f, 0.0f, -0.0f, kNaN, 0.70710677f, -2.5f, 1e30f, kInf}) constant.push_back({g, 0.0f});
  for (float start : {1.0f, 0.0f, -0.0f, kNaN, -1.3f, 3e38f})
    for (float delta : {0.0f, -0.0f, -3.1e-3f, 3e37f})  // the last overflows the gain
      ramps.push_back({start, delta});
  const std::pair<K, const std::vector<std::pair<float, float>>*> kernels[] = {
      {K::Peak, &none},        {K::Add, &none},        {K::Mul, &constant},
      {K::MulPeak, &constant}, {K::MulAdd, &constant}, {K::MulAddPeak, &constant},
      {K::Ramp, &ramps},       {K::RampAdd, &ramps}};
  for (const auto& [kernel, gains] : kernels)
    for (const auto& [a, b] : *gains)
      for (Call::Alias alias : {Call::kSeparate, Call::kSrcIsDst}) {
        checkEverywhere(kernel, a, b, alias);
        if (HasFatalFailure()) return;
      }
}

// The source may be either destination of the two-destination kernel.
TEST_F(MixRenderLevels, TwoDestinations) {
  const float gains[] = {1.0f, -0.0f, kNaN, 0.5f, -3.25f};
  for (float gainA : gains)
    for (float gainB : gains)
      for (Call::Alias alias : {Call::kSeparate, Call::kSrcIsDst, Call::kSrcIsDstB}) {
        checkEverywhere(K::MulAdd2, gainA, gainB, alias);
        if (HasFatalFailure()) return;
      }
}

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
  // Not reported: nothing to read or write, or a peak that is not folded.
  MR::PeakScan(nullptr, 0, &peak);
  MR::MultiplyConstantAndAdd2(nullptr, nullptr, nullptr, 0, 2.0f, 3.0f);
  MR::MultiplyConstantWithPrePeakScan(buf, buf + 2, 0, 2.0f, &peak);
  float cleared[4] = {9, 9, 9, 9};
  MR::MultiplyConstantWithPrePeakScan(buf, cleared, 1, -0.0f, nullptr);
  host::setFatalReportHandler({});
  EXPECT_TRUE(reports.size() == 6u && peak == 0.5f);
  EXPECT_EQ(std::vector<float>(buf, buf + 4), (std::vector<float>{1, 2, 3, 4}));
  for (float v : cleared) EXPECT_EQ(bitsOf(v), 0u);  // +0, not -0
}

TEST(MixRender, FastSineCosine) {
  const float r = floatOf(0x3F3504F3);
  const struct {
    unsigned phase;
    float sine, cosine;
  } exact[] = {{0, 0, 1},       {8192, r, r},   {16384, 1, 0},       {24576, r, -r},     {32768, 0, -1},
               {40960, -r, -r}, {57344, -r, r}, {0xFFFF0000u, 0, 1}, {0x12344000u, 1, 0}};
  for (const auto& row : exact) {
    float s, c;
    MR::fastSineCosine(s, c, row.phase);
    EXPECT_EQ(s, row.sine) << row.phase;
    EXPECT_EQ(c, row.cosine) << row.phase;
  }
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
