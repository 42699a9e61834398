#include "host/ProjectTime.h"

#include <atomic>
#include <chrono>
#include <functional>
#include <mutex>

#include "host/HostHooks.h"

namespace {

std::atomic<double> frameDuration{1.0 / 25.0};

struct ClockHook {
  std::mutex mutex;
  std::function<double()> clock;
  std::atomic<bool> set{false};
};

ClockHook& clockHook() {
  static ClockHook* const c = new ClockHook();
  return *c;
}

}  // namespace

namespace Kv::CurrentProject {
double getFrameDuration() { return frameDuration.load(std::memory_order_relaxed); }
}  // namespace Kv::CurrentProject

double mPosn_Xlate_CelToClock(double editTime, const Kv::OutputGearing& gearing) {
  return editTime * gearing.scale + gearing.offsetSeconds;
}

double service_get_msecs_precise() {
  ClockHook& c = clockHook();
  if (c.set.load(std::memory_order_acquire)) {
    std::function<double()> clock;
    {
      std::lock_guard lock(c.mutex);
      clock = c.clock;
    }
    if (clock) return clock();
  }
  using namespace std::chrono;
  return duration<double, std::milli>(steady_clock::now().time_since_epoch()).count();
}

namespace host {
void setFrameDuration(double seconds) { frameDuration.store(seconds, std::memory_order_relaxed); }
void setClock(std::function<double()> clock) {
  ClockHook& c = clockHook();
  std::lock_guard lock(c.mutex);
  const bool set = static_cast<bool>(clock);
  c.clock = std::move(clock);
  c.set.store(set, std::memory_order_release);
}
}  // namespace host
