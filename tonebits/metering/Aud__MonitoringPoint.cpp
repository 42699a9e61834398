#include "tonebits/metering/Aud__MonitoringPoint.h"

#include "host/Log.h"
#include "host/OS.h"
#include "host/ProjectTime.h"

namespace Aud {

namespace {

// A taken peak that no write refreshes reads as 0 after this long.
constexpr double kPeakHoldMs = 40.0;

using Entry = MonitoringPointReaderListEntry;

MonitoringPointManager& manager() { return MonitoringPointManager::instance(); }

void giveBack(Entry* entry) {
  if (!isOk(manager().mpRemoveReader(entry)))
    vel_splat("Unexpected state in MonitoringPointReader::operator=");
}

}  // namespace

struct MonitoringPointReader::Impl : host::HostAllocated {
  Entry* entry = nullptr;
  // What getId last read under the manager's lock; getId hands out a
  // reference to it, which the unregistering thread never writes.
  IdStamp idSeen = IdStamp::invalidStamp();

  // Takes over entry; gives it back when there is no memory for the holder.
  static Impl* holding(Entry* entry) {
    try {
      Impl* impl = new Impl;
      impl->entry = entry;
      return impl;
    } catch (...) {
      if (entry) giveBack(entry);
      throw;
    }
  }
};

// ---- readers ----

MonitoringPointReader::MonitoringPointReader() : impl_(new Impl) {}

MonitoringPointReader::MonitoringPointReader(IdStamp const& pointId)
    : impl_(Impl::holding(manager().mpAddReader(pointId))) {}

MonitoringPointReader::MonitoringPointReader(MonitoringPointReader const& other)
    : impl_(Impl::holding(other.impl_->entry ? manager().mpAddReader(manager().pointIdOf(*other.impl_->entry))
                                             : nullptr)) {}

MonitoringPointReader& MonitoringPointReader::operator=(MonitoringPointReader const& other) {
  Entry* const mine = impl_->entry;
  Entry* const theirs = other.impl_->entry;
  if (mine && theirs && manager().sameTarget(*mine, *theirs)) return *this;
  if (mine) {
    giveBack(mine);
    impl_->entry = nullptr;
  }
  if (theirs) impl_->entry = manager().mpAddReader(manager().pointIdOf(*theirs));
  return *this;
}

MonitoringPointReader::~MonitoringPointReader() {
  if (impl_->entry) giveBack(impl_->entry);
  delete impl_;
}

IdStamp const& MonitoringPointReader::getId() const {
  if (!impl_->entry) return Private::invalidIdStamp();
  impl_->idSeen = manager().pointIdOf(*impl_->entry);
  return impl_->idSeen;
}

bool MonitoringPointReader::valid() const { return impl_->entry && manager().isAttached(*impl_->entry); }

float MonitoringPointReader::peakValue(bool reset) {
  Entry* const entry = impl_->entry;
  if (!entry) return 0.0f;
  if (entry->peakTaken.load(std::memory_order_relaxed)) {
    const double now = service_get_msecs_precise();
    if (now - entry->takenAtMs.load(std::memory_order_relaxed) > kPeakHoldMs) {
      entry->heldPeak.store(0.0f, std::memory_order_relaxed);
      entry->peakTaken.store(false, std::memory_order_relaxed);
    }
  }
  const float value = entry->heldPeak.load(std::memory_order_relaxed);
  if (reset) {
    entry->peakTaken.store(true, std::memory_order_relaxed);
    entry->takenAtMs.store(service_get_msecs_precise(), std::memory_order_relaxed);
  }
  return value;
}

bool MonitoringPointReader::hasClipped(bool reset) {
  Entry* const entry = impl_->entry;
  if (!entry) return false;
  // An exchange, so a clip reported between the read and the clear is kept.
  return reset ? entry->clipped.exchange(false, std::memory_order_relaxed)
               : entry->clipped.load(std::memory_order_relaxed);
}

// ---- writers ----

MonitoringPointWriter::MonitoringPointWriter() noexcept { writerId_.invalidate(); }

MonitoringPointWriter::MonitoringPointWriter(IdStamp const& writerId) noexcept : writerId_(writerId) {}

void MonitoringPointWriter::updatePeakSampleValue(float samplePeak) {
  (void)manager().mpUpdatePeakSampleValue(writerId_, samplePeak);
}

void MonitoringPointWriter::updateHasClipped() { (void)manager().mpUpdateHasClipped(writerId_); }

}  // namespace Aud
