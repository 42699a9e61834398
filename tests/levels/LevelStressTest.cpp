// Editors change a store at random while one iterator applies it forwards and
// another in reverse. Run under ThreadSanitizer in CI: besides races and
// crashes it checks that no edit makes a step in the gain.
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cmath>
#include <random>
#include <thread>

#include "LevelTestSupport.h"
#include "tonebits/levels/Aud__DynamicLevelApplyingIterator.h"

namespace {

using namespace levels_test;
using Aud::DynamicLevelControl::DynamicLevelApplyingIterator;

// Nodes sit on a 20 ms grid over [0, 1] s with levels in [0, 1], so a segment
// runs at least 10 ms (reverse into an end guard) and a glide spans 480
// samples: no step between samples may exceed 1/450, plus the drift of up to
// 48000 float additions of at most 2^-24 each.
constexpr double kGrid = 0.02;
constexpr float kMaxStep = 1.0f / 450.0f + 48000.0f / 16777216.0f;

void editOnce(Store& s, std::mt19937& rng) {
  std::uniform_real_distribution<float> level(0.0f, 1.0f);
  const auto gridTime = [&] { return kGrid * static_cast<double>(rng() % 51); };
  const Store::eNodeType kinds[] = {N, N, N, MD, SG, EG};
  const double t = gridTime();
  // Edits through a found position hold the lock so another editor cannot erase the node first.
  const criticalSection lock = s.getLockObject();
  CriticalSectionLock hold(lock);
  Store::iterator it = s.find(t);
  switch (rng() % 10) {
    case 0: s.insert(Node(t, level(rng), kinds[rng() % 6], false)); break;
    case 1: s.erase(it); break;  // the end position too: an edit that changes nothing
    case 2: s.erase(t, t + 3 * kGrid); break;
    case 3:
    case 4:
      if (it != s.end()) it.setLevel(level(rng));
      break;
    case 5:
      if (it != s.end()) it.setTime(gridTime());
      break;
    case 6: s.setRangeToBlackSection(t, gridTime()); break;
    case 7: s.setRangeToNonBlackSection(t, gridTime()); break;
    default: s.eraseNonGuard(t, gridTime() + kGrid); break;
  }
}

struct PlayResult {
  float maxStep = 0.0f;
  long samples = 0;
  bool finite = true;
};

void play(const Store* s, bool reverse, const std::atomic<bool>* stop, PlayResult* out) {
  std::mt19937 rng(reverse ? 2 : 1);
  std::uniform_real_distribution<double> start(0.0, 1.2);
  DynamicLevelApplyingIterator it;
  std::vector<float> block(256);
  while (!*stop) {
    reverse ? it.configureReverse(s, 48000, start(rng)) : it.configureForwards(s, 48000, start(rng));
    float previous = NAN;
    for (int b = 0; b < 80 && !*stop; ++b, out->samples += 256) {
      std::fill(block.begin(), block.end(), 1.0f);
      it.apply(block.data(), block.size());
      for (float g : block) {
        out->finite = out->finite && std::isfinite(g);
        if (!std::isnan(previous)) out->maxStep = std::max(out->maxStep, std::fabs(g - previous));
        previous = g;
      }
      std::this_thread::yield();  // playback waits for its device between blocks
    }
  }
}

// With two editors, black sections walk the store while the other editor erases.
TEST(LevelStress, EditorsAgainstForwardAndReversePlay) {
  for (int editors : {1, 2}) {
    SCOPED_TRACE(editors);
    Store s;
    for (int k = 0; k < 51; k += 3) s.insert(Node(k * kGrid, 0.5f, k % 9 == 0 ? SG : N, false));
    std::atomic<bool> stop{false};
    std::atomic<long> edits{0};
    PlayResult results[2];
    std::vector<std::thread> threads;
    for (int r = 0; r < 2; ++r) threads.emplace_back(play, &s, r == 1, &stop, &results[r]);
    for (int e = 0; e < editors; ++e)
      threads.emplace_back([&, e] {
        std::mt19937 rng(100 + e);
        for (; !stop; ++edits, std::this_thread::yield()) editOnce(s, rng);
      });
    // A bounded run, not a measurement: nothing below depends on its length.
    std::this_thread::sleep_for(std::chrono::milliseconds(700));
    stop = true;
    for (std::thread& t : threads) t.join();
    EXPECT_GT(edits.load(), 0);
    for (const PlayResult& r : results) {
      EXPECT_GT(r.samples, 0);
      EXPECT_TRUE(r.finite);
      EXPECT_LE(r.maxStep, kMaxStep);
    }
    const Fields f = fields(s);
    EXPECT_TRUE(
        std::is_sorted(f.begin(), f.end(), [](auto& a, auto& b) { return std::get<0>(a) < std::get<0>(b); }));
  }
}

}  // namespace
