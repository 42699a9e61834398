// The nine stored sample forms and their conversions to and from float.
//
// Type  Bytes  Stored form
//  0     4     float, clamped to -1.0 ... 1 - 2^-23 when written
//  1     2     signed 16-bit
//  2     3     signed 24-bit packed
//  3     1     signed 8-bit
//  4     1     unsigned 8-bit, offset 128
//  5     4     signed 24-bit in the low three bytes of a 4-byte slot
//  6     4     signed 32-bit
//  7     4     float, unclamped
//  8     8     double
// Multi-byte forms are little-endian; -1 means no sample type.
//
// Writing clamps (a value equal to a bound passes) and truncates toward
// zero. A NaN written to an integer form is written as 0.0 is (silence: 0,
// or 127 for type 4), since converting it would be undefined.
//
// The per-sample rules below are the reference; convertToFloat and
// convertFromFloat apply them to blocks, on a SIMD fast path where the CPU
// has one, with identical bits.
#pragma once

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "tonebits/export.h"

namespace Aud {

inline constexpr int kNumSampleTypes = 9;

// Bytes per sample of a type, or 0 for a number that is not a sample type.
constexpr unsigned bytesPerSampleOfType(int sampleType) noexcept {
  constexpr unsigned kBytes[kNumSampleTypes] = {4, 2, 3, 1, 1, 4, 4, 4, 8};
  return sampleType >= 0 && sampleType < kNumSampleTypes ? kBytes[sampleType] : 0u;
}

namespace SampleRules {

// Upper clamp bounds, as floats.
inline constexpr float kFloatMax = 0.99999988079071044921875f;  // 1 - 2^-23, bits 0x3F7FFFFE
inline constexpr float kInt16Max = 0.999969482421875f;          // 1 - 2^-15
inline constexpr float kInt8Max = 0.9921875f;                   // 1 - 2^-7

inline float clamp(float v, float lo, float hi) noexcept { return v > hi ? hi : (v < lo ? lo : v); }
inline float clampNaNToZero(float v, float lo, float hi) noexcept { return v != v ? 0.0f : clamp(v, lo, hi); }

inline int32_t loadLE16(const unsigned char* p) noexcept { return int16_t(uint16_t(p[0] | (p[1] << 8))); }
inline int32_t loadLE24(const unsigned char* p) noexcept {
  const uint32_t u = uint32_t(p[0]) | (uint32_t(p[1]) << 8) | (uint32_t(p[2]) << 16);
  return int32_t(u << 8) >> 8;
}
inline int32_t loadLE32(const unsigned char* p) noexcept {
  uint32_t u;
  std::memcpy(&u, p, 4);
  return int32_t(u);
}

// ---- to float ----
inline float float32ToFloat(const unsigned char* p) noexcept {
  float v;
  std::memcpy(&v, p, 4);
  return v;
}
inline float int16ToFloat(const unsigned char* p) noexcept { return float(loadLE16(p)) * 0x1p-15f; }
inline float int24ToFloat(const unsigned char* p) noexcept { return float(loadLE24(p)) * 0x1p-23f; }
inline float int8ToFloat(const unsigned char* p) noexcept { return float(int8_t(p[0])) * 0x1p-7f; }
inline float uint8ToFloat(const unsigned char* p) noexcept { return float(int(p[0]) - 128) * 0x1p-7f; }
inline float int24in32ToFloat(const unsigned char* p) noexcept { return int24ToFloat(p); }
inline float int32ToFloat(const unsigned char* p) noexcept {
  return float((double(loadLE32(p)) + 0.5) / 2147483647.5);
}
inline float doubleToFloat(const unsigned char* p) noexcept {
  double v;
  std::memcpy(&v, p, 8);
  return float(v);
}

// ---- from float ----
inline void floatToFloat32(float v, unsigned char* p) noexcept {
  const float c = clamp(v, -1.0f, kFloatMax);
  std::memcpy(p, &c, 4);
}
inline int16_t floatToInt16Value(float v) noexcept {
  return int16_t(clampNaNToZero(v, -1.0f, kInt16Max) * 32768.0f);
}
inline void floatToInt16(float v, unsigned char* p) noexcept {
  const uint16_t u = uint16_t(floatToInt16Value(v));
  p[0] = uint8_t(u);
  p[1] = uint8_t(u >> 8);
}
inline int32_t floatToInt24Value(float v) noexcept {
  const int32_t i = int32_t(clampNaNToZero(v, -1.0f, kFloatMax) * 8388608.0f);
  return i < -8388608 ? -8388608 : (i > 8388607 ? 8388607 : i);
}
inline void floatToInt24(float v, unsigned char* p) noexcept {
  const uint32_t u = uint32_t(floatToInt24Value(v));
  p[0] = uint8_t(u);
  p[1] = uint8_t(u >> 8);
  p[2] = uint8_t(u >> 16);
}
inline int8_t floatToInt8Value(float v) noexcept {
  return int8_t(clampNaNToZero(v, -1.0f, kInt8Max) * 128.0f);
}
inline void floatToInt8(float v, unsigned char* p) noexcept { p[0] = uint8_t(floatToInt8Value(v)); }
// The offset is added in double and rounded to float; the clamp and the
// scaling by 127.5 are then in float. Scaling in double instead truncates to
// the same byte for every one of the 2^32 float inputs, so the precision of
// that step cannot be observed; float keeps the vector paths narrow.
inline uint8_t floatToUint8Value(float v) noexcept {
  const float shifted = v != v ? 1.0f : float(double(v) + 1.0);
  return uint8_t(int(clamp(shifted, 0.0f, 2.0f) * 127.5f));
}
inline void floatToUint8(float v, unsigned char* p) noexcept { p[0] = floatToUint8Value(v); }
inline void floatToInt24in32(float v, unsigned char* p) noexcept {
  const uint32_t u = uint32_t(floatToInt24Value(v));
  std::memcpy(p, &u, 4);
}
inline int32_t floatToInt32Value(float v) noexcept {
  return int32_t(double(clampNaNToZero(v, -1.0f, 1.0f)) * 2147483647.5 - 0.5);
}
inline void floatToInt32(float v, unsigned char* p) noexcept {
  const int32_t i = floatToInt32Value(v);
  std::memcpy(p, &i, 4);
}
inline void floatToFloat32Unclamped(float v, unsigned char* p) noexcept { std::memcpy(p, &v, 4); }
inline void floatToDouble(float v, unsigned char* p) noexcept {
  const double d = v;
  std::memcpy(p, &d, 8);
}

}  // namespace SampleRules

// One sample of the given type at p as float; 0.0 for an unknown type.
TONEBITS_API float sampleToFloat(int sampleType, const unsigned char* p) noexcept;
// Writes v as one sample of the given type at p; false, writing nothing, for
// an unknown type.
TONEBITS_API bool sampleFromFloat(int sampleType, float v, unsigned char* p) noexcept;

// Block conversions of count samples, on the fast path of the active
// instruction-set level (Aud::Simd), bit for bit the per-sample rules. The
// stored side may have any alignment, the float side a float's; source and
// destination must not overlap, and nothing outside the count samples is read
// or written. False, writing nothing, for an unknown type, or for a missing
// buffer when count is not 0.
TONEBITS_API bool convertToFloat(int sampleType, const unsigned char* src, float* dst,
                                 std::size_t count) noexcept;
TONEBITS_API bool convertFromFloat(int sampleType, const float* src, unsigned char* dst,
                                   std::size_t count) noexcept;

}  // namespace Aud
