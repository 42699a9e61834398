// The decode-and-peak kernel behind the input monitor.
//
// samplePeak is, bit for bit, this loop over the count samples at samples:
//   float p = 0; for each sample: a = |decoded sample|; if (a > p) p = a;
// where the decoding is the to-float rule of the sample type (a NaN never
// counts, so NaNs are passed over). It returns 0.0 for no samples and for a
// number that is not a sample type. Any alignment.
//
// With Aud::Simd::activeLevel() at eScalar it runs that loop; otherwise a
// per-CPU path that finds the same value without decoding every sample
// (integer forms keep their smallest and largest raw values and decode
// once). It is exported so that its paths can be checked against the loop.
#pragma once

#include <cstddef>

#include "tonebits/export.h"

namespace Aud::Private {

TONEBITS_API float samplePeak(int sampleType, const unsigned char* samples, std::size_t count) noexcept;

}  // namespace Aud::Private
