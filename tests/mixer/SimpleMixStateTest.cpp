#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <thread>

#include "mixer/MixStateTesting.h"
#include "tonebits/mixer/Aud__SimpleMixState.h"

namespace {

using Aud::SimpleMixState;
using mixtest::FatalReports;

TEST(SimpleMixState, DefaultConfigurationOfTwoInputsOneMixTwoOutputs) {
  SimpleMixState s(2, 1, 2);
  EXPECT_TRUE(s.valid());
  EXPECT_FALSE(s.getDirty());
  for (int i = 0; i < 2; ++i) {
    EXPECT_EQ(s.getInputLevel(i), 1.0f);
    EXPECT_EQ(s.getInputPan(i), 0.5f);
    EXPECT_FALSE(s.getInputMuteState(i));
    EXPECT_FALSE(s.getInputSoloState(i));
    EXPECT_TRUE(s.getInputRoutedToMix(i, -1));
    EXPECT_FALSE(s.getInputRoutedToMix(i, 0));
  }
  for (int m = -1; m <= 0; ++m) {
    EXPECT_EQ(s.getMixLevel(m), 1.0f);
    EXPECT_FALSE(s.getMixMuteState(m));
    EXPECT_FALSE(s.getMixSoloState(m));
  }
  struct Route {
    int m, o;
    bool left, on;
  };
  const Route routes[] = {
      {-1, 0, true, true},   {-1, 1, false, true},   {-1, 0, false, false}, {-1, 1, true, false},
      {0, 0, true, false},   {0, 1, false, false},   {0, -2, true, false},  {0, -1, false, false},
      {-1, -2, true, false}, {-1, -1, false, false},
  };
  for (const Route& r : routes)
    EXPECT_EQ(s.getMixRoutedToOutput(r.m, r.o, r.left), r.on) << r.m << "," << r.o;
}

TEST(SimpleMixState, LevelSettersClampPanSetterDoesNot) {
  struct Row {
    float in, level;
  };
  const float nan = std::numeric_limits<float>::quiet_NaN();
  const float inf = std::numeric_limits<float>::infinity();
  const Row rows[] = {{2.0f, 1.5f}, {-1.0f, 0.0f}, {1.5f, 1.5f}, {0.0f, 0.0f},
                      {0.3f, 0.3f}, {inf, 1.5f},   {-inf, 0.0f}, {1.5000001f, 1.5f}};
  SimpleMixState s(1, 1, 2);
  for (const Row& r : rows) {
    s.setInputLevel(0, r.in);
    EXPECT_EQ(s.getInputLevel(0), r.level) << r.in;
    s.setMixLevel(0, r.in);
    EXPECT_EQ(s.getMixLevel(0), r.level) << r.in;
    s.setInputPan(0, r.in);
    EXPECT_EQ(s.getInputPan(0), r.in);
  }
  s.setInputLevel(0, nan);
  EXPECT_TRUE(std::isnan(s.getInputLevel(0)));
  s.setInputPan(0, 7.0f);
  EXPECT_EQ(s.getInputPan(0), 7.0f);
}

TEST(SimpleMixState, EverySetterStoresItsOwnEntryAndMarksDirty) {
  struct Case {
    const char* name;
    std::function<void(SimpleMixState&)> set;
    std::function<bool(SimpleMixState&)> check;
  };
  const Case cases[] = {
      {"input level", [](SimpleMixState& s) { s.setInputLevel(2, 0.25f); },
       [](SimpleMixState& s) { return s.getInputLevel(2) == 0.25f && s.getInputLevel(1) == 1.0f; }},
      {"input pan", [](SimpleMixState& s) { s.setInputPan(1, 0.0f); },
       [](SimpleMixState& s) { return s.getInputPan(1) == 0.0f && s.getInputPan(0) == 0.5f; }},
      {"input mute", [](SimpleMixState& s) { s.setInputMuteState(0, true); },
       [](SimpleMixState& s) { return s.getInputMuteState(0) && !s.getInputSoloState(0); }},
      {"input solo", [](SimpleMixState& s) { s.setInputSoloState(2, true); },
       [](SimpleMixState& s) { return s.getInputSoloState(2) && !s.getInputMuteState(2); }},
      {"input route", [](SimpleMixState& s) { s.setInputRoutedToMix(1, 1, true); },
       [](SimpleMixState& s) { return s.getInputRoutedToMix(1, 1) && !s.getInputRoutedToMix(0, 1); }},
      {"mix level", [](SimpleMixState& s) { s.setMixLevel(-1, 0.5f); },
       [](SimpleMixState& s) { return s.getMixLevel(-1) == 0.5f && s.getMixLevel(0) == 1.0f; }},
      {"mix mute", [](SimpleMixState& s) { s.setMixMuteState(1, true); },
       [](SimpleMixState& s) { return s.getMixMuteState(1) && !s.getMixMuteState(0); }},
      {"mix solo", [](SimpleMixState& s) { s.setMixSoloState(0, true); },
       [](SimpleMixState& s) { return s.getMixSoloState(0) && !s.getMixSoloState(-1); }},
      {"mix route off", [](SimpleMixState& s) { s.setMixRoutedToOutput(-1, 0, true, false); },
       [](SimpleMixState& s) {
         return !s.getMixRoutedToOutput(-1, 0, true) && s.getMixRoutedToOutput(-1, 1, false);
       }},
  };
  for (const Case& c : cases) {
    SimpleMixState s(3, 2, 3);
    c.set(s);
    EXPECT_TRUE(c.check(s)) << c.name;
    EXPECT_TRUE(s.getDirty()) << c.name;
  }
}

TEST(SimpleMixState, OutOfRangeIndicesChangeNothingAndReadNeutral) {
  SimpleMixState s(2, 1, 2);
  const SimpleMixState before(s);
  s.setInputLevel(-1, 0.5f);
  s.setInputLevel(2, 0.5f);
  s.setInputPan(2, 0.1f);
  s.setInputMuteState(-7, true);
  s.setInputSoloState(2, true);
  s.setInputRoutedToMix(0, 1, true);
  s.setInputRoutedToMix(0, -2, true);
  s.setMixLevel(-2, 0.5f);
  s.setMixLevel(1, 0.5f);
  s.setMixMuteState(1, true);
  s.setMixSoloState(-2, true);
  s.setMixRoutedToOutput(0, 2, true, false);
  s.setMixRoutedToOutput(-1, -2, true, true);
  s.setMixRoutedToOutput(-1, -1, false, true);
  s.setMixRoutedToOutput(0, -3, true, true);
  EXPECT_FALSE(s.getDirty());
  SimpleMixState copy(before);
  mixtest::expectSameEntries(s, copy, 2, 1, 2);

  // Getters given an index outside the tables read a neutral value instead
  // of memory beside them.
  for (int bad : {-1000000, -2, 2, 3, 1 << 30}) {
    EXPECT_EQ(s.getInputLevel(bad), 0.0f);
    EXPECT_EQ(s.getInputPan(bad), 0.0f);
    EXPECT_FALSE(s.getInputMuteState(bad));
    EXPECT_FALSE(s.getInputSoloState(bad));
    EXPECT_FALSE(s.getInputRoutedToMix(bad, -1));
    EXPECT_FALSE(s.getInputRoutedToMix(0, bad));
    EXPECT_EQ(s.getMixLevel(bad), 0.0f);
    EXPECT_FALSE(s.getMixMuteState(bad));
    EXPECT_FALSE(s.getMixSoloState(bad));
    EXPECT_FALSE(s.getMixRoutedToOutput(bad, 0, true));
    EXPECT_FALSE(s.getMixRoutedToOutput(0, bad, false));
  }
}

TEST(SimpleMixState, PhysicalOutputHasOneFeedPseudoOutputsMany) {
  SimpleMixState s(2, 2, 3);
  // Mix 0's right side takes output 0 from the main mix's left side.
  s.setMixRoutedToOutput(0, 0, false, true);
  EXPECT_TRUE(s.getMixRoutedToOutput(0, 0, false));
  EXPECT_FALSE(s.getMixRoutedToOutput(-1, 0, true));
  EXPECT_TRUE(s.getMixRoutedToOutput(-1, 1, false));
  // Switching the other side of the same mix on takes it from its own right.
  s.setMixRoutedToOutput(0, 0, true, true);
  EXPECT_TRUE(s.getMixRoutedToOutput(0, 0, true));
  EXPECT_FALSE(s.getMixRoutedToOutput(0, 0, false));
  // Several feeds of a pseudo output stay together.
  s.setMixRoutedToOutput(0, -1, true, true);
  s.setMixRoutedToOutput(1, -1, true, true);
  s.setMixRoutedToOutput(1, -1, false, true);
  EXPECT_TRUE(s.getMixRoutedToOutput(0, -1, true));
  EXPECT_TRUE(s.getMixRoutedToOutput(1, -1, true));
  EXPECT_TRUE(s.getMixRoutedToOutput(1, -1, false));
  // Exactly one feed per physical output after a run of random switches.
  std::mt19937 rng(7);
  for (int k = 0; k < 500; ++k) {
    const int m = static_cast<int>(rng() % 3) - 1, o = static_cast<int>(rng() % 5) - 2;
    s.setMixRoutedToOutput(m, o, rng() & 1, (rng() % 3) != 0);
    for (int out = 0; out < 3; ++out) {
      int feeds = 0;
      for (int mix = -1; mix < 2; ++mix)
        feeds += s.getMixRoutedToOutput(mix, out, true) + s.getMixRoutedToOutput(mix, out, false);
      ASSERT_LE(feeds, 1) << "output " << out << " after step " << k;
    }
  }
}

TEST(SimpleMixState, SwitchingOnAMissingEntryChangesNothingButMarksDirty) {
  struct Case {
    int m, o;
  };
  for (const Case c : {Case{5, 0}, Case{-2, 1}, Case{0, 2}, Case{0, 40}}) {
    SimpleMixState s(1, 1, 2);
    s.setMixRoutedToOutput(c.m, c.o, true, true);
    EXPECT_TRUE(s.getDirty());
    EXPECT_TRUE(s.getMixRoutedToOutput(-1, 0, true)) << c.m << "," << c.o;
    EXPECT_TRUE(s.getMixRoutedToOutput(-1, 1, false)) << c.m << "," << c.o;
  }
}

TEST(SimpleMixState, NegativeCountsCountAsNoneAndDefaultRoutesOnlyWhereTheyFit) {
  struct Row {
    int inputs, mixes, outputs;
    bool leftRoute, rightRoute;
  };
  const Row rows[] = {
      {-5, -1, -3, false, false}, {1, 0, 0, false, false}, {1, 0, 1, true, false},
      {1, 0, 2, true, true},      {0, 3, 2, true, true},
  };
  for (const Row& r : rows) {
    SimpleMixState s(r.inputs, r.mixes, r.outputs);
    ASSERT_TRUE(s.valid());
    EXPECT_EQ(s.getMixRoutedToOutput(-1, 0, true), r.leftRoute);
    EXPECT_EQ(s.getMixRoutedToOutput(-1, 1, false), r.rightRoute);
    EXPECT_EQ(s.getInputLevel(0), r.inputs > 0 ? 1.0f : 0.0f);
    EXPECT_EQ(s.getMixLevel(-1), 1.0f);  // the main mix always exists
    s.resetToDefaultConfiguration(true);
    EXPECT_TRUE(s.getDirty());
  }
}

TEST(SimpleMixState, ResetRestoresDefaultsAndMarksDirtyOnlyWhenAsked) {
  std::mt19937 rng(3);
  SimpleMixState s(4, 2, 4), fresh(4, 2, 4);
  mixtest::randomize(s, 4, 2, 4, rng);
  s.clearDirty();
  s.resetToDefaultConfiguration(false);
  EXPECT_FALSE(s.getDirty());
  mixtest::expectSameEntries(s, fresh, 4, 2, 4);
  s.resetToDefaultConfiguration(true);
  EXPECT_TRUE(s.getDirty());
}

TEST(SimpleMixState, InsertAndRemoveInputsKeepTheCount) {
  auto levels = [](SimpleMixState& s) {
    std::vector<float> v;
    for (int i = 0; i < 3; ++i) v.push_back(s.getInputLevel(i));
    return v;
  };
  struct Case {
    const char* what;
    std::function<void(SimpleMixState&)> op;
    std::vector<float> expected;
  };
  const Case cases[] = {
      {"insert 1 at 0", [](SimpleMixState& s) { s.insertInputs(1, 0); }, {1.0f, 0.1f, 0.2f}},
      {"insert 1 at 2", [](SimpleMixState& s) { s.insertInputs(1, 2); }, {0.1f, 0.2f, 1.0f}},
      {"insert 2 at 1", [](SimpleMixState& s) { s.insertInputs(2, 1); }, {0.1f, 1.0f, 1.0f}},
      {"insert huge at 1", [](SimpleMixState& s) { s.insertInputs(~0ull, 1); }, {0.1f, 1.0f, 1.0f}},
      {"insert at 3", [](SimpleMixState& s) { s.insertInputs(1, 3); }, {0.1f, 0.2f, 0.3f}},
      {"insert 0 at 0", [](SimpleMixState& s) { s.insertInputs(0, 0); }, {0.1f, 0.2f, 0.3f}},
      {"remove 0", [](SimpleMixState& s) { s.removeInput(0); }, {0.2f, 0.3f, 1.0f}},
      {"remove 2", [](SimpleMixState& s) { s.removeInput(2); }, {0.1f, 0.2f, 1.0f}},
      {"remove 3", [](SimpleMixState& s) { s.removeInput(3); }, {0.1f, 0.2f, 0.3f}},
      {"remove huge", [](SimpleMixState& s) { s.removeInput(~0ull); }, {0.1f, 0.2f, 0.3f}},
      {"insert then remove",
       [](SimpleMixState& s) {
         s.insertInputs(1, 0);
         s.removeInput(0);
       },
       {0.1f, 0.2f, 1.0f}},
  };
  for (const Case& c : cases) {
    SimpleMixState s(3, 0, 2);
    s.setInputLevel(0, 0.1f);
    s.setInputLevel(1, 0.2f);
    s.setInputLevel(2, 0.3f);
    s.setInputPan(2, 0.9f);
    s.setInputMuteState(1, true);
    s.setInputRoutedToMix(2, -1, false);
    s.clearDirty();
    c.op(s);
    EXPECT_EQ(levels(s), c.expected) << c.what;
    EXPECT_FALSE(s.getDirty()) << c.what;
    EXPECT_FALSE(s.getInputRoutedToMix(2, -1)) << c.what << ": routing moved";
  }
  SimpleMixState s(3, 0, 2);
  s.setInputPan(2, 0.9f);
  s.setInputMuteState(2, true);
  s.removeInput(0);
  EXPECT_EQ(s.getInputPan(1), 0.9f);
  EXPECT_TRUE(s.getInputMuteState(1));
  EXPECT_EQ(s.getInputPan(2), 0.5f);
  EXPECT_FALSE(s.getInputMuteState(2));
}

TEST(SimpleMixState, CopyFromGrowsAndFillsWhatTheSourceLacksWithDefaults) {
  std::mt19937 rng(11);
  struct Sizes {
    int ni, nm, no;
  };
  const std::pair<Sizes, Sizes> pairs[] = {
      {{2, 1, 2}, {4, 1, 2}},
      {{4, 3, 5}, {2, 1, 2}},
      {{3, 0, 1}, {1, 4, 0}},
      {{2, 2, 2}, {2, 2, 2}},
  };
  for (const auto& [src, dst] : pairs) {
    SimpleMixState source(src.ni, src.nm, src.no), target(dst.ni, dst.nm, dst.no);
    mixtest::randomize(source, src.ni, src.nm, src.no, rng);
    mixtest::randomize(target, dst.ni, dst.nm, dst.no, rng);
    target.copyFrom(source, false);
    const int ni = std::max(src.ni, dst.ni), nm = std::max(src.nm, dst.nm), no = std::max(src.no, dst.no);
    SimpleMixState defaults(ni, nm, no);
    for (int i = 0; i < ni; ++i) {
      SimpleMixState& ref = i < src.ni ? source : defaults;
      EXPECT_EQ(target.getInputLevel(i), ref.getInputLevel(i)) << i;
      EXPECT_EQ(target.getInputPan(i), ref.getInputPan(i)) << i;
      for (int m = -1; m < nm; ++m) {
        SimpleMixState& r2 = (i < src.ni && m < src.nm) ? source : defaults;
        EXPECT_EQ(target.getInputRoutedToMix(i, m), r2.getInputRoutedToMix(i, m)) << i << "," << m;
      }
    }
    for (int m = -1; m < nm; ++m) {
      SimpleMixState& ref = m < src.nm ? source : defaults;
      EXPECT_EQ(target.getMixLevel(m), ref.getMixLevel(m)) << m;
      for (int o = -2; o < no; ++o) {
        SimpleMixState& r2 = (m < src.nm && o < src.no) ? source : defaults;
        EXPECT_EQ(target.getMixRoutedToOutput(m, o, true), r2.getMixRoutedToOutput(m, o, true))
            << m << "," << o;
        EXPECT_EQ(target.getMixRoutedToOutput(m, o, false), r2.getMixRoutedToOutput(m, o, false))
            << m << "," << o;
      }
    }
  }
}

TEST(SimpleMixState, CopyFromTakesOverTheDirtyFlagButNotTheTag) {
  SimpleMixState source(2, 1, 2), target(2, 1, 2);
  source.setInputLevel(0, 0.2f);
  ASSERT_TRUE(source.getDirty());
  target.copyFrom(source, true);
  EXPECT_TRUE(target.getDirty());
  EXPECT_FALSE(source.getDirty());
  EXPECT_NE(target.tag(), source.tag());
  target.copyFrom(source, false);
  EXPECT_FALSE(target.getDirty());

  SimpleMixState empty;
  EXPECT_FALSE(empty.valid());
  empty = source;
  EXPECT_TRUE(empty.valid());
  EXPECT_EQ(empty.getInputLevel(0), 0.2f);

  // An invalid source has nothing to give.
  SimpleMixState invalid, keeps(1, 0, 2);
  keeps.setInputLevel(0, 0.7f);
  keeps.copyFrom(invalid, true);
  EXPECT_EQ(keeps.getInputLevel(0), 0.7f);
  keeps.copyFrom(keeps, true);
  EXPECT_EQ(keeps.getInputLevel(0), 0.7f);
}

TEST(SimpleMixState, TwoThreadsCopyingIntoEachOtherDoNotDeadlock) {
  SimpleMixState a(8, 2, 4), b(8, 2, 4);
  a.setInputLevel(0, 0.25f);
  b.setInputLevel(0, 0.25f);
  std::thread t1([&] {
    for (int k = 0; k < 2000; ++k) a.copyFrom(b, false);
  });
  std::thread t2([&] {
    for (int k = 0; k < 2000; ++k) b.copyFrom(a, false);
  });
  t1.join();
  t2.join();
  EXPECT_EQ(a.getInputLevel(0), 0.25f);
  EXPECT_EQ(b.getInputLevel(0), 0.25f);
}

TEST(SimpleMixState, CopiesAndClones) {
  std::mt19937 rng(5);
  SimpleMixState s(3, 2, 2);
  mixtest::randomize(s, 3, 2, 2, rng);
  SimpleMixState copy(s);
  EXPECT_EQ(copy.tag(), s.tag());
  EXPECT_EQ(copy.getDirty(), s.getDirty());
  mixtest::expectSameEntries(copy, s, 3, 2, 2);
  copy.setInputLevel(0, 0.0f);
  EXPECT_NE(s.getInputLevel(0), 0.0f);  // its own tables

  std::unique_ptr<Taggable> clone(s.clone());
  auto* c = dynamic_cast<SimpleMixState*>(clone.get());
  ASSERT_NE(c, nullptr);
  ASSERT_NE(c, &s);
  EXPECT_TRUE(c->valid());
  EXPECT_NE(c->tag(), s.tag());
  mixtest::expectSameEntries(*c, s, 3, 2, 2);

  std::unique_ptr<Streamable> shell(s.clone(Streamable::eBuildForUnpack));
  auto* e = dynamic_cast<SimpleMixState*>(shell.get());
  ASSERT_NE(e, nullptr);
  EXPECT_FALSE(e->valid());
  EXPECT_EQ(e->tag(), s.tag());
}

TEST(SimpleMixState, CallsOnAnInvalidStateAreReportedAndHarmless) {
  FatalReports reports;
  SimpleMixState s;
  EXPECT_FALSE(s.valid());
  EXPECT_EQ(s.getInputLevel(0), 0.0f);
  s.setInputLevel(0, 1.0f);
  EXPECT_FALSE(s.getMixRoutedToOutput(-1, 0, true));
  s.setMixRoutedToOutput(-1, 0, true, true);
  s.resetToDefaultConfiguration(true);
  EXPECT_FALSE(s.getDirty());
  s.insertInputs(3, 0);
  s.removeInput(0);
  ASSERT_EQ(reports.messages.size(), 5u);
  for (const std::string& m : reports.messages) EXPECT_EQ(m, "Function called on invalid MixerState!");
  EXPECT_EQ(s.revisionMajor(), 1);
  EXPECT_EQ(s.revisionMinor(), 0);
}

}  // namespace
