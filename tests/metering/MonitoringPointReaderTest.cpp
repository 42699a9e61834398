#include <gtest/gtest.h>

#include <cmath>
#include <optional>

#include "metering/MeteringTestSupport.h"

namespace {

using Aud::MonitoringPointManager;
using Aud::MonitoringPointReader;
using Aud::MonitoringPointWriter;
using metering_test::ManualClock;
using metering_test::Point;
using metering_test::registerPoint;

class MonitoringPointReaderTest : public ::testing::Test {
 protected:
  ManualClock clock;
};

TEST_F(MonitoringPointReaderTest, AnEmptyReaderReadsNothing) {
  MonitoringPointReader empty;
  EXPECT_FALSE(empty.valid());
  EXPECT_FALSE(empty.getId().valid());
  for (bool reset : {false, true, false}) {
    EXPECT_EQ(empty.peakValue(reset), 0.0f);
    EXPECT_FALSE(empty.hasClipped(reset));
  }
}

TEST_F(MonitoringPointReaderTest, ReadersAreAttachedOnlyToRegisteredPointIds) {
  const Point p = registerPoint();
  MonitoringPointReader attached(p.pointId), fromWriter(p.writerId), unknown{IdStamp()};
  EXPECT_TRUE(attached.valid());
  EXPECT_EQ(attached.getId(), p.pointId);
  EXPECT_FALSE(fromWriter.valid());
  EXPECT_EQ(fromWriter.getId(), p.writerId);  // the id it was built from, though detached
  EXPECT_FALSE(unknown.valid());

  MonitoringPointWriter(p.writerId).updatePeakSampleValue(0.5f);
  EXPECT_EQ(attached.peakValue(false), 0.5f);
  EXPECT_EQ(fromWriter.peakValue(false), 0.0f);
  EXPECT_EQ(unknown.peakValue(false), 0.0f);
}

// The read rule against the clock: each row is a script of writes and reads
// at given times on one reader, with the value each read must return.
TEST_F(MonitoringPointReaderTest, TakenPeaksExpireStrictlyAfter40Ms) {
  struct Step {
    double atMs;
    std::optional<float> write;  // a write, or else a read
    bool reset;
    float expect;
  };
  struct Row {
    const char* what;
    std::vector<Step> steps;
  };
  const Row rows[] = {
      {"a look does not start the window",
       {{0, 0.7f, false, 0}, {0, {}, true, 0.7f}, {30, {}, false, 0.7f}, {50, {}, false, 0.0f}}},
      {"exactly 40 ms holds",
       {{0, 0.7f, false, 0}, {0, {}, true, 0.7f}, {40, {}, false, 0.7f}, {40, {}, true, 0.7f}}},
      {"just past 40 ms falls to 0",
       {{0, 0.7f, false, 0}, {0, {}, true, 0.7f}, {40.000001, {}, false, 0.0f}, {40.000001, {}, true, 0.0f}}},
      {"resetting every 20 ms keeps the value",
       {{0, 0.7f, false, 0},
        {0, {}, true, 0.7f},
        {20, {}, true, 0.7f},
        {40, {}, true, 0.7f},
        {60, {}, true, 0.7f},
        {80, {}, true, 0.7f},
        {121, {}, true, 0.0f}}},
      {"without a resetting read nothing expires",
       {{0, 0.7f, false, 0}, {0, {}, false, 0.7f}, {1000, {}, false, 0.7f}, {5000, {}, false, 0.7f}}},
      {"looking twice keeps the largest",
       {{0, 0.3f, false, 0},
        {1, {}, false, 0.3f},
        {2, {}, false, 0.3f},
        {3, 0.2f, false, 0},
        {4, {}, false, 0.3f}}},
      {"a write after a reset replaces and clears the window",
       {{0, 0.7f, false, 0}, {0, {}, true, 0.7f}, {10, 0.1f, false, 0}, {100, {}, false, 0.1f}}},
      {"an expired peak is then kept to the next write",
       {{0, 0.7f, false, 0},
        {0, {}, true, 0.7f},
        {41, {}, false, 0.0f},
        {42, 0.2f, false, 0},
        {43, 0.1f, false, 0},
        {44, {}, false, 0.2f}}},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    const Point p = registerPoint();
    MonitoringPointReader reader(p.pointId);
    MonitoringPointWriter writer(p.writerId);
    for (const Step& step : row.steps) {
      clock.set(5000.0 + step.atMs);
      if (step.write) {
        writer.updatePeakSampleValue(*step.write);
      } else {
        EXPECT_EQ(reader.peakValue(step.reset), step.expect) << "at " << step.atMs << " ms";
      }
    }
  }
}

TEST_F(MonitoringPointReaderTest, ClipFlagIsClearedOnlyByAResettingRead) {
  const Point p = registerPoint();
  MonitoringPointReader reader(p.pointId), other(p.pointId);
  MonitoringPointWriter writer(p.writerId);
  EXPECT_FALSE(reader.hasClipped(true));
  writer.updateHasClipped();
  EXPECT_TRUE(reader.hasClipped(false));
  EXPECT_TRUE(reader.hasClipped(false));
  EXPECT_TRUE(reader.hasClipped(true));
  EXPECT_FALSE(reader.hasClipped(true));
  EXPECT_FALSE(reader.hasClipped(false));
  EXPECT_TRUE(other.hasClipped(false));  // each reader has its own flag
  writer.updateHasClipped();
  EXPECT_TRUE(reader.hasClipped(true));
  EXPECT_EQ(reader.peakValue(false), 1.0f);
}

TEST_F(MonitoringPointReaderTest, AReaderOfAnUnregisteredPointKeepsItsLastValueUntilExpiry) {
  const Point p = registerPoint();
  MonitoringPointReader reader(p.pointId);
  MonitoringPointWriter writer(p.writerId);
  writer.updatePeakSampleValue(0.6f);
  writer.updateHasClipped();
  writer.updatePeakSampleValue(1.25f);
  ASSERT_EQ(MonitoringPointManager::unregisterMP(p.writerId), Aud::sSuccess);

  EXPECT_FALSE(reader.valid());
  EXPECT_FALSE(reader.getId().valid());
  EXPECT_TRUE(writer.valid());  // the writer does not ask the manager
  writer.updatePeakSampleValue(0.9f);
  EXPECT_EQ(reader.peakValue(true), 1.25f);
  EXPECT_TRUE(reader.hasClipped(true));
  clock.advance(40);
  EXPECT_EQ(reader.peakValue(true), 1.25f);
  clock.advance(40.5);
  EXPECT_EQ(reader.peakValue(true), 0.0f);
}

TEST_F(MonitoringPointReaderTest, ACopyIsANewSubscriptionToTheSamePoint) {
  const Point p = registerPoint();
  MonitoringPointReader reader(p.pointId);
  MonitoringPointWriter writer(p.writerId);
  writer.updatePeakSampleValue(0.8f);
  writer.updateHasClipped();

  MonitoringPointReader copy(reader);
  EXPECT_TRUE(copy.valid());
  EXPECT_EQ(copy.getId(), p.pointId);
  EXPECT_EQ(copy.peakValue(false), 0.0f);  // fresh held state
  EXPECT_FALSE(copy.hasClipped(false));
  writer.updatePeakSampleValue(0.4f);
  EXPECT_EQ(copy.peakValue(true), 0.4f);
  EXPECT_EQ(reader.peakValue(true), 1.0f);

  const MonitoringPointReader empty;
  const MonitoringPointReader emptyCopy(empty);
  EXPECT_FALSE(emptyCopy.getId().valid());

  // A copy of a reader whose point is gone asks for the now invalid id.
  MonitoringPointManager::unregisterMP(p.writerId);
  MonitoringPointReader late(reader);
  EXPECT_FALSE(late.valid());
  EXPECT_FALSE(late.getId().valid());
}

// Assignment over every pair of reader states: the target keeps its own
// subscription (and held peak) only when both name the same point.
TEST_F(MonitoringPointReaderTest, AssignmentReplacesTheSubscriptionUnlessItNamesTheSamePoint) {
  const Point a = registerPoint("a");
  const Point b = registerPoint("b");
  const Point gone = registerPoint("gone");
  enum Kind { kEmpty, kA, kB, kGone, kNever };
  auto make = [&](Kind k) {
    switch (k) {
      case kEmpty: return MonitoringPointReader();
      case kA: return MonitoringPointReader(a.pointId);
      case kB: return MonitoringPointReader(b.pointId);
      case kGone: return MonitoringPointReader(gone.pointId);
      case kNever: return MonitoringPointReader(IdStamp());
    }
    return MonitoringPointReader();
  };
  const Kind kinds[] = {kEmpty, kA, kB, kGone, kNever};
  for (Kind target : kinds) {
    for (Kind source : kinds) {
      SCOPED_TRACE(testing::Message() << "target " << target << " source " << source);
      MonitoringPointReader t = make(target);
      const MonitoringPointReader s = make(source);
      if (target == kGone || source == kGone) {
        MonitoringPointManager::unregisterMP(gone.writerId);
      }
      MonitoringPointWriter(a.writerId).updatePeakSampleValue(0.5f);
      MonitoringPointWriter(b.writerId).updatePeakSampleValue(0.5f);
      const IdStamp sourceId = s.getId();

      t = s;
      // Kept only between two subscriptions to one point (each kNever reader
      // names an id of its own). The kept one still holds its 0.5.
      const bool keptWritten = target == source && (target == kA || target == kB);
      EXPECT_EQ(t.getId(), sourceId);
      EXPECT_EQ(t.valid(), s.valid());
      EXPECT_EQ(t.peakValue(false), keptWritten ? 0.5f : 0.0f);
      t = t;
      EXPECT_EQ(t.getId(), sourceId);
    }
  }
}

TEST_F(MonitoringPointReaderTest, SelfAssignmentKeepsTheHeldState) {
  const Point p = registerPoint();
  MonitoringPointReader reader(p.pointId);
  MonitoringPointWriter(p.writerId).updateHasClipped();
  MonitoringPointReader& alias = reader;
  reader = alias;
  EXPECT_TRUE(reader.hasClipped(false));
  EXPECT_EQ(reader.peakValue(false), 1.0f);
  MonitoringPointReader empty;
  reader = empty;
  EXPECT_FALSE(reader.valid());
  EXPECT_FALSE(reader.getId().valid());
  EXPECT_EQ(reader.peakValue(true), 0.0f);
}

TEST_F(MonitoringPointReaderTest, Writers) {
  const MonitoringPointWriter none;
  EXPECT_FALSE(none.valid());
  EXPECT_FALSE(none.getId().valid());

  const Point p = registerPoint();
  MonitoringPointReader reader(p.pointId);
  MonitoringPointWriter writer(p.writerId);
  MonitoringPointWriter copy;
  copy = writer;
  EXPECT_TRUE(copy.valid());
  EXPECT_EQ(copy.getId(), p.writerId);
  copy.updatePeakSampleValue(0.3f);
  MonitoringPointWriter(copy).updatePeakSampleValue(0.6f);
  MonitoringPointWriter(p.pointId).updatePeakSampleValue(0.9f);  // a point id names no writer
  MonitoringPointWriter().updateHasClipped();
  EXPECT_EQ(reader.peakValue(true), 0.6f);
  EXPECT_FALSE(reader.hasClipped(true));
}

}  // namespace
