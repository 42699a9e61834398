// Level automation costs.
//
// Store operations at 10^3..10^6 nodes: ns per insert, erase and
// getLevelAtTime at random times, with the cost divided by log2(n) as a
// counter (flat when the growth is logarithmic); getLevelAtTime also with
// the queries in time order.
//
// Applying a 1000-node store to 1 Mi samples with the ready iterator, in
// blocks of 1024, against a plain loop over the same samples that multiplies
// by a linear ramp built by repeated addition (the per-sample rule's own
// arithmetic), timed in the same run: `ratio` is iterator time / loop time,
// each the fastest of the passes.
// `vs_closed_form` compares with a loop that computes each ramp value from
// its index instead, which vectorises but does not give the rule's values.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <random>
#include <vector>

#include "tonebits/levels/Aud__DynamicLevelApplyingIterator.h"
#include "tonebits/levels/Aud__DynamicLevelControl.h"

namespace {

using Aud::DynamicLevelControl::DynamicLevelApplyingIterator;
using Aud::DynamicLevelControl::Store;
using Node = Store::Node;
using Clock = std::chrono::steady_clock;

// Nodes at every integer second, so random fractional times never collide.
void build(Store& s, long n) {
  for (long i = 0; i < n; ++i)
    s.insert_noAdjust(Node(static_cast<double>(i), 0.5f + 0.25f * static_cast<float>(i % 3)));
}

std::vector<double> freshTimes(long n, std::size_t count, unsigned seed) {
  std::mt19937_64 rng(seed);
  std::uniform_int_distribution<long> second(0, n - 1);
  std::uniform_real_distribution<double> fraction(0.1, 0.9);
  std::vector<double> out(count);
  for (double& x : out) x = static_cast<double>(second(rng)) + fraction(rng);
  return out;
}

// Seconds per operation and per log2(n): flat when the cost grows as log n.
void perLog(benchmark::State& state, long n) {
  state.counters["per_log2n"] =
      benchmark::Counter(static_cast<double>(state.iterations()) * std::log2(static_cast<double>(n)),
                         benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
}

void BM_StoreInsert(benchmark::State& state) {
  const long n = state.range(0);
  Store s;
  build(s, n);
  const std::vector<double> times = freshTimes(n, 4096, 1);
  std::vector<Store::iterator> added;
  added.reserve(times.size());
  std::size_t i = 0;
  for (auto _ : state) {
    added.push_back(s.insert(Node(times[i], 0.3f)));
    if (++i == times.size()) {
      state.PauseTiming();
      for (const Store::iterator& it : added) s.erase_noAdjust(it);
      added.clear();
      i = 0;
      state.ResumeTiming();
    }
  }
  perLog(state, n);
}

void BM_StoreErase(benchmark::State& state) {
  const long n = state.range(0);
  Store s;
  build(s, n);
  const std::vector<double> times = freshTimes(n, 4096, 2);
  std::vector<Store::iterator> added;
  const auto refill = [&] {
    added.clear();
    for (double t : times) added.push_back(s.insert_noAdjust(Node(t, 0.3f)));
  };
  refill();
  std::size_t i = 0;
  for (auto _ : state) {
    s.erase(added[i]);
    if (++i == added.size()) {
      state.PauseTiming();
      refill();
      i = 0;
      state.ResumeTiming();
    }
  }
  perLog(state, n);
}

void BM_StoreGetLevelAtTime(benchmark::State& state) {
  const long n = state.range(0);
  Store s;
  build(s, n);
  const std::vector<double> times = freshTimes(n, 4096, 3);
  std::size_t i = 0;
  float sum = 0.0f;
  for (auto _ : state) {
    sum += s.getLevelAtTime(times[i]);
    i = (i + 1) & 4095;
  }
  benchmark::DoNotOptimize(sum);
  perLog(state, n);
}

// Queries in time order over a stretch of 1024 nodes, as playback and
// drawing make them: the paths down the tree stay in cache, which isolates
// the logarithmic part from the memory latency of random lookups.
void BM_StoreGetLevelAtTimeInOrder(benchmark::State& state) {
  const long n = state.range(0);
  Store s;
  build(s, n);
  std::vector<double> times(4096);
  for (std::size_t k = 0; k < times.size(); ++k) times[k] = static_cast<double>(n / 2) + 0.25 * k;
  std::size_t i = 0;
  float sum = 0.0f;
  for (auto _ : state) {
    sum += s.getLevelAtTime(times[i]);
    i = (i + 1) & 4095;
  }
  benchmark::DoNotOptimize(sum);
  perLog(state, n);
}

// The baseline's rule: gain from a ramp built by repeated addition.
__attribute__((noinline)) void rampLoop(float* x, std::size_t n, float g, float d) {
  for (std::size_t i = 0; i < n; ++i) {
    x[i] *= g;
    g += d;
  }
}

__attribute__((noinline)) void closedFormRamp(float* x, std::size_t n, float g, float d) {
  const int count = static_cast<int>(n);
  for (int i = 0; i < count; ++i) x[i] *= g + static_cast<float>(i) * d;
}

void BM_ApplyReadyIterator(benchmark::State& state) {
  constexpr std::size_t kSamples = 1 << 20;
  constexpr std::size_t kBlock = 1024;
  constexpr double kRate = 48000.0;
  Store s;
  const double span = static_cast<double>(kSamples) / kRate;
  for (int i = 0; i < 1000; ++i)
    s.insert(Node(span * i / 1000.0, 0.5f + 0.5f * static_cast<float>((i * 7919) % 1000) / 1000.0f));
  std::vector<float> source(kSamples), work(kSamples);
  std::mt19937 rng(4);
  std::uniform_real_distribution<float> sample(-1.0f, 1.0f);
  for (float& x : source) x = sample(rng);

  // The machine is shared: each figure is the fastest pass, the one least
  // disturbed by other work.
  double ours = 1e300, plain = 1e300, closed = 1e300;
  const auto nanos = [](Clock::time_point a, Clock::time_point b) {
    return std::chrono::duration<double, std::nano>(b - a).count();
  };
  DynamicLevelApplyingIterator it;
  for (auto _ : state) {
    std::copy(source.begin(), source.end(), work.begin());
    auto t0 = Clock::now();
    it.configureForwards(&s, kRate, 0.0);
    for (std::size_t at = 0; at < kSamples; at += kBlock) it.apply(work.data() + at, kBlock);
    auto t1 = Clock::now();
    benchmark::DoNotOptimize(work.data());
    ours = std::min(ours, nanos(t0, t1));
    state.SetIterationTime(std::chrono::duration<double>(t1 - t0).count());

    std::copy(source.begin(), source.end(), work.begin());
    t0 = Clock::now();
    rampLoop(work.data(), kSamples, 0.5f, 0.5f / kSamples);
    t1 = Clock::now();
    benchmark::DoNotOptimize(work.data());
    plain = std::min(plain, nanos(t0, t1));

    std::copy(source.begin(), source.end(), work.begin());
    t0 = Clock::now();
    closedFormRamp(work.data(), kSamples, 0.5f, 0.5f / kSamples);
    t1 = Clock::now();
    benchmark::DoNotOptimize(work.data());
    closed = std::min(closed, nanos(t0, t1));
  }
  state.counters["ns_per_sample"] = ours / kSamples;
  state.counters["baseline_ns_per_sample"] = plain / kSamples;
  state.counters["ratio"] = ours / plain;
  state.counters["vs_closed_form"] = ours / closed;
}

}  // namespace

BENCHMARK(BM_StoreInsert)->RangeMultiplier(10)->Range(1000, 1000000);
BENCHMARK(BM_StoreErase)->RangeMultiplier(10)->Range(1000, 1000000);
BENCHMARK(BM_StoreGetLevelAtTime)->RangeMultiplier(10)->Range(1000, 1000000);
BENCHMARK(BM_StoreGetLevelAtTimeInOrder)->RangeMultiplier(10)->Range(1000, 1000000);
BENCHMARK(BM_ApplyReadyIterator)->UseManualTime()->Unit(benchmark::kMicrosecond);

BENCHMARK_MAIN();
