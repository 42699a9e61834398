// The input monitor, the manager's registry and subscriptions, and the
// readers and writers on it.
#include <gtest/gtest.h>

#include <bit>
#include <climits>
#include <limits>
#include <optional>
#include <set>

#include "metering/MeteringTestSupport.h"

namespace {

using Aud::MonitoringPointManager;
using Aud::MonitoringPointReader;
using Aud::MonitoringPointWriter;
using Aud::StreamBuffer;
using metering_test::bufferOf;
using metering_test::bytesOf;
using metering_test::Point;
using metering_test::registerPoint;
using metering_test::TestMonitor;
using Bytes = std::vector<unsigned char>;

class Metering : public ::testing::Test {
 protected:
  metering_test::ManualClock clock;  // frozen unless a test moves it
};

// Each input gets a point with fresh ids, described under its writer id
// only; other ids share one empty description.
TEST_F(Metering, RegistersOnePointPerInputNamedFromZeroOnEveryCall) {
  std::optional<MonitoringPointReader> reader;
  {
    TestMonitor monitor;
    monitor.registerMonitoringPoints(2);
    monitor.registerMonitoringPoints(2);
    std::set<IdStamp> ids;
    for (unsigned i = 0; i < 4; ++i) {
      const std::string name = "[ZIREzuru][PhysicalInput][" + std::to_string(i % 2) + "]";
      const auto& info = MonitoringPointManager::getInfo(monitor.writerId(i));
      for (const char* text : {info.text1, info.text2, info.text3}) EXPECT_STREQ(text, name.c_str());
      EXPECT_TRUE(info.code == 0 && info.flag && info.value == 60.0f);
      const IdStamp& pointId = monitor.getInputMonitoringPointId(i);
      EXPECT_EQ(&MonitoringPointManager::getInfo(pointId), &MonitoringPointManager::getInfo(IdStamp()));
      ids.insert({pointId, monitor.writerId(i)});
    }
    EXPECT_TRUE(ids.size() == 8u && !ids.contains(IdStamp::invalidStamp()));
    EXPECT_TRUE(MonitoringPointManager::getInfo(IdStamp()).text1.isEmpty());
    EXPECT_FALSE(monitor.getInputMonitoringPointId(4).valid());
    EXPECT_FALSE(monitor.getInputMonitoringPointId(UINT_MAX).valid());
    EXPECT_EQ(TestMonitor(monitor).writerId(3), monitor.writerId(3));  // a copy names the same points
    reader.emplace(monitor.getInputMonitoringPointId(3));
  }
  EXPECT_TRUE(reader->valid());  // points outlive the monitor
  EXPECT_FALSE(MonitoringPointManager::getInternalReaderId(0, Aud::eIO_Input).valid());
  EXPECT_FALSE(MonitoringPointManager::getInternalReaderId(~0u, Aud::eIO_Output).valid());
}

// Blocks, and what the meters of a 3-input monitor then read (0.5 where an
// input got no write). A block's memory may not hold what its sample count
// claims: a buffer without memory writes 0, and only whole samples inside the
// memory are read (under ASan a read past the end stops the test).
TEST_F(Metering, BuffersAreMatchedToInputsAndReadOnlyWhereTheyHoldSamples) {
  auto f = [](float peak) { return bufferOf(bytesOf<float>({peak / 2, -peak}), 2, 0); };
  const Bytes held = {0x64, 0, 0xD4, 0xFE, 0xC8, 0, 0x80};  // 100, -300, 200, and half a sample, not read
  const StreamBuffer none(0, 1u << 20, 1), part = bufferOf(held, 1u << 20, 1),
                                           empty = bufferOf({}, 1u << 20, 1);
  const StreamBuffer bad = bufferOf({0xFF, 0xFF, 0xFF, 0xFF}, 1, 1);
  const StreamBuffer loud = bufferOf(bytesOf<int16_t>({-32768, 5}), 1, 1);  // more memory than the count
  struct Row {
    const char* what;
    std::vector<StreamBuffer> buffers;
    unsigned numSamples;
    int type;
    float expect[3];
    std::size_t logs = 0;
  };
  const Row rows[] = {
      {"one buffer per input", {f(.1f), f(.2f), f(.3f)}, 2, 0, {.1f, .2f, .3f}},
      {"fewer buffers leave inputs unwritten", {f(.1f)}, 2, 0, {.1f, .5f, .5f}},
      {"extra buffers are not read", {f(.1f), f(.2f), f(.3f), f(.95f), f(.99f)}, 2, 0, {.1f, .2f, .3f}},
      {"an empty block writes nothing", {}, 2, 0, {.5f, .5f, .5f}},
      {"memory short of the count", {none, part, empty}, 1u << 20, 1, {0, 300.0f / 32768, 0}},
      {"the count wins over more memory", {loud, none, loud}, 1, 1, {1, 0, 1}},
      {"a count of 0", {loud, loud, loud}, 0, 1, {0, 0, 0}},
      {"type -1 logs per buffer", {bad, none}, 1, -1, {0, 0, .5f}, 2},
      {"type 9", {bad, none, bad}, 1, 9, {0, 0, 0}, 3},
      {"type INT_MIN", {bad}, 1, INT_MIN, {0, .5f, .5f}, 1},
  };
  TestMonitor monitor;
  monitor.registerMonitoringPoints(3);
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    auto readers = metering_test::primedReaders(monitor);
    auto block = metering_test::listOf(row.buffers, row.numSamples, row.type);
    metering_test::Capture capture;
    monitor.updateMonitoringPoints(block);
    EXPECT_EQ(capture.lines,
              std::vector<std::string>(row.logs, "Monitor: buffer sample format not supported!\n"));
    for (unsigned i = 0; i < 3; ++i) {
      EXPECT_EQ(readers[i].peakValue(true), row.expect[i]) << "input " << i;
      EXPECT_EQ(readers[i].hasClipped(true), row.expect[i] == 1.0f) << "input " << i;
    }
  }
}

// Which readers a write reaches, by how they were made and written.
TEST_F(Metering, OnlyReadersOfARegisteredPointIdAreAttached) {
  const Point p = registerPoint();
  MonitoringPointWriter writer, none;
  EXPECT_FALSE(none.valid() || none.getId().valid());
  writer = MonitoringPointWriter(p.writerId);
  const struct {
    IdStamp id;
    bool attached;
  } rows[] = {{p.pointId, true}, {p.writerId, false}, {IdStamp(), false}, {IdStamp::invalidStamp(), false}};
  for (const auto& row : rows) {
    MonitoringPointReader r(row.id);
    EXPECT_EQ(r.getId(), row.id);  // the id it was built from, even detached
    EXPECT_EQ(r.valid(), row.attached);
    MonitoringPointWriter(p.pointId).updatePeakSampleValue(0.9f);  // a point id names no writer
    none.updateHasClipped();
    EXPECT_FALSE(r.peakValue(false) != 0.0f || r.hasClipped(false));
    writer.updatePeakSampleValue(0.25f);
    MonitoringPointWriter(writer).updateHasClipped();
    EXPECT_EQ(r.peakValue(true), row.attached ? 1.0f : 0.0f);
    EXPECT_EQ(r.hasClipped(true), row.attached);
  }
}

// Unregistering detaches readers, which hold their last value until expiry.
TEST_F(Metering, UnregisteringAndRemoving) {
  const Point p = registerPoint("gone");
  std::optional<MonitoringPointReader> readers[3];
  for (auto& r : readers) r.emplace(p.pointId);
  MonitoringPointWriter writer(p.writerId);
  writer.updatePeakSampleValue(0.6f);
  writer.updateHasClipped();
  writer.updatePeakSampleValue(1.25f);
  EXPECT_EQ(MonitoringPointManager::unregisterMP(p.writerId), Aud::sSuccess);
  EXPECT_EQ(MonitoringPointManager::unregisterMP(p.writerId), Aud::sInvalid);
  EXPECT_EQ(MonitoringPointManager::unregisterMP(p.pointId), Aud::sInvalid);
  EXPECT_STREQ(MonitoringPointManager::getInfo(p.writerId).text1, "gone");
  EXPECT_TRUE(writer.valid());  // the writer does not ask the manager; its writes reach nobody
  writer.updatePeakSampleValue(1.5f);
  EXPECT_FALSE(MonitoringPointReader(p.pointId).valid());
  for (auto& r : readers) {
    EXPECT_FALSE(r->valid() || r->getId().valid());
    EXPECT_EQ(r->peakValue(true), 1.25f);
    EXPECT_TRUE(r->hasClipped(true));
  }
  clock.advance(40.5);
  EXPECT_EQ(readers[0]->peakValue(true), 0.0f);
  metering_test::Capture capture;  // detached subscriptions are still given back, in any order
  for (int i : {1, 2, 0}) readers[i].reset();
  EXPECT_TRUE(capture.lines.empty());
  // What the manager does not hold is refused: a null pointer, reported, and
  // a subscription of nobody, whether it names a registered point or not.
  EXPECT_EQ(MonitoringPointManager::instance().mpRemoveReader(nullptr), Aud::sInvalid);
  EXPECT_EQ(capture.lines,
            std::vector<std::string>{"Illegal client ptr in Aud::MonitoringPointManager::mpRemoveReader"});
  Aud::MonitoringPointReaderListEntry stranger;
  for (const IdStamp& id : {IdStamp::invalidStamp(), registerPoint().writerId}) {
    stranger.writerId = id;
    EXPECT_EQ(MonitoringPointManager::instance().mpRemoveReader(&stranger), Aud::sInvalid);
  }
  EXPECT_EQ(capture.lines.size(), 1u);
}

// The write, clip and read rules, step by step on two readers of one point.
// A step is a write (W), a clip (C), a resetting read by the first reader
// only (R, which returns what it holds) or a move of the clock (T); after it
// both readers' held peaks are looked at, without resetting. Each row ends
// with both clip flags. A taken peak that no write refreshes falls to 0 once
// the clock has moved more than 40 ms since the resetting read.
TEST_F(Metering, WriteClipAndReadRules) {
  constexpr float kNaN = std::numeric_limits<float>::quiet_NaN(), h = .7f;
  enum Op { W, C, R, T };
  struct Step {
    Op op;
    double value;  // written, or the ms the clock moves
    float first, second;
  };
  struct Row {
    const char* what;
    bool firstClipped, secondClipped;
    std::vector<Step> steps;
  };
  const Row rows[] = {
      {"largest kept", 0, 0, {{W, .2, .2f, .2f}, {W, .5, .5f, .5f}, {W, .3, .5f, .5f}}},
      {"taken, replaced", 0, 0, {{W, .5, .5f, .5f}, {R, 0, .5f, .5f}, {W, .1, .1f, .5f}, {W, .05, .1f, .5f}}},
      {"equal is not larger", 0, 0, {{W, -0.0, 0, 0}, {W, .5, .5f, .5f}, {W, .5, .5f, .5f}}},
      {"NaN never larger", 0, 0, {{W, .4, .4f, .4f}, {W, kNaN, .4f, .4f}}},
      {"NaN taken", 0, 0, {{W, .4, .4f, .4f}, {R, 0, .4f, .4f}, {W, kNaN, kNaN, .4f}, {W, .5, kNaN, .5f}}},
      {"negatives only replace", 0, 0, {{W, -.5, 0, 0}, {R, 0, 0, 0}, {W, -.5, -.5f, 0}}},
      {"clip raises to 1", 1, 1, {{W, .3, .3f, .3f}, {C, 0, 1, 1}, {W, .5, 1, 1}}},
      {"clip keeps larger untaken", 1, 1, {{W, 1.5, 1.5f, 1.5f}, {C, 0, 1.5f, 1.5f}}},
      {"clip replaces taken", 1, 1, {{W, 1.5, 1.5f, 1.5f}, {R, 0, 1.5f, 1.5f}, {C, 0, 1, 1.5f}}},
      {"reset clears own flag", 0, 1, {{C, 0, 1, 1}, {R, 0, 1, 1}}},
      {"exactly 40 ms holds", 0, 0, {{W, .7, h, h}, {R, 0, h, h}, {T, 40, h, h}, {R, 0, h, h}}},
      {"just past falls", 0, 0, {{W, .7, h, h}, {R, 0, h, h}, {T, 40.000001, 0, h}, {R, 0, 0, h}}},
      {"looks don't restart", 0, 0, {{W, .7, h, h}, {R, 0, h, h}, {T, 30, h, h}, {T, 20, 0, h}}},
      {"resets restart", 0, 0, {{W, .7, h, h}, {R, 0, h, h}, {T, 30, h, h}, {R, 0, h, h}, {T, 30, h, h}}},
      {"a write ends the hold", 0, 0, {{W, .7, h, h}, {R, 0, h, h}, {W, .1, .1f, h}, {T, 90, .1f, h}}},
      {"expired, kept", 0, 0, {{W, .7, h, h}, {R, 0, h, h}, {T, 41, 0, h}, {W, .2, .2f, h}, {W, .1, .2f, h}}},
  };
  auto bits = [](float f) { return std::bit_cast<uint32_t>(f); };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    clock.set(5000.0);
    const Point p = registerPoint();
    MonitoringPointReader first(p.pointId), second(p.pointId);
    MonitoringPointWriter writer(p.writerId);
    for (const Step& step : row.steps) {
      if (step.op == W) writer.updatePeakSampleValue(float(step.value));
      if (step.op == C) writer.updateHasClipped();
      if (step.op == T) clock.advance(step.value);
      if (step.op == R) {
        EXPECT_EQ(bits(first.peakValue(true)), bits(step.first));
        first.hasClipped(true);
      }
      EXPECT_EQ(bits(first.peakValue(false)), bits(step.first));
      EXPECT_EQ(bits(second.peakValue(false)), bits(step.second));
    }
    for (bool reset : {false, true}) {  // only a resetting read clears the flag, and returns it
      EXPECT_EQ(first.hasClipped(reset), row.firstClipped);
      EXPECT_EQ(second.hasClipped(reset), row.secondClipped);
    }
    EXPECT_FALSE(first.hasClipped(false) || second.hasClipped(false));
  }
}

TEST_F(Metering, ManagerCopiesCarryThePointsAndShareTheSubscriptions) {
  MonitoringPointManager original, assigned;
  Point a, b;
  original.mpRegister(metering_test::describe("a"), a.pointId, a.writerId);
  auto* e = original.mpAddReader(a.pointId);
  MonitoringPointManager copy(original);
  original.mpRegister(metering_test::describe("b"), b.pointId, b.writerId);  // unknown to the copy
  copy.mpUpdatePeakSampleValue(a.writerId, 0.5f);  // the subscription is shared by pointer
  EXPECT_EQ(e->heldPeak.load(), 0.5f);
  EXPECT_TRUE(copy.mpGetInfo(b.writerId).text1.isEmpty());
  assigned = original;
  assigned = assigned;
  EXPECT_STREQ(assigned.mpGetInfo(b.writerId).text1, "b");
  for (MonitoringPointManager* m : {&assigned, &copy, &original})
    EXPECT_EQ(m->mpUnregister(a.writerId), Aud::sSuccess);
  EXPECT_EQ(original.mpRemoveReader(e), Aud::sSuccess);  // detached by all three, held by the original
}

// Copy and assignment over every pair of reader states: a copy is a new
// subscription to the same point; the target of an assignment keeps its own
// subscription (and held state) only when both name the same point, and
// always when assigned to itself.
TEST_F(Metering, ReaderCopyAndAssignment) {
  const Point a = registerPoint("a"), b = registerPoint("b"), gone = registerPoint("gone");
  enum Kind { kEmpty, kA, kB, kGone, kNever };  // each kNever reader names an id of its own
  auto make = [&](Kind k) {
    const IdStamp ids[] = {IdStamp(), a.pointId, b.pointId, gone.pointId, IdStamp()};
    return k == kEmpty ? MonitoringPointReader() : MonitoringPointReader(ids[k]);
  };
  for (Kind target : {kEmpty, kA, kB, kGone, kNever}) {
    for (Kind source : {kEmpty, kA, kB, kGone, kNever}) {
      SCOPED_TRACE(testing::Message() << "target " << target << " source " << source);
      MonitoringPointReader t = make(target);
      const MonitoringPointReader s = make(source);
      if (target == kGone || source == kGone) MonitoringPointManager::unregisterMP(gone.writerId);
      MonitoringPointWriter(a.writerId).updatePeakSampleValue(0.5f);
      MonitoringPointWriter(b.writerId).updatePeakSampleValue(0.5f);
      const IdStamp sourceId = s.getId();  // invalid once the point is gone
      MonitoringPointReader copy(s);
      EXPECT_EQ(copy.getId(), sourceId);
      EXPECT_EQ(copy.valid(), s.valid());
      EXPECT_FALSE(copy.peakValue(false) != 0.0f || copy.hasClipped(false));  // fresh held state
      t = s;
      EXPECT_EQ(t.getId(), sourceId);
      EXPECT_EQ(t.valid(), s.valid());
      EXPECT_EQ(t.peakValue(false), target == source && (target == kA || target == kB) ? 0.5f : 0.0f);
      MonitoringPointWriter(a.writerId).updateHasClipped();
      MonitoringPointWriter(b.writerId).updateHasClipped();
      t = t;
      EXPECT_EQ(t.getId(), sourceId);
      EXPECT_EQ(t.hasClipped(false), t.valid());
    }
  }
}

}  // namespace
