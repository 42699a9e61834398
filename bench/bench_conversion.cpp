// Block sample conversions against memcpy of the same bytes.
//
// Each benchmark converts 1 Mi samples of one type in one direction at one
// instruction-set level. Every iteration first copies the larger of the
// source and destination byte counts between the same two buffers with
// memcpy, then converts, timing both; the reported time is the conversion's.
// Times are the thread's CPU time, so that time spent descheduled on a busy
// machine is not counted against either side. Counters: ratio = total
// conversion time / total memcpy time; ratio_median = the median over
// iterations of conversion / memcpy (steadier on a busy machine); memcpy_us =
// the baseline's mean time.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <random>
#include <vector>

#include <time.h>

#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/foundation/Aud__Simd.h"

namespace {

constexpr std::size_t kSamples = std::size_t(1) << 20;
constexpr std::size_t kBufferBytes = kSamples * 8;  // the widest form, double

struct FreeDeleter {
  void operator()(unsigned char* p) const noexcept { std::free(p); }
};
using Buffer = std::unique_ptr<unsigned char, FreeDeleter>;

double threadSeconds() noexcept {
  timespec ts;
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &ts);
  return double(ts.tv_sec) + double(ts.tv_nsec) * 1e-9;
}

Buffer makeBuffer() {
  Buffer b(static_cast<unsigned char*>(std::aligned_alloc(64, kBufferBytes)));
  std::memset(b.get(), 0, kBufferBytes);  // fault the pages in before timing
  return b;
}

// Samples in the signal range, for either side of a conversion.
void fillSource(unsigned char* src, int type, bool toFloat) {
  std::mt19937 rng(1);
  std::uniform_real_distribution<float> signal(-1.1f, 1.1f);
  if (!toFloat || type == 0 || type == 7) {
    for (std::size_t i = 0; i < kSamples; ++i) {
      const float v = signal(rng);
      std::memcpy(src + 4 * i, &v, 4);
    }
  } else if (type == 8) {
    for (std::size_t i = 0; i < kSamples; ++i) {
      const double v = signal(rng);
      std::memcpy(src + 8 * i, &v, 8);
    }
  } else {
    for (std::size_t i = 0; i < kBufferBytes; ++i) src[i] = static_cast<unsigned char>(rng());
  }
}

void BM_Conversion(benchmark::State& state) {
  const int type = static_cast<int>(state.range(0));
  const bool toFloat = state.range(1) != 0;
  const auto level = static_cast<Aud::Simd::eLevel>(state.range(2));
  if (level > Aud::Simd::supportedLevel()) {
    state.SkipWithError("level not supported on this CPU");
    return;
  }
  const Aud::Simd::eLevel saved = Aud::Simd::activeLevel();
  Aud::Simd::setActiveLevel(level);

  static const Buffer src = makeBuffer(), dst = makeBuffer();
  fillSource(src.get(), type, toFloat);
  const std::size_t stored = kSamples * Aud::bytesPerSampleOfType(type), floats = kSamples * 4;
  const std::size_t copyBytes = std::max(stored, floats);

  double convTotal = 0, copyTotal = 0;
  std::vector<double> ratios;
  ratios.reserve(1 << 16);
  for (auto _ : state) {
    const double t0 = threadSeconds();
    std::memcpy(dst.get(), src.get(), copyBytes);
    benchmark::ClobberMemory();
    const double t1 = threadSeconds();
    const bool ok =
        toFloat ? Aud::convertToFloat(type, src.get(), reinterpret_cast<float*>(dst.get()), kSamples)
                : Aud::convertFromFloat(type, reinterpret_cast<const float*>(src.get()), dst.get(), kSamples);
    benchmark::DoNotOptimize(ok);
    benchmark::ClobberMemory();
    const double t2 = threadSeconds();
    state.SetIterationTime(t2 - t1);
    convTotal += t2 - t1;
    copyTotal += t1 - t0;
    if (t1 > t0) ratios.push_back((t2 - t1) / (t1 - t0));
  }
  std::nth_element(ratios.begin(), ratios.begin() + ratios.size() / 2, ratios.end());
  state.counters["memcpy_us"] = copyTotal / double(state.iterations()) * 1e6;
  state.counters["ratio"] = convTotal / copyTotal;
  state.counters["ratio_median"] = ratios.empty() ? 0.0 : ratios[ratios.size() / 2];
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * copyBytes));
  state.SetLabel(Aud::Simd::levelName(level));
  Aud::Simd::setActiveLevel(saved);
}

BENCHMARK(BM_Conversion)
    ->ArgsProduct({{0, 1, 2, 3, 4, 5, 6, 7, 8},
                   {1, 0},
                   {Aud::Simd::eScalar, Aud::Simd::eSSE2, Aud::Simd::eAVX2}})
    ->ArgNames({"type", "to_float", "level"})
    ->UseManualTime()
    ->Unit(benchmark::kMicrosecond);

}  // namespace

BENCHMARK_MAIN();
