// Helpers shared by the level automation tests.
#pragma once

#include <atomic>
#include <initializer_list>
#include <string>
#include <vector>

#include "host/HostHooks.h"
#include "host/Lock.h"
#include "tonebits/levels/Aud__DynamicLevelControl.h"

namespace levels_test {

using Aud::DynamicLevelControl::Store;
using Node = Store::Node;
inline constexpr Store::eNodeType N = Store::Normal;
inline constexpr Store::eNodeType SG = Store::StartGuard;
inline constexpr Store::eNodeType EG = Store::EndGuard;
inline constexpr Store::eNodeType MD = Store::MarkedForDelete;

// Builds a store exactly as listed: no window erase, no guard adjustment.
inline void fill(Store& s, std::initializer_list<Node> nodes) {
  for (const Node& n : nodes) s.insert_noAdjust(n);
}

inline std::vector<Node> nodesOf(Store& s) {
  const criticalSection lock = s.getLockObject();
  CriticalSectionLock hold(lock);
  std::vector<Node> out;
  for (Store::iterator it = s.begin(); it != s.end(); ++it) out.push_back(it.getNode());
  return out;
}

inline std::vector<float> levelsOf(Store& s) {
  std::vector<float> out;
  for (const Node& n : nodesOf(s)) out.push_back(n.level);
  return out;
}

inline std::vector<double> timesOf(Store& s) {
  std::vector<double> out;
  for (const Node& n : nodesOf(s)) out.push_back(n.time);
  return out;
}

inline bool orderedByRawTime(Store& s) {
  const std::vector<double> t = timesOf(s);
  for (std::size_t i = 1; i < t.size(); ++i)
    if (t[i] < t[i - 1]) return false;
  return true;
}

// Counts vel_splat reports while alive.
class FatalReports {
 public:
  FatalReports() {
    host::setFatalReportHandler([this](const char* m) {
      ++count_;
      last_ = m;
    });
  }
  ~FatalReports() { host::setFatalReportHandler({}); }
  int count() const { return count_; }
  const std::string& last() const { return last_; }

 private:
  std::atomic<int> count_{0};
  std::string last_;
};

// Sets the project frame duration for a scope.
class FrameDuration {
 public:
  explicit FrameDuration(double seconds) { host::setFrameDuration(seconds); }
  ~FrameDuration() { host::setFrameDuration(1.0 / 25.0); }
};

}  // namespace levels_test
