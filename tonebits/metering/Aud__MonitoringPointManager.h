// The process-wide registry of monitoring points.
//
// A monitoring point is a named place in the audio path whose level meters
// show. Its owner registers it and gets two ids: the point id, handed to
// meters, and the writer id, kept by the owner to write and unregister. The
// audio path writes the block's peak magnitude and any clip through the
// writer id; the manager fans each write out to every subscription of that
// point. Meters own subscriptions (through Aud::MonitoringPointReader) and
// read them without taking the manager's lock.
//
// Write rule, per subscription: a write replaces the held peak when the peak
// was taken by a resetting read since the last write, or when the new value
// is larger (strictly; a NaN is never larger). A clip report sets the clip
// flag and then writes 1.0 (full scale) by the same rule.
//
// Life cycle: registration never fails and never attaches subscriptions
// made earlier from an unknown id. Unregistration detaches the point's
// subscriptions (both their ids become invalid) and keeps the point's
// description, so references from mpGetInfo stay valid for the life of the
// process. A detached subscription is never attached again.
//
// Threads: every member operation takes the manager's lock; instance()
// creates the one manager under a separate creation lock made when the
// library loads, and afterwards reads it without locking. The held state of a
// subscription (heldPeak, clipped, peakTaken, takenAtMs) is written by the
// audio thread under the lock and read and reset by the meter's thread
// without it, so those fields are atomics.
#pragma once

#include <atomic>
#include <cstdint>
#include <list>
#include <map>

#include "host/IdStamp.h"
#include "host/Lock.h"
#include "host/OS.h"
#include "host/String.h"
#include "tonebits/export.h"
#include "tonebits/foundation/Aud__Status.h"

namespace Aud {

// Named only by MonitoringPointManager::getInternalReaderId, which ignores it.
enum eIO_Direction : int32_t { eIO_Input = 0, eIO_Output = 1 };

// The description of a point: stored unchanged and never interpreted here.
struct TONEBITS_API MonitoringPointInfo {
  unsigned char code = 0;
  String text1;
  String text2;
  String text3;
  bool flag = false;
  float value = 0.0f;
};

// One reader's subscription. Made by mpAddReader and freed by
// mpRemoveReader; the reader that asked for it holds the pointer in between.
// The two ids change only under the manager's lock; the held state is
// shared lock-free between the writing and the reading thread.
class TONEBITS_API MonitoringPointReaderListEntry {
 public:
  IdStamp writerId = IdStamp::invalidStamp();  // invalid while detached
  IdStamp pointId = IdStamp::invalidStamp();   // the id the reader asked for
  std::atomic<float> heldPeak{0.0f};
  std::atomic<bool> clipped{false};
  std::atomic<bool> peakTaken{false};  // set by a resetting read, cleared by a write
  std::atomic<double> takenAtMs{0.0};  // clock of the last resetting read

  MonitoringPointReaderListEntry() noexcept = default;
  MonitoringPointReaderListEntry(const MonitoringPointReaderListEntry&) = delete;
  MonitoringPointReaderListEntry& operator=(const MonitoringPointReaderListEntry&) = delete;
};

static_assert(std::atomic<float>::is_always_lock_free && std::atomic<double>::is_always_lock_free &&
                  std::atomic<bool>::is_always_lock_free,
              "a meter's read must not take a lock");

class TONEBITS_API MonitoringPointManager {
 public:
  // ---- process-wide access ----

  // The single manager, created on first use and never destroyed.
  static MonitoringPointManager& instance();
  static eStatus registerMP(MonitoringPointInfo const& info, IdStamp& pointId, IdStamp& writerId);
  static eStatus unregisterMP(IdStamp const& writerId);
  static MonitoringPointInfo const& getInfo(IdStamp const& writerId);
  // The invalid id, whatever the arguments.
  static IdStamp const& getInternalReaderId(unsigned int channel, eIO_Direction direction) noexcept;

  // ---- members (callers inside the library go through instance()) ----

  MonitoringPointManager();
  MonitoringPointManager(MonitoringPointManager const& other);
  MonitoringPointManager& operator=(MonitoringPointManager const& other);
  // Frees the containers, not the subscriptions, which belong to readers.
  ~MonitoringPointManager();

  // Registers a point with fresh ids; always sSuccess.
  eStatus mpRegister(MonitoringPointInfo const& info, IdStamp& pointId, IdStamp& writerId);
  // sInvalid for an unknown or already unregistered writer id.
  eStatus mpUnregister(IdStamp const& writerId);
  // A new subscription, attached when pointId is a registered point id and
  // detached otherwise; null when memory runs out.
  MonitoringPointReaderListEntry* mpAddReader(IdStamp const& pointId);
  // Frees a subscription this manager holds; sInvalid, freeing nothing, for
  // any other pointer.
  eStatus mpRemoveReader(MonitoringPointReaderListEntry* entry);
  // The description registered under writerId (also after unregistration),
  // or a shared empty description.
  MonitoringPointInfo const& mpGetInfo(IdStamp const& writerId);
  // Both always return sSuccess; an unknown writer id changes nothing.
  eStatus mpUpdatePeakSampleValue(IdStamp const& writerId, float samplePeak);
  eStatus mpUpdateHasClipped(IdStamp const& writerId);

 private:
  friend class MonitoringPointReader;

  struct IdLess {
    bool operator()(IdStamp const& a, IdStamp const& b) const noexcept { return a.compare(b) < 0; }
  };
  template <class V>
  using IdMap = std::map<IdStamp, V, IdLess, StdAllocator<std::pair<const IdStamp, V>>>;
  using Entry = MonitoringPointReaderListEntry;

  // The reader's view of its subscription's ids, read under the lock since
  // unregistration may be changing them on another thread.
  IdStamp pointIdOf(Entry const& entry) const noexcept;
  bool isAttached(Entry const& entry) const noexcept;
  bool sameTarget(Entry const& a, Entry const& b) const noexcept;

  IdMap<MonitoringPointInfo> infos;
  IdMap<IdStamp> pointToWriter;
  IdMap<IdStamp> writerToPoint;
  criticalSection lock;
  std::list<Entry*, StdAllocator<Entry*>> detachedReaders;
  std::multimap<IdStamp, Entry*, IdLess, StdAllocator<std::pair<const IdStamp, Entry*>>> readers;
};

namespace Private {
// The one shared invalid id that id accessors return a reference to.
TONEBITS_API IdStamp const& invalidIdStamp() noexcept;
}  // namespace Private

}  // namespace Aud
