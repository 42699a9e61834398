// The two handles on a monitoring point: a meter holds a reader built from
// the point id, the point's owner holds a writer built from the writer id.
//
// A reader owns one subscription in the manager for as long as it lives (or
// none, when empty). Reads take no lock and never allocate:
//   peakValue(reset): if the peak was taken by a resetting read more than
//     40 ms ago (strictly, by service_get_msecs_precise) and nothing has been
//     written since, the held peak falls to 0; then the held peak is
//     returned, and a resetting read marks it taken, so the next write
//     replaces it instead of keeping the larger value.
//   hasClipped(reset): the clip flag, cleared when reset is true.
// So a meter polling with reset true sees the largest magnitude written since
// its previous poll, and a point no longer written reads 0 on the first poll
// more than 40 ms after the previous resetting poll.
//
// Copying a reader makes a new subscription to the same point id with its
// own fresh held state. Assigning keeps the target's subscription when both
// name the same point, and otherwise gives it back and subscribes anew.
//
// Threads: one reader object is used by one thread at a time; any number of
// readers on any threads may read while the audio thread writes. A writer is
// a plain value usable from any thread; each write is serialised by the
// manager.
#pragma once

#include "host/IdStamp.h"
#include "tonebits/export.h"
#include "tonebits/metering/Aud__MonitoringPointManager.h"

namespace Aud {

class TONEBITS_API MonitoringPointReader {
 public:
  // ---- types: empty, attached or detached ----

  // An empty reader: no subscription.
  MonitoringPointReader();
  // Subscribes to pointId: attached when it is a registered point id,
  // detached (reading 0 for ever) otherwise.
  explicit MonitoringPointReader(IdStamp const& pointId);
  MonitoringPointReader(MonitoringPointReader const& other);
  MonitoringPointReader& operator=(MonitoringPointReader const& other);
  ~MonitoringPointReader();

  // ---- operations ----

  // The id the reader was built from; the invalid id once the point is
  // unregistered, and for an empty reader.
  IdStamp const& getId() const;
  // True while attached to a registered point.
  bool valid() const;
  // 0.0 and false for an empty reader.
  float peakValue(bool reset);
  bool hasClipped(bool reset);

 private:
  struct Impl;
  Impl* impl_;
};

class TONEBITS_API MonitoringPointWriter {
 public:
  // An invalid writer.
  MonitoringPointWriter() noexcept;
  explicit MonitoringPointWriter(IdStamp const& writerId) noexcept;
  MonitoringPointWriter(MonitoringPointWriter const& other) noexcept = default;
  MonitoringPointWriter& operator=(MonitoringPointWriter const& other) noexcept = default;
  ~MonitoringPointWriter() = default;

  IdStamp const& getId() const noexcept { return writerId_; }
  // Whether the id is valid, not whether its point is still registered.
  bool valid() const noexcept { return writerId_.valid(); }
  // Writes through an unregistered id change nothing.
  void updatePeakSampleValue(float samplePeak);
  void updateHasClipped();

 private:
  IdStamp writerId_;
};

}  // namespace Aud
