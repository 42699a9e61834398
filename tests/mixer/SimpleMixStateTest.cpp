#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cmath>
#include <functional>
#include <limits>
#include <thread>
#include <tuple>

#include "host/HostHooks.h"
#include "host/IniFile.h"
#include "mixer/MixStateTesting.h"
#include "tonebits/mixer/Aud__SimpleMixState.h"

namespace {

using Aud::SimpleMixState;
using mixtest::Dims;
using Set = std::function<void(SimpleMixState&)>;

TEST(SimpleMixState, LevelSettersClampPanSetterDoesNot) {
  const float inf = std::numeric_limits<float>::infinity();
  const std::pair<float, float> rows[] = {{2.0f, 1.5f}, {-1.0f, 0.0f},      {1.5f, 1.5f},
                                          {0.0f, 0.0f}, {0.3f, 0.3f},       {inf, 1.5f},
                                          {-inf, 0.0f}, {1.5000001f, 1.5f}, {7.0f, 1.5f}};
  SimpleMixState s(1, 1, 2);
  for (const auto& [in, level] : rows) {
    s.setInputLevel(0, in);
    s.setMixLevel(0, in);
    s.setInputPan(0, in);
    EXPECT_EQ(s.getInputLevel(0), level) << in;
    EXPECT_EQ(s.getMixLevel(0), level) << in;
    EXPECT_EQ(s.getInputPan(0), in);
  }
  s.setInputLevel(0, std::numeric_limits<float>::quiet_NaN());
  EXPECT_TRUE(std::isnan(s.getInputLevel(0)));
}

// Each setter marks dirty and changes its own entry only: exactly the given
// stored line is new against a fresh state's. Out of range, nothing changes.
TEST(SimpleMixState, SettersChangeTheirOwnEntryOnlyGettersReadNeutralOutOfRange) {
  using S = SimpleMixState;
  auto stored = [](S& s) {
    KvIniFile f;
    s.storeCompatibleConfigurationInformation(f);
    std::vector<std::string> out;
    for (const String& name : f.sectionNames())
      for (const auto& p : f[name]) out.push_back(std::string(name.c_str()) + " " + p.line().c_str());
    return out;
  };
  const std::pair<Set, std::string> cases[] = {
      {[](S& s) { s.setInputLevel(2, 0.25f); }, "InputChannels.Fader 002=0.2500000000"},
      {[](S& s) { s.setInputPan(1, 0.0f); }, "InputChannels.Pan 001=0.0000000000"},
      {[](S& s) { s.setInputMuteState(0, true); }, "InputChannels.Mute 000=1"},
      {[](S& s) { s.setInputSoloState(2, true); }, "InputChannels.Solo 002=1"},
      {[](S& s) { s.setInputRoutedToMix(1, 1, true); }, "InputChannels.RouteToMix 001->02=1"},
      {[](S& s) { s.setMixLevel(-1, 0.5f); }, "MixChannels.Fader 00=0.5000000000"},
      {[](S& s) { s.setMixMuteState(1, true); }, "MixChannels.Mute 02=1"},
      {[](S& s) { s.setMixSoloState(0, true); }, "MixChannels.Solo 01=1"},
      {[](S& s) { s.setMixRoutedToOutput(-1, 0, true, false); }, "MixChannels.RouteToOutput 00L->02=0"},
      // Out of range; the main mix feeds no pseudo output.
      {[](S& s) { s.setInputLevel(-1, 0.5f); }, ""},
      {[](S& s) { s.setInputLevel(3, 0.5f); }, ""},
      {[](S& s) { s.setInputPan(3, 0.1f); }, ""},
      {[](S& s) { s.setInputMuteState(-7, true); }, ""},
      {[](S& s) { s.setInputSoloState(3, true); }, ""},
      {[](S& s) { s.setInputRoutedToMix(0, 2, true); }, ""},
      {[](S& s) { s.setInputRoutedToMix(0, -2, true); }, ""},
      {[](S& s) { s.setInputRoutedToMix(3, 0, true); }, ""},
      {[](S& s) { s.setMixLevel(-2, 0.5f); }, ""},
      {[](S& s) { s.setMixLevel(2, 0.5f); }, ""},
      {[](S& s) { s.setMixMuteState(2, true); }, ""},
      {[](S& s) { s.setMixSoloState(-2, true); }, ""},
      {[](S& s) { s.setMixRoutedToOutput(0, 3, true, false); }, ""},
      {[](S& s) { s.setMixRoutedToOutput(-1, -2, true, true); }, ""},
      {[](S& s) { s.setMixRoutedToOutput(0, -3, true, true); }, ""},
  };
  S fresh(3, 2, 3);
  EXPECT_TRUE(fresh.valid() && !fresh.getDirty());
  const std::vector<std::string> before = stored(fresh);
  for (std::size_t k = 0; k < std::size(cases); ++k) {
    SCOPED_TRACE(k);
    const auto& [set, line] = cases[k];
    S s(3, 2, 3);
    set(s);
    EXPECT_EQ(s.getDirty(), !line.empty());
    std::vector<std::string> changed;
    for (const std::string& l : stored(s))
      if (std::find(before.begin(), before.end(), l) == before.end()) changed.push_back(l);
    EXPECT_EQ(changed,
              line.empty() ? std::vector<std::string>{} : std::vector<std::string>{"SimpleMixState." + line});
  }
  // Getters out of the tables read a neutral value, not memory beside them.
  for (int bad : {-1000000, -3, 3, 4, 1 << 30}) {
    EXPECT_EQ(fresh.getInputLevel(bad) + fresh.getInputPan(bad) + fresh.getMixLevel(bad), 0.0f) << bad;
    EXPECT_FALSE(fresh.getInputMuteState(bad) || fresh.getInputSoloState(bad) ||
                 fresh.getInputRoutedToMix(bad, -1) || fresh.getInputRoutedToMix(0, bad) ||
                 fresh.getMixMuteState(bad) || fresh.getMixSoloState(bad) ||
                 fresh.getMixRoutedToOutput(bad, 0, true) || fresh.getMixRoutedToOutput(0, bad, false))
        << bad;
  }
}

TEST(SimpleMixState, PhysicalOutputHasOneFeed) {
  SimpleMixState s(2, 2, 3);
  // Switching on a missing entry marks dirty but takes no feed.
  for (auto [m, o] : {std::pair{5, 0}, {-2, 1}, {0, 3}, {0, 40}}) s.setMixRoutedToOutput(m, o, true, true);
  EXPECT_TRUE(s.getDirty() && s.getMixRoutedToOutput(-1, 0, true) && s.getMixRoutedToOutput(-1, 1, false));
  // Mix 0's right side takes output 0 from the main mix's left side.
  s.setMixRoutedToOutput(0, 0, false, true);
  EXPECT_TRUE(s.getMixRoutedToOutput(0, 0, false) && !s.getMixRoutedToOutput(-1, 0, true) &&
              s.getMixRoutedToOutput(-1, 1, false));
  // Switching the other side of the same mix on takes it from its own right.
  s.setMixRoutedToOutput(0, 0, true, true);
  EXPECT_TRUE(s.getMixRoutedToOutput(0, 0, true) && !s.getMixRoutedToOutput(0, 0, false));
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

// Negative counts count as none, and the default routes go only where they
// fit, after a reset too; a reset marks dirty only when asked.
TEST(SimpleMixState, DefaultsAndReset) {
  std::mt19937 rng(3);
  // The counts asked for, and whether the main mix feeds outputs 0 and 1.
  const std::tuple<Dims, bool, bool> rows[] = {{{-5, -1, -3}, false, false}, {{1, 0, 0}, false, false},
                                               {{1, 0, 1}, true, false},     {{1, 0, 2}, true, true},
                                               {{0, 3, 2}, true, true},      {{4, 2, 4}, true, true}};
  for (auto [c, left, right] : rows) {
    SimpleMixState s(c.ni, c.nm, c.no), fresh(c.ni, c.nm, c.no);
    const Dims n{std::max(c.ni, 0), std::max(c.nm, 0), std::max(c.no, 0)};
    mixtest::randomize(s, n, rng);
    s.clearDirty();
    s.resetToDefaultConfiguration(false);
    EXPECT_FALSE(s.getDirty());
    mixtest::expectSameEntries(s, fresh, n);
    EXPECT_EQ(s.getMixRoutedToOutput(-1, 0, true), left);
    EXPECT_EQ(s.getMixRoutedToOutput(-1, 1, false), right);
    EXPECT_EQ(s.getInputLevel(0), c.ni > 0 ? 1.0f : 0.0f);
    EXPECT_EQ(s.getMixLevel(-1), 1.0f);  // the main mix always exists
    s.resetToDefaultConfiguration(true);
    EXPECT_TRUE(s.getDirty());
  }
}

// Channels move whole (level and mute) and the count stays; routing does
// not move. The layout names the old channels, "n" a default one.
TEST(SimpleMixState, InsertAndRemoveInputsKeepTheCount) {
  const float level[] = {0.1f, 0.2f, 0.3f};
  // Insert `count` at `at`, or remove `at`; the layout after it.
  const std::tuple<char, unsigned long long, unsigned long long, const char*> cases[] = {
      {'i', 1, 0, "n01"}, {'i', 1, 2, "01n"},    {'i', 2, 1, "0nn"}, {'i', ~0ull, 1, "0nn"},
      {'i', 1, 3, "012"}, {'i', 0, 0, "012"},    {'r', 0, 0, "12n"}, {'r', 0, 2, "01n"},
      {'r', 0, 3, "012"}, {'r', 0, ~0ull, "012"}};
  for (auto [op, count, at, layout] : cases) {
    SCOPED_TRACE(testing::Message() << op << count << "@" << at);
    SimpleMixState s(3, 0, 2);
    for (int i = 0; i < 3; ++i) s.setInputLevel(i, level[i]);
    s.setInputMuteState(1, true);
    s.setInputRoutedToMix(2, -1, false);
    s.clearDirty();
    op == 'i' ? s.insertInputs(count, at) : s.removeInput(at);
    for (int i = 0; i < 3; ++i) {
      const int from = layout[i] == 'n' ? -1 : layout[i] - '0';
      EXPECT_EQ(s.getInputLevel(i), from < 0 ? 1.0f : level[from]) << i;
      EXPECT_EQ(s.getInputMuteState(i), from == 1) << i;
    }
    EXPECT_FALSE(s.getDirty());
    EXPECT_FALSE(s.getInputRoutedToMix(2, -1));
  }
}

TEST(SimpleMixState, TwoThreadsCopyingIntoEachOtherDoNotDeadlock) {
  SimpleMixState a(8, 2, 4), b(8, 2, 4);
  for (SimpleMixState* x : {&a, &b}) x->setInputLevel(0, 0.25f);
  std::atomic<int> ready = 0;  // both start together
  auto copies = [&ready](SimpleMixState& to, SimpleMixState& from) {
    for (++ready; ready < 2;) std::this_thread::yield();
    for (int k = 0; k < 200000; ++k) to.copyFrom(from, false);
  };
  std::thread t1(copies, std::ref(a), std::ref(b)), t2(copies, std::ref(b), std::ref(a));
  for (std::thread* t : {&t1, &t2}) t->join();
  EXPECT_TRUE(a.getInputLevel(0) == 0.25f && b.getInputLevel(0) == 0.25f);
}

TEST(SimpleMixState, CopiesAndClones) {
  std::mt19937 rng(5);
  SimpleMixState s(3, 2, 2), target(3, 2, 2), empty, invalid;
  mixtest::randomize(s, {3, 2, 2}, rng);
  SimpleMixState copy(s);  // the tag and dirty flag too, in tables of its own
  EXPECT_TRUE(copy.tag() == s.tag() && copy.getDirty());
  mixtest::expectSameEntries(copy, s, {3, 2, 2});
  copy.setInputLevel(0, 0.0f);
  EXPECT_NE(s.getInputLevel(0), 0.0f);

  target.copyFrom(s, true);  // takes over the dirty flag, not the tag
  EXPECT_TRUE(target.getDirty());
  EXPECT_FALSE(s.getDirty());
  EXPECT_NE(target.tag(), s.tag());
  target.copyFrom(s, false);
  EXPECT_FALSE(target.getDirty());
  empty = s;
  mixtest::expectSameEntries(empty, s, {3, 2, 2});
  target.copyFrom(invalid, true);  // an invalid source has nothing to give
  target.copyFrom(target, true);   // nor does the state itself
  mixtest::expectSameEntries(target, s, {3, 2, 2});

  // copyFrom grows the target and fills what the source lacks with defaults.
  const std::pair<Dims, Dims> pairs[] = {
      {{2, 1, 2}, {4, 1, 2}}, {{4, 3, 5}, {2, 1, 2}}, {{3, 0, 1}, {1, 4, 0}}, {{2, 2, 2}, {2, 2, 2}}};
  for (const auto& [src, dst] : pairs) {
    SimpleMixState source(src.ni, src.nm, src.no), into(dst.ni, dst.nm, dst.no);
    mixtest::randomize(source, src, rng);
    mixtest::randomize(into, dst, rng);
    into.copyFrom(source, false);
    const Dims n{std::max(src.ni, dst.ni), std::max(src.nm, dst.nm), std::max(src.no, dst.no)};
    SimpleMixState defaults(n.ni, n.nm, n.no);
    mixtest::expectSameEntries(into, source, n, true, src, &defaults);
  }

  std::unique_ptr<Taggable> clone(s.clone());
  auto* c = dynamic_cast<SimpleMixState*>(clone.get());
  ASSERT_TRUE(c && c != &s && c->valid());
  EXPECT_NE(c->tag(), s.tag());
  mixtest::expectSameEntries(*c, s, {3, 2, 2});
  std::unique_ptr<Streamable> shell(s.clone(Streamable::eBuildForUnpack));  // empty, with the tag
  auto* e = dynamic_cast<SimpleMixState*>(shell.get());
  ASSERT_TRUE(e && !e->valid() && e->tag() == s.tag());
}

TEST(SimpleMixState, CallsOnAnInvalidStateAreReportedAndHarmless) {
  std::vector<std::string> reports;
  host::setFatalReportHandler([&](const char* m) { reports.emplace_back(m); });
  SimpleMixState s;
  EXPECT_FALSE(s.getInputLevel(0) || s.getMixRoutedToOutput(-1, 0, true));
  s.setInputLevel(0, 1.0f);
  s.setMixRoutedToOutput(-1, 0, true, true);
  s.resetToDefaultConfiguration(true);
  s.insertInputs(3, 0);
  s.removeInput(0);
  KvIniFile f;
  EXPECT_EQ(s.storeCompatibleConfigurationInformation(f), Aud::sSuccess);
  EXPECT_EQ(s.retrieveCompatibleConfigurationInformation(f), Aud::sSuccess);
  EXPECT_TRUE(f.sectionNames().empty() && !s.getDirty());
  host::setFatalReportHandler({});
  EXPECT_EQ(reports, std::vector<std::string>(7, "Function called on invalid MixerState!"));
}

}  // namespace
