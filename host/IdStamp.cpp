#include "host/IdStamp.h"

#include <atomic>
#include <chrono>

namespace {

// The first word tells processes apart (start time); the other two count.
uint32_t processWord() {
  static const uint32_t word = [] {
    auto ticks = static_cast<uint64_t>(std::chrono::steady_clock::now().time_since_epoch().count());
    uint32_t w = static_cast<uint32_t>(ticks ^ (ticks >> 32));
    return w ? w : 1u;  // never zero, so a fresh stamp is never invalid
  }();
  return word;
}

std::atomic<uint64_t> nextSerial{1};

}  // namespace

IdStamp::IdStamp() noexcept {
  const uint64_t serial = nextSerial.fetch_add(1, std::memory_order_relaxed);
  words_[0] = processWord();
  words_[1] = static_cast<uint32_t>(serial >> 32);
  words_[2] = static_cast<uint32_t>(serial);
}

int IdStamp::compare(const IdStamp& other) const noexcept {
  for (int i = 0; i < 3; ++i) {
    if (words_[i] != other.words_[i]) return words_[i] < other.words_[i] ? -1 : 1;
  }
  return 0;
}
