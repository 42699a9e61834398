#include <gtest/gtest.h>

#include <functional>

#include "LevelTestSupport.h"

namespace {

using namespace levels_test;

TEST(StoreIterator, MovesStopOrWrapAtBothEnds) {
  Store s;
  EXPECT_EQ(s.begin(), s.end());
  Store::iterator e = s.end();
  EXPECT_EQ(--e, s.end());  // empty: the end has no last node
  EXPECT_EQ(++e, s.end());

  fill(s, {Node(1, .1f), Node(2, .2f), Node(3, .3f)});
  Store::iterator it = s.end();
  EXPECT_TRUE(it.valid());
  EXPECT_EQ(++it, s.end());  // the end position stays put
  EXPECT_EQ((--it).getRawTime(), 3.0);
  EXPECT_EQ((--it).getRawTime(), 2.0);
  EXPECT_EQ((--it).getRawTime(), 1.0);
  EXPECT_EQ(--it, s.end());  // from the first node to the end position
  it = s.find(3);
  EXPECT_EQ(++it, s.end());

  const Store::iterator none;
  EXPECT_FALSE(none.valid());
  EXPECT_EQ(none, Store::iterator());
  EXPECT_NE(none, s.end());
  Store other;
  EXPECT_NE(other.end(), s.end());
}

TEST(StoreIterator, SetLevelTiesTheNeighbouringGuards) {
  struct Row {
    const char* name;
    std::vector<Node> nodes;
    double at;
    std::vector<float> levels;
  };
  const Row rows[] = {
      {"only node of a section", {{0, .3f, SG, false}, {1, .3f}, {2, .3f, EG, false}}, 1, {.9f, .9f, .9f}},
      {"marked node", {{0, .3f, SG, false}, {1, .3f, MD, false}, {2, .3f, EG, false}}, 1, {.9f, .9f, .9f}},
      {"first node", {{1, .3f}, {2, .3f, EG, false}}, 1, {.9f, .9f}},
      {"a guard changes alone", {{0, .3f, SG, false}, {1, .3f}, {2, .3f, EG, false}}, 0, {.9f, .3f, .3f}},
      {"neighbours that are not guards", {{0, .3f}, {1, .3f}, {2, .3f, SG, false}}, 1, {.3f, .9f, .3f}},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.name);
    Store s;
    for (const Node& n : row.nodes) s.insert_noAdjust(n);
    s.find(row.at).setLevel(.9f);
    EXPECT_EQ(levelsOf(s), row.levels);
  }
}

TEST(StoreIterator, SetTimeErasesWhatTheMovePassesAndKeepsTheOrder) {
  struct Row {
    const char* name;
    std::vector<double> times;
    double from, to;
    std::vector<double> after;
  };
  const Row rows[] = {
      {"within its neighbours", {1, 2, 3}, 2, 2.5, {1, 2.5, 3}},
      {"within, near a neighbour", {1, 2, 3}, 2, 2.9999995, {1, 2.9999995, 3}},
      {"past two later neighbours", {1, 2, 3, 4, 5}, 2, 4.5, {1, 4.5, 5}},
      {"onto a later neighbour", {1, 2, 3, 4}, 2, 3, {1, 3, 4}},
      {"to within the window of a later node", {1, 2, 3, 4}, 2, 3.9999995, {1, 3.9999995}},
      {"past two earlier neighbours", {1, 2, 3, 4, 5}, 4, 1.5, {1, 1.5, 5}},
      {"to within the window of an earlier node", {1, 2, 3, 4}, 3, 1.0000005, {1.0000005, 4}},
      {"first node past the next", {1, 2, 3}, 1, 2.5, {2.5, 3}},
      {"last node before the previous", {1, 2, 3}, 3, 1.5, {1, 1.5}},
      {"only node", {1}, 1, 7, {7}},
      // A neighbour closer than 5 ms on the side the node moves to is passed
      // over like any other and goes too: the store stays ordered.
      {"past a close later neighbour", {1, 1.003, 2}, 1, 1.5, {1.5, 2}},
      {"past a close earlier neighbour", {1, 1.997, 2}, 2, 1.5, {1, 1.5}},
      {"to its own time", {1, 2, 3}, 2, 2, {1, 2, 3}},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.name);
    Store s;
    for (double t : row.times) s.insert_noAdjust(Node(t, static_cast<float>(t)));
    Store::iterator it = s.find(row.from);
    it.setTime(row.to);
    EXPECT_EQ(it.getRawTime(), row.to);
    EXPECT_EQ(it.getLevel(), static_cast<float>(row.from));
    EXPECT_EQ(timesOf(s), row.after);
    EXPECT_TRUE(orderedByRawTime(s));
  }
}

TEST(StoreIterator, SetTimeLeavesGuardLevelsAlone) {
  Store s;
  fill(s, {Node(0, .3f, SG, false), Node(1, .5f), Node(2, .5f, EG, false), Node(3, .8f)});
  s.find(1).setTime(2.5);
  EXPECT_EQ(timesOf(s), (std::vector<double>{0, 2.5, 3}));
  EXPECT_EQ(levelsOf(s), (std::vector<float>{.3f, .5f, .8f}));
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
  s.setModified();
  EXPECT_TRUE(s.queryModification(&r1, &t1));
  EXPECT_TRUE(s.queryModification(&r2, nullptr));
}

TEST(StoreModification, EveryEditClearsEveryAcknowledgement) {
  Store source;
  fill(source, {Node(10, .5f)});
  const std::pair<const char*, std::function<void(Store&)>> edits[] = {
      {"insert", [](Store& s) { s.insert(Node(5, .5f)); }},
      {"insert with hint", [](Store& s) { s.insert(s.begin(), Node(5, .5f)); }},
      {"insert_noAdjust", [](Store& s) { s.insert_noAdjust(Node(5, .5f)); }},
      {"insert_noAdjust with hint", [](Store& s) { s.insert_noAdjust(s.end(), Node(5, .5f)); }},
      {"insertRange", [&](Store& s) { s.insertRange(source.begin(), source.end()); }},
      {"erase", [](Store& s) { s.erase(s.find(2)); }},
      {"erase of the end position", [](Store& s) { s.erase(s.end()); }},
      {"erase range", [](Store& s) { s.erase(s.find(1), s.find(3)); }},
      {"erase times", [](Store& s) { s.erase(1.5, 2.5); }},
      {"erase of nothing", [](Store& s) { s.erase(7, 8); }},
      {"erase_noAdjust", [](Store& s) { s.erase_noAdjust(s.find(2)); }},
      {"erase_noAdjust times", [](Store& s) { s.erase_noAdjust(1.5, 2.5); }},
      {"eraseNonGuard", [](Store& s) { s.eraseNonGuard(s.begin(), s.end()); }},
      {"eraseNonGuard times", [](Store& s) { s.eraseNonGuard(0, 5); }},
      {"clear", [](Store& s) { s.clear(); }},
      {"black section", [](Store& s) { s.setRangeToBlackSection(0, 2.5); }},
      {"non-black section", [](Store& s) { s.setRangeToNonBlackSection(0, 2.5); }},
      {"setLevel", [](Store& s) { s.find(2).setLevel(.1f); }},
      {"setTime", [](Store& s) { s.find(2).setTime(2.5); }},
      {"setNodeType with the same type", [](Store& s) { s.find(2).setNodeType(N); }},
      {"setInAudioBlackSection", [](Store& s) { s.find(2).setInAudioBlackSection(false); }},
      {"setModified alone", [](Store& s) { s.setModified(); }},
      {"assignment", [&](Store& s) { s = source; }},
  };
  for (const auto& [name, edit] : edits) {
    SCOPED_TRACE(name);
    Store s;
    fill(s, {Node(1, .2f, SG, false), Node(2, .4f), Node(3, .6f, EG, false)});
    int reader = 0, tag = 0;
    s.acknowledgeModification(&reader, &tag);
    s.acknowledgeModification(&tag, nullptr);
    Store::iterator kept = s.find(1);
    (void)kept.getLevel();
    EXPECT_FALSE(s.queryModification(&reader, &tag));
    edit(s);
    EXPECT_TRUE(s.queryModification(&reader, &tag));
    EXPECT_TRUE(s.queryModification(&tag, nullptr));
  }
  // Reading is not an edit.
  Store s;
  fill(s, {Node(1, .2f), Node(2, .4f)});
  int reader = 0;
  s.acknowledgeModification(&reader, nullptr);
  (void)s.getLevelAtTime(1.5);
  (void)s.isInAudioBlackAtTime(1.5);
  (void)s.getRangeState(0, 3, nullptr);
  (void)s.find(1.5);
  (void)s.size();
  EXPECT_FALSE(s.queryModification(&reader, nullptr));
}

}  // namespace
