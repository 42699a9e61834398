// Metering under concurrency, meant for the ThreadSanitizer build: an audio
// thread feeds 8 points block by block while meter threads poll them with
// resetting and non-resetting reads and make, copy, assign and drop readers,
// and another thread registers and unregisters points. Beside them a writer
// and a meter take turns on one point to check the read rule across threads.
// The work is bounded by a round count and a time budget; no assertion
// depends on time.
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <mutex>
#include <random>
#include <sstream>
#include <thread>
#include <vector>

#include "metering/MeteringTestSupport.h"

namespace {

using Aud::MonitoringPointManager;
using Aud::MonitoringPointReader;
using Aud::MonitoringPointWriter;
using metering_test::ManualClock;
using metering_test::Point;
using metering_test::TestMonitor;

constexpr unsigned kInputs = 8;
constexpr unsigned kBlock = 64;
constexpr int kMeters = 4;
constexpr int kRounds = 300;
constexpr auto kBudget = std::chrono::milliseconds(1500);  // on a loaded machine, fewer rounds
constexpr float kLoudest = 1.25f;                          // no sample of the audio thread is louder

// One round of the turn-taking check: what the writer wrote, and how far it
// moved the clock before handing over.
struct Round {
  std::vector<float> writes;  // a clip report counts as a write of 1.0
  bool clipped = false;
  double advanceMs = 0;
};

class Shared {
 public:
  std::atomic<bool> stop{false};
  std::atomic<int> bad{0};  // reads outside what was ever written
  // Work done, so the run can stop once every thread has done its share.
  std::atomic<int> blocks{0}, polls{0}, registrations{0};
  bool enoughWork() const {
    return blocks.load() >= 4000 && polls.load() >= 40000 && registrations.load() >= 400;
  }

  void publishChurn(const IdStamp& id) {
    std::lock_guard lock(mutex_);
    churn_ = id;
  }
  IdStamp churn() {
    std::lock_guard lock(mutex_);
    return churn_;
  }

 private:
  std::mutex mutex_;
  IdStamp churn_ = IdStamp::invalidStamp();
};

void checkRead(Shared& shared, float v) {
  if (!(v >= 0.0f && v <= kLoudest)) shared.bad.fetch_add(1, std::memory_order_relaxed);
}

void audioThread(TestMonitor& monitor, Shared& shared) {
  std::mt19937 rng(1);
  std::uniform_real_distribution<float> sample(-kLoudest, kLoudest);
  Aud::StreamBufferList block;
  for (unsigned c = 0; c < kInputs; ++c) {
    block.buffers.push_back(metering_test::bufferOf(std::vector<unsigned char>(kBlock * 4), kBlock, 0));
  }
  block.numSamples = kBlock;
  block.sampleType = 0;
  while (!shared.stop.load(std::memory_order_relaxed)) {
    const float scale = (rng() % 4) / 3.0f;  // quiet blocks and loud ones
    for (auto& b : block.buffers) {
      float* s = reinterpret_cast<float*>(b.getBuffer());
      for (unsigned i = 0; i < kBlock; ++i) s[i] = sample(rng) * scale;
    }
    monitor.updateMonitoringPoints(block);
    MonitoringPointWriter(monitor.writerId(rng() % kInputs)).updatePeakSampleValue(0.5f);
    shared.blocks.fetch_add(1, std::memory_order_relaxed);
    std::this_thread::yield();
  }
}

// A polling meter only reads, as a meter's timer does, and so never takes
// the manager's lock in its loop; the others also handle readers.
void meterThread(TestMonitor& monitor, const Point& turnPoint, Shared& shared, unsigned seed, bool pollOnly) {
  std::mt19937 rng(seed);
  std::vector<MonitoringPointReader> readers;
  readers.reserve(kInputs + 1);
  for (unsigned i = 0; i < kInputs; ++i) readers.emplace_back(monitor.getInputMonitoringPointId(i));
  readers.emplace_back(turnPoint.pointId);
  for (unsigned n = 0; !shared.stop.load(std::memory_order_relaxed); ++n) {
    MonitoringPointReader& r = readers[rng() % readers.size()];
    checkRead(shared, r.peakValue(rng() & 1));
    r.hasClipped(rng() & 1);
    shared.polls.fetch_add(1, std::memory_order_relaxed);
    if (n % 16 == 0) std::this_thread::yield();
    if (pollOnly) continue;
    if (!r.valid() || !r.getId().valid()) shared.bad.fetch_add(1, std::memory_order_relaxed);
    if (n % 16 != 0) continue;

    MonitoringPointReader copy(r);
    checkRead(shared, copy.peakValue(true));
    readers[rng() % kInputs] = readers[rng() % kInputs];
    MonitoringPointReader churn(shared.churn());
    checkRead(shared, churn.peakValue(rng() & 1));
    churn.hasClipped(true);
    churn.valid();
    churn.getId();
    MonitoringPointReader assigned;
    assigned = churn;
    assigned = copy;
    assigned = churn;
    checkRead(shared, assigned.peakValue(false));
  }
}

void registryThread(Shared& shared) {
  std::mt19937 rng(2);
  std::uniform_real_distribution<float> peak(0.0f, kLoudest);
  while (!shared.stop.load(std::memory_order_relaxed)) {
    Point p;
    MonitoringPointManager::registerMP(metering_test::describe("churn"), p.pointId, p.writerId);
    shared.publishChurn(p.pointId);
    MonitoringPointReader reader(p.pointId);
    MonitoringPointWriter writer(p.writerId);
    for (int j = 0; j < 8; ++j) {
      writer.updatePeakSampleValue(peak(rng));
      if (j % 3 == 0) writer.updateHasClipped();
      checkRead(shared, reader.peakValue(j & 1));
    }
    MonitoringPointManager::unregisterMP(p.writerId);
    checkRead(shared, reader.peakValue(true));
    shared.registrations.fetch_add(1, std::memory_order_relaxed);
    std::this_thread::yield();
  }
}

// The writer and the meter take turns through `turn` (release/acquire), so
// the meter's expectation is exact: a resetting read returns the largest
// value written since the previous resetting read or, with nothing written,
// the value held before, which falls to 0 once the clock has moved more than
// 40 ms since that read.
class TurnTaking {
 public:
  TurnTaking(const Point& point, ManualClock& clock, std::chrono::steady_clock::time_point end)
      : point_(point), clock_(clock), end_(end) {}

  void writer() {
    std::mt19937 rng(3);
    std::uniform_real_distribution<float> peak(0.0f, kLoudest);
    const double advances[] = {0, 5, 20, 40, 40.25, 100};
    MonitoringPointWriter w(point_.writerId);
    for (int r = 0; r < kRounds && std::chrono::steady_clock::now() < end_; ++r) {
      waitFor(kWriterTurn);
      round_ = Round();
      const int writes = int(rng() % 5);
      for (int k = 0; k < writes; ++k) {
        if (rng() % 6 == 0) {
          w.updateHasClipped();
          round_.writes.push_back(1.0f);
          round_.clipped = true;
        } else {
          round_.writes.push_back(peak(rng));
          w.updatePeakSampleValue(round_.writes.back());
        }
      }
      round_.advanceMs = advances[rng() % std::size(advances)];
      clock_.advance(round_.advanceMs);
      turn_.store(kMeterTurn, std::memory_order_release);
    }
    waitFor(kWriterTurn);
    finished_ = true;
    turn_.store(kMeterTurn, std::memory_order_release);
  }

  void meter() {
    MonitoringPointReader reader(point_.pointId);
    float held = reader.peakValue(true);  // 0, and taken: the first write replaces it
    turn_.store(kWriterTurn, std::memory_order_release);
    for (int r = 0;; ++r) {
      waitFor(kMeterTurn);
      if (finished_) break;
      float expect = held;
      if (!round_.writes.empty()) {
        expect = *std::max_element(round_.writes.begin(), round_.writes.end());
      } else if (round_.advanceMs > 40.0) {
        expect = 0.0f;
      }
      const float got = reader.peakValue(true);
      const bool clipped = reader.hasClipped(true);
      if ((got != expect || clipped != round_.clipped) && mismatches_.empty()) {
        std::ostringstream out;
        out << "round " << r << ": read " << got << " clipped " << clipped << ", expected " << expect
            << " clipped " << round_.clipped << " after " << round_.writes.size() << " writes and "
            << round_.advanceMs << " ms";
        mismatches_ = out.str();
      }
      held = expect;
      turn_.store(kWriterTurn, std::memory_order_release);
    }
  }

  const std::string& mismatch() const { return mismatches_; }

 private:
  static constexpr int kSetUp = 0, kWriterTurn = 1, kMeterTurn = 2;
  void waitFor(int who) {
    while (turn_.load(std::memory_order_acquire) != who) std::this_thread::yield();
  }

  const Point& point_;
  ManualClock& clock_;
  const std::chrono::steady_clock::time_point end_;
  std::atomic<int> turn_{kSetUp};  // the meter subscribes before the first write
  Round round_;                    // handed over through turn_, as is finished_
  bool finished_ = false;
  std::string mismatches_;
};

TEST(MeteringStress, AudioMetersAndRegistrationsRunTogether) {
  ManualClock clock;
  TestMonitor monitor;
  monitor.registerMonitoringPoints(kInputs);
  const Point turnPoint = metering_test::registerPoint("turns");
  Shared shared;
  const auto end = std::chrono::steady_clock::now() + kBudget;
  TurnTaking turns(turnPoint, clock, end);

  std::vector<std::thread> threads;
  threads.emplace_back(audioThread, std::ref(monitor), std::ref(shared));
  for (int m = 0; m < kMeters; ++m) {
    threads.emplace_back(meterThread, std::ref(monitor), std::cref(turnPoint), std::ref(shared), 100u + m,
                         m % 2 == 0);
  }
  threads.emplace_back(registryThread, std::ref(shared));
  std::thread turnWriter([&] { turns.writer(); });
  std::thread turnMeter([&] { turns.meter(); });
  turnWriter.join();
  turnMeter.join();
  while (!shared.enoughWork() && std::chrono::steady_clock::now() < end) {
    std::this_thread::sleep_for(std::chrono::milliseconds(5));
  }
  shared.stop.store(true, std::memory_order_relaxed);
  for (auto& t : threads) t.join();

  EXPECT_EQ(turns.mismatch(), "");
  EXPECT_EQ(shared.bad.load(), 0);
  for (unsigned i = 0; i < kInputs; ++i) MonitoringPointManager::unregisterMP(monitor.writerId(i));
  MonitoringPointManager::unregisterMP(turnPoint.writerId);
}

}  // namespace
