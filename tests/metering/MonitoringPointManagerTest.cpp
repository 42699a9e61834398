#include <gtest/gtest.h>

#include <bit>
#include <cmath>
#include <limits>
#include <set>

#include "metering/MeteringTestSupport.h"

namespace {

using Aud::MonitoringPointInfo;
using Aud::MonitoringPointManager;
using Aud::MonitoringPointReaderListEntry;
using metering_test::Capture;
using metering_test::Point;
using metering_test::registerPoint;

MonitoringPointManager& manager() { return MonitoringPointManager::instance(); }

void expectEmptyInfo(const MonitoringPointInfo& info) {
  EXPECT_EQ(info.code, 0);
  EXPECT_TRUE(info.text1.isEmpty() && info.text2.isEmpty() && info.text3.isEmpty());
  EXPECT_FALSE(info.flag);
  EXPECT_EQ(info.value, 0.0f);
}

// A subscription's held state, read the way the tests compare it.
struct Held {
  float peak;
  bool clipped, taken;
};
Held heldOf(const MonitoringPointReaderListEntry* e) {
  return {e->heldPeak.load(), e->clipped.load(), e->peakTaken.load()};
}

TEST(MonitoringPointManager, RegistrationHandsOutFreshIdsAndKeepsTheDescription) {
  const MonitoringPointInfo info = metering_test::describe("twice", 200);
  Point a, b;
  ASSERT_EQ(MonitoringPointManager::registerMP(info, a.pointId, a.writerId), Aud::sSuccess);
  ASSERT_EQ(MonitoringPointManager::registerMP(info, b.pointId, b.writerId), Aud::sSuccess);
  const std::set<IdStamp> ids{a.pointId, a.writerId, b.pointId, b.writerId};
  EXPECT_EQ(ids.size(), 4u);
  for (const IdStamp& id : ids) EXPECT_TRUE(id.valid());

  const MonitoringPointInfo& got = MonitoringPointManager::getInfo(a.writerId);
  EXPECT_EQ(got.code, 200);
  EXPECT_STREQ(got.text1, "twice");
  EXPECT_STREQ(got.text2, "second");
  EXPECT_STREQ(got.text3, "third");
  EXPECT_TRUE(got.flag);
  EXPECT_EQ(got.value, -12.5f);
  // The description is keyed by the writer id only.
  expectEmptyInfo(MonitoringPointManager::getInfo(a.pointId));
  expectEmptyInfo(MonitoringPointManager::getInfo(IdStamp()));
  EXPECT_EQ(&MonitoringPointManager::getInfo(a.pointId), &MonitoringPointManager::getInfo(IdStamp()));
}

TEST(MonitoringPointManager, InternalReaderIdIsTheInvalidIdWhateverTheArguments) {
  const IdStamp& first = MonitoringPointManager::getInternalReaderId(0, Aud::eIO_Input);
  for (unsigned channel : {0u, 1u, 63u, ~0u}) {
    for (auto direction : {Aud::eIO_Input, Aud::eIO_Output, static_cast<Aud::eIO_Direction>(-5)}) {
      const IdStamp& id = MonitoringPointManager::getInternalReaderId(channel, direction);
      EXPECT_FALSE(id.valid());
      EXPECT_EQ(&id, &first);
    }
  }
}

// Which subscriptions a write reaches, by how they were made.
TEST(MonitoringPointManager, OnlySubscriptionsMadeFromARegisteredPointIdAreAttached) {
  const Point p = registerPoint();
  struct Row {
    const char* what;
    IdStamp id;
    bool attached;
  };
  const Row rows[] = {
      {"point id", p.pointId, true},
      {"writer id", p.writerId, false},
      {"id never registered", IdStamp(), false},
      {"invalid id", IdStamp::invalidStamp(), false},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    MonitoringPointReaderListEntry* e = manager().mpAddReader(row.id);
    ASSERT_NE(e, nullptr);
    EXPECT_EQ(e->pointId, row.id);
    EXPECT_EQ(e->writerId, row.attached ? p.writerId : IdStamp::invalidStamp());
    const Held fresh = heldOf(e);
    EXPECT_EQ(fresh.peak, 0.0f);
    EXPECT_FALSE(fresh.clipped || fresh.taken);
    EXPECT_EQ(e->takenAtMs.load(), 0.0);

    EXPECT_EQ(manager().mpUpdatePeakSampleValue(p.writerId, 0.25f), Aud::sSuccess);
    EXPECT_EQ(manager().mpUpdateHasClipped(p.writerId), Aud::sSuccess);
    EXPECT_EQ(heldOf(e).peak, row.attached ? 1.0f : 0.0f);
    EXPECT_EQ(heldOf(e).clipped, row.attached);
    EXPECT_EQ(manager().mpRemoveReader(e), Aud::sSuccess);
  }
}

TEST(MonitoringPointManager, ADetachedSubscriptionStaysDetachedAfterLaterRegistrations) {
  MonitoringPointReaderListEntry* e = manager().mpAddReader(IdStamp());
  const Point p = registerPoint();
  manager().mpUpdatePeakSampleValue(p.writerId, 0.5f);
  EXPECT_FALSE(e->writerId.valid());
  EXPECT_EQ(heldOf(e).peak, 0.0f);
  EXPECT_EQ(manager().mpRemoveReader(e), Aud::sSuccess);
}

TEST(MonitoringPointManager, UnregisteringDetachesReadersAndKeepsTheDescription) {
  const Point p = registerPoint("gone");
  MonitoringPointReaderListEntry* readers[3];
  for (auto& r : readers) r = manager().mpAddReader(p.pointId);
  manager().mpUpdatePeakSampleValue(p.writerId, 0.75f);

  EXPECT_EQ(MonitoringPointManager::unregisterMP(p.writerId), Aud::sSuccess);
  EXPECT_EQ(MonitoringPointManager::unregisterMP(p.writerId), Aud::sInvalid);
  EXPECT_EQ(MonitoringPointManager::unregisterMP(p.pointId), Aud::sInvalid);
  EXPECT_STREQ(MonitoringPointManager::getInfo(p.writerId).text1, "gone");

  // Writes through the old writer id are accepted and reach nobody.
  EXPECT_EQ(manager().mpUpdatePeakSampleValue(p.writerId, 0.9f), Aud::sSuccess);
  EXPECT_EQ(manager().mpUpdateHasClipped(p.writerId), Aud::sSuccess);
  for (auto* r : readers) {
    EXPECT_FALSE(r->writerId.valid());
    EXPECT_FALSE(r->pointId.valid());
    EXPECT_EQ(heldOf(r).peak, 0.75f);  // the last value held before unregistration
    EXPECT_FALSE(heldOf(r).clipped);
  }
  // A reader made now from the old point id is detached.
  MonitoringPointReaderListEntry* late = manager().mpAddReader(p.pointId);
  EXPECT_FALSE(late->writerId.valid());
  // Detached subscriptions are still given back, in any order.
  EXPECT_EQ(manager().mpRemoveReader(readers[1]), Aud::sSuccess);
  EXPECT_EQ(manager().mpRemoveReader(late), Aud::sSuccess);
  EXPECT_EQ(manager().mpRemoveReader(readers[2]), Aud::sSuccess);
  EXPECT_EQ(manager().mpRemoveReader(readers[0]), Aud::sSuccess);
}

TEST(MonitoringPointManager, RemovingWhatItDoesNotHoldIsRefused) {
  Capture capture;
  EXPECT_EQ(manager().mpRemoveReader(nullptr), Aud::sInvalid);
  ASSERT_EQ(capture.fatal().size(), 1u);
  EXPECT_EQ(capture.fatal()[0], "Illegal client ptr in Aud::MonitoringPointManager::mpRemoveReader");

  // A subscription of nobody, whether it names a registered point or not.
  const Point p = registerPoint();
  MonitoringPointReaderListEntry stranger;
  EXPECT_EQ(manager().mpRemoveReader(&stranger), Aud::sInvalid);
  stranger.writerId = p.writerId;
  EXPECT_EQ(manager().mpRemoveReader(&stranger), Aud::sInvalid);
  EXPECT_EQ(capture.fatal().size(), 1u);
}

// The write rule, step by step on two subscriptions of one point: `reset`
// is a resetting read by the first one only.
TEST(MonitoringPointManager, WriteAndClipRules) {
  constexpr float kNaN = std::numeric_limits<float>::quiet_NaN();
  enum Op { kWrite, kClip, kReset };
  struct Step {
    Op op;
    float value;
    float first, second;  // held peaks after the step
  };
  struct Row {
    const char* what;
    std::vector<Step> steps;
    bool firstClipped, secondClipped;
  };
  const Row rows[] = {
      {"the largest is kept",
       {{kWrite, 0.2f, 0.2f, 0.2f}, {kWrite, 0.5f, 0.5f, 0.5f}, {kWrite, 0.3f, 0.5f, 0.5f}},
       false,
       false},
      {"after a resetting read the next write replaces",
       {{kWrite, 0.5f, 0.5f, 0.5f},
        {kReset, 0, 0.5f, 0.5f},
        {kWrite, 0.1f, 0.1f, 0.5f},
        {kWrite, 0.05f, 0.1f, 0.5f}},
       false,
       false},
      {"equal is not larger",
       {{kWrite, -0.0f, 0.0f, 0.0f}, {kWrite, 0.5f, 0.5f, 0.5f}, {kWrite, 0.5f, 0.5f, 0.5f}},
       false,
       false},
      {"NaN is never larger", {{kWrite, 0.4f, 0.4f, 0.4f}, {kWrite, kNaN, 0.4f, 0.4f}}, false, false},
      {"a taken peak is replaced even by NaN, which no write then beats",
       {{kWrite, 0.4f, 0.4f, 0.4f},
        {kReset, 0, 0.4f, 0.4f},
        {kWrite, kNaN, kNaN, 0.4f},
        {kWrite, 0.5f, kNaN, 0.5f}},
       false,
       false},
      {"negative values only replace",
       {{kWrite, -0.5f, 0.0f, 0.0f}, {kReset, 0, 0.0f, 0.0f}, {kWrite, -0.5f, -0.5f, 0.0f}},
       false,
       false},
      {"a clip raises to full scale",
       {{kWrite, 0.3f, 0.3f, 0.3f}, {kClip, 0, 1.0f, 1.0f}, {kWrite, 0.5f, 1.0f, 1.0f}},
       true,
       true},
      {"a clip keeps a larger untaken value",
       {{kWrite, 1.5f, 1.5f, 1.5f}, {kClip, 0, 1.5f, 1.5f}},
       true,
       true},
      {"a clip replaces a taken value",
       {{kWrite, 1.5f, 1.5f, 1.5f}, {kReset, 0, 1.5f, 1.5f}, {kClip, 0, 1.0f, 1.5f}},
       true,
       true},
      {"a resetting read clears only its own flag",
       {{kClip, 0, 1.0f, 1.0f}, {kReset, 0, 1.0f, 1.0f}},
       false,
       true},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    const Point p = registerPoint();
    MonitoringPointReaderListEntry* first = manager().mpAddReader(p.pointId);
    MonitoringPointReaderListEntry* second = manager().mpAddReader(p.pointId);
    for (const Step& step : row.steps) {
      switch (step.op) {
        case kWrite: manager().mpUpdatePeakSampleValue(p.writerId, step.value); break;
        case kClip: manager().mpUpdateHasClipped(p.writerId); break;
        case kReset:
          first->peakTaken = true;  // what a resetting read leaves behind
          first->clipped = false;
          break;
      }
      EXPECT_EQ(std::bit_cast<uint32_t>(heldOf(first).peak), std::bit_cast<uint32_t>(step.first));
      EXPECT_EQ(std::bit_cast<uint32_t>(heldOf(second).peak), std::bit_cast<uint32_t>(step.second));
    }
    EXPECT_EQ(heldOf(first).clipped, row.firstClipped);
    EXPECT_EQ(heldOf(second).clipped, row.secondClipped);
    manager().mpRemoveReader(first);
    manager().mpRemoveReader(second);
    MonitoringPointManager::unregisterMP(p.writerId);
  }
}

TEST(MonitoringPointManager, CopiesCarryThePointsAndShareTheSubscriptions) {
  MonitoringPointManager original;
  Point a, b;
  original.mpRegister(metering_test::describe("a"), a.pointId, a.writerId);
  MonitoringPointReaderListEntry* e = original.mpAddReader(a.pointId);

  MonitoringPointManager copy(original);
  EXPECT_STREQ(copy.mpGetInfo(a.writerId).text1, "a");
  copy.mpUpdatePeakSampleValue(a.writerId, 0.5f);  // the subscription is shared by pointer
  EXPECT_EQ(heldOf(e).peak, 0.5f);

  // Points registered in one are unknown to the other.
  original.mpRegister(metering_test::describe("b"), b.pointId, b.writerId);
  expectEmptyInfo(copy.mpGetInfo(b.writerId));
  EXPECT_EQ(copy.mpUnregister(b.writerId), Aud::sInvalid);

  MonitoringPointManager assigned;
  assigned = original;
  assigned = assigned;
  EXPECT_STREQ(assigned.mpGetInfo(b.writerId).text1, "b");
  EXPECT_EQ(assigned.mpUnregister(a.writerId), Aud::sSuccess);
  EXPECT_EQ(original.mpUnregister(a.writerId), Aud::sSuccess);  // still registered there
  // Both detached the shared subscription; the original still holds it.
  EXPECT_EQ(original.mpRemoveReader(e), Aud::sSuccess);
}

}  // namespace
