// Metering costs: the input monitor's pass over a captured block against a
// memcpy of the same bytes measured in the same loop (counter vs_memcpy), a
// peak write by the number of readers on the point, and a meter's poll.
#include <benchmark/benchmark.h>

#include <chrono>
#include <cstring>
#include <random>
#include <vector>

#include "host/Ptr.h"
#include "tonebits/foundation/Aud__SampleConversion.h"
#include "tonebits/foundation/Aud__Simd.h"
#include "tonebits/metering/Aud__Monitor.h"
#include "tonebits/metering/Aud__MonitoringPoint.h"
#include "tonebits/metering/Aud__MonitoringPointManager.h"

namespace {

constexpr unsigned kSamples = 1u << 20;  // per channel
constexpr unsigned kChannels = 2;

class BenchMonitor : public Aud::Monitor {
 public:
  virtual ~BenchMonitor() = default;
  using Aud::Monitor::registerMonitoringPoints;
  using Aud::Monitor::updateMonitoringPoints;
};

Aud::StreamBufferList stereoBlock(int type) {
  std::mt19937 rng(7);
  std::uniform_real_distribution<float> sample(-0.9f, 0.9f);
  const unsigned bytes = Aud::bytesPerSampleOfType(type);
  Aud::StreamBufferList list;
  for (unsigned c = 0; c < kChannels; ++c) {
    Aud::StreamBuffer b(0, kSamples, type);
    b.buffer = Kv::Ptr<iMemHolder>(new ByteBufferImpl(std::size_t(kSamples) * bytes));
    for (unsigned i = 0; i < kSamples; ++i)
      Aud::sampleFromFloat(type, sample(rng), b.getBuffer() + i * bytes);
    b.valid = true;
    list.buffers.push_back(b);
  }
  list.numSamples = kSamples;
  list.sampleType = type;
  return list;
}

// Args: sample type, SIMD level (clamped to what the CPU has).
void BM_UpdateMonitoringPoints(benchmark::State& state) {
  const int type = int(state.range(0));
  const Aud::Simd::eLevel saved = Aud::Simd::activeLevel();
  const Aud::Simd::eLevel level = Aud::Simd::setActiveLevel(Aud::Simd::eLevel(state.range(1)));
  state.SetLabel(Aud::Simd::levelName(level));

  BenchMonitor monitor;
  monitor.registerMonitoringPoints(kChannels);
  Aud::MonitoringPointReader meter(monitor.getInputMonitoringPointId(0));
  Aud::StreamBufferList block = stereoBlock(type);
  const std::size_t channelBytes = std::size_t(kSamples) * Aud::bytesPerSampleOfType(type);
  std::vector<unsigned char> copy(channelBytes * kChannels);

  // Both are timed by hand as well, in turn, so the ratio compares them
  // under the same cache and clock conditions.
  using Clock = std::chrono::steady_clock;
  Clock::duration inUpdate{}, inMemcpy{};
  for (auto _ : state) {
    const auto start = Clock::now();
    monitor.updateMonitoringPoints(block);
    const auto updated = Clock::now();
    state.PauseTiming();
    for (unsigned c = 0; c < kChannels; ++c) {
      std::memcpy(copy.data() + c * channelBytes, block.buffers[c].getBuffer(), channelBytes);
    }
    benchmark::ClobberMemory();
    inUpdate += updated - start;
    inMemcpy += Clock::now() - updated;
    state.ResumeTiming();
  }
  benchmark::DoNotOptimize(meter.peakValue(true));
  state.SetBytesProcessed(int64_t(state.iterations()) * int64_t(channelBytes * kChannels));
  const double n = double(state.iterations());
  const double updateUs = std::chrono::duration<double, std::micro>(inUpdate).count() / n;
  const double memcpyUs = std::chrono::duration<double, std::micro>(inMemcpy).count() / n;
  state.counters["update_us"] = updateUs;
  state.counters["memcpy_us"] = memcpyUs;
  state.counters["vs_memcpy"] = updateUs / memcpyUs;
  Aud::Simd::setActiveLevel(saved);
}

void updateArgs(benchmark::internal::Benchmark* b) {
  for (int type : {0, 1, 2, 5}) {
    for (int level : {Aud::Simd::eScalar, Aud::Simd::eSSE2, Aud::Simd::eAVX2}) b->Args({type, level});
  }
}

// A peak write fans out to every subscription of the point.
void BM_PeakWrite(benchmark::State& state) {
  Aud::MonitoringPointInfo info;
  IdStamp pointId, writerId;
  Aud::MonitoringPointManager::registerMP(info, pointId, writerId);
  std::vector<Aud::MonitoringPointReader> readers;
  readers.reserve(std::size_t(state.range(0)));
  for (int r = 0; r < state.range(0); ++r) readers.emplace_back(pointId);
  Aud::MonitoringPointWriter writer(writerId);
  float peak = 0.0f;
  for (auto _ : state) {
    writer.updatePeakSampleValue(peak);
    peak = peak < 1.0f ? peak + 0x1p-10f : 0.0f;
  }
  Aud::MonitoringPointManager::unregisterMP(writerId);
}

// A meter's timer: a resetting read of the peak and of the clip flag, with
// the audio side writing between polls as it would.
void BM_MeterPoll(benchmark::State& state) {
  Aud::MonitoringPointInfo info;
  IdStamp pointId, writerId;
  Aud::MonitoringPointManager::registerMP(info, pointId, writerId);
  Aud::MonitoringPointReader meter(pointId);
  Aud::MonitoringPointWriter(writerId).updatePeakSampleValue(0.5f);
  for (auto _ : state) {
    benchmark::DoNotOptimize(meter.peakValue(true));
    benchmark::DoNotOptimize(meter.hasClipped(true));
  }
  Aud::MonitoringPointManager::unregisterMP(writerId);
}

}  // namespace

BENCHMARK(BM_UpdateMonitoringPoints)->Apply(updateArgs)->Unit(benchmark::kMicrosecond)->UseRealTime();
BENCHMARK(BM_PeakWrite)->Arg(0)->Arg(1)->Arg(8);
BENCHMARK(BM_MeterPoll);

BENCHMARK_MAIN();
