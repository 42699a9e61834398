// The mixing kernels against their baselines, all in one run, on a
// cache-resident block (4096 samples) and on a block far beyond the caches
// (4 Mi samples):
//   - every sample kernel against a plain loop of the same arithmetic built
//     -O3 -march=native with restrict pointers ("plain"): speed ratio
//     plain time / kernel time, wanted at least 0.9 at 4096;
//   - at 4 Mi, against memcpy of the destination bytes (of the source for
//     PeakScan, which writes none): time ratio, wanted at most 1.2;
//   - the ramps against a bare serial loop of as many float additions, their
//     dependency limit: time ratio, wanted at most 1.3.
// The table at the end gives the ratios; they are also counters of each
// benchmark.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <map>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "support/mixrender_plain.h"
#include "tonebits/dsp/Aud__MixRender.h"
#include "tonebits/foundation/Aud__Simd.h"

namespace {

namespace MR = Aud::MixRender;

constexpr std::size_t kSmall = 4096;
constexpr std::size_t kLarge = std::size_t(4) << 20;
constexpr float kGain = 0.7f, kGainB = -0.35f, kDelta = 1e-7f;

struct Buffer {
  explicit Buffer(std::size_t n) : data(static_cast<float*>(std::aligned_alloc(64, n * sizeof(float)))) {
    std::mt19937 rng(7);
    std::uniform_real_distribution<float> d(-1.0f, 1.0f);
    for (std::size_t i = 0; i < n; ++i) data.get()[i] = d(rng);
  }
  struct Free {
    void operator()(float* p) const { std::free(p); }
  };
  std::unique_ptr<float, Free> data;
  float* get() const { return data.get(); }
};

struct Buffers {
  explicit Buffers(std::size_t n) : src(n), a(n), b(n) {}
  Buffer src, a, b;
};

Buffers& buffersFor(std::size_t n) {
  static Buffers small(kSmall), large(kLarge);
  return n == kSmall ? small : large;
}

struct Kernel {
  const char* name;
  int destinations;  // bytes memcpy is given, in blocks of n samples
  bool ramp;
  void (*library)(Buffers&, unsigned quads, float& peak);
  void (*plain)(Buffers&, std::size_t n, float& peak);
};

const Kernel kKernels[] = {
    {"PeakScan", 1, false, [](Buffers& b, unsigned q, float& p) { MR::PeakScan(b.src.get(), q, &p); },
     [](Buffers& b, std::size_t n, float& p) { p = plain::peak(b.src.get(), n, p); }},
    {"MultiplyConstant", 1, false,
     [](Buffers& b, unsigned q, float&) { MR::MultiplyConstant(b.src.get(), b.a.get(), q, kGain); },
     [](Buffers& b, std::size_t n, float&) { plain::mul(b.src.get(), b.a.get(), n, kGain); }},
    {"MultiplyConstantWithPrePeakScan", 1, false,
     [](Buffers& b, unsigned q, float& p) {
       MR::MultiplyConstantWithPrePeakScan(b.src.get(), b.a.get(), q, kGain, &p);
     },
     [](Buffers& b, std::size_t n, float& p) { p = plain::mulPeak(b.src.get(), b.a.get(), n, kGain, p); }},
    {"Add", 1, false, [](Buffers& b, unsigned q, float&) { MR::Add(b.src.get(), b.a.get(), q); },
     [](Buffers& b, std::size_t n, float&) { plain::add(b.src.get(), b.a.get(), n); }},
    {"MultiplyConstantAndAdd", 1, false,
     [](Buffers& b, unsigned q, float&) { MR::MultiplyConstantAndAdd(b.src.get(), b.a.get(), q, kGain); },
     [](Buffers& b, std::size_t n, float&) { plain::mulAdd(b.src.get(), b.a.get(), n, kGain); }},
    {"MultiplyConstantAndAdd2", 2, false,
     [](Buffers& b, unsigned q, float&) {
       MR::MultiplyConstantAndAdd2(b.src.get(), b.a.get(), b.b.get(), q, kGain, kGainB);
     },
     [](Buffers& b, std::size_t n, float&) {
       plain::mulAdd2(b.src.get(), b.a.get(), b.b.get(), n, kGain, kGainB);
     }},
    {"MultiplyConstantAndAddWithPrePeakScan", 1, false,
     [](Buffers& b, unsigned q, float& p) {
       MR::MultiplyConstantAndAddWithPrePeakScan(b.src.get(), b.a.get(), q, kGain, &p);
     },
     [](Buffers& b, std::size_t n, float& p) { p = plain::mulAddPeak(b.src.get(), b.a.get(), n, kGain, p); }},
    {"MultiplyWithDelta", 1, true,
     [](Buffers& b, unsigned q, float&) { MR::MultiplyWithDelta(b.src.get(), b.a.get(), q, kGain, kDelta); },
     [](Buffers& b, std::size_t n, float&) { plain::ramp(b.src.get(), b.a.get(), n, kGain, kDelta); }},
    {"MultiplyWithDeltaAndAdd", 1, true,
     [](Buffers& b, unsigned q, float&) {
       MR::MultiplyWithDeltaAndAdd(b.src.get(), b.a.get(), q, kGain, kDelta);
     },
     [](Buffers& b, std::size_t n, float&) { plain::rampAdd(b.src.get(), b.a.get(), n, kGain, kDelta); }},
};

std::string key(const char* kernel, std::size_t n) { return std::string(kernel) + "/" + std::to_string(n); }

// The best (smallest) time of one call of each contestant. They run in turn
// within every benchmark iteration, so a moment of load on this shared
// machine touches all of them alike, and the minimum over many turns is each
// one's undisturbed speed.
struct Times {
  double kernel = 1e300, plain = 1e300, memcpy = 1e300, serial = 1e300;
};
std::map<std::string, Times> results;

// Short batches read the wall clock. A call on the large block lasts about
// as long as the scheduler's time slice on this shared machine, so it reads
// the thread's CPU clock, which stops while other processes run.
double nowNs(bool cpuClock) {
  if (cpuClock) {
    timespec t;
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &t);
    return double(t.tv_sec) * 1e9 + double(t.tv_nsec);
  }
  return std::chrono::duration<double, std::nano>(std::chrono::steady_clock::now().time_since_epoch())
      .count();
}

template <class F>
double timeCalls(int calls, bool cpuClock, F&& f) {
  const double t0 = nowNs(cpuClock);
  for (int c = 0; c < calls; ++c) {
    f();
    benchmark::ClobberMemory();
  }
  return (nowNs(cpuClock) - t0) / calls;
}

void contest(benchmark::State& state, const Kernel& k, std::size_t n) {
  Buffers& b = buffersFor(n);
  const int calls = n == kSmall ? 16 : 1;  // a batch is long enough for the clock
  const bool cpuClock = n == kLarge;
  float peak = 0.0f;
  Times best;
  for (auto _ : state) {
    const double kernel = timeCalls(calls, cpuClock, [&] { k.library(b, unsigned(n / 4), peak); });
    state.SetIterationTime(kernel * 1e-9);
    best.kernel = std::min(best.kernel, kernel);
    best.plain = std::min(best.plain, timeCalls(calls, cpuClock, [&] { k.plain(b, n, peak); }));
    if (n == kLarge)
      best.memcpy = std::min(best.memcpy, timeCalls(calls, cpuClock, [&] {
                               std::memcpy(b.a.get(), b.src.get(), n * sizeof(float));
                               if (k.destinations == 2)
                                 std::memcpy(b.b.get(), b.src.get(), n * sizeof(float));
                             }));
    if (k.ramp)
      best.serial = std::min(best.serial, timeCalls(calls, cpuClock, [&] {
                               benchmark::DoNotOptimize(plain::serialAdds(n, kGain, kDelta));
                             }));
    benchmark::DoNotOptimize(peak);
  }
  state.counters["plain/kernel"] = best.plain / best.kernel;
  if (n == kLarge) state.counters["kernel/memcpy"] = best.kernel / best.memcpy;
  if (k.ramp) state.counters["kernel/serial"] = best.kernel / best.serial;
  results[key(k.name, n)] = best;
}

void registerAll() {
  for (const Kernel& k : kKernels)
    for (std::size_t n : {kSmall, kLarge})
      benchmark::RegisterBenchmark(key(k.name, n).c_str(),
                                   [&k, n](benchmark::State& state) { contest(state, k, n); })
          ->UseManualTime()
          ->Unit(benchmark::kNanosecond)
          ->Iterations(n == kSmall ? 4000 : 40);
}

void printRatios() {
  std::printf("\nMixRender at level %s: best ns per call; speed = plain time / kernel time\n",
              Aud::Simd::levelName(Aud::Simd::activeLevel()));
  std::printf("%-38s %8s %11s %11s %7s %14s %14s\n", "kernel", "samples", "kernel ns", "plain ns", "speed",
              "kernel/memcpy", "kernel/serial");
  for (const Kernel& k : kKernels) {
    for (std::size_t n : {kSmall, kLarge}) {
      const auto it = results.find(key(k.name, n));
      if (it == results.end()) continue;
      const Times& t = it->second;
      std::printf("%-38s %8zu %11.1f %11.1f %6.2fx", k.name, n, t.kernel, t.plain, t.plain / t.kernel);
      if (n == kLarge) {
        std::printf(" %14.2f", t.kernel / t.memcpy);
      } else {
        std::printf(" %14s", "");
      }
      if (k.ramp) std::printf(" %14.2f", t.kernel / t.serial);
      std::printf("\n");
    }
  }
  std::printf(
      "wanted: speed >= 0.9 at %zu; kernel/memcpy <= 1.2 at %zu (sample kernels); "
      "kernel/serial <= 1.3 (ramps)\n",
      kSmall, kLarge);
}

}  // namespace

int main(int argc, char** argv) {
  registerAll();
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
  printRatios();
  benchmark::Shutdown();
  return 0;
}
