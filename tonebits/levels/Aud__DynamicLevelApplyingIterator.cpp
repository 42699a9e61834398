#include "tonebits/levels/Aud__DynamicLevelApplyingIterator.h"

#include <algorithm>
#include <atomic>
#include <cmath>
#include <iterator>
#include <limits>

#include "host/Lock.h"
#include "host/OS.h"

namespace Aud::DynamicLevelControl {

namespace {

using State = DynamicLevelApplyingIteratorState;
using Node = Store::Node;
using Pos = Store::NodeSet::iterator;

constexpr double kGlideSeconds = 0.01;

std::atomic<int32_t> readerIdCounter{0};

// Segment lengths are kept in 32 bits: a span too long saturates, and a NaN
// or negative one is no samples at all.
uint32_t samplesFor(double span, double rate) noexcept {
  const double samples = span * rate;
  if (!(samples > 0.0)) return 0;
  if (samples >= 4294967295.0) return 0xFFFFFFFFu;
  return static_cast<uint32_t>(static_cast<int64_t>(samples));
}

float deltaFor(float from, float to, uint32_t samples) noexcept {
  return samples == 0 ? 0.0f : (to - from) / static_cast<float>(samples);
}

// The level a fraction f of the way from a to b; a degenerate span (f not a
// number or infinite) takes b's level.
float between(double f, float a, float b) noexcept {
  if (!std::isfinite(f)) return b;
  return static_cast<float>(f) * (b - a) + a;
}

void* readerKey(const State& s) noexcept {
  return reinterpret_cast<void*>(static_cast<std::uintptr_t>(s.readerId));
}

void holdAt(State& s, float level, double nextNodeTime) noexcept {
  s.level = level;
  s.levelDelta = 0.0f;
  s.holdLevel = true;
  s.samplesToNextNode = 0;
  s.nextNodeTime = nextNodeTime;
}

void takePending(State& s) noexcept {
  s.samplesToNextNode = s.pendingSamplesToNextNode;
  s.level = s.pendingLevel;
  s.levelDelta = s.pendingLevelDelta;
  s.holdLevel = s.pendingHoldLevel;
  s.nextNodeTime = s.pendingNextNodeTime;
  s.pendingValid = false;
}

// Clears what a configuration recomputes; false when there is nothing to
// apply, in which case the state holds unity gain.
bool reset(State& s, const Store* store, double sampleRate) noexcept {
  s.store = store;
  s.sampleRate = sampleRate;
  s.samplesToNextNode = 0;
  s.holdLevel = false;
  s.level = 0.0f;
  s.levelDelta = 0.0f;
  s.pendingValid = false;
  s.nextNodeTime = 0.0;
  if (store && sampleRate > 0.0) return true;
  s.level = 1.0f;
  s.holdLevel = true;
  return false;
}

}  // namespace

// --- state ---------------------------------------------------------------

DynamicLevelApplyingIteratorState::DynamicLevelApplyingIteratorState() noexcept
    : readerId(static_cast<uint32_t>(OS()->atomics()->atomicIncrement(readerIdCounter))) {}

void DynamicLevelApplyingIteratorState::invalidate() noexcept {
  holdLevel = true;
  level = 1.0f;
  levelDelta = 0.0f;
  store = nullptr;
  sampleRate = 0.0;
  samplesToNextNode = 0;
  pendingValid = false;
  nextNodeTime = 0.0;
}

// --- segments (the store's lock is held) ---------------------------------

void DynamicLevelApplyingIteratorBase::startForwards(State& s, double t) {
  Store& store = const_cast<Store&>(*s.store);
  const Store::NodeSet& nodes = store.nodes_;
  const Pos n = nodes.lower_bound(Node(t));
  s.nodePosition = store.at(n);
  if (nodes.empty()) return holdAt(s, 1.0f, std::numeric_limits<double>::max());
  if (n == nodes.end()) return holdAt(s, std::prev(n)->level, std::numeric_limits<double>::max());
  s.nextNodeTime = n->getTime();
  s.samplesToNextNode = samplesFor(s.nextNodeTime - t, s.sampleRate);
  if (n == nodes.begin()) {
    s.level = n->level;
    s.levelDelta = 0.0f;
  } else {
    const Pos p = std::prev(n);
    s.level = between((t - p->time) / (s.nextNodeTime - p->time), p->level, n->level);
    s.levelDelta = deltaFor(s.level, n->level, s.samplesToNextNode);
  }
  stepForwards(s);
}

void DynamicLevelApplyingIteratorBase::startReverse(State& s, double t) {
  Store& store = const_cast<Store&>(*s.store);
  const Store::NodeSet& nodes = store.nodes_;
  const Pos n = nodes.lower_bound(Node(t));
  if (n == nodes.begin()) {
    // Empty, or at or before the first node: nothing remains behind.
    s.nodePosition = store.at(n);
    return holdAt(s, nodes.empty() ? 1.0f : n->level, std::numeric_limits<double>::min());
  }
  // Reverse configuration measures from raw times, end guards included.
  const Pos p = std::prev(n);
  s.nodePosition = store.at(p);
  s.samplesToNextNode = samplesFor(t - p->time, s.sampleRate);
  if (n != nodes.end()) {
    s.level = between((t - p->time) / (n->time - p->time), p->level, n->level);
    s.levelDelta = deltaFor(s.level, p->level, s.samplesToNextNode);
  } else {
    s.level = p->level;
    s.levelDelta = 0.0f;
  }
  s.nextNodeTime = p->time;
  stepReverse(s);
}

// Passes every node closer than one sample in one go.
void DynamicLevelApplyingIteratorBase::stepForwards(State& s) {
  const Store::NodeSet& nodes = s.store->nodes_;
  while (s.samplesToNextNode == 0 && !s.holdLevel) {
    Pos pos = s.nodePosition.position_;
    if (pos == nodes.end()) {
      // Already past the last node: nothing is left to move to.
      s.levelDelta = 0.0f;
      s.holdLevel = true;
      return;
    }
    const Pos prev = pos++;
    s.nodePosition.position_ = pos;
    if (pos == nodes.end()) return holdAt(s, prev->level, s.nextNodeTime);
    s.nextNodeTime = pos->getTime();
    s.samplesToNextNode = samplesFor(s.nextNodeTime - prev->time, s.sampleRate);
    s.level = prev->level;
    s.levelDelta = deltaFor(prev->level, pos->level, s.samplesToNextNode);
  }
}

void DynamicLevelApplyingIteratorBase::stepReverse(State& s) {
  const Store::NodeSet& nodes = s.store->nodes_;
  while (s.samplesToNextNode == 0 && !s.holdLevel) {
    Pos pos = s.nodePosition.position_;
    if (pos == nodes.end()) {
      s.levelDelta = 0.0f;
      s.holdLevel = true;
      return;
    }
    if (pos == nodes.begin()) return holdAt(s, pos->level, s.nextNodeTime);
    const Pos cur = pos--;
    s.nodePosition.position_ = pos;
    s.nextNodeTime = pos->getTime();
    s.samplesToNextNode = samplesFor(cur->time - s.nextNodeTime, s.sampleRate);
    s.level = cur->level;
    s.levelDelta = deltaFor(cur->level, pos->level, s.samplesToNextNode);
  }
}

// --- base ----------------------------------------------------------------

DynamicLevelApplyingIteratorBase::DynamicLevelApplyingIteratorBase(State& state) noexcept : state_(state) {}
DynamicLevelApplyingIteratorBase::~DynamicLevelApplyingIteratorBase() = default;

const Store::NodeSet& DynamicLevelApplyingIteratorBase::getNodeStore() const {
  if (!state_.store) {
    static const Store::NodeSet none;
    return none;
  }
  return state_.store->nodes_;
}

void DynamicLevelApplyingIteratorBase::configureForwards(const Store* store, double sampleRate,
                                                         double startTime) {
  State& s = state_;
  if (!reset(s, store, sampleRate)) return;
  const criticalSection lock = store->getLockObject();
  CriticalSectionLock hold(lock);
  store->acknowledgeModification(readerKey(s), nullptr);
  startForwards(s, startTime);
}

void DynamicLevelApplyingIteratorBase::configureReverse(const Store* store, double sampleRate,
                                                        double startTime) {
  State& s = state_;
  if (!reset(s, store, sampleRate)) return;
  const criticalSection lock = store->getLockObject();
  CriticalSectionLock hold(lock);
  store->acknowledgeModification(readerKey(s), nullptr);
  startReverse(s, startTime);
}

// The throw-away state that reads the edited automation draws its own reader
// id but never acknowledges, so glides leave nothing in the store's set.
void DynamicLevelApplyingIteratorBase::glide(double to, bool reverse) {
  State& s = state_;
  if (!s.store || !(s.sampleRate > 0.0)) return;
  const criticalSection lock = s.store->getLockObject();
  CriticalSectionLock hold(lock);
  if (!s.store->queryModification(readerKey(s), nullptr)) return;
  s.store->acknowledgeModification(readerKey(s), nullptr);
  const uint32_t glideSamples = samplesFor(kGlideSeconds, s.sampleRate);

  State fresh;
  reset(fresh, s.store, s.sampleRate);
  if (reverse) {
    startReverse(fresh, to);
  } else {
    startForwards(fresh, to);
  }
  s.pendingSamplesToNextNode = fresh.samplesToNextNode;
  s.pendingLevel = fresh.level;
  s.pendingLevelDelta = fresh.levelDelta;
  s.pendingHoldLevel = fresh.holdLevel;
  s.pendingNextNodeTime = fresh.nextNodeTime;
  s.nodePosition = fresh.nodePosition;
  s.pendingValid = true;
  if (glideSamples == 0) return takePending(s);  // below 100 samples per second

  s.nextNodeTime = to;
  s.samplesToNextNode = glideSamples;
  s.levelDelta = (s.pendingLevel - s.level) / static_cast<float>(glideSamples);
  s.holdLevel = false;
}

void DynamicLevelApplyingIteratorBase::handleStoreModsForwards(double time) {
  glide(time + kGlideSeconds, false);
}

void DynamicLevelApplyingIteratorBase::handleStoreModsReverse(double time) {
  glide(time - kGlideSeconds, true);
}

void DynamicLevelApplyingIteratorBase::move(bool reverse) {
  State& s = state_;
  if (!s.store) return;
  const criticalSection lock = s.store->getLockObject();
  CriticalSectionLock hold(lock);
  // After an edit the position may name an erased node: it is replaced
  // before any use.
  if (s.store->queryModification(readerKey(s), nullptr)) {
    if (reverse) {
      handleStoreModsReverse(s.nextNodeTime);
    } else {
      handleStoreModsForwards(s.nextNodeTime);
    }
    if (s.samplesToNextNode == 0 && !s.holdLevel) s.holdLevel = true;
    return;
  }
  if (s.pendingValid) return takePending(s);
  if (reverse) {
    stepReverse(s);
  } else {
    stepForwards(s);
  }
}

void DynamicLevelApplyingIteratorBase::moveToNextNodeForwards() { move(false); }
void DynamicLevelApplyingIteratorBase::moveToNextNodeReverse() { move(true); }

// --- ready iterator --------------------------------------------------------

namespace {

// The per-sample rule over a run inside one segment: the gain is the level,
// then the increment is added. The additions form one chain, in order, so
// the levels are those of stepping sample by sample.
float rampInPlace(float* samples, std::size_t count, float level, float delta) noexcept {
  for (std::size_t i = 0; i < count; ++i) {
    samples[i] *= level;
    level += delta;
  }
  return level;
}

void scaleInPlace(float* samples, std::size_t count, float level) noexcept {
  for (std::size_t i = 0; i < count; ++i) samples[i] *= level;
}

}  // namespace

DynamicLevelApplyingIterator::DynamicLevelApplyingIterator() noexcept
    : DynamicLevelApplyingIteratorBase(ownedState) {}

DynamicLevelApplyingIterator::~DynamicLevelApplyingIterator() = default;

void DynamicLevelApplyingIterator::configureForwards(const Store* store, double sampleRate,
                                                     double startTime) {
  reverse_ = false;
  startTime_ = startTime;
  samplesApplied_ = 0;
  DynamicLevelApplyingIteratorBase::configureForwards(store, sampleRate, startTime);
}

void DynamicLevelApplyingIterator::configureReverse(const Store* store, double sampleRate, double startTime) {
  reverse_ = true;
  startTime_ = startTime;
  samplesApplied_ = 0;
  DynamicLevelApplyingIteratorBase::configureReverse(store, sampleRate, startTime);
}

void DynamicLevelApplyingIterator::invalidate() noexcept { ownedState.invalidate(); }

double DynamicLevelApplyingIterator::getStreamTime() const noexcept {
  if (!(ownedState.sampleRate > 0.0)) return startTime_;
  const double elapsed = static_cast<double>(samplesApplied_) / ownedState.sampleRate;
  return reverse_ ? startTime_ - elapsed : startTime_ + elapsed;
}

void DynamicLevelApplyingIterator::apply(float* samples, std::size_t count) {
  if (count == 0) return;
  State& s = ownedState;
  if (reverse_) {
    handleStoreModsReverse(getStreamTime());
  } else {
    handleStoreModsForwards(getStreamTime());
  }
  std::size_t done = 0;
  while (done < count) {
    if (s.holdLevel) {
      scaleInPlace(samples + done, count - done, s.level);
      break;
    }
    const std::size_t run = std::min<std::size_t>(count - done, s.samplesToNextNode);
    s.level = rampInPlace(samples + done, run, s.level, s.levelDelta);
    s.samplesToNextNode -= static_cast<uint32_t>(run);
    done += run;
    if (s.samplesToNextNode == 0) {
      if (reverse_) {
        moveToNextNodeReverse();
      } else {
        moveToNextNodeForwards();
      }
    }
  }
  samplesApplied_ += count;
}

}  // namespace Aud::DynamicLevelControl
