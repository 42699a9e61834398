// Applying iterators: turn a level store into a gain for every sample of a
// stream played forwards or in reverse from a given time.
//
// Contract:
// - The state works in segments: between two nodes the gain moves linearly,
//   so it keeps the current level, a per-sample increment and a count of
//   samples left, and touches the store only when a segment ends or when the
//   caller checks for edits.
// - Per sample, in the order of play: the sample's gain is `level`; then,
//   unless `holdLevel` is set, `levelDelta` is added to `level` and
//   `samplesToNextNode` counted down; when it reaches 0 the move operation of
//   the direction starts the next segment. Every base operation leaves either
//   `holdLevel` set or `samplesToNextNode` above 0.
// - An edit of the store is noticed through its acknowledgement set under
//   the key (readerId, null), at the next segment change or edit check; the
//   gain then glides in a straight line over 10 ms of samples to where the
//   edited automation stands 10 ms further on, and follows it from there.
// - Segment lengths are a time span times the sample rate, truncated toward
//   zero and saturated to 32 bits; a NaN or negative span gives 0 samples.
// - Every look at the store is made under its lock; positions into the store
//   are never used after an edit until replaced.
// - A null store or a sample rate that is not above 0 gives unity gain for
//   ever; an empty store gives unity gain.
#pragma once

#include <cstddef>
#include <cstdint>

#include "tonebits/export.h"
#include "tonebits/levels/Aud__DynamicLevelControl.h"

namespace Aud::DynamicLevelControl {

// A plain copyable value; a copy keeps the reader id, so it shares its
// original's acknowledgements. Construction draws a new reader id from one
// process-wide counter.
struct TONEBITS_API DynamicLevelApplyingIteratorState {
  DynamicLevelApplyingIteratorState() noexcept;
  DynamicLevelApplyingIteratorState(const DynamicLevelApplyingIteratorState&) noexcept = default;
  DynamicLevelApplyingIteratorState& operator=(const DynamicLevelApplyingIteratorState&) noexcept = default;

  // Back to unity gain for ever; the position and reader id stay.
  void invalidate() noexcept;

  Store::iterator nodePosition;  // the node that ends the current segment
  const Store* store = nullptr;
  uint32_t samplesToNextNode = 0;
  float level = 1.0f;
  float levelDelta = 0.0f;
  double sampleRate = 0.0;
  bool holdLevel = true;
  double nextNodeTime = 0.0;
  bool pendingValid = false;  // a segment waits behind a glide
  uint32_t pendingSamplesToNextNode = 0;
  float pendingLevel = 1.0f;
  float pendingLevelDelta = 0.0f;
  bool pendingHoldLevel = true;
  double pendingNextNodeTime = 0.0;
  uint32_t readerId;
};

// Configures a state and moves it from segment to segment; the per-sample
// stepping is the derived class's. Owns nothing.
class TONEBITS_API DynamicLevelApplyingIteratorBase {
 public:
  explicit DynamicLevelApplyingIteratorBase(DynamicLevelApplyingIteratorState& state) noexcept;
  DynamicLevelApplyingIteratorBase(const DynamicLevelApplyingIteratorBase&) = delete;
  DynamicLevelApplyingIteratorBase& operator=(const DynamicLevelApplyingIteratorBase&) = delete;
  virtual ~DynamicLevelApplyingIteratorBase();

  // Sets the state up for play from startTime (seconds) at sampleRate
  // (samples per second).
  void configureForwards(const Store* store, double sampleRate, double startTime);
  void configureReverse(const Store* store, double sampleRate, double startTime);

  // If the store was edited since the state last acknowledged it, glides
  // from time, the stream's current time, towards the edited automation.
  void handleStoreModsForwards(double time);
  void handleStoreModsReverse(double time);

 protected:
  // Start the next segment; for when samplesToNextNode has reached 0 and
  // holdLevel is not set.
  void moveToNextNodeForwards();
  void moveToNextNodeReverse();

  // The configured store's nodes, read-only; an empty set when unconfigured.
  // Read them under the store's lock.
  const Store::NodeSet& getNodeStore() const;

  DynamicLevelApplyingIteratorState& iteratorState() const noexcept { return state_; }

 private:
  static void startForwards(DynamicLevelApplyingIteratorState& s, double t);
  static void startReverse(DynamicLevelApplyingIteratorState& s, double t);
  static void stepForwards(DynamicLevelApplyingIteratorState& s);
  static void stepReverse(DynamicLevelApplyingIteratorState& s);
  // Glides towards the edited automation as it stands at time `to`.
  void glide(double to, bool reverse);
  void move(bool reverse);

  DynamicLevelApplyingIteratorState& state_;
};

// Holds the state of DynamicLevelApplyingIterator ahead of its base.
struct TONEBITS_API DynamicLevelApplyingIteratorStorage {
  DynamicLevelApplyingIteratorState ownedState;
};

// A ready iterator that owns its state and applies the automation to blocks
// of float samples in place, in the order of play, checking for edits once
// at the start of each block.
class TONEBITS_API DynamicLevelApplyingIterator : private DynamicLevelApplyingIteratorStorage,
                                                  public DynamicLevelApplyingIteratorBase {
 public:
  DynamicLevelApplyingIterator() noexcept;
  ~DynamicLevelApplyingIterator() override;

  // Configure and restart the stream clock at startTime.
  void configureForwards(const Store* store, double sampleRate, double startTime);
  void configureReverse(const Store* store, double sampleRate, double startTime);
  // Back to unity gain for ever.
  void invalidate() noexcept;

  // Multiplies samples[0..count) by their gains, samples[0] being the next
  // sample of the stream.
  void apply(float* samples, std::size_t count);

  // Where the stream stands: the start time moved by the samples applied.
  double getStreamTime() const noexcept;
  bool isReverse() const noexcept { return reverse_; }
  const DynamicLevelApplyingIteratorState& getState() const noexcept { return ownedState; }

 private:
  bool reverse_ = false;
  double startTime_ = 0.0;
  uint64_t samplesApplied_ = 0;
};

}  // namespace Aud::DynamicLevelControl
