// The block and multichannel paths against the sample-by-sample reference,
// bit for bit: outputs with memcmp, filter state with its bits.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <string>
#include <vector>

#include "host/HostHooks.h"
#include "tests/dsp/DspSupport.h"
#include "tonebits/dsp/Aud__MultiBandBiquad.h"

namespace {

using namespace dsp_test;
using Aud::Filter::MultiBandBiquad;

template <class F>
constexpr unsigned kBands = 1;
template <unsigned N>
constexpr unsigned kBands<MultiBandBiquad<N>> = N;
template <class F>
Biquad& bandOf(F& f, unsigned k) {
  if constexpr (kBands<F> == 1)
    return f;
  else
    return f.getBand(k);
}

template <class F>
std::vector<StateBits> statesOf(F& f) {
  std::vector<StateBits> s;
  for (unsigned k = 0; k < kBands<F>; ++k) s.push_back(stateOf(bandOf(f, k)));
  return s;
}

// Random types and settings, each band on with probability pOn, with a
// little history so the run starts from a live state.
template <class F>
void randomise(F& f, std::mt19937& rng, unsigned pOnPercent = 75) {
  for (unsigned k = 0; k < kBands<F>; ++k) {
    configureRandomly(bandOf(f, k), typeAt(1 + int(rng() % 9)), rng);
    bandOf(f, k).setActive(rng() % 100 < pOnPercent);
  }
  for (float x : signal(3, Salt::kClean, rng)) f.processSample(x);
}

template <class F>
std::vector<float> reference(F& f, const std::vector<float>& in) {
  std::vector<float> out(in.size());
  for (size_t i = 0; i < in.size(); ++i) out[i] = f.processSample(in[i]);
  return out;
}

// processBlock of f, in place or into a separate buffer with a guard sample,
// against processSample of a copy.
template <class F>
void checkBlock(F& f, const std::vector<float>& in, bool inPlace) {
  F g = f;
  const unsigned n = unsigned(in.size());
  std::vector<float> want = reference(g, in), got = in;
  got.push_back(12345.0f), want.push_back(12345.0f);  // a guard sample
  if (!inPlace) std::fill(got.begin(), got.end() - 1, 0.5f);
  f.processBlock(inPlace ? got.data() : in.data(), got.data(), n);
  ASSERT_TRUE(sameBits(got, want));
  ASSERT_TRUE(statesOf(f) == statesOf(g));
}

template <class F>
class FilterPaths : public testing::Test {};
using Filters =
    testing::Types<Biquad, MultiBandBiquad<2>, MultiBandBiquad<3>, MultiBandBiquad<4>, MultiBandBiquad<5>>;
TYPED_TEST_SUITE(FilterPaths, Filters);

// Every length to 70 and a few past the gather chunk, every salt.
TYPED_TEST(FilterPaths, BlockEqualsProcessSample) {
  std::mt19937 rng(kBands<TypeParam>);
  for (unsigned n = 0; n <= 74; ++n)
    for (Salt salt : kSalts)
      for (bool inPlace : {false, true}) {
        const unsigned len = n <= 70 ? n : std::array{255u, 256u, 257u, 1000u}[n - 71];
        SCOPED_TRACE(testing::Message() << "n " << len << " salt " << int(salt) << " in place " << inPlace);
        TypeParam f;
        randomise(f, rng, len % 7 == 0 ? 0 : 75);  // now and then every band off
        checkBlock(f, signal(len, salt, rng), inPlace);
        if (this->HasFatalFailure()) return;
      }
}

TEST(MultiBandBlock, EveryPatternOfSwitchedOffBands) {
  // Inactive bands leave the pipeline; each must still record the last
  // sample it passed on, wherever it sits in the chain.
  std::mt19937 rng(9);
  for (unsigned mask = 0; mask < 32; ++mask)
    for (unsigned n : {1u, 2u, 3u, 4u, 5u, 6u, 40u}) {
      SCOPED_TRACE(testing::Message() << mask << " " << n);
      MultiBandBiquad<5> f;
      randomise(f, rng);
      for (unsigned k = 0; k < 5; ++k) f.getBand(k).setActive((mask >> k) & 1);
      checkBlock(f, signal(n, Salt::kClean, rng), true);
      if (testing::Test::HasFatalFailure()) return;
    }
}

// ---- Several channels at once ----

// Input and output each planar (channel c at c * (n + 1), a guard after it)
// or interleaved; planar to planar goes through processBlockMultiChannel,
// interleaved to interleaved through processBlockInterleaved, the mixed
// ones through processBlockStrided.
struct Layout {
  bool interleavedIn, interleavedOut, inPlace;
};
const Layout kLayouts[] = {
    {false, false, false}, {false, false, true}, {true, true, false},
    {true, true, true},    {false, true, false}, {true, false, false},
};

// channels filters through the multichannel entry point of the layout,
// against each channel's filter run sample by sample on its own.
template <class F>
void checkChannels(std::mt19937& rng, unsigned channels, unsigned n, Layout layout, Salt salt,
                   bool sameSettings) {
  std::vector<F> filters(channels);
  std::vector<F*> list;
  for (unsigned c = 0; c < channels; ++c) {
    list.push_back(&filters[c]);
    if (!sameSettings || c == 0) randomise(filters[c], rng);
    if (!sameSettings || c == 0) continue;
    filters[c] = filters[0];  // same bands on every channel: no lane mixes on and off
    for (float x : signal(2, Salt::kClean, rng)) filters[c].processSample(x);
  }
  std::vector<F> expected = filters;

  const auto size = [&](bool il) { return il ? size_t(n) * channels + 1 : size_t(n + 1) * channels; };
  const auto offset = [&](bool il, unsigned c) { return il ? c : c * (n + 1); };
  const ptrdiff_t inStride = layout.interleavedIn ? channels : 1;
  const ptrdiff_t outStride = layout.interleavedOut ? channels : 1;
  std::vector<float> inBuf(size(layout.interleavedIn), 777.0f), outBuf(size(layout.interleavedOut), 777.0f),
      wantBuf = outBuf;
  for (unsigned c = 0; c < channels; ++c) {
    const std::vector<float> in = signal(n, c % 3 == 1 ? salt : Salt::kClean, rng);
    const std::vector<float> want = reference(expected[c], in);
    for (unsigned i = 0; i < n; ++i) {
      inBuf[offset(layout.interleavedIn, c) + i * inStride] = in[i];
      wantBuf[offset(layout.interleavedOut, c) + i * outStride] = want[i];
    }
  }
  if (layout.inPlace) outBuf = inBuf;
  const float* source = layout.inPlace ? outBuf.data() : inBuf.data();
  std::vector<const float*> ins(channels);
  std::vector<float*> outs(channels);
  for (unsigned c = 0; c < channels; ++c)
    ins[c] = source + offset(layout.interleavedIn, c),
    outs[c] = outBuf.data() + offset(layout.interleavedOut, c);
  if (layout.interleavedIn != layout.interleavedOut)
    F::processBlockStrided(list.data(), ins.data(), inStride, outs.data(), outStride, channels, n);
  else if (layout.interleavedIn)
    F::processBlockInterleaved(list.data(), source, outBuf.data(), channels, n);
  else
    F::processBlockMultiChannel(list.data(), ins.data(), outs.data(), channels, n);

  ASSERT_TRUE(sameBits(outBuf, wantBuf));  // guards included
  for (unsigned c = 0; c < channels; ++c) ASSERT_TRUE(statesOf(filters[c]) == statesOf(expected[c])) << c;
}

TYPED_TEST(FilterPaths, MultiChannelEqualsEachChannelAlone) {
  LevelGuard guard;
  std::mt19937 rng(20 + kBands<TypeParam>);
  for (Aud::Simd::eLevel level : levels()) {
    Aud::Simd::setActiveLevel(level);
    for (unsigned channels : {1u, 2u, 3u, 4u, 5u, 6u, 7u, 8u, 11u})
      for (size_t l = 0; l < std::size(kLayouts); ++l) {
        SCOPED_TRACE(testing::Message()
                     << Aud::Simd::levelName(level) << " channels " << channels << " layout " << l);
        // Same bands on in every channel: the lanes run together (lengths
        // around the pipeline's fill and the gather chunk).
        for (unsigned n : {0u, 1u, 2u, 5u, 64u, 300u}) {
          SCOPED_TRACE(n);
          checkChannels<TypeParam>(rng, channels, n, kLayouts[l], kSalts[rng() % std::size(kSalts)], true);
        }
        // Bands on in some channels only: lane after lane.
        checkChannels<TypeParam>(rng, channels, 64, kLayouts[l], kSalts[rng() % std::size(kSalts)], false);
        if (this->HasFatalFailure()) return;
      }
  }
}

TEST(MultiChannel, AFilterListedTwiceRunsChannelAfterChannel) {
  using F = MultiBandBiquad<3>;
  LevelGuard guard;
  std::mt19937 rng(31);
  const unsigned n = 100;
  for (Aud::Simd::eLevel level : levels()) {
    Aud::Simd::setActiveLevel(level);
    for (unsigned channels : {2u, 5u, 8u, 9u}) {
      F filters[2], refs[2];  // the first at the first and last channels, the second between
      for (F& f : filters) randomise(f, rng, 100);
      std::copy(filters, filters + 2, refs);
      std::vector<std::vector<float>> data(channels), want(channels);
      std::vector<F*> list;
      std::vector<const float*> ins;
      std::vector<float*> outs;
      for (unsigned c = 0; c < channels; ++c) {
        const int k = c == 0 || c == channels - 1 ? 0 : 1;
        want[c] = data[c] = signal(n, Salt::kClean, rng);
        refs[k].processBlock(want[c].data(), want[c].data(), n);
        list.push_back(&filters[k]);
        ins.push_back(data[c].data());
        outs.push_back(data[c].data());
      }
      F::processBlockMultiChannel(list.data(), ins.data(), outs.data(), channels, n);
      for (unsigned c = 0; c < channels; ++c) ASSERT_TRUE(sameBits(data[c], want[c])) << channels << " " << c;
      for (int k : {0, 1}) ASSERT_TRUE(statesOf(filters[k]) == statesOf(refs[k]));
    }
  }
}

TEST(MultiChannel, NullArgumentsAreReportedAndTouchNothing) {
  std::vector<std::string> reports;
  host::setFatalReportHandler([&](const char* m) { reports.emplace_back(m); });
  MultiBandBiquad<2> a, b;
  a.getBand(0).configure(Biquad::LowPass, 100.0f, 48000.0f, Shape(Shape::Q, 0.7f), 0.0);
  a.getBand(0).setActive(true);
  b = a;
  a.processSample(1.0f);
  const auto before = statesOf(a);
  float x[4] = {1, 2, 3, 4}, y[4] = {9, 9, 9, 9};
  const float* ins[2] = {x, nullptr};
  float* outs[2] = {y, y};
  MultiBandBiquad<2>* list[2] = {&a, &b};
  MultiBandBiquad<2>* holey[2] = {&a, nullptr};
  MultiBandBiquad<2>::processBlockMultiChannel(list, ins, outs, 2, 4);
  MultiBandBiquad<2>::processBlockMultiChannel(nullptr, ins, outs, 2, 4);
  MultiBandBiquad<2>::processBlockInterleaved(holey, x, y, 2, 2);
  MultiBandBiquad<2>::processBlockInterleaved(list, nullptr, y, 2, 2);
  MultiBandBiquad<2>::processBlockStrided(list, ins, 0, outs, 1, 1, 4);  // stride below 1
  a.processBlock(nullptr, y, 4);
  a.getBand(0).processBlock(x, nullptr, 4);
  // Nothing to do is not an error, whatever the pointers.
  MultiBandBiquad<2>::processBlockMultiChannel(nullptr, nullptr, nullptr, 0, 4);
  MultiBandBiquad<2>::processBlockInterleaved(nullptr, nullptr, nullptr, 2, 0);
  a.processBlock(nullptr, nullptr, 0);
  host::setFatalReportHandler(nullptr);
  EXPECT_EQ(reports.size(), 7u);
  EXPECT_TRUE(statesOf(a) == before);
  for (float v : y) EXPECT_EQ(v, 9.0f);
}

}  // namespace
