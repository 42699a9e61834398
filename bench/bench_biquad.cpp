// Filter speed, each path beside a baseline measured in the same run; the
// ratios are printed at the end.
//
//   processBlock vs processSample called per sample, vs a plain loop of the
//   same arithmetic (one band after another per sample, history in locals,
//   compiled here), and vs memcpy of the same bytes;
//   the multichannel forms for a stereo three-band equaliser vs the two
//   channels run one after the other, at every SIMD level the CPU has;
//   a tail decaying through the denormal range vs the same filter on normal
//   values, with and without ScopedNoDenormals.
#include <benchmark/benchmark.h>

#include <cmath>
#include <cstdio>
#include <cstring>
#include <map>
#include <random>
#include <string>
#include <vector>

#include "tonebits/dsp/Aud__Biquad.h"
#include "tonebits/dsp/Aud__MultiBandBiquad.h"
#include "tonebits/dsp/Aud__ScopedNoDenormals.h"
#include "tonebits/foundation/Aud__Simd.h"

namespace {

using Aud::Filter::Biquad;
using Aud::Filter::MultiBandBiquad;
using Shape = Biquad::ShapeDescriptor;

constexpr unsigned kSmall = 4096;
constexpr unsigned kLarge = 4u << 20;

std::vector<float> noise(size_t n, uint32_t seed = 1) {
  std::mt19937 rng(seed);
  std::uniform_real_distribution<float> d(-1.0f, 1.0f);
  std::vector<float> v(n);
  for (float& x : v) x = d(rng);
  return v;
}

Biquad lowPass() { return Biquad(Biquad::LowPass, 1000.0f, 48000.0f, Shape(Shape::Q, 0.7071f), 0.0, true); }

template <unsigned N>
MultiBandBiquad<N> equaliser() {
  MultiBandBiquad<N> eq;
  const Biquad::eFilterType types[] = {Biquad::LowShelf, Biquad::PeakingEQ, Biquad::PeakingEQ,
                                       Biquad::PeakingEQ, Biquad::HighShelf};
  const float frequencies[] = {120.0f, 500.0f, 2500.0f, 6000.0f, 9000.0f};
  for (unsigned k = 0; k < N; ++k) {
    const Biquad::eFilterType type = k == N - 1 ? Biquad::HighShelf : types[k];
    const Shape shape = type == Biquad::PeakingEQ ? Shape(Shape::Q, 1.2f) : Shape(Shape::S, 1.0f);
    eq.getBand(k).configure(type, frequencies[k], 48000.0f, shape, k % 2 ? -4.5 : 3.0);
    eq.getBand(k).setActive(true);
  }
  return eq;
}

void perSample(benchmark::State& state, size_t samples) {
  state.SetItemsProcessed(int64_t(state.iterations() * samples));
  state.counters["ns/sample"] = benchmark::Counter(double(state.iterations() * samples) * 1e-9,
                                                   benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
}

// ---- baselines ----

void BM_Memcpy(benchmark::State& state) {
  const unsigned n = unsigned(state.range(0));
  std::vector<float> in = noise(n), out(n);
  for (auto _ : state) {
    std::memcpy(out.data(), in.data(), n * sizeof(float));
    benchmark::DoNotOptimize(out.data());
    benchmark::ClobberMemory();
  }
  perSample(state, n);
}
BENCHMARK(BM_Memcpy)->Arg(kSmall)->Arg(kLarge);

// The cascade as one would first write it: per sample, band after band, the
// history in locals. Same arithmetic, same bits.
template <unsigned N>
void plainCascade(const float (*c)[5], float (*h)[4], const float* in, float* out, unsigned n) {
  float s[N][4];
  std::memcpy(s, h, sizeof(s));
  for (unsigned i = 0; i < n; ++i) {
    float x = in[i];
    for (unsigned k = 0; k < N; ++k) {
      const float y =
          (((c[k][0] * x + c[k][1] * s[k][0]) + c[k][2] * s[k][1]) - c[k][3] * s[k][2]) - c[k][4] * s[k][3];
      s[k][1] = s[k][0];
      s[k][0] = x;
      s[k][3] = s[k][2];
      s[k][2] = y;
      x = y;
    }
    out[i] = x;
  }
  std::memcpy(h, s, sizeof(s));
}

template <unsigned N>
void BM_PlainLoop(benchmark::State& state) {
  const unsigned n = unsigned(state.range(0));
  std::vector<float> in = noise(n), out(n);
  float c[N][5], h[N][4] = {};
  for (unsigned k = 0; k < N; ++k) {
    const float lp[5] = {0.003916123f, 0.007832247f, 0.003916123f, -1.815340f, 0.8310041f};
    std::memcpy(c[k], lp, sizeof(lp));
  }
  for (auto _ : state) {
    plainCascade<N>(c, h, in.data(), out.data(), n);
    benchmark::DoNotOptimize(out.data());
    benchmark::ClobberMemory();
  }
  perSample(state, n);
}
BENCHMARK(BM_PlainLoop<1>)->Arg(kSmall);
BENCHMARK(BM_PlainLoop<5>)->Arg(kSmall);

// ---- one channel ----

void BM_BiquadProcessSample(benchmark::State& state) {
  const unsigned n = unsigned(state.range(0));
  std::vector<float> in = noise(n), out(n);
  Biquad f = lowPass();
  for (auto _ : state) {
    for (unsigned i = 0; i < n; ++i) out[i] = f.processSample(in[i]);
    benchmark::DoNotOptimize(out.data());
  }
  perSample(state, n);
}
BENCHMARK(BM_BiquadProcessSample)->Arg(kSmall);

void BM_BiquadProcessBlock(benchmark::State& state) {
  const unsigned n = unsigned(state.range(0));
  std::vector<float> in = noise(n), out(n);
  Biquad f = lowPass();
  for (auto _ : state) {
    f.processBlock(in.data(), out.data(), n);
    benchmark::DoNotOptimize(out.data());
  }
  perSample(state, n);
}
BENCHMARK(BM_BiquadProcessBlock)->Arg(kSmall)->Arg(kLarge);

template <unsigned N>
void BM_MultiBandProcessSample(benchmark::State& state) {
  const unsigned n = unsigned(state.range(0));
  std::vector<float> in = noise(n), out(n);
  MultiBandBiquad<N> f = equaliser<N>();
  for (auto _ : state) {
    for (unsigned i = 0; i < n; ++i) out[i] = f.processSample(in[i]);
    benchmark::DoNotOptimize(out.data());
  }
  perSample(state, n);
}
BENCHMARK(BM_MultiBandProcessSample<5>)->Arg(kSmall);

template <unsigned N>
void BM_MultiBandProcessBlock(benchmark::State& state) {
  const unsigned n = unsigned(state.range(0));
  std::vector<float> in = noise(n), out(n);
  MultiBandBiquad<N> f = equaliser<N>();
  for (auto _ : state) {
    f.processBlock(in.data(), out.data(), n);
    benchmark::DoNotOptimize(out.data());
  }
  perSample(state, n);
}
BENCHMARK(BM_MultiBandProcessBlock<3>)->Arg(kSmall);
BENCHMARK(BM_MultiBandProcessBlock<5>)->Arg(kSmall)->Arg(kLarge);

// ---- stereo, three bands ----

struct Stereo {
  MultiBandBiquad<3> eq[2] = {equaliser<3>(), equaliser<3>()};
  MultiBandBiquad<3>* list[2] = {&eq[0], &eq[1]};
};

// Both channels through processBlock, one after the other.
void BM_StereoPerChannel(benchmark::State& state) {
  const unsigned n = unsigned(state.range(0));
  std::vector<float> left = noise(n, 1), right = noise(n, 2);
  Stereo s;
  for (auto _ : state) {
    s.eq[0].processBlock(left.data(), left.data(), n);
    s.eq[1].processBlock(right.data(), right.data(), n);
    benchmark::DoNotOptimize(left.data());
    benchmark::DoNotOptimize(right.data());
  }
  perSample(state, 2 * n);
}
BENCHMARK(BM_StereoPerChannel)->Arg(kSmall);

// Both channels sample by sample from interleaved frames.
void BM_StereoInterleavedProcessSample(benchmark::State& state) {
  const unsigned n = unsigned(state.range(0));
  std::vector<float> frames = noise(2 * size_t(n));
  Stereo s;
  for (auto _ : state) {
    for (unsigned i = 0; i < n; ++i) {
      frames[2 * i] = s.eq[0].processSample(frames[2 * i]);
      frames[2 * i + 1] = s.eq[1].processSample(frames[2 * i + 1]);
    }
    benchmark::DoNotOptimize(frames.data());
  }
  perSample(state, 2 * n);
}
BENCHMARK(BM_StereoInterleavedProcessSample)->Arg(kSmall);

void BM_StereoMultiChannel(benchmark::State& state) {
  const unsigned n = unsigned(state.range(0));
  const auto level = Aud::Simd::eLevel(state.range(1));
  if (Aud::Simd::setActiveLevel(level) != level) return state.SkipWithError("level not supported");
  std::vector<float> left = noise(n, 1), right = noise(n, 2);
  float* planes[2] = {left.data(), right.data()};
  Stereo s;
  for (auto _ : state) {
    MultiBandBiquad<3>::processBlockMultiChannel(s.list, planes, planes, 2, n);
    benchmark::DoNotOptimize(left.data());
    benchmark::DoNotOptimize(right.data());
  }
  Aud::Simd::setActiveLevel(Aud::Simd::supportedLevel());
  perSample(state, 2 * n);
}
BENCHMARK(BM_StereoMultiChannel)
    ->Args({kSmall, Aud::Simd::eScalar})
    ->Args({kSmall, Aud::Simd::eSSE2})
    ->Args({kSmall, Aud::Simd::eAVX2});

void BM_StereoInterleaved(benchmark::State& state) {
  const unsigned n = unsigned(state.range(0));
  const auto level = Aud::Simd::eLevel(state.range(1));
  if (Aud::Simd::setActiveLevel(level) != level) return state.SkipWithError("level not supported");
  std::vector<float> frames = noise(2 * size_t(n));
  Stereo s;
  for (auto _ : state) {
    MultiBandBiquad<3>::processBlockInterleaved(s.list, frames.data(), frames.data(), 2, n);
    benchmark::DoNotOptimize(frames.data());
  }
  Aud::Simd::setActiveLevel(Aud::Simd::supportedLevel());
  perSample(state, 2 * n);
}
BENCHMARK(BM_StereoInterleaved)
    ->Args({kSmall, Aud::Simd::eScalar})
    ->Args({kSmall, Aud::Simd::eSSE2})
    ->Args({kSmall, Aud::Simd::eAVX2});

// Eight channels (7.1), for the width of the AVX lanes.
void BM_EightChannelsInterleaved(benchmark::State& state) {
  const unsigned n = unsigned(state.range(0));
  const auto level = Aud::Simd::eLevel(state.range(1));
  if (Aud::Simd::setActiveLevel(level) != level) return state.SkipWithError("level not supported");
  std::vector<float> frames = noise(8 * size_t(n));
  std::vector<MultiBandBiquad<3>> eqs(8, equaliser<3>());
  MultiBandBiquad<3>* list[8];
  for (int c = 0; c < 8; ++c) list[c] = &eqs[c];
  for (auto _ : state) {
    MultiBandBiquad<3>::processBlockInterleaved(list, frames.data(), frames.data(), 8, n);
    benchmark::DoNotOptimize(frames.data());
  }
  Aud::Simd::setActiveLevel(Aud::Simd::supportedLevel());
  perSample(state, 8 * n);
}
BENCHMARK(BM_EightChannelsInterleaved)
    ->Args({kSmall, Aud::Simd::eScalar})
    ->Args({kSmall, Aud::Simd::eSSE2})
    ->Args({kSmall, Aud::Simd::eAVX2});

// ---- denormal tail ----

// A low, gently damped low-pass whose history starts at 'level' and decays
// by about 0.26% per sample: from 1e-39 it stays denormal for the whole block.
void BM_Tail(benchmark::State& state) {
  const bool denormal = state.range(0) != 0;
  const bool guarded = state.range(1) != 0;
  const unsigned n = kSmall;
  Biquad start(Biquad::LowPass, 20.0f, 48000.0f, Shape(Shape::Q, 0.5f), 0.0, true);
  const float level = denormal ? 1e-39f : 1e-3f;
  for (int i = 0; i < 2; ++i) start.processSample(level * 2000.0f);  // charge it
  std::vector<float> silence(n, 0.0f), out(n);
  Biquad warm = start;
  for (unsigned i = 0; i < 64; ++i) warm.processSample(0.0f);
  for (auto _ : state) {
    Biquad f = start;
    if (guarded) {
      Aud::ScopedNoDenormals noDenormals;
      f.processBlock(silence.data(), out.data(), n);
    } else {
      f.processBlock(silence.data(), out.data(), n);
    }
    benchmark::DoNotOptimize(out.data());
  }
  perSample(state, n);
}
BENCHMARK(BM_Tail)->ArgNames({"denormal", "guarded"})->Args({0, 0})->Args({1, 0})->Args({1, 1});

// ---- ratios ----

class RatioReporter : public benchmark::ConsoleReporter {
 public:
  void ReportRuns(const std::vector<Run>& runs) override {
    for (const Run& r : runs)
      if (!r.error_occurred) nsPerSample[r.benchmark_name()] = r.counters.at("ns/sample");
    ConsoleReporter::ReportRuns(runs);
  }
  void printRatios() const {
    const auto ratio = [&](const char* what, const std::string& a, const std::string& b) {
      const auto ia = nsPerSample.find(a), ib = nsPerSample.find(b);
      if (ia == nsPerSample.end() || ib == nsPerSample.end()) return;
      std::printf("  %-62s %7.3f ns / %7.3f ns = %6.2fx\n", what, double(ia->second), double(ib->second),
                  double(ia->second) / double(ib->second));
    };
    std::printf("\nRatios (time per sample, first / second; below 1 is faster):\n");
    ratio("Biquad processBlock / processSample loop", "BM_BiquadProcessBlock/4096",
          "BM_BiquadProcessSample/4096");
    ratio("Biquad processBlock / plain local loop", "BM_BiquadProcessBlock/4096", "BM_PlainLoop<1>/4096");
    ratio("Biquad processBlock / memcpy (4 Mi)", "BM_BiquadProcessBlock/4194304", "BM_Memcpy/4194304");
    ratio("5 bands processBlock / processSample loop", "BM_MultiBandProcessBlock<5>/4096",
          "BM_MultiBandProcessSample<5>/4096");
    ratio("5 bands processBlock / plain band-after-band loop", "BM_MultiBandProcessBlock<5>/4096",
          "BM_PlainLoop<5>/4096");
    ratio("5 bands processBlock / memcpy (4 Mi)", "BM_MultiBandProcessBlock<5>/4194304", "BM_Memcpy/4194304");
    for (const char* level : {"0", "1", "2"}) {
      const std::string l = level;
      ratio(("stereo 3 bands interleaved, level " + l + " / per channel").c_str(),
            "BM_StereoInterleaved/4096/" + l, "BM_StereoPerChannel/4096");
      ratio(("stereo 3 bands interleaved, level " + l + " / processSample").c_str(),
            "BM_StereoInterleaved/4096/" + l, "BM_StereoInterleavedProcessSample/4096");
      ratio(("stereo 3 bands planar, level " + l + " / per channel").c_str(),
            "BM_StereoMultiChannel/4096/" + l, "BM_StereoPerChannel/4096");
      ratio(("8 channels 3 bands interleaved, level " + l + " / scalar").c_str(),
            "BM_EightChannelsInterleaved/4096/" + l, "BM_EightChannelsInterleaved/4096/0");
    }
    ratio("denormal tail / normal tail", "BM_Tail/denormal:1/guarded:0", "BM_Tail/denormal:0/guarded:0");
    ratio("denormal tail with ScopedNoDenormals / normal tail", "BM_Tail/denormal:1/guarded:1",
          "BM_Tail/denormal:0/guarded:0");
  }

 private:
  std::map<std::string, double> nsPerSample;
};

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  RatioReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  reporter.printRatios();
  benchmark::Shutdown();
  return 0;
}
