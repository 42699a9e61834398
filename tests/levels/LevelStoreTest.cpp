#include <gtest/gtest.h>

#include <cmath>
#include <functional>
#include <thread>

#include "LevelTestSupport.h"

namespace {

using namespace levels_test;

Node node(const char* text) { return parse(text).at(0); }

// An edit of the store `s`, named by its own text.
#define EDIT(...) #__VA_ARGS__, [&](Store & s) { s.__VA_ARGS__; }
struct EditCase {
  const char *before, *text;
  std::function<void(Store&)> apply;
  const char* after;
  bool modifies = true;
};

// Every edit, even one changing nothing, clears every acknowledgement.
void runEditCases(const std::vector<EditCase>& cases) {
  for (const EditCase& c : cases) {
    SCOPED_TRACE(std::string(c.before) + " | " + c.text);
    Store s;
    fill(s, c.before);
    int reader = 0, tag = 0;
    s.acknowledgeModification(&reader, &tag);
    s.acknowledgeModification(&tag, nullptr);
    c.apply(s);
    EXPECT_EQ(fields(s), fields(c.after));
    EXPECT_EQ(s.queryModification(&reader, &tag), c.modifies);
    EXPECT_EQ(s.queryModification(&tag, nullptr), c.modifies);
  }
}

TEST(LevelStoreNode, SearchKeyDefaultsAndOnlyAnEndGuardActsAQuarterFrameLater) {
  EXPECT_EQ(fields({Node(3.0)}), fields({Node(3.0, Node().level, N, false)}));
  EXPECT_FALSE(Node(2.0, 0.1f) < Node(2.0, 0.9f));  // only raw times order nodes
  FrameDuration fd(0.04);
  for (Store::eNodeType type : {N, SG, MD}) EXPECT_EQ(Node(2.0, 1.0f, type, false).getTime(), 2.0);
  const Node end = node("E2:1");
  EXPECT_DOUBLE_EQ(end.getTime(), 2.01);
  host::setFrameDuration(0.08);  // read afresh on every call
  EXPECT_DOUBLE_EQ(end.getTime(), 2.02);
}

// Insert, erase, insertRange and the setters each tie guards by their own rule.
TEST(LevelStoreEdits, ReplaceTheirWindowAndTieGuards) {
  Store src;
  fill(src, "0:.1 1:.9 2:.8 3:.1");
  runEditCases({
      // Every node within 1e-6 s of the new one goes.
      {"1:.25", EDIT(insert(Node(1.0000009, .75f))), "1.0000009:.75"},
      {"1:.25", EDIT(insert(Node(1.000002, .75f))), "1:.25 1.000002:.75"},
      // Below time resolution equal times stay; the newcomer goes after.
      {"1e12:.25", EDIT(insert(Node(1e12, .75f))), "1e12:.25 1e12:.75"},
      // A start guard takes the level of the node after, an end guard that of the Normal before.
      {"S0:.3 E2:.3", EDIT(insert(s.begin(), node("M1:.5"))), "S0:.5 M1:.5 E2:.5"},
      {"1:.4 2:.6", EDIT(insert(node("S.5:.9"))), "S.5:.4 1:.4 2:.6"},
      {"1:.4 3:.6", EDIT(insert(node("E2:.9"))), "1:.4 E2:.4 3:.6"},
      {"M1:.4", EDIT(insert(node("E2:.9"))), "M1:.4 E2:.4"},
      {"1:.4", EDIT(insert(node("E.5:.9"))), "E.5:.9 1:.4"},
      {"S0:.1 1:.4 2:.6", EDIT(insert(node("E1:.9"))), "S0:.1 E1:.1 2:.6"},
      {"-1:.5 S0:.1 1:.4 2:.6", EDIT(insert(node("E1:.9"))), "-1:.5 S0:.6 E1:.6 2:.6"},
      {"S0:.3 E2:.3", EDIT(insert_noAdjust(s.end(), Node(1, .5f))), "S0:.3 1:.5 E2:.3"},
      {"S0:.1 1:.4 2:.6", EDIT(erase(s.find(1))), "S0:.6 2:.6"},
      {"1:.5 2:.7 E3:.9", EDIT(erase(s.find(2))), "1:.5 E3:.5"},
      {"S0:.3 1:.5 E2:.6", EDIT(erase(s.find(1))), "S0:.3 E2:.6"},
      {"S0:.1 1:.4 2:.6", EDIT(erase(s.end())), "S0:.1 1:.4 2:.6"},
      {"S0:.1 1:.4 2:.6", EDIT(erase_noAdjust(s.find(1))), "S0:.1 2:.6"},
      // Ranges tie guards around the node after them, never a leading start guard.
      {"-1:.5 S0:.1 1:.4 2:.6", EDIT(erase(s.find(1), s.find(2))), "-1:.5 S0:.6 2:.6"},
      {"0:.2 1:.5 2:.7 E3:.9", EDIT(erase(1.5, 2.5)), "0:.2 1:.5 E3:.5"},
      {"0:.2 M1:.5 2:.7 E3:.9", EDIT(erase(1.5, 2.5)), "0:.2 M1:.5 E3:.9"},
      {"-1:.5 S0:.1 1:.4 2:.6", EDIT(erase(1.5, .5)), "-1:.5 S0:.1 1:.4 2:.6"},
      {"-1:.5 S0:.1 1:.4 2:.6", EDIT(erase_noAdjust(.5, 1.5)), "-1:.5 S0:.1 2:.6"},
      {"S0:.1 1:.4 2:.6", EDIT(clear()), ""},
      // Non-guard erasers keep and re-tie guards; a section left bare goes to unity.
      {"-1:.5 S0:.3 1:.4 2:.6 E3:.6 4:.2", EDIT(eraseNonGuard(s.find(0), s.find(3.5))),
       "-1:.5 S0:1 E3:1 4:.2"},
      {"S0:.3 1:.4 2:.6 E3:.6", EDIT(eraseNonGuard(s.find(1.5), s.find(3))), "S0:.4 1:.4 E3:.4"},
      {"S0:.3 1:.4 2:.6 E3:.6", EDIT(eraseNonGuard(2.5, .5)), "S0:.3 1:.4 2:.6 E3:.6"},
      // insertRange replaces the copied span.
      {"0:.1 1:.2 1.5:.3 2.0000005:.4 2.1:.45 3:.5", EDIT(insertRange(src.find(1), src.find(3))),
       "0:.1 1:.9 2:.8 2.1:.45 3:.5"},
      {"-1:.5 S0:.3 E5:.3", EDIT(insertRange(src.find(1), src.find(3))), "-1:.5 S0:.9 1:.9 2:.8 E5:.8"},
      {"S0:.3 E5:.3", EDIT(insertRange(src.find(1), src.find(3))), "S0:.3 1:.9 2:.8 E5:.8"},
      {"0:.1 1:.2 2:.3", EDIT(insertRange(s.find(0), s.end())), "0:.1 1:.2 2:.3"},
      // setLevel also sets an adjacent guard; the other setters leave guards alone.
      {"S0:.3 1:.3 E2:.3", EDIT(find(1).setLevel(.9f)), "S0:.9 1:.9 E2:.9"},
      {"S0:.3 1:.3 E2:.3", EDIT(find(0).setLevel(.9f)), "S0:.9 1:.3 E2:.3"},
      {"0:.3 1:.3 S2:.3", EDIT(find(1).setLevel(.9f)), "0:.3 1:.9 S2:.3"},
      {"S0:.3 1:.5 E2:.5 3:.8", EDIT(find(1).setTime(2.5)), "S0:.3 2.5:.5 3:.8"},
      {"S0:.3 1:.5 E2:.5", EDIT(find(1).setInAudioBlackSection(true)), "S0:.3 1:.5* E2:.5"},
  });
}

TEST(StoreIterator, SetTimeErasesWhatTheMovePassesAndKeepsTheOrder) {
  // What the move passes goes, and what lies within 1e-6 s beyond; the iterator follows.
  const std::tuple<const char*, double, double, const char*> rows[] = {
      {"1:1 2:2 3:3", 2, 2.9999995, "1:1 2.9999995:2 3:3"},
      {"1:1 2:2 3:3 4:4 5:5", 2, 4.5, "1:1 4.5:2 5:5"},
      {"1:1 2:2 3:3 4:4", 2, 3.9999995, "1:1 3.9999995:2"},
      {"1:1 2:2 3:3 4:4", 3, 1.0000005, "1.0000005:3 4:4"},
      // A neighbour closer than 5 ms is passed over too: the store stays ordered.
      {"1:1 1.003:1.003 2:2", 1, 1.5, "1.5:1 2:2"},
      {"1:1 1.997:1.997 2:2", 2, 1.5, "1:1 1.5:2"},
      {"1:1 2:2 3:3", 2, 2, "1:1 2:2 3:3"},
  };
  for (const auto& [before, from, to, after] : rows) {
    SCOPED_TRACE(testing::Message() << before << " | " << from << " to " << to);
    Store s;
    fill(s, before);
    Store::iterator it = s.find(from);
    it.setTime(to);
    EXPECT_EQ(it.getRawTime(), to);
    EXPECT_EQ(it.getLevel(), static_cast<float>(from));  // each row's levels are its times
    EXPECT_EQ(fields(s), fields(after));
  }
}

TEST(StoreIterator, MovesStopOrWrapAtBothEnds) {
  Store s;
  EXPECT_EQ(s.begin(), s.end());
  Store::iterator it = s.end();
  EXPECT_EQ(--it, s.end());  // empty: the end has no last node
  fill(s, "1:.1 2:.2");
  EXPECT_TRUE(it.valid());
  EXPECT_EQ(++it, s.end());  // the end position stays put
  EXPECT_EQ((--it).getRawTime(), 2.0);
  EXPECT_EQ((--it).getRawTime(), 1.0);
  EXPECT_EQ(--it, s.end());  // from the first node to the end position
  EXPECT_EQ(s.insert(Node(3, .3f)).getRawTime(), 3.0);
  EXPECT_FALSE(Store::iterator().valid());
  EXPECT_NE(Store::iterator(), s.end());
  EXPECT_NE(Store().end(), s.end());
}

TEST(LevelStoreBlack, BlackSectionsKeepOnlyTheirGuards) {
  const char* before = "S1:.5 2:.5 3:.7 E4:.7 6:.2";
  runEditCases({
      {before, EDIT(setRangeToBlackSection(1, 5)), "S1:.7* E4:.7* 6:.2"},
      {before, EDIT(setRangeToBlackSection(5, 1)), "S1:.7* E4:.7* 6:.2"},
      {before, EDIT(setRangeToBlackSection(1, 10)), before, false},     // no node at or after the end
      {before, EDIT(setRangeToBlackSection(2.5, 2.6)), before, false},  // no node in the range
      {"S1:.7* E4:.7* 6:.2", EDIT(setRangeToNonBlackSection(0, 5)), "S1:.7 E4:.7 6:.2"},
      {"S1:.7* E4:.7* 6:.2", EDIT(setRangeToNonBlackSection(5, 0)), "S1:.7* E4:.7* 6:.2", false},  // t2 < t1
  });
  Store s;
  EXPECT_FALSE(s.isInAudioBlackAtTime(1.0));
  fill(s, before);
  s.setRangeToBlackSection(1, 5);
  for (const auto& [t, black] : std::vector<std::pair<double, bool>>{
           {0.5, false}, {1.0, true}, {2.5, true}, {4.5, true}, {6.0, false}, {7.0, false}})
    EXPECT_EQ(s.isInAudioBlackAtTime(t), black) << t;
}

TEST(LevelStoreLevel, InterpolatesHoldsAndBridgesGaps) {
  FrameDuration fd(0.04);
  Store s;
  EXPECT_EQ(s.getLevelAtTime(1.0), 1.0f);
  fill(s, "1:.2 2:.6 E3:.3 S4:.9 5:.1");
  const auto ramp = [](float a, float b, double f) {
    return static_cast<float>(static_cast<double>(b - a) * f) + a;
  };
  // Time, then the level as a fraction of the way between two levels.
  const std::tuple<double, float, float, double> rows[] = {
      {0.0, .2f, .2f, 0},          {1.0, .2f, .2f, 0},  {1.5, .2f, .6f, .5}, {2.0000005, .6f, .6f, 0},
      {3.0, .6f, .3f, 1.0 / 1.01}, {3.01, .3f, .3f, 0}, {3.5, .3f, .3f, 0},  {3.9999995, .9f, .9f, 0},
      {4.5, .9f, .1f, .5},         {6.0, .1f, .1f, 0}};
  for (const auto& [t, a, b, f] : rows) EXPECT_EQ(s.getLevelAtTime(t), ramp(a, b, f)) << t;
  host::setFrameDuration(0.08);  // the end guard now acts at 3.02
  EXPECT_EQ(s.getLevelAtTime(3.0), ramp(.6f, .3f, 1.0 / 1.02));
  EXPECT_EQ(s.getLevelAtTime(3.02), .3f);
}

TEST(LevelStoreLevel, NoSpanBetweenNodesGivesTheLaterLevel) {
  // An end guard acting at 2.25 meets the next node exactly: no division by zero.
  FrameDuration fd(1.0);
  Store s;
  fill(s, "1:.2 E2:.4 2.25:.8");
  EXPECT_EQ(s.getLevelAtTime(2.1), .8f);
  EXPECT_EQ(s.getLevelAtTime(2.2), .8f);
  // A span too wide for a double is no span either.
  Store wide;
  fill(wide, "-1.7e308:0 1.7e308:1");
  EXPECT_EQ(wide.getLevelAtTime(1e308), 1.0f);
}

TEST(LevelStoreRange, ClassifiesTheLevelOverARange) {
  // The level is left alone (-5) when the range varies.
  const std::tuple<const char*, double, double, Store::eRangeState, float> rows[] = {
      {"1:0", 5, 6, Store::RangeSilent, 0.0f},
      {"1:.5 2:.5 3:.5", 1.5, 2.5, Store::RangeConstant, .5f},
      {"1:.5 2:.5 3:.8", 2.5, 1.5, Store::RangeConstant, .5f},  // times swapped
      {"1:.5 2:.6 3:.5", 1.5, 2.5, Store::RangeVarying, -5},
      {"1:0 2:1", 5, 6, Store::RangeUnity, 1.0f},
      {"1:nan 2:nan", 1.5, 2.5, Store::RangeVarying, -5},
  };
  for (const auto& [nodes, t1, t2, state, expected] : rows) {
    SCOPED_TRACE(testing::Message() << nodes << " over " << t1 << ", " << t2);
    Store s;
    fill(s, nodes);
    float level = -5;
    EXPECT_EQ(s.getRangeState(t1, t2, &level), state);
    EXPECT_EQ(level, expected);
    EXPECT_EQ(s.getRangeState(t1, t2, nullptr), state);
  }
}

TEST(StoreModification, AcknowledgementsArePerReaderAndTag) {
  Store s;
  int r1 = 0, r2 = 0, t1 = 0, t2 = 0;
  EXPECT_TRUE(s.queryModification(&r1, &t1));  // never acknowledged
  s.acknowledgeModification(&r1, &t1);
  s.acknowledgeModification(&r1, &t1);
  s.acknowledgeModification(&r2, nullptr);
  for (auto [r, t, modified] : {std::tuple<int*, int*, bool>{&r1, &t1, false},
                                {&r1, &t2, true},
                                {&r2, &t1, true},
                                {&r2, nullptr, false},
                                {&r1, nullptr, true}})
    EXPECT_EQ(s.queryModification(r, t), modified);
  // Reading is not an edit; setModified alone is.
  fill(s, "1:.2 2:.4");
  s.acknowledgeModification(&r1, &t1);
  (void)s.getLevelAtTime(1.5);
  (void)s.getRangeState(0, 3, nullptr);
  EXPECT_FALSE(s.queryModification(&r1, &t1));
  s.setModified();
  EXPECT_TRUE(s.queryModification(&r1, &t1));
}

TEST(LevelStoreCopy, CopiesShareTheReEntrantLockAndAssignmentIsAnEdit) {
  Store a;
  fill(a, "1:.5 2:.6");
  int reader = 0;
  a.acknowledgeModification(&reader, nullptr);
  Store b(a);
  EXPECT_TRUE(b.getLockObject().sharesLockWith(a.getLockObject()));
  EXPECT_EQ(fields(b), fields(a));
  EXPECT_FALSE(b.queryModification(&reader, nullptr));  // the acknowledgements come along
  b.insert(Node(3, .7f));
  EXPECT_EQ(a.size(), 2u);
  {
    const criticalSection lock = b.getLockObject();
    CriticalSectionLock hold(lock);
    b.insert(Node(4, .5f));  // re-enters from the holding thread
    bool otherGotIt = true;
    std::thread([&] {
      if ((otherGotIt = a.getLockObject().tryEnter())) a.getLockObject().leave();
    }).join();
    EXPECT_FALSE(otherGotIt);  // held across calls, for every copy
  }
  // Assignment replaces nodes a reader of the destination holds: an edit.
  Store c;
  EXPECT_FALSE(c.getLockObject().sharesLockWith(a.getLockObject()));
  c.acknowledgeModification(&reader, nullptr);
  c = a;
  EXPECT_TRUE(c.queryModification(&reader, nullptr));
  EXPECT_TRUE(c.getLockObject().sharesLockWith(a.getLockObject()));
  EXPECT_EQ(fields(c), fields(a));
}

TEST(LevelStoreErrors, BadInputIsReportedAndChangesNothing) {
  int reports = 0;
  host::setFatalReportHandler([&](const char*) { ++reports; });
  Store s, other;
  fill(s, "1:.5 2:.6 3:.7");
  fill(other, "1:.5");
  const double inf = INFINITY, nan = NAN;
  const std::function<void()> edits[] = {
      [&] { EXPECT_EQ(s.insert(Node(nan, .1f)), s.end()); },
      [&] { s.insert(Node(inf, .1f)); },
      [&] { s.insert_noAdjust(Node(-inf, .1f)); },
      [&] { s.insert(Node(1.5, .1f, static_cast<Store::eNodeType>(7), false)); },
      [&] { s.erase(other.begin()); },
      [&] { s.erase(s.find(3), s.find(1)); },
      [&] { s.eraseNonGuard(s.find(3), s.find(1)); },
      [&] { s.insertRange(s.find(1), other.end()); },
      [&] { s.insertRange(s.find(3), s.find(1)); },
      [&] { s.find(2).setTime(nan); },
      [&] { s.find(2).setNodeType(static_cast<Store::eNodeType>(-1)); },
      [&] { s.end().setLevel(0.0f); },
      [&] { EXPECT_EQ(s.end().getLevel(), -1.0f); },
      [&] { EXPECT_EQ(Store::iterator().getRawTime(), -1.0); },
  };
  int expected = 0;
  for (const auto& edit : edits) {
    edit();
    EXPECT_EQ(reports, ++expected) << "edit " << expected;
    EXPECT_EQ(fields(s), fields("1:.5 2:.6 3:.7"));
  }
  host::setFatalReportHandler({});
}

}  // namespace
