// Flush-to-zero and denormals-are-zero for the current thread, for as long as
// the object lives.
//
// A recursive filter fed silence decays towards zero through the denormal
// range, where many CPUs run float arithmetic tens of times slower. Inside
// the scope, denormal inputs of float and double SSE/AVX arithmetic read as
// zero and denormal results are written as zero. That changes results: a
// value that would have been denormal (smaller than about 1.2e-38 in float,
// 2.2e-308 in double) becomes a zero of the same sign, so bit-exact
// comparisons against a run without the scope differ once a signal reaches
// that range. Nothing else is affected: rounding mode and exception flags
// stay as they are.
//
// The destructor puts back the two modes as they were when the object was
// made, so scopes nest. The mode belongs to the thread: make and destroy the
// object on the same thread, around the calls to be protected (the library's
// own calls; the compiler may move inline arithmetic across the switch).
// Threads started inside the scope inherit the mode with the rest of the
// floating-point environment.
// On CPUs without these modes the object does nothing.
#pragma once

#include <cstdint>

#include "tonebits/export.h"

namespace Aud {

class TONEBITS_API ScopedNoDenormals {
 public:
  ScopedNoDenormals() noexcept;
  ~ScopedNoDenormals();
  ScopedNoDenormals(const ScopedNoDenormals&) = delete;
  ScopedNoDenormals& operator=(const ScopedNoDenormals&) = delete;

  // Whether flush-to-zero and denormals-are-zero are on for this thread now.
  static bool isActiveOnThisThread() noexcept;

 private:
  uint32_t previous;  // the thread's two mode bits before the scope
};

}  // namespace Aud
