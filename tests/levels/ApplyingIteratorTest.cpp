#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <limits>
#include <ostream>
#include <random>
#include <string>

#include "LevelTestSupport.h"
#include "tonebits/levels/Aud__DynamicLevelApplyingIterator.h"

namespace {

using namespace levels_test;
using Aud::DynamicLevelControl::DynamicLevelApplyingIterator;
using Aud::DynamicLevelControl::DynamicLevelApplyingIteratorBase;
using Aud::DynamicLevelControl::DynamicLevelApplyingIteratorState;
using Aud::DynamicLevelControl::DynamicLevelApplyingIteratorStorage;
using State = DynamicLevelApplyingIteratorState;

// Steps a state one sample at a time exactly as the base's contract says.
class Stepper : private DynamicLevelApplyingIteratorStorage, public DynamicLevelApplyingIteratorBase {
 public:
  explicit Stepper(bool reverse = false) : DynamicLevelApplyingIteratorBase(ownedState), reverse_(reverse) {}
  void configure(const Store* s, double rate, double t) {
    reverse_ ? configureReverse(s, rate, t) : configureForwards(s, rate, t);
  }
  void handleMods(double t) { reverse_ ? handleStoreModsReverse(t) : handleStoreModsForwards(t); }
  float next() {
    State& s = ownedState;
    const float gain = s.level;
    if (!s.holdLevel) {
      s.level += s.levelDelta;
      if (--s.samplesToNextNode == 0) reverse_ ? moveToNextNodeReverse() : moveToNextNodeForwards();
    }
    return gain;
  }
  State& state() { return ownedState; }
  std::size_t nodeCount() const { return getNodeStore().size(); }

 private:
  bool reverse_;
};

std::vector<float> gains(DynamicLevelApplyingIterator& it, std::size_t n) {
  std::vector<float> g(n, 1.0f);
  it.apply(g.data(), n);
  return g;
}

// The gains of a list of segments, each a sample count and the levels at
// its two ends, as the per-sample rule produces them.
struct Segment {
  uint32_t samples;
  float from, to;
};
std::vector<float> expectedGains(const std::vector<Segment>& segments) {
  std::vector<float> g;
  for (const Segment& seg : segments) {
    float level = seg.from;
    const float delta = (seg.to - seg.from) / static_cast<float>(seg.samples);
    for (uint32_t i = 0; i < seg.samples; ++i, level += delta) g.push_back(level);
  }
  return g;
}

TEST(ApplyingIterator, UnityWhenThereIsNothingToApply) {
  Store empty;
  const double nan = std::numeric_limits<double>::quiet_NaN();
  struct Row {
    const char* name;
    const Store* store;
    double rate;
  };
  const Row rows[] = {{"null store", nullptr, 48000},
                      {"zero rate", &empty, 0},
                      {"negative rate", &empty, -48000},
                      {"rate not a number", &empty, nan},
                      {"empty store", &empty, 48000}};
  for (const Row& row : rows) {
    for (bool reverse : {false, true}) {
      SCOPED_TRACE(row.name + std::string(reverse ? " reverse" : " forwards"));
      DynamicLevelApplyingIterator it;
      reverse ? it.configureReverse(row.store, row.rate, 1.0)
              : it.configureForwards(row.store, row.rate, 1.0);
      EXPECT_TRUE(it.getState().holdLevel);
      for (float g : gains(it, 1000)) ASSERT_EQ(g, 1.0f);
    }
  }
  DynamicLevelApplyingIterator never;
  for (float g : gains(never, 100)) ASSERT_EQ(g, 1.0f);
}

TEST(ApplyingIterator, HoldsTheLevelBeyondTheEndOfPlay) {
  Store s;
  fill(s, {Node(1, .25f), Node(2, .75f)});
  Stepper fwd(false), rev(true);
  fwd.configure(&s, 48000, 3.0);
  rev.configure(&s, 48000, 0.5);
  EXPECT_TRUE(fwd.state().holdLevel);
  EXPECT_EQ(fwd.state().level, .75f);
  EXPECT_EQ(fwd.state().nextNodeTime, std::numeric_limits<double>::max());
  EXPECT_TRUE(rev.state().holdLevel);
  EXPECT_EQ(rev.state().level, .25f);
  EXPECT_EQ(rev.state().nextNodeTime, std::numeric_limits<double>::min());
  rev.configure(&s, 48000, 1.0);  // at the first node is before it too
  EXPECT_TRUE(rev.state().holdLevel);
  for (int i = 0; i < 1000; ++i) ASSERT_EQ(fwd.next(), .75f);
}

TEST(ApplyingIterator, ConfiguresPartWayThroughASegment) {
  Store s;
  fill(s, {Node(0, 0.0f), Node(1, 1.0f)});
  Stepper fwd(false), rev(true);
  fwd.configure(&s, 48000, 0.25);
  EXPECT_EQ(fwd.state().level, 0.25f);
  EXPECT_EQ(fwd.state().samplesToNextNode, 36000u);
  EXPECT_EQ(fwd.state().levelDelta, 0.75f / 36000);
  EXPECT_EQ(fwd.state().nextNodeTime, 1.0);
  EXPECT_FALSE(fwd.state().holdLevel);
  rev.configure(&s, 48000, 0.75);
  EXPECT_EQ(rev.state().level, 0.75f);
  EXPECT_EQ(rev.state().samplesToNextNode, 36000u);
  EXPECT_EQ(rev.state().levelDelta, -0.75f / 36000);
  EXPECT_EQ(rev.state().nextNodeTime, 0.0);
}

TEST(ApplyingIterator, SegmentLengthsSaturateAndNeverWrap) {
  Store far;
  fill(far, {Node(0, 0.0f), Node(1e5, 1.0f)});  // 4.8e9 samples at 48 kHz
  Stepper a;
  a.configure(&far, 48000, 0.0);
  EXPECT_EQ(a.state().samplesToNextNode, 0xFFFFFFFFu);

  // An end guard acting before its raw time gives a negative span: no
  // samples, so the next segment starts at once.
  FrameDuration fd(-1.0);
  Store s;
  fill(s, {Node(0, 0.0f), Node(1, 1.0f, EG, false), Node(2, .5f)});
  Stepper b;
  b.configure(&s, 1000, 0.9);
  EXPECT_EQ(b.state().samplesToNextNode, 1000u);
  EXPECT_EQ(b.state().level, 1.0f);
  EXPECT_EQ(b.state().nextNodeTime, 2.0);

  // A span too wide for a double gives the later node's level, not NaN.
  Store wide;
  fill(wide, {Node(-1.7e308, 0.0f), Node(1.7e308, 1.0f)});
  for (bool reverse : {false, true}) {
    Stepper w(reverse);
    w.configure(&wide, 48000, 1e308);
    EXPECT_EQ(w.state().level, 1.0f);
    EXPECT_EQ(w.state().samplesToNextNode, 0xFFFFFFFFu);
  }

  Stepper c;
  c.configure(&s, 1000, std::numeric_limits<double>::quiet_NaN());
  EXPECT_TRUE(c.state().holdLevel || c.state().samplesToNextNode > 0);
  EXPECT_LE(c.state().samplesToNextNode, 1000u);
  EXPECT_TRUE(std::isfinite(c.state().level));
}

// Sections at 1024 samples per second with a 1/8 s frame: an end guard acts
// 32 samples after its raw time, and a glide is 10 samples.
class ApplyingAcrossSections : public ::testing::Test {
 protected:
  ApplyingAcrossSections() : fd_(0.125) {
    fill(store_, {Node(0, .4f, SG, false), Node(.25, .4f), Node(.5, .8f), Node(.75, .8f, EG, false),
                  Node(1, .3f, SG, false), Node(1.25, .6f), Node(1.5, .6f, EG, false), Node(2, 1.0f)});
    store_.setRangeToBlackSection(1.0, 1.75);  // leaves the second section's guards only
  }
  FrameDuration fd_;
  Store store_;
};

TEST_F(ApplyingAcrossSections, ForwardsEndsSegmentsAtEndGuardsPlusAQuarterFrame) {
  ASSERT_EQ(timesOf(store_), (std::vector<double>{0, .25, .5, .75, 1, 1.5, 2}));
  ASSERT_EQ(levelsOf(store_), (std::vector<float>{.4f, .4f, .8f, .8f, .3f, .6f, 1.0f}));
  std::vector<float> expected = expectedGains({{256, .4f, .4f},
                                               {256, .4f, .8f},
                                               {288, .8f, .8f},  // to the end guard's acting time
                                               {256, .8f, .3f},  // measured from its raw time
                                               {544, .3f, .6f},  // across the black section
                                               {512, .6f, 1.0f}});
  expected.resize(expected.size() + 200, 1.0f);  // hold after the last node
  for (bool ready : {false, true}) {
    SCOPED_TRACE(ready ? "ready iterator" : "by hand");
    std::vector<float> got(expected.size(), 1.0f);
    if (ready) {
      DynamicLevelApplyingIterator it;
      it.configureForwards(&store_, 1024, 0.0);
      it.apply(got.data(), got.size());
    } else {
      Stepper st(false);
      st.configure(&store_, 1024, 0.0);
      for (float& g : got) g = st.next();
    }
    ASSERT_EQ(got.size(), expected.size());
    for (std::size_t i = 0; i < got.size(); ++i) ASSERT_EQ(got[i], expected[i]) << i;
  }
}

TEST_F(ApplyingAcrossSections, ReverseConfiguresOnRawTimesAndMovesToActingTimes) {
  std::vector<float> expected = expectedGains({{256, 1.0f, 1.0f},
                                               {480, 1.0f, .6f},  // to the end guard's acting time
                                               {512, .6f, .3f},   // measured from its raw time
                                               {224, .3f, .8f},
                                               {256, .8f, .8f},
                                               {256, .8f, .4f},
                                               {256, .4f, .4f}});
  expected.resize(expected.size() + 200, .4f);  // hold before the first node
  DynamicLevelApplyingIterator it;
  it.configureReverse(&store_, 1024, 2.25);
  std::vector<float> got(expected.size(), 1.0f);
  it.apply(got.data(), 1000);
  it.apply(got.data() + 1000, got.size() - 1000);
  for (std::size_t i = 0; i < got.size(); ++i) ASSERT_EQ(got[i], expected[i]) << i;

  Stepper st(true);
  st.configure(&store_, 1024, 1.25);  // reverse configuration ignores the shift
  EXPECT_EQ(st.state().samplesToNextNode, 256u);
  EXPECT_EQ(st.state().nextNodeTime, 1.0);
  EXPECT_EQ(st.state().level, 0.5f * (.6f - .3f) + .3f);
}

struct GlideCase {
  bool reverse;
  double start;
  friend void PrintTo(const GlideCase& c, std::ostream* os) {
    *os << (c.reverse ? "reverse from " : "forwards from ") << c.start;
  }
};

class ApplyingEdits : public ::testing::TestWithParam<GlideCase> {};

TEST_P(ApplyingEdits, AnEditMidSegmentGlidesOver480SamplesAt48k) {
  const GlideCase c = GetParam();
  Store s;
  fill(s, {Node(0, 0.0f), Node(1, 1.0f)});
  DynamicLevelApplyingIterator it;
  c.reverse ? it.configureReverse(&s, 48000, c.start) : it.configureForwards(&s, 48000, c.start);
  const std::vector<float> before = gains(it, 24000);
  EXPECT_EQ(it.getStreamTime(), 0.5);
  const float reached = it.getState().level;
  EXPECT_NEAR(reached, 0.5f, 1e-3);  // a long chain of float additions drifts a little

  s.insert(Node(c.reverse ? 0.25 : 0.75, 0.25f));
  // Where the edited automation stands 10 ms on, read by a fresh state.
  Stepper target(c.reverse);
  target.configure(&s, 48000, c.reverse ? 0.49 : 0.51);
  const State aim = target.state();

  const std::vector<float> after = gains(it, 2000);
  const float delta = (aim.level - reached) / 480.0f;
  float level = reached;
  for (int i = 0; i < 480; ++i, level += delta) ASSERT_EQ(after[i], level) << i;
  EXPECT_EQ(after[480], aim.level);  // the glide lands on the edited automation
  for (int i = 480; i < 2000; ++i) ASSERT_EQ(after[i], target.next()) << i;
  EXPECT_LT(std::fabs(after[0] - before.back()), 1e-4);  // no step where the glide starts
}

INSTANTIATE_TEST_SUITE_P(BothDirections, ApplyingEdits,
                         ::testing::Values(GlideCase{false, 0.0}, GlideCase{true, 1.0}),
                         [](const ::testing::TestParamInfo<GlideCase>& p) {
                           return std::string(p.param.reverse ? "Reverse" : "Forwards");
                         });

TEST(ApplyingIterator, StatesKeepTheirOwnAcknowledgements) {
  Store s;
  fill(s, {Node(0, 0.0f), Node(1, 1.0f)});
  Stepper a, b;
  EXPECT_NE(a.state().readerId, b.state().readerId);
  const State copy = a.state();
  EXPECT_EQ(copy.readerId, a.state().readerId);
  a.configure(&s, 48000, 0.0);
  b.configure(&s, 48000, 0.0);
  s.find(1).setLevel(.5f);
  a.handleMods(0.1);
  EXPECT_TRUE(a.state().pendingValid);
  EXPECT_FALSE(b.state().pendingValid);
  const auto key = [](const State& st) { return reinterpret_cast<void*>(uintptr_t{st.readerId}); };
  EXPECT_FALSE(s.queryModification(key(a.state()), nullptr));
  EXPECT_TRUE(s.queryModification(key(b.state()), nullptr));
  b.handleMods(0.1);
  EXPECT_TRUE(b.state().pendingValid);
  EXPECT_EQ(b.state().samplesToNextNode, 480u);
  a.handleMods(0.2);  // no edit since: nothing changes
  EXPECT_EQ(a.state().samplesToNextNode, 480u);
  EXPECT_EQ(a.nodeCount(), 2u);
}

TEST(ApplyingIterator, BelowAHundredSamplesPerSecondAnEditJumps) {
  Store s;
  fill(s, {Node(0, 0.0f), Node(10, 1.0f)});
  DynamicLevelApplyingIterator it;
  it.configureForwards(&s, 50, 0.0);
  gains(it, 250);
  s.find(10).setLevel(0.0f);
  const std::vector<float> g = gains(it, 100);
  EXPECT_EQ(g[0], 0.0f);
  for (float x : g) ASSERT_EQ(x, 0.0f);
}

TEST(ApplyingIterator, InvalidateGivesUnityForEver) {
  Store s;
  fill(s, {Node(0, 0.0f), Node(1, 1.0f)});
  DynamicLevelApplyingIterator it;
  it.configureForwards(&s, 48000, 0.5);
  const uint32_t id = it.getState().readerId;
  it.invalidate();
  EXPECT_EQ(it.getState().readerId, id);
  EXPECT_EQ(it.getState().store, nullptr);
  for (float g : gains(it, 1000)) ASSERT_EQ(g, 1.0f);
}

// The ready iterator's runs must give, sample for sample, what stepping the
// state by hand gives, edits between blocks included.
TEST(ApplyingIterator, ReadyIteratorEqualsSteppingByHand) {
  std::mt19937 rng(12345);
  std::uniform_real_distribution<double> time(0.0, 2.0);
  std::uniform_real_distribution<float> level(0.0f, 1.5f);
  std::uniform_int_distribution<int> kind(0, 5);
  const Store::eNodeType kinds[] = {N, N, N, MD, SG, EG};
  for (int round = 0; round < 40; ++round) {
    const bool reverse = round % 2 == 1;
    SCOPED_TRACE(round);
    Store s;
    for (int i = 0; i < 30; ++i) s.insert(Node(time(rng), level(rng), kinds[kind(rng)], false));
    const double rate = round % 4 < 2 ? 48000.0 : 44100.0;
    const double start = time(rng);
    DynamicLevelApplyingIterator ready;
    Stepper hand(reverse);
    reverse ? ready.configureReverse(&s, rate, start) : ready.configureForwards(&s, rate, start);
    hand.configure(&s, rate, start);
    std::uniform_int_distribution<int> blockSize(1, 3000);
    std::uint64_t done = 0;
    for (int block = 0; block < 30; ++block) {
      const std::size_t n = static_cast<std::size_t>(blockSize(rng));
      std::vector<float> a(n), b(n);
      for (std::size_t i = 0; i < n; ++i) a[i] = b[i] = level(rng) - 0.75f;
      ready.apply(a.data(), n);
      hand.handleMods(reverse ? start - static_cast<double>(done) / rate
                              : start + static_cast<double>(done) / rate);
      for (std::size_t i = 0; i < n; ++i) b[i] *= hand.next();
      ASSERT_EQ(std::memcmp(a.data(), b.data(), n * sizeof(float)), 0) << "block " << block;
      done += n;
      if (block % 7 == 3) s.insert(Node(time(rng), level(rng)));
      if (block % 11 == 5) s.setRangeToBlackSection(time(rng), time(rng));
    }
  }
}

}  // namespace
