// IdStamp: a 12-byte identifier, three 32-bit words. A default-constructed
// stamp is fresh: unique within the process, from any thread. The invalid
// stamp is all zeros.
#pragma once

#include <cstdint>

#include "host/HostExport.h"

class HOST_API IdStamp {
 public:
  IdStamp() noexcept;  // a fresh identifier
  IdStamp(uint32_t a, uint32_t b, uint32_t c) noexcept : words_{a, b, c} {}

  static IdStamp invalidStamp() noexcept { return IdStamp(0, 0, 0); }

  // Below, at or above zero: a strict total order.
  int compare(const IdStamp& other) const noexcept;
  bool valid() const noexcept { return (words_[0] | words_[1] | words_[2]) != 0; }
  void invalidate() noexcept { words_[0] = words_[1] = words_[2] = 0; }
  uint32_t word(int i) const noexcept { return words_[i]; }

  friend bool operator==(const IdStamp& a, const IdStamp& b) noexcept { return a.compare(b) == 0; }
  friend bool operator!=(const IdStamp& a, const IdStamp& b) noexcept { return a.compare(b) != 0; }
  friend bool operator<(const IdStamp& a, const IdStamp& b) noexcept { return a.compare(b) < 0; }

 private:
  uint32_t words_[3];
};
static_assert(sizeof(IdStamp) == 12);
