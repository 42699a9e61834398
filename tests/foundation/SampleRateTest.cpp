#include <gtest/gtest.h>

#include <atomic>
#include <cmath>
#include <cstdint>
#include <random>
#include <string>
#include <thread>

#include "host/Exception.h"
#include "host/HostHooks.h"
#include "tonebits/foundation/Aud__SampleRate.h"

namespace {

using namespace Aud;

eFactor F(uint32_t bits) { return eFactor(bits); }
SampleRate fromWord(uint32_t word) { return SampleRate(eBaseSampleRate(word & 0x1F), F(word & ~0x1Fu)); }

// The word as the text form carries it.
int32_t wordOf(const SampleRate& rate) {
  int32_t word = 0;
  char revision = 0;
  EXPECT_EQ(std::sscanf(rate.asString(), "[%c][%d]", &revision, &word), 2);
  return word;
}

// Collects what the console receives while it lives.
struct ConsoleCapture {
  ConsoleCapture() {
    host::setLogSink([this](const char* t) { text += t; });
  }
  ~ConsoleCapture() { host::setLogSink(nullptr); }
  std::string text;
};

TEST(SampleRateWord, BaseAndFactorsAreIndependentFieldsAndBasesHaveFrequencies) {
  EXPECT_EQ(wordOf(SampleRate(sr48000, fx1_1001)), 264);
  EXPECT_FALSE(SampleRate().valid());
  EXPECT_FALSE(SampleRate(srNone, fx2).valid());
  // The low five bits of a factor are the base's: stray bits there must not
  // turn 48 kHz into another rate.
  SampleRate rate(sr48000, F(0x20 | 0x1F));
  rate.addFactor(F(0x07 | 0x800));
  rate.removeFactor(F(0x08 | 0x20));
  EXPECT_EQ(rate, SampleRate(sr48000, fx2));
  rate.factor(F(0x200 | 0x01));
  EXPECT_EQ(wordOf(rate), 8 + 0x200);
  rate.baseSampleRate(sr44100);
  EXPECT_EQ(rate, SampleRate(sr44100, fx30_24));
  EXPECT_EQ(SampleRate(eBaseSampleRate(0x28), fNone).baseSampleRate(), sr48000);

  const unsigned hertz[] = {0, 0, 11025, 16000, 22050, 24000, 32000, 44100, 48000, 96000, 0};
  for (int base = -1; base <= 31; base += base == srNone ? 2 : 1) {  // srProject reads the project
    const unsigned want = base >= 0 && base <= 10 ? hertz[base] : 0;
    EXPECT_EQ(SampleRate::calcBaseSampleRate(eBaseSampleRate(base)), want) << base;
    if (!want) continue;
    EXPECT_EQ(SampleRate::calcSampleRate(want), base);
  }
  for (unsigned h : {0u, 1u, 44099u, 44101u, 47999u, 192000u, 0xFFFFFFFFu})
    EXPECT_EQ(SampleRate::calcSampleRate(h), srNone) << h;
  EXPECT_DOUBLE_EQ(SampleRate(sr48000, fx1_1001).calcCombinedSampleRate(), 48000.0 / 1.001);
}

TEST(SampleRateFactor, MultipliersInversesAndFactorsFromMultipliers) {
  // The pairs: 0x20 24/25 and 0x40 25/24; 0x80 1.001 and 0x100 1/1.001;
  // 0x200 30/24 and 0x400 24/30; 0x800 2 and 0x1000 1/2. Both of a pair
  // count as neither; flags above the four pairs have no multiplier.
  const double up = 1.0416666666666667;
  const std::pair<uint32_t, double> rows[] = {{0, 1.0},      {0x20, 0.96},        {0x40, up},
                                              {0x400, 0.8},  {0x1000, 0.5},       {0x60, 1.0},
                                              {0x1E00, 1.0}, {0xFFFFE080u, 1.001}};
  for (const auto& [flags, multiplier] : rows)
    EXPECT_EQ(SampleRate::calcFactor(F(flags)), multiplier) << flags;
  // Exact: the order is fixed.
  EXPECT_EQ(SampleRate::calcFactor(F(0x100)), 1.0 / 1.001);
  EXPECT_EQ(SampleRate::calcFactor(F(0x140)), up / 1.001);
  EXPECT_EQ(SampleRate::calcFactor(F(0x14A0)), 0.96 * 1.001 * 0.8 * 0.5);
  EXPECT_EQ(SampleRate::calcFactor(F(0xAC0)), up * 1.001 * 1.25 * 2.0);

  // invert exchanges the members of every pair and keeps other bits.
  EXPECT_EQ(SampleRate::invert(F(0x20 | 0x100)), F(0x40 | 0x80));
  EXPECT_EQ(SampleRate::invert(F(0x800 | 0x400)), F(0x1000 | 0x200));
  EXPECT_EQ(SampleRate::invert(F(0x60)), F(0x60));
  EXPECT_EQ(SampleRate::invert(F(0x1F)), fNone);
  EXPECT_EQ(SampleRate::invert(F(0x80000000u | 0x20)), F(0x80000000u | 0x40));
  // Inverting twice gives the set back, and a multiplier times its
  // inverse's is one. Every set with at most one member of each pair comes
  // back from its own multiplier (no two share one).
  int candidates = 0;
  for (uint32_t flags = 0; flags < 0x2000; flags += 0x20) {
    const eFactor f = F(flags);
    EXPECT_EQ(SampleRate::invert(SampleRate::invert(f)), f);
    EXPECT_NEAR(SampleRate::calcFactor(f) * SampleRate::calcFactor(SampleRate::invert(f)), 1.0, 1e-15)
        << flags;
    if (!flags || (flags & 0x60) == 0x60 || (flags & 0x180) == 0x180 || (flags & 0x600) == 0x600 ||
        (flags & 0x1800) == 0x1800)
      continue;
    ++candidates;
    eFactor out = F(0xDEAD0000u);
    ASSERT_EQ(SampleRate::determineFactorFromFloat(out, SampleRate::calcFactor(f)), sSuccess);
    EXPECT_EQ(out, f);
  }
  EXPECT_EQ(candidates, 80);  // 3^4 sets, one per pair state, less fNone
  const std::pair<double, uint32_t> near[] = {{1.0, 0}, {1.0000005, 0}, {0.5 + 4e-7, 0x1000}};
  for (const auto& [multiplier, flags] : near) {
    eFactor out = fx2;
    EXPECT_EQ(SampleRate::determineFactorFromFloat(out, multiplier), sSuccess) << multiplier;
    EXPECT_EQ(out, F(flags)) << multiplier;
  }
  for (double multiplier : {3.0, 0.0, -1.0, double(NAN), double(INFINITY)}) {
    eFactor out = fx2;
    EXPECT_EQ(SampleRate::determineFactorFromFloat(out, multiplier), sInvalid) << multiplier;
    EXPECT_EQ(out, fNone) << multiplier;
  }
}

TEST(SampleRateText, TextFormAndDisplayTexts) {
  EXPECT_STREQ(SampleRate(sr48000, fNone).asString(), "[A][8] 48 kHz");
  EXPECT_STREQ(SampleRate(sr11025, fx24_25 | fx1_1001).asString(), "[A][290] 11.025 kHz x 24/25 x 1/1.001");
  EXPECT_STREQ(SampleRate(srProject, fx2).asString(), "[A][2049] Project x 2");
  EXPECT_STREQ(SampleRate().asString(), "[A][0] < Invalid >");
  EXPECT_STREQ(SampleRate(sr96000, F(0x80000000u)).asString(), "[A][-2147483639] 96 kHz");
  std::mt19937 random(7);
  std::vector<uint32_t> words = {0, 1, 8, 264, 999, 0x1FFF, 0x7FFFFFFF, 0x80000000u, 0xFFFFFFFFu};
  for (int i = 0; i < 200; ++i) words.push_back(random());
  ConsoleCapture console;
  for (const uint32_t word : words) {
    const String text = fromWord(word).asString();
    EXPECT_EQ(SampleRate(text), fromWord(word)) << text.c_str();
  }
  EXPECT_EQ(console.text, "");
  // Display texts: bases, factors in pair order, both of a pair as neither.
  const std::pair<uint32_t, const wchar_t*> texts[] = {
      {4, L"22.05 kHz"},
      {7, L"44.1 kHz"},
      {1, L"Project"},
      {31 | 0x800, L"< Invalid > x 2"},
      {5 | 0x40 | 0x80 | 0x400 | 0x1000, L"24 kHz x 25/24 x 1.001 x 24/30 x 1/2"},
      {8 | 0x1FE0, L"48 kHz"},
      {8 | 0x260, L"48 kHz x 30/24"}};
  for (const auto& [word, text] : texts) EXPECT_EQ(getDisplayString(fromWord(word)), text) << word;
  EXPECT_EQ(getDisplayString(fx2), L"2");
  EXPECT_EQ(getDisplayString(fNone), L"");
  EXPECT_EQ(getDisplayString(eBaseSampleRate(-5)), L"< Invalid >");
  host::setResourceText(74, L"Hz*1000");
  EXPECT_EQ(getDisplayString(sr16000), L"16 Hz*1000");
  host::setResourceText(74, L"kHz");
}

// Reads text and returns the word, checking what went to the console and to
// standard output.
uint32_t readWord(const char* text, const char* warning) {
  ConsoleCapture console;
  testing::internal::CaptureStdout();
  const SampleRate rate{String(text)};
  EXPECT_EQ(testing::internal::GetCapturedStdout(), warning);
  EXPECT_EQ(console.text, warning);
  return uint32_t(wordOf(rate));
}

TEST(SampleRateText, ReadingTakesTheNumberUntestedAndWarnsOnBadText) {
  // Anything after the number is ignored, the closing bracket included; the
  // number is taken whole, signed or unsigned, with no test of its bits.
  const std::pair<const char*, uint32_t> readable[] = {{"[A][8] 96 kHz and more", 8},
                                                       {"[A][8", 8},
                                                       {"[A][ \t+264]", 264},
                                                       {"[A][-1]", 0xFFFFFFFFu},
                                                       {"[A][-2147483648]", 0x80000000u},
                                                       {"[A][4294967295]", 0xFFFFFFFFu},
                                                       {"[A][007]", 7}};
  for (const auto& [text, word] : readable) EXPECT_EQ(readWord(text, ""), word) << text;
  for (const char* text : {"[B][8]", "[a][8]", "[]][8]"})
    EXPECT_EQ(readWord(text, "Warning: encountered unrecognized SampleRate revision!\n"), 0u) << text;
  // Without a number the revision is never looked at; a number beyond 32
  // bits is no number.
  for (const char* text : {"48000", "", "[", "[A]", "[A][", "[A][x8]", "[A][-]", "[A] [8]", " [A][8]", "[B]",
                           "[A][4294967296]", "[A][-2147483649]", "[A][99999999999999999999999999]"})
    EXPECT_EQ(readWord(text, "Warning: encountered unreadable SampleRate value!\n"), 0u) << text;
}

TEST(SearchableVector, FindsTheFirstEqualRateOrGivesTheSize) {
  SearchableVector<SampleRate> rates;
  EXPECT_EQ(rates.find(SampleRate(sr48000, fNone)), 0u);
  for (eFactor f : {fNone, fx1_1001, fNone, fx1_1001}) rates.push_back(SampleRate(sr48000, f));
  EXPECT_EQ(rates.find(SampleRate(sr48000, fx1_1001)), 1u);
  EXPECT_EQ(rates.find(SampleRate(sr48000, fx1001)), rates.size());
}

class ProjectRate : public testing::Test {
 protected:
  void SetUp() override { set(SampleRate()); }
  void TearDown() override {
    host::setNamedObjectsAvailable(true);
    set(SampleRate());
  }
  static void set(SampleRate rate) {
    SampleRate* object = Private::getProjectHardwareSampleRateNamedObject();
    ASSERT_NE(object, nullptr);
    *object = rate;
  }
};

TEST_F(ProjectRate, IsOneSharedObjectThatSrProjectReads) {
  EXPECT_EQ(getProjectHardwareSampleRate(), SampleRate());
  EXPECT_EQ(SampleRate::calcBaseSampleRate(srProject), 0u);
  set(SampleRate(sr44100, fx1001));
  EXPECT_EQ(getProjectHardwareSampleRate(), SampleRate(sr44100, fx1001));
  EXPECT_EQ(SampleRate::calcBaseSampleRate(srProject), 44100u);
  // Only the project's base stands in; the rate's own factors are kept.
  EXPECT_EQ(SampleRate(srProject, fx1_2).specialized(), SampleRate(sr44100, fx1_2));
  EXPECT_EQ(SampleRate(sr96000, fx1_2).specialized(), SampleRate(sr96000, fx1_2));
  EXPECT_DOUBLE_EQ(SampleRate(srProject, fx2).calcCombinedSampleRate(), 88200.0);
  set(SampleRate(srProject, fNone));  // never valid there, and not followed
  EXPECT_EQ(SampleRate::calcBaseSampleRate(srProject), 0u);
}

TEST_F(ProjectRate, ThrowsWhenTheHostHasNoNamedObject) {
  host::setNamedObjectsAvailable(false);
  EXPECT_EQ(Private::getProjectHardwareSampleRateNamedObject(), nullptr);
  const std::function<void()> readers[] = {[] { getProjectHardwareSampleRate(); },
                                           [] { SampleRate::calcBaseSampleRate(srProject); },
                                           [] { SampleRate(srProject, fNone).specialized(); },
                                           [] { SampleRate(srProject, fx2).calcCombinedSampleRate(); }};
  for (const auto& read : readers) {
    try {
      read();
      ADD_FAILURE() << "no exception";
    } catch (const Kv::Exception::Base& e) {
      EXPECT_STREQ(e.getTypeName(), "RuntimeError");
      EXPECT_STREQ(e.getMessage(), "Failed to find project sample rate named object!");
      EXPECT_STREQ(e.getFile(), "Aud__SampleRate");
      EXPECT_EQ(e.getLine(), 37);
    }
  }
  // Concrete rates never need the object.
  EXPECT_EQ(SampleRate(sr48000, fNone).specialized(), SampleRate(sr48000, fNone));
  EXPECT_EQ(SampleRate::calcBaseSampleRate(sr48000), 48000u);
  EXPECT_STREQ(SampleRate(srProject, fNone).asString(), "[A][1] Project");
}

TEST_F(ProjectRate, ReadersSeeWholeWordsWhileTheHostSetsIt) {
  const SampleRate a(sr48000, fx1_1001 | fx2), b(sr44100, fx24_25);
  set(a);
  SampleRate* object = Private::getProjectHardwareSampleRateNamedObject();
  std::atomic<bool> done{false};
  std::thread writer([&] {
    for (int i = 0; i < 20000; ++i) std::atomic_ref<SampleRate>(*object).store(i % 2 ? a : b);
    done = true;
  });
  for (int reads = 0; !done || reads < 100; ++reads) {
    const SampleRate seen = getProjectHardwareSampleRate();
    ASSERT_TRUE(seen == a || seen == b);
  }
  writer.join();
}

}  // namespace
