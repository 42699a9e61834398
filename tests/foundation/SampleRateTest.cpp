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

// The word as the text form carries it.
int32_t wordOf(const SampleRate& rate) {
  int32_t word = 0;
  char revision = 0;
  EXPECT_EQ(std::sscanf(rate.asString(), "[%c][%d]", &revision, &word), 2);
  return word;
}

// Collects what the console receives while it lives.
class ConsoleCapture {
 public:
  ConsoleCapture() {
    host::setLogSink([this](const char* text) { text_ += text; });
  }
  ~ConsoleCapture() { host::setLogSink(nullptr); }
  const std::string& text() const { return text_; }

 private:
  std::string text_;
};

TEST(SampleRateWord, BaseAndFactorsAreIndependentFields) {
  SampleRate rate(sr48000, fx1_1001);
  EXPECT_EQ(wordOf(rate), 264);
  rate.baseSampleRate(sr44100);
  rate.addFactor(fx2 | fx24_25);
  rate.removeFactor(fx1_1001 | fx1001);
  EXPECT_EQ(rate, SampleRate(sr44100, fx2 | fx24_25));
  rate.factor(fx30_24);
  EXPECT_EQ(wordOf(rate), 7 + 0x200);
  EXPECT_FALSE(SampleRate().valid());
  EXPECT_FALSE(SampleRate(srNone, fx2).valid());
  // The low five bits of a factor are the base's: stray bits there must not
  // turn 48 kHz into another rate.
  SampleRate guarded(sr48000, F(0x20 | 0x1F));
  guarded.addFactor(F(0x07));
  guarded.removeFactor(F(0x08));
  guarded.factor(F(0x800 | 0x01));
  EXPECT_EQ(guarded, SampleRate(sr48000, fx2));
  EXPECT_EQ(SampleRate(eBaseSampleRate(0x28), fNone).baseSampleRate(), sr48000);
}

TEST(SampleRateHertz, BasesAndTheirFrequencies) {
  const struct {
    eBaseSampleRate base;
    unsigned hertz;
  } rows[] = {{srNone, 0},      {sr11025, 11025},         {sr16000, 16000},         {sr22050, 22050},
              {sr24000, 24000}, {sr32000, 32000},         {sr44100, 44100},         {sr48000, 48000},
              {sr96000, 96000}, {eBaseSampleRate(10), 0}, {eBaseSampleRate(31), 0}, {eBaseSampleRate(-1), 0}};
  for (const auto& row : rows) {
    SCOPED_TRACE(row.base);
    EXPECT_EQ(SampleRate::calcBaseSampleRate(row.base), row.hertz);
    if (row.hertz) {
      EXPECT_EQ(SampleRate::calcSampleRate(row.hertz), row.base);
    }
  }
  for (unsigned hertz : {0u, 1u, 44099u, 44101u, 47999u, 192000u, 0xFFFFFFFFu}) {
    EXPECT_EQ(SampleRate::calcSampleRate(hertz), srNone) << hertz;
  }
  EXPECT_DOUBLE_EQ(SampleRate(sr48000, fx1_1001).calcCombinedSampleRate(), 48000.0 / 1.001);
}

TEST(SampleRateFactor, MultipliersAreTakenInPairOrder) {
  const struct {
    uint32_t flags;
    double multiplier;
  } rows[] = {
      {0, 1.0},
      {0x20, 0.96},
      {0x40, 1.0416666666666667},
      {0x100, 1.0 / 1.001},
      {0x400, 0.8},
      {0x1000, 0.5},
      {0x20 | 0x40, 1.0},  // both of a pair count as neither
      {0x800 | 0x1000 | 0x200 | 0x400, 1.0},
      {0x40 | 0x100, 1.0416666666666667 / 1.001},
      {0x20 | 0x80 | 0x400 | 0x1000, 0.96 * 1.001 * 0.8 * 0.5},
      {0x40 | 0x80 | 0x200 | 0x800, 1.0416666666666667 * 1.001 * 1.25 * 2.0},
      {0x20 | 0x60, 1.0},
      {0xFFFFE000u | 0x80, 1.001}  // flags above the four pairs have no multiplier
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.flags);
    EXPECT_EQ(SampleRate::calcFactor(F(row.flags)), row.multiplier);  // exact: the order is fixed
  }
}

TEST(SampleRateFactor, InvertExchangesTheMembersOfEveryPair) {
  EXPECT_EQ(SampleRate::invert(F(0x20 | 0x100)), F(0x40 | 0x80));
  EXPECT_EQ(SampleRate::invert(F(0x800 | 0x400)), F(0x1000 | 0x200));
  EXPECT_EQ(SampleRate::invert(F(0x60)), F(0x60));
  EXPECT_EQ(SampleRate::invert(F(0x1F)), fNone);
  EXPECT_EQ(SampleRate::invert(F(0x80000000u | 0x20)), F(0x80000000u | 0x40));
  for (uint32_t n = 0; n < 256; ++n) {
    const eFactor f = F(n << 5);
    EXPECT_EQ(SampleRate::invert(SampleRate::invert(f)), f);
    const double product = SampleRate::calcFactor(f) * SampleRate::calcFactor(SampleRate::invert(f));
    EXPECT_NEAR(product, 1.0, 1e-15) << n;
  }
}

TEST(SampleRateFactor, DetermineFromFloatFindsEveryCandidate) {
  int candidates = 0, exactRoundTrips = 0;
  for (uint32_t n = 1; n <= 254; ++n) {
    const uint32_t flags = n << 5;
    const bool bothOfAPair = ((flags & 0x60) == 0x60) || ((flags & 0x180) == 0x180) ||
                             ((flags & 0x600) == 0x600) || ((flags & 0x1800) == 0x1800);
    if (bothOfAPair) continue;
    ++candidates;
    const double multiplier = SampleRate::calcFactor(F(flags));
    eFactor out = F(0xDEAD0000u);
    ASSERT_EQ(SampleRate::determineFactorFromFloat(out, multiplier), sSuccess) << n;
    // The answer is a candidate no later than this one, with the same multiplier.
    EXPECT_LE(uint32_t(out), flags);
    EXPECT_EQ(uint32_t(out) & 0x1F, 0u);
    EXPECT_LT(std::fabs(SampleRate::calcFactor(out) - multiplier), 1e-6);
    if (out == F(flags)) ++exactRoundTrips;
  }
  EXPECT_EQ(candidates, 80);               // 3^4 sets, one per pair state, less fNone
  EXPECT_EQ(exactRoundTrips, candidates);  // no two sets share a multiplier
}

TEST(SampleRateFactor, DetermineFromFloatEdges) {
  const struct {
    double multiplier;
    eStatus status;
    uint32_t flags;
  } rows[] = {{1.0, sSuccess, 0},
              {1.0000005, sSuccess, 0},
              {1.001, sSuccess, 0x80},
              {0.96 * 1.001, sSuccess, 0x20 | 0x80},
              {1.0 / 1.001, sSuccess, 0x100},
              {0.5 + 4e-7, sSuccess, 0x1000},
              {3.0, sInvalid, 0},
              {0.0, sInvalid, 0},
              {-1.0, sInvalid, 0},
              {NAN, sInvalid, 0},
              {INFINITY, sInvalid, 0}};
  for (const auto& row : rows) {
    SCOPED_TRACE(row.multiplier);
    eFactor out = fx2;
    EXPECT_EQ(SampleRate::determineFactorFromFloat(out, row.multiplier), row.status);
    EXPECT_EQ(out, F(row.flags));
  }
}

TEST(SampleRateText, WordsRoundTripThroughTheTextForm) {
  std::mt19937 random(7);
  std::vector<uint32_t> words = {0, 1, 8, 264, 999, 0x1FFF, 0x7FFFFFFF, 0x80000000u, 0xFFFFFFFFu};
  for (int i = 0; i < 200; ++i) words.push_back(random());
  ConsoleCapture console;
  for (const uint32_t word : words) {
    const SampleRate rate(eBaseSampleRate(word & 0x1F), F(word & ~0x1Fu));
    const String text = rate.asString();
    EXPECT_EQ(SampleRate(text), rate) << text.c_str();
  }
  EXPECT_EQ(console.text(), "");
}

TEST(SampleRateText, AsStringCarriesTheWordAndTheDisplayText) {
  EXPECT_STREQ(SampleRate(sr48000, fNone).asString(), "[A][8] 48 kHz");
  EXPECT_STREQ(SampleRate(sr48000, fx1_1001).asString(), "[A][264] 48 kHz x 1/1.001");
  EXPECT_STREQ(SampleRate(sr11025, fx24_25 | fx1_1001).asString(), "[A][290] 11.025 kHz x 24/25 x 1/1.001");
  EXPECT_STREQ(SampleRate(srProject, fx2).asString(), "[A][2049] Project x 2");
  EXPECT_STREQ(SampleRate().asString(), "[A][0] < Invalid >");
  EXPECT_STREQ(SampleRate(sr96000, F(0x80000000u)).asString(), "[A][-2147483639] 96 kHz");
}

// Reads text and returns the word, checking what went to the console and to
// standard output.
uint32_t readWord(const char* text, const char* warning) {
  ConsoleCapture console;
  testing::internal::CaptureStdout();
  const SampleRate rate{String(text)};
  EXPECT_EQ(testing::internal::GetCapturedStdout(), warning);
  EXPECT_EQ(console.text(), warning);
  return uint32_t(wordOf(rate));
}

TEST(SampleRateText, ReadingTakesTheNumberUntestedAndWarnsOnBadText) {
  // Anything after the number is ignored, the closing bracket included; the
  // number is taken whole, signed or unsigned, with no test of its bits.
  const struct {
    const char* text;
    uint32_t word;
  } readable[] = {{"[A][8]", 8},
                  {"[A][8] 96 kHz and more", 8},
                  {"[A][8", 8},
                  {"[A][999]", 999},
                  {"[A][ \t+264]", 264},
                  {"[A][-1]", 0xFFFFFFFFu},
                  {"[A][-2147483648]", 0x80000000u},
                  {"[A][4294967295]", 0xFFFFFFFFu},
                  {"[A][007]", 7}};
  for (const auto& row : readable) EXPECT_EQ(readWord(row.text, ""), row.word) << row.text;

  for (const char* text : {"[B][8]", "[a][8]", "[]][8]"}) {
    EXPECT_EQ(readWord(text, "Warning: encountered unrecognized SampleRate revision!\n"), 0u) << text;
  }
  // Without a number the revision is never looked at; a number beyond 32
  // bits is no number.
  for (const char* text : {"48000", "", "[", "[A]", "[A][", "[A][x8]", "[A][-]", "[A] [8]", " [A][8]", "[B]",
                           "[A][4294967296]", "[A][-2147483649]", "[A][99999999999999999999999999]"}) {
    EXPECT_EQ(readWord(text, "Warning: encountered unreadable SampleRate value!\n"), 0u) << text;
  }
}

TEST(SampleRateDisplay, BaseFactorAndRateTexts) {
  const struct {
    uint32_t word;
    const wchar_t* text;
  } rows[] = {{2, L"11.025 kHz"},
              {4, L"22.05 kHz"},
              {7, L"44.1 kHz"},
              {9, L"96 kHz"},
              {1, L"Project"},
              {0, L"< Invalid >"},
              {10, L"< Invalid >"},
              {31 | 0x800, L"< Invalid > x 2"},
              {8 | 0x100, L"48 kHz x 1/1.001"},
              {6 | 0x1800, L"32 kHz"},
              {3 | 0x120, L"16 kHz x 24/25 x 1/1.001"},
              {5 | 0x40 | 0x80 | 0x400 | 0x1000, L"24 kHz x 25/24 x 1.001 x 24/30 x 1/2"},
              {8 | 0x1FE0, L"48 kHz"},
              {8 | 0x260, L"48 kHz x 30/24"}};
  for (const auto& row : rows) {
    const SampleRate rate(eBaseSampleRate(row.word & 0x1F), F(row.word));
    EXPECT_EQ(getDisplayString(rate), row.text) << row.word;
  }
  EXPECT_EQ(getDisplayString(fx2), L"2");
  EXPECT_EQ(getDisplayString(fNone), L"");
  EXPECT_EQ(getDisplayString(eBaseSampleRate(-5)), L"< Invalid >");
  host::setResourceText(74, L"Hz*1000");
  EXPECT_EQ(getDisplayString(sr16000), L"16 Hz*1000");
  host::setResourceText(74, L"kHz");
}

TEST(SearchableVector, FindsTheFirstEqualRateOrGivesTheSize) {
  SearchableVector<SampleRate> rates;
  EXPECT_EQ(rates.find(SampleRate(sr48000, fNone)), 0u);
  rates.push_back(SampleRate(sr44100, fNone));
  rates.push_back(SampleRate(sr48000, fx1_1001));
  rates.push_back(SampleRate(sr48000, fNone));
  rates.push_back(SampleRate(sr48000, fx1_1001));
  EXPECT_EQ(rates.find(SampleRate(sr48000, fx1_1001)), 1u);
  EXPECT_EQ(rates.find(SampleRate(sr48000, fNone)), 2u);
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
  EXPECT_EQ(Private::getProjectHardwareSampleRateNamedObject(),
            Private::getProjectHardwareSampleRateNamedObject());
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
  int reads = 0;
  while (!done || reads < 100) {
    const SampleRate seen = getProjectHardwareSampleRate();
    ASSERT_TRUE(seen == a || seen == b);
    ++reads;
  }
  writer.join();
}

}  // namespace
