// Mixer state persistence for a mixer of 64 inputs, 16 mixes and 32 outputs:
// pack and unpack through an object stream, store and retrieve through an
// INI file (in memory, and saved to and loaded from a real file). Each
// benchmark reports its time in microseconds and, as x_memcpy, its ratio to
// a memcpy of the packed bytes (resp. the INI text) timed in the same run.
#include <benchmark/benchmark.h>

#include <cstdio>
#include <cstring>
#include <ctime>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "host/IniFile.h"
#include "host/ObjectStream.h"
#include "tonebits/mixer/Aud__SimpleMixState.h"

namespace {

// The machine is shared: time by this thread's CPU time, not the wall.
double threadNs() {
  timespec t;
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &t);
  return static_cast<double>(t.tv_sec) * 1e9 + static_cast<double>(t.tv_nsec);
}

Aud::SimpleMixState makeState() {
  Aud::SimpleMixState s(64, 16, 32);
  std::mt19937 rng(1);
  std::uniform_real_distribution<float> u(0.0f, 1.5f);
  std::bernoulli_distribution coin(0.3);
  for (int i = 0; i < 64; ++i) {
    s.setInputLevel(i, u(rng));
    s.setInputPan(i, u(rng) / 1.5f);
    for (int m = -1; m < 16; ++m) s.setInputRoutedToMix(i, m, coin(rng));
  }
  for (int m = -1; m < 16; ++m) {
    s.setMixLevel(m, u(rng));
    for (int o = -2; o < 32; ++o) s.setMixRoutedToOutput(m, o, coin(rng), coin(rng));
  }
  return s;
}

// Nanoseconds for one memcpy of n bytes, measured now.
double memcpyNs(std::size_t n) {
  std::vector<char> from(n, 'x'), to(n);
  const int rounds = 20000;
  const double start = threadNs();
  for (int k = 0; k < rounds; ++k) {
    benchmark::DoNotOptimize(from.data());
    std::memcpy(to.data(), from.data(), n);
    benchmark::ClobberMemory();
  }
  return (threadNs() - start) / rounds;
}

template <class Body>
void run(benchmark::State& state, std::size_t baselineBytes, Body body) {
  const double start = threadNs();
  for (auto _ : state) body();
  const double ns = (threadNs() - start) / static_cast<double>(state.iterations());
  state.counters["us"] = ns / 1000.0;
  state.counters["x_memcpy"] = ns / memcpyNs(baselineBytes);
  state.counters["bytes"] = static_cast<double>(baselineBytes);
}

StreamFile::Bytes packedBytes(const Aud::SimpleMixState& s) {
  PStream p;
  s.STRM_hierarchyPack(p);
  return p.contents();
}

void BM_Pack(benchmark::State& state) {
  const Aud::SimpleMixState s = makeState();
  run(state, packedBytes(s).size(), [&] {
    PStream p;
    s.STRM_hierarchyPack(p);
    benchmark::DoNotOptimize(p.size());
  });
}

void BM_Unpack(benchmark::State& state) {
  const StreamFile::Bytes bytes = packedBytes(makeState());
  run(state, bytes.size(), [&] {
    PStream p(bytes.data(), bytes.size());
    std::unique_ptr<Streamable> back(Aud::SimpleMixState::STRM_L_SimpleMixState_builder(p));
    benchmark::DoNotOptimize(back.get());
  });
}

void BM_StoreIni(benchmark::State& state) {
  Aud::SimpleMixState s = makeState();
  KvIniFile f;
  s.storeCompatibleConfigurationInformation(f);
  run(state, f.text().size(), [&] {
    s.storeCompatibleConfigurationInformation(f);
    benchmark::DoNotOptimize(&f);
  });
}

void BM_RetrieveIni(benchmark::State& state) {
  Aud::SimpleMixState s = makeState(), back(64, 16, 32);
  KvIniFile f;
  s.storeCompatibleConfigurationInformation(f);
  run(state, f.text().size(), [&] {
    back.retrieveCompatibleConfigurationInformation(f);
    benchmark::DoNotOptimize(&back);
  });
}

void BM_StoreSaveLoadRetrieveIniFile(benchmark::State& state) {
  Aud::SimpleMixState s = makeState(), back(64, 16, 32);
  const std::string path = "/tmp/bench_mixstate.ini";
  KvIniFile probe;
  s.storeCompatibleConfigurationInformation(probe);
  run(state, probe.text().size(), [&] {
    KvIniFile out, in;
    s.storeCompatibleConfigurationInformation(out);
    out.save(path.c_str());
    in.load(path.c_str());
    back.retrieveCompatibleConfigurationInformation(in);
    benchmark::DoNotOptimize(&back);
  });
  std::remove(path.c_str());
}

}  // namespace

BENCHMARK(BM_Pack)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_Unpack)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_StoreIni)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_RetrieveIni)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_StoreSaveLoadRetrieveIniFile)->Unit(benchmark::kMicrosecond);
BENCHMARK_MAIN();
