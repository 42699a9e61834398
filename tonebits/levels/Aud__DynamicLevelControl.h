// Level automation store: a time-ordered collection of level nodes (a gain
// at a time in seconds) with guard nodes that mark where a section of
// automation starts and ends, and a per-node audio-black flag.
//
// Contract:
// - Nodes are kept in a balanced tree ordered by raw time; nodes of equal raw
//   time keep their order of arrival. Insert, erase and every lookup by time
//   cost O(log n).
// - Every operation takes the store's re-entrant lock; copies of a store share
//   that lock, and getLockObject() hands it out by value for callers that need
//   several calls to see one consistent store.
// - Every edit empties the acknowledgement set, so a reader that acknowledged
//   the store learns through queryModification that it must read it again.
// - Matching a time against nodes uses a window of 1e-6 s.
// - Adjusting edits keep guard levels tied to their neighbours: a start guard
//   carries the level of the ordinary node after it, an end guard the level of
//   the Normal node before it. The _noAdjust variants leave guards alone.
// - Node times must be finite and node types one of eNodeType: anything else
//   is reported through vel_splat and the edit is ignored.
// - Store::iterator reads and moves without the lock; its setters take it.
//   An iterator stays usable while its node exists.
#pragma once

#include <cstdint>
#include <functional>
#include <set>
#include <utility>
#include <vector>

#include "host/Lock.h"
#include "host/OS.h"
#include "tonebits/export.h"

namespace Aud::DynamicLevelControl {

class DynamicLevelApplyingIteratorBase;

class TONEBITS_API Store {
 public:
  enum eNodeType : int32_t { Normal = 0, StartGuard = 1, EndGuard = 2, MarkedForDelete = 3 };
  enum eRangeState : int32_t { RangeSilent = 1, RangeUnity = 2, RangeConstant = 3, RangeVarying = 4 };

  class TONEBITS_API Node {
   public:
    double time;        // raw time in seconds: the sort key
    float level;        // gain: 1.0 unity, 0.0 silence
    eNodeType type;     // kind of node
    bool inAudioBlack;  // the stretch from this node to the next is audio black

    Node() noexcept : Node(-1.0) {}
    // A search key; level and flag take the defaults of Node().
    explicit Node(double t) noexcept : Node(t, -1.0f) {}
    Node(double t, float l) noexcept : Node(t, l, Normal, false) {}
    Node(double t, float l, eNodeType ty, bool black) noexcept
        : time(t), level(l), type(ty), inAudioBlack(black) {}

    double getRawTime() const noexcept { return time; }
    // An end guard acts a quarter of the project's frame duration after its
    // stored time; the duration is read afresh on each call.
    double getTime() const noexcept;
    float getLevel() const noexcept { return level; }
    bool operator<(const Node& other) const noexcept { return time < other.time; }

    bool isGuard() const noexcept { return type == StartGuard || type == EndGuard; }
  };

  using NodeSet = std::multiset<Node, std::less<Node>, StdAllocator<Node>>;

  class TONEBITS_API iterator {
   public:
    iterator() noexcept = default;
    iterator(const iterator&) noexcept = default;
    iterator& operator=(const iterator&) noexcept = default;

    bool operator==(const iterator& other) const noexcept;
    bool operator!=(const iterator& other) const noexcept { return !(*this == other); }
    // The position is set; the end position counts as valid.
    bool valid() const noexcept { return store_ != nullptr; }

    // The end position stays put; from the last node to the end position.
    iterator& operator++() noexcept;
    // From the end position to the last node; from the first node to the end.
    iterator& operator--() noexcept;

    // Node accessors. On the end position or an invalid iterator they report
    // through vel_splat and read a default node.
    const Node& getNode() const noexcept;
    float getLevel() const noexcept { return getNode().level; }
    double getTime() const noexcept { return getNode().getTime(); }
    double getRawTime() const noexcept { return getNode().time; }
    eNodeType getNodeType() const noexcept { return getNode().type; }
    bool isInAudioBlack() const noexcept { return getNode().inAudioBlack; }
    bool isStartGuard() const noexcept { return getNode().type == StartGuard; }
    bool isEndGuard() const noexcept { return getNode().type == EndGuard; }
    bool isMarkedForDelete() const noexcept { return getNode().type == MarkedForDelete; }
    bool isGuardNode() const noexcept { return getNode().isGuard(); }

    // Setters take the store's lock and mark it modified. setLevel on an
    // ordinary node also sets the level of an end guard right after it and
    // of a start guard right before it.
    void setLevel(float level);
    // Moves the node to raw time t. When t leaves the open interval between
    // the node's neighbours, every other node the move passes over (those
    // strictly between the old and new places, and those within 1e-6 s of t
    // on the far side) is erased without guard adjustment, so the store stays
    // ordered by raw time. Guard levels are not adjusted.
    void setTime(double t);
    void setNodeType(eNodeType type);
    void setInAudioBlackSection(bool inAudioBlack);

   private:
    friend class Store;
    friend class DynamicLevelApplyingIteratorBase;
    iterator(Store* store, NodeSet::iterator position) noexcept : store_(store), position_(position) {}
    bool atNode() const noexcept;
    Node& node() const noexcept { return const_cast<Node&>(*position_); }

    Store* store_ = nullptr;
    NodeSet::iterator position_{};
  };

  Store();
  // Copies share the source's lock. A copy takes the source's nodes and
  // acknowledgements; assignment takes its nodes and counts as an edit of the
  // destination, so readers of the destination re-read it.
  Store(const Store& other);
  Store& operator=(const Store& other);
  ~Store();

  unsigned int size() const;
  bool empty() const;
  criticalSection getLockObject() const noexcept { return lock_; }

  iterator begin();
  iterator end();
  // The first node whose raw time is at or after t; end() if none.
  iterator find(double t);

  // Erases the nodes within 1e-6 s of n's raw time (adjusting), inserts n
  // after any nodes of equal raw time, then ties the guards around it.
  iterator insert(const Node& n);
  // As insert(n): the hint is replaced by the position after the cleared
  // window.
  iterator insert(iterator hint, const Node& n);
  iterator insert_noAdjust(const Node& n);
  iterator insert_noAdjust(iterator hint, const Node& n);
  // Copies [first, last) of any store in. The nodes of this store within the
  // copied span (from 1e-6 s before the first copied node's raw time to 1e-6 s
  // after the last's) are erased first, adjusting, so a pasted stretch of
  // automation replaces what was there.
  void insertRange(iterator first, iterator last);

  // Erase one node; a start guard before the node after it takes that node's
  // level, a guard after a Normal node takes the Normal node's. The end
  // position is ignored.
  iterator erase(iterator it);
  // Range erasers tie guards around the node after the range, but never a
  // start guard that is the store's first node.
  iterator erase(iterator first, iterator last);
  // Erases the nodes with t1 <= raw time < t2; t1 > t2 (or a NaN) erases
  // and adjusts nothing.
  iterator erase(double t1, double t2);
  iterator erase_noAdjust(iterator it);
  iterator erase_noAdjust(double t1, double t2);
  // Erases the ordinary nodes of [first, last), then re-ties every guard in
  // the store; a section left with only its guards goes back to unity.
  iterator eraseNonGuard(iterator first, iterator last);
  // The ordinary nodes from 1e-6 s before t1 up to 1e-6 s before t2, each
  // erased with the adjusting erase(iterator); nothing unless t1 <= t2.
  iterator eraseNonGuard(double t1, double t2);
  void clear();

  // Makes [min, max) of the two times audio black: its guards are flagged,
  // its ordinary nodes erased (adjusting). Nothing happens when no node lies
  // at or after the range's end. Holds the lock for the whole walk.
  void setRangeToBlackSection(double t1, double t2);
  // Clears the flag of the nodes of [t1, t2), when t2 >= t1 and a node lies
  // at or after t2.
  void setRangeToNonBlackSection(double t1, double t2);

  // Linear between nodes on their acting times; the first node's level
  // before it, the last's after it; the end guard's level in the gap before
  // the next section's start guard; 1.0 when empty. Two nodes acting at the
  // same time, or too far apart for the span to be finite, give the later
  // one's level.
  float getLevelAtTime(double t) const;
  bool isInAudioBlackAtTime(double t) const;
  // level may be null; it is left alone when the result is RangeVarying.
  eRangeState getRangeState(double t1, double t2, float* level) const;

  // Modification tracking: every edit empties the acknowledgement set.
  void setModified() const;
  void acknowledgeModification(void* reader, void* tag) const;
  bool queryModification(void* reader, void* tag) const;

 private:
  friend class iterator;
  friend class DynamicLevelApplyingIteratorBase;
  using Ack = std::pair<std::uintptr_t, std::uintptr_t>;  // (reader, tag)
  using AckSet = std::vector<Ack, StdAllocator<Ack>>;
  using Pos = NodeSet::iterator;

  iterator at(Pos p) noexcept { return iterator(this, p); }
  bool owns(const iterator& it) const noexcept { return it.store_ == this; }
  bool acceptable(const Node& n) const;
  Pos lowerBound(double t) const { return nodes_.lower_bound(Node(t)); }
  Pos insertWithoutAdjust(const Node& n);
  Pos eraseRange(Pos first, Pos last, bool adjust);
  // The nodes from t1 up to t2, under the lock; none when t1 > t2 or a time is NaN.
  iterator eraseTimes(double t1, double t2, bool adjust);
  void adjustAfterRangeErase(Pos r);
  Pos eraseOne(Pos it, bool adjust);
  bool reaches(Pos first, Pos last) const;

  NodeSet nodes_;
  criticalSection lock_;
  mutable AckSet acks_;
};

}  // namespace Aud::DynamicLevelControl
