// Editors change a store at random while one iterator applies it forwards and
// another in reverse. Run under ThreadSanitizer in CI: besides races and
// crashes it checks that no edit makes a step in the gain.
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cmath>
#include <functional>
#include <random>
#include <thread>

#include "LevelTestSupport.h"
#include "tonebits/levels/Aud__DynamicLevelApplyingIterator.h"

namespace {

using namespace levels_test;
using Aud::DynamicLevelControl::DynamicLevelApplyingIterator;

bool ordered(Store& s) {
  const Fields f = fields(s);
  return std::is_sorted(f.begin(), f.end(), [](auto& a, auto& b) { return std::get<0>(a) < std::get<0>(b); });
}

constexpr double kRate = 48000.0;
// Nodes sit on a 20 ms grid over [0, 1] s with levels in [0, 1], so a segment
// runs at least 10 ms (reverse into an end guard) and a glide spans 480
// samples: no step between samples may exceed 1/450, plus the drift of a
// chain of float additions over a segment of up to 1 s (48000 additions of at
// most 2^-24 each).
constexpr double kGrid = 0.02;
constexpr int kSlots = 51;
constexpr float kMaxStep = 1.0f / 450.0f + 48000.0f / 16777216.0f;

double gridTime(std::mt19937& rng) { return kGrid * std::uniform_int_distribution<int>(0, kSlots - 1)(rng); }

void editOnce(Store& s, std::mt19937& rng) {
  std::uniform_real_distribution<float> level(0.0f, 1.0f);
  const Store::eNodeType kinds[] = {N, N, N, MD, SG, EG};
  // Edits through a found position hold the lock so that another editor
  // cannot erase the node first.
  const criticalSection lock = s.getLockObject();
  const double t = gridTime(rng);
  const auto found = [&](const std::function<void(Store::iterator)>& edit) {
    CriticalSectionLock hold(lock);
    Store::iterator it = s.find(t);
    if (it != s.end()) edit(it);
  };
  switch (std::uniform_int_distribution<int>(0, 9)(rng)) {
    case 0:
    case 1: s.insert(Node(t, level(rng), kinds[rng() % 6], false)); break;
    case 2: {
      CriticalSectionLock hold(lock);
      s.erase(s.find(t));  // the end position too: an edit that changes nothing
      break;
    }
    case 3: s.erase(t, t + 3 * kGrid); break;
    case 4:
    case 5: found([&](Store::iterator it) { it.setLevel(level(rng)); }); break;
    case 6: found([&](Store::iterator it) { it.setTime(gridTime(rng)); }); break;
    case 7: s.setRangeToBlackSection(t, gridTime(rng)); break;
    case 8: s.setRangeToNonBlackSection(t, gridTime(rng)); break;
    default: s.eraseNonGuard(t, gridTime(rng) + kGrid); break;
  }
}

struct PlayResult {
  float maxStep = 0.0f;
  long samples = 0;
  bool finite = true;
};

void play(const Store& s, bool reverse, const std::atomic<bool>& stop, unsigned seed, PlayResult& out) {
  std::mt19937 rng(seed);
  std::uniform_real_distribution<double> start(0.0, 1.2);
  DynamicLevelApplyingIterator it;
  std::vector<float> block(256);
  while (!stop.load(std::memory_order_relaxed)) {
    reverse ? it.configureReverse(&s, kRate, start(rng)) : it.configureForwards(&s, kRate, start(rng));
    float previous = std::nanf("");
    for (int b = 0; b < 80 && !stop.load(std::memory_order_relaxed); ++b) {
      std::fill(block.begin(), block.end(), 1.0f);
      it.apply(block.data(), block.size());
      for (float g : block) {
        if (!std::isfinite(g)) out.finite = false;
        if (!std::isnan(previous)) out.maxStep = std::max(out.maxStep, std::fabs(g - previous));
        previous = g;
      }
      out.samples += static_cast<long>(block.size());
      std::this_thread::yield();  // playback waits for its device between blocks
    }
  }
}

void stress(int editors) {
  Store s;
  for (int k = 0; k < kSlots; k += 3) s.insert(Node(k * kGrid, 0.5f, k % 9 == 0 ? SG : N, false));
  std::atomic<bool> stop{false};
  PlayResult forwardsAndReverse[2];
  std::vector<std::thread> threads;
  for (unsigned r = 0; r < 2; ++r)
    threads.emplace_back(play, std::cref(s), r == 1, std::cref(stop), r + 1, std::ref(forwardsAndReverse[r]));
  std::atomic<long> edits{0};
  for (int e = 0; e < editors; ++e) {
    threads.emplace_back([&, e] {
      std::mt19937 rng(100 + e);
      while (!stop.load(std::memory_order_relaxed)) {
        editOnce(s, rng);
        ++edits;
        std::this_thread::yield();
      }
    });
  }
  // A bounded run, not a measurement: nothing below depends on its length.
  std::this_thread::sleep_for(std::chrono::milliseconds(700));
  stop = true;
  for (std::thread& t : threads) t.join();

  EXPECT_GT(edits.load(), 0);
  for (const PlayResult& r : forwardsAndReverse) {
    EXPECT_GT(r.samples, 0);
    EXPECT_TRUE(r.finite);
    EXPECT_LE(r.maxStep, kMaxStep);
  }
  EXPECT_TRUE(ordered(s));
}

TEST(LevelStress, OneEditorAgainstForwardAndReversePlay) { stress(1); }

// Two editors: black sections walk the store while the other editor erases.
TEST(LevelStress, TwoEditorsAgainstForwardAndReversePlay) { stress(2); }

}  // namespace
