#include "tonebits/levels/Aud__DynamicLevelControl.h"

#include <algorithm>
#include <cmath>
#include <iterator>

#include "host/Log.h"
#include "host/ProjectTime.h"

namespace Aud::DynamicLevelControl {

namespace {

using Node = Store::Node;
using Pos = Store::NodeSet::iterator;

// Matching a time against nodes tolerates this much, in seconds.
constexpr double kWindow = 1e-6;

// The tree hands out const nodes; levels, flags and types are not part of the
// sort key, and times are only changed where the order is kept, so the nodes
// are edited in place.
Node& mut(Pos p) noexcept { return const_cast<Node&>(*p); }

bool isOrdinary(const Node& n) noexcept { return !n.isGuard(); }

Store::eRangeState classify(float level) noexcept {
  if (level == 1.0f) return Store::RangeUnity;
  if (level == 0.0f) return Store::RangeSilent;
  return Store::RangeConstant;
}

}  // namespace

double Store::Node::getTime() const noexcept {
  if (type != EndGuard) return time;
  return time + 0.25 * Kv::CurrentProject::getFrameDuration();
}

// --- construction --------------------------------------------------------

Store::Store() = default;
Store::~Store() = default;

Store::Store(const Store& other) : lock_(other.lock_) {
  CriticalSectionLock hold(lock_);
  nodes_ = other.nodes_;
  acks_ = other.acks_;
}

Store& Store::operator=(const Store& other) {
  if (this == &other) return *this;
  const criticalSection source = other.lock_;
  NodeSet copied;
  {
    CriticalSectionLock hold(source);
    copied = other.nodes_;
  }
  // Readers of this store may hold positions into the nodes being replaced:
  // the assignment is an edit for them, whatever the source's readers saw.
  const criticalSection own = lock_;
  {
    CriticalSectionLock hold(own);
    setModified();
    nodes_.swap(copied);
  }
  lock_ = source;
  return *this;
}

// --- queries -------------------------------------------------------------

unsigned int Store::size() const {
  CriticalSectionLock hold(lock_);
  return static_cast<unsigned int>(nodes_.size());
}

bool Store::empty() const {
  CriticalSectionLock hold(lock_);
  return nodes_.empty();
}

Store::iterator Store::begin() {
  CriticalSectionLock hold(lock_);
  return at(nodes_.begin());
}

Store::iterator Store::end() {
  CriticalSectionLock hold(lock_);
  return at(nodes_.end());
}

Store::iterator Store::find(double t) {
  CriticalSectionLock hold(lock_);
  return at(lowerBound(t));
}

float Store::getLevelAtTime(double t) const {
  CriticalSectionLock hold(lock_);
  if (nodes_.empty()) return 1.0f;
  const Pos it = lowerBound(t - kWindow);
  if (it == nodes_.end()) return std::prev(it)->level;
  const double itTime = it->getTime();
  if (std::fabs(t - itTime) < kWindow) return it->level;
  if (it == nodes_.begin()) return it->level;
  const Pos p = std::prev(it);
  // Between one section's end and the next one's start the end guard's
  // level holds.
  if (it->type == StartGuard && p->type == EndGuard && valLessThanVal<double>(t, itTime)) return p->level;
  const double pTime = p->getTime();
  // Nodes acting at the same time, or so far apart that the span overflows,
  // leave no fraction to interpolate by: the later node's level holds.
  const double f = (t - pTime) / (itTime - pTime);
  if (!std::isfinite(f)) return it->level;
  return static_cast<float>(static_cast<double>(it->level - p->level) * f) + p->level;
}

bool Store::isInAudioBlackAtTime(double t) const {
  CriticalSectionLock hold(lock_);
  if (nodes_.empty()) return false;
  const Pos it = lowerBound(t - kWindow);
  if (it != nodes_.end() && std::fabs(t - it->getTime()) < kWindow) return it->inAudioBlack;
  if (it == nodes_.begin()) return false;
  return std::prev(it)->inAudioBlack;
}

Store::eRangeState Store::getRangeState(double t1, double t2, float* level) const {
  CriticalSectionLock hold(lock_);
  if (nodes_.empty()) {
    if (level) *level = 1.0f;
    return RangeUnity;
  }
  if (nodes_.size() == 1) {
    if (level) *level = nodes_.begin()->level;
    return classify(nodes_.begin()->level);
  }
  // Without an order between the times there is no range to vouch for.
  if (std::isnan(t1) || std::isnan(t2)) return RangeVarying;
  if (t1 > t2) std::swap(t1, t2);
  Pos a = lowerBound(t1);
  if (a != nodes_.begin()) --a;
  const Pos b = lowerBound(t2);
  for (Pos it = a; it != b; ++it) {
    if (!(it->level == a->level)) return RangeVarying;
  }
  if (level) *level = a->level;
  return classify(a->level);
}

// --- modification tracking -----------------------------------------------

void Store::setModified() const {
  CriticalSectionLock hold(lock_);
  acks_.clear();
}

void Store::acknowledgeModification(void* reader, void* tag) const {
  const Ack key(reinterpret_cast<std::uintptr_t>(reader), reinterpret_cast<std::uintptr_t>(tag));
  CriticalSectionLock hold(lock_);
  const auto it = std::lower_bound(acks_.begin(), acks_.end(), key);
  if (it == acks_.end() || *it != key) acks_.insert(it, key);
}

bool Store::queryModification(void* reader, void* tag) const {
  const Ack key(reinterpret_cast<std::uintptr_t>(reader), reinterpret_cast<std::uintptr_t>(tag));
  CriticalSectionLock hold(lock_);
  return !std::binary_search(acks_.begin(), acks_.end(), key);
}

// --- inserting -----------------------------------------------------------

bool Store::acceptable(const Node& n) const {
  if (!std::isfinite(n.time)) {
    vel_splat("DynamicLevelControl::Store: node time is not finite");
    return false;
  }
  if (n.type < Normal || n.type > MarkedForDelete) {
    vel_splat("DynamicLevelControl::Store: unknown node type");
    return false;
  }
  return true;
}

Store::Pos Store::insertWithoutAdjust(const Node& n) {
  // A multiset inserts after the nodes of equal key already there.
  return nodes_.insert(n);
}

Store::iterator Store::insert(const Node& n) {
  CriticalSectionLock hold(lock_);
  if (!acceptable(n)) return at(nodes_.end());
  setModified();
  erase(n.time - kWindow, n.time + kWindow);
  const Pos p = insertWithoutAdjust(n);
  const Pos next = std::next(p);
  const bool hasNext = next != nodes_.end();
  const bool hasPrev = p != nodes_.begin();
  if (p->type == StartGuard) {
    if (hasNext) mut(p).level = next->level;
  } else if (p->type == EndGuard) {
    if (hasPrev) mut(p).level = std::prev(p)->level;
  } else {
    if (hasNext && next->type == EndGuard) mut(next).level = p->level;
    if (hasPrev && std::prev(p)->type == StartGuard) mut(std::prev(p)).level = p->level;
  }
  return at(p);
}

Store::iterator Store::insert(iterator /*hint*/, const Node& n) { return insert(n); }

Store::iterator Store::insert_noAdjust(const Node& n) {
  CriticalSectionLock hold(lock_);
  if (!acceptable(n)) return at(nodes_.end());
  setModified();
  erase_noAdjust(n.time - kWindow, n.time + kWindow);
  return at(insertWithoutAdjust(n));
}

Store::iterator Store::insert_noAdjust(iterator /*hint*/, const Node& n) { return insert_noAdjust(n); }

void Store::insertRange(iterator first, iterator last) {
  if (!first.valid() || first.store_ != last.store_) {
    vel_splat("DynamicLevelControl::Store::insertRange: iterators of different stores");
    return;
  }
  // Copy the source out under its own lock first: the source may be this
  // store, and holding two stores' locks at once could deadlock.
  std::vector<Node, StdAllocator<Node>> copied;
  {
    const Store& source = *first.store_;
    const criticalSection sourceLock = source.getLockObject();
    CriticalSectionLock hold(sourceLock);
    if (!source.reaches(first.position_, last.position_)) {
      vel_splat("DynamicLevelControl::Store::insertRange: range does not run forwards");
      return;
    }
    for (Pos it = first.position_; it != last.position_; ++it) copied.push_back(*it);
  }
  CriticalSectionLock hold(lock_);
  setModified();
  if (copied.empty()) return;
  erase(copied.front().time - kWindow, copied.back().time + kWindow);
  for (const Node& n : copied) {
    const Pos p = insertWithoutAdjust(n);
    const Pos next = std::next(p);
    if (next != nodes_.end() && next->type == EndGuard) mut(next).level = p->level;
    if (p != nodes_.begin()) {
      const Pos prev = std::prev(p);
      if (prev->type == StartGuard && prev != nodes_.begin()) mut(prev).level = p->level;
    }
  }
}

// --- erasing -------------------------------------------------------------

bool Store::reaches(Pos first, Pos last) const {
  for (Pos it = first;; ++it) {
    if (it == last) return true;
    if (it == nodes_.end()) return false;
  }
}

void Store::adjustAfterRangeErase(Pos r) {
  if (r == nodes_.end() || r == nodes_.begin()) return;
  const Pos before = std::prev(r);
  // A guard that is the store's first node is left alone by range erasers.
  if (before == nodes_.begin()) return;
  if (isOrdinary(*r)) {
    if (before->type == StartGuard) mut(before).level = r->level;
  } else if (r->type == EndGuard) {
    if (before->type == Normal) mut(r).level = before->level;
  }
}

Store::Pos Store::eraseRange(Pos first, Pos last, bool adjust) {
  nodes_.erase(first, last);
  if (adjust) adjustAfterRangeErase(last);
  return last;
}

Store::Pos Store::eraseOne(Pos it, bool adjust) {
  const Pos r = nodes_.erase(it);
  if (!adjust || r == nodes_.end() || r == nodes_.begin()) return r;
  const Pos before = std::prev(r);
  if (isOrdinary(*r)) {
    if (before->type == StartGuard) mut(before).level = r->level;
  } else if (before->type == Normal) {
    mut(r).level = before->level;
  }
  return r;
}

Store::iterator Store::erase(iterator it) {
  CriticalSectionLock hold(lock_);
  setModified();
  if (!owns(it)) {
    vel_splat("DynamicLevelControl::Store::erase: iterator of another store");
    return at(nodes_.end());
  }
  if (it.position_ == nodes_.end()) return it;
  return at(eraseOne(it.position_, true));
}

Store::iterator Store::erase_noAdjust(iterator it) {
  CriticalSectionLock hold(lock_);
  setModified();
  if (!owns(it)) {
    vel_splat("DynamicLevelControl::Store::erase: iterator of another store");
    return at(nodes_.end());
  }
  if (it.position_ == nodes_.end()) return it;
  return at(eraseOne(it.position_, false));
}

Store::iterator Store::erase(iterator first, iterator last) {
  CriticalSectionLock hold(lock_);
  setModified();
  if (!owns(first) || !owns(last) || !reaches(first.position_, last.position_)) {
    vel_splat("DynamicLevelControl::Store::erase: not a range of this store");
    return at(nodes_.end());
  }
  return at(eraseRange(first.position_, last.position_, true));
}

Store::iterator Store::erase(double t1, double t2) { return eraseTimes(t1, t2, true); }

Store::iterator Store::erase_noAdjust(double t1, double t2) { return eraseTimes(t1, t2, false); }

Store::iterator Store::eraseTimes(double t1, double t2, bool adjust) {
  CriticalSectionLock hold(lock_);
  setModified();
  const Pos last = lowerBound(t2);
  if (!(t1 <= t2)) return at(last);
  return at(eraseRange(lowerBound(t1), last, adjust));
}

Store::iterator Store::eraseNonGuard(iterator first, iterator last) {
  CriticalSectionLock hold(lock_);
  setModified();
  if (!owns(first) || !owns(last) || !reaches(first.position_, last.position_)) {
    vel_splat("DynamicLevelControl::Store::eraseNonGuard: not a range of this store");
    return at(nodes_.end());
  }
  for (Pos it = first.position_; it != last.position_;) {
    it = it->isGuard() ? std::next(it) : nodes_.erase(it);
  }
  if (nodes_.empty()) return last;
  // Re-tie every guard to its neighbour; a section left with only its two
  // guards goes back to unity.
  for (Pos a = nodes_.begin(), b = std::next(a); b != nodes_.end(); a = b, ++b) {
    if (b->type == EndGuard && a->type == Normal) {
      mut(b).level = a->level;
    } else if (a->type == StartGuard) {
      if (b->type == Normal) {
        mut(a).level = b->level;
      } else if (b->type == EndGuard) {
        mut(a).level = 1.0f;
        mut(b).level = 1.0f;
      }
    }
  }
  return last;
}

Store::iterator Store::eraseNonGuard(double t1, double t2) {
  CriticalSectionLock hold(lock_);
  setModified();
  const Pos last = lowerBound(t2 - kWindow);
  if (!(t1 <= t2)) return at(last);
  for (Pos it = lowerBound(t1 - kWindow); it != last;) {
    it = it->isGuard() ? std::next(it) : eraseOne(it, true);
  }
  return at(last);
}

void Store::clear() {
  CriticalSectionLock hold(lock_);
  setModified();
  nodes_.clear();
}

// --- audio black ---------------------------------------------------------

// Both walks hold the lock throughout: positions kept across a release could
// be erased by another thread in between.
void Store::setRangeToBlackSection(double t1, double t2) {
  if (std::isnan(t1) || std::isnan(t2)) return;
  const double lo = std::min(t1, t2);
  const double hi = std::max(t1, t2);
  CriticalSectionLock hold(lock_);
  const Pos last = lowerBound(hi - kWindow);
  if (last == nodes_.end()) return;
  const Pos first = lowerBound(lo - kWindow);
  for (Pos it = first; it != last;) {
    if (it->isGuard()) {
      at(it).setInAudioBlackSection(true);
      ++it;
    } else {
      it = erase(at(it)).position_;
    }
  }
}

void Store::setRangeToNonBlackSection(double t1, double t2) {
  if (!(t2 >= t1)) return;
  CriticalSectionLock hold(lock_);
  const Pos last = lowerBound(t2 - kWindow);
  if (last == nodes_.end()) return;
  for (Pos it = lowerBound(t1 - kWindow); it != last; ++it) at(it).setInAudioBlackSection(false);
}

// --- iterator ------------------------------------------------------------

bool Store::iterator::operator==(const iterator& other) const noexcept {
  if (store_ != other.store_) return false;
  return store_ == nullptr || position_ == other.position_;
}

bool Store::iterator::atNode() const noexcept {
  return store_ != nullptr && position_ != store_->nodes_.end();
}

Store::iterator& Store::iterator::operator++() noexcept {
  if (atNode()) ++position_;
  return *this;
}

Store::iterator& Store::iterator::operator--() noexcept {
  if (!store_) return *this;
  if (position_ == store_->nodes_.begin()) {
    position_ = store_->nodes_.end();
  } else {
    --position_;
  }
  return *this;
}

const Node& Store::iterator::getNode() const noexcept {
  if (!atNode()) {
    vel_splat("DynamicLevelControl::Store::iterator: no node at this position");
    static const Node none;
    return none;
  }
  return *position_;
}

void Store::iterator::setLevel(float level) {
  if (!atNode()) {
    vel_splat("DynamicLevelControl::Store::iterator: no node at this position");
    return;
  }
  const criticalSection lock = store_->getLockObject();
  CriticalSectionLock hold(lock);
  store_->setModified();
  NodeSet& nodes = store_->nodes_;
  node().level = level;
  if (node().isGuard()) return;
  const Pos next = std::next(position_);
  if (next != nodes.end() && next->type == EndGuard) mut(next).level = level;
  if (position_ != nodes.begin()) {
    const Pos before = std::prev(position_);
    if (before->type == StartGuard) mut(before).level = level;
  }
}

void Store::iterator::setTime(double t) {
  if (!atNode()) {
    vel_splat("DynamicLevelControl::Store::iterator: no node at this position");
    return;
  }
  if (!std::isfinite(t)) {
    vel_splat("DynamicLevelControl::Store: node time is not finite");
    return;
  }
  const criticalSection lock = store_->getLockObject();
  CriticalSectionLock hold(lock);
  NodeSet& nodes = store_->nodes_;
  const double old = position_->time;
  const Pos next = std::next(position_);
  const bool hasPrev = position_ != nodes.begin();
  const bool leaves =
      (hasPrev && t <= std::prev(position_)->time) || (next != nodes.end() && t >= next->time);
  if (leaves && t > old) {
    for (Pos it = next; it != nodes.end() && it->time < t + kWindow;) it = nodes.erase(it);
  } else if (leaves && t < old) {
    while (position_ != nodes.begin()) {
      const Pos before = std::prev(position_);
      if (before->time < t - kWindow) break;
      nodes.erase(before);
    }
  }
  node().time = t;
  store_->setModified();
}

void Store::iterator::setNodeType(eNodeType type) {
  if (!atNode()) {
    vel_splat("DynamicLevelControl::Store::iterator: no node at this position");
    return;
  }
  if (type < Normal || type > MarkedForDelete) {
    vel_splat("DynamicLevelControl::Store: unknown node type");
    return;
  }
  const criticalSection lock = store_->getLockObject();
  CriticalSectionLock hold(lock);
  store_->setModified();
  node().type = type;
}

void Store::iterator::setInAudioBlackSection(bool inAudioBlack) {
  if (!atNode()) {
    vel_splat("DynamicLevelControl::Store::iterator: no node at this position");
    return;
  }
  const criticalSection lock = store_->getLockObject();
  CriticalSectionLock hold(lock);
  store_->setModified();
  node().inAudioBlack = inAudioBlack;
}

}  // namespace Aud::DynamicLevelControl
