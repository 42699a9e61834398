#include <gtest/gtest.h>

#include <cmath>
#include <functional>
#include <limits>
#include <thread>

#include "LevelTestSupport.h"

namespace {

using namespace levels_test;

struct EditCase {
  const char* name;
  std::vector<Node> initial;
  std::function<void(Store&)> edit;
  std::vector<double> times;
  std::vector<float> levels;
};

void runEditCases(const std::vector<EditCase>& cases) {
  for (const EditCase& c : cases) {
    SCOPED_TRACE(c.name);
    Store s;
    for (const Node& n : c.initial) s.insert_noAdjust(n);
    c.edit(s);
    EXPECT_EQ(timesOf(s), c.times);
    EXPECT_EQ(levelsOf(s), c.levels);
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
  const Node end(2.0, 1.0f, EG, false);
  EXPECT_EQ(end.getRawTime(), 2.0);
  EXPECT_DOUBLE_EQ(end.getTime(), 2.01);
  host::setFrameDuration(0.08);  // read afresh on every call
  EXPECT_DOUBLE_EQ(end.getTime(), 2.02);
}

TEST(LevelStoreInsert, ReplacesEveryNodeWithinTheWindow) {
  struct Row {
    double offset;
    unsigned expectedSize;
  };
  const Row rows[] = {{0.0, 1}, {0.9e-6, 1}, {-0.9e-6, 1}, {2e-6, 2}, {-2e-6, 2}, {-1e-6, 2}, {1e-3, 2}};
  for (const Row& row : rows) {
    SCOPED_TRACE(row.offset);
    Store s;
    s.insert(Node(1.0, 0.25f));
    const Store::iterator it = s.insert(Node(1.0 + row.offset, 0.75f));
    EXPECT_EQ(s.size(), row.expectedSize);
    EXPECT_EQ(it.getLevel(), 0.75f);
    EXPECT_EQ(it.getRawTime(), 1.0 + row.offset);
    EXPECT_TRUE(orderedByRawTime(s));
  }
  // Where the window is below the resolution of the time, equal times are
  // kept and the newcomer goes after them.
  Store s;
  s.insert(Node(1e12, 0.25f));
  s.insert(Node(1e12, 0.75f));
  s.insert_noAdjust(Node(1e12, 0.5f));
  EXPECT_EQ(levelsOf(s), (std::vector<float>{0.25f, 0.75f, 0.5f}));
}

TEST(LevelStoreInsert, TiesGuardsToTheirNeighbours) {
  runEditCases({
      {"ordinary between guards ties both",
       {{0, .3f, SG, false}, {2, .3f, EG, false}},
       [](Store& s) { s.insert(Node(1, .5f)); },
       {0, 1, 2},
       {.5f, .5f, .5f}},
      {"start guard takes the next level",
       {{1, .4f}, {2, .6f}},
       [](Store& s) { s.insert(Node(.5, .9f, SG, false)); },
       {.5, 1, 2},
       {.4f, .4f, .6f}},
      {"start guard with nothing after keeps its level",
       {{1, .4f}},
       [](Store& s) { s.insert(Node(2, .9f, SG, false)); },
       {1, 2},
       {.4f, .9f}},
      {"end guard takes the previous level",
       {{1, .4f}, {3, .6f}},
       [](Store& s) { s.insert(Node(2, .9f, EG, false)); },
       {1, 2, 3},
       {.4f, .4f, .6f}},
      {"end guard after a marked node takes its level",
       {{1, .4f, MD, false}},
       [](Store& s) { s.insert(Node(2, .9f, EG, false)); },
       {1, 2},
       {.4f, .4f}},
      {"end guard as first node keeps its level",
       {{1, .4f}},
       [](Store& s) { s.insert(Node(.5, .9f, EG, false)); },
       {.5, 1},
       {.9f, .4f}},
      {"ordinary after an end guard leaves it",
       {{0, .2f}, {1, .2f, EG, false}},
       [](Store& s) { s.insert(Node(2, .7f)); },
       {0, 1, 2},
       {.2f, .2f, .7f}},
      {"marked node ties guards like a normal one",
       {{0, .3f, SG, false}, {2, .3f, EG, false}},
       [](Store& s) { s.insert(Node(1, .5f, MD, false)); },
       {0, 1, 2},
       {.5f, .5f, .5f}},
      {"replacing with a guard, start guard first",
       {{0, .1f, SG, false}, {1, .4f}, {2, .6f}},
       [](Store& s) { s.insert(Node(1, .9f, EG, false)); },
       {0, 1, 2},
       {.1f, .1f, .6f}},
      {"replacing with a guard, start guard not first",
       {{-1, .5f}, {0, .1f, SG, false}, {1, .4f}, {2, .6f}},
       [](Store& s) { s.insert(Node(1, .9f, EG, false)); },
       {-1, 0, 1, 2},
       {.5f, .6f, .6f, .6f}},
      {"no adjustment without being asked",
       {{0, .3f, SG, false}, {2, .3f, EG, false}},
       [](Store& s) { s.insert_noAdjust(Node(1, .5f)); },
       {0, 1, 2},
       {.3f, .5f, .3f}},
  });
}

TEST(LevelStoreErase, EachEraserTiesGuardsByItsOwnRule) {
  const auto sgFirst = {Node(0, .1f, SG, false), Node(1, .4f), Node(2, .6f)};
  const auto sgSecond = {Node(-1, .5f), Node(0, .1f, SG, false), Node(1, .4f), Node(2, .6f)};
  runEditCases({
      {"range by times leaves a first start guard",
       sgFirst,
       [](Store& s) { s.erase(.5, 1.5); },
       {0, 2},
       {.1f, .6f}},
      {"range by iterators leaves a first start guard",
       sgFirst,
       [](Store& s) { s.erase(s.find(1), s.find(2)); },
       {0, 2},
       {.1f, .6f}},
      {"one node re-ties a first start guard",
       sgFirst,
       [](Store& s) { s.erase(s.find(1)); },
       {0, 2},
       {.6f, .6f}},
      {"range by times re-ties a later start guard",
       sgSecond,
       [](Store& s) { s.erase(.5, 1.5); },
       {-1, 0, 2},
       {.5f, .6f, .6f}},
      {"range by iterators re-ties a later start guard",
       sgSecond,
       [](Store& s) { s.erase(s.find(1), s.find(2)); },
       {-1, 0, 2},
       {.5f, .6f, .6f}},
      {"range ties an end guard to a normal predecessor",
       {{0, .2f}, {1, .5f}, {2, .7f}, {3, .9f, EG, false}},
       [](Store& s) { s.erase(1.5, 2.5); },
       {0, 1, 3},
       {.2f, .5f, .5f}},
      {"range leaves an end guard after the first node",
       {{1, .5f}, {2, .7f}, {3, .9f, EG, false}},
       [](Store& s) { s.erase(1.5, 2.5); },
       {1, 3},
       {.5f, .9f}},
      {"range leaves an end guard after a marked node",
       {{0, .2f}, {1, .5f, MD, false}, {2, .7f}, {3, .9f, EG, false}},
       [](Store& s) { s.erase(1.5, 2.5); },
       {0, 1, 3},
       {.2f, .5f, .9f}},
      {"one node ties an end guard even after the first node",
       {{1, .5f}, {2, .7f}, {3, .9f, EG, false}},
       [](Store& s) { s.erase(s.find(2)); },
       {1, 3},
       {.5f, .5f}},
      {"one node ties a start guard to a normal predecessor",
       {{1, .5f}, {2, .7f}, {3, .9f, SG, false}, {4, .3f}},
       [](Store& s) { s.erase(s.find(2)); },
       {1, 3, 4},
       {.5f, .5f, .3f}},
      {"one node between guards changes neither",
       {{0, .3f, SG, false}, {1, .5f}, {2, .6f, EG, false}},
       [](Store& s) { s.erase(s.find(1)); },
       {0, 2},
       {.3f, .6f}},
      {"no adjustment by iterator",
       sgFirst,
       [](Store& s) { s.erase_noAdjust(s.find(1)); },
       {0, 2},
       {.1f, .6f}},
      {"no adjustment by times",
       sgSecond,
       [](Store& s) { s.erase_noAdjust(.5, 1.5); },
       {-1, 0, 2},
       {.5f, .1f, .6f}},
      {"reversed times erase nothing",
       sgSecond,
       [](Store& s) { s.erase(1.5, .5); },
       {-1, 0, 1, 2},
       {.5f, .1f, .4f, .6f}},
      {"end position is ignored", sgFirst, [](Store& s) { s.erase(s.end()); }, {0, 1, 2}, {.1f, .4f, .6f}},
      {"clear", sgFirst, [](Store& s) { s.clear(); }, {}, {}},
  });
}

TEST(LevelStoreErase, NonGuardErasersKeepTheGuards) {
  const auto section = {Node(-1, .5f), Node(0, .3f, SG, false), Node(1, .4f),
                        Node(2, .6f),  Node(3, .6f, EG, false), Node(4, .2f)};
  const auto sgFirst = {Node(0, .3f, SG, false), Node(1, .4f), Node(2, .6f), Node(3, .6f, EG, false)};
  runEditCases({
      {"an emptied section goes back to unity",
       section,
       [](Store& s) { s.eraseNonGuard(s.find(0), s.find(3.5)); },
       {-1, 0, 3, 4},
       {.5f, 1, 1, .2f}},
      {"guards are re-tied store-wide",
       sgFirst,
       [](Store& s) { s.eraseNonGuard(s.find(1.5), s.find(3)); },
       {0, 1, 3},
       {.4f, .4f, .4f}},
      {"by times each node is erased adjusting",
       sgFirst,
       [](Store& s) { s.eraseNonGuard(.5, 1.5); },
       {0, 2, 3},
       {.6f, .6f, .6f}},
      {"by times the window starts 1e-6 s early",
       sgFirst,
       [](Store& s) { s.eraseNonGuard(1.0000005, 2.0000005); },
       {0, 2, 3},
       {.6f, .6f, .6f}},
      {"by times reversed erases nothing",
       sgFirst,
       [](Store& s) { s.eraseNonGuard(2.5, .5); },
       {0, 1, 2, 3},
       {.3f, .4f, .6f, .6f}},
  });
}

TEST(LevelStoreBlack, BlackSectionsKeepOnlyTheirGuards) {
  const auto store = {Node(1, .5f, SG, false), Node(2, .5f), Node(3, .7f), Node(4, .7f, EG, false),
                      Node(6, .2f)};
  struct Row {
    const char* name;
    std::function<void(Store&)> edit;
    std::vector<double> times;
    std::vector<bool> black;
    bool marksModified;
  };
  const Row rows[] = {
      {"forwards", [](Store& s) { s.setRangeToBlackSection(1, 5); }, {1, 4, 6}, {true, true, false}, true},
      {"times swapped",
       [](Store& s) { s.setRangeToBlackSection(5, 1); },
       {1, 4, 6},
       {true, true, false},
       true},
      {"running past the last node",
       [](Store& s) { s.setRangeToBlackSection(1, 10); },
       {1, 2, 3, 4, 6},
       {false, false, false, false, false},
       false},
      {"no node in range",
       [](Store& s) { s.setRangeToBlackSection(2.5, 2.6); },
       {1, 2, 3, 4, 6},
       {false, false, false, false, false},
       false},
      {"cleared again",
       [](Store& s) {
         s.setRangeToBlackSection(1, 5);
         s.setRangeToNonBlackSection(0, 5);
       },
       {1, 4, 6},
       {false, false, false},
       true},
      {"clearing with times swapped does nothing",
       [](Store& s) {
         s.setRangeToBlackSection(1, 5);
         s.setRangeToNonBlackSection(5, 0);
       },
       {1, 4, 6},
       {true, true, false},
       true},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.name);
    Store s;
    fill(s, store);
    int reader = 0;
    s.acknowledgeModification(&reader, nullptr);
    row.edit(s);
    EXPECT_EQ(timesOf(s), row.times);
    std::vector<bool> black;
    for (const Node& n : nodesOf(s)) black.push_back(n.inAudioBlack);
    EXPECT_EQ(black, row.black);
    EXPECT_EQ(s.queryModification(&reader, nullptr), row.marksModified);
  }
}

TEST(LevelStoreBlack, FlagInForceAtATime) {
  Store s;
  EXPECT_FALSE(s.isInAudioBlackAtTime(1.0));
  fill(s, {Node(1, .5f, SG, false), Node(2, .5f), Node(3, .7f), Node(4, .7f, EG, false), Node(6, .2f)});
  s.setRangeToBlackSection(1, 5);
  const std::pair<double, bool> rows[] = {{0.5, false}, {1.0, true},  {2.5, true},
                                          {4.5, true},  {6.0, false}, {7.0, false}};
  for (const auto& [t, black] : rows) EXPECT_EQ(s.isInAudioBlackAtTime(t), black) << t;
}

TEST(LevelStoreLevel, InterpolatesHoldsAndBridgesGaps) {
  FrameDuration fd(0.04);
  Store s;
  EXPECT_EQ(s.getLevelAtTime(1.0), 1.0f);
  fill(s, {Node(1, .2f), Node(2, .6f), Node(3, .3f, EG, false), Node(4, .9f, SG, false), Node(5, .1f)});
  const auto ramp = [](float a, float b, double f) {
    return static_cast<float>(static_cast<double>(b - a) * f) + a;
  };
  struct Row {
    double t;
    float level;
  };
  const Row rows[] = {
      {0.0, .2f},  // before the first node
      {1.0, .2f},
      {1.5, ramp(.2f, .6f, .5)},
      {2.0000005, .6f},                   // within the window of a node
      {3.0, ramp(.6f, .3f, 1.0 / 1.01)},  // the end guard acts at 3.01
      {3.01, .3f},
      {3.5, .3f},  // the gap holds the end guard's level
      {3.9999995, .9f},
      {4.5, ramp(.9f, .1f, .5)},
      {6.0, .1f},  // after the last node
  };
  for (const Row& row : rows) EXPECT_EQ(s.getLevelAtTime(row.t), row.level) << row.t;
}

TEST(LevelStoreLevel, NoSpanBetweenNodesGivesTheLaterLevel) {
  // An end guard at 2 acting a quarter of a one-second frame later meets the
  // next node's time exactly: no division by zero.
  FrameDuration fd(1.0);
  Store s;
  fill(s, {Node(1, .2f), Node(2, .4f, EG, false), Node(2.25, .8f)});
  EXPECT_EQ(s.getLevelAtTime(2.1), .8f);
  EXPECT_EQ(s.getLevelAtTime(2.2), .8f);
  // A span too wide for a double is no span either.
  Store wide;
  fill(wide, {Node(-1.7e308, 0.0f), Node(1.7e308, 1.0f)});
  EXPECT_EQ(wide.getLevelAtTime(1e308), 1.0f);
}

TEST(LevelStoreLevel, EndGuardShiftFollowsTheFrameDuration) {
  FrameDuration fd(0.04);
  Store s;
  fill(s, {Node(0, .3f, SG, false), Node(2, .3f, EG, false)});
  s.insert(Node(1, .5f));
  EXPECT_EQ(levelsOf(s), (std::vector<float>{.5f, .5f, .5f}));
  s.insert_noAdjust(Node(1, 0.0f));
  s.find(2).setLevel(1.0f);
  EXPECT_EQ(s.getLevelAtTime(2.0), static_cast<float>(1.0 / 1.01));
  host::setFrameDuration(0.08);
  EXPECT_EQ(s.getLevelAtTime(2.0), static_cast<float>(1.0 / 1.02));
  EXPECT_EQ(s.getLevelAtTime(2.02), 1.0f);
}

TEST(LevelStoreRange, ClassifiesTheLevelOverARange) {
  const float nan = std::numeric_limits<float>::quiet_NaN();
  struct Row {
    const char* name;
    std::vector<Node> nodes;
    double t1, t2;
    Store::eRangeState state;
    float level;  // -5 when it must be left alone
  };
  const Row rows[] = {
      {"empty", {}, 0, 1, Store::RangeUnity, 1.0f},
      {"one silent node", {Node(1, 0.0f)}, 5, 6, Store::RangeSilent, 0.0f},
      {"one unity node", {Node(1, 1.0f)}, 5, 6, Store::RangeUnity, 1.0f},
      {"one other node", {Node(1, .5f)}, 5, 6, Store::RangeConstant, .5f},
      {"constant", {Node(1, .5f), Node(2, .5f), Node(3, .5f)}, 1.5, 2.5, Store::RangeConstant, .5f},
      {"times swapped", {Node(1, .5f), Node(2, .5f), Node(3, .8f)}, 2.5, 1.5, Store::RangeConstant, .5f},
      {"varying", {Node(1, .5f), Node(2, .6f), Node(3, .5f)}, 1.5, 2.5, Store::RangeVarying, -5},
      {"the node before the range counts",
       {Node(1, .5f), Node(2, .6f), Node(3, .6f)},
       2.5,
       2.8,
       Store::RangeConstant,
       .6f},
      {"before every node", {Node(1, 0.0f), Node(2, .6f)}, 0, 0.5, Store::RangeSilent, 0.0f},
      {"after every node", {Node(1, 0.0f), Node(2, 1.0f)}, 5, 6, Store::RangeUnity, 1.0f},
      {"not a number varies", {Node(1, nan), Node(2, nan)}, 1.5, 2.5, Store::RangeVarying, -5},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.name);
    Store s;
    for (const Node& n : row.nodes) s.insert_noAdjust(n);
    float level = -5;
    EXPECT_EQ(s.getRangeState(row.t1, row.t2, &level), row.state);
    EXPECT_EQ(level, row.level);
    EXPECT_EQ(s.getRangeState(row.t1, row.t2, nullptr), row.state);
  }
}

TEST(LevelStoreInsertRange, ReplacesTheCopiedSpan) {
  Store source;
  fill(source, {Node(0, .1f), Node(1, .9f), Node(2, .8f), Node(3, .1f)});
  runEditCases({
      {"nodes inside the span go, those outside stay",
       {{0, .1f}, {1, .2f}, {1.5, .3f}, {2.0000005, .4f}, {2.1, .45f}, {3, .5f}},
       [&](Store& s) { s.insertRange(source.find(1), source.find(3)); },
       {0, 1, 2, 2.1, 3},
       {.1f, .9f, .8f, .45f, .5f}},
      {"guards around the span are tied to it",
       {{-1, .5f}, {0, .3f, SG, false}, {5, .3f, EG, false}},
       [&](Store& s) { s.insertRange(source.find(1), source.find(3)); },
       {-1, 0, 1, 2, 5},
       {.5f, .9f, .9f, .8f, .8f}},
      {"a start guard that is the first node is left alone",
       {{0, .3f, SG, false}, {5, .3f, EG, false}},
       [&](Store& s) { s.insertRange(source.find(1), source.find(3)); },
       {0, 1, 2, 5},
       {.3f, .9f, .8f, .8f}},
      {"an empty range copies nothing",
       {{1, .2f}},
       [&](Store& s) { s.insertRange(source.find(1), source.find(1)); },
       {1},
       {.2f}},
      {"a store can copy from itself",
       {{0, .1f}, {1, .2f}, {2, .3f}},
       [](Store& s) { s.insertRange(s.find(0), s.end()); },
       {0, 1, 2},
       {.1f, .2f, .3f}},
  });
  Store dest;
  int reader = 0;
  dest.acknowledgeModification(&reader, nullptr);
  dest.insertRange(source.find(1), source.find(1));
  EXPECT_TRUE(dest.queryModification(&reader, nullptr));
}

TEST(LevelStoreCopy, CopiesShareTheLockAndAssignmentIsAnEdit) {
  Store a;
  fill(a, {Node(1, .5f), Node(2, .6f)});
  int reader = 0;
  a.acknowledgeModification(&reader, nullptr);
  Store b(a);
  EXPECT_TRUE(b.getLockObject().sharesLockWith(a.getLockObject()));
  EXPECT_EQ(timesOf(b), timesOf(a));
  EXPECT_FALSE(b.queryModification(&reader, nullptr));  // the acknowledgements come along
  b.insert(Node(3, .7f));
  EXPECT_EQ(a.size(), 2u);

  // A reader of the destination holds positions into nodes that assignment
  // replaces, even when the source carries that reader's acknowledgement.
  Store c;
  EXPECT_FALSE(c.getLockObject().sharesLockWith(a.getLockObject()));
  c.acknowledgeModification(&reader, nullptr);
  Store snapshot(c);
  c = a;
  EXPECT_TRUE(c.queryModification(&reader, nullptr));
  EXPECT_TRUE(c.getLockObject().sharesLockWith(a.getLockObject()));
  EXPECT_EQ(timesOf(c), timesOf(a));
  c = snapshot;
  EXPECT_TRUE(c.empty());
}

TEST(LevelStoreLock, IsReEntrantAndHeldAcrossCalls) {
  Store s;
  const criticalSection lock = s.getLockObject();
  CriticalSectionLock hold(lock);
  s.insert(Node(1, .5f));  // re-enters from the holding thread
  bool otherGotIt = true;
  std::thread other([&] {
    const criticalSection copy = s.getLockObject();
    otherGotIt = copy.tryEnter();
    if (otherGotIt) copy.leave();
  });
  other.join();
  EXPECT_FALSE(otherGotIt);
}

TEST(LevelStoreErrors, BadInputIsReportedAndChangesNothing) {
  FatalReports reports;
  Store s, other;
  fill(s, {Node(1, .5f), Node(2, .6f), Node(3, .7f)});
  fill(other, {Node(1, .5f)});
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
    EXPECT_EQ(reports.count(), ++expected) << "edit " << expected;
    EXPECT_EQ(timesOf(s), (std::vector<double>{1, 2, 3}));
    EXPECT_EQ(levelsOf(s), (std::vector<float>{.5f, .6f, .7f}));
  }
}

}  // namespace
