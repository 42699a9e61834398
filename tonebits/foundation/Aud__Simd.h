// The instruction-set level the kernels run at. The level is chosen once,
// from the CPU, when first asked; it is the scalar reference when the build
// option TONEBITS_FORCE_SCALAR is on or the environment variable of the same
// name is set to anything but "0" or empty.
//
// setActiveLevel is for tests and benchmarks that compare the paths: it is
// not synchronised with kernels running on other threads.
#pragma once

#include <cstdint>

#include "tonebits/export.h"

namespace Aud::Simd {

enum eLevel : int32_t { eScalar = 0, eSSE2 = 1, eAVX2 = 2, eAVX512 = 3 };

// The best level this CPU and build allow.
TONEBITS_API eLevel supportedLevel() noexcept;
// The level the kernels use now.
TONEBITS_API eLevel activeLevel() noexcept;
// Makes level (at most supportedLevel()) the active one; returns it.
TONEBITS_API eLevel setActiveLevel(eLevel level) noexcept;
TONEBITS_API const char* levelName(eLevel level) noexcept;

}  // namespace Aud::Simd
