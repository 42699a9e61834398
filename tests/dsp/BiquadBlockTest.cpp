// The block and multichannel paths against the sample-by-sample reference,
// bit for bit: outputs with memcmp, filter state with its bits.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "host/HostHooks.h"
#include "tests/dsp/BiquadSupport.h"
#include "tonebits/dsp/Aud__MultiBandBiquad.h"
#include "tonebits/foundation/Aud__Simd.h"

namespace {

using namespace biquad_test;
using Aud::Filter::MultiBandBiquad;

template <unsigned N>
Biquad& bandOf(MultiBandBiquad<N>& f, unsigned k) {
  return f.getBand(k);
}
Biquad& bandOf(Biquad& f, unsigned) { return f; }
template <unsigned N>
constexpr unsigned bandsOf(const MultiBandBiquad<N>*) {
  return N;
}
constexpr unsigned bandsOf(const Biquad*) { return 1; }

template <class F>
std::vector<StateBits> statesOf(F& f) {
  std::vector<StateBits> s;
  for (unsigned k = 0; k < bandsOf(&f); ++k) s.push_back(stateOf(bandOf(f, k)));
  return s;
}

// Random types, random settings, each band on with probability pOn, with a
// little history so the run starts from a live state.
template <class F>
void randomise(F& f, std::mt19937& rng, unsigned pOnPercent = 75) {
  for (unsigned k = 0; k < bandsOf(&f); ++k) {
    Biquad& b = bandOf(f, k);
    configureRandomly(b, typeAt(1 + int(rng() % 9)), rng);
    b.setActive(rng() % 100 < pOnPercent);
  }
  for (float x : signal(3, Salt::kClean, rng)) f.processSample(x);
}

template <class F>
std::vector<float> reference(F& f, const std::vector<float>& in) {
  std::vector<float> out(in.size());
  for (size_t i = 0; i < in.size(); ++i) out[i] = f.processSample(in[i]);
  return out;
}

std::vector<unsigned> lengths() {
  std::vector<unsigned> v;
  for (unsigned n = 0; n <= 70; ++n) v.push_back(n);
  for (unsigned n : {255u, 256u, 257u, 1000u}) v.push_back(n);
  return v;
}

// One filter (Biquad or MultiBandBiquad<N>) over every length and salt, in
// place and into a separate buffer.
template <class F>
void checkBlockEqualsSamples(uint32_t seed) {
  std::mt19937 rng(seed);
  for (unsigned n : lengths())
    for (Salt salt : kSalts)
      for (bool inPlace : {false, true}) {
        F f;
        randomise(f, rng, n % 7 == 0 ? 0 : 75);  // now and then every band off
        F g = f;
        const std::vector<float> in = signal(n, salt, rng);
        const std::vector<float> want = reference(g, in);
        std::vector<float> got = in;
        std::vector<float> separate(n + 1, 12345.0f);  // one guard sample
        if (inPlace)
          f.processBlock(got.data(), got.data(), n);
        else
          f.processBlock(in.data(), separate.data(), n);
        if (!inPlace) {
          EXPECT_EQ(separate[n], 12345.0f);
          got.assign(separate.begin(), separate.begin() + n);
        }
        ASSERT_TRUE(sameBits(got, want)) << "n " << n << " salt " << int(salt) << " in place " << inPlace;
        ASSERT_TRUE(statesOf(f) == statesOf(g)) << "n " << n << " salt " << int(salt);
      }
}

// Random types and settings (every type comes up many times), every length
// to 70 and a few past the gather chunk, every salt.
TEST(BiquadBlock, EqualsProcessSample) { checkBlockEqualsSamples<Biquad>(1); }

TEST(MultiBandBlock, EqualsProcessSampleForTwoToFiveBands) {
  checkBlockEqualsSamples<MultiBandBiquad<2>>(2);
  checkBlockEqualsSamples<MultiBandBiquad<3>>(3);
  checkBlockEqualsSamples<MultiBandBiquad<4>>(4);
  checkBlockEqualsSamples<MultiBandBiquad<5>>(5);
}

TEST(MultiBandBlock, EveryPatternOfSwitchedOffBands) {
  // Inactive bands leave the pipeline; each must still record the last
  // sample it passed on, wherever it sits in the chain.
  std::mt19937 rng(9);
  for (unsigned mask = 0; mask < 32; ++mask)
    for (unsigned n : {1u, 2u, 3u, 4u, 5u, 6u, 40u}) {
      MultiBandBiquad<5> f;
      randomise(f, rng);
      for (unsigned k = 0; k < 5; ++k) f.getBand(k).setActive((mask >> k) & 1);
      MultiBandBiquad<5> g = f;
      const std::vector<float> in = signal(n, Salt::kClean, rng);
      const std::vector<float> want = reference(g, in);
      std::vector<float> got = in;
      f.processBlock(got.data(), got.data(), n);
      ASSERT_TRUE(sameBits(got, want)) << mask << " " << n;
      ASSERT_TRUE(statesOf(f) == statesOf(g)) << mask << " " << n;
    }
}

// ---- Several channels at once ----

std::vector<Aud::Simd::eLevel> levels() {
  std::vector<Aud::Simd::eLevel> v;
  for (int l = Aud::Simd::eScalar; l <= Aud::Simd::supportedLevel(); ++l) v.push_back(Aud::Simd::eLevel(l));
  return v;
}

struct LevelGuard {
  Aud::Simd::eLevel saved = Aud::Simd::activeLevel();
  ~LevelGuard() { Aud::Simd::setActiveLevel(saved); }
};

enum class Layout { kPlanar, kPlanarInPlace, kInterleaved, kInterleavedInPlace, kPlanarToInterleaved };

// channels filters through the multichannel entry point of the given layout,
// against each channel's filter run sample by sample on its own.
template <class F>
void checkChannels(std::mt19937& rng, unsigned channels, unsigned n, Layout layout, Salt salt,
                   bool sameSettings) {
  std::vector<F> filters(channels), expected;
  for (unsigned c = 0; c < channels; ++c) {
    if (sameSettings && c > 0) {
      filters[c] = filters[0];  // same bands on every channel: no lane mixes on and off
      for (float x : signal(2, Salt::kClean, rng)) filters[c].processSample(x);
    } else {
      randomise(filters[c], rng);
    }
  }
  expected = filters;
  std::vector<std::vector<float>> in(channels), want(channels);
  for (unsigned c = 0; c < channels; ++c) {
    in[c] = signal(n, c % 3 == 1 ? salt : Salt::kClean, rng);
    want[c] = reference(expected[c], in[c]);
  }
  std::vector<F*> list;
  for (F& f : filters) list.push_back(&f);

  std::vector<std::vector<float>> got(channels);
  if (layout == Layout::kPlanar || layout == Layout::kPlanarInPlace) {
    std::vector<std::vector<float>> out(channels, std::vector<float>(n + 1, 777.0f));
    std::vector<const float*> ins;
    std::vector<float*> outs;
    for (unsigned c = 0; c < channels; ++c) {
      if (layout == Layout::kPlanarInPlace) out[c].assign(in[c].begin(), in[c].end());
      ins.push_back(layout == Layout::kPlanarInPlace ? out[c].data() : in[c].data());
      outs.push_back(out[c].data());
    }
    F::processBlockMultiChannel(list.data(), ins.data(), outs.data(), channels, n);
    for (unsigned c = 0; c < channels; ++c) {
      if (layout == Layout::kPlanar) {
        EXPECT_EQ(out[c][n], 777.0f);
      }
      got[c].assign(out[c].begin(), out[c].begin() + n);
    }
  } else {
    std::vector<float> frames(size_t(n) * channels), out(size_t(n) * channels + 1, 777.0f);
    for (unsigned f = 0; f < n; ++f)
      for (unsigned c = 0; c < channels; ++c) frames[size_t(f) * channels + c] = in[c][f];
    if (layout == Layout::kInterleavedInPlace) {
      F::processBlockInterleaved(list.data(), frames.data(), frames.data(), channels, n);
      out.assign(frames.begin(), frames.end());
    } else if (layout == Layout::kPlanarToInterleaved) {
      std::vector<const float*> ins;
      std::vector<float*> outs;
      for (unsigned c = 0; c < channels; ++c) {
        ins.push_back(in[c].data());
        outs.push_back(out.data() + c);
      }
      F::processBlockStrided(list.data(), ins.data(), 1, outs.data(), channels, channels, n);
    } else {
      F::processBlockInterleaved(list.data(), frames.data(), out.data(), channels, n);
      EXPECT_EQ(out[size_t(n) * channels], 777.0f);
    }
    for (unsigned c = 0; c < channels; ++c)
      for (unsigned f = 0; f < n; ++f) got[c].push_back(out[size_t(f) * channels + c]);
  }
  for (unsigned c = 0; c < channels; ++c) {
    ASSERT_TRUE(sameBits(got[c], want[c])) << "channel " << c;
    ASSERT_TRUE(statesOf(filters[c]) == statesOf(expected[c])) << "channel " << c;
  }
}

template <class F>
void checkChannelsEverywhere(uint32_t seed) {
  LevelGuard guard;
  std::mt19937 rng(seed);
  const Layout layouts[] = {Layout::kPlanar, Layout::kPlanarInPlace, Layout::kInterleaved,
                            Layout::kInterleavedInPlace, Layout::kPlanarToInterleaved};
  for (Aud::Simd::eLevel level : levels()) {
    Aud::Simd::setActiveLevel(level);
    for (unsigned channels : {1u, 2u, 3u, 4u, 5u, 6u, 7u, 8u, 11u})
      for (Layout layout : layouts) {
        SCOPED_TRACE(testing::Message()
                     << Aud::Simd::levelName(level) << " channels " << channels << " layout " << int(layout));
        // Same bands on in every channel: the lanes run together (lengths
        // around the pipeline's fill and the gather chunk).
        for (unsigned n : {0u, 1u, 2u, 5u, 64u, 300u}) {
          SCOPED_TRACE(n);
          checkChannels<F>(rng, channels, n, layout, kSalts[rng() % std::size(kSalts)], true);
        }
        // Bands on in some channels only: lane after lane.
        checkChannels<F>(rng, channels, 64, layout, kSalts[rng() % std::size(kSalts)], false);
        if (testing::Test::HasFatalFailure()) return;
      }
  }
}

TEST(MultiChannel, BiquadEqualsEachChannelAlone) { checkChannelsEverywhere<Biquad>(21); }
TEST(MultiChannel, TwoBandsEqualEachChannelAlone) { checkChannelsEverywhere<MultiBandBiquad<2>>(22); }
TEST(MultiChannel, ThreeBandsEqualEachChannelAlone) { checkChannelsEverywhere<MultiBandBiquad<3>>(23); }
TEST(MultiChannel, FourBandsEqualEachChannelAlone) { checkChannelsEverywhere<MultiBandBiquad<4>>(24); }
TEST(MultiChannel, FiveBandsEqualEachChannelAlone) { checkChannelsEverywhere<MultiBandBiquad<5>>(25); }

TEST(MultiChannel, AFilterListedTwiceRunsChannelAfterChannel) {
  LevelGuard guard;
  std::mt19937 rng(31);
  for (Aud::Simd::eLevel level : levels()) {
    Aud::Simd::setActiveLevel(level);
    for (unsigned channels : {2u, 5u, 8u, 9u}) {
      MultiBandBiquad<3> shared, other;
      randomise(shared, rng, 100);
      randomise(other, rng, 100);
      MultiBandBiquad<3> sharedRef = shared, otherRef = other;
      std::vector<MultiBandBiquad<3>*> list(channels, &other);
      list[0] = &shared;
      list[channels - 1] = &shared;
      std::vector<MultiBandBiquad<3>*> refList(channels, &otherRef);
      refList[0] = &sharedRef;
      refList[channels - 1] = &sharedRef;
      const unsigned n = 100;
      std::vector<std::vector<float>> data(channels), want(channels);
      std::vector<const float*> ins;
      std::vector<float*> outs;
      for (unsigned c = 0; c < channels; ++c) {
        data[c] = signal(n, Salt::kClean, rng);
        want[c] = data[c];
        refList[c]->processBlock(want[c].data(), want[c].data(), n);
        ins.push_back(data[c].data());
        outs.push_back(data[c].data());
      }
      MultiBandBiquad<3>::processBlockMultiChannel(list.data(), ins.data(), outs.data(), channels, n);
      for (unsigned c = 0; c < channels; ++c) ASSERT_TRUE(sameBits(data[c], want[c])) << channels << " " << c;
      ASSERT_TRUE(statesOf(shared) == statesOf(sharedRef));
      ASSERT_TRUE(statesOf(other) == statesOf(otherRef));
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
