// Helpers shared by the metering tests: a clock the test sets, capture of
// fatal reports and log lines, fresh points, and sample blocks.
#pragma once

#include <atomic>
#include <cstring>
#include <mutex>
#include <string>
#include <vector>

#include "host/HostHooks.h"
#include "host/Ptr.h"
#include "tonebits/foundation/Aud__StreamBuffer.h"
#include "tonebits/metering/Aud__Monitor.h"
#include "tonebits/metering/Aud__MonitoringPoint.h"
#include "tonebits/metering/Aud__MonitoringPointManager.h"

namespace metering_test {

// service_get_msecs_precise reads `now` while this lives.
class ManualClock {
 public:
  ManualClock() {
    host::setClock([this] { return now_.load(std::memory_order_relaxed); });
  }
  ~ManualClock() { host::setClock({}); }
  void set(double ms) { now_.store(ms, std::memory_order_relaxed); }
  void advance(double ms) {
    now_.store(now_.load(std::memory_order_relaxed) + ms, std::memory_order_relaxed);
  }

 private:
  std::atomic<double> now_{1000.0};
};

// Collects vel_splat reports and log lines while it lives.
class Capture {
 public:
  Capture() {
    host::setFatalReportHandler([this](const char* m) { add(fatal_, m); });
    host::setLogSink([this](const char* t) { add(log_, t); });
  }
  ~Capture() {
    host::setFatalReportHandler({});
    host::setLogSink({});
  }
  std::vector<std::string> fatal() const { return get(fatal_); }
  std::vector<std::string> log() const { return get(log_); }

 private:
  void add(std::vector<std::string>& to, const char* text) {
    std::lock_guard lock(mutex_);
    to.emplace_back(text);
  }
  std::vector<std::string> get(const std::vector<std::string>& from) const {
    std::lock_guard lock(mutex_);
    return from;
  }
  mutable std::mutex mutex_;
  std::vector<std::string> fatal_, log_;
};

struct Point {
  IdStamp pointId, writerId;
};

inline Aud::MonitoringPointInfo describe(const char* name, unsigned char code = 7) {
  Aud::MonitoringPointInfo info;
  info.code = code;
  info.text1 = name;
  info.text2 = "second";
  info.text3 = "third";
  info.flag = true;
  info.value = -12.5f;
  return info;
}

inline Point registerPoint(const char* name = "test point") {
  Point p;
  EXPECT_EQ(Aud::MonitoringPointManager::registerMP(describe(name), p.pointId, p.writerId), Aud::sSuccess);
  return p;
}

// A monitor whose protected operations the tests drive.
class TestMonitor : public Aud::Monitor {
 public:
  virtual ~TestMonitor() = default;
  using Aud::Monitor::registerMonitoringPoints;
  using Aud::Monitor::updateMonitoringPoints;
  const IdStamp& writerId(unsigned i) const { return inputWriterIds.at(i); }
  std::size_t inputs() const { return inputPointIds.size(); }
};

// A block holding `bytes`, whose memory is exactly that size.
inline Aud::StreamBuffer bufferOf(const std::vector<unsigned char>& bytes, unsigned numSamples, int type) {
  Aud::StreamBuffer b(0, numSamples, type);
  b.buffer = Kv::Ptr<iMemHolder>(new ByteBufferImpl(bytes.size()));
  if (!bytes.empty()) std::memcpy(b.buffer->getBuffer(), bytes.data(), bytes.size());
  b.valid = true;
  return b;
}

template <class T>
std::vector<unsigned char> bytesOf(std::initializer_list<T> values) {
  std::vector<unsigned char> out(values.size() * sizeof(T));
  std::memcpy(out.data(), values.begin(), out.size());
  return out;
}

}  // namespace metering_test
