// Helpers shared by the metering tests: a clock the test sets, capture of
// fatal reports and log lines, fresh points, and sample blocks.
#pragma once

#include <atomic>
#include <cstring>
#include <string>
#include <vector>

#include "host/HostHooks.h"
#include "tonebits/metering/Aud__Monitor.h"
#include "tonebits/metering/Aud__MonitoringPoint.h"

namespace metering_test {

// service_get_msecs_precise reads `now` while this lives.
struct ManualClock {
  ManualClock() {
    host::setClock([this] { return now.load(); });
  }
  ~ManualClock() { host::setClock({}); }
  void set(double ms) { now = ms; }
  void advance(double ms) { now = now.load() + ms; }  // one advancing thread at a time
  std::atomic<double> now{1000.0};
};

// Collects vel_splat reports and log lines, in one list, while it lives.
struct Capture {
  Capture() {
    host::setFatalReportHandler([this](const char* m) { lines.emplace_back(m); });
    host::setLogSink([this](const char* t) { lines.emplace_back(t); });
  }
  ~Capture() {
    host::setFatalReportHandler({});
    host::setLogSink({});
  }
  std::vector<std::string> lines;
};

struct Point {
  IdStamp pointId, writerId;
};

inline Aud::MonitoringPointInfo describe(const char* name) {
  Aud::MonitoringPointInfo info;
  info.text1 = name;
  return info;
}

inline Point registerPoint(const char* name = "test point") {
  Point p;
  EXPECT_EQ(Aud::MonitoringPointManager::registerMP(describe(name), p.pointId, p.writerId), Aud::sSuccess);
  return p;
}

// A monitor whose protected operations the tests drive.
struct TestMonitor : Aud::Monitor {
  virtual ~TestMonitor() = default;
  using Aud::Monitor::registerMonitoringPoints;
  using Aud::Monitor::updateMonitoringPoints;
  const IdStamp& writerId(unsigned i) const { return inputWriterIds.at(i); }
  std::size_t inputs() const { return inputPointIds.size(); }
};

// Readers on every input, each left with a taken peak of 0.5, so that the
// next write replaces it and no write leaves it (while the clock stands).
inline std::vector<Aud::MonitoringPointReader> primedReaders(TestMonitor& monitor) {
  std::vector<Aud::MonitoringPointReader> readers;
  readers.reserve(monitor.inputs());  // a copied reader starts afresh
  for (unsigned i = 0; i < monitor.inputs(); ++i) {
    readers.emplace_back(monitor.getInputMonitoringPointId(i));
    Aud::MonitoringPointWriter(monitor.writerId(i)).updatePeakSampleValue(0.5f);
    readers.back().peakValue(true);
    readers.back().hasClipped(true);
  }
  return readers;
}

// A buffer holding `bytes`, whose memory is exactly that size.
inline Aud::StreamBuffer bufferOf(const std::vector<unsigned char>& bytes, unsigned numSamples, int type) {
  Aud::StreamBuffer b(0, numSamples, type);
  b.buffer = Kv::Ptr<iMemHolder>(new ByteBufferImpl(bytes.size()));
  if (!bytes.empty()) std::memcpy(b.buffer->getBuffer(), bytes.data(), bytes.size());
  b.valid = true;
  return b;
}

inline Aud::StreamBufferList listOf(std::vector<Aud::StreamBuffer> buffers, unsigned numSamples, int type) {
  Aud::StreamBufferList list;
  list.buffers.assign(buffers.begin(), buffers.end());
  list.numSamples = numSamples;
  list.sampleType = type;
  return list;
}

template <class T>
std::vector<unsigned char> bytesOf(std::initializer_list<T> values) {
  std::vector<unsigned char> out(values.size() * sizeof(T));
  std::memcpy(out.data(), values.begin(), out.size());
  return out;
}

}  // namespace metering_test
