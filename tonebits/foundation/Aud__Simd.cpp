#include "tonebits/foundation/Aud__Simd.h"

#include <atomic>
#include <cstdlib>
#include <cstring>

namespace Aud::Simd {

namespace {

eLevel detect() noexcept {
#if defined(TONEBITS_FORCE_SCALAR)
  return eScalar;
#else
  const char* force = std::getenv("TONEBITS_FORCE_SCALAR");
  if (force && *force && std::strcmp(force, "0") != 0) return eScalar;
#if defined(__x86_64__) || defined(__i386__)
  __builtin_cpu_init();
  if (__builtin_cpu_supports("avx512f") && __builtin_cpu_supports("avx512bw") &&
      __builtin_cpu_supports("avx512vl") && __builtin_cpu_supports("avx512dq"))
    return eAVX512;
  if (__builtin_cpu_supports("avx2") && __builtin_cpu_supports("fma")) return eAVX2;
  return eSSE2;
#else
  return eScalar;
#endif
#endif
}

std::atomic<int32_t> active{-1};

}  // namespace

eLevel supportedLevel() noexcept {
  static const eLevel supported = detect();
  return supported;
}

eLevel activeLevel() noexcept {
  int32_t level = active.load(std::memory_order_relaxed);
  if (level < 0) {
    level = supportedLevel();
    active.store(level, std::memory_order_relaxed);
  }
  return static_cast<eLevel>(level);
}

eLevel setActiveLevel(eLevel level) noexcept {
  const eLevel best = supportedLevel();
  const eLevel chosen = level < eScalar ? eScalar : (level > best ? best : level);
  active.store(chosen, std::memory_order_relaxed);
  return chosen;
}

const char* levelName(eLevel level) noexcept {
  switch (level) {
    case eScalar: return "scalar";
    case eSSE2: return "sse2";
    case eAVX2: return "avx2";
    case eAVX512: return "avx512";
  }
  return "unknown";
}

}  // namespace Aud::Simd
