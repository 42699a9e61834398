// Metering under concurrency, meant for the ThreadSanitizer build: an audio
// thread feeds 8 points while meter threads poll them (half only read, as a
// meter's timer does, and so never lock; half also make, copy, assign and
// drop readers), and another thread registers and unregisters points. Beside
// them a writer and a meter take turns on one point to check the read rule
// across threads. The background work is bounded by a time budget; no
// assertion depends on time.
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <barrier>
#include <chrono>
#include <mutex>
#include <random>
#include <thread>
#include <vector>

#include "metering/MeteringTestSupport.h"

namespace {

using Aud::MonitoringPointManager;
using Aud::MonitoringPointReader;
using Aud::MonitoringPointWriter;
using Clock = std::chrono::steady_clock;

TEST(MeteringStress, AudioMetersAndRegistrationsRunTogether) {
  constexpr unsigned kInputs = 8, kBlock = 64;
  constexpr float kLoudest = 1.25f;  // no sample written is louder
  metering_test::ManualClock clock;
  metering_test::TestMonitor monitor;
  monitor.registerMonitoringPoints(kInputs);
  const metering_test::Point turnPoint = metering_test::registerPoint("turns");
  const auto end = Clock::now() + std::chrono::milliseconds(1500);
  std::atomic<bool> stop{false};
  std::atomic<int> bad{0};  // reads outside what was ever written
  std::atomic<int> blocks{0}, polls{0}, registrations{0};
  std::mutex churnMutex;
  IdStamp churnId = IdStamp::invalidStamp();  // the registry thread's point of the moment
  auto churn = [&](const IdStamp* set) {
    std::lock_guard lock(churnMutex);
    if (set) churnId = *set;
    return churnId;
  };
  auto check = [&](float v) { bad += !(v >= 0.0f && v <= kLoudest); };

  std::vector<std::thread> threads;
  threads.emplace_back([&] {  // audio
    std::mt19937 rng(1);
    std::uniform_real_distribution<float> sample(-kLoudest, kLoudest);
    auto block = metering_test::listOf({}, kBlock, 0);
    for (unsigned c = 0; c < kInputs; ++c)
      block.buffers.push_back(metering_test::bufferOf(std::vector<unsigned char>(kBlock * 4), kBlock, 0));
    for (; !stop; ++blocks, std::this_thread::yield()) {
      const float scale = (rng() % 4) / 3.0f;  // quiet blocks and loud ones
      for (auto& b : block.buffers)
        std::generate_n(reinterpret_cast<float*>(b.getBuffer()), kBlock, [&] { return sample(rng) * scale; });
      monitor.updateMonitoringPoints(block);
      MonitoringPointWriter(monitor.writerId(rng() % kInputs)).updatePeakSampleValue(0.5f);
    }
  });
  for (unsigned m = 0; m < 4; ++m) {
    threads.emplace_back([&, m] {  // meters
      std::mt19937 rng(100 + m);
      std::vector<MonitoringPointReader> readers;
      readers.reserve(kInputs + 1);
      for (unsigned i = 0; i < kInputs; ++i) readers.emplace_back(monitor.getInputMonitoringPointId(i));
      readers.emplace_back(turnPoint.pointId);
      for (unsigned n = 0; !stop; ++n, ++polls) {
        MonitoringPointReader& r = readers[rng() % readers.size()];
        check(r.peakValue(rng() & 1));
        r.hasClipped(rng() & 1);
        if (n % 16 == 0) std::this_thread::yield();
        if (m % 2 == 0) continue;
        if (!r.valid() || !r.getId().valid()) ++bad;
        if (n % 16 != 0) continue;
        MonitoringPointReader copy(r), churned(churn(nullptr)), assigned(churned);
        readers[rng() % kInputs] = readers[rng() % kInputs];
        assigned = copy;
        assigned = churned;
        for (MonitoringPointReader* x : {&copy, &churned, &assigned}) {
          check(x->peakValue(rng() & 1));
          x->hasClipped(x->valid() && x->getId().valid());
        }
      }
    });
  }
  threads.emplace_back([&] {  // registry
    std::mt19937 rng(2);
    for (; !stop; ++registrations, std::this_thread::yield()) {
      IdStamp pointId, writerId;
      MonitoringPointManager::registerMP(metering_test::describe("churn"), pointId, writerId);
      churn(&pointId);
      MonitoringPointReader reader(pointId);
      for (int j = 0; j < 8; ++j) {
        MonitoringPointWriter(writerId).updatePeakSampleValue(kLoudest * (rng() % 6) / 5);
        if (j % 3 == 0) MonitoringPointWriter(writerId).updateHasClipped();
        check(reader.peakValue(j & 1));
      }
      MonitoringPointManager::unregisterMP(writerId);
      check(reader.peakValue(true));
    }
  });

  // A writer thread and this one take turns on one point through a barrier,
  // so the expectation is exact: a resetting read returns the largest value
  // written since the previous resetting read (a clip counts as 1.0) or, with
  // nothing written, the value held before, which falls to 0 once the clock
  // has moved more than 40 ms since that read.
  constexpr int kRounds = 300;
  std::barrier turn(2);
  std::vector<float> writes;  // the round's, handed over by the barrier as are the next two
  bool clipped = false;
  double advanceMs = 0;
  std::thread turnWriter([&] {
    std::mt19937 rng(3);
    std::uniform_real_distribution<float> peak(0.0f, kLoudest);
    const double advances[] = {0, 5, 20, 40, 40.25, 100};
    MonitoringPointWriter w(turnPoint.writerId);
    for (int r = 0; r < kRounds; ++r) {
      turn.arrive_and_wait();  // the meter has read
      writes.clear();
      clipped = false;
      for (int k = int(rng() % 5); k > 0; --k) {
        const bool clip = rng() % 6 == 0;
        clipped |= clip;
        writes.push_back(clip ? 1.0f : peak(rng));
        clip ? w.updateHasClipped() : w.updatePeakSampleValue(writes.back());
      }
      clock.advance(advanceMs = advances[rng() % std::size(advances)]);
      turn.arrive_and_wait();
    }
  });
  MonitoringPointReader reader(turnPoint.pointId);
  float held = reader.peakValue(true);  // 0, and taken: the first write replaces it
  for (int r = 0, failures = 0; r < kRounds; ++r) {
    turn.arrive_and_wait();
    turn.arrive_and_wait();
    const float expect = !writes.empty()  ? *std::max_element(writes.begin(), writes.end())
                         : advanceMs > 40 ? 0.0f
                                          : held;
    const float got = reader.peakValue(true);
    const bool gotClip = reader.hasClipped(true);
    if ((got != expect || gotClip != clipped) && failures++ == 0) {
      ADD_FAILURE() << "round " << r << ": read " << got << (gotClip ? " clipped" : "") << ", expected "
                    << expect << (clipped ? " clipped" : "") << " after " << writes.size() << " writes and "
                    << advanceMs << " ms";
    }
    held = expect;
  }
  turnWriter.join();
  while (!(blocks >= 4000 && polls >= 40000 && registrations >= 400) && Clock::now() < end) {
    std::this_thread::sleep_for(std::chrono::milliseconds(5));
  }
  stop = true;
  for (auto& t : threads) t.join();

  EXPECT_EQ(bad.load(), 0);
  for (unsigned i = 0; i < kInputs; ++i) MonitoringPointManager::unregisterMP(monitor.writerId(i));
  MonitoringPointManager::unregisterMP(turnPoint.writerId);
}

}  // namespace
