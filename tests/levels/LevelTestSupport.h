// Helpers shared by the level automation tests.
#pragma once

#include <algorithm>
#include <cstdlib>
#include <sstream>
#include <stdexcept>
#include <string>
#include <tuple>
#include <vector>

#include "host/HostHooks.h"
#include "host/Lock.h"
#include "tonebits/levels/Aud__DynamicLevelControl.h"

namespace levels_test {

using Aud::DynamicLevelControl::Store;
using Node = Store::Node;
inline constexpr Store::eNodeType N = Store::Normal, SG = Store::StartGuard, EG = Store::EndGuard,
                                  MD = Store::MarkedForDelete;

// Nodes written as "S0:.3 1:.5 M2:.4 E3:.6*": raw time:level, prefixed S, E
// or M for a start guard, end guard or marked node, suffixed * when black.
inline std::vector<Node> parse(const std::string& text) {
  std::vector<Node> out;
  std::istringstream in(text);
  for (std::string w; in >> w;) {
    const std::size_t k = std::string("NSEM").find(w[0]), kind = k == std::string::npos ? 0 : k;
    char* end = nullptr;
    const double t = std::strtod(w.c_str() + (k == std::string::npos ? 0 : 1), &end);
    if (*end != ':') throw std::invalid_argument(w);
    const float level = std::strtof(end + 1, &end);
    if (*end != '\0' && std::string(end) != "*") throw std::invalid_argument(w);
    out.emplace_back(t, level, static_cast<Store::eNodeType>(kind), *end == '*');
  }
  return out;
}

// Builds a store exactly as written: no window erase, no guard adjustment.
inline void fill(Store& s, const std::string& text) {
  for (const Node& n : parse(text)) s.insert_noAdjust(n);
}

// Every field of every node, for exact comparison.
using Fields = std::vector<std::tuple<double, float, int, bool>>;
inline Fields fields(const std::vector<Node>& nodes) {
  Fields out;
  for (const Node& n : nodes) out.emplace_back(n.time, n.level, n.type, n.inAudioBlack);
  return out;
}
inline Fields fields(const std::string& text) { return fields(parse(text)); }
inline Fields fields(Store& s) {
  const criticalSection lock = s.getLockObject();
  CriticalSectionLock hold(lock);
  std::vector<Node> nodes;
  for (Store::iterator it = s.begin(); it != s.end(); ++it) nodes.push_back(it.getNode());
  return fields(nodes);
}

// Sets the project frame duration for a scope.
struct FrameDuration {
  explicit FrameDuration(double seconds) { host::setFrameDuration(seconds); }
  ~FrameDuration() { host::setFrameDuration(1.0 / 25.0); }
};

}  // namespace levels_test
