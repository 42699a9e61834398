#include <gtest/gtest.h>

#include <cmath>
#include <numeric>
#include <string>
#include <vector>

#include "host/HostHooks.h"
#include "tonebits/foundation/Aud__FrameCadence.h"

namespace {

using namespace Aud;
using Counts = std::vector<unsigned>;

Counts counts(const Util::SampleCounts& s) { return Counts(s.begin(), s.end()); }
Counts frames(SampleRate r, int f) { return counts(Util::getSMPTE_FrameSequence(r, Kv::FrameRate(f))); }
Counts fields(SampleRate r, int f) { return counts(Util::getSMPTE_FieldSequence(r, Kv::FrameRate(f))); }
unsigned long long sum(const Counts& c) { return std::accumulate(c.begin(), c.end(), 0ull); }

const SampleRate k48(sr48000, fNone), k44(sr44100, fNone), k32(sr32000, fNone), k22(sr22050, fNone),
    k11(sr11025, fNone), k96(sr96000, fNone);

TEST(FrameCadence, ShortCadences) {
  const struct {
    SampleRate rate;
    int frameRate;
    Counts expected;
  } rows[] = {{k48, 1, {2000}}, {k44, 1, {1837}}, {k32, 1, {1333}}, {k48, 2, {2002}}, {k44, 2, {}},
              {k32, 2, {}},     {k48, 3, {1920}}, {k44, 3, {1764}}, {k32, 3, {1280}}, {k48, 4, {1600}},
              {k44, 4, {1470}}, {k48, 7, {1001}}, {k44, 7, {}},     {k48, 8, {960}},  {k44, 8, {882}},
              {k48, 9, {800}},  {k32, 9, {533}},  {k44, 10, {}},    {k32, 10, {}},    {k11, 3, {441}},
              {k22, 3, {882}},  {k96, 3, {3840}}, {k22, 2, {}}};
  for (const auto& row : rows)
    EXPECT_EQ(frames(row.rate, row.frameRate), row.expected)
        << row.rate.asString() << " at " << row.frameRate;
  EXPECT_EQ(frames(SampleRate(sr48000, fx2), 3), (Counts{3840}));
  EXPECT_EQ(frames(SampleRate(sr48000, fx1_1001), 5), (Counts{1600}));  // the one exact pulled-down NTSC case
  EXPECT_EQ(frames(k48, 10), (Counts{800, 801, 801, 801, 801}));
  EXPECT_EQ(frames(k96, 10), (Counts{1600, 1602, 1602, 1602, 1602}));
  EXPECT_EQ(frames(k48, 5), (Counts{1602, 1601, 1602, 1601, 1602}));
  EXPECT_EQ(frames(k96, 5), (Counts{3204, 3202, 3204, 3202, 3204}));
}

TEST(FrameCadence, LongCadencesOfThe1001FrameRates) {
  const struct {
    SampleRate rate;
    std::size_t length;
    unsigned long long total;
    unsigned shortFrame;
  } rows[] = {{k48, 5, 8008, 1601}, {k44, 100, 147147, 1471}, {k32, 15, 16016, 1067}};
  // 5 and 6 are the 30/1.001 rates; numbers outside 1 to 10 fall back to them.
  for (int frameRate : {5, 6, 0, -1, 11, 1000}) {
    for (const auto& row : rows) {
      SCOPED_TRACE(testing::Message() << row.total << " frame rate " << frameRate);
      const Counts c = frames(row.rate, frameRate);
      EXPECT_EQ(c.size(), row.length);
      EXPECT_EQ(sum(c), row.total);
      for (unsigned n : c) EXPECT_TRUE(n == row.shortFrame || n == row.shortFrame + 1) << n;
    }
  }
  const Counts c44 = frames(k44, 5), c32 = frames(k32, 6);
  for (std::size_t k = 1; k <= 100; ++k)
    EXPECT_EQ(c44[k - 1], k % 2 == 1 && k != 23 && k != 47 && k != 71 ? 1472u : 1471u) << k;
  for (std::size_t k = 1; k <= 15; ++k)
    EXPECT_EQ(c32[k - 1], k % 2 == 1 || k == 4 || k == 8 || k == 12 ? 1068u : 1067u) << k;
}

TEST(FrameCadence, DerivedAndPulledDownRatesWalkTheBaseCadence) {
  // The carry joins the next frame's count before scaling, so a cycle of
  // 24/25 at 25 frames per second closes only after the longest walk.
  const Counts pal = frames(SampleRate(sr48000, fx24_25), 3);
  EXPECT_EQ(Counts(pal.begin(), pal.begin() + 12),
            (Counts{1843, 1843, 1843, 1843, 1843, 1844, 1843, 1843, 1843, 1843, 1844, 1843}));
  EXPECT_EQ(pal.size(), 108001u);
  // Every cycle of one frame is 1920 / 1.001 = 1918.08 samples; the closing
  // entry takes one extra sample.
  const Counts ntsc = frames(SampleRate(sr48000, fx1_1001), 3);
  ASSERT_EQ(ntsc.size(), 108001u);
  EXPECT_EQ(ntsc.back(), 1919u);
  EXPECT_EQ(sum(ntsc), static_cast<unsigned long long>(108001 * 1920 / 1.001) + 1);

  // Whole cycles of a derived cadence carry the base's total, scaled; each
  // frame is within a sample of its share; long walks stop at the first
  // cycle end past 108000 frames.
  const Counts ntsc44 = frames(k44, 5), ntsc48 = frames(k48, 5), ntsc32 = frames(k32, 5);
  const struct {
    SampleRate rate;
    int frameRate;
    Counts base;
    double multiplier;
    bool closedEarly;
  } walks[] = {{k22, 5, ntsc44, 0.5, false},
               {k22, 8, {882}, 0.5, true},
               {SampleRate(sr44100, fx1_1001), 5, ntsc44, 1 / 1.001, false},
               {SampleRate(sr32000, fx1001), 5, ntsc32, 1.001, false},
               {SampleRate(sr48000, fx25_24), 1, {2000}, 25.0 / 24.0, true},
               // Above twice the base rate the carry must not feed back on itself.
               {SampleRate(sr96000, fx1001), 3, {1920}, 2.002, false},
               {SampleRate(sr48000, fx2 | fx25_24), 5, ntsc48, 2.0 * 1.0416666666666667, true},
               {SampleRate(sr96000, fx2 | fx1001), 1, {2000}, 4.004, false},
               {SampleRate(sr96000, fx1_1001), 5, ntsc48, 2.0 / 1.001, false}};
  for (const auto& w : walks) {
    SCOPED_TRACE(testing::Message() << w.rate.calcBaseSampleRate() << " Hz x " << w.rate.calcFactor()
                                    << ", frame rate " << w.frameRate);
    const Counts c = frames(w.rate, w.frameRate);
    ASSERT_FALSE(c.empty());
    ASSERT_EQ(c.size() % w.base.size(), 0u);
    for (std::size_t i = 0; i < c.size(); ++i) {
      const double share = w.base[i % w.base.size()] * w.multiplier;
      ASSERT_TRUE(c[i] >= std::floor(share) - 1.0 && c[i] <= std::ceil(share) + 1.0) << i << ": " << c[i];
    }
    EXPECT_NEAR(double(sum(c)), double(sum(w.base)) * double(c.size() / w.base.size()) * w.multiplier, 2.0);
    EXPECT_EQ(c.size() < 108000u, w.closedEarly);
    EXPECT_LT(c.size(), 108000u + (w.closedEarly ? 0 : w.base.size() + 1));
  }
}

TEST(FrameCadence, FieldsSplitEachFrame) {
  EXPECT_EQ(fields(k48, 3), (Counts{960, 960}));
  EXPECT_EQ(fields(k48, 5), (Counts{801, 801, 800, 801, 801, 801, 800, 801, 801, 801}));
  EXPECT_EQ(fields(k11, 3), (Counts{220, 221}));
  for (int frameRate = 1; frameRate <= 10; ++frameRate) {
    const Counts f = frames(k44, frameRate), g = fields(k44, frameRate);
    ASSERT_EQ(g.size(), 2 * f.size());
    for (std::size_t i = 0; i < f.size(); ++i) {
      EXPECT_EQ(g[2 * i] + g[2 * i + 1], f[i]);
      EXPECT_LE(g[2 * i], g[2 * i + 1]);
    }
  }
}

TEST(FrameCadence, RatesWithNoBaseCadenceAreReported) {
  std::vector<std::string> reports;
  host::setFatalReportHandler([&](const char* m) { reports.push_back(m); });
  frames(k44, 2);  // no cadence, but no fault either
  frames(SampleRate(sr22050, fx1001), 7);
  EXPECT_TRUE(reports.empty());
  for (const SampleRate rate : {SampleRate(), SampleRate(sr16000, fNone), SampleRate(sr24000, fx1001),
                                SampleRate(srProject, fNone), SampleRate(eBaseSampleRate(20), fNone)}) {
    reports.clear();
    EXPECT_EQ(frames(rate, 3), Counts{});
    EXPECT_EQ(fields(rate, 5), Counts{});
    EXPECT_EQ(reports,
              (std::vector<std::string>{"Not implemented for this rate!", "Not implemented for this rate!"}));
  }
  host::setFatalReportHandler(nullptr);
}

}  // namespace
