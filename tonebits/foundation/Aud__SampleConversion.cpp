#include "tonebits/foundation/Aud__SampleConversion.h"

#include "tonebits/foundation/Aud__Simd.h"

namespace Aud {

namespace {

using ToFloatFn = float (*)(const unsigned char*) noexcept;
using FromFloatFn = void (*)(float, unsigned char*) noexcept;

constexpr ToFloatFn kToFloat[kNumSampleTypes] = {
    SampleRules::float32ToFloat, SampleRules::int16ToFloat,     SampleRules::int24ToFloat,
    SampleRules::int8ToFloat,    SampleRules::uint8ToFloat,     SampleRules::int24in32ToFloat,
    SampleRules::int32ToFloat,   SampleRules::float32ToFloat,   SampleRules::doubleToFloat,
};
constexpr FromFloatFn kFromFloat[kNumSampleTypes] = {
    SampleRules::floatToFloat32, SampleRules::floatToInt16,            SampleRules::floatToInt24,
    SampleRules::floatToInt8,    SampleRules::floatToUint8,            SampleRules::floatToInt24in32,
    SampleRules::floatToInt32,   SampleRules::floatToFloat32Unclamped, SampleRules::floatToDouble,
};

bool isSampleType(int sampleType) noexcept { return sampleType >= 0 && sampleType < kNumSampleTypes; }

// The scalar references: the per-sample rules in a loop. Each type gets its
// own instantiation so the rule inlines.
template <ToFloatFn Rule, unsigned Bytes>
void toFloatLoop(const unsigned char* src, float* dst, std::size_t count) noexcept {
  for (std::size_t i = 0; i < count; ++i) dst[i] = Rule(src + i * Bytes);
}
template <FromFloatFn Rule, unsigned Bytes>
void fromFloatLoop(const float* src, unsigned char* dst, std::size_t count) noexcept {
  for (std::size_t i = 0; i < count; ++i) Rule(src[i], dst + i * Bytes);
}

}  // namespace

float sampleToFloat(int sampleType, const unsigned char* p) noexcept {
  return isSampleType(sampleType) && p ? kToFloat[sampleType](p) : 0.0f;
}

bool sampleFromFloat(int sampleType, float v, unsigned char* p) noexcept {
  if (!isSampleType(sampleType) || !p) return false;
  kFromFloat[sampleType](v, p);
  return true;
}

namespace detail {

void convertToFloatScalar(int sampleType, const unsigned char* src, float* dst, std::size_t count) noexcept {
  using namespace SampleRules;
  switch (sampleType) {
    case 0: case 7: toFloatLoop<float32ToFloat, 4>(src, dst, count); break;
    case 1: toFloatLoop<int16ToFloat, 2>(src, dst, count); break;
    case 2: toFloatLoop<int24ToFloat, 3>(src, dst, count); break;
    case 3: toFloatLoop<int8ToFloat, 1>(src, dst, count); break;
    case 4: toFloatLoop<uint8ToFloat, 1>(src, dst, count); break;
    case 5: toFloatLoop<int24in32ToFloat, 4>(src, dst, count); break;
    case 6: toFloatLoop<int32ToFloat, 4>(src, dst, count); break;
    case 8: toFloatLoop<doubleToFloat, 8>(src, dst, count); break;
    default: break;
  }
}

void convertFromFloatScalar(int sampleType, const float* src, unsigned char* dst, std::size_t count) noexcept {
  using namespace SampleRules;
  switch (sampleType) {
    case 0: fromFloatLoop<floatToFloat32, 4>(src, dst, count); break;
    case 1: fromFloatLoop<floatToInt16, 2>(src, dst, count); break;
    case 2: fromFloatLoop<floatToInt24, 3>(src, dst, count); break;
    case 3: fromFloatLoop<floatToInt8, 1>(src, dst, count); break;
    case 4: fromFloatLoop<floatToUint8, 1>(src, dst, count); break;
    case 5: fromFloatLoop<floatToInt24in32, 4>(src, dst, count); break;
    case 6: fromFloatLoop<floatToInt32, 4>(src, dst, count); break;
    case 7: fromFloatLoop<floatToFloat32Unclamped, 4>(src, dst, count); break;
    case 8: fromFloatLoop<floatToDouble, 8>(src, dst, count); break;
    default: break;
  }
}

}  // namespace detail

bool convertToFloat(int sampleType, const unsigned char* src, float* dst, std::size_t count) noexcept {
  if (!isSampleType(sampleType)) return false;
  if (count == 0) return true;
  if (!src || !dst) return false;
  detail::convertToFloatScalar(sampleType, src, dst, count);
  return true;
}

bool convertFromFloat(int sampleType, const float* src, unsigned char* dst, std::size_t count) noexcept {
  if (!isSampleType(sampleType)) return false;
  if (count == 0) return true;
  if (!src || !dst) return false;
  detail::convertFromFloatScalar(sampleType, src, dst, count);
  return true;
}

}  // namespace Aud
