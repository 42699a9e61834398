// Random operation sequences on two level stores, each shadowed by a plain
// sorted-vector model of the same rules. After every operation: the nodes
// are ordered by raw time, every field of every node matches the model (so
// every guard carries the level the rules give it), an adjusting insert has
// tied its neighbouring guards, and getLevelAtTime agrees with the model's
// linear-scan lookup. Applying iterators configured on the result must keep
// their segment invariant. Any mismatch aborts.
#include <fuzzer/FuzzedDataProvider.h>

#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <vector>

#include "host/HostHooks.h"
#include "host/ProjectTime.h"
#include "tonebits/levels/Aud__DynamicLevelApplyingIterator.h"
#include "tonebits/levels/Aud__DynamicLevelControl.h"

namespace {

using Aud::DynamicLevelControl::Store;
using Node = Store::Node;
constexpr double kW = 1e-6;

[[noreturn]] void fail(const char* what, int op) {
  std::fprintf(stderr, "level store mismatch after op %d: %s\n", op, what);
  std::abort();
}

bool isGuard(const Node& n) { return n.type == Store::StartGuard || n.type == Store::EndGuard; }
bool sameFloat(float a, float b) { return (std::isnan(a) && std::isnan(b)) || std::memcmp(&a, &b, 4) == 0; }

// The rules again, on a vector, by index.
struct Model {
  std::vector<Node> v;

  size_t lb(double t) const {
    size_t i = 0;
    while (i < v.size() && v[i].time < t) ++i;
    return i;
  }
  size_t insertRaw(const Node& n) {
    size_t i = 0;
    while (i < v.size() && !(n.time < v[i].time)) ++i;
    v.insert(v.begin() + static_cast<long>(i), n);
    return i;
  }
  void eraseAt(size_t i) { v.erase(v.begin() + static_cast<long>(i)); }
  void adjustAfterRange(size_t r) {
    if (r >= v.size() || r == 0 || r - 1 == 0) return;
    Node& b = v[r - 1];
    if (!isGuard(v[r])) {
      if (b.type == Store::StartGuard) b.level = v[r].level;
    } else if (v[r].type == Store::EndGuard && b.type == Store::Normal) {
      v[r].level = b.level;
    }
  }
  void eraseIndexRange(size_t first, size_t last, bool adjust) {
    v.erase(v.begin() + static_cast<long>(first), v.begin() + static_cast<long>(last));
    if (adjust) adjustAfterRange(first);
  }
  void eraseTimes(double t1, double t2, bool adjust) {
    if (!(t1 <= t2)) return;
    eraseIndexRange(lb(t1), lb(t2), adjust);
  }
  void eraseOne(size_t i, bool adjust) {
    if (i >= v.size()) return;
    eraseAt(i);
    if (!adjust || i >= v.size() || i == 0) return;
    Node& b = v[i - 1];
    if (!isGuard(v[i])) {
      if (b.type == Store::StartGuard) b.level = v[i].level;
    } else if (b.type == Store::Normal) {
      v[i].level = b.level;
    }
  }
  static bool acceptable(const Node& n) { return std::isfinite(n.time); }
  void insert(const Node& n) {
    if (!acceptable(n)) return;
    eraseTimes(n.time - kW, n.time + kW, true);
    const size_t p = insertRaw(n);
    if (n.type == Store::StartGuard) {
      if (p + 1 < v.size()) v[p].level = v[p + 1].level;
    } else if (n.type == Store::EndGuard) {
      if (p > 0) v[p].level = v[p - 1].level;
    } else {
      if (p + 1 < v.size() && v[p + 1].type == Store::EndGuard) v[p + 1].level = n.level;
      if (p > 0 && v[p - 1].type == Store::StartGuard) v[p - 1].level = n.level;
    }
  }
  void insertNoAdjust(const Node& n) {
    if (!acceptable(n)) return;
    eraseTimes(n.time - kW, n.time + kW, false);
    insertRaw(n);
  }
  void eraseNonGuard(size_t first, size_t last) {
    for (size_t i = first; i < last;) {
      if (isGuard(v[i])) {
        ++i;
      } else {
        eraseAt(i);
        --last;
      }
    }
    for (size_t i = 0; i + 1 < v.size(); ++i) {
      Node& a = v[i];
      Node& b = v[i + 1];
      if (b.type == Store::EndGuard && a.type == Store::Normal) {
        b.level = a.level;
      } else if (a.type == Store::StartGuard) {
        if (b.type == Store::Normal) {
          a.level = b.level;
        } else if (b.type == Store::EndGuard) {
          a.level = b.level = 1.0f;
        }
      }
    }
  }
  void eraseNonGuardTimes(double t1, double t2) {
    if (!(t1 <= t2)) return;
    size_t last = lb(t2 - kW);
    for (size_t i = lb(t1 - kW); i < last;) {
      if (isGuard(v[i])) {
        ++i;
      } else {
        eraseOne(i, true);
        --last;
      }
    }
  }
  void black(double t1, double t2) {
    if (std::isnan(t1) || std::isnan(t2)) return;
    size_t last = lb(std::max(t1, t2) - kW);
    if (last == v.size()) return;
    for (size_t i = lb(std::min(t1, t2) - kW); i < last;) {
      if (isGuard(v[i])) {
        v[i++].inAudioBlack = true;
      } else {
        eraseOne(i, true);
        --last;
      }
    }
  }
  void nonBlack(double t1, double t2) {
    if (!(t2 >= t1)) return;
    const size_t last = lb(t2 - kW);
    if (last == v.size()) return;
    for (size_t i = lb(t1 - kW); i < last; ++i) v[i].inAudioBlack = false;
  }
  void setLevel(size_t i, float l) {
    v[i].level = l;
    if (isGuard(v[i])) return;
    if (i + 1 < v.size() && v[i + 1].type == Store::EndGuard) v[i + 1].level = l;
    if (i > 0 && v[i - 1].type == Store::StartGuard) v[i - 1].level = l;
  }
  void setTime(size_t i, double t) {
    if (!std::isfinite(t)) return;
    const double old = v[i].time;
    const bool leaves = (i > 0 && t <= v[i - 1].time) || (i + 1 < v.size() && t >= v[i + 1].time);
    if (leaves && t > old) {
      while (i + 1 < v.size() && v[i + 1].time < t + kW) eraseAt(i + 1);
    } else if (leaves && t < old) {
      while (i > 0 && v[i - 1].time >= t - kW) eraseAt(--i);
    }
    v[i].time = t;
  }
  void insertRange(const std::vector<Node>& copied) {
    if (copied.empty()) return;
    eraseTimes(copied.front().time - kW, copied.back().time + kW, true);
    for (const Node& n : copied) {
      const size_t p = insertRaw(n);
      if (p + 1 < v.size() && v[p + 1].type == Store::EndGuard) v[p + 1].level = v[p].level;
      if (p > 1 && v[p - 1].type == Store::StartGuard) v[p - 1].level = v[p].level;
    }
  }
  float levelAt(double t) const {
    if (v.empty()) return 1.0f;
    const size_t i = lb(t - kW);
    if (i == v.size()) return v.back().level;
    const Node& it = v[i];
    if (std::fabs(t - it.getTime()) < kW || i == 0) return it.level;
    const Node& p = v[i - 1];
    if (it.type == Store::StartGuard && p.type == Store::EndGuard && t < it.getTime()) return p.level;
    const double f = (t - p.getTime()) / (it.getTime() - p.getTime());
    if (!std::isfinite(f)) return it.level;
    return static_cast<float>(static_cast<double>(it.level - p.level) * f) + p.level;
  }
};

Store::iterator nth(Store& s, size_t i) {
  Store::iterator it = s.begin();
  while (i-- > 0) ++it;
  return it;
}

double decodeTime(FuzzedDataProvider& in) {
  const uint8_t kind = in.ConsumeIntegral<uint8_t>();
  const double k = in.ConsumeIntegralInRange<int>(-4, 40);
  switch (kind % 8) {
    case 0: return k * 0.5e-6;  // around the matching window
    case 1: return k * 0.001;
    case 2: return k * 0.25;
    case 3: return 1.0 + k * 0.0025;  // around the 5 ms margin
    case 4: return 1e12 + k * 1e-4;   // the window below the resolution
    case 5: {
      const double special[] = {0.0,
                                -0.0,
                                std::numeric_limits<double>::quiet_NaN(),
                                std::numeric_limits<double>::infinity(),
                                -std::numeric_limits<double>::infinity(),
                                std::numeric_limits<double>::max(),
                                -1.0,
                                1e-300};
      return special[static_cast<int>(k + 4) % 8];
    }
    default: return k * 0.125;
  }
}

float decodeLevel(FuzzedDataProvider& in) {
  const float values[] = {0.0f,
                          0.25f,
                          0.5f,
                          1.0f,
                          2.0f,
                          -0.5f,
                          0.1f,
                          0.7f,
                          std::numeric_limits<float>::quiet_NaN(),
                          std::numeric_limits<float>::infinity(),
                          1e-40f,
                          0.3f};
  return values[in.ConsumeIntegralInRange<int>(0, 11)];
}

Store::eNodeType decodeType(FuzzedDataProvider& in) {
  return static_cast<Store::eNodeType>(in.ConsumeIntegralInRange<int>(0, 3));
}

void check(Store& s, const Model& m, int op, FuzzedDataProvider& in) {
  if (s.size() != m.v.size()) fail("size", op);
  size_t i = 0;
  double previous = -std::numeric_limits<double>::infinity();
  for (Store::iterator it = s.begin(); it != s.end(); ++it, ++i) {
    const Node& n = it.getNode();
    const Node& e = m.v[i];
    if (n.time < previous) fail("order by raw time", op);
    previous = n.time;
    if (std::memcmp(&n.time, &e.time, sizeof(double)) != 0 && n.time != e.time) fail("time", op);
    if (!sameFloat(n.level, e.level)) fail("level", op);
    if (n.type != e.type || n.inAudioBlack != e.inAudioBlack) fail("type or flag", op);
  }
  for (int probe = 0; probe < 4; ++probe) {
    const double t = decodeTime(in);
    if (!sameFloat(s.getLevelAtTime(t), m.levelAt(t))) fail("getLevelAtTime", op);
  }
}

// Steps a state by the per-sample contract and checks the base's promise.
class Stepper : private Aud::DynamicLevelControl::DynamicLevelApplyingIteratorStorage,
                public Aud::DynamicLevelControl::DynamicLevelApplyingIteratorBase {
 public:
  Stepper() : DynamicLevelApplyingIteratorBase(ownedState) {}
  void run(const Store& s, bool reverse, double t, int samples) {
    reverse ? configureReverse(&s, 1000.0, t) : configureForwards(&s, 1000.0, t);
    for (int i = 0; i < samples; ++i) {
      auto& st = ownedState;
      if (!st.holdLevel && st.samplesToNextNode == 0) fail("segment invariant", -1);
      if (st.holdLevel) return;
      st.level += st.levelDelta;
      if (--st.samplesToNextNode == 0) reverse ? moveToNextNodeReverse() : moveToNextNodeForwards();
    }
  }
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  host::setFatalReportHandler([](const char*) {});
  FuzzedDataProvider in(data, size);
  const double frames[] = {1.0 / 25.0, 1.0, 0.0, -0.5};
  host::setFrameDuration(frames[in.ConsumeIntegralInRange<int>(0, 3)]);
  Store stores[2];
  Model models[2];
  for (int op = 0; op < 200 && in.remaining_bytes() > 0; ++op) {
    const int which = in.ConsumeBool() ? 1 : 0;
    Store& s = stores[which];
    Model& m = models[which];
    const size_t n = m.v.size();
    const auto index = [&] { return static_cast<size_t>(in.ConsumeIntegralInRange<size_t>(0, n)); };
    switch (in.ConsumeIntegralInRange<int>(0, 17)) {
      case 0:
      case 1: {
        const Node node(decodeTime(in), decodeLevel(in), decodeType(in), in.ConsumeBool());
        const Store::iterator p = s.insert(node);
        m.insert(node);
        // An adjusting insert ties the guards around the new node.
        if (std::isfinite(node.time) && !isGuard(node)) {
          Store::iterator before = p, after = p;
          ++after;
          if (after != s.end() && after.isEndGuard() && !sameFloat(after.getLevel(), node.level))
            fail("end guard after an insert", op);
          if (p != s.begin() && (--before).isStartGuard() && !sameFloat(before.getLevel(), node.level))
            fail("start guard before an insert", op);
        }
        break;
      }
      case 2: {
        const Node node(decodeTime(in), decodeLevel(in), decodeType(in), in.ConsumeBool());
        s.insert_noAdjust(node);
        m.insertNoAdjust(node);
        break;
      }
      case 3: {
        const size_t i = index();
        s.erase(nth(s, i));
        if (i < n) m.eraseOne(i, true);
        break;
      }
      case 4: {
        const size_t i = index();
        s.erase_noAdjust(nth(s, i));
        if (i < n) m.eraseOne(i, false);
        break;
      }
      case 5: {
        size_t a = index(), b = index();
        if (a > b) std::swap(a, b);
        s.erase(nth(s, a), nth(s, b));
        m.eraseIndexRange(a, b, true);
        break;
      }
      case 6:
      case 7: {
        const double t1 = decodeTime(in), t2 = decodeTime(in);
        const bool adjust = in.ConsumeBool();
        adjust ? s.erase(t1, t2) : s.erase_noAdjust(t1, t2);
        m.eraseTimes(t1, t2, adjust);
        break;
      }
      case 8: {
        size_t a = index(), b = index();
        if (a > b) std::swap(a, b);
        s.eraseNonGuard(nth(s, a), nth(s, b));
        m.eraseNonGuard(a, b);
        break;
      }
      case 9: {
        const double t1 = decodeTime(in), t2 = decodeTime(in);
        s.eraseNonGuard(t1, t2);
        m.eraseNonGuardTimes(t1, t2);
        break;
      }
      case 10: {
        const double t1 = decodeTime(in), t2 = decodeTime(in);
        s.setRangeToBlackSection(t1, t2);
        m.black(t1, t2);
        break;
      }
      case 11: {
        const double t1 = decodeTime(in), t2 = decodeTime(in);
        s.setRangeToNonBlackSection(t1, t2);
        m.nonBlack(t1, t2);
        break;
      }
      case 12: {
        const size_t i = index();
        const float l = decodeLevel(in);
        if (i < n) {
          nth(s, i).setLevel(l);
          m.setLevel(i, l);
        }
        break;
      }
      case 13: {
        const size_t i = index();
        const double t = decodeTime(in);
        if (i < n) {
          nth(s, i).setTime(t);
          m.setTime(i, t);
        }
        break;
      }
      case 14: {
        const size_t i = index();
        const Store::eNodeType type = decodeType(in);
        const bool black = in.ConsumeBool();
        if (i < n) {
          nth(s, i).setNodeType(type);
          nth(s, i).setInAudioBlackSection(black);
          m.v[i].type = type;
          m.v[i].inAudioBlack = black;
        }
        break;
      }
      case 15: {
        // From the other store, or from this one.
        const int from = in.ConsumeBool() ? 1 - which : which;
        const size_t count = models[from].v.size();
        size_t a = in.ConsumeIntegralInRange<size_t>(0, count),
               b = in.ConsumeIntegralInRange<size_t>(0, count);
        if (a > b) std::swap(a, b);
        const std::vector<Node> copied(models[from].v.begin() + static_cast<long>(a),
                                       models[from].v.begin() + static_cast<long>(b));
        s.insertRange(nth(stores[from], a), nth(stores[from], b));
        m.insertRange(copied);
        break;
      }
      case 16:
        if (in.ConsumeIntegralInRange<int>(0, 7) == 0) {
          s.clear();
          m.v.clear();
        }
        break;
      default: {
        Stepper st;
        st.run(s, in.ConsumeBool(), decodeTime(in), in.ConsumeIntegralInRange<int>(0, 64));
        break;
      }
    }
    check(s, m, op, in);
  }
  host::setFatalReportHandler({});
  return 0;
}
