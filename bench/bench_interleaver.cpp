// The interleaver's hot paths against memcpy of the same number of source
// bytes, timed alternately in the same run. The "vs_memcpy" counter is
// (time of the operation) / (time of the memcpy); the benchmark's own time
// is the operation's. Both are the thread's CPU time, so that time spent
// descheduled on a busy machine counts for neither.
//
// Inbound runs in the steady state (the list's blocks are reused), as a
// capture or import loop runs it. Each case runs at every instruction-set
// level the CPU supports.
#include <benchmark/benchmark.h>

#include <time.h>

#include <cstring>
#include <random>
#include <vector>

#include "host/Ptr.h"
#include "tonebits/foundation/Aud__Interleaver.h"
#include "tonebits/foundation/Aud__Simd.h"

namespace {

constexpr unsigned kSamples = 1u << 20;  // per channel

double threadSeconds() {
  timespec t;
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &t);
  return double(t.tv_sec) + 1e-9 * double(t.tv_nsec);
}

std::vector<unsigned char> randomBytes(std::size_t n) {
  std::mt19937 rng(42);
  std::vector<unsigned char> b(n);
  for (auto& x : b) x = static_cast<unsigned char>(rng());
  return b;
}

template <class Op>
void timeAgainstMemcpy(benchmark::State& state, std::size_t bytes, Op op) {
  std::vector<unsigned char> from = randomBytes(bytes), to(bytes);
  op();  // warm up: buffers made, pages touched
  std::memcpy(to.data(), from.data(), bytes);
  double opSeconds = 0, copySeconds = 0;
  for (auto _ : state) {
    const double t0 = threadSeconds();
    std::memcpy(to.data(), from.data(), bytes);
    benchmark::ClobberMemory();
    const double t1 = threadSeconds();
    op();
    benchmark::ClobberMemory();
    const double t2 = threadSeconds();
    copySeconds += t1 - t0;
    opSeconds += t2 - t1;
    state.SetIterationTime(t2 - t1);
  }
  state.counters["vs_memcpy"] = opSeconds / copySeconds;
  state.SetBytesProcessed(int64_t(state.iterations()) * int64_t(bytes));
}

void setLevel(benchmark::State& state) {
  const auto wanted = static_cast<Aud::Simd::eLevel>(state.range(0));
  if (Aud::Simd::setActiveLevel(wanted) != wanted) state.SkipWithError("level not supported");
  state.SetLabel(Aud::Simd::levelName(wanted));
}

void deinterleave(benchmark::State& state, unsigned channels, int sampleType) {
  setLevel(state);
  AudioInterleaver il(sampleType, channels, Aud::eDataTypePCM);
  const std::size_t bytes = std::size_t(kSamples) * channels * il.getAudioFormat().getStride();
  Kv::Ptr<iMemHolder> src(new ByteBufferImpl(bytes));
  const std::vector<unsigned char> data = randomBytes(bytes);
  std::memcpy(src->getBuffer(), data.data(), bytes);
  Aud::StreamBufferList out;
  timeAgainstMemcpy(state, bytes, [&] { benchmark::DoNotOptimize(il.deinterleaveAudio(src, out)); });
}

void writePlanar(benchmark::State& state, unsigned channels, int sampleType) {
  setLevel(state);
  AudioInterleaver il(sampleType, channels, Aud::eDataTypePCM);
  const std::size_t planeBytes = std::size_t(kSamples) * il.getAudioFormat().getStride();
  std::vector<std::vector<unsigned char>> planes;
  std::vector<const unsigned char*> pointers;
  for (unsigned c = 0; c < channels; ++c) planes.push_back(randomBytes(planeBytes));
  for (const auto& p : planes) pointers.push_back(p.data());
  timeAgainstMemcpy(state, planeBytes * channels,
                    [&] { benchmark::DoNotOptimize(il.writeSamplesPlanar(pointers, kSamples)); });
}

void BM_DeinterleaveStereo16(benchmark::State& state) { deinterleave(state, 2, 1); }
void BM_DeinterleaveStereo24Packed(benchmark::State& state) { deinterleave(state, 2, 2); }
void BM_Deinterleave8ch24in32(benchmark::State& state) { deinterleave(state, 8, 5); }
void BM_WritePlanarStereo16(benchmark::State& state) { writePlanar(state, 2, 1); }
void BM_WritePlanarStereo24(benchmark::State& state) { writePlanar(state, 2, 2); }
// For comparison: a type whose samples do go through the float round trip.
void BM_WritePlanarStereo24in32(benchmark::State& state) { writePlanar(state, 2, 5); }

void levels(benchmark::internal::Benchmark* b) {
  for (int l = Aud::Simd::eScalar; l <= Aud::Simd::supportedLevel(); ++l) b->Arg(l);
  b->UseManualTime()->Unit(benchmark::kMicrosecond);
}

BENCHMARK(BM_DeinterleaveStereo16)->Apply(levels);
BENCHMARK(BM_DeinterleaveStereo24Packed)->Apply(levels);
BENCHMARK(BM_Deinterleave8ch24in32)->Apply(levels);
BENCHMARK(BM_WritePlanarStereo16)->Apply(levels);
BENCHMARK(BM_WritePlanarStereo24)->Apply(levels);
BENCHMARK(BM_WritePlanarStereo24in32)->Apply(levels);

}  // namespace

BENCHMARK_MAIN();
