#include "tonebits/dsp/Aud__ScopedNoDenormals.h"

#if defined(__x86_64__) || defined(__i386__)
#include <xmmintrin.h>
#define TONEBITS_HAS_MXCSR 1
#endif

namespace Aud {

namespace {

#if TONEBITS_HAS_MXCSR
constexpr uint32_t kDenormalsAreZero = 1u << 6;
constexpr uint32_t kFlushToZero = 1u << 15;
constexpr uint32_t kModes = kDenormalsAreZero | kFlushToZero;
#endif

}  // namespace

ScopedNoDenormals::ScopedNoDenormals() noexcept : previous(0) {
#if TONEBITS_HAS_MXCSR
  const uint32_t csr = _mm_getcsr();
  previous = csr & kModes;
  _mm_setcsr(csr | kModes);
#endif
}

ScopedNoDenormals::~ScopedNoDenormals() {
#if TONEBITS_HAS_MXCSR
  // Only the two modes go back: flags raised inside the scope are kept.
  _mm_setcsr((_mm_getcsr() & ~kModes) | previous);
#endif
}

bool ScopedNoDenormals::isActiveOnThisThread() noexcept {
#if TONEBITS_HAS_MXCSR
  return (_mm_getcsr() & kModes) == kModes;
#else
  return false;
#endif
}

}  // namespace Aud
