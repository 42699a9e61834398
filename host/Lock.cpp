#include "host/Lock.h"

#include <atomic>
#include <mutex>

#include "host/OS.h"

struct criticalSection::Shared : host::HostAllocated {
  std::recursive_mutex mutex;
  std::atomic<int32_t> references{1};
};

criticalSection::criticalSection() : shared_(new Shared) {}

criticalSection::criticalSection(const criticalSection& other) noexcept : shared_(other.shared_) {
  OS()->atomics()->atomicIncrement(shared_->references);
}

criticalSection& criticalSection::operator=(const criticalSection& other) noexcept {
  if (shared_ != other.shared_) {
    OS()->atomics()->atomicIncrement(other.shared_->references);
    Shared* old = shared_;
    shared_ = other.shared_;
    if (OS()->atomics()->atomicDecrement(old->references) == 0) delete old;
  }
  return *this;
}

criticalSection::~criticalSection() {
  if (OS()->atomics()->atomicDecrement(shared_->references) == 0) delete shared_;
}

void criticalSection::enter() const noexcept { shared_->mutex.lock(); }
void criticalSection::leave() const noexcept { shared_->mutex.unlock(); }
bool criticalSection::tryEnter() const noexcept { return shared_->mutex.try_lock(); }
