#include <gtest/gtest.h>

#include <functional>
#include <limits>
#include <string>
#include <thread>
#include <tuple>

#include "LevelTestSupport.h"

namespace {

using namespace levels_test;

Node node(const char* text) { return parse(text).at(0); }

// An edit of the store `s`, named by its own text.
struct Edit {
  const char* text;
  std::function<void(Store&)> apply;
};
// clang-format off
#define EDIT(...) Edit{#__VA_ARGS__, [&](Store& s) { s.__VA_ARGS__; }}
// clang-format on

struct EditCase {
  const char* before;
  Edit edit;
  const char* after;
  bool modifies = true;
};

// Every edit, even one that changes nothing, clears every acknowledgement;
// `modifies` is false for calls that are no edit at all.
void runEditCases(const std::vector<EditCase>& cases) {
  for (const EditCase& c : cases) {
    SCOPED_TRACE(std::string(c.before) + " | " + c.edit.text);
    Store s;
    fill(s, c.before);
    int reader = 0, tag = 0;
    s.acknowledgeModification(&reader, &tag);
    s.acknowledgeModification(&tag, nullptr);
    c.edit.apply(s);
    EXPECT_EQ(fields(s), fields(c.after));
    EXPECT_EQ(s.queryModification(&reader, &tag), c.modifies);
    EXPECT_EQ(s.queryModification(&tag, nullptr), c.modifies);
  }
}

TEST(LevelStoreNode, ASearchKeyGetsTheDefaultLevelAndFlag) {
  const Node key(3.0);
  EXPECT_EQ(key.time, 3.0);
  EXPECT_EQ(key.level, Node().level);
  EXPECT_EQ(key.type, N);
  EXPECT_FALSE(key.inAudioBlack);
  EXPECT_FALSE(Node(2.0, 0.1f) < Node(2.0, 0.9f));  // only raw times order nodes
}

TEST(LevelStoreNode, OnlyAnEndGuardActsAQuarterFrameLater) {
  FrameDuration fd(0.04);
  for (Store::eNodeType type : {N, SG, MD}) EXPECT_EQ(Node(2.0, 1.0f, type, false).getTime(), 2.0);
  const Node end = node("E2:1");
  EXPECT_EQ(end.getRawTime(), 2.0);
  EXPECT_DOUBLE_EQ(end.getTime(), 2.01);
  host::setFrameDuration(0.08);  // read afresh on every call
  EXPECT_DOUBLE_EQ(end.getTime(), 2.02);
}

TEST(LevelStoreInsert, ReplacesTheWindowAndTiesGuardsToTheirNeighbours) {
  runEditCases({
      // Every node within 1e-6 s of the new one goes.
      {"1:.25", EDIT(insert(Node(1, .75f))), "1:.75"},
      {"1:.25", EDIT(insert(Node(1.0000009, .75f))), "1.0000009:.75"},
      {"1:.25", EDIT(insert(Node(0.9999991, .75f))), "0.9999991:.75"},
      {"1:.25", EDIT(insert(Node(1.000002, .75f))), "1:.25 1.000002:.75"},
      {"1:.25", EDIT(insert(Node(0.999999, .75f))), "0.999999:.75 1:.25"},
      // Where the window is below the resolution of the time, equal times
      // are kept and the newcomer goes after them.
      {"1e12:.25", EDIT(insert(Node(1e12, .75f))), "1e12:.25 1e12:.75"},
      {"1e12:.25 1e12:.75", EDIT(insert_noAdjust(Node(1e12, .5f))), "1e12:.25 1e12:.75 1e12:.5"},
      // A start guard carries the level of the ordinary node after it, an end
      // guard that of the Normal node before it.
      {"S0:.3 E2:.3", EDIT(insert(Node(1, .5f))), "S0:.5 1:.5 E2:.5"},
      {"S0:.3 E2:.3", EDIT(insert(s.begin(), node("M1:.5"))), "S0:.5 M1:.5 E2:.5"},
      {"1:.4 2:.6", EDIT(insert(node("S.5:.9"))), "S.5:.4 1:.4 2:.6"},
      {"1:.4", EDIT(insert(node("S2:.9"))), "1:.4 S2:.9"},
      {"1:.4 3:.6", EDIT(insert(node("E2:.9"))), "1:.4 E2:.4 3:.6"},
      {"M1:.4", EDIT(insert(node("E2:.9"))), "M1:.4 E2:.4"},
      {"1:.4", EDIT(insert(node("E.5:.9"))), "E.5:.9 1:.4"},
      {"0:.2 E1:.2", EDIT(insert(Node(2, .7f))), "0:.2 E1:.2 2:.7"},
      {"S0:.1 1:.4 2:.6", EDIT(insert(node("E1:.9"))), "S0:.1 E1:.1 2:.6"},
      {"-1:.5 S0:.1 1:.4 2:.6", EDIT(insert(node("E1:.9"))), "-1:.5 S0:.6 E1:.6 2:.6"},
      {"S0:.3 E2:.3", EDIT(insert_noAdjust(s.end(), Node(1, .5f))), "S0:.3 1:.5 E2:.3"},
  });
}

TEST(LevelStoreErase, EachEraserTiesGuardsByItsOwnRule) {
  runEditCases({
      // One node: a start guard before the next node takes its level, a guard
      // after a Normal node takes that node's.
      {"S0:.1 1:.4 2:.6", EDIT(erase(s.find(1))), "S0:.6 2:.6"},
      {"1:.5 2:.7 E3:.9", EDIT(erase(s.find(2))), "1:.5 E3:.5"},
      {"1:.5 2:.7 S3:.9 4:.3", EDIT(erase(s.find(2))), "1:.5 S3:.5 4:.3"},
      {"S0:.3 1:.5 E2:.6", EDIT(erase(s.find(1))), "S0:.3 E2:.6"},
      {"S0:.1 1:.4 2:.6", EDIT(erase(s.end())), "S0:.1 1:.4 2:.6"},
      {"S0:.1 1:.4 2:.6", EDIT(erase_noAdjust(s.find(1))), "S0:.1 2:.6"},
      // Ranges tie the guards around the node after them, never a start guard
      // that is the first node.
      {"S0:.1 1:.4 2:.6", EDIT(erase(.5, 1.5)), "S0:.1 2:.6"},
      {"-1:.5 S0:.1 1:.4 2:.6", EDIT(erase(s.find(1), s.find(2))), "-1:.5 S0:.6 2:.6"},
      {"0:.2 1:.5 2:.7 E3:.9", EDIT(erase(1.5, 2.5)), "0:.2 1:.5 E3:.5"},
      {"1:.5 2:.7 E3:.9", EDIT(erase(1.5, 2.5)), "1:.5 E3:.9"},
      {"0:.2 M1:.5 2:.7 E3:.9", EDIT(erase(1.5, 2.5)), "0:.2 M1:.5 E3:.9"},
      {"-1:.5 S0:.1 1:.4 2:.6", EDIT(erase(1.5, .5)), "-1:.5 S0:.1 1:.4 2:.6"},
      {"-1:.5 S0:.1 1:.4 2:.6", EDIT(erase_noAdjust(.5, 1.5)), "-1:.5 S0:.1 2:.6"},
      {"1:.2", EDIT(erase(7, 8)), "1:.2"},
      {"S0:.1 1:.4 2:.6", EDIT(clear()), ""},
      // Non-guard erasers keep the guards and re-tie them; a section left
      // with only its guards goes back to unity. By times the window starts
      // 1e-6 s early.
      {"-1:.5 S0:.3 1:.4 2:.6 E3:.6 4:.2", EDIT(eraseNonGuard(s.find(0), s.find(3.5))),
       "-1:.5 S0:1 E3:1 4:.2"},
      {"S0:.3 1:.4 2:.6 E3:.6", EDIT(eraseNonGuard(s.find(1.5), s.find(3))), "S0:.4 1:.4 E3:.4"},
      {"S0:.3 1:.4 2:.6 E3:.6", EDIT(eraseNonGuard(.5, 1.5)), "S0:.6 2:.6 E3:.6"},
      {"S0:.3 1:.4 2:.6 E3:.6", EDIT(eraseNonGuard(1.0000005, 2.0000005)), "S0:.6 2:.6 E3:.6"},
      {"S0:.3 1:.4 2:.6 E3:.6", EDIT(eraseNonGuard(2.5, .5)), "S0:.3 1:.4 2:.6 E3:.6"},
  });
}

TEST(LevelStoreInsertRange, ReplacesTheCopiedSpan) {
  Store src;
  fill(src, "0:.1 1:.9 2:.8 3:.1");
  runEditCases({
      // Nodes within the span go, those outside stay; guards are tied to it,
      // except a start guard that is the first node.
      {"0:.1 1:.2 1.5:.3 2.0000005:.4 2.1:.45 3:.5", EDIT(insertRange(src.find(1), src.find(3))),
       "0:.1 1:.9 2:.8 2.1:.45 3:.5"},
      {"-1:.5 S0:.3 E5:.3", EDIT(insertRange(src.find(1), src.find(3))), "-1:.5 S0:.9 1:.9 2:.8 E5:.8"},
      {"S0:.3 E5:.3", EDIT(insertRange(src.find(1), src.find(3))), "S0:.3 1:.9 2:.8 E5:.8"},
      {"1:.2", EDIT(insertRange(src.find(1), src.find(1))), "1:.2"},
      {"0:.1 1:.2 2:.3", EDIT(insertRange(s.find(0), s.end())), "0:.1 1:.2 2:.3"},
  });
}

TEST(StoreIterator, SettersTieGuardsByTheirOwnRules) {
  runEditCases({
      // setLevel on an ordinary node also sets an end guard right after it and
      // a start guard right before it.
      {"S0:.3 1:.3 E2:.3", EDIT(find(1).setLevel(.9f)), "S0:.9 1:.9 E2:.9"},
      {"S0:.3 M1:.3 E2:.3", EDIT(find(1).setLevel(.9f)), "S0:.9 M1:.9 E2:.9"},
      {"1:.3 E2:.3", EDIT(find(1).setLevel(.9f)), "1:.9 E2:.9"},
      {"S0:.3 1:.3 E2:.3", EDIT(find(0).setLevel(.9f)), "S0:.9 1:.3 E2:.3"},
      {"0:.3 1:.3 S2:.3", EDIT(find(1).setLevel(.9f)), "0:.3 1:.9 S2:.3"},
      // The other setters leave guard levels alone.
      {"S0:.3 1:.5 E2:.5 3:.8", EDIT(find(1).setTime(2.5)), "S0:.3 2.5:.5 3:.8"},
      {"S0:.3 1:.5 E2:.5", EDIT(find(1).setNodeType(N)), "S0:.3 1:.5 E2:.5"},
      {"S0:.3 1:.5 E2:.5", EDIT(find(1).setInAudioBlackSection(true)), "S0:.3 1:.5* E2:.5"},
  });
}

TEST(StoreIterator, SetTimeErasesWhatTheMovePassesAndKeepsTheOrder) {
  // Whatever the move passes over goes, and what lies within 1e-6 s of the
  // new time on the far side; the iterator follows its node.
  const std::tuple<const char*, double, double, const char*> rows[] = {
      {"1:1 2:2 3:3", 2, 2.9999995, "1:1 2.9999995:2 3:3"},
      {"1:1 2:2 3:3 4:4 5:5", 2, 4.5, "1:1 4.5:2 5:5"},
      {"1:1 2:2 3:3 4:4", 2, 3, "1:1 3:2 4:4"},
      {"1:1 2:2 3:3 4:4", 2, 3.9999995, "1:1 3.9999995:2"},
      {"1:1 2:2 3:3 4:4 5:5", 4, 1.5, "1:1 1.5:4 5:5"},
      {"1:1 2:2 3:3 4:4", 3, 1.0000005, "1.0000005:3 4:4"},
      {"1:1 2:2 3:3", 1, 2.5, "2.5:1 3:3"},
      {"1:1 2:2 3:3", 3, 1.5, "1:1 1.5:3"},
      {"1:1", 1, 7, "7:1"},
      // A neighbour closer than 5 ms on the side the node moves to is passed
      // over like any other and goes too: the store stays ordered.
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
  EXPECT_EQ(--it, s.end());     // from the first node to the end position
  it = s.insert(Node(3, .3f));  // the position of the new node
  EXPECT_EQ(it.getRawTime(), 3.0);
  EXPECT_EQ(++it, s.end());
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
  // Time, then the level as a fraction of the way between two levels: the
  // first level before the first node, the window of a node, the end guard
  // acting at 3.01, its level held across the gap, the last level after the
  // last node.
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
  // An end guard at 2 acting a quarter of a one-second frame later meets the
  // next node's time exactly: no division by zero.
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
      {"", 0, 1, Store::RangeUnity, 1.0f},
      {"1:0", 5, 6, Store::RangeSilent, 0.0f},
      {"1:.5 2:.5 3:.5", 1.5, 2.5, Store::RangeConstant, .5f},
      {"1:.5 2:.5 3:.8", 2.5, 1.5, Store::RangeConstant, .5f},  // times swapped
      {"1:.5 2:.6 3:.5", 1.5, 2.5, Store::RangeVarying, -5},
      {"1:.5 2:.6 3:.6", 2.5, 2.8, Store::RangeConstant, .6f},  // the node before the range counts
      {"1:0 2:.6", 0, 0.5, Store::RangeSilent, 0.0f},
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
  EXPECT_FALSE(s.queryModification(&r1, &t1));
  EXPECT_TRUE(s.queryModification(&r1, &t2));
  EXPECT_TRUE(s.queryModification(&r2, &t1));
  EXPECT_FALSE(s.queryModification(&r2, nullptr));
  EXPECT_TRUE(s.queryModification(&r1, nullptr));
  // Reading is not an edit; setModified alone is.
  fill(s, "1:.2 2:.4");
  s.acknowledgeModification(&r1, &t1);
  (void)s.getLevelAtTime(1.5);
  (void)s.isInAudioBlackAtTime(1.5);
  (void)s.getRangeState(0, 3, nullptr);
  (void)s.find(1.5).getLevel();
  EXPECT_FALSE(s.queryModification(&r1, &t1));
  s.setModified();
  EXPECT_TRUE(s.queryModification(&r1, &t1));
}

TEST(LevelStoreCopy, CopiesShareTheLockAndAssignmentIsAnEdit) {
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

  // A reader of the destination holds positions into nodes that assignment
  // replaces, even when the source carries that reader's acknowledgement.
  Store c;
  EXPECT_FALSE(c.getLockObject().sharesLockWith(a.getLockObject()));
  c.acknowledgeModification(&reader, nullptr);
  c = a;
  EXPECT_TRUE(c.queryModification(&reader, nullptr));
  EXPECT_TRUE(c.getLockObject().sharesLockWith(a.getLockObject()));
  EXPECT_EQ(fields(c), fields(a));
}

TEST(LevelStoreLock, IsReEntrantAndHeldAcrossCalls) {
  Store s;
  const criticalSection lock = s.getLockObject();
  CriticalSectionLock hold(lock);
  s.insert(Node(1, .5f));  // re-enters from the holding thread
  bool otherGotIt = true;
  std::thread other([&] {
    const criticalSection copy = s.getLockObject();
    if ((otherGotIt = copy.tryEnter())) copy.leave();
  });
  other.join();
  EXPECT_FALSE(otherGotIt);
}

TEST(LevelStoreErrors, BadInputIsReportedAndChangesNothing) {
  int reports = 0;
  host::setFatalReportHandler([&](const char*) { ++reports; });
  Store s, other;
  fill(s, "1:.5 2:.6 3:.7");
  fill(other, "1:.5");
  const double inf = std::numeric_limits<double>::infinity();
  const double nan = std::numeric_limits<double>::quiet_NaN();
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
