#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <limits>
#include <random>

#include "LevelTestSupport.h"
#include "tonebits/levels/Aud__DynamicLevelApplyingIterator.h"

namespace {

using namespace levels_test;
using Aud::DynamicLevelControl::DynamicLevelApplyingIterator;
using Aud::DynamicLevelControl::DynamicLevelApplyingIteratorBase;
using Aud::DynamicLevelControl::DynamicLevelApplyingIteratorStorage;
using State = Aud::DynamicLevelControl::DynamicLevelApplyingIteratorState;

// Steps a state one sample at a time exactly as the base's contract says.
class Stepper : private DynamicLevelApplyingIteratorStorage, public DynamicLevelApplyingIteratorBase {
 public:
  explicit Stepper(bool reverse = false) : DynamicLevelApplyingIteratorBase(ownedState), reverse_(reverse) {}
  void configure(const Store* s, double rate, double t) {
    reverse_ ? configureReverse(s, rate, t) : configureForwards(s, rate, t);
  }
  void handleMods(double t) { reverse_ ? handleStoreModsReverse(t) : handleStoreModsForwards(t); }
  float next() {
    const float gain = ownedState.level;
    if (!ownedState.holdLevel &&
        (ownedState.level += ownedState.levelDelta, --ownedState.samplesToNextNode == 0))
      reverse_ ? moveToNextNodeReverse() : moveToNextNodeForwards();
    return gain;
  }
  State& state() { return ownedState; }

 private:
  bool reverse_;
};

void configure(DynamicLevelApplyingIterator& it, bool reverse, const Store* s, double rate, double t) {
  reverse ? it.configureReverse(s, rate, t) : it.configureForwards(s, rate, t);
}

using Summary = std::tuple<bool, float, double, uint32_t, float>;  // hold, level, next time, samples, delta
Summary summary(const State& s) {
  return {s.holdLevel, s.level, s.nextNodeTime, s.samplesToNextNode, s.levelDelta};
}

std::vector<float> gains(DynamicLevelApplyingIterator& it, std::size_t n) {
  std::vector<float> g(n, 1.0f);
  it.apply(g.data(), n);
  return g;
}

// No store, a bad rate, an empty store, never configured or invalidated: unity.
TEST(ApplyingIterator, UnityWhenThereIsNothingToApply) {
  Store empty, s;
  fill(s, "0:0 1:1");
  const std::vector<float> unity(1000, 1.0f);
  const std::pair<const Store*, double> rows[] = {{nullptr, 48000}, {&empty, 0},     {&empty, -48000},
                                                  {&empty, NAN},    {&empty, 48000}, {&s, 48000}};
  for (const auto& [store, rate] : rows) {
    for (bool reverse : {false, true}) {
      SCOPED_TRACE(testing::Message() << store << " at " << rate << (reverse ? " reverse" : ""));
      DynamicLevelApplyingIterator it;
      configure(it, reverse, store, rate, 1.0);
      const uint32_t id = it.getState().readerId;
      if (store == &s) it.invalidate();
      EXPECT_EQ(it.getState().readerId, id);
      EXPECT_TRUE(it.getState().holdLevel);
      EXPECT_EQ(gains(it, 1000), unity);
    }
  }
}

TEST(ApplyingIterator, ConfiguresSegmentsWhoseLengthsSaturateAndNeverWrap) {
  const double max = std::numeric_limits<double>::max(), min = std::numeric_limits<double>::min();
  // An end guard acting before its raw time gives a negative span: the next segment starts at once.
  FrameDuration fd(-1.0);
  const std::tuple<const char*, double, bool, double, Summary> rows[] = {
      {"0:0 1:.5", 48000, false, 0.25, {false, .125f, 1.0, 36000, .375f / 36000}},
      {"0:0 1:.5", 48000, true, 0.75, {false, .375f, 0.0, 36000, -.375f / 36000}},
      {"0:0 1:.5", 48000, false, 3.0, {true, .5f, max, 0, 0}},  // beyond the end of play
      {"0:0 1:.5", 48000, true, -0.5, {true, 0, min, 0, 0}},
      {"0:0 1:.5", 48000, true, 0.0, {true, 0, min, 0, 0}},  // at the first node is before it too
      {"0:0 1e5:1", 48000, false, 0.0, {false, 0, 1e5, 0xFFFFFFFF, 0x1p-32f}},  // 4.8e9 samples
      {"0:0 E1:1 2:.5", 1000, false, 0.9, {false, 1, 2.0, 1000, -.5f / 1000}},
      // A span too wide for a double gives the later node's level, not NaN.
      {"-1.7e308:0 1.7e308:1", 48000, false, 1e308, {false, 1, 1.7e308, 0xFFFFFFFF, 0}},
      {"-1.7e308:0 1.7e308:1", 48000, true, 1e308, {false, 1, -1.7e308, 0xFFFFFFFF, -0x1p-32f}},
  };
  for (const auto& [nodes, rate, reverse, start, expected] : rows) {
    SCOPED_TRACE(testing::Message() << nodes << " from " << start << (reverse ? " reverse" : ""));
    Store s;
    fill(s, nodes);
    Stepper st(reverse);
    st.configure(&s, rate, start);
    EXPECT_EQ(summary(st.state()), expected);
  }
  Store s;
  fill(s, "0:0 E1:1 2:.5");
  Stepper c;
  c.configure(&s, 1000, NAN);
  EXPECT_TRUE(c.state().holdLevel || c.state().samplesToNextNode > 0);
  EXPECT_LE(c.state().samplesToNextNode, 1000u);
  EXPECT_TRUE(std::isfinite(c.state().level));
}

// At 1024 samples/s with a 1/8 s frame an end guard acts 32 samples after its
// raw time: segments end at its acting time and the next is measured from its raw time.
TEST(ApplyingIterator, EndGuardsActAQuarterFrameLaterAcrossBlackSections) {
  FrameDuration fd(0.125);
  Store s;
  fill(s, "S0:.4 .25:.4 .5:.8 E.75:.8 S1:.3 1.25:.6 E1.5:.6 2:1");
  s.setRangeToBlackSection(1.0, 1.75);  // leaves the second section's guards only
  ASSERT_EQ(fields(s), fields("S0:.4 .25:.4 .5:.8 E.75:.8 S1:.3* E1.5:.6* 2:1"));
  using Segment = std::tuple<uint32_t, float, float>;  // samples, from level, to level
  const std::vector<Segment> forwards = {{256, .4f, .4f}, {256, .4f, .8f}, {288, .8f, .8f},
                                         {256, .8f, .3f}, {544, .3f, .6f}, {512, .6f, 1}};
  const std::vector<Segment> reverse = {{256, 1, 1},     {480, 1, .6f},   {512, .6f, .3f}, {224, .3f, .8f},
                                        {256, .8f, .8f}, {256, .8f, .4f}, {256, .4f, .4f}};
  for (bool backwards : {false, true}) {
    SCOPED_TRACE(backwards ? "reverse" : "forwards");
    std::vector<float> expected;
    for (const auto& [samples, from, to] : backwards ? reverse : forwards) {
      float level = from;
      const float delta = (to - from) / static_cast<float>(samples);
      for (uint32_t i = 0; i < samples; ++i, level += delta) expected.push_back(level);
    }
    expected.resize(expected.size() + 200, backwards ? .4f : 1.0f);  // held past the last node
    DynamicLevelApplyingIterator it;
    configure(it, backwards, &s, 1024, backwards ? 2.25 : 0.0);
    std::vector<float> got(expected.size(), 1.0f);
    it.apply(got.data(), 1000);
    it.apply(got.data() + 1000, got.size() - 1000);
    EXPECT_EQ(got, expected);
  }
  Stepper st(true);
  st.configure(&s, 1024, 1.25);  // reverse configuration ignores the shift
  const float level = 0.5f * (.6f - .3f) + .3f;
  EXPECT_EQ(summary(st.state()), Summary(false, level, 1.0, 256, (.3f - level) / 256));
}

TEST(ApplyingIterator, AnEditMidSegmentGlidesOver480SamplesAt48k) {
  for (bool reverse : {false, true}) {
    SCOPED_TRACE(reverse ? "reverse" : "forwards");
    Store s;
    fill(s, "0:0 1:1");
    DynamicLevelApplyingIterator it;
    configure(it, reverse, &s, 48000, reverse ? 1.0 : 0.0);
    EXPECT_EQ(it.isReverse(), reverse);
    const float last = gains(it, 24000).back(), reached = it.getState().level;
    EXPECT_EQ(it.getStreamTime(), 0.5);
    EXPECT_NEAR(reached, 0.5f, 1e-3);  // a long chain of float additions drifts a little

    s.insert(Node(reverse ? 0.25 : 0.75, 0.25f));
    // Where the edited automation stands 10 ms on, read by a fresh state.
    Stepper target(reverse);
    target.configure(&s, 48000, reverse ? 0.49 : 0.51);
    const float aim = target.state().level;
    const std::vector<float> after = gains(it, 2000);
    float level = reached;
    for (int i = 0; i < 480; ++i, level += (aim - reached) / 480.0f) ASSERT_EQ(after[i], level) << i;
    EXPECT_EQ(after[480], aim);  // the glide lands on the edited automation
    for (int i = 480; i < 2000; ++i) ASSERT_EQ(after[i], target.next()) << i;
    EXPECT_LT(std::fabs(after[0] - last), 1e-4);  // no step where the glide starts
  }
}

TEST(ApplyingIterator, StatesKeepTheirOwnAcknowledgements) {
  Store s;
  fill(s, "0:0 1:1");
  Stepper a, b;
  EXPECT_NE(a.state().readerId, b.state().readerId);
  EXPECT_EQ(State(a.state()).readerId, a.state().readerId);
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
}

TEST(ApplyingIterator, BelowAHundredSamplesPerSecondAnEditJumps) {
  Store s;
  fill(s, "0:0 10:1");
  DynamicLevelApplyingIterator it;
  it.configureForwards(&s, 50, 0.0);
  gains(it, 250);
  s.find(10).setLevel(0.0f);
  for (float g : gains(it, 100)) ASSERT_EQ(g, 0.0f);
}

TEST(ApplyingIterator, ReadyIteratorEqualsSteppingByHand) {
  std::mt19937 rng(12345);
  std::uniform_real_distribution<double> time(0.0, 2.0);
  std::uniform_real_distribution<float> level(0.0f, 1.5f);
  std::uniform_int_distribution<int> kind(0, 5), blockSize(1, 3000);
  const Store::eNodeType kinds[] = {N, N, N, MD, SG, EG};
  for (int round = 0; round < 40; ++round) {
    const bool reverse = round % 2 == 1;
    const double rate = round % 4 < 2 ? 48000.0 : 44100.0, start = time(rng);
    SCOPED_TRACE(round);
    Store s;
    for (int i = 0; i < 30; ++i) s.insert(Node(time(rng), level(rng), kinds[kind(rng)], false));
    DynamicLevelApplyingIterator ready;
    Stepper hand(reverse);
    configure(ready, reverse, &s, rate, start);
    hand.configure(&s, rate, start);
    for (std::uint64_t block = 0, done = 0, n; block < 30; ++block, done += n) {
      n = static_cast<std::size_t>(blockSize(rng));
      std::vector<float> a(n), b(n);
      for (std::size_t i = 0; i < n; ++i) a[i] = b[i] = level(rng) - 0.75f;
      ready.apply(a.data(), n);
      hand.handleMods(start + (reverse ? -1.0 : 1.0) * static_cast<double>(done) / rate);
      for (std::size_t i = 0; i < n; ++i) b[i] *= hand.next();
      ASSERT_EQ(std::memcmp(a.data(), b.data(), n * sizeof(float)), 0) << "block " << block;
      if (block % 7 == 3) s.insert(Node(time(rng), level(rng)));
      if (block % 11 == 5) s.setRangeToBlackSection(time(rng), time(rng));
    }
  }
}

}  // namespace
