#include "tonebits/foundation/Aud__SampleConversion.h"

#include "tonebits/foundation/Aud__SampleConversion_internal.h"
#include "tonebits/foundation/Aud__Simd.h"

namespace Aud {

namespace detail {

// The scalar references: each rule in a loop of its own, so the rule inlines.
// Types 0 and 7 read through the same rule, since reading stores the bits.
constexpr ConversionKernels kScalarKernels = {
    {
        toFloatLoop<SampleRules::float32ToFloat, 4>,
        toFloatLoop<SampleRules::int16ToFloat, 2>,
        toFloatLoop<SampleRules::int24ToFloat, 3>,
        toFloatLoop<SampleRules::int8ToFloat, 1>,
        toFloatLoop<SampleRules::uint8ToFloat, 1>,
        toFloatLoop<SampleRules::int24in32ToFloat, 4>,
        toFloatLoop<SampleRules::int32ToFloat, 4>,
        toFloatLoop<SampleRules::float32ToFloat, 4>,
        toFloatLoop<SampleRules::doubleToFloat, 8>,
    },
    {
        fromFloatLoop<SampleRules::floatToFloat32, 4>,
        fromFloatLoop<SampleRules::floatToInt16, 2>,
        fromFloatLoop<SampleRules::floatToInt24, 3>,
        fromFloatLoop<SampleRules::floatToInt8, 1>,
        fromFloatLoop<SampleRules::floatToUint8, 1>,
        fromFloatLoop<SampleRules::floatToInt24in32, 4>,
        fromFloatLoop<SampleRules::floatToInt32, 4>,
        fromFloatLoop<SampleRules::floatToFloat32Unclamped, 4>,
        fromFloatLoop<SampleRules::floatToDouble, 8>,
    },
};

}  // namespace detail

namespace {

bool isSampleType(int sampleType) noexcept { return sampleType >= 0 && sampleType < kNumSampleTypes; }

// The kernels of the active level. AVX-512 machines run the AVX2 kernels:
// these loops are bound by memory, not by vector width.
const detail::ConversionKernels& activeKernels() noexcept {
#if defined(__x86_64__) || defined(__i386__)
  switch (Simd::activeLevel()) {
    case Simd::eAVX512:
    case Simd::eAVX2: return detail::kAVX2Kernels;
    case Simd::eSSE2: return detail::kSSE2Kernels;
    case Simd::eScalar: break;
  }
#endif
  return detail::kScalarKernels;
}

using SampleToFloatFn = float (*)(const unsigned char*) noexcept;
using SampleFromFloatFn = void (*)(float, unsigned char*) noexcept;

constexpr SampleToFloatFn kToFloat[kNumSampleTypes] = {
    SampleRules::float32ToFloat, SampleRules::int16ToFloat,   SampleRules::int24ToFloat,
    SampleRules::int8ToFloat,    SampleRules::uint8ToFloat,   SampleRules::int24in32ToFloat,
    SampleRules::int32ToFloat,   SampleRules::float32ToFloat, SampleRules::doubleToFloat,
};
constexpr SampleFromFloatFn kFromFloat[kNumSampleTypes] = {
    SampleRules::floatToFloat32, SampleRules::floatToInt16,
    SampleRules::floatToInt24,   SampleRules::floatToInt8,
    SampleRules::floatToUint8,   SampleRules::floatToInt24in32,
    SampleRules::floatToInt32,   SampleRules::floatToFloat32Unclamped,
    SampleRules::floatToDouble,
};

}  // namespace

float sampleToFloat(int sampleType, const unsigned char* p) noexcept {
  return isSampleType(sampleType) && p ? kToFloat[sampleType](p) : 0.0f;
}

bool sampleFromFloat(int sampleType, float v, unsigned char* p) noexcept {
  if (!isSampleType(sampleType) || !p) return false;
  kFromFloat[sampleType](v, p);
  return true;
}

bool convertToFloat(int sampleType, const unsigned char* src, float* dst, std::size_t count) noexcept {
  if (!isSampleType(sampleType)) return false;
  if (count == 0) return true;
  if (!src || !dst) return false;
  activeKernels().toFloat[sampleType](src, dst, count);
  return true;
}

bool convertFromFloat(int sampleType, const float* src, unsigned char* dst, std::size_t count) noexcept {
  if (!isSampleType(sampleType)) return false;
  if (count == 0) return true;
  if (!src || !dst) return false;
  activeKernels().fromFloat[sampleType](src, dst, count);
  return true;
}

}  // namespace Aud
