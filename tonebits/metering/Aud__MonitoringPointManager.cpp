#include "tonebits/metering/Aud__MonitoringPointManager.h"

#include <new>
#include <utility>

#include "host/Log.h"

namespace Aud {

namespace {

// Made when the library loads, before any other static object of the
// library could ask for the manager.
__attribute__((init_priority(101))) criticalSection creationLock;

std::atomic<MonitoringPointManager*> theInstance{nullptr};

// Where the manager lives when the host heap cannot give it a block: the
// manager is never destroyed, so static storage serves as well.
alignas(MonitoringPointManager) unsigned char reserveBlock[sizeof(MonitoringPointManager)];

using Entry = MonitoringPointReaderListEntry;

Entry* newEntry() noexcept {
  void* block = OS()->allocator()->alloc(sizeof(Entry));
  return block ? new (block) Entry() : nullptr;
}

void freeEntry(Entry* entry) noexcept {
  entry->~Entry();
  OS()->allocator()->release(entry);
}

// The write rule of one subscription; the caller holds the manager's lock,
// so the audio side is the only writer of these fields here.
void applyPeak(Entry& entry, float samplePeak) noexcept {
  if (entry.peakTaken.load(std::memory_order_relaxed) ||
      samplePeak > entry.heldPeak.load(std::memory_order_relaxed)) {
    entry.heldPeak.store(samplePeak, std::memory_order_relaxed);
    entry.peakTaken.store(false, std::memory_order_relaxed);
  }
}

}  // namespace

namespace Private {
IdStamp const& invalidIdStamp() noexcept {
  static const IdStamp invalid = IdStamp::invalidStamp();
  return invalid;
}
}  // namespace Private

// ---- process-wide access ----

MonitoringPointManager& MonitoringPointManager::instance() {
  if (MonitoringPointManager* existing = theInstance.load(std::memory_order_acquire)) return *existing;
  CriticalSectionLock guard(creationLock);
  MonitoringPointManager* manager = theInstance.load(std::memory_order_relaxed);
  if (!manager) {
    void* block = OS()->allocator()->alloc(sizeof(MonitoringPointManager));
    if (!block) {
      vel_splat("Out of memory!");
      block = reserveBlock;
    }
    try {
      manager = new (block) MonitoringPointManager();
    } catch (...) {
      if (block != reserveBlock) OS()->allocator()->release(block);
      throw;
    }
    theInstance.store(manager, std::memory_order_release);
  }
  return *manager;
}

eStatus MonitoringPointManager::registerMP(MonitoringPointInfo const& info, IdStamp& pointId,
                                           IdStamp& writerId) {
  return instance().mpRegister(info, pointId, writerId);
}

eStatus MonitoringPointManager::unregisterMP(IdStamp const& writerId) {
  return instance().mpUnregister(writerId);
}

MonitoringPointInfo const& MonitoringPointManager::getInfo(IdStamp const& writerId) {
  return instance().mpGetInfo(writerId);
}

IdStamp const& MonitoringPointManager::getInternalReaderId(unsigned int, eIO_Direction) noexcept {
  return Private::invalidIdStamp();
}

// ---- construction ----

MonitoringPointManager::MonitoringPointManager() = default;

MonitoringPointManager::MonitoringPointManager(MonitoringPointManager const& other) : lock(other.lock) {
  CriticalSectionLock guard(other.lock);
  infos = other.infos;
  pointToWriter = other.pointToWriter;
  writerToPoint = other.writerToPoint;
  detachedReaders = other.detachedReaders;
  readers = other.readers;
}

MonitoringPointManager& MonitoringPointManager::operator=(MonitoringPointManager const& other) {
  if (this == &other) return *this;
  MonitoringPointManager copy(other);
  {
    CriticalSectionLock guard(lock);
    infos.swap(copy.infos);
    pointToWriter.swap(copy.pointToWriter);
    writerToPoint.swap(copy.writerToPoint);
    detachedReaders.swap(copy.detachedReaders);
    readers.swap(copy.readers);
  }
  lock = other.lock;
  return *this;
}

MonitoringPointManager::~MonitoringPointManager() = default;

// ---- points ----

eStatus MonitoringPointManager::mpRegister(MonitoringPointInfo const& info, IdStamp& pointId,
                                           IdStamp& writerId) {
  const IdStamp point;
  const IdStamp writer;
  // The nodes are built before locking, so the lock covers only linking
  // them in, which cannot fail.
  IdMap<IdStamp> toWriter, toPoint;
  IdMap<MonitoringPointInfo> info1;
  toWriter.emplace(point, writer);
  toPoint.emplace(writer, point);
  info1.emplace(writer, info);
  {
    CriticalSectionLock guard(lock);
    pointToWriter.insert(toWriter.extract(toWriter.begin()));
    writerToPoint.insert(toPoint.extract(toPoint.begin()));
    infos.insert(info1.extract(info1.begin()));
  }
  pointId = point;
  writerId = writer;
  return sSuccess;
}

eStatus MonitoringPointManager::mpUnregister(IdStamp const& writerId) {
  CriticalSectionLock guard(lock);
  const auto found = writerToPoint.find(writerId);
  if (found == writerToPoint.end()) return sInvalid;

  // The one step that allocates comes first, so a refusal changes nothing.
  const auto [first, last] = readers.equal_range(writerId);
  std::list<Entry*, StdAllocator<Entry*>> detached;
  for (auto it = first; it != last; ++it) detached.push_back(it->second);

  const IdStamp pointId = found->second;
  writerToPoint.erase(found);
  const auto point = pointToWriter.find(pointId);
  if (point == pointToWriter.end()) {
    vel_splat("Unexpected state in Aud::MonitoringPointManager (1)");
  } else {
    pointToWriter.erase(point);
  }
  for (Entry* entry : detached) {
    entry->writerId.invalidate();
    entry->pointId.invalidate();
  }
  detachedReaders.splice(detachedReaders.end(), detached);
  readers.erase(first, last);
  return sSuccess;
}

MonitoringPointInfo const& MonitoringPointManager::mpGetInfo(IdStamp const& writerId) {
  static const MonitoringPointInfo empty;
  CriticalSectionLock guard(lock);
  const auto found = infos.find(writerId);
  return found == infos.end() ? empty : found->second;
}

// ---- subscriptions ----

MonitoringPointReaderListEntry* MonitoringPointManager::mpAddReader(IdStamp const& pointId) {
  Entry* entry = newEntry();
  if (!entry) {
    vel_splat("Out of memory!");
    return nullptr;
  }
  // Both possible links are made before locking; the one not used is freed
  // after. Nothing under the lock allocates, so nothing there can fail.
  decltype(readers) attached;
  decltype(detachedReaders) detached;
  try {
    attached.emplace(pointId, entry);
    detached.push_back(entry);
  } catch (...) {
    freeEntry(entry);
    throw;
  }
  {
    CriticalSectionLock guard(lock);
    const auto found = pointToWriter.find(pointId);
    const IdStamp writer = found == pointToWriter.end() ? IdStamp::invalidStamp() : found->second;
    entry->pointId = pointId;
    entry->writerId = writer;
    if (writer.valid()) {
      auto node = attached.extract(attached.begin());
      node.key() = writer;
      readers.insert(std::move(node));  // after the entries already under this key
    } else {
      detachedReaders.splice(detachedReaders.end(), detached);
    }
  }
  return entry;
}

eStatus MonitoringPointManager::mpRemoveReader(MonitoringPointReaderListEntry* entry) {
  if (!entry) {
    vel_splat("Illegal client ptr in Aud::MonitoringPointManager::mpRemoveReader");
    return sInvalid;
  }
  {
    CriticalSectionLock guard(lock);
    bool found = false;
    const auto [first, last] = readers.equal_range(entry->writerId);
    for (auto it = first; it != last; ++it) {
      if (it->second == entry) {
        readers.erase(it);
        found = true;
        break;
      }
    }
    if (!found) {
      for (auto it = detachedReaders.begin(); it != detachedReaders.end(); ++it) {
        if (*it == entry) {
          detachedReaders.erase(it);
          found = true;
          break;
        }
      }
    }
    if (!found) return sInvalid;
  }
  freeEntry(entry);
  return sSuccess;
}

// ---- writes ----

eStatus MonitoringPointManager::mpUpdatePeakSampleValue(IdStamp const& writerId, float samplePeak) {
  CriticalSectionLock guard(lock);
  const auto [first, last] = readers.equal_range(writerId);
  for (auto it = first; it != last; ++it) applyPeak(*it->second, samplePeak);
  return sSuccess;
}

eStatus MonitoringPointManager::mpUpdateHasClipped(IdStamp const& writerId) {
  CriticalSectionLock guard(lock);
  const auto [first, last] = readers.equal_range(writerId);
  for (auto it = first; it != last; ++it) {
    it->second->clipped.store(true, std::memory_order_relaxed);
    applyPeak(*it->second, 1.0f);
  }
  return sSuccess;
}

// ---- the reader's view of its ids ----

IdStamp MonitoringPointManager::pointIdOf(Entry const& entry) const noexcept {
  CriticalSectionLock guard(lock);
  return entry.pointId;
}

bool MonitoringPointManager::isAttached(Entry const& entry) const noexcept {
  CriticalSectionLock guard(lock);
  return entry.writerId.valid();
}

bool MonitoringPointManager::sameTarget(Entry const& a, Entry const& b) const noexcept {
  CriticalSectionLock guard(lock);
  return a.pointId == b.pointId && a.writerId == b.writerId;
}

}  // namespace Aud
